# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""ssh to virtual devices, as engines use it."""
import subprocess

import pytest

from support.outside import eventually, run, started
from support import ssh


@pytest.fixture(scope="module")
def rack(tmp_path_factory):
    with ssh.devices(tmp_path_factory.mktemp("rack"), 2) as devices:
        yield devices


def test_each_session_is_in_its_device(rack):
    for vendor, device in enumerate(rack):
        status, out, err = run(*device.ssh(
            "hostname; pwd; command -v fptest; cat /etc/vorlane/sysparms/*; exit 7"))
        assert out.startswith("quillmark\n/data/local/tmp\n/system/bin/fptest\n"), err
        assert f"<vendor>{vendor}</vendor>" in out
        assert (status, err) == (7, "")


def test_a_lost_connection_leaves_the_device(rack, tmp_path):
    with started(*rack[1].ssh("touch begun; sleep 100"), stderr=subprocess.DEVNULL) as client:
        assert eventually(lambda: run(*rack[1].ssh("test -e begun")).status == 0)
        rack[1].lose_connections()
        assert client.wait(20) == 255
    assert run(*rack[1].ssh("cd /data/local/tmp && ls")).out == "begun\n"


def test_what_one_writes_is_not_on_the_other(rack, tmp_path):
    (tmp_path / "there").write_text("of 1\n")
    words = [word if word != "-p" else "-P" for word in rack[0].ssh()[:-1]]
    assert run("scp", *words[1:], tmp_path / "there", "root@127.0.0.1:there").status == 0
    assert run(*rack[0].ssh("cat /data/local/tmp/there")).out == "of 1\n"
    assert run(*rack[1].ssh("cat /data/local/tmp/there")).status == 1
