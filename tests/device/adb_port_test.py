# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""device/run --adb: its port, COMMAND beside it, and what comes there that is not adb."""
import signal
import socket
import struct

import pytest

from support.adb import free_port
from support.outside import (DEVICE_RUN, at_a_terminal, content, eventually, is_running,
                             on_device, run, started, unique_length)

pytestmark = pytest.mark.usefixtures("device")


# ---- the port ----------------------------------------------------------------------------

@pytest.mark.parametrize("port, complaint", [
    ("0.0.0.0:5600", "--adb wants a port, not '0.0.0.0:5600'; it is one of 127.0.0.1 alone"),
    ("x", "--adb wants a port, not 'x'; it is one of 127.0.0.1 alone"),
    ("", "--adb wants a port, not ''; it is one of 127.0.0.1 alone"),
    ("65536", "--adb wants a port, not '65536'; it is one of 127.0.0.1 alone"),
    ("05600", "--adb wants a port, not '05600'; it is one of 127.0.0.1 alone"),
    ("5585", "--adb 5585: adb lists what is at a port up to 5585 twice; name one from 5586 on"),
])
def test_a_port_that_will_not_do_is_refused(port, complaint):
    assert run(DEVICE_RUN, "--adb", port, "--", "true") == (125, "", f"device/run: {complaint}\n")


def test_a_port_that_is_taken_is_told(adb):
    with socket.create_server(("127.0.0.1", 0)) as other:
        port = other.getsockname()[1]
        status, out, err = on_device("echo", "on", options=("--adb", str(port)))

    assert (status, out) == (125, "")
    assert err.splitlines()[-1] == (
        f"device/run: --adb {port}: the port is taken; name another")


def test_it_listens_on_the_loopback_alone(adb, start):
    port = free_port()
    start(options=("--adb", str(port)))
    adb.connect(port)

    listening = [line.split() for line in content("/proc/net/tcp").splitlines()[1:]]
    assert [words[1] for words in listening if words[1].endswith(f":{port:04X}")
            and words[3] == "0A"] == [f"0100007F:{port:04X}"]


# ---- COMMAND -----------------------------------------------------------------------------

def test_it_is_a_second_way_into_a_device_that_runs_a_command(adb, start):
    port = free_port()
    device = start("sh", "-c", "until [ -e /data/local/tmp/go ]; do sleep 0.05; done; exit 5",
                   options=("--adb", str(port)))
    there = adb.connect(port)
    assert there.shell("touch /data/local/tmp/go").status == 0

    assert device.status() == 5
    with pytest.raises(ConnectionRefusedError):
        socket.create_connection(("127.0.0.1", port))


def test_the_command_has_nothing_of_it():
    look = "ls /proc/self/fd; env | grep -E '^QUILLMARK_(ADB|BEGIN)='; ls -A /data/local/tmp"

    assert on_device("sh", "-c", look, options=("--adb", str(free_port()))).out == (
        on_device("sh", "-c", look).out)


def test_a_port_is_free_again_as_soon_as_the_device_has_ended(adb):
    port = free_port()
    for _ in range(3):
        assert on_device("echo", "on", options=("--adb", str(port))).out == "on\n"


def test_what_is_typed_for_the_command_is_not_for_it(adb):
    port = free_port()
    with at_a_terminal(DEVICE_RUN, "--adb", str(port), "--", "sh", "-c", "trap 'echo handled' "
                       "INT; echo ready; while :; do sleep 0.05; done") as (_, terminal):
        there = adb.connect(port)
        terminal.write(b"\x03")
        shown = b""
        while b"handled" not in shown:
            shown += terminal.read(4096)

        assert there.shell("echo on").out == "on\n"


@pytest.mark.parametrize("number", [signal.SIGINT, signal.SIGTERM])
def test_without_a_command_it_is_up_until_it_is_ended(adb, start, number):
    port = free_port()
    device = start(options=("--adb", str(port)))
    assert device.says(f"device/run: ready for adb connect 127.0.0.1:{port}\n")
    assert adb.connect(port).shell("echo on").out == "on\n"

    device.signal(number)

    assert device.status() == 128 + number


def test_results_of_a_session_go_where_it_says(adb, start, tmp_path):
    port = free_port()
    start(options=("--adb", str(port), "--out", tmp_path / "out"))

    assert adb.connect(port).shell(f"echo text >{tmp_path}/out/file").status == 0
    assert content(tmp_path / "out/file") == "text\n"


def test_a_lost_connection_hangs_up_every_session(adb):
    mark = unique_length()
    with adb.to_device() as there:
        with started(*there.words("shell", f"sleep {mark}"), stdin=-1), \
                started(*there.words("shell", f"sleep {mark} one"), stdin=-1):
            assert eventually(lambda: is_running(mark))

            adb.output_of("disconnect", there.device)

            assert eventually(lambda: not is_running(mark))
        adb.connect(there.device.partition(":")[2])
        assert there.shell("echo on").out == "on\n"


def test_sessions_are_hung_up_even_if_the_caller_ignores_that(adb):
    port, mark = free_port(), unique_length()
    with started("sh", "-c", 'trap "" HUP; exec "$0" "$@"', DEVICE_RUN, "--adb", str(port)):
        there = adb.connect(port)
        with started(*there.words("shell", f"sleep {mark}"), stdin=-1) as client:
            assert eventually(lambda: is_running(mark))
            client.kill()
            assert eventually(lambda: not is_running(mark))


# ---- what is not adb ---------------------------------------------------------------------

def packet(command, first=0, second=0, data=b"", length=None):
    number = int.from_bytes(command, "little")
    return struct.pack("<6I", number, first, second, len(data) if length is None else length,
                       0, number ^ 0xffffffff) + data


HELLO = packet(b"CNXN", 0x01000001, 1 << 18, b"host::\0")
SHELL = packet(b"OPEN", 1, 0, b"shell,v2,raw:cat\0")
SYNC = packet(b"OPEN", 1, 0, b"sync:\0")


def to_stream(data):
    return packet(b"WRTE", 1, 1, data)


GARBAGE = {
    "garbage": (b"GET / HTTP/1.1\r\nHost: 127.0.0.1\r\n\r\n", "this is not adb's protocol"),
    "4 GB": (packet(b"CNXN", length=0xffffffff),
             "a packet of 4294967295 bytes, where 262144 are the most"),
    "no beginning": (SHELL, "it does not begin as adb does"),
    "nothing at a time": (packet(b"CNXN", 0x01000001, 0, b"host::\0") + SHELL,
                          "it does not begin as adb does"),
    "a frame of 4 GB": (HELLO + SHELL + to_stream(b"\0\xff\xff\xff\xff"),
                        "4294967295 bytes for a service, where 262144 are the most"),
    "a path of 4 GB": (HELLO + SYNC + to_stream(b"STAT\xff\xff\xff\xff"),
                       "a path of 4294967295 bytes"),
    "a file's part of 4 GB": (
        HELLO + SYNC + to_stream(b"SEND\x15\0\0\0/data/local/tmp/x,420DATA\xff\xff\xff\xff"),
        "a file that is sent in another way than adb's"),
    "out of turn": (HELLO + packet(b"OPEN", 1, 0, b"shell,v2,raw:sleep 9\0") + 9 * to_stream(b""),
                    "it does not wait until what it sent is taken"),
}


@pytest.mark.parametrize("sent, why", GARBAGE.values(), ids=GARBAGE)
def test_a_client_that_is_not_adb_is_dropped_with_a_line(adb, start, sent, why):
    port = free_port()
    device = start(options=("--adb", str(port)))
    there = adb.connect(port)
    with socket.create_connection(("127.0.0.1", port), 10) as client:
        name = "{}:{}".format(*client.getsockname())
        client.sendall(sent)
        while client.recv(4096):
            pass

    assert device.says(f"device/run: adb: client {name} is dropped: {why}\n")
    assert device.out().count("dropped") == 1
    assert there.shell("echo on").out == "on\n"


def test_a_client_that_leaves_in_the_middle_or_waits_holds_up_nobody(adb, start):
    port = free_port()
    device = start(options=("--adb", str(port)))
    there = adb.connect(port)
    with socket.create_connection(("127.0.0.1", port)) as waiting:
        waiting.sendall(HELLO[:9])
        assert there.shell("echo on").out == "on\n"

    assert device.says("is dropped: it left in the middle of a packet\n")


def test_a_request_that_is_not_known_is_answered(adb, start):
    port = free_port()
    start(options=("--adb", str(port)))
    adb.connect(port)
    with socket.create_connection(("127.0.0.1", port), 10) as client:
        client.sendall(HELLO + SYNC + to_stream(b"STA2\1\0\0\0/"))
        client.sendall(packet(b"OKAY", 1, 1))
        said = b""
        while b"CLSE" not in said:
            said += client.recv(4096)

    assert b"FAIL" in said


def test_a_command_that_takes_no_input_is_hung_up(adb, start):
    port, mark = free_port(), unique_length()
    start(options=("--adb", str(port)))
    adb.connect(port)
    with socket.create_connection(("127.0.0.1", port), 10) as client:
        client.sendall(HELLO + packet(b"OPEN", 1, 0, f"shell:sleep {mark}".encode()) +
                       to_stream(bytes(200000)))
        assert eventually(lambda: is_running(mark))

    assert eventually(lambda: not is_running(mark))
