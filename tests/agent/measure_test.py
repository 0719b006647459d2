# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What items measure and leave in files, as runs tell it."""
import json
import re
import xml.etree.ElementTree as ET

import pytest

from support.outside import BUILD, make_program, on_device, run, way

pytestmark = pytest.mark.usefixtures("device")

FPTEST = BUILD / "agent/fptest"
PASS = "fptest report G {} --progress 100 --result 0"


class Bench:
    """A device with items that are scripts, and a directory for results."""

    def __init__(self, directory):
        self.bin = directory / "bin"
        self.out = directory / "out"
        self.bin.mkdir()
        self.out.mkdir()

    def run(self, items, *options, path="P/G", group="G"):
        """Runs a group of items, {name: script}, each of which passes."""
        for name, script in items.items():
            program = name.partition(" ")[0]
            make_program(self.bin / program, f"#!/system/bin/sh\n{script}\n" + PASS.format(name))
        cmds = "".join(f'<Cmd name="{name}" args="-"/>' for name in items)
        (self.out / "plan.xml").write_text(
            f'<?xml version="1.0"?><P><CmdGroup name="{group}">{cmds}</CmdGroup></P>')
        return on_device("fptest", "run", "--plan", "plan.xml", "--json", "json", *options, path,
                         options=("--bin", self.bin, "--out", self.out), cwd=self.out)

    def ends(self):
        lines = (self.out / "json").read_text().splitlines()
        return [one for one in map(json.loads, lines) if one["event"] == "end"]

    def end(self):
        one, = self.ends()
        return one

    def values(self):
        return [(one["name"], one["value"]) for one in self.end()["measurements"]]

    def tree(self, top="files"):
        return sorted(str(path.relative_to(self.out)) for path in (self.out / top).rglob("*"))


@pytest.fixture
def bench(tmp_path):
    return Bench(tmp_path)


# ---- measurements ----------------------------------------------------------------------

def test_a_line_of_the_output_measures(bench):
    outcome = bench.run({"Item": "echo '#measure vcore 1.213 V 1.15 1.25'\n"
                                 "fptest measure offset -.5 mV - 0 >&2\nprintf '#measure last 3'"})

    assert outcome.status == 0
    assert bench.end()["measurements"] == [
        {"name": "vcore", "value": 1.213, "unit": "V", "low": 1.15, "high": 1.25},
        {"name": "offset", "value": -0.5, "unit": "mV", "low": None, "high": 0},
        {"name": "last", "value": 3, "unit": None, "low": None, "high": None}]
    assert bench.end()["output"].startswith("#measure vcore 1.213 V 1.15 1.25\n")
    assert "    measured vcore 1.213 V (1.15 to 1.25)\n" in outcome.out


# as a tee or another filter of its output does
PRINTS_AT_ITS_END = "(while kill -0 $$; do :; done 2>/dev/null; echo '#measure v 5 V 0 1') &"


def test_what_an_items_child_prints_at_its_end_is_the_items(bench):
    assert bench.run({"Item": PRINTS_AT_ITS_END, "Next": ":"}, "--judge-limits").status == 1
    item, following = bench.ends()
    assert (item["outcome"], item["left_running"]) == ("failed", [])
    assert item["output"] == "#measure v 5 V 0 1\n"
    assert (following["outcome"], following["output"]) == ("passed", "")


def test_what_is_measured_outlives_the_kept_output(bench):
    bench.run({"Item": "echo '#measure first 1'; /usr/bin/seq 500000; "
                       "echo '#measure last 2'"})

    assert bench.values() == [("first", 1), ("last", 2)]
    assert len(bench.end()["output"]) == 64 * 1024


def test_a_hole_in_the_output_takes_no_time(bench):
    bench.run({"Item": "echo '#measure first 1'; sleep 0.1\n"
                       "/usr/bin/dd bs=1 seek=1T of=/dev/stdout if=/dev/null 2>/dev/null\n"
                       "/usr/bin/truncate -s 1T /proc/self/fd/1; echo; echo '#measure last 2'"},
              "--timeout", "20")

    assert bench.end()["outcome"] == "passed"
    assert bench.values() == [("first", 1), ("last", 2)]


@pytest.mark.parametrize("line", ["y", "#", "#measure a 1"])
def test_an_item_that_prints_without_end_is_stopped_in_time(bench, line):
    bench.run({"Item": f"exec /usr/bin/yes '{line}'"}, "--timeout", "1")

    assert bench.end()["outcome"] == "timed out"
    assert bench.end()["seconds"] < 6
    malformed = re.findall("malformed #measure line.*?'(.*?)'", bench.end()["warning"] or "")
    assert not malformed or line.startswith(malformed[0]), "but the last one may be cut short"


@pytest.mark.parametrize("options, status, outcome", [
    ((), 0, "passed"), (("--judge-limits",), 1, "failed")])
def test_limits_are_judged_if_the_user_asks(bench, options, status, outcome):
    ended = bench.run({"Item": "fptest measure vcore 1.4 V - 1.3"}, *options)

    assert (ended.status, bench.end()["outcome"]) == (status, outcome)
    assert "    measured vcore 1.4 V (at most 1.3): out of limits\n" in ended.out
    assert bench.end()["reason"] == (
        "1 measurement out of limits: vcore 1.4 V (at most 1.3), though it reported the result 0"
        if status else None)


@pytest.mark.parametrize("to", ["> /dev/stderr", "> /dev/stdout", "| tee /proc/self/fd/1"])
def test_limits_cannot_be_judged_where_measurements_may_be_lost(bench, to):
    lost = ("it has opened its output anew, as '> /dev/stderr' does, and what it had just printed "
            "may be lost: write '>&2'")
    items = {"Item": f"fptest measure v 5 V 0 1; echo log {to}; echo more", "Next": "echo more"}

    assert bench.run(items).status == 0
    assert [one["warning"] for one in bench.ends()] == [lost, None]
    assert bench.run(items, "--judge-limits").status == 1
    item, following = bench.ends()
    assert item["reason"] in (  # by chance
        f"limits cannot be judged, though it reported the result 0: {lost}",
        "1 measurement out of limits: v 5 V (0 to 1), though it reported the result 0")
    assert following["outcome"] == "passed"


def test_an_item_that_changes_how_its_output_is_written_costs_no_other(bench):
    bench.run({"Item": "/usr/bin/python3 -c 'import fcntl; fcntl.fcntl(1, fcntl.F_SETFL, 0)'\n"
                       "echo one; sleep 0.1; echo two",
               "Next": "for i in 1 2 3 4 5 6 7 8; do echo \"#measure v$i 1\"; sleep 0.03; done"})

    item, following = bench.ends()
    assert item["output"] == "one\ntwo\n"
    assert len(following["measurements"]) == 8
    assert following["output"].count("\n") == 8
    assert (item["warning"], following["warning"]) == (None, None)


def test_what_is_appended_loses_nothing(bench):
    assert bench.run({"Item": "echo '#measure v 1'; echo log >> /dev/stderr"},
                     "--judge-limits").status == 0
    assert (bench.end()["warning"], bench.values()) == (None, [("v", 1)])


def test_a_malformed_line_is_output_with_a_warning(bench):
    ended = bench.run({"Item": "echo '#measure vcore 0x12'; echo '#measure vcore 1'"})

    assert (ended.status, bench.values()) == (0, [("vcore", 1)])
    assert bench.end()["output"] == "#measure vcore 0x12\n#measure vcore 1\n"
    warning = ("1 malformed #measure line: '#measure vcore 0x12': '0x12' is not a number such as "
               "-1.5 or 2e-6")
    assert bench.end()["warning"] == warning
    assert f"    warning: {warning}\n" in ended.out


def test_an_item_that_is_stopped_has_measured(bench):
    bench.run({"Item": "echo '#measure a 1'; sleep 60"}, "--timeout", "0.5")

    assert bench.end()["outcome"] == "timed out"
    assert bench.values() == [("a", 1)]


def test_each_item_and_round_has_its_own(bench):
    bench.run({"One": "echo '#measure a 1'; printf '#measure'", "Two": "echo ' b 2'"},
              "--as-group", "--repeat", "2")

    assert [[one["name"] for one in end["measurements"]] for end in bench.ends()] == [
        ["a"], [], ["a"], []]


GATHERER = """#!/usr/bin/python3
import os, socket, struct, subprocess, time
for gathering in range(9):
    while True:
        try:
            trigger = socket.create_connection(("127.0.0.1", 34952))
            if trigger.getsockname() != trigger.getpeername():
                trigger.recv(100)
                break
            # it got that port as nobody listens, met itself, and would hold the port
            trigger.setsockopt(socket.SOL_SOCKET, socket.SO_LINGER, struct.pack("ii", 1, 0))
            trigger.close()
        except OSError:
            time.sleep(0.01)
    print("#measure samples 64", flush=True)
    if gathering > 0 and "FPTEST_ITEM_DIR" in os.environ:
        open(os.environ["FPTEST_ITEM_DIR"] + f"/{gathering}", "w")
    subprocess.run("fptest report G SensorProbe --progress 100 --result 0".split())
"""


def gather(bench, *options, runs=1, prints=0, begins="", status=0):
    make_program(bench.bin / "SensorProbe",
                 GATHERER.replace("64", f"64\\n{'x' * prints}", 1)
                 .replace("for", f"print('{begins}', flush=True)\nfor", 1))
    (bench.out / "plan.xml").write_text('<?xml version="1.0"?><P><CmdGroup name="G">'
                                        '<Cmd name="SensorProbe" args="-"/></CmdGroup></P>')
    run = ["fptest", "run", "--plan", "plan.xml", "--json", "json", *options, "P/G"]
    ended = on_device("sh", "-ec", ";".join([" ".join(run)] * runs),
                      options=("--bin", bench.bin, "--out", bench.out), cwd=bench.out)
    assert ended.status == status, ended
    return ended.err.splitlines()


def test_a_gatherer_measures_before_it_reports(bench):
    gather(bench, "--repeat", "3")

    assert [[one["name"] for one in end["measurements"]] for end in bench.ends()] == [
        ["samples"]] * 3


def test_what_is_printed_between_two_items_is_the_next_ones(bench):
    counts = ("/usr/bin/python3 -uc 'import time\nfor line in range(100000):\n"
              "  print(line); time.sleep(0.0005)' | tee lines &\n"
              "until test -s lines; do sleep 0.01; done")
    bench.run({"First": counts} | {f"Item{number}": "sleep 0.1" for number in range(6)})

    lines = "".join(end["output"] for end in bench.ends()).split()
    assert len(lines) > 20
    assert lines == [str(line) for line in range(len(lines))]


def test_a_gatherer_has_one_directory_for_the_whole_run(bench):
    gather(bench, "--repeat", "3", "--files", "files")

    assert [(end["directory"], end["files"]) for end in bench.ends()] == [
        (None, []), ("files/G/SensorProbe", ["1"]), ("files/G/SensorProbe", ["1", "2"])]


def test_an_empty_directory_of_the_gatherer_is_removed_in_the_end(bench):
    gather(bench, "--files", "files")

    assert bench.tree() == []


@pytest.mark.parametrize("options", [["--judge-limits"], ["--files", "files"]])
def test_a_gatherer_of_an_earlier_run_is_ended_first(bench, options):
    assert gather(bench, *options, runs=2) == [
        "fptest: the running gatherer is ended first: "
        "its measurements and files would be the run's that started it"]

    assert len(bench.end()["measurements"]) == 1


def test_a_gatherer_out_of_limits_is_started_anew_before_it_is_tried_again(bench):
    gather(bench, "--judge-limits", "--retry", "1", begins="#measure self 5 V 0 2", status=1)

    assert bench.end()["reason"].startswith("1 measurement out of limits: self 5 V (0 to 2)")
    assert bench.end()["attempt"] == 2


def test_a_gatherer_that_has_printed_much_is_ended_before_its_next_run(bench):
    said = gather(bench, runs=6, prints=300_000)

    assert said == ["fptest: the running gatherer is ended first: "
                    "it has printed more than can be kept for it"]


# ---- fptest measure ----------------------------------------------------------------------

@pytest.mark.parametrize("words", [
    "vcore 1.213", "vcore -.5", "vcore -1.5e-3 mV", "vcore +1 % - 2", "vcore 1 - -3 -", "-- a -1"])
def test_measure_prints_the_line(words):
    line = "#measure " + words.removeprefix("-- ")

    assert run(FPTEST, "measure", *words.split()) == (0, f"{line}\n", "")


@pytest.mark.parametrize("words, said", [
    ([], "NAME is required"),
    (["vcore"], "VALUE is required"),
    (["refused:", "1"], "fptest measure has refused it"),
    (["a b", "1"], "'a b' is not a name: letters, digits, '_', '.' and '-', at most 64, "
                    "no '.' or '-' first"),
    (["--log", "1"], "'--log' is not a name: letters, digits, '_', '.' and '-', at most 64, "
                     "no '.' or '-' first"),
    (["a", ""], "'' is not a number such as -1.5 or 2e-6"),
    (["a", "1\n#measure b 2"],
     "'1␊#measure b 2' is not a number such as -1.5 or 2e-6"),
    (["a", "1", "m V"], "'m V' is not a unit of 1 to 16 characters"),
    (["a", "1", ""], "'' is not a unit of 1 to 16 characters"),
    (["a", "1", "V", "2"], "LOW is there without HIGH: write '-' for no limit"),
    (["a", "1", "V", "3", "2"], "LOW 3 is above HIGH 2"),
    (["a", "1", "V", "2", "3", "4"], "'4' is one argument too many")])
def test_measure_refuses_what_is_no_measurement(words, said):
    is_usage = said.endswith(("is required", "too many"))
    why = "its arguments are no measurement" if is_usage else said
    assert run(FPTEST, "measure", *words) == (
        2, f"#measure refused: {why}\n", f"fptest: {said}; see fptest measure --help\n")


def test_a_script_that_goes_on_after_a_refused_measurement_has_a_warning(bench):
    ended = bench.run({"Item": "fptest measure vcore '' uV 1 2"}, "--judge-limits")

    said = ("1 malformed #measure line: '#measure refused: '' is not a number such as -1.5 or "
            "2e-6': fptest measure has refused it")
    assert bench.end()["warning"] == said
    assert ended.status == 1
    assert bench.end()["reason"] == (
        f"limits cannot be judged, though it reported the result 0: {said}")


def test_help_tells_the_words():
    help_text = run(FPTEST, "measure", "--help").out

    assert "Usage: fptest measure [OPTIONS] NAME VALUE [UNIT] [LOW] [HIGH]\n" in help_text


# ---- files -------------------------------------------------------------------------------

LEAVES = 'echo text >"$FPTEST_ITEM_DIR/dump"; mkdir "$FPTEST_ITEM_DIR/sub"; : >"$FPTEST_ITEM_DIR/sub/x"'


def test_files_are_kept_and_named_in_all_reports(bench):
    ended = bench.run({"Item": f'ls -A "$FPTEST_ITEM_DIR"; echo "$FPTEST_ITEM_DIR"; {LEAVES}',
                       "None": "test -d $FPTEST_ITEM_DIR"},
                      "--files", "files", "--junit", "junit", "--exit-status")

    assert ended.status == 0
    assert bench.tree() == ["files/G", "files/G/Item", "files/G/Item/dump", "files/G/Item/sub",
                            "files/G/Item/sub/x"]
    left, none = bench.ends()
    assert left["output"] == f"{bench.out}/files/G/Item\n"
    assert (left["directory"], left["files"]) == ("files/G/Item", ["dump", "sub/x"])
    assert (none["directory"], none["files"]) == (None, [])
    assert "    files in files/G/Item: dump, sub/x\n" in ended.out
    case, other = ET.parse(bench.out / "junit").iter("testcase")
    assert case.find("system-out").text.endswith(
        "\n[[ATTACHMENT|files/G/Item/dump]]\n[[ATTACHMENT|files/G/Item/sub/x]]\n")
    assert other.find("system-out") is None


def test_files_of_every_attempt_are_named_in_junit(bench):
    bench.run({"Item": LEAVES + "; exit 1"}, "--files", "files", "--junit", "junit",
              "--exit-status", "--retry", "1")

    case, = ET.parse(bench.out / "junit").iter("testcase")
    named = [re.findall(r"\[\[ATTACHMENT\|(.*)\]\]", case.find(element).text)
             for element in ("rerunError", "system-out")]
    assert [len(files) for files in named] == [2, 2]
    assert not set(named[0]) & set(named[1])
    assert all((bench.out / file).exists() for files in named for file in files)


def test_files_are_named_in_tap(bench):
    ended = bench.run({"Item": LEAVES}, "--files", "files", "--tap")

    assert '        - path: "sub/x"\n' in ended.out


def test_rounds_have_directories_of_their_own(bench):
    bench.run({"Item": 'test -z "$(ls -A $FPTEST_ITEM_DIR)" && : >$FPTEST_ITEM_DIR/x'},
              "--files", "files/a/", "--repeat", "2", "--exit-status", "--as-group")

    assert bench.tree("files/a") == [
        f"files/a/{path}" for path in (
            "round-1", "round-1/G", "round-1/G/Item", "round-1/G/Item/x",
            "round-2", "round-2/G", "round-2/G/Item", "round-2/G/Item/x")]
    assert [end["directory"] for end in bench.ends()] == ["files/a/round-1/G/Item",
                                                          "files/a/round-2/G/Item"]


def test_no_two_items_share_a_directory(bench):
    script = 'test -z "$(ls -A $FPTEST_ITEM_DIR)" && : >$FPTEST_ITEM_DIR/x'
    for _ in range(2):  # the second time beside the files of the first
        bench.run({"Item": script}, "--files", "files", "--exit-status", "P/G", path="P/G/Item")
        assert {end["outcome"] for end in bench.ends()} == {"passed"}

    assert [path for path in bench.tree() if path.count("/") == 2] == [
        "files/G/Item", "files/G/Item.2", "files/G/Item.3", "files/G/Item.4"]


def test_names_are_made_safe(bench):
    make_program(bench.bin / "Item", '#!/system/bin/sh\n: >"$FPTEST_ITEM_DIR/x"\n')
    (bench.out / "plan.xml").write_text(
        '<?xml version="1.0"?><P><CmdGroup name="..&#228; #1"><Cmd name="Item" args="-"/></CmdGroup></P>')
    on_device("fptest", "run", "--plan", "plan.xml", "--json", "json", "--files", "files",
              "P/..\u00e4 #1", options=("--bin", bench.bin, "--out", bench.out), cwd=bench.out)

    assert bench.end()["directory"] == "files/_.____1/Item"
    assert "files/_.____1/Item/x" in bench.tree()


def test_a_directory_that_fptest_may_not_list_is_told(bench):
    bench.run({"Item": "cd $FPTEST_ITEM_DIR; mkdir z; touch a z/x; chmod 0 z; ls z",
               "Other": "chmod 0 $FPTEST_ITEM_DIR"}, "--files", "files")

    item, other = bench.ends()
    may_list = item["output"] == "x\n"  # as an almighty root
    warning = None if may_list else "not all of its files are named"
    assert (item["files"], item["warning"]) == (["a", "z/x"] if may_list else ["a"], warning)
    assert other["warning"] == warning


def test_only_some_of_many_files_are_named(bench):
    bench.run({"Item": 'cd $FPTEST_ITEM_DIR; for n in 1 2 3 4 5 6 7 8 9 10; do '
                       'touch $n $n.a $n.b $n.c $n.d $n.e $n.f $n.g $n.h $n.i $n.j; done'},
              "--files", "files")

    assert len(bench.end()["files"]) == 100
    assert bench.end()["warning"] == "not all of its files are named"


def test_links_are_named_and_not_followed(bench):
    bench.run({"Item": 'ln -s / $FPTEST_ITEM_DIR/root'}, "--files", "files")

    assert bench.end()["files"] == ["root"]


def test_an_item_that_was_not_reached_leaves_no_directory(bench):
    interrupt = "read one two three parent rest </proc/$PPID/stat; kill -INT $parent; sleep 60"
    outcome = bench.run({"One": f"ls files/G; {interrupt}", "Two": "exit"}, "--files", "files",
                        "--as-group")

    assert outcome.status == 130
    assert [end["outcome"] for end in bench.ends()] == ["stopped", "not run"]
    assert bench.ends()[0]["output"].startswith("One\nTwo\n")
    assert bench.tree() == []


def test_a_directory_that_cannot_be_written_is_refused(bench):
    (bench.out / "file").touch()
    outcome = bench.run({"Item": "echo ran"}, "--files", "file")
    assert outcome == (3, "", "fptest: file: Not a directory; nothing was run\n")
    assert not (bench.out / "json").exists()

    outcome = bench.run({"Item": "echo ran"}, "--files", "/proc/files")
    assert outcome == (3, "", "fptest: /proc/files: No such file or directory; nothing was run\n")

    if way() != "in-place":  # where it would be made
        outcome = bench.run({"Item": "echo ran"}, "--files", "/usr/files")
        assert (outcome.status, outcome.out) == (3, "")
        assert "/usr/files: the host's directories are read-only on the vir" in outcome.err

    outcome = bench.run({"Item": "echo ran"}, "--files=")
    assert outcome == (2, "", "fptest: --files: its value is empty; see fptest run --help\n")

    outcome = bench.run({"Item": "echo ran"}, "--files", "json")
    assert outcome == (2, "", "fptest: --json and --files both want the file json: give them "
                              "files of their own\n")


def test_a_directory_that_is_lost_with_the_device_is_told(bench):
    outcome = bench.run({"Item": "exit"}, "--files", "/tmp")

    is_lost = way() != "in-place"
    assert ("--files /tmp is lost when the virtual device ends" in outcome.err) == is_lost


def test_an_item_may_remove_its_directory(bench):
    bench.run({"Item": "rm -r $FPTEST_ITEM_DIR"}, "--files", "files")

    assert (bench.end()["directory"], bench.end()["files"]) == (None, [])
    assert bench.end()["warning"] == "its directory for files was removed"


def test_an_item_whose_directory_cannot_be_made_has_a_warning(bench):
    outcome = bench.run({"Item": "rm -r files/G; touch files/G",
                         "Other": "echo ${FPTEST_ITEM_DIR-none}"}, "--files", "files")

    assert outcome.status == 0
    assert bench.ends()[1]["output"] == "none\n"
    assert bench.ends()[1]["warning"] == (
        "it had no directory for files: files/G: Not a directory")
