# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""lab/: several devices at once, driven by what exists."""
import xml.etree.ElementTree

import pytest

from support.outside import TREE, content, run

pytestmark = pytest.mark.usefixtures("namespaces")

DEVICES = [f"127.0.0.1:{port}" for port in (5601, 5602, 5603)]
ADB_ALL = TREE / "lab/adb-all"
PLAN = TREE / "plans/demo.xml"


def on_rack(*command, devices=3, **others):
    return run(TREE / "lab/virtual-rack", str(devices), *command, **others)


def cases(path):
    """SUITE/ITEM -> what it became."""
    return {f"{suite.get('name')}/{case.get('name')}": [
        child.tag for child in case if child.tag in ("failure", "error")]
        for suite in xml.etree.ElementTree.parse(path).getroot() for case in suite.iter("testcase")}


def test_three_devices_run_a_group_and_their_reports_are_joined(tmp_path):
    status, out, _ = on_rack(ADB_ALL, PLAN, "demo/Bringup", "--timeout", "30", cwd=tmp_path)

    lines = [line.partition(": 1 passed, 3 failed, ") for line in sorted(out.splitlines())]
    assert [line[0] for line in lines] == DEVICES
    assert all(line[1] for line in lines), out
    assert status == 1
    one = {"SpiCheck": [], "DeadPixel": ["failure"], "FingerWait": ["failure"],
           "QuietRun": ["error"]}
    assert cases(tmp_path / "results/all.xml") == {
        f"{device}: Bringup/{name}": what for device in DEVICES for name, what in one.items()}
    for device in DEVICES:
        assert '"event":"finish"' in content(tmp_path / f"results/{device}.jsonl")


def test_the_status_is_the_worst(tmp_path):
    assert on_rack(ADB_ALL, PLAN, "demo/Bringup/SpiCheck", devices=2, cwd=tmp_path).status == 0

    status, out, _ = on_rack(ADB_ALL, PLAN, "demo/No 'where", devices=2, cwd=tmp_path)
    assert status == 2
    assert out.count("No 'where") == 2
    assert list(cases(tmp_path / "results/all.xml").values()) == [["error"], ["error"]]


def test_a_device_that_is_lost_is_named_and_the_others_go_on(tmp_path):
    lose = """
        "$@" & until grep SpiCheck results/127.0.0.1:5602.log; do sleep 0.05; done >&2
        adb -s 127.0.0.1:5602 shell 'kill $(pgrep -x sleep)'
        wait $!"""

    status, out, _ = on_rack("bash", "-c", lose, "bash", ADB_ALL, PLAN, "demo/Bringup",
                             cwd=tmp_path)

    lines = sorted(out.splitlines())
    assert lines[0].startswith(DEVICES[0] + ": 1 passed, 3 failed, ")
    assert lines[1].startswith(DEVICES[1] + ": lost; last heard: Bringup/")
    assert lines[2].startswith(DEVICES[2] + ": 1 passed, 3 failed, ")
    assert status == 3
    of_all = cases(tmp_path / "results/all.xml")
    assert len(of_all) == 4 + 1 + 4
    assert of_all[DEVICES[1] + ": no report/device"] == ["error"]


def test_ctrl_c_ends_the_runs_of_all(tmp_path):
    status, out, err = on_rack("bash", "-c", """
        timeout --preserve-status -s INT 2 "$@"; echo $?
        for device in 127.0.0.1:5601 127.0.0.1:5602; do
            until adb -s $device shell cat /data/local/tmp/fptest/r.jsonl | grep '"finish"'; do
                sleep 0.05
            done
        done""", "bash", ADB_ALL, PLAN, "demo/Endurance", devices=2, cwd=tmp_path)

    assert out.startswith("130\n")
    assert out.count('"finished":false,"reason":"interrupted by SIGHUP"') == 2
    assert (status, err) == (0, "")


@pytest.mark.parametrize("words, complaint", [
    ((), "it takes a plan and paths, as plan.xml root/group"),
    (("nowhere.xml", "demo/Bringup"), "nowhere.xml: no such plan"),
])
def test_wrong_usage_gets_one_line(words, complaint):
    assert run(ADB_ALL, *words) == (2, "", f"lab/adb-all: {complaint}\n")


def test_without_a_device_it_says_so(tmp_path):
    outcome = on_rack("sh", "-c", 'adb disconnect >&2; exec "$@"', "sh", ADB_ALL, PLAN,
                      "demo/Bringup", devices=1, cwd=tmp_path)

    assert outcome.status == 3
    assert outcome.err.endswith("lab/adb-all: adb lists no device\n")


@pytest.mark.parametrize("words", [(), ("3",), ("0", "true"), ("x", "true")])
def test_a_rack_has_a_number_and_a_command(words):
    assert run(TREE / "lab/virtual-rack", *words) == (
        2, "", "lab/virtual-rack: it takes a number of devices and a COMMAND, as 3 "
               "lab/adb-all plan.xml root/group\n")
