# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""Devices that adb reaches, for labgrid 0.4.1, which has none: name this file under imports
in the environment."""
import subprocess

import attr
from labgrid import target_factory
from labgrid.driver import Driver, ExecutionError
from labgrid.driver.commandmixin import CommandMixin
from labgrid.protocol import CommandProtocol, FileTransferProtocol
from labgrid.resource import Resource


@target_factory.reg_resource
@attr.s(eq=False)
class AdbDevice(Resource):
    """A device by its serial number, or by HOST:PORT."""
    serial = attr.ib(validator=attr.validators.instance_of(str))


@target_factory.reg_driver
@attr.s(eq=False)
class AdbDriver(CommandMixin, Driver, CommandProtocol, FileTransferProtocol):
    bindings = {"device": AdbDevice}

    def words(self, *words):
        return ["adb", "-s", self.device.serial, *words]

    def on_activate(self):
        serial = self.device.serial
        state = self._adb(self.words("get-state"), may_fail=True).stdout.strip()
        if ":" in serial and state != b"device":
            self._adb(["adb", "disconnect", serial], may_fail=True)  # one that is offline
            said = self._adb(["adb", "connect", serial]).stdout
            if b"connected to" not in said:  # its status is 0 all the same
                raise ExecutionError(said.decode(errors="replace").strip())
        self._adb(self.words("wait-for-device"))

    def _adb(self, words, timeout=30, may_fail=False):
        try:
            done = subprocess.run(words, stdin=subprocess.DEVNULL, capture_output=True,
                                  timeout=timeout, check=False)
        except (OSError, subprocess.TimeoutExpired) as why:
            raise ExecutionError(str(why)) from why
        if done.returncode != 0 and not may_fail:
            said = (done.stderr or done.stdout).decode(errors="replace")
            raise ExecutionError(f"{' '.join(words)}: {said.strip()}")
        return done

    def _run(self, cmd, *, timeout=30, codec="utf-8", decodeerrors="strict"):
        done = self._adb(self.words("shell", cmd), timeout, may_fail=True)
        return (done.stdout.decode(codec, decodeerrors).splitlines(),
                done.stderr.decode(codec, decodeerrors).splitlines(), done.returncode)

    @Driver.check_active
    def run(self, cmd, timeout=30, codec="utf-8", decodeerrors="strict"):
        return self._run(cmd, timeout=timeout, codec=codec, decodeerrors=decodeerrors)

    @Driver.check_active
    def get_status(self):
        return 1

    @Driver.check_active
    def put(self, filename, remotepath):
        self._adb(self.words("push", filename, remotepath), timeout=300)

    @Driver.check_active
    def get(self, filename, destination="."):
        self._adb(self.words("pull", filename, destination), timeout=300)
