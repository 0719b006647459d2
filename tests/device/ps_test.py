# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""quillmark-ps, which is the virtual device's ps."""
import re
import shutil

import pytest

from support.outside import BUILD, PS_HEADER, output_of, shell, way
from support.ps_list import names, own_processes, processes

pytestmark = pytest.mark.usefixtures("device")

PS = BUILD / "libexec/quillmark/bin/ps"


def test_it_prints_the_old_toolboxs_columns():
    parent, child = own_processes("ps; :")

    if way() == "namespace":
        assert parent.user == child.user == "root"
    assert child.parent == parent.pid
    assert (parent.name, child.name) == ("sh", "ps")
    assert int(child.size) > int(child.resident) > 0


def test_it_lists_by_process_id():
    ids = [int(each.pid) for each in own_processes("sleep 9 & sleep 9 & sleep 9 & ps; :")]

    assert len(ids) == 5
    assert ids == sorted(ids)


@pytest.mark.parametrize("wanted", ["s", "sle", "sleep"])
def test_it_selects_by_the_start_of_the_last_part_of_the_programs_path(wanted):
    found = names(own_processes(f"sleep 9 & /system/bin/sleep 9 & sleep 0.3; ps {wanted}"))

    assert [name for name in found if name != "sh"] == ["sleep", "/system/bin/sleep"]


@pytest.mark.parametrize("wanted", ["leep", "sleeper", "/system", "Sleep"])
def test_it_does_not_select_by_another_part(wanted):
    assert shell(f"sleep 9 & /system/bin/sleep 9 & sleep 0.3; ps {wanted}")[:2] == (
        0, f"{PS_HEADER}\n")


def test_with_an_empty_name_it_lists_every_process():
    assert names(own_processes("ps ''; :")) == ["sh", "ps"]


def test_a_number_that_is_no_name_is_a_processs_id():
    of_shell, = own_processes("ps $$; :")
    of_program, = own_processes("(exec -a $$ /usr/bin/sleep 9) & sleep 0.3; ps $$; :")

    assert of_shell.name == "sh"
    assert of_program.name == of_program.parent


def test_it_shows_the_program_without_its_arguments():
    found = own_processes("sh -c 'sleep 9; : /system/bin/SensorProbe' & sleep 0.3; ps; :")

    assert names(found).count("sh") == 2


def test_it_shows_the_kernels_name_of_a_zombie():
    # a program that never reaps takes the place of the shell that started a child
    found = own_processes("(sleep 0 & exec sleep 9) & sleep 1; ps sleep")

    assert [(each.state, each.name) for each in found].count(("Z", "sleep")) == 1


def test_it_shows_the_kernels_name_where_the_programs_is_empty():
    found = own_processes("(exec -a '' /usr/bin/sleep 9) & sleep 0.3; ps sleep")

    assert names(found) == ["sleep"]


def test_it_reads_a_kernels_name_that_looks_like_the_next_fields(tmp_path):
    shutil.copy("/usr/bin/sleep", tmp_path / "a) Z 7")

    found, = own_processes("(exec -a '' '/system/bin/a) Z 7' 9) & sleep 0.3; ps 'a)'",
                           options=("--bin", tmp_path))

    assert (found.name, found.state) == ("a) Z 7", "S")
    assert found.parent != "7"


def test_it_keeps_a_process_on_one_line():
    found = own_processes(r"(exec -a $'two\nlines' /usr/bin/sleep 9) & sleep 0.3; ps two")

    assert names(found) == ["two?lines"]


def test_a_query_piped_into_grep_never_finds_its_own_grep():
    assert shell("for i in 1 2 3 4 5 6 7 8 9 10; do ps | grep /system/bin/SensorProbe; "
                 "done")[:2] == (1, "")


@pytest.mark.parametrize("program", ["SensorProbe", "SensorProbe_ca"])
def test_a_query_for_the_gatherer_finds_every_variant_of_it(program):
    line, = shell(f"/system/bin/sh -c '/system/bin/{program} --group g' & sleep 0.4; "
                  "ps | grep /system/bin/SensorProbe").out.splitlines()

    assert line.endswith(f" /system/bin/{program}")


def test_it_skips_processes_that_end_meanwhile():
    # in 300 runs, some meet a process that ends between two looks at it
    status, out, _ = shell(
        "churn() { while :; do /system/bin/true; done; }; churn & first=$!; churn & "
        "i=0; while [ $((i += 1)) -le 300 ]; do ps >/tmp/list || exit 9; done; "
        "kill $! $first; cat /tmp/list")

    assert status == 0
    assert len(processes(*out.splitlines())) >= 5


def test_it_finds_no_program_by_the_arguments_of_another():
    assert names(own_processes("sh -c 'sleep 9; :' /x/Other Other & sleep 0.3; ps Other")) == []


def test_it_needs_nothing_but_the_c_library():
    needed = re.findall(r"NEEDED.*\[(.*)\]", output_of("readelf", "-d", PS))

    assert [name for name in needed if not name.startswith("libc.")] == []


def test_with_options_the_next_ps_in_path_answers():
    other = "#!/system/bin/sh\necho other ps $*\n"
    out = shell(f"mkdir /tmp/other; printf '{other}' >/tmp/other/ps; chmod 700 /tmp/other/ps; "
                "PATH=/system/bin:/tmp/other; ps -A -o PID; ps a b").out

    assert out == "other ps -A -o PID\nother ps a b\n"


@pytest.mark.parametrize("path", ["/system/bin", "/system/bin:/tmp/copy", ""])
@pytest.mark.parametrize("arguments", ["-A", "a b"])
def test_with_options_and_no_other_ps_it_says_so(arguments, path):
    status, out, err = shell("mkdir /tmp/copy; cp /system/bin/ps /tmp/copy/ps; "
                             f"PATH={path}; /system/bin/ps {arguments}")

    assert (status, out) == (1, "")
    assert err.splitlines()[-1] == (
        "ps: it takes one name at most, and no options: ps [NAME]; no other ps in PATH could "
        "be asked")
