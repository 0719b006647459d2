# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""device/run --system with programs for ARM, where qemu can run them."""
import os
import pathlib
import platform
import shutil

import pytest

from support.device_copy import with_system
from support.outside import make_program, output_of

# since 6.7 the kernel has emulators of a user namespace's own
HAS_OWN_EMULATORS = tuple(map(int, platform.release().split(".")[:2])) >= (6, 7)
IS_REGISTERED = pathlib.Path("/proc/sys/fs/binfmt_misc/qemu-aarch64").exists()

pytestmark = [pytest.mark.usefixtures("namespaces"), pytest.mark.skipif(
    platform.machine() != "x86_64" or not shutil.which("qemu-arm") or
    not (HAS_OWN_EMULATORS or IS_REGISTERED), reason="no qemu for ARM here")]

# Ends with 7.
ARM_PROGRAM = {
    "aarch64": (".globl _start\n_start: mov x0, #7\nmov x8, #93\nsvc #0\n", "linker64", 183),
    "arm": (".globl _start\n_start: mov r0, #7\nmov r7, #1\nsvc #0\n", "linker", 40),
}


def make_shell(system, processor):
    text, linker, machine = ARM_PROGRAM[processor]
    library = "lib64" if linker == "linker64" else "lib"
    source = system.parent / "shell.s"
    source.write_text(text)
    (system / "bin/sh").unlink()
    output_of("clang", f"--target={processor}-linux-gnu", "-nostdlib", "-static", "-fuse-ld=lld",
              "-o", system / "bin/sh", source)
    (system / library).mkdir(exist_ok=True)
    (system / library / "libc.so").touch()
    (system / "bin" / linker).touch()


@pytest.mark.parametrize("processor", ARM_PROGRAM)
def test_programs_for_arm_are_run_by_qemu(system, processor):
    make_shell(system, processor)

    assert with_system(system, "sh") == (7, "", "")


def test_a_kernel_without_emulators_of_its_own_is_told_in_one_line(system, tmp_path):
    make_shell(system, "aarch64")
    old = tmp_path / "old"
    old.mkdir()
    # as on a kernel before 6.7
    make_program(old / "unshare", "#!/bin/sh\necho 'mount: permission denied' >&2\nexit 1\n")

    outcome = with_system(system, "sh", env={"PATH": f"{old}:{os.environ['PATH']}"})

    assert outcome == ((7, "", "") if IS_REGISTERED else (
        125, "", f"device/run: --system {system}: its programs are for aarch64, and Linux before "
        "6.7 gives those to an emulator for all of the machine alone: as root, apt-get install "
        "qemu-user-binfmt (mount: permission denied)\n"))
