# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""The completion of fptest's command line in bash."""
import re
import shlex

import pytest

from support.outside import BUILD, TREE, content, make_program, run

COMPLETION = shlex.quote(str(TREE / "agent/completion/fptest"))

DEMO = """\
demo/Bringup/SpiCheck   /system/bin/SpiCheck --group Bringup
demo/Bringup/DeadPixel  /system/bin/DeadPixel
demo/Gather/SensorProbe  /system/bin/SensorProbe x  y
"""
HOSTILE = """\
demo/$(touch bad)/`touch bad`;touch bad  x
demo/two words/an item's  y
"""


@pytest.fixture
def offered(tmp_path):
    """What is offered for the last of the words, each of them a word of bash, where fptest
    lists that plan, and notes how it was called."""
    (tmp_path / "plans").mkdir()
    (tmp_path / "plans/demo.xml").touch()
    (tmp_path / "plans/other plan.xml").touch()

    def offered(words, plan=DEMO, status=0, **others):
        (tmp_path / "list").write_text(plan)
        make_program(tmp_path / "fptest", f"""#!/bin/sh
            printf '%s|' "$@" >>calls; echo noise >&2; cat list; exit {status}""")
        outcome = run("/usr/bin/bash", "-u", "-c", f"""
            source {COMPLETION}
            PATH=/usr/bin:/bin
            COMP_WORDS=(./fptest {words})
            COMP_CWORD=$((${{#COMP_WORDS[@]}} - 1))
            _fptest ./fptest
            for one in "${{COMPREPLY[@]}}"; do printf '%s\\n' "$one"; done
            """, cwd=tmp_path, **others)
        assert (outcome.status, outcome.err) == (0, "")
        return outcome.out.splitlines()

    return offered


@pytest.mark.parametrize("command", ["", "run", "check", "show", "html", "report", "measure",
                                     "send", "doctor", "status", "stop"])
def test_every_option_is_offered_that_the_help_tells(offered, command):
    help_text = run(BUILD / "agent/fptest", *command.split(), "--help").out
    options = re.findall(r"^  (?:-\w,)?(-\S+)", help_text, re.MULTILINE)

    assert options
    assert sorted(offered(f"{command} -")) == sorted(options)


@pytest.mark.parametrize("words, expected", [
    # sub-commands
    ("''", ["check", "doctor", "html", "measure", "report", "run", "send", "show", "status", "stop"]),
    ("re", ["report"]),
    ("s", ["send", "show", "status", "stop"]),
    ("x", []),
    # options
    ("run --pl", ["--plain", "--plan"]),
    ("run --plan x demo/Bringup --j", ["--json", "--judge-limits", "--junit"]),
    ("send --p", []),
    # files
    *((words, ["plans"]) for words in (
        "run --plan pl", "run --junit pl", "run --json pl", "run --log pl", "run --expect pl", "run --failed-of pl",
        "run --resume pl",
        "run --plan = pl", "send --log pl", "report --log pl", "check pl", "check x pl",
        "html pl", "html x pl", "show pl", "show --help pl")),
    ("show plans/", ["plans/demo.xml", "plans/other plan.xml"]),
    # directories
    ("run --files pl", ["plans"]),
    ("run --files plans/", []),
    ("run --plan =", ["fptest", "list", "plans"]),
    ("show plans/demo.xml pl", []),
    # codes that the library knows
    ("run --pass-code ''", ["-2", "0", "1"]),
    ("report G I --result -", ["-2"]),
    ("run --hangup ''", ["go-on", "stop"]),
    # numbers, words
    *((words, []) for words in (
        "run --timeout ''", "run --for ''", "run --limit ''", "run --stop-after ''",
        "run --retry ''", "run --repeat ''", "report --progress ''", "run --label ''",
        "stop --wait ''", "status ''",
        "report --description ''", "send ''", "report Bringup SpiCheck ''")),
])
def test_what_needs_no_plan_is_offered_without_one(offered, tmp_path, words, expected):
    assert sorted(offered(words)) == expected
    assert not (tmp_path / "calls").exists()


@pytest.mark.parametrize("plan, words, expected", [
    # node paths
    (DEMO, "run ''", ["demo/Bringup", "demo/Bringup/DeadPixel", "demo/Bringup/SpiCheck",
                      "demo/Gather", "demo/Gather/SensorProbe"]),
    (DEMO, "run --tap demo/Bringup demo/G", ["demo/Gather", "demo/Gather/SensorProbe"]),
    (DEMO, "run demo/Bringup/S", ["demo/Bringup/SpiCheck"]),
    (DEMO, "run demo/Bringup --skip demo/Bringup/S", ["demo/Bringup/SpiCheck"]),
    # the root is called as anyone likes
    (DEMO, "run other/Ga", ["other/Gather", "other/Gather/SensorProbe"]),
    # groups, then their items
    (DEMO, "report ''", ["Bringup", "Gather"]),
    (DEMO, "report --result -2 G", ["Gather"]),
    (DEMO, "report Bringup ''", ["DeadPixel", "SpiCheck"]),
    (DEMO, "report Bringup --progress 100 S", ["SpiCheck"]),
    (DEMO, "report Gather ''", ["SensorProbe"]),
    (DEMO, "report Nothing ''", []),
    # what a plan says is quoted
    (HOSTILE, "run ''", [r"demo/\$\(touch\ bad\)",
                         r"demo/\$\(touch\ bad\)/\`touch\ bad\`\;touch\ bad",
                         r"demo/two\ words", r"demo/two\ words/an\ item\'s"]),
    (HOSTILE, "report tw", [r"two\ words"]),
    (HOSTILE, r"report 'two\ words' an", [r"an\ item\'s"]),
    (HOSTILE, r"run 'demo/two\ wo'", [r"demo/two\ words", r"demo/two\ words/an\ item\'s"]),
    ("demo/G/a,b  x\n", "run demo/G/a,", [r"demo/G/a\,b"]),
    # there is none
    ("", "run ''", []),
])
def test_what_the_stored_plan_has_is_offered(offered, tmp_path, plan, words, expected):
    assert sorted(offered(words, plan)) == expected
    assert content(tmp_path / "calls") == "run|--list|"
    assert not (tmp_path / "bad").exists()


@pytest.mark.parametrize("words", ["run ''", "report ''"])
def test_nothing_is_offered_where_the_plan_cannot_be_read(offered, words):
    assert offered(words, "demo/Bringup/SpiCheck  x\n", status=3) == []


@pytest.mark.parametrize("plan, read", [
    ("plans/demo.xml", "plans/demo.xml"),
    (r"= 'plans/other\ plan.xml'", "plans/other plan.xml"),
    ("'~/a.xml'", "/home/me/a.xml"),
])
def test_the_plan_that_is_named_is_asked_for(offered, tmp_path, plan, read):
    offered(f"run --plan {plan} ''", env={"HOME": "/home/me"})

    assert content(tmp_path / "calls") == f"run|--plan|{read}|--list|"


def test_it_is_bound_to_the_name():
    outcome = run("/usr/bin/bash", "-c", f"source {COMPLETION}; complete -p fptest")

    assert (outcome.status, outcome.out) == (0, "complete -F _fptest fptest\n")
