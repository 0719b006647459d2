# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""The device that has namespaces of its own: what it has of the host, and what not."""
import pathlib
import tempfile

import pytest

from support.outside import BUILD, TREE, make_program, on_device, shell

pytestmark = pytest.mark.usefixtures("namespaces")

RUN_A_PLAN = ("fptest", "run", "--plan", "plans/demo.xml", "demo/Bringup/SpiCheck")


@pytest.fixture
def in_tmp():
    """A directory in the host's /tmp."""
    with tempfile.TemporaryDirectory(dir="/tmp") as directory:
        yield pathlib.Path(directory)


@pytest.mark.parametrize("kind", ["pid", "net", "ipc", "uts", "mnt"])
def test_it_has_namespaces_of_its_own(kind):
    link = pathlib.Path("/proc/self/ns", kind)

    own = on_device("readlink", link).out

    assert own.startswith(f"{kind}:[")
    assert own != f"{link.readlink()}\n"


def test_it_has_a_name_of_its_own():
    assert on_device("hostname").out == "quillmark\n"


def test_it_says_nothing_of_its_own():
    assert on_device("true") == (0, "", "")


def test_command_is_run_by_root_without_any_capability():
    assert on_device("id", "-u").out == "0\n"
    assert on_device("grep", "CapEff", "/proc/self/status").out == f"CapEff:\t{0:016}\n"


def test_process_nine_is_nobody():
    status, out, err = shell("for i in 1 2 3 4 5 6 7 8 9 10 11 12; do /system/bin/true; "
                             "done; ls -d /proc/9; kill -0 9")

    assert (status, out) == (1, "")
    assert "kill: 9: No such process" in err
    # the first process that COMMAND starts is after it
    assert int(shell("sh -c 'echo $$'; :").out) > 9


def test_it_has_the_loopback_alone_and_that_is_up():
    _, _, *interfaces = on_device("cat", "/proc/net/dev").out.splitlines()

    assert [interface.split()[0] for interface in interfaces] == ["lo:"]
    assert "UP LOOPBACK RUNNING" in on_device("ifconfig", "lo").out
    assert shell("echo over it | timeout 9 netcat -l -p 34952 & sleep 0.5; "
                 "sleep 0.5 | timeout 9 netcat 127.0.0.1 34952").out == "over it\n"


@pytest.mark.parametrize("directory", [
    TREE, BUILD, "--bin", "the current directory", "/usr", "/etc", "/", "/bin", "/data",
    "/system/bin"])
def test_the_host_is_read_only(directory, tmp_path):
    own, current = tmp_path / "own", tmp_path / "current"
    own.mkdir()
    current.mkdir()
    make_program(own / "Mine", "")
    directory = {"--bin": own, "the current directory": current}.get(directory, directory)
    file = pathlib.Path(directory, "written-by-the-device")

    assert on_device("touch", file, options=("--bin", own), cwd=current).err == (
        f"touch: '{file}': Read-only file system\n")
    assert not file.exists()


@pytest.mark.parametrize("option", ["--junit", "--json", "--log"])
def test_reports_are_not_written_to_the_host_and_the_line_says_what_to_do(option):
    assert on_device(*RUN_A_PLAN, option, "results") == (
        3, "",
        f"fptest: {option} results: the host's directories are read-only on the virtual "
        "device: device/run --out DIR gives a working directory that can be written\n")


def test_results_in_tmp_are_said_to_be_lost_with_the_device(in_tmp):
    junit, json = f"{in_tmp}.xml", f"{in_tmp}.json"

    assert on_device(*RUN_A_PLAN, "--junit", junit, "--json", json).err == (
        f"fptest: --json {json} and --junit {junit} are lost when the virtual "
        "device ends; device/run --out DIR gives a working directory that stays\n")


def test_nothing_but_the_shell_is_in_bin():
    assert on_device("ls", "-A", "/bin").out == "sh\n"
    assert "home" not in on_device("ls", "-A", "/").out


def test_ps_sees_only_its_own_processes():
    _, *rows = on_device("ps").out.splitlines()

    columns = [row.split() for row in rows]
    assert [(row[1], row[-1]) for row in columns] == [("1", "bwrap"), ("2", "ps")]


# ---- the host's /tmp ---------------------------------------------------------------------

def test_it_has_a_tmp_of_its_own(in_tmp):
    file = pathlib.Path(f"{in_tmp}-of-the-device")

    assert on_device("touch", file).status == 0
    assert not file.exists()
    assert on_device("ls", in_tmp, cwd="/").status == 1


def test_who_works_in_tmp_is_told_that_it_is_not_the_devices():
    assert on_device("true", cwd="/tmp").err == (
        "device/run: the device's /tmp is its own: the files here are not on it; run this "
        "from a directory below /tmp, or from elsewhere\n")


def test_who_names_files_in_tmp_is_told_that_they_are_hidden(in_tmp):
    own, other = in_tmp / "own", in_tmp / "other"
    for directory in (own, other):
        directory.mkdir()
        (directory / "plan.xml").touch()
    plan = str(own / "plan.xml")

    for word, directory, hidden in ((plan[1:], "/", plan[1:]),
                                    (f"--plan={plan}", TREE, plan),
                                    ("../other/plan.xml", own, "../other/plan.xml")):
        assert on_device("true", word, cwd=directory).err == (
            f"device/run: the device's /tmp is its own: {hidden} is not on it; run this "
            "from its directory, or keep it elsewhere\n")
    for word, directory in ((plan, own), ("./plan.xml", own), ("/tmp/no-such-file", TREE)):
        assert on_device("true", word, cwd=directory).err == ""


# ---- its disks, over adb -----------------------------------------------------------------

@pytest.mark.parametrize("place, why", [("/system/bin/item", "Read-only file system"),
                                        ("/data/vorlane/item", "No space left on device")])
def test_a_file_that_does_not_fit_is_not_pushed(there, tmp_path, place, why):
    (tmp_path / "item").write_bytes(bytes(20 << 20))

    status, out, err = there.run("push", tmp_path / "item", place)

    assert status == 1
    assert f"couldn't create file: {why}" in out + err
    assert there.shell(f"ls {place}").status == 1
