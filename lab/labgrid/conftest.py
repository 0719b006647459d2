# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""Each item of a plan on each device of a labgrid environment as a pytest test.

    pytest --lg-env lab/labgrid/rack.yaml lab/labgrid
    pytest --lg-env lab/labgrid/rack.yaml lab/labgrid -n 3 --dist loadgroup --junitxml all.xml

The first runs one device after another, the second (python3-pytest-xdist) three at once.
-k 'bench-2 and Bringup' chooses items, and --lf those that did not pass, if -n is as before;
a device has one run of fptest for all that are chosen. To try it, on three virtual devices:

    lab/virtual-rack 3 pytest --lg-env lab/labgrid/adb.yaml lab/labgrid -k Bringup

    --fptest-plan=FILE         the plan; else the environment's image "plan"
    --fptest-expect=FILE       for fptest's --expect; else its image "expect", if there is one
    --fptest-options=OPTIONS   for fptest run, as --fptest-options='--timeout 30 --retry 1'
    --fptest-results=DIR       for TARGET.jsonl, .xml and .log, which grows as the run goes on;
                               "results" by default
    --fptest-patience=SECONDS  how long a device that is lost may take to be back; 60

pytest wants the '=', or them behind the directory; PYTEST_ADDOPTS may have them too. A target's
option "directory" says where on the device its files are, if not in /data/local/tmp/fptest.

    fptest                                      pytest
    passed                                      passed
    flaky                                       passed, with a warning
    expected                                    xfailed
    failed, no result, timed out, unexpected    failed: the reason, and the item's output
    not run: --stop-after or --until-fail       skipped
      ended the run, or --skip left it out
    stopped; not run, or not in all rounds,     error
      as the run did not finish; nothing reported

Of several rounds the worst counts. The properties of a test, as --junitxml has them, are
outcome, seconds, description and, as fptest's own JUnit, "measure NAME" for each measurement.
Where a device is lost, it is connected again and its reports are fetched: what ended there
keeps its result. Ctrl-C ends the runs on the devices.
"""
import os
import pathlib
import shlex
import xml.etree.ElementTree

import pytest
from labgrid.config import Config

from fptest_device import SILENCE, Device, one_line


def pytest_addoption(parser):
    group = parser.getgroup("fptest")
    group.addoption("--fptest-plan", metavar="FILE", help="the plan that the devices run")
    group.addoption("--fptest-expect", metavar="FILE", help="what is known to fail")
    group.addoption("--fptest-options", metavar="OPTIONS", default="",
                    help="options for fptest run")
    group.addoption("--fptest-results", metavar="DIR", default="results", type=pathlib.Path,
                    help="where reports are kept (default: results)")
    group.addoption("--fptest-patience", metavar="SECONDS", default=60, type=float,
                    help="how long a lost device may take to be back (default: 60)")


def pytest_configure(config):
    option = config.option
    file = option.lg_env or option.env_config or os.environ.get("LG_ENV")
    if not file:
        raise pytest.UsageError("name the devices, as --lg-env lab/labgrid/rack.yaml")
    check_environment(file)
    if getattr(option, "numprocesses", None) and option.dist != "loadgroup":
        raise pytest.UsageError("with -n say --dist loadgroup, so that each device has one run")


def check_environment(file):
    """What labgrid itself would meet with a traceback."""
    try:
        config = Config(file)
        imports, targets = config.get_imports(), config.data.get("targets")
    except (AttributeError, UnboundLocalError):  # of a file that is no mapping
        imports, targets = [], None
    except Exception as why:
        raise pytest.UsageError(f"{file}: {one_line(why)}") from None
    missing = [path for path in imports if path.endswith(".py") and not os.path.exists(path)]
    if missing:
        raise pytest.UsageError(f"{file}: imports: there is no {missing[0]}")
    if not targets or not isinstance(targets, dict):
        raise pytest.UsageError(f"{file}: it has no targets")
    for name, target in targets.items():
        if not isinstance(target, dict) or not target.get("drivers"):
            raise pytest.UsageError(f"{file}: target {name}: it has no drivers, as SSHDriver")


def pytest_sessionstart(session):
    session.config.fptest_rack = Rack(session.config.option, session.config._labgrid_env)


def pytest_sessionfinish(session):
    if hasattr(session.config, "fptest_rack"):
        session.config._labgrid_env.cleanup()


def items_of(plan):
    """Its groups and items, each once."""
    try:
        root = xml.etree.ElementTree.parse(plan).getroot()
    except xml.etree.ElementTree.ParseError as why:
        raise pytest.UsageError(f"{plan}: {why}; fptest check says more") from None
    items = [(group.get("name", ""), item.get("name", ""))
             for group in root.iterfind(".//CmdGroup") for item in group.iterfind("Cmd")]
    if not items:
        raise pytest.UsageError(f"{plan}: it has no items")
    return list(dict.fromkeys(items))


def words_of(options):
    try:
        words = shlex.split(options)
    except ValueError as why:
        raise pytest.UsageError(f"--fptest-options: {why}") from None
    if "--quiet" in words:
        raise pytest.UsageError("--fptest-options: leave out --quiet: a device that says nothing "
                                f"for {SILENCE} s is taken for lost")
    if any(word.partition("=")[0] == "--hangup" for word in words):
        raise pytest.UsageError("--fptest-options: leave out --hangup: what a lost device still "
                                "runs is ended when it is connected again")
    return words


class Rack:
    """The devices, the items that they are to run, and what they have reported."""

    def __init__(self, option, env):
        images = env.config.get_images()
        named = {"plan.xml": option.fptest_plan or images.get("plan"),
                 "expect": option.fptest_expect or images.get("expect")}
        self.files = {name: file for name, file in named.items() if file}
        if "plan.xml" not in self.files:
            raise pytest.UsageError(f"{env.config_file}: it has no image \"plan\"; add it, or say "
                                    "--fptest-plan FILE")
        for file in self.files.values():
            if not os.path.isfile(file):
                raise pytest.UsageError(f"{file}: no such file")
        self.items = items_of(self.files["plan.xml"])
        self.options = words_of(option.fptest_options)
        try:
            option.fptest_results.mkdir(parents=True, exist_ok=True)
        except OSError as why:
            raise pytest.UsageError(f"{option.fptest_results}: {why.strerror}") from None
        self.devices, self.reports = {}, {}
        for name in env.config.get_targets():
            try:
                self.devices[name] = Device(env, name, option.fptest_results,
                                            option.fptest_patience)
            except Exception as why:
                raise pytest.UsageError(
                    f"{env.config_file}: target {name}: {one_line(why)}") from None

    def report(self, name, chosen):
        """What the device reports of these items, and why that may not be whole."""
        if name not in self.reports:
            words = self.options + (["--expect", "expect"] if "expect" in self.files else [])
            if len(chosen) < len(self.items):
                words += [f"plan/{group}/{item}" for group, item in chosen]
            self.reports[name] = self.devices[name].run(self.files, words)
        return self.reports[name]


def pytest_generate_tests(metafunc):
    if "ended" in metafunc.fixturenames:
        rack = metafunc.config.fptest_rack
        metafunc.parametrize("ended", [
            pytest.param((device, item), id=f"{device}-{'/'.join(item)}",
                         marks=pytest.mark.xdist_group(device))
            for device in rack.devices for item in rack.items], indirect=True)


@pytest.fixture
def ended(request, record_property):
    """How an item ended on a device, as its JSON line has it."""
    device, item = request.param
    params = (one.callspec.params.get("ended") for one in request.session.items
              if hasattr(one, "callspec"))
    chosen = [param[1] for param in params if param and param[0] == device]
    report, why = request.config.fptest_rack.report(device, chosen)
    ends = report.ends[item]
    for end in ends:
        for name, value in properties_of(end):
            record_property(name, value)
    if report.items and item not in report.items:
        pytest.skip("left out of the run")
    if not ends:
        pytest.fail(f"no report: {why}", pytrace=False)
    has_finished = report.finish.get("finished")
    worst = max(ends, key=lambda end: rank(end["outcome"], has_finished))
    if worst["outcome"] == "not run" and has_finished:
        pytest.skip(worst["reason"] or "not run")
    if worst["outcome"] in ("not run", "stopped"):
        pytest.fail(f"{worst['outcome']}: {worst['reason']}; {why}", pytrace=False)
    if len(ends) < (report.rounds or 0) and not has_finished and worst["outcome"] in GOOD:
        pytest.fail(f"{len(ends)} of {report.rounds} rounds: {why}", pytrace=False)
    return worst


GOOD = ("passed", "flaky", "expected")


def rank(outcome, has_finished):
    if outcome in GOOD:
        return 1 + GOOD.index(outcome)
    if outcome == "not run":
        return 0 if has_finished else 4
    return 5 if outcome == "stopped" else 6


def properties_of(end):
    yield "outcome", end["outcome"]
    if end["seconds"] is not None:
        yield "seconds", end["seconds"]
    if end["description"]:
        yield "description", end["description"]
    for one in end["measurements"]:
        words = [one["value"], one["unit"], one["low"], one["high"]]
        while words[-1] in (None, ""):
            words.pop()
        yield f"measure {one['name']}", " ".join(
            "-" if word in (None, "") else str(word).removesuffix(".0") for word in words)


@pytest.hookimpl(hookwrapper=True)
def pytest_runtest_makereport(item, call):
    """A test takes as long as its item, though all were run together."""
    report = (yield).get_result()
    seconds = [value for name, value in item.user_properties if name == "seconds"]
    if call.when == "call" and seconds:
        report.duration = sum(seconds)
