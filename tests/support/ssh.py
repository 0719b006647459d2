# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""Virtual devices that ssh, scp and adb reach, where all of the network is the tests' own."""
import contextlib
import fcntl
import os
import pathlib
import signal

from support.outside import DEVICE_RUN, content, eventually, output_of, started

FIRST_SSH, FIRST_ADB = 2201, 5601


def children(process):
    return [int(child) for child in
            content(f"/proc/{process}/task/{process}/children").split()]


def first_inside(process):
    """The first process below one that has a namespace of its own."""
    for child in children(process):
        with contextlib.suppress(OSError):  # it has ended
            if os.readlink(f"/proc/{child}/ns/pid") != os.readlink("/proc/self/ns/pid"):
                return child
        if found := first_inside(child):
            return found
    return None


class Device:
    """Is reached as root@127.0.0.1 at its port with its key; by adb at its serial."""

    def __init__(self, directory, number, process, stack):
        self.number = number
        self.port = FIRST_SSH + number
        self.serial = f"127.0.0.1:{FIRST_ADB + number}"
        self.key = directory / "key"
        self.name = f"device-{number + 1}"
        self.process = process
        self.directory = directory
        self.stack = stack
        self.inside = first_inside(process.pid)
        self.listen()

    def listen(self):
        """Starts its sshd, whose every session enters the device."""
        configuration = self.directory / f"sshd-{self.number}"
        enter = (f"nsenter --target {self.inside} --user --mount --pid --net --ipc --uts "
                 "--preserve-credentials --wdns=/data/local/tmp -- /usr/bin/env "
                 "PATH=/system/bin TMPDIR=/tmp HOME=/data/local/tmp "
                 '/system/bin/sh ${SSH_ORIGINAL_COMMAND:+-c "$SSH_ORIGINAL_COMMAND"}')
        configuration.write_text(f"""\
ListenAddress 127.0.0.1:{self.port}
HostKey {self.key}
AuthorizedKeysFile {self.key}.pub
StrictModes no
UsePAM no
PermitRootLogin yes
PidFile none
Subsystem sftp /usr/lib/openssh/sftp-server
ForceCommand exec {enter}
""")
        pathlib.Path("/run/sshd").mkdir(exist_ok=True)
        self.sshd = self.stack.enter_context(started(
            "/usr/sbin/sshd", "-D", "-e", "-f", configuration, start_new_session=True,
            stderr=(self.directory / f"sshd-{self.number}.log").open("ab")))
        assert eventually(lambda: "listening on" in content(
            self.directory / f"sshd-{self.number}.log"))

    def make_root_writable(self):
        output_of("nsenter", "--target", str(self.inside), "--user", "--mount",
                  "--preserve-credentials", "mount", "-o", "remount,rw", "/")

    def ssh(self, *words):
        """The words of a client."""
        return ("ssh", "-F", "none", "-p", str(self.port), "-i", self.key,
                "-o", "StrictHostKeyChecking=no", "-o", "UserKnownHostsFile=/dev/null",
                "-o", "LogLevel=ERROR", *words[:-1], "root@127.0.0.1", *words[-1:])

    def lose_connections(self):
        """Ends its sshd's sessions; the device goes on, and new ones are let in."""
        for session in children(self.sshd.pid):
            with contextlib.suppress(ProcessLookupError):  # it has just ended by itself
                os.kill(session, signal.SIGKILL)

    def lose(self):
        """The device and its sshd are gone."""
        self.lose_connections()
        self.sshd.kill()
        self.process.kill()


@contextlib.contextmanager
def devices(directory, count, *options):
    """That many devices, up meanwhile, with another vendor selector each; the options are those
    of device/run. One after the other, as their ports, and adb's, are the same for all tests."""
    with contextlib.ExitStack() as stack:
        fcntl.flock(stack.enter_context(open(__file__, encoding="utf-8")), fcntl.LOCK_EX)
        output_of("ssh-keygen", "-q", "-t", "ed25519", "-N", "", "-f", directory / "key")
        processes, logs = [], []
        for number in range(count):
            logs.append(directory / f"device-{number}.log")
            processes.append(stack.enter_context(started(
                DEVICE_RUN, "--vendor", str(number % 3), "--adb", str(FIRST_ADB + number),
                *options, stderr=logs[-1].open("wb"))))
        assert all(eventually(lambda log=log: "ready for adb" in content(log), 30)
                   for log in logs)
        yield [Device(directory, number, process, stack)
               for number, process in enumerate(processes)]
