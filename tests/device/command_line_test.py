# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What device/run has against a command line, before it starts anything."""
import pathlib
import shlex
import shutil

import pytest

from support.outside import DEVICE_RUN, TREE, make_program, run


def assert_refused(words, *complaints, program=DEVICE_RUN, **others):
    said = "".join(f"device/run: {complaint}\n" for complaint in complaints)
    assert run(program, *words, **others) == (125, "", said)


@pytest.mark.parametrize("line, complaint", [
    ("", "no COMMAND given; see device/run --help"),
    ("--vendor 1 --", "no COMMAND given; see device/run --help"),
    ("--speed 9 -- true", "unknown option '--speed'; see device/run --help"),
    ("--speed=9 -- true", "unknown option '--speed=9'; see device/run --help"),
    ("--vendor 1a -- true", "--vendor wants a whole number, not '1a'"),
    ("--vendor '' -- true", "--vendor wants a whole number, not ''"),
    ("--vendor=x=1 -- true", "--vendor wants a whole number, not 'x=1'"),
    ("--android 8 -- true", "--android wants 5, 7, 9 or 14, not '8'"),
    ("--android= -- true", "--android wants 5, 7, 9 or 14, not ''"),
    ("--bin /dev/null -- true", "--bin /dev/null: no such directory"),
    ("--bin /dev -- true", "--bin /dev: the device has its own directory of that name"),
    ("--bin one --bin=other -- true",
     "--bin is given twice, as one and as other; it takes one"),
    ("--data README.md/data -- true", "--data README.md/data: cannot be made"),
    ("--data README.md -- true", "--data README.md: not a directory"),
    ("--out README.md -- true", "--out README.md: not a directory"),
    ("--build /usr -- true",
     "nothing is built in /usr; build first, or name the build with --build DIR"),
])
def test_a_bad_command_line_gets_one_line_and_status_125(line, complaint):
    assert_refused(shlex.split(line), complaint, cwd=TREE)


@pytest.mark.parametrize("option", ["--data", "--out", "--bin", "--build", "--vendor", "--android",
                                    "--adb"])
def test_every_option_wants_an_argument(option):
    assert_refused([option], f"{option} needs an argument; see device/run --help")


@pytest.mark.parametrize("option", ["--data", "--out", "--bin", "--build"])
def test_no_directory_has_an_empty_name(option):
    for words in ([option, ""], [f"{option}="]):
        assert_refused([*words, "--", "true"], f"{option} wants a directory, not an empty "
                       "name: is a shell variable not set?")
    assert_refused([option, "--", "true"], f"{option} wants a directory, not '--': is a "
                   "shell variable not set?")


def test_the_environment_may_name_the_build():
    assert_refused(["true"], "nothing is built in /nowhere; build first, or name the build "
                   "with --build DIR", env={"QUILLMARK_BUILD": "/nowhere"})


@pytest.mark.usefixtures("device")
@pytest.mark.parametrize("variable", ["POSIXLY_CORRECT=1", "SHELLOPTS=posix:errexit:noglob"])
def test_the_environment_changes_nothing_of_its_shell(variable):
    assert run("env", variable, DEVICE_RUN, "--", "echo", "on").out == "on\n"


def test_without_a_build_named_it_is_the_release_build_of_its_own_tree(tmp_path):
    shutil.copytree(TREE / "device", tmp_path / "device")

    assert_refused(["true"], f"nothing is built in {tmp_path}/build/release; build first, "
                   "or name the build with --build DIR",
                   program=tmp_path / "device/run", env={"QUILLMARK_BUILD": ""})


def test_help_fits_a_terminal_and_names_every_option():
    status, out, err = run(DEVICE_RUN, "--help")

    assert (status, err) == (0, "")
    assert max(map(len, out.splitlines())) <= 80
    for text in ("--data DIR", "--out DIR", "--bin DIR", "--vendor N", "--android N",
                 "--adb PORT", "--build DIR", "--in-place", "--help", "125", "127"):
        assert text in out


# ---- directories that the device may write to ------------------------------------------

@pytest.mark.parametrize("option", ["--data", "--out"])
@pytest.mark.parametrize("directory", [
    "/", "//", "/usr", "/usr/../usr/local/x", "/etc/vorlane", "/bin", "/lib", "/dev",
    "/home", "/tmp", "/var", "/var/lib", "/proc/self", "/opt",
    "/usr/quillmark-must-not-make-this"])
def test_no_directory_of_the_system_may_be_written_to(option, directory):
    assert_refused([option, directory, "--", "true"],
                   f"{option} {directory}: a directory of the system; name one of your own")
    assert not pathlib.Path("/usr/quillmark-must-not-make-this").exists()


def test_a_directory_is_judged_by_where_a_link_leads(tmp_path):
    link = tmp_path / "link"
    link.symlink_to("/")

    assert_refused(["--out", link, "--", "true"],
                   f"--out {link}: a directory of the system; name one of your own")


@pytest.mark.parametrize("option", ["--data", "--out"])
def test_no_directory_is_made_where_the_device_has_its_own(option):
    directory = pathlib.Path("/system/quillmark-must-not-make-this")

    assert_refused([option, directory, "--", "true"],
                   f"{option} {directory}: the device has its own directory of that name")
    assert not directory.exists()


def test_a_current_directory_that_is_gone_holds_none(tmp_path):
    script = 'mkdir gone && cd gone && rmdir ../gone && exec "$0" --out x -- true'

    status, _, err = run("sh", "-c", script, DEVICE_RUN, cwd=tmp_path)

    assert status == 125
    assert [line for line in err.splitlines() if not line.startswith("shell-init: ")] == [
        "device/run: the current directory is gone"]  # the other line is bash's


# ---- the user's programs -----------------------------------------------------------------

@pytest.mark.parametrize("name", ["ps", "sh", "grep", "toybox"])
def test_the_devices_own_programs_are_not_replaced(name, tmp_path):
    make_program(tmp_path / name, "")

    assert_refused(["--bin", tmp_path, "--", "true"],
                   f"--bin {tmp_path}: {name} is the device's own and cannot be replaced")


def test_each_program_that_cannot_be_on_the_device_gets_a_line(tmp_path):
    (tmp_path / "MyItem").symlink_to("gone/MyItem")
    (tmp_path / "Other").symlink_to("gone/Other")
    make_program(tmp_path / "ps", "")

    assert_refused(
        ["--bin", tmp_path, "--", "true"],
        f"--bin {tmp_path}: MyItem is a link that leads nowhere: to gone/MyItem",
        f"--bin {tmp_path}: Other is a link that leads nowhere: to gone/Other",
        f"--bin {tmp_path}: ps is the device's own and cannot be replaced")
