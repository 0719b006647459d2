# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What scripts/test-lab says where it cannot run."""
import os

from support.outside import TREE, make_program, run

SCRIPT = TREE / "scripts/test-lab"


def skipped(why):
    return 77, "", f"scripts/test-lab: skipped: {why}\n"


def test_it_needs_root_and_namespaces(tmp_path):
    make_program(tmp_path / "unshare", "#!/bin/sh\nexit 1\n")
    why = ("namespaces are refused here" if os.geteuid() == 0 else
           "it installs packages in a root of its own, as root")
    assert run(SCRIPT, env={"PATH": f"{tmp_path}:{os.environ['PATH']}"}) == skipped(why)


def test_server_takes_no_argument():
    assert run(SCRIPT, "--server", "x") == (
        2, "", "scripts/test-lab: --server takes no argument\n")
