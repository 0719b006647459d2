# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""fptest where the device's own ps does not answer the library."""
import json
import re
import shutil

import pytest

from support.outside import BUILD, make_program, on_device

pytestmark = pytest.mark.usefixtures("namespaces")

OWN_PS = BUILD / "libexec/quillmark/bin/ps"
PLAN = """<P><CmdGroup name="G"><Cmd name="SensorProbe" args="--group G --seconds 0.1"/>
<Cmd name="BurnIn" args="--group G --seconds 60"/></CmdGroup></P>"""


def run(directory, *options, fptest="fptest", release="14", device=()):
    """What fptest says, the outcomes and times of the items, and what the library logs."""
    (directory / "plan.xml").write_text(PLAN)
    outcome = on_device(fptest, "run", "--plan", "plan.xml", "--json", "results", "--log", "log",
                        "--timeout", "1.5", "--grace", "9", *options, "P/G",
                        options=("--out", directory, "--android", release, *device))
    ends = [(end["outcome"], end["seconds"])
            for end in map(json.loads, (directory / "results").read_text().splitlines())
            if end["event"] == "end"]
    return outcome.err.splitlines(), ends, (directory / "log").read_text()


@pytest.mark.parametrize("release", ["5", "7", "9", "14"])
def test_its_own_answers_in_its_place_and_it_says_so(tmp_path, release):
    said, ends, log = run(tmp_path, "--repeat", "2", release=release)

    assert said.count("fptest: this device's ps does not answer the library: "
                      f"{OWN_PS} is used instead") == 1
    assert [outcome for outcome, _ in ends] == ["passed", "timed out"] * 2
    assert all(seconds < 2.9 for _, seconds in ends), "the library's own stop ends an item"
    assert "target process not exist" not in log.split("FPTEST_SuspendItemExecute", 1)[1]
    assert re.findall("row=(.)", log) == ["0", "1"]


SCRIPT = """#!/usr/bin/python3
import socket, subprocess, time
while True:
    try:
        connection = socket.create_connection(("127.0.0.1", 34952))
        if connection.recv(13) != b"gather again!":
            continue
    except OSError:
        time.sleep(0.02)
        continue
    subprocess.run(["fptest", "report", "G", "SensorProbe", "--progress", "100", "--result", "0"])
"""


@pytest.fixture(name="programs")
def programs_with_a_script(tmp_path):
    """A directory of it, as the gatherer."""
    directory = tmp_path / "programs"
    directory.mkdir()
    make_program(directory / "SensorProbe", SCRIPT)
    return directory


def test_a_gatherer_that_is_a_script_is_triggered_again(tmp_path, programs):
    _, ends, log = run(tmp_path, "--repeat", "2", device=("--bin", programs))

    assert [outcome for outcome, _ in ends] == ["passed", "timed out"] * 2
    assert re.findall("row=(.)", log) == ["0", "1"]


def test_a_script_that_runs_already_is_not_taken_for_another_gatherer(tmp_path, programs):
    (tmp_path / "plan.xml").write_text(PLAN)

    status, _, err = on_device(
        "sh", "-c", "fptest run --plan plan.xml P/G/SensorProbe && fptest run P/G/SensorProbe",
        options=("--out", tmp_path, "--android", "14", "--bin", programs))

    assert status == 0
    assert "a gatherer is running already" not in err


def test_without_one_it_says_what_follows(tmp_path):
    shutil.copy(BUILD / "agent/fptest", tmp_path / "fptest")

    said, ends, log = run(tmp_path, fptest="./fptest")

    assert said == ["fptest: this device's ps does not answer the library, and there is no "
                    "quillmark-ps beside fptest: fptest doctor says what that leads to"]
    assert [outcome for outcome, _ in ends] == ["passed", "timed out"]
    assert ends[1][1] < 2.9, "fptest itself ends the item"
    assert "target process not exist" in log.split("FPTEST_SuspendItemExecute", 1)[1]


def test_what_would_be_run_is_listed_without_asking(tmp_path):
    (tmp_path / "plan.xml").write_text(PLAN)

    outcome = on_device("fptest", "run", "--list", "--plan", "plan.xml",
                        options=("--out", tmp_path, "--android", "14"))

    assert (outcome.status, outcome.err) == (0, "")


def test_one_beside_fptest_is_found(tmp_path):
    shutil.copy(BUILD / "agent/fptest", tmp_path / "fptest")
    (tmp_path / "quillmark/bin").mkdir(parents=True)
    shutil.copy(OWN_PS, tmp_path / "quillmark/bin/ps")

    said, ends, _ = run(tmp_path, fptest="./fptest")

    assert said == ["fptest: this device's ps does not answer the library: "
                    f"{tmp_path}/quillmark/bin/ps is used instead"]
    assert ends[1][1] < 2.9


def test_without_a_path_the_other_programs_are_found_too(tmp_path):
    (tmp_path / "plan.xml").write_text(PLAN)

    outcome = on_device("sh", "-c", "unset PATH; /system/bin/fptest run --repeat 2 --log log "
                        "--plan plan.xml P/G/SensorProbe",
                        options=("--out", tmp_path, "--android", "14"))

    assert outcome.status == 0, outcome.err
    assert re.findall("row=(.)", (tmp_path / "log").read_text()) == ["0", "1"]
