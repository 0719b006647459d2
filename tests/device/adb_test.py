# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""The virtual device as adb reaches it: commands, files, terminals."""
import contextlib
import fcntl
import os
import struct
import termios

import pytest

from support.outside import (at_a_terminal, content, eventually, is_running, started,
                             status_of, unique_length)

pytestmark = pytest.mark.usefixtures("device")


# ---- shell, exec-out ---------------------------------------------------------------------

def test_it_is_listed_once(there):
    listed = [line for line in there.output_of("devices").splitlines() if "\tdevice" in line]

    assert listed == [f"{there.device}\tdevice"]


@pytest.mark.parametrize("status", [0, 1, 7, 255])
def test_the_exit_status_comes_back(there, status):
    assert there.shell(f"exit {status}").status == status


def test_a_command_that_is_killed_has_a_shells_status(there):
    assert there.shell("kill -TERM $$").status == 143


def test_output_and_errors_come_apart(there):
    assert there.shell("echo out; echo err >&2") == (0, "out\n", "err\n")


def test_protocol_1_has_neither_status_nor_errors(there):
    assert there.shell("-x", "echo out; echo err >&2; exit 3") == (0, "out\nerr\n", "")


def test_a_command_reads_to_the_end_of_its_input(there):
    assert there.shell("cat; echo end", text="some\nlines\n") == (0, "some\nlines\nend\n", "")


def test_a_command_need_not_read_its_input(there):
    assert there.shell("exit 4", text="x" * 3000000).status == 4


def test_commands_may_come_from_the_input(there):
    assert there.shell(text="echo one\nexit 5\n")[:2] == (5, "one\n")


def test_every_byte_passes_unchanged(there, tmp_path):
    everything = bytes(range(256)) * 3000
    (tmp_path / "bytes").write_bytes(everything)
    there.output_of("push", tmp_path / "bytes", "/data/local/tmp/bytes")

    for words in (["exec-out"], ["shell", "-T"], ["shell", "-x"]):
        with started(*there.words(*words, "cat /data/local/tmp/bytes"), stdout=-1) as process:
            assert process.communicate(timeout=20)[0] == everything
    with started(*there.words("shell", "-T", "cat >/data/local/tmp/copy"), stdin=-1) as process:
        process.communicate(everything, timeout=20)
    assert there.shell("cmp /data/local/tmp/bytes /data/local/tmp/copy").status == 0


def test_exec_out_is_as_protocol_1(there):
    assert there.run("exec-out", "echo out; echo err >&2; exit 3")[:2] == (0, "out\nerr\n")


def test_sessions_are_the_devices(there):
    status, out, _ = there.shell("pwd; echo $PATH $TERM; id -u; which fptest SpiCheck; "
                                 "env | grep -E 'QUILLMARK_(ADB|CALLER|BEGIN)'",
                                 env={"TERM": "vt52"})

    assert (status, out) == (1, "/\n/system/bin vt52\n0\n/system/bin/fptest\n"
                                "/system/bin/SpiCheck\n")


def test_commands_run_beside_each_other(there):
    with started(*there.words("shell", "cat >/dev/null"), stdin=-1):
        assert there.shell("echo on").out == "on\n"


@pytest.mark.parametrize("words", [
    ("root",), ("reverse", "tcp:7777", "tcp:7777"), ("jdwp",), ("reboot",)])
def test_other_services_are_refused(there, words):
    status, _, err = there.run(*words)

    assert status == 1
    assert err.endswith(": closed\n")
    assert there.shell("echo on").out == "on\n"


# ---- terminals ---------------------------------------------------------------------------

def shown_by(process, terminal, *dialogue):
    """What it shows until it ends; each of the dialogue is an awaited text and its answer."""
    shown, dialogue = b"", list(dialogue)
    with contextlib.suppress(OSError):  # nobody has the other side open any more
        while True:
            shown += terminal.read(4096)
            while dialogue and dialogue[0][0] in shown:
                dialogue.pop(0)[1]()
    return shown.decode().replace("\r\n", "\n"), status_of(process)


def test_a_terminal_has_its_clients_size_and_name(there):
    # the size may come as the command already runs
    words = there.words("shell", "-t", "echo $TERM; was='0 0'; until [[ $was = 44* ]]; do "
                        "now=$(/usr/bin/stty size); [[ $now = $was ]] || echo $now; "
                        "was=$now; sleep 0.05; done; exit 9")
    with at_a_terminal("sh", "-c", 'stty rows 33 cols 77; TERM=vt52 exec "$@"', "sh",
                       *words) as (process, terminal):
        shown, status = shown_by(process, terminal, (b"33 77\r\n", lambda: fcntl.ioctl(
            terminal, termios.TIOCSWINSZ, struct.pack("4H", 44, 88, 0, 0))))

    assert shown == "vt52\n33 77\n44 88\n"
    assert status == 9


@pytest.mark.parametrize("option, answer", [("-t", "no"), ("-tt", "yes"), ("-T", "no")])
def test_without_a_terminal_there_is_one_if_it_is_insisted_on(there, option, answer):
    assert there.shell(option, "test -t 1 && echo yes || echo no").out.strip() == answer


def test_without_a_command_there_is_a_prompt(there):
    with at_a_terminal(*there.words("shell")) as (process, terminal):
        shown, status = shown_by(
            process, terminal, (b"# ", lambda: terminal.write(b"echo $((6 * 7)); exit 6\n")))

    assert "42\n" in shown
    assert status == 6


def test_ctrl_c_ends_the_command_at_a_terminal(there):
    mark = unique_length()

    def press():
        # before its child has begun the shell takes a signal to its own, and waits for it
        assert eventually(lambda: is_running(mark))
        terminal.write(b"\x03")

    with at_a_terminal(*there.words("shell", "-t", f"echo ready; sleep {mark}; echo $?")) as (
            process, terminal):
        shown, status = shown_by(process, terminal, (b"ready", press))

    assert shown.startswith("ready\n^C")
    assert status == 130


# ---- a client that goes ------------------------------------------------------------------

HUNG_UP = "trap '' PIPE; trap 'echo HUP >/data/local/tmp/said; exit' HUP; {}; while :; do sleep 0.05; done"


@pytest.mark.parametrize("option", ["-tt", "-T", "-x"])
@pytest.mark.parametrize("does", [":", "while :; do echo more; done", "exec 0<&- 1>&- 2>&-"],
                         ids=["quiet", "talking", "without_files"])
def test_the_commands_session_is_hung_up_when_its_client_goes(there, option, does):
    mark = unique_length()
    there.shell("rm -f /data/local/tmp/*")
    script = HUNG_UP.format(f"sleep {mark} & echo >/data/local/tmp/on; {does}")
    with started(*there.words("shell", option, script), stdin=-1, stdout=-3) as client:
        # a child of the shell is still its copy at first, with its trap
        assert eventually(lambda: is_running(mark))
        assert eventually(lambda: there.shell("ls /data/local/tmp").out == "on\n")

        client.kill()

        assert eventually(lambda: there.shell("cat /data/local/tmp/said").out == "HUP\n")
        assert eventually(lambda: not is_running(mark))


def test_what_is_in_a_session_of_its_own_goes_on(there):
    mark = unique_length()
    with started(*there.words("shell", f"nohup setsid sleep {mark} >/dev/null 2>&1 & wait"),
                 stdin=-1) as client:
        assert eventually(lambda: is_running(mark))
        client.kill()
    assert not eventually(lambda: not is_running(mark), 0.5)
    there.shell(f"kill $(pgrep -f 'sleep {mark}')")


# ---- push, pull --------------------------------------------------------------------------

def test_files_go_there_and_back_with_mode_and_time(there, tmp_path):
    (tmp_path / "item").write_bytes(os.urandom(3000000))
    (tmp_path / "item").chmod(0o751)
    os.utime(tmp_path / "item", (1, 1000000000))

    there.output_of("push", tmp_path / "item", "/data/local/tmp/")
    assert there.shell("stat -c '%a %Y %s' /data/local/tmp/item").out == "751 1000000000 3000000\n"

    there.output_of("pull", "-a", "/data/local/tmp/item", tmp_path / "back")
    assert (tmp_path / "back").read_bytes() == (tmp_path / "item").read_bytes()
    assert (tmp_path / "back").stat().st_mtime == 1000000000


def test_directories_go_there_and_back(there, tmp_path):
    inner = tmp_path / "tree/a/b"
    inner.mkdir(parents=True)
    (inner / "empty").touch()
    (inner / "name with  spaces, and é").write_text("text\n")
    (tmp_path / "tree/link").symlink_to("a/b")

    there.output_of("push", tmp_path / "tree", "/data/local/tmp/tree")
    assert there.shell("readlink /data/local/tmp/tree/link").out == "a/b\n"

    there.output_of("pull", "/data/local/tmp/tree", tmp_path / "back")
    assert (tmp_path / "back/a/b/empty").read_bytes() == b""
    assert content(tmp_path / "back/a/b/name with  spaces, and é") == "text\n"


def test_a_file_takes_the_place_of_one(there, tmp_path):
    (tmp_path / "program").write_text("#!/system/bin/sh\nsleep 9\n")
    (tmp_path / "program").chmod(0o700)
    for text in ("a longer first content", "short"):
        (tmp_path / "file").write_text(text)
        there.output_of("push", tmp_path / "file", "/data/local/tmp/file")
        assert there.output_of("exec-out", "cat /data/local/tmp/file") == text


def test_a_file_that_cannot_be_written_says_why(there, tmp_path):
    (tmp_path / "item").write_bytes(bytes(2000000))

    status, out, err = there.run("push", tmp_path / "item", "/proc/x/y")

    assert status == 1
    assert "couldn't create file: No such file or directory" in out + err


def test_a_file_that_cannot_be_read_says_why(there, tmp_path):
    assert there.run("pull", "/nowhere", tmp_path).status == 1

    status, out, err = there.run("pull", "/proc/self/mem", tmp_path)

    assert status == 1
    assert "Input/output error" in out + err
