# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What is installed of the library alone, with a Mini-XML and the platform's headers that are
named."""
import shutil

import pytest
from support.outside import CACHE, TREE, install_library, output_of, run

LIBDIR = CACHE["CMAKE_INSTALL_LIBDIR"]


@pytest.fixture(scope="module", name="prefix")
def installed_prefix(tmp_path_factory):
    place = tmp_path_factory.mktemp("named")
    (place / "mini").mkdir()
    shutil.copy(CACHE["MINIXML_INCLUDE_DIR"] + "/mxml.h", place / "mini")
    (place / "mini/libmine.so").symlink_to(CACHE["MINIXML_LIBRARY"])
    shutil.copytree(TREE / "vorlane", place / "own", ignore=shutil.ignore_patterns("linux"))
    with (place / "own/vr_log.h").open("a") as header:
        header.write("/* mine */\n")
    return install_library(
        place, "-DCMAKE_DISABLE_FIND_PACKAGE_CLI11=ON",
        f"-DVORLANE_INCLUDE_DIR={place}/own", f"-DMINIXML_INCLUDE_DIR={place}/mini",
        f"-DMINIXML_LIBRARY={place}/mini/libmine.so")


def test_without_the_tools_there_is_no_fptest(prefix):
    assert (prefix / LIBDIR / "libquillmark.so").exists()
    assert (prefix / "share/man/man5/quillmark-plan.5").exists()
    assert list(prefix.rglob("*fptest*")) == []


def test_pkg_config_names_the_mini_xml_that_was_named_but_not_its_place(prefix):
    # it knows no Mini-XML of the machine's
    said = output_of("pkg-config", "--cflags", "--libs", "--static", "quillmark",
                     env={"PKG_CONFIG_LIBDIR": prefix / LIBDIR / "pkgconfig",
                          "PKG_CONFIG_PATH": None})
    assert said.split()[-2:] == ["-lquillmark", "-lmine"]
    named = run("grep", "-rlF", "-e", TREE, "-e", prefix.parent / "mini", ".", cwd=prefix)
    assert named == (1, "", "")


def test_the_platforms_headers_that_were_named_are_installed(prefix):
    assert "/* mine */" in (prefix / "include/vorlane/vr_log.h").read_text()
