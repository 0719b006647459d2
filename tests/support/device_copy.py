# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""A copy of a device's /system, made of this machine's programs."""
import platform
import shutil
import struct

from support.outside import make_program, on_device

BITS64 = {"x86_64": 62, "aarch64": 183}
SHELL = shutil.which("mksh")


def elf_head(machine, is_64=True):
    return struct.pack("<4sBBB9xHH", b"\x7fELF", 2 if is_64 else 1, 1, 1, 3, machine)


def make_system(made):
    """A copy of a device's /system, in which nothing lacks."""
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


def with_system(system, *command, options=(), **others):
    return on_device(*command, options=("--system", system, *options), **others)
