# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""quillmark-ps where it needs namespaces: in place another program is the shell's guard, and
scripts have its shell's name."""
import re

import pytest

from support.outside import BUILD, PS_HEADER, make_program, run, shell
from support.ps_list import names, own_processes

pytestmark = pytest.mark.usefixtures("device", "namespaces")

PS = BUILD / "libexec/quillmark/bin/ps"
LONG = "ItemWithANameOfMoreThanTwentyEightCharacters"


@pytest.mark.parametrize("first_line", ["#!/system/bin/sh", "#!/system/bin/sh -e"])
def test_it_finds_a_script_by_its_own_name(tmp_path, first_line):
    make_program(tmp_path / LONG, f"{first_line}\nsleep 9; :\n")

    found = own_processes(f"/system/bin/{LONG} one two & sleep 0.3; ps {LONG[:28]}",
                          options=("--bin", tmp_path))

    assert names(found) == [f"/system/bin/{LONG}"]


def test_it_finds_a_script_by_its_path_and_not_by_its_interpreter(tmp_path):
    make_program(tmp_path / "SensorProbe", "#!/system/bin/sh\nsleep 9; :\n")
    start = "/system/bin/SensorProbe --group g & sleep 0.3; "

    line, = shell(start + "ps | grep /system/bin/SensorProbe",
                  options=("--bin", tmp_path)).out.splitlines()
    assert line.endswith(" /system/bin/SensorProbe")
    assert "/system/bin/SensorProbe" not in names(
        own_processes(start + "ps sh", options=("--bin", tmp_path)))


def test_it_finds_a_script_whose_interpreter_is_emulated(tmp_path):
    # as qemu's arguments look: itself, the program's path, the program's arguments
    make_program(tmp_path / "emulated", f"echo {LONG[:15]} >/proc/$$/comm; sleep 9; :\n")
    make_program(tmp_path / LONG,
                 "#!/system/bin/sh\nexec -a qemu sh /system/bin/emulated sh -e $0\n")

    found = own_processes(f"/system/bin/{LONG} & sleep 0.3; ps {LONG[:28]}",
                          options=("--bin", tmp_path))

    assert names(found) == [f"/system/bin/{LONG}"]


# The first process of a namespace, which is not to be looked into; the words after the
# option run without privileges, on a /proc that hides what they may not look into.
HIDDEN_FIRST = """
import ctypes, subprocess, sys
ctypes.CDLL(None).prctl(4, 0)
subprocess.run(["mount", "-o", "remount,hidepid=" + sys.argv[1], "/proc"], check=True)
sys.exit(subprocess.run(["setpriv", "--inh-caps=-all", "--bounding-set=-all", *sys.argv[2:]],
                        stdout=sys.stderr).returncode)
"""


def beside_hidden_first(hidepid, *command):
    return run("unshare", "--user", "--map-root-user", "--pid", "--fork", "--mount-proc",
               "/usr/bin/python3", "-c", HIDDEN_FIRST, hidepid, *command)


def test_it_says_where_proc_hides_processes():
    status, _, err = beside_hidden_first("4", PS, "sleep")

    assert (status, err) == (
        0, "ps: /proc hides other users' processes (hidepid): they are not listed; run as root, "
           f"or with the group that /proc is mounted with\n{PS_HEADER}\n")


@pytest.mark.parametrize("ps", ["libexec/quillmark/bin/ps", "device/android/ps5",
                                "device/android/ps7", "device/android/ps9",
                                "device/android/ps14"])
def test_no_ps_finds_what_proc_hides(ps):
    of_first = re.compile(r"^\S+ +1 .*python3 *$", re.M)

    assert of_first.search(beside_hidden_first("0", BUILD / ps).err)
    assert not of_first.search(beside_hidden_first("4", BUILD / ps).err)
