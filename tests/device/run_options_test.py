# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What goes onto the device and what comes from it: --bin, --data, --out."""
import shutil

import pytest

from support.outside import BUILD, DEVICE_RUN, TREE, content, make_program, on_device, run

pytestmark = pytest.mark.usefixtures("device")

RUN_A_PLAN = ("fptest", "run", "--plan", "plans/demo.xml", "demo/Bringup/SpiCheck")


# ---- --out -------------------------------------------------------------------------------

@pytest.fixture
def caller(tmp_path):
    """The caller's directory, with a plan."""
    (tmp_path / "plans").mkdir()
    shutil.copy(TREE / "plans/demo.xml", tmp_path / "plans")
    return tmp_path


def with_out(out, caller, *command):
    return on_device(*command, options=("--out", out), cwd=caller)


def test_out_is_made_and_is_the_working_directory_that_stays(caller):
    assert with_out("made/results", caller, "sh", "-c", "pwd; echo text >file")[:2] == (
        0, f"{caller}/made/results\n")
    assert content(caller / "made/results/file") == "text\n"


def test_out_may_be_the_callers_directory(caller):
    assert with_out(".", caller, "sh", "-c", "cat plans/demo.xml >copy").status == 0
    assert content(caller / "copy") == content(TREE / "plans/demo.xml")


def test_out_is_written_through_a_link(caller):
    (caller / "real").mkdir()
    (caller / "link").symlink_to("real")

    assert with_out("link", caller, "touch", "file").status == 0
    assert (caller / "real/file").exists()


@pytest.mark.parametrize("out", ["results", "."])
def test_out_keeps_the_reports_of_a_plan_in_the_callers_directory(out, caller):
    status, _, err = with_out(out, caller, *RUN_A_PLAN, "--timeout", "30", "--junit",
                              "results.xml", "--json", "results.jsonl")

    assert status == 0
    assert "fptest: " not in err
    assert "SpiCheck" in content(caller / out / "results.xml")
    assert "SpiCheck" in content(caller / out / "results.jsonl")


def test_with_out_a_plan_is_looked_for_there_and_then_in_the_callers_directory(caller):
    for command in ("check", "show"):
        assert with_out("results", caller, "fptest", command, "plans/demo.xml").status == 0

    (caller / "results/plans").mkdir()
    (caller / "results/plans/demo.xml").write_text("no plan")
    assert with_out("results", caller, "fptest", "check", "plans/demo.xml").status == 1


def test_with_out_a_command_is_looked_for_there_and_then_in_the_callers_directory(caller):
    make_program(caller / "mine", "#!/system/bin/sh\npwd\n")
    assert with_out("results", caller, "./mine").out == f"{caller}/results\n"

    make_program(caller / "results/mine", "#!/system/bin/sh\necho another\n")
    assert with_out("results", caller, "./mine").out == "another\n"


# ---- where results go without it ---------------------------------------------------------

def test_results_on_the_devices_own_disks_are_said_to_be_lost_with_it():
    status, _, err = on_device(*RUN_A_PLAN, "--junit", "/data/vorlane/r.xml")

    assert status == 0
    assert err.splitlines()[-1] == (
        "fptest: --junit /data/vorlane/r.xml is lost when the virtual device ends; "
        "device/run --out DIR gives a working directory that stays")


def test_nothing_is_said_of_results_that_stay(tmp_path):
    status, _, err = on_device(*RUN_A_PLAN, "--junit", "/data/vorlane/r.xml", "--log",
                               "/dev/null", options=("--data", tmp_path / "data"))

    assert status == 0
    assert "fptest: " not in err
    assert (tmp_path / "data/r.xml").exists()


# ---- --bin -------------------------------------------------------------------------------

def with_bin(directory, *command):
    """The status, the output, and the lines of the errors."""
    status, out, err = on_device(*command, options=("--bin", directory))
    return status, out, err.splitlines()


def test_a_users_program_that_is_not_executable_is_named_and_left_out(tmp_path):
    make_program(tmp_path / "MyItem", "#!/system/bin/sh\necho mine\n")
    (tmp_path / "Other").write_text("#!/system/bin/sh\n")
    (tmp_path / "README").write_text("not a program")
    (tmp_path / "sources").mkdir()

    assert with_bin(tmp_path, "sh", "-c", "ls /system/bin | grep -xE 'MyItem|Other|README|"
                    "sources'; MyItem") == (0, "MyItem\nmine\n", [
        f"device/run: --bin {tmp_path}: not executable, and left out: Other, README"])


@pytest.mark.parametrize("name", ["MyItem", "MyItem_ca"])
def test_a_users_program_may_be_a_link_to_one_outside_of_the_directory(name, tmp_path):
    own = tmp_path / "own"
    own.mkdir()
    make_program(tmp_path / "built", "#!/system/bin/sh\necho ${0##*/}\n")
    (own / "MyItem").symlink_to(tmp_path / "built")
    (own / "MyItem_ca").symlink_to("MyItem")

    assert with_bin(own, name)[1] == f"{name}\n"


def test_users_programs_whose_interpreter_is_missing_are_named(tmp_path):
    for name, text in {"A": "#!/nowhere/python3\n", "B": "#! /usr/bin/env nowhere -x\n",
                       "C": "#!/system/bin/sh\r\n", "D": "#!/system/bin/sh -e\necho mine\n",
                       "E": "#!/usr/bin/env -S sh\n", "F": "no script\n"}.items():
        make_program(tmp_path / name, text)

    assert with_bin(tmp_path, "D") == (0, "mine\n", [
        f"device/run: --bin: {name} cannot be started: there is no {missing} on the device"
        for name, missing in (("A", "/nowhere/python3"), ("B", "nowhere"),
                              ("C", "/system/bin/sh\\r"))])


@pytest.mark.parametrize("line, missing", [
    ("#!/nowhere/bash\n", "/nowhere/bash"), ("#!/system/bin/sh\r\n", "/system/bin/sh\\r")])
def test_a_program_whose_interpreter_is_missing_is_no_command(line, missing, tmp_path):
    make_program(tmp_path / "mine", line)

    for name, place in (("./mine", {"cwd": tmp_path}),
                        ("mine", {"options": ("--bin", tmp_path)})):
        status, _, err = on_device(name, **place)

        assert status == 127
        assert err.splitlines()[-1] == (
            f"device/run: {name} cannot be started: there is no {missing} on the device")


def test_bin_may_hold_no_program_at_all(tmp_path):
    assert with_bin(tmp_path, "true") == (0, "", [])


# ---- values ------------------------------------------------------------------------------

def test_values_may_follow_an_equals_sign(tmp_path):
    make_program(tmp_path / "MyItem", "#!/system/bin/sh\necho x >file\n"
                                      "cp /etc/vorlane/sysparms/* /data/vorlane\n")

    assert run(DEVICE_RUN, f"--bin={tmp_path}", f"--data={tmp_path}/data", "--vendor=2",
               f"--out={tmp_path}/out", f"--build={BUILD}", "MyItem").status == 0
    assert content(tmp_path / "out/file") == "x\n"
    assert "<vendor>2<" in content(tmp_path / "data/vr_common_cfg.xml")
