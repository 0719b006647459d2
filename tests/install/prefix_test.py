# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What cmake --install puts where, and what a compiler, pkg-config and find_package make
of it, in a prefix that was moved."""
import os
import pathlib
import re
import tempfile

import pytest
from support.outside import BUILD, CACHE, TREE, configure, on_device, output_of, run

CONSUMER = TREE / "tests/install/consumer"
LIBDIR = CACHE["CMAKE_INSTALL_LIBDIR"]
VERSION = CACHE["CMAKE_PROJECT_VERSION"]
MAJOR = VERSION.partition(".")[0]
FILES = f"""\
bin/fptest
include/quillmark.h
include/vorlane/mxml_whitespace.h
include/vorlane/sockwrap.h
include/vorlane/sysparm.h
include/vorlane/vr_log.h
{LIBDIR}/cmake/quillmark/MiniXml.cmake
{LIBDIR}/cmake/quillmark/quillmarkConfig.cmake
{LIBDIR}/cmake/quillmark/quillmarkConfigVersion.cmake
{LIBDIR}/cmake/quillmark/quillmarkTargets-{CACHE["CMAKE_BUILD_TYPE"].lower()}.cmake
{LIBDIR}/cmake/quillmark/quillmarkTargets.cmake
{LIBDIR}/libquillmark.so -> libquillmark.so.{MAJOR}
{LIBDIR}/libquillmark.so.{MAJOR} -> libquillmark.so.{VERSION}
{LIBDIR}/libquillmark.so.{VERSION}
{LIBDIR}/pkgconfig/quillmark.pc
{LIBDIR}/quillmark/libvorlane.so
libexec/quillmark/bin/ps
share/bash-completion/completions/fptest
share/doc/quillmark/LICENSE
share/man/man1/fptest.1
share/man/man5/fptest-results.5
share/man/man5/quillmark-plan.5
"""
os.environ.pop("LD_LIBRARY_PATH", None)


@pytest.fixture(scope="module", name="prefix")
def moved_prefix():
    with tempfile.TemporaryDirectory(dir=BUILD) as directory:  # which the device shows
        output_of("cmake", "--install", BUILD, "--prefix", f"{directory}/first")
        yield pathlib.Path(directory, "first").rename(f"{directory}/moved")


# ---- what is there -------------------------------------------------------------------

def test_each_file_is_in_its_place(prefix):
    found = output_of("find", ".", "!", "-type", "d", "(", "-type", "l", "-printf",
                      "%P -> %l\\n", "-o", "-printf", "%P\\n", ")", cwd=prefix)
    assert sorted(found.splitlines()) == sorted(FILES.splitlines())


def test_no_path_of_the_tree_or_the_build_or_the_first_prefix_is_named(prefix):
    named = run("grep", "-rlF", "-e", TREE, "-e", BUILD, "-e", prefix.parent / "first", ".",
                cwd=prefix)
    assert named == (1, "", "")


def vorlane_of(program, path=None):
    """Where the loader finds libvorlane.so for a program."""
    listing = output_of("ldd", program, env={"LD_LIBRARY_PATH": path})
    return pathlib.Path(re.search(r"libvorlane\.so => (.+) \(0x", listing)[1]).resolve()


def test_the_platforms_library_takes_the_place_of_the_installed_one(prefix, tmp_path):
    own = prefix / LIBDIR / "quillmark/libvorlane.so"
    platforms = tmp_path / "libvorlane.so"
    platforms.write_bytes(own.read_bytes())
    assert vorlane_of(prefix / "bin/fptest") == own
    assert vorlane_of(prefix / "bin/fptest", tmp_path) == platforms


def test_fptest_runs_from_any_place(prefix):
    fptest = prefix / "bin/fptest"
    assert output_of(fptest, "--version") == f"fptest {VERSION}\n"
    assert "0 errors, 0 warnings" in output_of(fptest, "check", TREE / "plans/demo.xml")
    assert f"{BUILD}/lib" not in output_of("ldd", fptest)


# ---- who builds on it ----------------------------------------------------------------

def expect_agent_works(prefix, *flags):
    """Of the agent that is compiled with these flags."""
    agent = prefix.parent / "agent"
    output_of("cc", "-std=c11", "-Wall", "-Wextra", "-Wpedantic", "-Werror", "-o", agent,
              CONSUMER / "agent.c", *flags, f"-Wl,-rpath,{prefix / LIBDIR}")
    outcome = on_device("/usr/bin/env", "VR_LOG_FILE=/tmp/log", agent)
    assert outcome.status == 0
    assert ('<Cmd name="SpiCheck" args="--group Bringup" progress="100" result="0" '
            'description="chip 0x1a2b answers at 8 MHz"') in " ".join(outcome.out.split())


def test_a_plain_compiler_builds_the_agent_that_the_readme_shows(prefix):
    source = (CONSUMER / "agent.c").read_text()
    shown = source[source.index("#include"):]
    assert f"```c\n{shown}```" in (TREE / "README.md").read_text()
    expect_agent_works(prefix, f"-I{prefix}/include", f"-L{prefix / LIBDIR}", "-lquillmark")


def test_pkg_config_tells_a_compiler_its_flags(prefix, tmp_path):
    # by another name: pkg-config prints nothing if a path has an apostrophe
    link = tmp_path / "prefix"
    link.symlink_to(prefix)

    def ask(*options):
        return output_of("pkg-config", *options, "quillmark",
                         env={"PKG_CONFIG_PATH": link / LIBDIR / "pkgconfig"})

    expect_agent_works(prefix, *ask("--cflags", "--libs").split())
    assert pathlib.Path(ask("--variable=libdir").strip()).resolve() == prefix / LIBDIR
    assert ask("--modversion") == f"{VERSION}\n"
    assert "mxml" not in ask("--libs")
    assert "-lmxml" in ask("--libs", "--static")


@pytest.mark.parametrize("version, is_taken", [
    ("1.0.0", True), ("0.9", False), ("1.999", False), ("2.0", False)])
def test_find_package_refuses_another_major_version(version, is_taken, prefix, tmp_path):
    status, said = configure(tmp_path, "-S", CONSUMER, f"-DCMAKE_PREFIX_PATH={prefix}",
                             f"-DWANTED={version}")
    assert (status == 0) == is_taken, said
    assert (f"quillmarkConfig.cmake, version: {VERSION}" in said) != is_taken


def test_find_package_says_that_mini_xml_is_missing(prefix, tmp_path):
    # nothing but what is named is looked for in a root that does not exist
    status, said = configure(
        tmp_path, "-S", CONSUMER, f"-Dquillmark_DIR={prefix / LIBDIR}/cmake/quillmark",
        "-DCMAKE_FIND_ROOT_PATH=/nowhere", "-DCMAKE_FIND_ROOT_PATH_MODE_INCLUDE=ONLY",
        "-DCMAKE_FIND_ROOT_PATH_MODE_LIBRARY=ONLY")
    assert status != 0
    assert ("Reason given by package: Mini-XML is missing: install libmxml-dev, or set "
            "MINIXML_INCLUDE_DIR and MINIXML_LIBRARY") in said
