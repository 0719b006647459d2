# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""Jobs for Debian's LAVA made of the files of lab/lava/, and what became of them."""
import contextlib
import shutil

import jinja2
import yaml

from support.outside import TREE, make_program, output_of, started

LAVA = TREE / "lab/lava"

# An item that measures, in the place of one that does not.
VOLTS = """#!/system/bin/sh
echo '#measure vcore 1.18 V 1.1 1.2'
echo '#measure load 12'
exec fptest report Bringup Volts --progress 100 --result 0 --description '"a": 7.5 s'
"""


def make_items(directory):
    """For device/run --bin, of each vendor selector."""
    directory.mkdir()
    for suffix in ("", "_ca", "_ca_qsee"):
        make_program(directory / f"Volts{suffix}", VOLTS)
    return directory


def make_repository(directory):
    """With lab/lava/ and a plan, as a user's."""
    shutil.copytree(LAVA, directory / "lab/lava")
    plan = (TREE / "plans/demo.xml").read_text()
    (directory / "plan.xml").write_text(plan.replace(
        '<Cmd name="QuietRun"', '<Cmd name="Volts" args=""/>\n    <Cmd name="QuietRun"'))
    git = ("git", "-C", directory, "-c", "user.name=lab", "-c", "user.email=lab@localhost")
    for words in (("init", "--quiet"), ("add", "."), ("commit", "--quiet", "--message", "lab")):
        output_of(*git, *words)
    return directory


def job(kind, repository, definitions, **parameters):
    """What job-KIND.yaml says, with these definitions instead."""
    what = yaml.safe_load((LAVA / f"job-{kind}.yaml").read_text())
    definition, = what["actions"][2]["test"]["definitions"]
    parameters = definition.get("parameters", {}) | {"PLAN": "plan.xml"} | parameters
    what["actions"][2]["test"]["definitions"] = [
        definition | {"name": name, "repository": str(repository), "parameters": parameters,
                      "path": f"lab/lava/{name}.yaml"} for name in definitions]
    return what


def device_dictionary(kind, **values):
    return jinja2.Environment().from_string(
        (LAVA / f"fptest-{kind}.jinja2").read_text()).render(**values)


def dictionary_of(kind, device):
    if kind == "adb":
        return device_dictionary("adb", serial=device.serial)
    return device_dictionary("ssh", host="127.0.0.1", port=device.port,
                             identity_file=device.key)


@contextlib.contextmanager
def running(directory, number, what, dictionary):
    """lava-run, whose log goes to the directory."""
    directory.mkdir()
    (directory / "job.yaml").write_text(yaml.safe_dump(what))
    (directory / "device.yaml").write_text(dictionary)
    (directory / "dispatcher.yaml").write_text("dispatcher_ip: 127.0.0.1\n")
    with (directory / "log").open("wb") as log, started(
            "lava-run", "--job-id", str(number), "--output-dir", directory / "out",
            "--device", directory / "device.yaml", "--dispatcher", directory / "dispatcher.yaml",
            directory / "job.yaml", stdout=log, stderr=log, cwd=directory) as process:
        yield process


def results(log):
    """DEFINITION/CASE -> result, measurement and units, of what LAVA has recorded."""
    recorded = [yaml.safe_load(line)["msg"] for line in log.read_text().splitlines()
                if '"lvl": "results"' in line]
    return {f"{one['definition']}/{one['case']}": (
        one["result"], one.get("measurement"), one.get("units")) for one in recorded}
