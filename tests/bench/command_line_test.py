# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What scripts/bench says of arguments that it cannot take."""
import pytest

from support.outside import TREE, run


@pytest.mark.parametrize("arguments, line", [
    ("--fast", "unknown argument '--fast'; see scripts/bench --help"),
    ("--filter", "--filter needs an argument; see scripts/bench --help"),
    ("--filter ", "--filter needs an argument; see scripts/bench --help"),
    ("--filter (", "--filter '(' is not a regular expression"),
    ("--json /tmp", "--json /tmp: this is a directory; name a file in it"),
    ("--json /proc/figures", "--json /proc/figures: this cannot be written"),
    ("--json /nowhere/figures.json",
     "--json /nowhere/figures.json: there is no such directory"),
    ("--write --filter ping",
     "--write keeps all figures: leave out the options that skip some"),
])
def test_a_wrong_argument_gets_one_line(arguments, line):
    assert run(TREE / "scripts/bench", *arguments.split(" ")) == (2, "", f"scripts/bench: {line}\n")
