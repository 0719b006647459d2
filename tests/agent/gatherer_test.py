# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""A gatherer that a run has left, and whose program is another one now."""
import re
import shutil

import pytest

from support.outside import BUILD, on_device

pytestmark = pytest.mark.usefixtures("device")

PLAN = """<?xml version="1.0"?>
<P><CmdGroup name="G"><Cmd name="SensorProbe" args="--group G --seconds 0"/></CmdGroup></P>
"""


def gatherings(directory, link, change):
    """Of three runs, the change between the last two: how often the gatherer had gathered."""
    (directory / "bin").mkdir()
    for name in ("1.1", "1.2", "bin/SensorProbe"):
        shutil.copy(BUILD / "device/bin/SensorProbe", directory / name)
    (directory / "plan.xml").write_text(PLAN)
    run = "fptest run --plan plan.xml"
    ended = on_device("sh", "-c", f"{link}; {run}; {run}; sleep 0.1; {change}; {run}",
                      options=("--bin", directory / "bin", "--out", directory), cwd=directory)
    assert ended.status == 0, ended.out
    return re.findall(r"gathering (\d+)", ended.out), ended.err


LINK = "ln -sfn ../1.1 bin/SensorProbe"


@pytest.mark.parametrize("link, change", [
    (LINK, "ln -sfn ../1.2 bin/SensorProbe"), (LINK, "mv 1.2 1.1"),
    ("ln -s 1.1 now; ln -sfn ../now bin/SensorProbe", "ln -sfn 1.2 now")],
    ids=["link", "behind a link", "link to a link"])
def test_is_ended_where_its_link_leads_to_another_file(tmp_path, link, change):
    assert gatherings(tmp_path, link, change) == (
        ["1", "2", "1"], "fptest: the running gatherer is ended first: its program has been "
                         "replaced since it started\n")


def test_goes_on_where_nothing_has_changed(tmp_path):
    assert gatherings(tmp_path, LINK, "ln -sfn 1.2 now") == (["1", "2", "3"], "")
