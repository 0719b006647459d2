# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""lab/labgrid: the real labgrid and pytest, with three virtual devices over ssh and adb."""
import collections
import contextlib
import functools
import os
import pathlib
import re
import runpy
import signal
import types
import xml.etree.ElementTree

import labgrid
import pytest

from support import ssh
from support.adb import Adb, free_port, take_a_network_of_its_own
from support.outside import (TREE, content, eventually, make_program, output_of, run, started,
                             status_of)

BENCHES = ["bench-1", "bench-2", "bench-3"]
LAB = TREE / "lab/labgrid"

REPORT = "fptest report G {} --progress 100 --result"
HOLD = "/data/local/tmp/hold"
ITEMS = {
    "Measures": "echo '#measure vcore 1.213 V 1.15 1.25'; echo '#measure boot 2 s'; {} 0",
    "Fails": "echo 'read <0x1a> & stopped'; {} 1 --description 'no answer'",
    "Flaky": "test -e /data/local/tmp/tried && exec {} 0; touch /data/local/tmp/tried; {} 1",
    "Known": "{} 1",
    "Held": "until test ! -e " + HOLD + "; do sleep 0.05; done; {} 0",
    "Last": "{} 0"}
RESULTS = {"Measures": "passed", "Fails": "failure", "Flaky": "passed", "Known": "skipped",
           "Held": "passed", "Last": "passed"}

OUTCOMES = {"Fails": "failed", "Flaky": "flaky", "Known": "expected"}  # the others' is passed


class Rack:
    """Three devices, and pytest with labgrid that runs plans on them."""

    def __init__(self, directory, stack):
        self.directory = directory
        (directory / "bin").mkdir()
        for name, script in ITEMS.items():
            script = script.replace("{}", REPORT.format(name))
            for suffix in ("", "_ca", "_ca_qsee"):  # the devices' vendors differ
                make_program(directory / f"bin/{name}{suffix}", f"#!/system/bin/sh\n{script}\n")
        cmds = "".join(f'<Cmd name="{name}" args="-"/>' for name in ITEMS)
        (directory / "plan.xml").write_text(
            f'<?xml version="1.0"?><P><CmdGroup name="G">{cmds}</CmdGroup></P>')
        (directory / "expect").write_text("P/G/Known  its sensor is not there yet\n")
        self.by_ssh = dict(zip(BENCHES, stack.enter_context(
            ssh.devices(directory, len(BENCHES), "--bin", directory / "bin"))))
        adb = Adb(directory, free_port())
        stack.callback(adb.run, "kill-server")
        self.devices = {name: adb.connect(ssh.FIRST_ADB + number)
                        for number, name in enumerate(BENCHES)}
        self.environment = {"SSH_AUTH_SOCK": str(directory / "agent"),
                            **dict(word.split("=") for word in adb.variables)}
        stack.enter_context(started("ssh-agent", "-D", "-a", directory / "agent", stdout=-3))
        assert eventually((directory / "agent").exists)
        output_of("ssh-add", "-q", directory / "key", env=self.environment)

    def start(self, directory, *options, environment="rack.yaml"):
        """pytest, a process group of its own as in a terminal."""
        return started(
            "/usr/bin/python3", "-B", "-m", "pytest", LAB, "--lg-env", LAB / environment,
            "--fptest-plan", self.directory / "plan.xml",
            "--fptest-expect", self.directory / "expect", "--junitxml", "all.xml",
            "-o", f"cache_dir={directory}/cache", *options, cwd=directory, env=self.environment,
            stdout=(directory / "out").open("w"), start_new_session=True)

    def run(self, directory, *options, **others):
        """Its exit status and what it printed."""
        with self.start(directory, *options, **others) as process:
            return status_of(process, 120), content(directory / "out")

    def hold(self, *names):
        for name in names:
            self.devices[name].output_of("shell", "touch", HOLD)

    def let_go(self):
        for device in self.devices.values():
            device.shell("rm -f /data/local/tmp/hold /data/local/tmp/tried")

    def is_held(self, directory, name):
        """Its item runs, and all that it said before has arrived."""
        return ("G/Known: " in content(directory / f"results/{name}.log")
                and " G/Held " in self.devices[name].shell("fptest status").out)

    def nothing_runs(self, name):
        return self.devices[name].shell("fptest status").out.startswith("nothing runs")


@pytest.fixture(scope="module")
def devices(tmp_path_factory):
    names = [line.split(":")[0].strip() for line in content("/proc/net/dev").splitlines()[2:]]
    if names != ["lo"] or os.getuid() != 0:
        pytest.skip("scripts/test-lab runs this, in a root and a network of its own")
    take_a_network_of_its_own(as_root=True)
    with contextlib.ExitStack() as stack:
        yield Rack(tmp_path_factory.mktemp("rack"), stack)


@pytest.fixture
def rack(devices):
    yield devices
    devices.let_go()
    for name in BENCHES:
        devices.devices[name].shell("fptest stop")


AT_ONCE = ("-n", "3", "--dist", "loadgroup")
RETRIED = "--fptest-options=--retry 1"


def cases(directory):
    """{(device, item): its element}"""
    found = {}
    for case in xml.etree.ElementTree.parse(directory / "all.xml").iter("testcase"):
        device, item = re.match(r"test_item\[(.*)-G/(.*)\]", case.get("name")).groups()
        found[device, item] = case
    return found


def results(directory):
    """{device: {item: what it became}}"""
    found = collections.defaultdict(dict)
    for (device, item), case in cases(directory).items():
        found[device][item] = next((one.tag for one in case if one.tag in (
            "failure", "error", "skipped")), "passed")
    return found


def properties(case):
    return [(one.get("name"), one.get("value")) for one in case.iter("property")]


# ---- results ---------------------------------------------------------------------------

def test_each_item_of_each_device_is_a_test(rack, tmp_path):
    status, out = rack.run(tmp_path, *AT_ONCE, RETRIED)

    assert results(tmp_path) == {name: RESULTS for name in BENCHES}, out
    assert status == 1
    assert "3 failed, 12 passed, 3 xfailed, 3 warnings" in out
    for (device, item), case in cases(tmp_path).items():
        assert ("outcome", OUTCOMES.get(item, "passed")) in properties(case)
        assert 0 < float(case.get("time")) == float(dict(properties(case))["seconds"])
    for device in BENCHES:
        assert '"event":"finish"' in content(tmp_path / f"results/{device}.jsonl")
        assert f'"device":"{device}"' in content(tmp_path / f"results/{device}.jsonl")
        assert f'hostname="{device}"' in content(tmp_path / f"results/{device}.xml")


def test_measurements_reasons_and_output_are_with_their_item(rack, tmp_path):
    _, out = rack.run(tmp_path, RETRIED, "-k", "bench-2 and not Held")

    of = {item: case for (device, item), case in cases(tmp_path).items()}
    assert list(of) == ["Measures", "Fails", "Flaky", "Known", "Last"]
    assert "Held" not in content(tmp_path / "results/bench-2.jsonl")
    assert [one for one in properties(of["Measures"]) if one[0].startswith("measure ")] == [
        ("measure vcore", "1.213 V 1.15 1.25"), ("measure boot", "2 s")]
    assert of["Fails"].find("failure").text == "failed: reported the result 1\nno answer"
    assert "read <0x1a> & stopped" in of["Fails"].find("system-out").text
    assert "read <0x1a> & stopped" in out
    assert "flaky: " in out
    assert "its sensor is not there yet" in of["Known"].find("skipped").get("message")


def test_what_the_run_leaves_out_is_skipped(rack, tmp_path):
    status, out = rack.run(
        tmp_path, "--fptest-options=--stop-after 1 --skip P/G/Last", "-k", "bench-1")

    assert results(tmp_path) == {"bench-1": {name: "skipped" for name in ITEMS} | {
        "Measures": "passed", "Fails": "failure"}}, out
    assert status == 1


def test_of_several_rounds_the_worst_counts(rack, tmp_path):
    rack.run(tmp_path, "--fptest-options=--repeat 2", "-k", "bench-1 and (Flaky or Last)")

    assert results(tmp_path) == {"bench-1": {"Flaky": "failure", "Last": "passed"}}
    outcomes = [value for name, value in properties(cases(tmp_path)["bench-1", "Flaky"])
                if name == "outcome"]
    assert outcomes == ["failed", "passed"]


def test_a_round_that_was_not_begun_is_an_error(rack, tmp_path):
    rack.hold("bench-1")
    rack.run(tmp_path, "--fptest-options=--repeat 2 --limit 2 --timeout 60",
             "-k", "bench-1 and (Measures or Fails or Held)")

    assert results(tmp_path) == {
        "bench-1": {"Measures": "error", "Fails": "failure", "Held": "error"}}
    error = cases(tmp_path)["bench-1", "Measures"].find("error").text
    assert error.startswith("1 of 2 rounds: fptest ended with 1: 1 passed, ")


# ---- devices that are lost ---------------------------------------------------------------

LOST = RESULTS | {"Held": "error", "Last": "error"}


def test_a_device_that_is_lost_is_connected_again_and_can_be_run_again(rack, tmp_path):
    rack.hold("bench-2")
    with rack.start(tmp_path, *AT_ONCE, RETRIED) as process:
        assert eventually(lambda: rack.is_held(tmp_path, "bench-2"), 60), content(tmp_path / "out")
        device = rack.by_ssh["bench-2"]
        device.lose_connections()
        device.sshd.kill()
        assert eventually(lambda: rack.nothing_runs("bench-2"), 30)
        device.listen()
        assert status_of(process, 120) == 1

    assert results(tmp_path) == {
        "bench-1": RESULTS, "bench-2": LOST, "bench-3": RESULTS}, content(tmp_path / "out")
    error = cases(tmp_path)["bench-2", "Held"].find("error").text
    assert error.startswith("stopped: ")
    assert error.endswith("; it was connected again")
    assert ("measure vcore", "1.213 V 1.15 1.25") in properties(
        cases(tmp_path)["bench-2", "Measures"])

    rack.let_go()
    rack.run(tmp_path, *AT_ONCE, RETRIED, "--lf")
    assert results(tmp_path) == {
        name: {"Fails": "failure"} | ({"Held": "passed", "Last": "passed"} if name == "bench-2"
                                      else {}) for name in BENCHES}


def test_over_adb_too(rack, tmp_path):
    rack.hold("bench-3")
    with rack.start(tmp_path, *AT_ONCE, RETRIED, environment="adb.yaml") as process:
        assert eventually(lambda: rack.is_held(tmp_path, "bench-3"), 60), content(tmp_path / "out")
        rack.devices["bench-3"].output_of("disconnect", "127.0.0.1:5603")
        assert status_of(process, 120) == 1

    assert results(tmp_path) == {
        "bench-1": RESULTS, "bench-2": RESULTS, "bench-3": LOST}, content(tmp_path / "out")


def test_a_device_that_stays_away_costs_its_own_items_only(rack, tmp_path):
    (tmp_path / "rack.yaml").write_text(content(LAB / "adb.yaml").replace(
        "adb_driver.py", str(LAB / "adb_driver.py")).replace("5603", "5604"))

    rack.run(tmp_path, "--fptest-patience", "0", RETRIED, environment=tmp_path / "rack.yaml")

    assert results(tmp_path) == {"bench-1": RESULTS, "bench-2": RESULTS,
                                 "bench-3": dict.fromkeys(RESULTS, "error")}
    error = cases(tmp_path)["bench-3", "Last"].find("error").text
    assert error.startswith("no report: nothing was run: failed to connect to ")
    assert "\n" not in error


def test_a_busy_device_is_let_alone(rack, tmp_path):
    rack.hold("bench-1")
    with rack.start(tmp_path, "-k", "bench-1") as process:
        assert eventually(lambda: rack.is_held(tmp_path, "bench-1"), 60)
        (tmp_path / "other").mkdir()
        rack.run(tmp_path / "other", "-k", "bench-1 and Last")
        rack.let_go()
        status_of(process)

    error = cases(tmp_path / "other")["bench-1", "Last"].find("error").text
    assert re.match(
        r"no report: nothing was run: fptest runs there already: process \d+, .* G/Held ", error)
    assert results(tmp_path) == {"bench-1": RESULTS | {"Flaky": "failure"}}


# ---- the end ---------------------------------------------------------------------------

ONE = ("-k", "bench-1")


@pytest.mark.parametrize("environment, options, end, number", [
    ("rack.yaml", AT_ONCE, os.killpg, signal.SIGINT), ("adb.yaml", ONE, os.killpg, signal.SIGINT),
    ("rack.yaml", ONE, os.kill, signal.SIGKILL)], ids=["Ctrl-C, ssh", "Ctrl-C, adb", "killed"])
def test_the_runs_on_the_devices_end_with_pytest(rack, tmp_path, environment, options, end,
                                                 number):
    names = BENCHES if options == AT_ONCE else BENCHES[:1]
    rack.hold(*names)
    with rack.start(tmp_path, *options, RETRIED, environment=environment) as process:
        assert eventually(lambda: all(rack.is_held(tmp_path, name) for name in names), 60)
        end(process.pid, number)
        assert status_of(process) == (137 if number == signal.SIGKILL else
                                      pytest.ExitCode.INTERRUPTED)

    for name in names:
        # before fptest next says something, to nobody
        assert eventually(functools.partial(rack.nothing_runs, name), 8)
        report = rack.devices[name].shell("cat /data/local/tmp/fptest/r.jsonl").out
        assert '"finished":false,"reason":"interrupted by SIG' in report


# ---- bad input ---------------------------------------------------------------------------

PLAN = "images: {plan: plan.xml}\n"
TARGET = ("targets: {bench: {resources: {NetworkService: {address: a, username: u}}, "
          "drivers: {SSHDriver: {}}}}\n")


@pytest.mark.parametrize("environment, complaint", [
    (None, "rack.yaml: configuration file 'rack.yaml' could not be found"),
    ("", "rack.yaml: it has no targets"),
    ("- a\n", "rack.yaml: it has no targets"),
    ("targets: {", "rack.yaml: Error in configuration file: while parsing"),
    ("targets: some\n", "rack.yaml: it has no targets"),
    ("targets: {bench: {}}\n", "rack.yaml: target bench: it has no drivers, as SSHDriver"),
    ("imports: [adb.py]\n" + TARGET, "rack.yaml: imports: there is no {directory}/adb.py"),
    (PLAN + TARGET.replace("SSHDriver", "Some"),
     "rack.yaml: target bench: unknown driver class Some"),
    (PLAN + TARGET.replace("username: u", ""),
     "rack.yaml: target bench: failed to create NetworkService for target "),
    (TARGET, 'rack.yaml: it has no image "plan"; add it, or say --fptest-plan FILE'),
    (TARGET + "images: {plan: no.xml}\n", "{directory}/no.xml: no such file"),
    (TARGET + "images: {plan: rack.yaml}\n",
     "{directory}/rack.yaml: syntax error: line 1, column 0; fptest check says more"),
    (TARGET + "images: {plan: empty.xml}\n", "{directory}/empty.xml: it has no items"),
])
def test_a_bad_environment_is_named_in_one_line(tmp_path, parts, environment, complaint):
    (tmp_path / "empty.xml").write_text("<P/>")
    if environment is not None:
        (tmp_path / "rack.yaml").write_text(environment)

    assert refusal(parts).startswith(complaint.format(directory=tmp_path))


@pytest.mark.parametrize("options, complaint", [
    ({"expect": "no"}, "no: no such file"),
    ({"results": pathlib.Path("/proc/no")}, "/proc/no: No such file or directory"),
    ({"options": "'"}, "--fptest-options: No closing quotation"),
    ({"options": "--quiet"}, "--fptest-options: leave out --quiet: a device that says nothing for "
                             "60 s is taken for lost"),
    ({"options": "--hangup=go-on"}, "--fptest-options: leave out --hangup: what a lost device "
                                    "still runs is ended when it is connected again")])
def test_a_bad_option_is_named_in_one_line(tmp_path, parts, options, complaint):
    (tmp_path / "rack.yaml").write_text(PLAN + TARGET)

    assert refusal(parts, **options) == complaint


@pytest.fixture
def parts(tmp_path, monkeypatch):
    """What conftest.py has, in a directory with a plan."""
    monkeypatch.syspath_prepend(LAB)
    monkeypatch.chdir(tmp_path)
    (tmp_path / "plan.xml").write_text("<P><CmdGroup name='G'><Cmd name='I'/></CmdGroup></P>")
    return types.SimpleNamespace(**runpy.run_path(LAB / "conftest.py"))


def refusal(parts, **options):
    given = {"plan": None, "expect": None, "options": "", "results": pathlib.Path("."),
             "patience": 1} | options
    given = types.SimpleNamespace(**{f"fptest_{name}": value for name, value in given.items()})
    with pytest.raises(pytest.UsageError) as raised:
        parts.check_environment("rack.yaml")
        parts.Rack(given, labgrid.Environment("rack.yaml"))
    assert "\n" not in str(raised.value)
    return str(raised.value)


@pytest.mark.parametrize("options, complaint", [
    ((), "name the devices, as --lg-env lab/labgrid/rack.yaml"),
    (("--lg-env", "no"), "no: configuration file 'no' could not be found"),
    (("--lg-env", LAB / "rack.yaml", "-n", "3"),
     "with -n say --dist loadgroup, so that each device has one run")])
def test_wrong_usage_gets_one_line(tmp_path, options, complaint):
    assert run("/usr/bin/python3", "-B", "-m", "pytest", "-p", "no:cacheprovider", LAB,
               *options, cwd=tmp_path) == (
        pytest.ExitCode.USAGE_ERROR, "", f"ERROR: {complaint}\n\n")


# ---- a report that is not whole ----------------------------------------------------------

def test_a_report_counts_as_far_as_it_goes(parts):
    import fptest_device
    report = fptest_device.Report(
        '{"event":"run","rounds":1,"items":[{"group":"G","item":"A"},{"group":"G","item":"B"}]}\n'
        '{"event":"end","group":"G","item":"A","outcome":"passed","output":"\u2028 \x85"}\n'
        '{"event":"end","group":"G","it')

    assert report.items == {("G", "A"), ("G", "B")}
    assert [end["outcome"] for end in report.ends["G", "A"]] == ["passed"]
    assert not report.ends["G", "B"]
    assert not report.finish
