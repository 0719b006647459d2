# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""Android.bp, which builds the library in Android's own tree as CMake builds it here."""
import json
import re
import shlex

from libraries import entries_of
from support.outside import BUILD, TREE, output_of

BLUEPRINT = TREE / "Android.bp"
# How CMake compiles the library: for each unit, the words of its command.
COMMANDS = [shlex.split(unit["command"])
            for unit in json.loads((BUILD / "compile_commands.json").read_text())
            if " -o CMakeFiles/quillmark.dir/" in unit["command"]]


def strings_of(name):
    """The strings of a property of the library."""
    library = BLUEPRINT.read_text().partition("\ncc_library_shared {")[2]
    value = re.search(rf"\n    {name}: (\[[^]]*\]|[^\n]*)", library)[1]
    return sorted(re.findall('"([^"]*)"', value))


def ends_of(beginning, words):
    """The ends of the words that begin so."""
    return sorted(word.removeprefix(beginning) for word in words
                  if word.startswith(beginning))


def test_it_is_formatted_as_androids_own():
    assert output_of("bpfmt", "-d", BLUEPRINT) == ""


def test_it_compiles_what_cmake_does():
    sources = [source for command in COMMANDS for source in ends_of(f"{TREE}/", command)]
    assert sources
    assert strings_of("srcs") == sorted(sources)


def test_it_compiles_as_cmake_does():
    # Android's build says these itself, or they are GCC's alone
    others = {"-fPIC", f"-ffile-prefix-map={TREE}/=", "-Wno-restrict"}
    flags = [word for word in COMMANDS[0] if re.match("-[fW]", word) and word not in others]
    assert strings_of("cflags") == sorted([*flags, "-Os"])

    assert strings_of("cpp_std") == ends_of("-std=", COMMANDS[0])
    assert strings_of("stl") == ["none"]
    exported = strings_of("export_include_dirs")
    assert exported == ["src"]
    assert (sorted(strings_of("local_include_dirs") + exported) ==
            ends_of(f"-I{TREE}/", COMMANDS[0]))


def test_it_links_what_the_library_needs():
    needed = {need.partition(".so")[0]
              for need in entries_of(BUILD / "libquillmark.so", "NEEDED")}
    # the C library is linked to everything there
    assert strings_of("shared_libs") == sorted(needed - {"libc"})
    assert strings_of("export_shared_lib_headers") == ["libmxml"]
