# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""fptest over adb, as on a device on the desk."""
import contextlib
import json
import re
import xml.etree.ElementTree

import pytest

from support.outside import TREE, at_a_terminal, content, eventually, run, started, status_of

pytestmark = pytest.mark.usefixtures("device")

PLACE = "/data/local/tmp"
REPORTS = f"--json {PLACE}/r.jsonl --junit {PLACE}/r.xml"


@pytest.fixture(autouse=True)
def plan(there):
    there.shell(f"rm -f {PLACE}/*")
    there.output_of("push", TREE / "plans/demo.xml", PLACE + "/demo.xml")


def events(there):
    lines = there.output_of("exec-out", f"cat {PLACE}/r.jsonl").splitlines()
    return [json.loads(line) for line in lines]


@pytest.mark.parametrize("command, status", [
    (f"fptest run --plan {PLACE}/demo.xml demo/Bringup/SpiCheck", 0),
    (f"fptest run --plan {PLACE}/demo.xml demo/Bringup", 1),
    (f"fptest run --plan {PLACE}/demo.xml demo/Nowhere", 2),
    ("rm -f /data/vorlane/src1.xml; fptest run demo/Bringup", 3),
])
def test_the_exit_status_is_fptests(there, command, status):
    assert there.shell(command).status == status


def test_reports_are_fetched(there, tmp_path):
    there.shell(f"fptest run --plan {PLACE}/demo.xml {REPORTS} demo/Bringup")

    there.output_of("pull", f"{PLACE}/r.xml", f"{PLACE}/r.jsonl", tmp_path)

    suite = xml.etree.ElementTree.parse(tmp_path / "r.xml").getroot().find("testsuite")
    assert (suite.get("tests"), suite.get("failures"), suite.get("errors")) == ("4", "2", "1")
    assert json.loads(content(tmp_path / "r.jsonl").splitlines()[-1])["finished"] is True


def test_json_lines_come_as_they_are_written(there):
    out = there.output_of("exec-out", f"fptest run --plan {PLACE}/demo.xml --json - "
                                      "demo/Bringup/SpiCheck")

    assert [json.loads(line)["event"] for line in out.splitlines()][:2] == ["run", "start"]


def test_the_manuals_line_runs_a_group(there, tmp_path):
    (tmp_path / "plan.xml").write_bytes((TREE / "plans/demo.xml").read_bytes())
    line = re.search(r"^printf 'XMLFile.*?send -0$", content(TREE / "docs/fptest.1"),
                     re.S | re.M)[0].replace("\\e", "\\")

    outcome = run("env", *there.variables, "sh", "-c", line, cwd=tmp_path)

    assert outcome.status == 0, outcome.err
    assert "SpiCheck" in there.shell("fptest show").out
    assert "chip 0x1a2b" in there.shell("fptest show").out


# ---- at a terminal -----------------------------------------------------------------------

@contextlib.contextmanager
def endurance_at_a_terminal(there):
    """A run at a terminal, as soon as its view shows the item."""
    words = there.words("shell", "-t", f"TERM=xterm fptest run --plan {PLACE}/demo.xml {REPORTS} "
                                       "demo/Endurance demo/Bringup")
    with at_a_terminal(*words) as (process, terminal):
        shown = b""
        while b"BurnIn" not in shown or b" of 60 s" not in shown:
            shown += terminal.read(4096)
        yield process, terminal, shown


def test_the_live_view_is_shown_at_a_terminal_and_ctrl_c_ends_the_run(there):
    with endurance_at_a_terminal(there) as (process, terminal, shown):
        assert b"\x1b[" in shown  # lines are drawn anew

        terminal.write(b"\x03")
        with contextlib.suppress(OSError):
            while more := terminal.read(4096):
                shown += more

        assert status_of(process) == 130
    assert_interrupted(there, "SIGINT|Ctrl-C")


def test_a_window_that_is_closed_ends_the_run(there):
    with endurance_at_a_terminal(there) as (process, terminal, _):
        terminal.close()
        process.wait(10)

    assert_interrupted(there, "SIGHUP|hang|terminal")


def test_a_client_that_is_killed_ends_the_run(there):
    with started(*there.words("shell", f"fptest run --plan {PLACE}/demo.xml {REPORTS} "
                              "demo/Endurance demo/Bringup"), stdin=-1, stdout=-1) as client:
        assert eventually(lambda: " of 60 s" in there.shell(f"cat {PLACE}/r.jsonl").out)

        client.kill()

    assert_interrupted(there, "SIGHUP|hang|terminal")


def assert_interrupted(there, by):
    """The run ends soon, its reports say so and are whole, and the next run works."""
    assert eventually(lambda: events(there)[-1]["event"] == "finish")
    said = events(there)
    assert said[-1]["finished"] is False
    assert re.search(f"interrupted by.*({by})", said[-1]["reason"])
    outcomes = [event["outcome"] for event in said if event["event"] == "end"]
    assert outcomes == ["stopped"] + 4 * ["not run"]

    report = there.output_of("exec-out", f"cat {PLACE}/r.xml")
    errors = xml.etree.ElementTree.fromstring(report).findall(".//error")
    assert len(errors) == 5
    assert eventually(lambda: there.shell("fptest run demo/Bringup/SpiCheck").status == 0)
