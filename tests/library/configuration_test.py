# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What the configuration takes and what it refuses: the Mini-XML, the platform's libraries
and the NDK that are named."""
import os

import pytest
from support.outside import TREE, configure

TOOLCHAIN = "build/cmake/android.toolchain.cmake"


def include(module, directory, options):
    """What comes of one of cmake/ in a project with those variables; in these,
    HERE is the directory. Mini-XML's headers up to 2.7 do not say their version."""
    headers = {"2.7": "extern mxml_node_t\t*mxmlGetFirstChild(mxml_node_t *node);",
               "2.5": "extern mxml_node_t\t*mxmlFindElement(mxml_node_t *node);"}
    for version in "2.6 2.12 3.0 3.2 3.3 4.0".split():
        major, minor = version.split(".")
        headers[version] = (
            f"#  define MXML_MAJOR_VERSION {major}\n#define MXML_MINOR_VERSION {minor}\n")
    for version, text in headers.items():
        (directory / version).mkdir()
        (directory / version / "mxml.h").write_text(text)
    for header in "mxml_whitespace.h sockwrap.h sysparm.h".split():
        (directory / header).touch()
    (directory / "one.so").touch()
    (directory / "CMakeLists.txt").write_text(f"""
cmake_minimum_required(VERSION 3.25)
project(tried NONE)
include("{TREE}/cmake/{module}.cmake")
message("is ${{MINIXML_LIBRARY}}")
""")
    options = (option.replace("HERE", str(directory)).replace("TREE", str(TREE))
               for option in options.split())
    return configure("build", *(f"-D{option}" for option in options), cwd=directory)


@pytest.mark.parametrize("version", ["2.7", "2.12", "3.0", "3.3"])
def test_mini_xml_from_2_7_to_3_may_be_named_by_relative_paths(version, tmp_path):
    status, said = include(
        "MiniXml", tmp_path, f"MINIXML_INCLUDE_DIR={version} MINIXML_LIBRARY=one.so")
    assert status == 0, said
    assert f" is {tmp_path}/one.so " in said


@pytest.mark.parametrize("module, options, complaint", [
    ("MiniXml", "MINIXML_INCLUDE_DIR=HERE/3.2 MINIXML_LIBRARY=HERE/absent.so",
     "MINIXML_LIBRARY names no file: HERE/absent.so "),
    ("MiniXml", "MINIXML_INCLUDE_DIR=HERE/3.2 MINIXML_LIBRARY=HERE",
     "MINIXML_LIBRARY names no file: HERE "),
    ("MiniXml", "MINIXML_INCLUDE_DIR=HERE/absent MINIXML_LIBRARY=HERE/one.so",
     "MINIXML_INCLUDE_DIR has no mxml.h: HERE/absent "),
    *[("MiniXml", f"MINIXML_INCLUDE_DIR=HERE/{version} MINIXML_LIBRARY=HERE/one.so",
       f"is Mini-XML {named}, but Quillmark uses the interface of 2.7 to 3.x: install "
       "libmxml-dev, or set MINIXML_INCLUDE_DIR and MINIXML_LIBRARY")
      for version, named in (("2.5", "before 2.7"), ("2.6", "2.6"), ("4.0", "4.0"))],
    *[("Vorlane", f"VORLANE_INCLUDE_DIR=TREE/vorlane VORLANE_LIBRARIES=HERE/one.so;{other}",
       f"VORLANE_LIBRARIES names no file by its whole path: {other}; several are separated "
       "by ';'")
      for other in ("/absent/two.so", "HERE")],
    ("Vorlane", "VORLANE_INCLUDE_DIR=HERE", "VORLANE_INCLUDE_DIR has no vr_log.h: HERE"),
    ("Vorlane", "VORLANE_INCLUDE_DIR=TREE/vorlane VORLANE_LIBRARIES=HERE/one.so "
     "QUILLMARK_BUILD_TESTS=ON",
     "set QUILLMARK_BUILD_TESTS to OFF, or VORLANE_LIBRARIES to nothing")])
def test_what_cannot_be_used_is_named(module, options, complaint, tmp_path):
    status, said = include(module, tmp_path, options)
    assert status != 0
    assert complaint.replace("HERE", str(tmp_path)) in said


# ---- Android's presets ---------------------------------------------------------------

@pytest.mark.parametrize("preset, abi", [
    ("android-arm64", "arm64-v8a"), ("android-armv7", "armeabi-v7a"),
    ("android-x86_64", "x86_64"), ("android-x86", "x86")])
def test_a_preset_asks_the_ndk_for_its_machine_and_no_cpp_runtime(preset, abi, tmp_path):
    (tmp_path / TOOLCHAIN).parent.mkdir(parents=True)
    (tmp_path / TOOLCHAIN).write_text(
        'message(FATAL_ERROR "asked: ${ANDROID_ABI} ${ANDROID_PLATFORM} ${ANDROID_STL} '
        '${CMAKE_BUILD_TYPE}")\n')
    said = configure(tmp_path / "built", "--preset", preset,
                     env={"ANDROID_NDK_ROOT": tmp_path})[1]
    assert f"asked: {abi} android-28 none MinSizeRel" in said


@pytest.mark.parametrize("ndk, complaint", [
    ("", "names no NDK: ''"),
    ("HERE/none", "names no NDK: 'HERE/none'"),
    # it leads there from the tree's root, where CMake is started
    ("RELATIVE", "is not an absolute path: 'RELATIVE'")])
def test_an_ndk_that_is_missing_is_asked_for(ndk, complaint, tmp_path):
    (tmp_path / TOOLCHAIN).parent.mkdir(parents=True)
    (tmp_path / TOOLCHAIN).write_text('message(FATAL_ERROR "read")\n')

    def place(text):
        relative = os.path.relpath(tmp_path, TREE)
        return text.replace("HERE", str(tmp_path)).replace("RELATIVE", relative)

    status, said = configure(tmp_path / "built", "--preset", "android-arm64",
                             env={"ANDROID_NDK_ROOT": place(ndk)})
    assert status != 0
    assert (f"ANDROID_NDK_ROOT {place(complaint)}; set it to the directory that holds "
            f"{TOOLCHAIN}") in said
