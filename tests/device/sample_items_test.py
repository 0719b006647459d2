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
])
def test_items_report_their_steps_and_end_as_they_report(item, status, reported, last,
                                                         data):
    outcome = data.shell(f"{item} --group sensor --seconds 0.05")

    assert (outcome.status, reports(outcome.err)) == (status, reported)
    assert data.report(item) == last


def test_burnin_reports_now_and_then_and_passes_in_the_end(data):
    status, _, err = data.shell("BurnIn --group sensor --seconds 0.1")

    assert status == 0
    assert len(reports(err)) == 21
    assert reports(err)[1] == (-2, 5)
    assert data.report("BurnIn") == (
        'progress="100" result="0" description="stable for 0.1 s"')


def test_burnin_is_still_running_after_a_while_and_ends_by_sigterm(data):
    assert data.shell("BurnIn --group sensor 2>/dev/null & sleep 1; "
                      "kill $! && wait $!; echo $?").out == "143\n"
    assert data.report("BurnIn") == 'progress="0" result="-2" description="0 s of 60 s"'


def test_quietrun_never_reports(data):
    status, _, err = data.shell("QuietRun --group sensor --seconds 0.05")

    assert status == 0
    assert "FPTEST_" not in err
    assert content(data.plan) == PLAN


def test_vendor_variants_report_under_the_plans_name(data):
    data.shell("DeadPixel_ca --group sensor --seconds 0; "
               "FingerWait_ca_qsee --group sensor --seconds 0")

    assert data.report("DeadPixel") != ""
    assert data.report("FingerWait") != ""


def test_items_report_under_the_name_given(data):
    data.shell("DeadPixel --group sensor --item QuietRun --seconds 0")

    assert data.report("DeadPixel") == ""
    assert data.report("QuietRun") != ""


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

def say(text):
    """Listens once on the library's port and says that."""
    return f"printf '{text}' | timeout 5 netcat -l -p 34952 >/dev/null; "


def gatherers_complaints(data, saying, until):
    """Starts a gatherer, speaks to it, and gives it time to come to a gathering; it runs
    on. What it complained of."""
    _, out, err = data.shell(
        f"/system/bin/SensorProbe --group sensor --seconds 0.02 & {saying}"
        "for i in 1 2 3 4 5 6 7 8 9 10 11 12 13 14 15 16 17 18 19 20; do sleep 0.1; "
        f"grep -q '{until}' /data/vorlane/src1.xml && break; done; "
        "ps | grep -c /system/bin/SensorProbe")

    assert out == "1\n"
    return [line for line in err.splitlines() if line.startswith("SensorProbe: ")]


def test_the_gatherer_gathers_each_time_it_is_told(data):
    assert not gatherers_complaints(data, 2 * say("gather again!"), "gathering 2")
    assert data.report("SensorProbe") == GATHERED.format(2)
    assert content(data.directory / "readings.txt").startswith("gatherings 2\n")


def test_the_gatherer_does_nothing_until_it_is_told(data):
    gatherers_complaints(data, "", "no gathering at all")

    assert data.report("SensorProbe") == ""
    assert not (data.directory / "readings.txt").exists()


@pytest.mark.parametrize("trigger, complaint", [
    ("gather", "SensorProbe: the trigger ended after 6 of 13 bytes"),
    ("hello", 'SensorProbe: the trigger is not "gather again!"')])
def test_the_gatherer_outlives_a_wrong_trigger(trigger, complaint, data):
    assert gatherers_complaints(data, say(trigger) + say("gather again!"),
                                "gathering 1") == [complaint]
    assert data.report("SensorProbe") == GATHERED.format(1)


def test_the_gatherer_puts_a_trigger_together_that_comes_in_pieces(data):
    gatherers_complaints(data, "(printf gather; sleep 0.1; printf ' again!') | "
                               "timeout 5 netcat -l -p 34952 >/dev/null; ", "gathering 1")

    assert data.report("SensorProbe") == GATHERED.format(1)


def test_the_gatherer_of_vendor_two_gathers_once_and_ends(data):
    assert data.shell("SensorProbe_ca_qsee --group sensor --seconds 0").status == 0
    assert data.report("SensorProbe") == GATHERED.format(1)


def test_the_gatherer_reports_that_it_cannot_write_its_readings(data):
    assert data.shell("mkdir /data/vorlane/readings.txt; "
                      "SensorProbe_ca_qsee --group sensor --seconds 0").status == 1
    assert data.report("SensorProbe") == (
        'progress="100" result="1" '
        'description="/data/vorlane/readings.txt cannot be written"')
