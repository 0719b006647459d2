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
    ("--rack", "--rack wants numbers of devices, as 1,3,10,30, not ''"),
    ("--rack 3,", "--rack wants numbers of devices, as 1,3,10,30, not '3,'"),
    ("--rack 0", "--rack wants numbers of devices, as 1,3,10,30, not '0'"),
    ("--rack 1000", "--rack wants numbers of devices, as 1,3,10,30, not '1000'"),
    ("--rack 3 --quick", "--rack measures something else: leave out all but --write"),
    ("--write --filter ping",
     "--write keeps all figures: leave out the options that skip some"),
])
def test_a_wrong_argument_gets_one_line(arguments, line):
    assert run(TREE / "scripts/bench", *arguments.split(" ")) == (2, "", f"scripts/bench: {line}\n")
