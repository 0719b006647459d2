# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""The real adb, its server, and virtual devices that it reaches."""
import contextlib
import ctypes
import fcntl
import os
import pathlib
import socket
import struct

from support.outside import DEVICE_RUN, eventually, output_of, run, started

CLONE_NEWUSER, CLONE_NEWNET = 0x10000000, 0x40000000
SIOCSIFFLAGS, IFF_UP = 0x8914, 1


def take_a_network_of_its_own(as_root=False):
    """Moves this process where its ports are nobody else's, if that is allowed.

    Root there has no rights to anything else, unless this is to be as root."""
    user, group = os.getuid(), os.getgid()
    if ctypes.CDLL(None).unshare(CLONE_NEWNET | (0 if as_root else CLONE_NEWUSER)) != 0:
        return
    maps = {"setgroups": "deny", "uid_map": f"0 {user} 1", "gid_map": f"0 {group} 1"}
    for file, text in () if as_root else maps.items():
        pathlib.Path("/proc/self", file).write_text(text)
    with socket.socket() as some:
        fcntl.ioctl(some, SIOCSIFFLAGS, struct.pack("16sH14x", b"lo", IFF_UP))


def free_port():
    with socket.create_server(("127.0.0.1", 0)) as some:
        return some.getsockname()[1]


class Adb:
    """The client's words, for a server, or for a device of it."""

    def __init__(self, directory, port, device=None):
        self.directory = directory
        self.port = port
        self.device = device
        self.variables = [f"HOME={directory}", f"TMPDIR={directory}",
                          f"ANDROID_ADB_SERVER_PORT={port}"]
        if device:
            self.variables.append(f"ANDROID_SERIAL={device}")

    def words(self, *words):
        return "env", *self.variables, "adb", *words

    def run(self, *words, **options):
        return run(*self.words(*words), **options)

    def shell(self, *words, **options):
        return self.run("shell", *words, **options)

    def output_of(self, *words, **options):
        return output_of(*self.words(*words), **options)

    def connect(self, port):
        """The device at that port, as soon as it is there."""
        device = Adb(self.directory, self.port, f"127.0.0.1:{port}")
        assert eventually(lambda: "connected to" in self.run("connect", device.device).out)
        device.output_of("wait-for-device")
        return device

    @contextlib.contextmanager
    def to_device(self, *options):
        """A device that is up meanwhile."""
        port = free_port()
        with started(DEVICE_RUN, "--adb", str(port), *options) as process:
            yield self.connect(port)
            self.run("disconnect", f"127.0.0.1:{port}")
            process.terminate()
            process.wait(20)


@contextlib.contextmanager
def server(directory):
    take_a_network_of_its_own()
    adb = Adb(directory, free_port())
    adb.output_of("start-server")
    try:
        yield adb
    finally:
        adb.run("kill-server")
