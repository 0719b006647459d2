# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What lab/lava/signals makes of fptest's JSON lines, in the shells that it may meet, and
what the pattern of lines.yaml finds in its plain lines."""
import json
import re

import pytest
import yaml

from support.outside import DEVICE_RUN, TREE, make_program, on_device, output_of

SIGNALS = TREE / "lab/lava/signals"
SAY = '#!/bin/sh\necho "$*"\n'

# What passes at its second try, where it has one.
FLAKY = """#!/system/bin/sh
[ -e tried ] && exec fptest report Bringup Flaky --progress 100 --result 0
touch tried
exec fptest report Bringup Flaky --progress 100 --result 1
"""

END = {"event": "end", "index": 0, "group": "Bringup", "item": "Volts", "round": 1,
       "outcome": "passed", "progress": "100", "result": "0", "description": None,
       "reason": None, "start": "2026-11-23T08:20:36.290Z", "seconds": 0.5, "exit_status": 0,
       "signal": None, "left_running": [], "measurements": [], "directory": None, "files": [],
       "warning": None, "output": ""}


@pytest.fixture(params=["dash", "bash", "mksh", "device"])
def said(request, tmp_path):
    """What it has lava-test-case say of lines."""
    make_program(tmp_path / "lava-test-case", SAY)
    words = (request.param, SIGNALS)
    if request.param == "device":
        words = (DEVICE_RUN, "--bin", tmp_path, "--", "sh", SIGNALS)

    def said(*lines):
        text = "".join(f"{line}\n" for line in lines)
        return output_of(*words, text=text, env={
            "PATH": f"{tmp_path}:/usr/sbin:/usr/bin"}).splitlines()

    return said


def line(**others):
    return json.dumps(END | others, separators=(",", ":"), ensure_ascii=False)


def measured(name, value, unit):
    return {"name": name, "value": value, "unit": unit, "low": 1.0, "high": None}


def run_each_outcome(tmp_path, *options):
    make_program(tmp_path / "Flaky", FLAKY)
    plan = tmp_path / "plan.xml"
    plan.write_text('<TestPlan><CmdGroup name="Bringup">' + "".join(
        f'<Cmd name="{item}" args="--group Bringup"/>'
        for item in ("SpiCheck", "Flaky", "DeadPixel", "FingerWait", "QuietRun", "BurnIn"))
        + "</CmdGroup></TestPlan>")
    (tmp_path / "expected").write_text("*/Bringup/DeadPixel known\n")
    status, out, err = on_device(
        "fptest", "run", *options, "--plan", "plan.xml", "--retry", "1",
        "--expect", "expected", "--stop-after", "2", options=("--bin", tmp_path, "--out", tmp_path),
        cwd=tmp_path)
    assert status == 1, err
    return out


def test_each_outcome_of_a_run(said, tmp_path):
    out = run_each_outcome(tmp_path, "--quiet", "--json", "-")

    timeless = [" ".join(word for word in words.split() if word[0] not in "0123456789")
                for words in said(*out.splitlines())]
    assert timeless == [
        "Bringup/SpiCheck --result pass --measurement --units s",
        "Bringup/Flaky --result unknown --measurement --units s",
        "Bringup/DeadPixel --result skip --measurement --units s",
        "Bringup/FingerWait --result fail --measurement --units s",
        "Bringup/QuietRun --result fail --measurement --units s",
        "Bringup/BurnIn --result skip",
        "run --result pass"]


def test_measurements_have_their_items_result(said):
    assert said(line(outcome="failed", measurements=[
        measured("vcore", 1.18, "V"), measured("load", -2e-06, None), measured("r", 3, "°C"),
        measured("odd", 4.0, '}"],<=>')])) == [
            "Bringup/Volts --result fail --measurement 0.5 --units s",
            "Bringup/Volts/vcore --result fail --measurement 1.18 --units V",
            "Bringup/Volts/load --result fail --measurement -2e-06",
            "Bringup/Volts/r --result fail --measurement 3 --units °C",
            'Bringup/Volts/odd --result fail --measurement 4.0 --units }\\"],___',
            "run --result fail"]


@pytest.mark.parametrize("others", [
    {"output": '","outcome":"failed",\n' * 6000},
    {"description": '","outcome":"failed","seconds":7,"measurements":[1],"directory":'},
    {"output": "\\" * 70000, "warning": '"'},
])
def test_texts_are_no_results(said, others):
    assert said(line(**others))[0] == "Bringup/Volts --result pass --measurement 0.5 --units s"


def test_names_are_of_characters_that_lava_takes(said):
    assert said(line(group='a "b" > \\c', item="x=y"))[0] == (
        "a___b_______c/x_y --result pass --measurement 0.5 --units s")


def test_a_run_without_end_fails(said):
    assert said(line(), '{"event":"finish","finished":false,"reason":"interrupted"}')[1:] == [
        "run --result fail"]
    assert said() == ["run --result fail"]
    assert said("fptest: another fptest is running") == ["run --result fail"]


def test_each_plain_line_of_a_run_is_found(tmp_path):
    out = run_each_outcome(tmp_path, "--plain") + "Bringup/X (round 2): unexpected, 1.5 s: 3 s: a\n"
    parse = yaml.safe_load((SIGNALS.parent / "lines.yaml").read_text())["parse"]
    found = re.findall(parse["pattern"], out.replace("\n", "\r\n"), re.M)

    assert [(item, parse["fixupdict"][result], units) for item, result, _, units in found] == [
        ("Bringup/SpiCheck", "pass", "s"), ("Bringup/Flaky", "unknown", "s"),
        ("Bringup/DeadPixel", "skip", "s"), ("Bringup/FingerWait", "fail", "s"),
        ("Bringup/QuietRun", "fail", "s"), ("Bringup/X", "fail", "s")]
    assert found[-1][2] == "1.5"
    assert all(0 <= float(seconds) < 20 for _, _, seconds, _ in found)
