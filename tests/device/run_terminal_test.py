# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""How a device ends at a terminal: by keys typed there, and by its end."""
import contextlib
import shlex
import time

import pytest

from support.outside import (DEVICE_RUN, SIGNAL_SAYER, at_a_terminal, content, eventually,
                             status_of)

pytestmark = pytest.mark.usefixtures("device")


CTRL_C = b"\x03"
CTRL_BACKSLASH = b"\x1c"
KEYS = {
    "Ctrl-C is COMMAND's to handle": (
        "trap 'echo handled; exit 7' INT; echo ready; while :; do sleep 0.05; done", CTRL_C,
        7, "handled\r\n"),
    # not said by the shell, which may lose the key on the way to becoming another program
    "Ctrl-C ends a COMMAND that does not handle it": (
        r"""exec /usr/bin/perl -e '$| = 1; alarm 9; print "ready\n"; sleep'""", CTRL_C,
        130, ""),
    "Ctrl-C does not end a COMMAND that ignores it": (
        "trap '' INT; echo ready; sleep 0.5; echo done", CTRL_C, 0, "done\r\n"),
    "Ctrl-C comes to COMMAND once": (
        "exec " + shlex.join(map(str, SIGNAL_SAYER)), CTRL_C, 7, "ready\r\n^CINT\r\n"),
    "Ctrl-\\ is COMMAND's to handle": (
        "trap 'exit 8' QUIT; echo ready; while :; do sleep 0.05; done", CTRL_BACKSLASH,
        8, ""),
}


@pytest.mark.parametrize("script, key, status, shown_last", KEYS.values(), ids=KEYS)
def test_a_key_that_is_typed(script, key, status, shown_last):
    shown = b""
    is_typed = False
    with at_a_terminal(DEVICE_RUN, "--", "sh", "-c", script) as (process, terminal):
        with contextlib.suppress(OSError):  # nobody has the other side open any more
            while True:
                shown += terminal.read(4096)
                if not is_typed and b"ready\r\n" in shown:
                    is_typed = terminal.write(key)

        assert shown.decode().endswith(shown_last)
        assert status_of(process) == status


# the terminal's first process, which gets the signal, may be device/run or a shell
@pytest.mark.parametrize("before", ["exec ", ""], ids=["device_run_first", "a_shell_first"])
def test_a_closed_terminal_comes_to_command_once(tmp_path, before):
    said = tmp_path / "said"

    def says_last(line):
        return eventually(lambda: content(said).splitlines()[-1:] == [line])

    with at_a_terminal("sh", "-c", before + '"$@" >"$0" 2>&1; :', said, DEVICE_RUN,
                       *SIGNAL_SAYER) as (shell, terminal):
        assert says_last("ready")

        terminal.close()

        assert says_last("HUP")
        status_of(shell)
        time.sleep(0.7)
        assert content(said).splitlines()[-2:] == ["ready", "HUP"]
