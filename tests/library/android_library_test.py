# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What becomes of the library where clang, lld, musl and the linker's options of an
Android preset take the place of an NDK."""
import platform
import re
import shutil

import pytest
from libraries import INTERFACE, entries_of, exports_of, make_platform_libraries
from support.outside import CACHE, TREE, output_of

MUSL = "x86_64-linux-musl"
# those of an NDK's toolchain file
NDK_FLAGS = ("-DANDROID -fdata-sections -ffunction-sections -funwind-tables "
             "-fstack-protector-strong -no-canonical-prefixes -D_FORTIFY_SOURCE=2 "
             "-Wformat -Werror=format-security")
NDK_LINKER_FLAGS = ("-Wl,--build-id=sha1 -Wl,--no-rosegment -Wl,--fatal-warnings "
                    "-Qunused-arguments -Wl,--no-undefined")
TOOLCHAIN = f"""
set(CMAKE_SYSTEM_NAME Android)
set(CMAKE_SYSTEM_VERSION 1)
set(CMAKE_C_COMPILER clang)
set(CMAKE_CXX_COMPILER clang++)
set(CMAKE_C_COMPILER_TARGET x86_64-linux-android28)
set(CMAKE_CXX_COMPILER_TARGET x86_64-linux-android28)
set(CMAKE_TRY_COMPILE_TARGET_TYPE STATIC_LIBRARY)
set(CMAKE_CXX_FLAGS_INIT "-nostdlibinc -nostdinc++ -isystem /usr/include/{MUSL} {NDK_FLAGS}")
set(CMAKE_SHARED_LINKER_FLAGS_INIT
  "-nostdlib -fuse-ld=lld {NDK_LINKER_FLAGS} -L/usr/lib/{MUSL} -lc")
"""


pytestmark = pytest.mark.skipif(platform.machine() != "x86_64",
                                reason="the emulator's preset, but another machine")


def build(directory, *options):
    """Builds the emulator's preset with those options. Gives the place."""
    toolchain = directory / "build/cmake/android.toolchain.cmake"
    toolchain.parent.mkdir(parents=True)
    toolchain.write_text(TOOLCHAIN)
    # alone, without its neighbours
    shutil.copy(CACHE["MINIXML_INCLUDE_DIR"] + "/mxml.h", directory)
    built = directory / "built"
    output_of("cmake", "--preset", "android-x86_64", "-B", built,
              f"-DMINIXML_INCLUDE_DIR={directory}",
              f"-DMINIXML_LIBRARY={CACHE['MINIXML_LIBRARY']}", *options,
              cwd=TREE, env={"ANDROID_NDK_ROOT": directory})
    output_of("cmake", "--build", built, "--target", "quillmark")
    return built


def expect_small_and_for_16_kilobyte_pages(library):
    listing = output_of("readelf", "--segments", "--sections", "--wide", library)
    assert set(re.findall(r"^ *LOAD .* (\S+)$", listing, re.M)) == {"0x4000"}
    assert ".symtab" not in listing
    assert ".eh_frame" not in listing
    assert library.stat().st_size <= 24 * 1024


def test_it_is_a_small_one_for_16_kilobyte_pages_on_the_devices_platform(tmp_path):
    built = build(tmp_path, f"-DVORLANE_LIBRARIES={make_platform_libraries(tmp_path)}")
    library = built / "libquillmark.so"
    assert not library.is_symlink(), "Android knows no versions of libraries"
    assert entries_of(library, "SONAME") == ["libquillmark.so"]
    assert (entries_of(library, "NEEDED") ==
            ["libc.so", "libmxml.so.1", "libplatform.so", "libplatformlog.so"])
    assert exports_of(library) == INTERFACE
    expect_small_and_for_16_kilobyte_pages(library)


def test_so_is_the_platforms_library_for_linux_and_own_flags_are_added_to_the_ndks(tmp_path):
    # without the NDK's, neither would it compile nor link
    built = build(tmp_path, "-DCMAKE_C_FLAGS=-DMINE", "-DCMAKE_CXX_FLAGS=-DMINE",
                  "-DCMAKE_SHARED_LINKER_FLAGS=-Wl,-z,nodelete")
    expect_small_and_for_16_kilobyte_pages(built / "libvorlane.so")
    assert entries_of(built / "libquillmark.so", "NEEDED") == [
        "libc.so", "libmxml.so.1", "libvorlane.so"]
    assert "NODELETE" in output_of("readelf", "--dynamic", built / "libquillmark.so")
    compiled = (built / "compile_commands.json").read_text()
    assert compiled.count(" -DMINE ") == compiled.count('"command": ')
