# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""A device of labgrid's on which fptest runs a plan, and what it reported."""
import collections
import json
import os
import re
import select
import shlex
import subprocess
import time

from labgrid.driver import ExecutionError, SSHDriver

SILENCE = 60  # seconds without a word, and a device is lost: fptest says something every 10


class Report:
    """What a run's JSON lines say; the last of a run that was killed may be cut."""

    def __init__(self, text):
        self.items = set()  # (group, item), as they were to be run
        self.rounds = None  # None where their number is open
        self.ends = collections.defaultdict(list)  # (group, item) -> its ends, one a round
        self.finish = {}
        for line in text.split("\n"):
            try:
                event = json.loads(line)
            except ValueError:
                break
            if event["event"] == "run":
                self.items = {(one["group"], one["item"]) for one in event["items"]}
                self.rounds = event["rounds"]
            elif event["event"] == "end":
                self.ends[event["group"], event["item"]].append(event)
            elif event["event"] == "finish":
                self.finish = event


class Device:
    def __init__(self, env, name, results, patience):
        self.name = name
        self.target = env.get_target(name)
        self.driver = self.target.get_driver("CommandProtocol", activate=False)
        self.files = self.target.get_driver("FileTransferProtocol", activate=False)
        self.there = env.config.get_target_option(name, "directory", "/data/local/tmp/fptest")
        self.patience = patience
        file = re.sub(r"[^\w.:-]", "_", name)
        self.log, self.json, self.junit = (
            results / f"{file}.{end}" for end in ("log", "jsonl", "xml"))

    def run(self, files, words):
        """Runs fptest with these words and files, {name there: file here}.

        Gives its report, and why that may not be whole."""
        for file in (self.log, self.json, self.junit):
            file.unlink(missing_ok=True)
        try:
            self.connect()
            out, err, status = self.driver.run("fptest status")
            if status:
                busy = "fptest runs there already: " if status == 4 else ""
                raise ExecutionError(busy + " ".join([*out, *err]))
            self.driver.run_check(f"mkdir -p {self.there}")
            self.driver.run_check(f"rm -f {self.there}/r.jsonl {self.there}/r.xml")
            for name, file in files.items():
                self.files.put(str(file), f"{self.there}/{name}")
        except Exception as why:  # labgrid's drivers raise what they like
            return Report(""), f"nothing was run: {one_line(why)}"

        status, heard = self.run_there(words)
        why = (f"fptest ended with {status}: {heard}" if status else
               f"the device was lost; last heard: {heard}")
        try:
            if not status:
                raise ExecutionError("lost")
            self.fetch()
        except Exception:
            why += self.fetch_later()
        text = self.json.read_text("utf-8", "replace") if self.json.exists() else ""
        return Report(text), why

    def connect(self):
        self.target.activate(self.driver)
        self.target.activate(self.files)

    def connect_anew(self):
        self.target.deactivate(self.files)
        self.target.deactivate(self.driver)
        self.connect()

    # SSHDriver.run knows neither a time limit nor a terminal, without which a run goes on
    # when its connection has ended.
    def session(self, command):
        if not isinstance(self.driver, SSHDriver):
            return self.driver.words("shell", command)
        service = self.driver.networkservice
        return ["ssh", "-tt", "-x", *self.driver.ssh_prefix, "-p", str(service.port),
                "-l", service.username, service.address, command]

    def run_there(self, words):
        """The status, "" if the device is lost before, and the last line that was heard."""
        command = (f"cd {self.there} && fptest run --plan plan.xml --json r.jsonl "
                   f"--junit r.xml --plain {shlex.join([f'--label=device={self.name}', *words])}; "
                   "echo status $?")
        # the session ends with this process, however that ends
        with self.log.open("wb") as log, subprocess.Popen(
                ["setpriv", "--pdeathsig", "TERM", *self.session(command)],
                stdin=subprocess.DEVNULL, stdout=subprocess.PIPE,
                stderr=subprocess.STDOUT) as process:
            try:
                while select.select([process.stdout], [], [], SILENCE)[0]:
                    data = os.read(process.stdout.fileno(), 65536)
                    if not data:
                        break
                    log.write(data)
                    log.flush()
            finally:
                process.terminate()
        lines = ["nothing", *self.log.read_text("utf-8", "replace").split("\n")]
        *lines, last = [line.strip() for line in lines if line.strip()]
        status = re.fullmatch(r"status (\d+)", last)
        return (status[1], lines[-1]) if status else ("", last)

    def fetch(self):
        """Brings the reports here, if there are any."""
        out, _, _ = self.driver.run(f"test -s {self.there}/r.jsonl && echo some || echo none")
        if "some" in out:
            self.files.get(f"{self.there}/r.jsonl", str(self.json))
            self.files.get(f"{self.there}/r.xml", str(self.junit))
        elif "none" not in out:
            raise ExecutionError("lost")

    def fetch_later(self):
        """Fetches from a device that is lost as soon as it is there again, and nothing runs.

        Gives what to say of it."""
        end = time.monotonic() + self.patience
        while True:
            try:
                self.connect_anew()
                self.driver.run("fptest stop")
                self.fetch()
                return "; it was connected again"
            except Exception as why:
                if time.monotonic() > end:
                    return f"; not connected again in {self.patience:g} s: {one_line(why)}"
            time.sleep(1)


def one_line(why):
    said = [getattr(why, "msg", why), *(getattr(why, "stderr", None) or [])]
    return " ".join(" ".join(map(str, said)).split())
