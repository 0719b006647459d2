# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""The root that engines run in: nothing of the machine is there."""
import os
import pathlib

from support.outside import TREE, output_of


def test_network_and_processes_are_its_own():
    assert len(output_of("ip", "-brief", "link").splitlines()) == 1
    assert output_of("ip", "-brief", "address").split()[:3] == ["lo", "UNKNOWN", "127.0.0.1/8"]
    assert len(list(pathlib.Path("/proc").glob("[0-9]*"))) < 50


def test_tree_and_root_stay_as_they_are():
    assert not os.access(TREE / "scripts", os.W_OK)
    assert not os.access("/usr", os.W_OK)
