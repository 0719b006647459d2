# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""The items of a plan on the devices of a rack; conftest.py says how."""
import warnings

import pytest


def test_item(ended):
    outcome, reason = ended["outcome"], ended["reason"]
    print(ended["output"], end="")
    if ended["warning"]:
        warnings.warn(ended["warning"])
    if outcome == "flaky":
        warnings.warn(f"flaky: {reason}")
    elif outcome == "expected":
        pytest.xfail(reason)
    elif outcome != "passed":
        description = ended["description"]
        pytest.fail(f"{outcome}: {reason}" + (f"\n{description}" if description else ""),
                    pytrace=False)
