# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""How a device ends: by COMMAND and by signals."""
import signal
import time

import pytest

from support.outside import (DEVICE_RUN, GOES_ON, SIGNAL_SAYER, TREE, SignalledDevice,
                             content, eventually, is_running, make_program, run, shell,
                             unique_length, way)

pytestmark = pytest.mark.usefixtures("device")

ALONE = SignalledDevice.signal
GROUP = SignalledDevice.signal_group


def test_sigterm_ends_it_and_everything_on_it(start):
    front, behind = unique_length(), unique_length()
    device = start("sh", "-c", f"sleep {behind} & exec sleep {front}")
    assert eventually(lambda: is_running(front) and is_running(behind))

    device.signal(signal.SIGTERM)

    assert device.status() == 143
    assert eventually(lambda: not is_running(front) and not is_running(behind))


def test_what_command_leaves_running_ends_with_it():
    length = unique_length()

    shell(f"sleep {length} >/dev/null 2>&1 &")

    assert eventually(lambda: not is_running(length))


def test_a_signal_that_the_caller_ignores_stays_ignored():
    outcome = run("sh", "-c", """trap '' INT; exec "$0" sh -c 'kill -INT $$; echo on'""",
                  DEVICE_RUN)

    assert outcome.out == "on\n"
    assert outcome.status == 0


@pytest.mark.parametrize("before_command, ways", [
    pytest.param([], [ALONE], id="to it alone"),
    pytest.param([], [GROUP], id="to its group"),
    pytest.param([], [ALONE, GROUP], id="to it and then to its group, as by timeout(1)"),
    pytest.param(["/usr/bin/setsid", "-w"], [GROUP], id="to its group, without COMMAND"),
])
@pytest.mark.parametrize("name", ["HUP", "INT", "QUIT", "TERM"])
def test_a_signal_comes_to_command_once(start, name, before_command, ways):
    device = start(*before_command, *SIGNAL_SAYER)
    assert device.says("ready")

    for send in ways:
        send(device, signal.Signals["SIG" + name])

    assert device.status() == 7
    assert device.out() == f"ready\n{name}\n"


@pytest.mark.parametrize("name", ["INT", "QUIT", "TERM"])
def test_a_signal_comes_to_what_a_script_waits_for_as_well(start, name, tmp_path):
    program = " ".join(map(str, SIGNAL_SAYER))
    make_program(tmp_path / "script", f"#!/system/bin/sh\nsh -c '{program}; echo on'; echo on\n")
    device = start("./script", options=("--out", tmp_path))
    assert device.says("ready")

    device.signal(signal.Signals["SIG" + name])

    assert device.status() == 128 + signal.Signals["SIG" + name]
    assert device.out() == f"ready\n{name}\n"


def test_a_second_signal_is_handed_on_as_well(start):
    device = start(*SIGNAL_SAYER)
    assert device.says("ready")

    device.signal(signal.SIGTERM)
    assert device.says("TERM\n")
    device.signal(signal.SIGTERM)
    assert device.says("TERM\nTERM\n")
    device.signal(signal.SIGHUP)

    assert device.status() == 7
    assert device.out() == "ready\nTERM\nTERM\nHUP\n"


def test_a_command_that_goes_on_is_ended_with_it_ten_seconds_later(start):
    # both at once, as they take their time; in place, if they cannot, they are the same
    ways = [ALONE, GROUP] if way() == "namespace" else [ALONE]
    goes_on = "trap '' TERM; echo ready; while :; do sleep 0.1; done"
    devices = [start("sh", "-c", goes_on) for _ in ways]
    assert all(device.says("ready") for device in devices)
    begin = time.monotonic()

    for send, device in zip(ways, devices):
        send(device, signal.SIGTERM)

    for device in devices:
        assert device.status() == 143
        assert time.monotonic() - begin >= 10
        assert device.out() == "ready\n" + GOES_ON


@pytest.mark.parametrize("milliseconds, number", [
    (at, signal.SIGHUP if at % 40 else signal.SIGTERM) for at in range(0, 241, 20)])
def test_a_signal_at_its_start_ends_it_and_leaves_nothing_running(
        start, milliseconds, number):
    length = unique_length()
    device = start("timeout", "20", "sleep", length)
    time.sleep(milliseconds / 1000)
    begin = time.monotonic()

    device.signal(number)

    assert device.status() == 128 + number, device.out()
    assert time.monotonic() - begin < 9
    assert eventually(lambda: not is_running(length))


def test_a_time_limit_leaves_whole_reports(start, tmp_path):
    results = tmp_path / "results"
    device = start("fptest", "run", "--plan", TREE / "plans/demo.xml", "--json", "results",
                   "--junit", "results.xml", "demo/Endurance", options=["--out", "."])
    assert eventually(lambda: '"start"' in content(results))

    device.signal(signal.SIGTERM)
    device.signal_group(signal.SIGTERM)

    assert device.status() == 130, device.out()
    assert '"finish"' in content(results)
    assert "</testsuites>" in content(tmp_path / "results.xml")
