# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What tests of the virtual device share."""
import pytest

from support.device_copy import make_system


@pytest.fixture
def system(tmp_path):
    """A copy of a device's /system, to be spoiled."""
    make_system(tmp_path / "pulled/system")
    return tmp_path / "pulled/system"
