# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What scripts/test-android says where it has no NDK or no userland of a device."""
import pytest

from support.outside import TREE, run

SCRIPT = TREE / "scripts/test-android"
SKIPPED = (77, "", "scripts/test-android: skipped: set ANDROID_NDK_ROOT to an NDK, and "
                   "ANDROID_SYSTEM to a copy of a device's /system\n")


@pytest.mark.parametrize("ndk, system", [(None, None), ("/ndk", None), (None, "/system")])
def test_it_names_what_it_needs(ndk, system):
    assert run(SCRIPT, env={"ANDROID_NDK_ROOT": ndk, "ANDROID_SYSTEM": system}) == SKIPPED


@pytest.mark.parametrize("arguments, what", [
    (["--adb"], "--adb needs one SERIAL"),
    (["x86"], "unknown argument 'x86'; see scripts/test-android --help"),
])
def test_wrong_arguments_are_refused(arguments, what):
    assert run(SCRIPT, *arguments) == (2, "", f"scripts/test-android: {what}\n")
