# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""How a device in namespaces of its own ends, by what does not end one in place too: its
launcher's or its caller's end, and signals while bwrap lays it out."""
import concurrent.futures
import os
import shutil
import signal
import time

import pytest

from support.outside import (DEVICE_RUN, SIGNAL_SAYER, content, eventually, is_running,
                             make_program, on_device, started, unique_length)

pytestmark = pytest.mark.usefixtures("namespaces")


def test_sigkill_of_the_launcher_ends_it_and_everything_on_it(start):
    front, behind = unique_length(), unique_length()
    device = start("sh", "-c", f"sleep {behind} & exec sleep {front}")
    assert eventually(lambda: is_running(front) and is_running(behind))

    device.signal(signal.SIGKILL)

    assert device.status() == 137
    assert eventually(lambda: not is_running(front) and not is_running(behind))


@pytest.fixture
def slow_bwrap(tmp_path, monkeypatch):
    """Makes what device/run finds for bwrap a script that knows which start it is, and can
    leave a process that does not end with it, as bwrap does early on."""
    left = unique_length()

    def make(on_probe, on_device=""):
        make_program(tmp_path / "bwrap", f"""#!/bin/bash
            leave() {{ setsid timeout 20 sleep {left} & }}
            case $* in
            *' -- /usr/bin/true') {on_probe} ;;
            *) {on_device}
            esac
            exec {shutil.which("bwrap")} "$@"
            """)
        monkeypatch.setenv("PATH", f"{tmp_path}:{os.environ['PATH']}")
        return left

    return make


@pytest.mark.parametrize(
    "number", [signal.SIGHUP, signal.SIGINT, signal.SIGQUIT, signal.SIGTERM])
def test_signals_to_its_group_do_not_meet_what_tries_the_box(
        start, slow_bwrap, tmp_path, number):
    left = slow_bwrap("leave; touch $0-started; sleep 0.4; kill $!")
    device = start("sh", "-c", "echo begun; sleep 9")
    assert eventually((tmp_path / "bwrap-started").exists)

    device.signal_group(number)

    assert device.status() == 128 + number
    assert eventually(lambda: not is_running(left))
    assert device.out() == ""


def test_sigkill_of_it_as_the_box_is_laid_out_ends_what_bwrap_leaves(
        start, slow_bwrap, tmp_path):
    left = slow_bwrap(":", "leave; touch $0-started; wait")
    device = start("echo", "begun")
    assert eventually((tmp_path / "bwrap-started").exists)

    device.signal(signal.SIGKILL)

    assert device.status() == 137
    assert eventually(lambda: not is_running(left))
    assert device.out() == ""


def test_a_bwrap_that_is_killed_has_refused_nothing(slow_bwrap):
    slow_bwrap("kill -KILL $$")

    outcome = on_device("true")

    assert outcome.status == 125
    assert outcome.err == "device/run: bwrap was ended by signal 9 as it tried the device\n"


@pytest.fixture
def unread():
    """A full pipe that nobody reads."""
    reading, writing = os.pipe()
    os.set_blocking(writing, False)
    try:
        while True:
            os.write(writing, bytes(4096))
    except BlockingIOError:
        os.set_blocking(writing, True)
    yield writing
    os.close(reading)
    os.close(writing)


def test_a_signal_is_handed_on_while_nobody_reads_its_errors(start, unread):
    device = start(*SIGNAL_SAYER, errors=unread)
    assert device.says("ready")

    device.signal(signal.SIGTERM)

    assert device.status() == 7
    assert device.out() == "ready\nTERM\n"


def test_a_command_that_goes_on_is_ended_while_nobody_reads_its_errors(start, unread):
    mark = unique_length()
    device = start("sh", "-c", "trap '' TERM; echo ready; echo errors >&2", mark,
                   errors=unread)
    assert device.says("ready")

    device.signal(signal.SIGTERM)

    assert device.status() == 143
    assert eventually(lambda: not is_running(mark))


def test_its_callers_end_is_a_hang_up(tmp_path):
    said = tmp_path / "said"
    with started("sh", "-c", '"$@" >"$0" 2>&1; :', said, DEVICE_RUN,
                 *SIGNAL_SAYER) as caller:
        assert eventually(lambda: content(said) == "ready\n")

        caller.kill()

        assert eventually(lambda: content(said) == "ready\nHUP\n"), content(said)


def test_the_end_of_its_callers_thread_is_no_hang_up(start):
    def call():
        device = start(*SIGNAL_SAYER)
        assert device.says("ready")
        return device

    with concurrent.futures.ThreadPoolExecutor() as caller:
        device = caller.submit(call).result()
    time.sleep(0.3)
    device.signal(signal.SIGTERM)

    assert device.status() == 7
    assert device.out() == "ready\nTERM\n"
