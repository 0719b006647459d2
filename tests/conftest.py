# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What a file of tests wants of the machine, and what comes of it that it is not there."""
import os

import pytest

from support import outside


@pytest.fixture(scope="session")
def device():
    """For tests of what holds on any device."""
    if outside.way() == "":
        why = "the device does not start: " + outside.on_device("true").err
        (pytest.fail if os.environ.get("CI") == "true" else pytest.skip)(why)


@pytest.fixture(scope="session")
def namespaces(device):
    """For tests of the device that has namespaces of its own."""
    if outside.way() == "in-place":
        pytest.skip("namespaces are refused here, and the device is in place")


def pytest_sessionfinish(session):
    """Says to ctest that all was skipped; a part of a file would be skipped unseen."""
    reporter = session.config.pluginmanager.get_plugin("terminalreporter")
    if session.exitstatus == pytest.ExitCode.OK and reporter.stats.get("skipped"):
        session.exitstatus = 77
        if reporter.stats.get("passed"):
            reporter.write_line("\nsome are skipped: split the file by what its tests need")
            session.exitstatus = pytest.ExitCode.TESTS_FAILED
