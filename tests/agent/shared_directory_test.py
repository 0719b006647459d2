# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""Two devices that keep their results in one directory."""
import json
import signal

import pytest

from support.outside import content, eventually, run, started, status_of, DEVICE_RUN, TREE

pytestmark = pytest.mark.usefixtures("namespaces")


def test_a_result_file_is_written_by_one_device_at_a_time(tmp_path):
    words = (DEVICE_RUN, "--out", tmp_path, "--", "fptest", "run", "--plan",
             TREE / "plans/demo.xml", "--json", "results.jsonl", "--junit", "results.xml")
    with started(*words, "demo/Endurance/BurnIn") as first:
        assert eventually(lambda: '"start"' in content(tmp_path / "results.jsonl"), 30)
        for name in ("results.jsonl", "results.xml"):
            option = "--json" if name.endswith("l") else "--junit"
            second = run(*words[:-4], option, name, "demo/Bringup/SpiCheck")
            assert second.status == 2
            assert second.err == (f"fptest: {name}: another fptest is writing it; "
                                  "name another file\n")
        other = run(*words[:-4], "--junit", "other.xml", "demo/Bringup/SpiCheck")
        assert other.status == 0, other.err
        first.send_signal(signal.SIGINT)
        assert status_of(first) == 130
    events = [json.loads(line)["event"]
              for line in content(tmp_path / "results.jsonl").splitlines()]
    assert events[0] == "run" and events[-1] == "finish" and events.count("run") == 1
    assert "BurnIn" in content(tmp_path / "results.xml")
