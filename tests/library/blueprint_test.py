# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""Android.bp, which builds in Android's own tree what CMake builds here, as it does."""
import ast
import collections
import json
import pathlib
import re
import shlex

import pytest
from libraries import entries_of
from support.outside import BUILD, TREE, output_of

BLUEPRINT = TREE / "Android.bp"
UNITS = json.loads((BUILD / "compile_commands.json").read_text())
ITEMS = [path.stem for path in (TREE / "device/items").glob("[A-Z]*.cpp")]

# For each module, the file that CMake makes of it, and the targets it is made of.
Made = collections.namedtuple("Made", "file targets")
MODULES = {
    "libquillmark": Made("libquillmark.so", ["quillmark"]),
    "libvorlane_linux": Made("libvorlane.so", ["vorlane"]),
    "fptest": Made("agent/fptest", ["fptest_parts", "fptest", "fmt_once"]),
    "quillmark-ps": Made("libexec/quillmark/bin/ps", ["quillmark_ps"]),
    **{item: Made(f"device/bin/{item}", ["device_item", item]) for item in ITEMS}}


def read_modules():
    """The properties of each module, those of its defaults among them."""
    modules = {}
    for body in re.findall(r"^cc_\w+ {\n(.*?)^}", BLUEPRINT.read_text(), re.M | re.S):
        body = re.sub("//.*", "", body)
        found = re.findall(r'^    (\w+): (\[.*?\]|".*?"|true),$', body, re.M | re.S)
        module = {name: ast.literal_eval(value.replace("true", "True")) for name, value in found}
        for other in module.pop("defaults", []):
            for name, value in modules[other].items():
                if isinstance(value, list):
                    module[name] = value + module.get(name, [])
                else:
                    module.setdefault(name, value)
        modules[module.pop("name")] = module
    return modules


READ = read_modules()


def units_of(target):
    """How CMake compiles it: the file and the words of the command of each unit."""
    units = [(unit["file"], shlex.split(unit["command"])) for unit in UNITS
             if f" -o CMakeFiles/{target}.dir/" in unit["command"]]
    assert units, target
    return units


def sources_of(target):
    """Those in the tree that are compiled, also as a part of a larger unit."""
    for file, _ in units_of(target):
        if "/Unity/" in file:
            yield from re.findall('^#include "(.*)"', pathlib.Path(file).read_text(), re.M)
        elif not file.startswith(f"{BUILD}/"):
            yield file


def ends_of(beginning, words):
    """The ends of the words that begin so."""
    return sorted(word.removeprefix(beginning) for word in words
                  if word.startswith(beginning))


def test_it_is_formatted_as_androids_own():
    assert output_of("bpfmt", "-d", BLUEPRINT) == ""


def test_every_program_and_library_of_a_device_has_a_module():
    made = {name for name, module in READ.items() if "srcs" in module}
    assert made - {"quillmark_item"} == {*MODULES}


@pytest.mark.parametrize("name", MODULES)
def test_it_compiles_what_cmake_does(name):
    written = [path for pattern in READ[name]["srcs"] for path in TREE.glob(pattern)]
    compiled = [pathlib.Path(source) for target in MODULES[name].targets
                for source in sources_of(target)]
    assert compiled
    assert sorted(written) == sorted(compiled)


@pytest.mark.parametrize("name", MODULES)
def test_it_compiles_as_cmake_does(name):
    module = READ[name]
    command = units_of(MODULES[name].targets[0])[0][1]
    # Android's build says these itself, or they are GCC's alone, or CMake's
    others = {"-fPIC", f"-ffile-prefix-map={TREE}/=", "-Wno-restrict", "-DNDEBUG"}
    flags = [word for word in command if re.match("-[fWD]", word)
             and word not in others and not word.endswith("_EXPORTS")]
    assert sorted(module["cflags"]) == sorted(flags + ["-Os"] * (module.get("stl") == "none"))
    assert [module["cpp_std"]] == ends_of("-std=", command)
    # what CMake takes for granted, Android does not
    with_runtime = "-fno-exceptions" not in flags
    assert module.get("rtti", False) == with_runtime
    assert module.get("cppflags", []) == ["-fexceptions"] * with_runtime

    directories = module.get("local_include_dirs", []) + module.get("export_include_dirs", [])
    for library in module.get("shared_libs", []):
        directories += READ.get(library, {}).get("export_include_dirs", [])
    assert (sorted(TREE / directory for directory in directories) ==
            sorted(path for path in map(pathlib.Path, ends_of("-I", command))
                   if path.is_relative_to(TREE)))


@pytest.mark.parametrize("name", MODULES)
def test_it_links_what_is_needed(name):
    file = BUILD / MODULES[name].file
    needed = {need.partition(".so")[0] for need in entries_of(file, "NEEDED")}
    # what is linked to everything there
    needed -= {"libc", "libgcc_s", "libm", "libstdc++"}
    assert sorted(READ[name].get("shared_libs", [])) == sorted(needed)
    assert READ[name].get("stem", name) == file.stem
    links = [path.name for path in file.parent.glob(f"{name}_*") if path.is_symlink()]
    assert READ[name].get("symlinks", []) == sorted(links)


def test_what_the_header_includes_comes_with_the_library():
    assert READ["libquillmark"]["export_shared_lib_headers"] == ["libmxml"]
