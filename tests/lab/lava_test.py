# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""LAVA's dispatcher, with the files of lab/lava/, on virtual devices."""
import contextlib

import pytest

from support import lava, ssh
from support.outside import content, eventually, output_of, run, status_of

ITEMS = {"Bringup/SpiCheck": "pass", "Bringup/DeadPixel": "fail", "Bringup/FingerWait": "fail",
         "Bringup/Volts": "pass", "Bringup/QuietRun": "fail"}
MEASURED = {"Bringup/Volts/vcore": ("pass", 1.18, "V"), "Bringup/Volts/load": ("pass", 12.0, None)}


@pytest.fixture(scope="module")
def repository(tmp_path_factory):
    return lava.make_repository(tmp_path_factory.mktemp("repository"))


@pytest.fixture
def rack(tmp_path):
    items = lava.make_items(tmp_path / "items")
    with ssh.devices(tmp_path, 3, "--bin", items) as devices:
        for device in devices:
            device.make_root_writable()
        output_of("adb", "start-server")
        output_of("adb", "connect", devices[2].serial)
        yield devices
        output_of("adb", "kill-server")


def jobs_on(rack, directory, what, stack):
    """By ssh on two devices, by adb on the third."""
    return [stack.enter_context(lava.running(
        directory / f"job-{number}", number + 1, what(kind), lava.dictionary_of(kind, device)))
        for number, (kind, device) in enumerate(zip(("ssh", "ssh", "adb"), rack))]


def of_definition(name, results):
    """What a definition has recorded, without its name."""
    return {case.removeprefix(name + "/"): result for case, result in results.items()
            if case.startswith(name + "/")}


def test_three_at_once_by_both_definitions(rack, repository, tmp_path):
    with contextlib.ExitStack() as stack:
        processes = jobs_on(rack, tmp_path, lambda kind: lava.job(
            kind, repository, ("signals", "lines"), ARGUMENTS="--timeout 30 demo/Bringup"), stack)
        statuses = [status_of(process, 120) for process in processes]

    for number, status in enumerate(statuses):
        log = tmp_path / f"job-{number}/log"
        assert status == 0, log.read_text()[-3000:]
        recorded = lava.results(log)
        assert recorded["lava/job"][0] == "pass"

        by_signals = of_definition("0_signals", recorded)
        assert by_signals.pop("run") == ("pass", None, None)
        assert {case: by_signals.pop(case) for case in MEASURED} == MEASURED
        by_lines = of_definition("1_lines", recorded)
        assert by_lines.pop("run") == ("fail", None, None)
        for of_items in (by_signals, by_lines):
            assert {case: result[0] for case, result in of_items.items()} == ITEMS
            assert all(0 <= result[1] < 30 and result[2] == "s" for result in of_items.values())
        assert by_signals["Bringup/SpiCheck"][1] > 0.2


def test_two_of_three_are_lost(rack, repository, tmp_path):
    with contextlib.ExitStack() as stack:
        processes = jobs_on(rack, tmp_path, lambda kind: lava.job(
            kind, repository, ("signals",), ARGUMENTS="demo/Bringup demo/Endurance"
            if kind == "adb" else "demo/Bringup"), stack)
        for number, device in enumerate(rack):
            if number > 0:
                assert eventually(lambda: "TEST_CASE_ID=Bringup/DeadPixel" in content(
                    tmp_path / f"job-{number}/log"), 60)
                device.lose()
        statuses = [status_of(process, 120) for process in processes]

    recorded = [lava.results(tmp_path / f"job-{number}/log") for number in range(3)]
    assert statuses == [0, 1, 0]
    assert recorded[0]["0_signals/run"][0] == "pass"
    # what came before is kept
    assert recorded[1]["lava/job"][0] == "fail"
    assert recorded[1]["0_signals/Bringup/SpiCheck"][0] == "pass"
    assert "0_signals/run" not in recorded[1]
    assert recorded[2]["0_signals/Bringup/SpiCheck"][0] == "pass"
    assert recorded[2]["0_signals/run"][0] == "fail"


def test_a_cancelled_job_leaves_nothing_running(rack, repository, tmp_path):
    def running_there():
        return [run(*device.ssh("fptest status")).out.count("Endurance/BurnIn")
                for device in rack]

    with contextlib.ExitStack() as stack:
        processes = jobs_on(rack, tmp_path, lambda kind: lava.job(
            kind, repository, ("signals",), ARGUMENTS="demo/Endurance"), stack)
        assert eventually(lambda: running_there() == [1, 1, 1], 60)
        for process in processes:
            process.terminate()
        assert [status_of(process, 60) for process in processes] == [1, 1, 1]
        assert eventually(lambda: running_there() == [0, 0, 0], 30)
