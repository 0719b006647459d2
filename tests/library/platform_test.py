# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""A device's platform in the place of the one for Linux."""
from libraries import INTERFACE, PLATFORM, entries_of, exports_of, make_platform_libraries
from support.outside import CACHE, TREE, install_library, output_of


def test_the_platforms_libraries_are_linked_and_those_for_linux_are_not_built(tmp_path):
    libraries = make_platform_libraries(tmp_path)
    prefix = install_library(tmp_path, f"-DVORLANE_LIBRARIES={libraries}")
    library = prefix / "lib/libquillmark.so"
    assert (entries_of(library, "NEEDED") ==
            ["libc.so.6", "libmxml.so.1", "libplatform.so", "libplatformlog.so"])
    assert entries_of(library, "RUNPATH") == []
    assert list((tmp_path / "build").rglob("*vorlane*")) == []
    installed = [path for path in prefix.rglob("lib*.*") if not path.is_symlink()]
    assert installed == [library.resolve()]

    # as the README says that agents are linked with it
    ping = tmp_path / "ping"
    output_of("cc", TREE / "tests/install/consumer/ping.c", "-o", ping,
              f"-I{prefix}/include", f"-L{prefix}/lib", "-lquillmark",
              f"-Wl,-rpath-link,{tmp_path}")
    found = {"LD_LIBRARY_PATH": f"{prefix}/lib:{tmp_path}"}
    assert output_of(ping, env=found) == "Ping Success!\n"


def test_nothing_of_the_platforms_archives_is_exported(tmp_path):
    make_platform_libraries(tmp_path)
    archive = tmp_path / "libplatform.a"
    for name in PLATFORM:
        output_of("cc", "-c", "-fPIC", f"-I{TREE}/vorlane", f"{name}.c", cwd=tmp_path)
        output_of("ar", "rc", archive, f"{name}.o", cwd=tmp_path)
    prefix = install_library(tmp_path, f"-DVORLANE_LIBRARIES={archive}",
                             f"-DMINIXML_LIBRARY={CACHE['MINIXML_ARCHIVE']}")
    library = prefix / "lib/libquillmark.so"
    assert exports_of(library) == INTERFACE
    assert entries_of(library, "NEEDED") == ["libc.so.6"]
