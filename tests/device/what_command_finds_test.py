# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What COMMAND finds on the virtual device, and what the caller has of it."""
import pytest

from support.outside import DEVICE_RUN, content, make_program, on_device, run, shell, way

pytestmark = pytest.mark.usefixtures("device")

PARAMETERS = "/etc/vorlane/sysparms/vr_common_cfg.xml"


def test_the_exit_status_is_passed_through():
    assert on_device("true").status == 0
    assert on_device("false").status == 1
    assert shell("exit 77").status == 77
    assert shell("kill -TERM $$").status == 143


def test_the_exit_status_is_passed_through_where_the_caller_ignores_sigchld():
    ignores = "import os, signal, sys; signal.signal(signal.SIGCHLD, signal.SIG_IGN); "
    program = ignores + "os.execv(sys.argv[1], sys.argv[1:])"

    assert run("/usr/bin/python3", "-c", program, DEVICE_RUN, "--", "sh", "-c",
               "exit 6").status == 6


def test_input_and_outputs_are_passed_through():
    _, out, err = shell("cat; echo complaint >&2", text="typed\n")

    assert out == "typed\n"
    assert err.splitlines()[-1] == "complaint"


def test_arguments_are_passed_unchanged():
    assert on_device("printf", "[%s]", "a b", "", "$HOME", "--", "*").out == (
        "[a b][][$HOME][--][*]")


@pytest.mark.parametrize("name", ["gcc", "/system/bin/NoSuchItem", "./device"])
def test_a_program_that_the_device_lacks_is_named(name):
    status, _, err = on_device(name)

    assert status == 127
    assert err.splitlines()[-1] == f"device/run: {name}: no such program on the device"


def test_a_program_that_is_not_executable_is_named_so(tmp_path):
    (tmp_path / "mine").write_text("echo\n")

    status, _, err = on_device("./mine", cwd=tmp_path)

    assert status == 127
    assert err.splitlines()[-1].endswith(
        "./mine: not an executable file: chmod +x makes it one")


def test_three_variables_are_set_and_the_others_left():
    assert shell("echo $PATH; echo $TMPDIR; echo $QUILLMARK_DEVICE; echo $COLOUR",
                 env={"COLOUR": "green", "TMPDIR": "/var/tmp"}).out == (
        f"/system/bin\n/tmp\n{way()}\ngreen\n")


# ---- /system/bin -------------------------------------------------------------------------

@pytest.mark.parametrize("path", ["/bin/sh", "/system/bin/sh", "sh"])
def test_every_shell_is_mksh(path):
    assert on_device(path, "-c", "echo ${KSH_VERSION%% R*}").out == "@(#)MIRBSD KSH\n"


@pytest.mark.parametrize("call", [
    "libc.system(script)",
    "libc.pclose(ctypes.c_void_p(libc.popen(script, b'w')))"])
def test_the_libcs_system_and_popen_use_mksh(call):
    program = ("import ctypes; libc = ctypes.CDLL(None);"
               "libc.popen.restype = ctypes.c_void_p;"
               f"script = b'echo $0 ${{KSH_VERSION%% R*}}'; {call}")

    assert on_device("/usr/bin/python3", "-c", program).out == "sh @(#)MIRBSD KSH\n"


def test_system_bin_holds_toybox_tools_and_items():
    found = on_device("ls", "/system/bin").out.splitlines()

    for name in ("sh", "ps", "grep", "kill", "sleep", "cat", "SpiCheck", "SpiCheck_ca",
                 "SpiCheck_ca_qsee", "DeadPixel", "FingerWait", "BurnIn", "QuietRun",
                 "SensorProbe", "SensorProbe_ca", "SensorProbe_ca_qsee"):
        assert found.count(name) == 1
    assert (on_device("readlink", "-f", "/system/bin/grep").out ==
            on_device("readlink", "-f", "/system/bin/toybox").out)


def test_a_users_program_takes_the_place_of_a_sample_item(tmp_path):
    make_program(tmp_path / "SpiCheck", "#!/system/bin/sh\necho mine\n")

    assert on_device("/system/bin/SpiCheck", options=("--bin", tmp_path)).out == "mine\n"
    assert on_device("SpiCheck", "--help").out.startswith("Checks")


# ---- its data and its parameters ---------------------------------------------------------

def test_the_data_directory_is_empty_and_writable_at_first():
    assert shell("ls -A /data/vorlane; echo x >/data/vorlane/x")[:2] == (0, "")
    assert shell("ls -A /data/vorlane").out == ""


def test_data_is_kept_in_the_directory_named(tmp_path):
    kept = tmp_path / "made/on/the/way"

    assert shell("echo first >/data/vorlane/file", options=("--data", kept)).status == 0
    assert content(kept / "file") == "first\n"
    assert on_device("cat", "/data/vorlane/file", options=("--data", kept)).out == "first\n"
    assert content(kept / "file") == "first\n"


def test_the_data_directory_may_be_named_relative_to_the_callers(tmp_path):
    shell("echo x >/data/vorlane/file", options=("--data", "kept"), cwd=tmp_path)

    assert content(tmp_path / "kept/file") == "x\n"


def test_there_is_no_parameter_file_unless_a_vendor_is_named():
    assert shell("ls -A /etc/vorlane/sysparms").out == ""


@pytest.mark.parametrize("vendor", ["0", "1", "2", "-1", "12345"])
def test_the_vendor_selector_is_written(vendor):
    assert on_device("cat", PARAMETERS, options=("--vendor", vendor)).out == (
        '<?xml version="1.0" encoding="UTF-8"?>\n<device>\n\t<SysParam>\n\t\t<Quillmark>\n'
        f"\t\t\t<vendor>{vendor}</vendor>\n\t\t</Quillmark>\n\t</SysParam>\n</device>\n")


def test_the_parameter_file_may_change_meanwhile():
    assert shell(f"echo x >{PARAMETERS} && cat /etc/vorlane/sysparms/*",
                 options=("--vendor", "1")).out == "x\n"


# ---- the caller's directory --------------------------------------------------------------

def test_a_command_is_found_relative_to_the_callers_directory(tmp_path):
    make_program(tmp_path / "mine", "#!/system/bin/sh\npwd\n")

    assert on_device("./mine", cwd=tmp_path).out == f"{tmp_path}\n"


def test_the_callers_directory_is_shown_also_under_the_name_of_a_link(tmp_path):
    (tmp_path / "real").mkdir()
    (tmp_path / "real/file").write_text("x")
    link = tmp_path / "link"
    link.symlink_to("real")

    assert on_device("cat", link / "file", cwd=link, env={"PWD": link}).out == "x"


@pytest.mark.parametrize("directory", ["/", "/tmp", "/etc", "/dev", "/proc", "/usr/bin"])
def test_the_callers_directory_may_be_one_that_is_the_devices_own(directory):
    assert on_device("true", cwd=directory).status == 0
