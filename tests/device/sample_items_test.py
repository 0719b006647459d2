# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""The sample items and the gatherer, as they are run from a shell on the device."""
import re

import pytest

from support.outside import content, shell

pytestmark = pytest.mark.usefixtures("device")

PLAN = """<?xml version="1.0"?>
<Plan><CmdGroup name="sensor"><Cmd name="SpiCheck"/><Cmd name="DeadPixel"/>\
<Cmd name="FingerWait"/><Cmd name="BurnIn"/><Cmd name="QuietRun"/><Cmd name="SensorProbe"/>\
</CmdGroup></Plan>
"""
GATHERED = 'progress="100" result="0" description="gathering {}, 64 samples"'


class Data:
    """/data/vorlane, kept on the host, with a stored plan that every sample item is in."""

    def __init__(self, directory):
        self.directory = directory
        self.plan = directory / "src1.xml"
        self.plan.write_text(PLAN)

    def shell(self, script):
        return shell(script, options=("--data", self.directory))

    def report(self, item):
        """What the plan says of an item: the attributes after its name."""
        plan = content(self.plan).replace("\n", " ")
        return re.search(f'<Cmd name="{item}"(.*?)/>', plan).group(1).strip()


@pytest.fixture
def data(tmp_path):
    return Data(tmp_path)


def reports(err):
    """The result and the progress of every report, in order, from the library's log."""
    return [(int(result), int(progress)) for result, progress in
            re.findall("iResult=(-?[0-9]+) - iProgress=([0-9]+) - iDesc=.+", err)]


# ---- the sample items --------------------------------------------------------------------

@pytest.mark.parametrize("item, status, reported, last", [
    ("SpiCheck", 0, [(-2, progress) for progress in range(10, 100, 10)] + [(0, 100)],
     'progress="100" result="0" description="chip 0x1a2b answers at 8 MHz"'),
    ("DeadPixel", 1, [(-2, 0), (1, 100)],
     'progress="100" result="1" description="3 dead pixels, limit 2"'),
    ("FingerWait", 1, [(-2, 0), (-2, 100)],
     'progress="100" result="-2" description="no finger within 0.05 s"'),
    ("BurnIn", 0, [(-2, progress) for progress in range(0, 100, 5)] + [(0, 100)],
     'progress="100" result="0" description="stable for 0.05 s"'),
])
def test_items_report_their_steps_and_end_as_they_report(item, status, reported, last,
                                                         data):
    outcome = data.shell(f"{item} --group sensor --seconds 0.05")

    assert (outcome.status, reports(outcome.err)) == (status, reported)
    assert data.report(item) == last


def test_burnin_is_still_running_after_a_while_and_ends_by_sigterm(data):
    assert data.shell("BurnIn --group sensor 2>/dev/null & sleep 1; "
                      "kill $! && wait $!; echo $?").out == "143\n"
    assert data.report("BurnIn") == 'progress="0" result="-2" description="0 s of 60 s"'


def test_quietrun_never_reports(data):
    status, _, err = data.shell("QuietRun --group sensor --seconds 0.05")

    assert status == 0
    assert "FPTEST_" not in err
    assert content(data.plan) == PLAN


@pytest.mark.parametrize("command, item", [
    ("DeadPixel_ca", "DeadPixel"), ("FingerWait_ca_qsee", "FingerWait"),
    ("DeadPixel --item QuietRun", "QuietRun")])
def test_items_report_under_the_plans_name_or_the_one_given(command, item, data):
    data.shell(f"{command} --group sensor --seconds 0")

    assert data.report(item) != ""
    assert content(data.plan).count("progress=") == 1


def test_items_do_not_undo_each_others_reports(data):
    data.shell("SpiCheck --group sensor --seconds 0.3 & sleep 0.1; "
               "DeadPixel --group sensor --seconds 0; wait")

    assert data.report("SpiCheck").startswith('progress="100"')
    assert data.report("DeadPixel").startswith('progress="100"')


def test_items_wait_for_whoever_has_the_plan_locked(data):
    assert data.shell(
        "sh -c 'flock 9; sleep 1; echo unlocked' 9</data/vorlane/src1.xml & sleep 0.5; "
        "DeadPixel --group sensor --seconds 0; echo reported; wait").out == (
        "unlocked\nreported\n")


def test_items_leave_a_whole_plan_when_stopped(data):
    # thousandths of a second apart, so that some stops fall into a report
    data.shell("for i in 0 1 2 3 4 5 6 7 8 9; do BurnIn --group sensor --seconds 0.01 & "
               "sleep 0.00$i; kill $!; done; sleep 1")

    assert content(data.plan).endswith("</Plan>\n")


@pytest.mark.parametrize("command, complaint", [
    ("SpiCheck", "SpiCheck: --group is required; see SpiCheck --help\n"),
    ("BurnIn_ca --group g --seconds -1",
     "BurnIn_ca: --seconds: wants a number from 0 to 86400; see BurnIn_ca --help\n"),
    ("SensorProbe --group g --seconds nan",
     "SensorProbe: --seconds: wants a number from 0 to 86400; see SensorProbe --help\n"),
    ("QuietRun --group g --speed 9",
     "QuietRun: The following arguments were not expected: 9 --speed; "
     "see QuietRun --help\n"),
])
def test_items_say_in_one_line_what_is_wrong_with_their_options(command, complaint):
    status, out, err = shell(command)

    assert (status, out) == (1, "")
    assert err.endswith(complaint)


# ---- the gatherer ------------------------------------------------------------------------

LISTENER = " | timeout 5 netcat -l -p 34952 >/dev/null; "
GATHER = "printf 'gather again!'" + LISTENER


def tell_gatherer(data, saying, until):
    """Starts a gatherer, speaks to it, gives it time to come so far, and sees that it runs
    on. What it complained of."""
    _, out, err = data.shell(
        f"/system/bin/SensorProbe --group sensor --seconds 0.02 & {saying}"
        "for i in 1 2 3 4 5 6 7 8 9 10 11 12 13 14 15 16 17 18 19 20; do sleep 0.1; "
        f"grep -q '{until}' /data/vorlane/src1.xml && break; done; "
        "ps | grep -c /system/bin/SensorProbe")

    assert out == "1\n"
    return [line for line in err.splitlines() if line.startswith("SensorProbe: ")]


@pytest.mark.parametrize("saying, times, complaints", [
    (GATHER + GATHER, 2, []),
    ("(printf gather; sleep 0.1; printf ' again!')" + LISTENER, 1, []),
    ("printf gather" + LISTENER + GATHER, 1,
     ["SensorProbe: the trigger ended after 6 of 13 bytes"]),
    ("printf hello" + LISTENER + GATHER, 1,
     ['SensorProbe: the trigger is not "gather again!"']),
], ids=["twice", "in pieces", "after one cut short", "after a wrong one"])
def test_the_gatherer_gathers_each_time_it_is_told(saying, times, complaints, data):
    assert tell_gatherer(data, saying, f"gathering {times}") == complaints
    assert data.report("SensorProbe") == GATHERED.format(times)
    assert content(data.directory / "readings.txt").startswith(f"gatherings {times}\n")


def test_the_gatherer_does_nothing_until_it_is_told(data):
    tell_gatherer(data, "", "no gathering at all")

    assert data.report("SensorProbe") == ""
    assert not (data.directory / "readings.txt").exists()


def test_the_gatherer_of_vendor_two_gathers_once_and_ends(data):
    assert data.shell("SensorProbe_ca_qsee --group sensor --seconds 0").status == 0
    assert data.report("SensorProbe") == GATHERED.format(1)


def test_the_gatherer_reports_that_it_cannot_write_its_readings(data):
    assert data.shell("mkdir /data/vorlane/readings.txt; "
                      "SensorProbe_ca_qsee --group sensor --seconds 0").status == 1
    assert data.report("SensorProbe") == (
        'progress="100" result="1" '
        'description="/data/vorlane/readings.txt cannot be written"')
