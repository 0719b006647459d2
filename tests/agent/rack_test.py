# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""lab/: several devices at once, driven by what exists."""
import json
import xml.etree.ElementTree

import pytest

from support.outside import BUILD, TREE, content, make_program, output_of, run

pytestmark = pytest.mark.usefixtures("namespaces")

DEVICES = [f"127.0.0.1:{port}" for port in (5601, 5602, 5603)]
ADB_ALL = TREE / "lab/adb-all"
PLAN = TREE / "plans/demo.xml"


def on_rack(*command, devices=3, **others):
    return run(TREE / "lab/virtual-rack", str(devices), *command, **others)


def suites(path):
    return xml.etree.ElementTree.parse(path).getroot().iter("testsuite")


def cases(path):
    """SUITE/ITEM -> what it became."""
    return {f"{suite.get('name')}/{case.get('name')}": [
        child.tag for child in case if child.tag in ("failure", "error")]
        for suite in suites(path) for case in suite.iter("testcase")}


def errors(path):
    """What the report of several devices says of those without a report."""
    return {suite.get("name").removesuffix(": no report"): suite.find("testcase/error").get("message")
            for suite in suites(path) if suite.get("name").endswith(": no report")}


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


@pytest.mark.parametrize("labels, devices", [
    (("--label", "job=device=7"), DEVICES[:2]),
    (("--label", "device=A7"), ["A7", "A7"]),
    (("--label=device=A7",), ["A7", "A7"]),
])
def test_results_say_whose_they_are(tmp_path, labels, devices):
    assert on_rack(ADB_ALL, PLAN, *labels, "demo/Bringup/SpiCheck", devices=2,
                   cwd=tmp_path).status == 0

    assert [suite.get("hostname") for suite in suites(tmp_path / "results/all.xml")] == devices
    for device, label in zip(DEVICES, devices):
        first = json.loads(content(tmp_path / f"results/{device}.jsonl").partition("\n")[0])
        assert first["labels"]["device"] == label


def test_without_a_path_every_group_is_run(tmp_path):
    on_rack(ADB_ALL, PLAN, "--skip", "demo/Endurance", "--skip", "demo/B*/[!S]*", devices=1,
            cwd=tmp_path)

    assert set(cases(tmp_path / "results/all.xml")) == {
        DEVICES[0] + ": Bringup/SpiCheck", DEVICES[0] + ": Gather/SensorProbe"}


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
    assert len(cases(tmp_path / "results/all.xml")) == 4 + 1 + 4
    assert errors(tmp_path / "results/all.xml") == dict([lines[1].split(": ", 1)])


def test_a_device_that_no_longer_answers_is_lost(tmp_path):
    freeze = """
        "$@" & until grep SpiCheck results/127.0.0.1:5602.log; do sleep 0.05; done >&2
        adb -s 127.0.0.1:5602 shell 'kill -STOP $(pgrep -f device/adbd)' &
        wait %1"""

    status, out, _ = on_rack("bash", "-c", freeze, "bash", ADB_ALL, PLAN, "demo/Bringup",
                             devices=2, cwd=tmp_path, env={"PATIENCE": "4"})

    lines = sorted(out.splitlines())
    assert lines[0].startswith(DEVICES[0] + ": 1 passed, 3 failed, ")
    assert lines[1].startswith(DEVICES[1] + ": lost, it does not answer; last heard: Bringup/")
    assert status == 3
    assert errors(tmp_path / "results/all.xml") == dict([lines[1].split(": ", 1)])


def test_a_device_whose_report_is_cut_on_its_way_is_lost(tmp_path):
    make_program(tmp_path / "adb", """#!/bin/sh
        case $* in *pull*/r.xml*) echo '<?xml' >"$5"; exit 1;; esac
        exec /usr/bin/adb "$@" """)

    status, out, _ = on_rack("sh", "-c", 'PATH=$PWD:$PATH; exec "$@"', "sh", ADB_ALL, PLAN,
                             "demo/Bringup/SpiCheck", devices=1, cwd=tmp_path)

    assert status == 3
    assert out.startswith(DEVICES[0] + ": lost with its report; last heard: status 0 ")
    assert errors(tmp_path / "results/all.xml") == dict([out.rstrip().split(": ", 1)])


def test_a_device_that_runs_for_another_is_left_to_it(tmp_path):
    twice = """
        RESULTS=first "$@" >out & until grep SpiCheck first/127.0.0.1:5601.log; do sleep 0.05; done >&2
        "$@"; status=$?
        wait $! || cat out
        exit $status"""

    status, out, _ = on_rack("bash", "-c", twice, "bash", ADB_ALL, PLAN, "demo/Bringup",
                             devices=1, cwd=tmp_path)

    assert status == 4
    second, first = out.splitlines()
    assert second.startswith(DEVICES[0] + ": another fptest uses it: ")
    assert first.startswith(DEVICES[0] + ": 1 passed, 3 failed, ")
    assert errors(tmp_path / "results/all.xml") == dict([second.split(": ", 1)])
    assert len(cases(tmp_path / "first/all.xml")) == 4
    assert not (tmp_path / f"results/{DEVICES[0]}.jsonl").exists()


def test_calls_at_once_have_each_their_own_reports(tmp_path):
    make_program(tmp_path / "adb", """#!/bin/sh
        case $* in *pull*) touch pulls; until [ -e over ]; do sleep 0.05; done;; esac
        exec /usr/bin/adb "$@" """)
    twice = """
        RESULTS=first PATH=$PWD:$PATH "$@" demo/Bringup/SpiCheck >&2 &
        until [ -e pulls ]; do sleep 0.05; done
        "$@" demo/Gather/SensorProbe >&2 && touch over && wait $! && adb shell ls /data/local/tmp"""

    status, out, err = on_rack("bash", "-c", twice, "bash", ADB_ALL, PLAN, devices=1, cwd=tmp_path)

    assert status == 0, err
    assert cases(tmp_path / "first/all.xml") == {DEVICES[0] + ": Bringup/SpiCheck": []}
    assert cases(tmp_path / "results/all.xml") == {DEVICES[0] + ": Gather/SensorProbe": []}
    assert '"SpiCheck"' in content(tmp_path / f"first/{DEVICES[0]}.jsonl")
    assert out == ""


def test_a_device_that_lacks_a_program_says_so_in_its_report(tmp_path):
    (tmp_path / "plan.xml").write_text('<P><CmdGroup name="G"><Cmd name="Nowhere" args=""/>'
                                       '</CmdGroup></P>')

    status, out, _ = on_rack(ADB_ALL, "plan.xml", devices=1, cwd=tmp_path)

    assert status == 3
    assert "Nowhere" in out
    assert errors(tmp_path / "results/all.xml") == dict([out.rstrip().split(": ", 1)])


def test_a_device_without_fptest_is_broken_and_not_busy(tmp_path):
    make_program(tmp_path / "adb", """#!/bin/bash
        exec /usr/bin/adb "${@/fptest status/no-such-fptest status}" """)

    status, out, _ = on_rack("bash", "-c", 'PATH=$PWD:$PATH "$@"', "bash", ADB_ALL, PLAN,
                             devices=1, cwd=tmp_path)

    assert status == 3
    assert "no-such-fptest" in out and "another" not in out
    assert errors(tmp_path / "results/all.xml") == dict([out.strip().split(": ", 1)])


def test_a_report_whose_pull_is_interrupted_is_pulled_again(tmp_path):
    make_program(tmp_path / "adb", """#!/bin/bash
        case $* in *pull*r.xml*) test -e pulled || { : >pulled; exit 1; } ;; esac
        exec /usr/bin/adb "$@" """)

    status, out, _ = on_rack("bash", "-c", 'PATH=$PWD:$PATH "$@"', "bash", ADB_ALL, PLAN,
                             "demo/Bringup/SpiCheck", devices=1, cwd=tmp_path)

    assert (status, cases(tmp_path / "results/all.xml")) == (
        0, {DEVICES[0] + ": Bringup/SpiCheck": []}), out


def test_a_reader_that_leaves_early_costs_nothing(tmp_path):
    make_program(tmp_path / "adb", """#!/bin/sh
        case $* in *:5602*"fptest run"*) until [ -e read ]; do sleep 0.05; done;; esac
        exec /usr/bin/adb "$@" """)
    script = """
        PATH=$PWD:$PATH timeout 20 "$@" | { head -n 1; exec <&-; touch read; }
        exit "${PIPESTATUS[0]}" """

    status, out, err = on_rack("bash", "-c", script, "bash", ADB_ALL, PLAN, "demo/Bringup/DeadPixel",
                               devices=2, cwd=tmp_path)

    assert (status, out.count("\n"), err) == (1, 1, "")
    assert cases(tmp_path / "results/all.xml") == {
        device + ": Bringup/DeadPixel": ["failure"] for device in DEVICES[:2]}


def test_a_device_with_nothing_to_do_is_not_lost(tmp_path):
    twice = """
        "$@" demo/Bringup/SpiCheck >&2
        adb push results/127.0.0.1:5601.jsonl /data/local/tmp/before.jsonl >&2
        exec "$@" --resume /data/local/tmp/before.jsonl"""

    status, out, _ = on_rack("bash", "-c", twice, "bash", ADB_ALL, PLAN, devices=1, cwd=tmp_path)

    assert (status, out) == (
        0, DEVICES[0] + ": fptest: /data/local/tmp/before.jsonl: that run has finished: nothing "
        "to do\n")
    assert not cases(tmp_path / "results/all.xml")


def test_a_device_that_takes_no_plan_in_time_is_lost(tmp_path):
    freeze = """
        adb -s 127.0.0.1:5601 shell 'kill -STOP $(pgrep -f device/adbd)' & sleep 0.5
        exec "$@" """

    status, out, _ = on_rack("bash", "-c", freeze, "bash", ADB_ALL, PLAN, "demo/Bringup",
                             devices=1, cwd=tmp_path, env={"PATIENCE": "1"})

    assert (status, out) == (3, f"{DEVICES[0]}: lost; last heard: no answer within 1 s\n")


# It wants a key that it never takes. A token more than adb asked for would make it begin anew.
ASKS_FOR_A_KEY = """
import socket, struct
with socket.create_server(("127.0.0.1", 5700)) as listening:
    client, _ = listening.accept()
    packets = client.makefile("rb")
    auth, token, public_key, kind = int.from_bytes(b"AUTH", "little"), 1, 3, 0
    while kind != public_key:
        _, kind, _, size, _, _ = struct.unpack("<6I", packets.read(24))
        packets.read(size)
        if kind != public_key:
            client.sendall(struct.pack("<6I", auth, token, 0, 20, 0, auth ^ 0xffffffff) + bytes(20))
    packets.read()
"""


def test_a_device_that_is_not_ready_is_named_and_lost(tmp_path):
    connect = """
        python3 -c "$0" &
        until adb connect 127.0.0.1:5700 | grep authenticate; do sleep 0.05; done >&2
        until adb devices | grep unauthorized; do sleep 0.05; done >&2
        exec "$@" """

    status, out, _ = on_rack("bash", "-c", connect, ASKS_FOR_A_KEY, ADB_ALL, PLAN,
                             "demo/Bringup/SpiCheck", devices=1, cwd=tmp_path)

    lines = sorted(out.splitlines())
    assert lines[0].startswith(DEVICES[0] + ": 1 passed, 0 failed, ")
    assert lines[1] == "127.0.0.1:5700: lost; last heard: adb lists it as unauthorized"
    assert status == 3
    assert cases(tmp_path / "results/all.xml") == {
        DEVICES[0] + ": Bringup/SpiCheck": [], "127.0.0.1:5700: no report/device": ["error"]}
    assert errors(tmp_path / "results/all.xml") == dict([lines[1].split(": ", 1)])
    page = run(BUILD / "agent/fptest", "html", *sorted((tmp_path / "results").glob("*.jsonl"))).out
    assert "127.0.0.1:5700" in page


def interrupted(tmp_path, script, devices):
    """Where an earlier run has left a good all.xml."""
    (tmp_path / "results").mkdir()
    (tmp_path / "results/all.xml").write_text("<testsuites/>")
    return on_rack("bash", "-c", script, "bash", ADB_ALL, PLAN, "demo/Endurance",
                   devices=devices, cwd=tmp_path)


# of its group, as a terminal does, and of itself alone
@pytest.mark.parametrize("end", ["timeout --preserve-status -s INT 3",
                                 "timeout --preserve-status -s HUP 3",
                                 "timeout --preserve-status --foreground -s TERM 3"])
def test_an_interruption_ends_the_runs_and_pulls_their_reports(tmp_path, end):
    status, out, _ = interrupted(tmp_path, f'exec {end} "$@"', 2)

    assert status == 130
    assert [line.partition("; ")[0] for line in sorted(out.splitlines())] == [
        device + ": interrupted" for device in DEVICES[:2]]
    of_all = cases(tmp_path / "results/all.xml")
    for device in DEVICES[:2]:
        assert '"finished":false,"reason":"interrupted by SIGHUP"' in content(
            tmp_path / f"results/{device}.jsonl")
        assert of_all[device + ": Endurance/BurnIn"] == ["error"]
    assert not (tmp_path / "results/jobs").exists()


@pytest.mark.parametrize("first, said, reason", [
    (":", "interrupted; ", '"reason":"interrupted by fptest stop"'),
    ("adb shell 'kill -STOP $(pgrep -x fptest)'", "interrupted, its run may go on; ",
     '"event":"start"'),
])
def test_an_interruption_ends_a_run_that_outlives_its_connection(tmp_path, first, said, reason):
    script = """
        "$@" --hangup go-on &
        until adb shell fptest status | grep BurnIn; do sleep 0.05; done >&2
        %s >&2; kill %%1; wait %%1; status=$?
        adb shell fptest status >&2; echo $?; exit $status""" % first

    status, out, _ = interrupted(tmp_path, script, 1)

    line, running = out.splitlines()
    assert status == 130
    assert line.startswith(f"{DEVICES[0]}: {said}last heard: ")
    assert running == ("4" if "may go on" in said else "0")
    assert reason in content(tmp_path / f"results/{DEVICES[0]}.jsonl")
    assert cases(tmp_path / "results/all.xml") == {DEVICES[0] + ": Endurance/BurnIn": ["error"]}


def test_an_interruption_takes_nothing_of_others(tmp_path):
    make_program(tmp_path / "adb", """#!/bin/sh
        case $* in *"fptest run"*) kill $(cat pid); exec sleep 9;; esac
        exec /usr/bin/adb "$@" """)
    script = f"""
        adb push {PLAN} /data/local/tmp/fptest/plan.xml >&2
        adb shell 'cd /data/local/tmp/fptest; fptest run --plan plan.xml --junit r.xml \\
            --json r.jsonl demo/Endurance' >&2 &
        until adb shell fptest status | grep BurnIn; do sleep 0.05; done >&2
        PATH=$PWD:$PATH "$@" & echo $! >pid; wait $!; status=$?
        adb shell 'fptest status >&2; echo $?; ls /data/local/tmp'; exit $status"""

    status, out, _ = interrupted(tmp_path, script, 1)

    assert status == 130
    assert out.splitlines() == [
        DEVICES[0] + ": interrupted; last heard: nothing", "4", "fptest"]
    assert content(tmp_path / f"results/{DEVICES[0]}.jsonl") == ""
    assert errors(tmp_path / "results/all.xml") == {DEVICES[0]: "interrupted; last heard: nothing"}


def test_an_interruption_before_the_first_run_leaves_no_earlier_report(tmp_path):
    make_program(tmp_path / "parallel", "#!/bin/sh\nkill $PPID; exec sleep 0.5\n")
    (tmp_path / "results").mkdir()
    (tmp_path / f"results/{DEVICES[0]}.xml").write_text("<?xml?>\n<testsuites>\n</testsuites>\n")
    (tmp_path / f"results/{DEVICES[0]}.jsonl").write_text("of an earlier run")

    assert on_rack("sh", "-c", 'PATH=$PWD:$PATH; exec "$@"', "sh", ADB_ALL, PLAN, devices=2,
                   cwd=tmp_path) == (130, "", "")

    assert errors(tmp_path / "results/all.xml") == dict.fromkeys(
        DEVICES[:2], "interrupted before it began")
    assert content(tmp_path / f"results/{DEVICES[0]}.jsonl") == ""


FREEZE_AND_INTERRUPT = """
    setsid "$@" & until grep -q BurnIn results/127.0.0.1:5602.log; do sleep 0.05; done
    adb -s 127.0.0.1:5602 shell 'kill -STOP $(pgrep -f device/adbd)' & sleep 0.5
    kill -TERM %1
"""


def test_an_interruption_does_not_wait_long_for_a_device(tmp_path):
    status, out, _ = interrupted(tmp_path, FREEZE_AND_INTERRUPT + "wait %1", 2)

    assert status == 130
    assert f"{DEVICES[0]}: interrupted; last heard: " in out
    assert f"{DEVICES[1]}: interrupted, its run may go on; last heard: " in out
    assert cases(tmp_path / "results/all.xml")[DEVICES[0] + ": Endurance/BurnIn"] == ["error"]
    assert errors(tmp_path / "results/all.xml")[DEVICES[1]].startswith("interrupted, its run may")


@pytest.mark.parametrize("words, patience, complaint", [
    ((), None, "it takes a plan, then paths and options of fptest run"),
    (("nowhere.xml", "demo/Bringup"), None, "nowhere.xml: no such plan"),
    ((TREE, "demo/Bringup"), None, f"{TREE}: no such plan"),
    ((PLAN, "demo/Bringup"), "1m", "PATIENCE is '1m': give a number of seconds"),
])
def test_wrong_usage_gets_one_line(words, patience, complaint):
    assert run(ADB_ALL, *words, env={"PATIENCE": patience}) == (
        2, "", f"lab/adb-all: {complaint}\n")


@pytest.mark.parametrize("directory", ["/proc", "/proc/cpuinfo"])
def test_reports_that_cannot_be_written_are_no_success(directory):
    assert run(ADB_ALL, PLAN, env={"RESULTS": directory}) == (
        3, "", f"lab/adb-all: {directory}: no reports can be written there; name another "
        "directory by RESULTS\n")


def test_its_help_is_its_head():
    outcome = run(ADB_ALL, "--help")

    assert (outcome.status, outcome.err) == (0, "")
    assert outcome.out.startswith("usage: lab/adb-all PLAN [ARGUMENT...]\n")


def test_what_is_quiet_has_passed(tmp_path):
    outcome = on_rack(ADB_ALL, PLAN, "demo/Bringup/SpiCheck", "--quiet", devices=1, cwd=tmp_path)

    assert (outcome.status, outcome.out) == (0, DEVICES[0] + ": all passed\n")


def test_without_a_device_it_says_so(tmp_path):
    (tmp_path / "results").mkdir()
    (tmp_path / "results/all.xml").write_text("of an earlier run")
    outcome = on_rack("sh", "-c", 'adb disconnect >&2; exec "$@"', "sh", ADB_ALL, PLAN,
                      "demo/Bringup", devices=1, cwd=tmp_path)

    assert outcome.status == 3
    assert outcome.err.endswith("lab/adb-all: adb lists no device\n")
    assert not list((tmp_path / "results").iterdir())


def test_what_devices_cost_is_measured():
    table = output_of(TREE / "bench/rack", "2")

    rows = {line[:36].strip(): [float(word) for word in line[36:].split()]
            for line in table.splitlines()[2:]}
    assert rows.pop("devices") == [2]
    headings = [name for name, values in rows.items() if not values]
    assert headings == ["processor time for a device, s", "memory for a device in a run, MiB"]
    assert all(len(rows[name]) == 1 and min(rows[name]) > 0 for name in rows
               if name not in headings), table
    assert max(map(len, table.splitlines()[2:])) <= 80
    # each of the items takes 0.3 s
    assert all(1.2 < seconds < 60 for seconds in rows["a run of four items (1.2 s), s"])


@pytest.mark.parametrize("words", [(), ("3",), ("0", "true"), ("x", "true")])
def test_a_rack_has_a_number_and_a_command(words):
    assert run(TREE / "lab/virtual-rack", *words) == (
        2, "", "lab/virtual-rack: it takes a number of devices and a COMMAND, as 3 "
               "lab/adb-all plan.xml root/group\n")
