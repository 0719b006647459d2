# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""A device's own userland: --system. Programs of this machine stand in for a device's, as
its loader runs them as well: no file of Android is at hand here."""
import platform
import shutil
import struct

import pytest

from support.outside import make_program, on_device, output_of

pytestmark = pytest.mark.usefixtures("namespaces")

BITS64 = {"x86_64": 62, "aarch64": 183}
SHELL = shutil.which("mksh")


def elf_head(machine, is_64=True):
    return struct.pack("<4sBBB9xHH", b"\x7fELF", 2 if is_64 else 1, 1, 1, 3, machine)


@pytest.fixture
def system(tmp_path):
    """A copy of a device's /system, in which nothing lacks."""
    made = tmp_path / "pulled/system"
    for directory in ("bin", "lib64", "etc"):
        (made / directory).mkdir(parents=True)
    shutil.copy(SHELL, made / "bin/mksh")
    (made / "bin/sh").symlink_to("mksh")
    (made / "bin/linker64").write_bytes(elf_head(BITS64[platform.machine()]))
    (made / "lib64/libc.so").write_bytes(elf_head(BITS64[platform.machine()]))
    (made / "etc/hosts").write_text("the device's hosts\n")
    shutil.copy(shutil.which("toybox"), made / "bin/toybox")
    (made / "bin/grep").symlink_to("toybox")
    make_program(made / "bin/ps", "#!/system/bin/sh\necho the ps of the device\n")
    return made


def with_system(system, *command, options=(), **others):
    return on_device(*command, options=("--system", system, *options), **others)


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


# Ends with 7.
ARM_PROGRAM = {
    "aarch64": (".globl _start\n_start: mov x0, #7\nmov x8, #93\nsvc #0\n", "linker64", 183),
    "arm": (".globl _start\n_start: mov r0, #7\nmov r7, #1\nsvc #0\n", "linker", 40),
}


@pytest.mark.skipif(platform.machine() != "x86_64" or not shutil.which("qemu-arm"),
                    reason="no qemu for ARM here")
@pytest.mark.parametrize("processor", ARM_PROGRAM)
def test_programs_for_arm_are_run_by_qemu(system, tmp_path, processor):
    text, linker, machine = ARM_PROGRAM[processor]
    library = "lib64" if linker == "linker64" else "lib"
    (tmp_path / "shell.s").write_text(text)
    (system / "bin/sh").unlink()
    output_of("clang", f"--target={processor}-linux-gnu", "-nostdlib", "-static", "-fuse-ld=lld",
              "-o", system / "bin/sh", tmp_path / "shell.s")
    (system / library).mkdir(exist_ok=True)
    (system / library / "libc.so").touch()
    (system / "bin" / linker).touch()
    assert with_system(system, "sh") == (7, "", "")
