# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""fptest where the device's own ps does not answer the library."""
import json
import re

import pytest

from support.outside import BUILD, make_program, on_device

pytestmark = pytest.mark.usefixtures("device")

SAYS_NOTHING = "#!/system/bin/sh\necho 'ps: bad arguments' >&2\nexit 1\n"
PLAN = """<P><CmdGroup name="G"><Cmd name="SensorProbe" args="--group G --seconds 0.1"/>
<Cmd name="BurnIn" args="--group G --seconds 60"/></CmdGroup></P>"""


@pytest.fixture(name="run")
def run_of_a_plan(tmp_path):
    """Runs PLAN, and gives what fptest said, the results, and the library's log."""
    def run(*options, script=SAYS_NOTHING):
        (tmp_path / "bin").mkdir()
        make_program(tmp_path / "bin/ps", script)
        (tmp_path / "plan.xml").write_text(PLAN)
        outcome = on_device("fptest", "run", "--plan", "plan.xml", "--json", "results", "--log",
                            "log", "--timeout", "2", "--grace", "9", *options, "P/G",
                            options=("--out", tmp_path, "--bin", tmp_path / "bin"))
        events = [json.loads(line) for line in (tmp_path / "results").read_text().splitlines()]
        ends = [event for event in events if event["event"] == "end"]
        return outcome, ends, (tmp_path / "log").read_text()
    return run


def test_its_own_answers_in_its_place_and_it_says_so(run):
    outcome, ends, log = run("--repeat", "2")

    assert outcome.err.splitlines().count(
        f"fptest: this device's ps does not answer the library: "
        f"{BUILD}/libexec/quillmark/bin/ps is used instead") == 1
    assert [end["outcome"] for end in ends] == ["passed", "timed out"] * 2
    assert all(end["seconds"] < 2.9 for end in ends), "the library's own stop ends an item"
    assert re.findall("row=(.)", log) == ["0", "1"]
