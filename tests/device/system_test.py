# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""A device's own userland: --system. Programs of this machine stand in for a device's, as
its loader runs them as well: no file of Android is at hand here."""
import shutil

import pytest

from support.device_copy import elf_head, with_system
from support.outside import make_program

pytestmark = pytest.mark.usefixtures("namespaces")


def test_the_devices_own_programs_and_files_are_there(system):
    outcome = with_system(system, "sh", "-c", "ps; read line </system/etc/hosts; echo $line; "
                                              "whence -p ps grep")
    assert outcome == (0, "the ps of the device\nthe device's hosts\n"
                          "/system/bin/ps\n/system/bin/grep\n", "")


def test_there_is_the_place_for_ones_own_files(system):
    assert with_system(system, "sh", "-c", "echo text >/data/local/tmp/file").status == 0


def test_the_shell_of_the_c_library_is_the_devices(system):
    assert with_system(system, "sh", "-c", f"[[ /bin/sh -ef {system}/bin/mksh ]]").status == 0


def test_no_other_program_is_there_but_fptest(system):
    outcome = with_system(system, "sh", "-c", "for p in /system/bin/*; do echo ${p##*/}; done")
    assert outcome.out.split() == ["fptest", "grep", "linker64", "mksh", "ps", "sh", "toybox"]


def test_programs_and_libraries_of_ones_own_come_first(system, tmp_path):
    own = tmp_path / "own"
    own.mkdir()
    make_program(own / "ps", "#!/system/bin/sh\necho my own ps\n")
    make_program(own / "Item", "#!/system/bin/sh\necho an item\n")
    (own / "libquillmark.so").write_bytes(elf_head(62))
    (own / "libold.so").write_bytes(elf_head(3, is_64=False))
    outcome = with_system(system, "sh", "-c",
                          "ps; Item; for l in /system/lib*/*.so; do echo $l; done",
                          options=("--bin", own))
    assert outcome == (0, "my own ps\nan item\n/system/lib/libold.so\n/system/lib64/libc.so\n"
                          "/system/lib64/libquillmark.so\n", "")


@pytest.mark.parametrize("gone, what", [
    ("bin/linker64", "bin/linker64, which starts its programs"),
    ("lib64/libc.so", "lib64/libc.so, its C library"),
    ("bin/ps", "bin/ps, which the library runs; --bin may have one"),
    ("bin/grep", "bin/grep, which the library runs; --bin may have one"),
])
def test_what_is_missing_is_a_line_each(system, gone, what):
    (system / gone).unlink()
    outcome = with_system(system, "sh", "-c", "true")
    assert (outcome.status, outcome.out) == (125, "")
    assert outcome.err.splitlines()[0] == f"device/run: --system {system}: lacks {what}"


def test_the_c_library_of_android_10_and_newer_is_beside_the_copy(system):
    beside = system.parent / "apex/com.android.runtime"
    for name, target in (("bin/linker64", "bin/linker64"),
                         ("lib64/libc.so", "lib64/bionic/libc.so")):
        (beside / target).parent.mkdir(parents=True)
        (system / name).rename(beside / target)
        (system / name).symlink_to(f"/apex/com.android.runtime/{target}")
    assert with_system(system, "sh", "-c", "[[ -f /system/lib64/libc.so ]]").status == 0

    shutil.rmtree(beside.parent)
    lines = with_system(system, "true").err.splitlines()
    assert len(lines) == 3
    assert lines[2] == (f"device/run: --system {system}: lacks apex beside it: from Android 10 on, "
                        f"adb pull /apex/com.android.runtime {beside}")


def test_a_directory_that_is_no_copy_is_refused(system, tmp_path):
    assert with_system(tmp_path, "true") == (125, "", f"device/run: --system {tmp_path}: no bin "
                                             "in it: not a copy of a device's /system\n")
    (system / "bin/mksh").write_text("#!/bin/sh\n")
    assert with_system(system, "true") == (
        125, "", f"device/run: --system {system}: bin/sh is no program of a device: copy all of "
                 "/system by adb pull\n")


def test_it_is_not_to_be_had_in_place(system):
    assert with_system(system, "true", options=("--in-place",)) == (
        125, "", "device/run: --system needs namespaces: not with --in-place\n")
