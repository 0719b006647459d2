# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What a file of tests wants of the machine, and what comes of it that it is not there."""
import contextlib
import os

import pytest

from support import adb as adb_support
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


@pytest.fixture(scope="session")
def adb(device, tmp_path_factory):
    """The adb of this process, which no other meets."""
    with adb_support.server(tmp_path_factory.mktemp("adb")) as adb:
        yield adb


@pytest.fixture(scope="module")
def there(adb):
    """adb, to a device that is up as long as the file's tests run."""
    with adb.to_device() as there:
        yield there


@pytest.fixture
def start(tmp_path):
    """Starts a SignalledDevice, which is killed after the test if it is still there."""
    with contextlib.ExitStack() as stack:
        def start(*command, options=(), errors=None):
            said = tmp_path / outside.unique_length()
            with said.open("w") as file:
                process = stack.enter_context(outside.started(
                    outside.DEVICE_RUN, *options, "--", *command, cwd=tmp_path, stdout=file,
                    stderr=errors or file, start_new_session=True))
            return outside.SignalledDevice(process, said)

        yield start


def pytest_sessionfinish(session):
    """Says to ctest that all was skipped; a part of a file would be skipped unseen."""
    reporter = session.config.pluginmanager.get_plugin("terminalreporter")
    if session.exitstatus == pytest.ExitCode.OK and reporter.stats.get("skipped"):
        session.exitstatus = 77
        if reporter.stats.get("passed"):
            reporter.write_line("\nsome are skipped: split the file by what its tests need")
            session.exitstatus = pytest.ExitCode.TESTS_FAILED
