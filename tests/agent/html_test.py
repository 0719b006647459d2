# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""fptest html: the page that it makes of runs' JSON lines, read as XML."""
import resource
import xml.etree.ElementTree as ET

import pytest

from support.json_lines import HOSTILE, Lines, hostile_run, measured
from support.outside import BUILD, run

FPTEST = BUILD / "agent/fptest"
USAGE = "fptest: FILE is required; see fptest html --help\n"


class Page:
    def __init__(self, outcome, errors=""):
        assert (outcome.status, outcome.err) == (0, errors)
        self.text = outcome.out
        self.tree = ET.fromstring(outcome.out)
        self.of = {one.get("id"): one for one in self.tree.iter() if one.get("id")}
        assert len(self.of) == outcome.out.count(' id="')

    def all(self, tag, style=None):
        return [one for one in self.tree.iter(tag) if style in (None, one.get("class"))]

    def rows(self, part="tbody"):
        """Of all tables, the cells of each row."""
        return [list(row) for table in self.all("table") for row in table.find(part)]

    def led_to(self, cell):
        return self.of[cell.find("a").get("href").removeprefix("#")]

    def facts(self, anchor):
        return facts(self.of[anchor])


def text(element):
    return "".join(element.itertext())


def facts(element):
    names, values = list(element.iter("dt")), list(element.iter("dd"))
    return dict(zip(map(text, names), map(text, values), strict=True))


@pytest.fixture
def page(tmp_path):
    """Makes the page of these runs, each in a file of its own."""
    def page(*runs, errors=""):
        files = [one.write(tmp_path / f"{at}.jsonl") for at, one in enumerate(runs)]
        return Page(run(FPTEST, "html", *files), errors)
    return page


# ---- one run ---------------------------------------------------------------------------

OUTCOMES = {"passed": "P", "failed": "F", "no result": "N", "timed out": "T", "stopped": "S",
            "not run": "-", "flaky": "L", "expected": "E", "unexpected": "U"}


def test_each_item_of_a_run_is_a_row_with_its_outcome(page):
    run = Lines([f"G/{word.replace(' ', '_')}" for word in OUTCOMES])
    for index, word in enumerate(OUTCOMES):
        run.end(index, word)
    shown = page(run.finish())

    rows = shown.rows()
    assert [text(row[0]) for row in rows] == list(OUTCOMES)
    for row, word in zip(rows, OUTCOMES, strict=True):
        assert f"G/{word.replace(' ', '_')}" in text(row[1])
        assert text(shown.led_to(row[0]).find("h4/span")) == word
    styles = {word: row[0].find("a").get("class") for row, word in zip(rows, OUTCOMES)}
    assert styles["passed"] != styles["failed"] != styles["not run"]
    for word, letter in OUTCOMES.items():
        assert f"{letter} 1 {word}" in text(shown.all("p", "tally")[0])


def test_an_item_has_all_that_is_known_of_it(page):
    shown = page(Lines().end(
        outcome="failed", result="1", progress="50", description="3 dead\nlimit 2",
        reason="too many", seconds=1.5, exit_status=3, signal=None, warning="a line is malformed",
        left_running=[{"name": "sh", "pid": 812}], directory="files/G/A", files=["a.png", "b"],
        measurements=[measured("vcore", 1.4, "V", 1.1, 1.3), measured("n", 3)],
        output="\nfirst\n<b>last</b>\n", expected="QM-7").finish())

    cell, item, time = shown.rows()[0]
    assert (text(time), text(item.find("p"))) == ("1.500 s", "3 dead␊limit 2")
    article = shown.led_to(cell)
    assert text(article.find("p")) == "3 dead\nlimit 2"
    assert facts(article) == {
        "Reason": "too many", "Known to fail": "QM-7", "Result": "1", "Progress": "50",
        "Start": "2026-11-23T07:00:01.000Z", "Process": "exit status 3",
        "Left running": "sh (pid 812)", "Warning": "a line is malformed",
        "Measured": "vcore 1.4 V (1.1 to 1.3) out of limitsn 3",
        "Files": "files/G/A/a.pngfiles/G/A/b"}
    assert text(article.find("details/summary")) == "Output, 3 lines"
    assert text(article.find("details/pre")) == "\n\nfirst\n<b>last</b>\n"
    assert article.find("details").get("open") is not None
    assert "1.500 s" in text(article.find("h4"))


def test_the_output_of_what_passed_is_folded(page):
    details = page(Lines().end(output="x").finish()).of["r1i1"].find("details")
    assert (details.get("open"), text(details.find("summary"))) == (None, "Output, 1 line")


def test_a_run_says_whose_it_is_and_how_it_ended(page):
    shown = page(Lines(labels={"device": "qm-1", "site": "lab 2"}, vendor=1, retries=2, seed=42,
                       resumed="before.jsonl", version="2.0", library_version="1.1")
                 .finish("interrupted by SIGINT", finished=False))

    assert shown.facts("r1") | {"File": ""} == {
        "End": "not finished: interrupted by SIGINT", "File": "",
        "Labels": "device=qm-1, site=lab 2", "Start": "2026-11-23T07:00:00.000Z", "Time": "1.5 s",
        "Run": "vendor 1, shuffled with seed 42, at most 3 attempts, resumed from before.jsonl",
        "fptest": "2.0", "Library": "1.1"}
    assert text(shown.all("h2")[0]) == "plan.xml: qm-1 not finished"
    assert "d1" in text(shown.all("p", "digest")[0])


def test_attempts_are_told_each(page):
    shown = page(Lines(retries=2).start().end(event="retry", outcome="failed", attempt=1,
                                              description="cold", output="one")
                 .start(attempt=2).end(event="retry", outcome="timed out", attempt=2)
                 .start(attempt=3).end(outcome="flaky", attempt=3, description="warm").finish())

    attempts = shown.of["r1i1"].findall("section")
    assert [text(one.find("h6")).split()[:3] for one in attempts] == [
        ["Attempt", "1", "failed"], ["Attempt", "2", "timed"], ["Attempt", "3", "flaky"]]
    assert [text(one.find("p")) for one in attempts] == ["cold", "fine", "warm"]
    assert text(attempts[0].find("details/pre")) == "\none"


def test_each_round_of_a_run_has_a_cell(page):
    run = Lines(["G/A", "G/B"], rounds=3)
    for index, outcome in enumerate(["passed", "passed", "failed", "passed", "passed", "flaky"]):
        run.end(index, outcome, description=f"number {index}")
    shown = page(run.finish())

    rows = shown.rows()
    assert [text(row[0]) for row in rows] == ["failed", "flaky"]
    cells = [row[1].find("div") for row in rows]
    assert [text(one) for one in cells] == ["PFP", "PPL"]
    for item, of_item in enumerate(cells):
        for number, link in enumerate(of_item):
            there = shown.of[link.get("href").removeprefix("#")]
            assert text(there.find("h5")).startswith(f"Round {number + 1} ")
            assert text(there.find("p")) == f"number {2 * number + item}"


def test_a_report_after_the_end_is_told(page):
    run = Lines(["G/A", "G/B"], rounds=2)
    for index in range(4):
        run.end(index)
    run.of_item("late", 2, progress="100", result="1", description="too <late>")
    shown = page(run.finish())
    late = "Late report, result 1, which changed nothing: too <late>"
    assert [text(one) for one in shown.of["r1i1n2"].findall("p")] == ["fine", late]
    assert shown.text.count("Late report") == 1


# ---- a rack ----------------------------------------------------------------------------

def test_thirty_devices_by_five_items(page):
    words = list(OUTCOMES)
    outcome = {(device, item): words[(device * 7 + item * 3) % 9]
               for device in range(30) for item in range(5)}
    runs = []
    for device in range(30):
        one = Lines([f"G/I{item}" for item in range(5)], device=f"qm-{device}")
        for item in range(5):
            one.end(item, outcome[device, item], description=f"{device} {item}")
        runs.append(one.finish())
    shown = page(*runs)

    rows = shown.rows()
    assert [text(row[0]) for row in rows] == [f"qm-{device}" for device in range(30)]
    assert [text(one) for one in shown.rows("thead")[0]] == [
        "Device", *(f"G/I{item}" for item in range(5)), "Passed"]
    good = {"passed", "flaky"}
    for device, row in enumerate(rows):
        assert text(shown.led_to(row[0]).find("h3")) == f"qm-{device}"
        for item, cell in enumerate(row[1:6]):
            word = outcome[device, item]
            assert text(cell) == OUTCOMES[word]
            assert cell.find("a").get("title") == f"qm-{device}, G/I{item}: {word}"
            article = shown.led_to(cell)
            assert text(article.find("p")) == f"{device} {item}"
            assert shown.led_to(article.find("h4/small")) is shown.of[f"r{device + 1}"]
        assert text(row[6]) == f"{sum(outcome[device, i] in good for i in range(5))}/5"
    assert [text(one) for one in shown.rows("tfoot")[0][1:6]] == [
        f"{sum(outcome[device, item] in good for device in range(30))}/30" for item in range(5)]
    assert text(shown.all("h2")[0]) == "plan.xml: 30 devices"
    assert len(shown.all("table")) == 1


def test_items_that_a_run_was_not_asked_for_have_no_cell(page):
    shown = page(Lines(["G/A", "G/B"]).end(0).end(1, "failed").finish(),
                 Lines(["G/C", "G/B"], device="two").end(0).end(1).finish())

    assert [text(one) for one in shown.rows("thead")[0]] == [
        "Device", "G/A", "G/B", "G/C", "Passed"]
    assert [[text(one) for one in row] for row in shown.rows()] == [
        ["one", "P", "F", "", "1/2"], ["two", "", "P", "P", "2/2"]]
    assert [text(one) for one in shown.rows("tfoot")[0]] == ["Passed", "1/1", "1/2", "1/1", ""]


def test_an_item_that_was_asked_for_twice_has_two_cells(page):
    both = [Lines(["G/A", "G/A"], device=name).end(0).end(1, "failed").finish() for name in "xy"]
    assert [text(one) for one in page(*both).rows()[1]] == ["y", "P", "F", "1/2"]


def test_a_cell_of_several_rounds_has_the_worst_outcome_and_how_often(page):
    run = Lines(rounds=3).end(0).end(1, "timed out").end(2, "failed").finish()
    shown = page(run, Lines(device="two", rounds=3).end(0).end(1).end(2).finish())

    assert [text(row[1]) for row in shown.rows()] == ["F2", "P"]
    assert shown.rows()[0][1].find("a").get("title") == "one, G/A: failed, 2 of 3 rounds not passed"
    assert len(shown.led_to(shown.rows()[0][1]).findall("section")) == 3


def test_runs_of_different_plans_have_a_table_each(page):
    shown = page(Lines().end().finish(), Lines(["H/B"], plan_digest="d2", plan="b.xml").finish(),
                 Lines(device="three").end().finish(), Lines(plan_digest=None).finish())

    assert [text(one) for one in shown.all("h2")] == [
        "plan.xml: 2 devices", "b.xml: one", "plan.xml: one"]
    assert "These are runs of 3 plans: a table for each." in text(shown.tree)
    assert [text(row[0]) for row in shown.rows()] == ["one", "three", "not run", "not run"]


def test_runs_of_one_device_are_told_apart_by_their_files(page):
    shown = page(Lines().finish(), Lines().finish(), Lines(device="two").finish())
    assert [text(row[0]) for row in shown.rows()] == ["one (0.jsonl)", "one (1.jsonl)", "two"]
    assert text(shown.all("h2")[0]) == "plan.xml: 3 runs"


def test_files_of_one_name_are_told_apart_by_their_paths(tmp_path):
    for name in ("a", "b"):
        (tmp_path / name).mkdir()
        Lines().finish().write(tmp_path / name / "r.jsonl")
    shown = Page(run(FPTEST, "html", "a/r.jsonl", "b/r.jsonl", cwd=tmp_path))
    assert [text(row[0]) for row in shown.rows()] == ["one (a/r.jsonl)", "one (b/r.jsonl)"]


def test_a_run_without_labels_is_named_by_its_file(page, tmp_path):
    shown = page(Lines(labels={}).end().finish())
    assert text(shown.all("h2")[0]) == f"plan.xml: {tmp_path}/0.jsonl"


def test_the_page_is_the_same_each_time(page):
    runs = [Lines(device=name).end(measurements=[measured("a", 1)]).finish() for name in "xyz"]
    assert page(*runs).text == page(*runs).text


# ---- plots -----------------------------------------------------------------------------

def coordinates(figure):
    """The heights of points, from the top."""
    return [float(one.get("cy")) for one in figure.iter("circle")]


def limits(figure):
    return [text(one) for one in figure.iter("text")]


def test_a_measurement_is_plotted_over_devices(page):
    values = [1.2, 1.21, 1.31, 1.2]
    shown = page(*(Lines(device=f"d{at}").end(measurements=[
        measured("vcore", value, "V", 1.15, 1.25), measured("other", at)]).finish()
        for at, value in enumerate(values)))

    other, vcore = shown.all("figure")
    assert text(vcore.find("figcaption")) == (
        "G/A vcore 1.2 to 1.31 V, 4 devices, 1 value out of limits")
    assert text(other.find("figcaption")) == "G/A other 0 to 3, 4 devices"
    assert limits(vcore) == ["1.15", "1.25"] and limits(other) == []
    low, high = [one for one in vcore.iter("path") if one.get("class") == "limit"]
    bottom, top = [float(one.get("d").split()[1].partition("H")[0]) for one in (low, high)]
    heights = coordinates(vcore)
    assert len(heights) == 3 and top < heights[1] < heights[0] == heights[2] < bottom
    out, = [one for one in vcore.iter("path") if one.get("class") == "out"]
    assert float(out.get("d").split()[1].partition("L")[0]) < top
    assert [(one.get("href"), text(one.find("title"))) for one in vcore.iter("a")] == [
        (f"#r{at + 1}i1", f"d{at}: vcore {value} V (1.15 to 1.25)")
        for at, value in enumerate(values)]
    across = [float(one.get("cx")) for one in other.iter("circle")]
    assert across == sorted(across) and len(set(across)) == 4


def test_of_one_run_it_is_plotted_over_rounds_or_values(page):
    run = Lines(rounds=3)
    for at in range(3):
        run.end(at, measurements=[measured("a", at), measured("a", at + 10)])
    figure, = page(run.finish()).all("figure")
    assert text(figure.find("figcaption")) == "G/A a 0 to 12, 3 rounds"
    assert len(coordinates(figure)) == 6 and len(list(figure.iter("path"))) == 3
    assert text(next(figure.iter("title"))) == "one, round 1: a 10"

    figure, = page(Lines().end(measurements=[measured("a", at, "mV", None, 5) for at in range(7)])
                   .finish()).all("figure")
    assert text(figure.find("figcaption")) == "G/A a 0 to 6 mV, 7 values, 1 value out of limits"
    assert len(coordinates(figure)) == 6 and limits(figure) == ["5"]


def test_of_many_values_the_least_and_the_greatest_are_drawn(page):
    runs = [Lines(device=name).end(measurements=[measured("a", at) for at in range(200)]).finish()
            for name in "xy"]
    figure, = page(*runs).all("figure")
    assert len(coordinates(figure)) == 4


def test_attempts_are_measured_too(page):
    figure, = page(Lines(retries=1).end(event="retry", outcome="failed", attempt=1,
                                        measurements=[measured("a", 9)])
                   .end(outcome="flaky", attempt=2, measurements=[measured("a", 1)])
                   .finish()).all("figure")
    assert text(figure.find("figcaption")) == "G/A a 1 to 9, 2 values"


def test_a_limit_that_changes_is_drawn_as_far_as_it_holds(page):
    figure, = page(*(Lines(device=f"d{at}").end(measurements=[measured("a", 1, None, 0, high)])
                     .finish() for at, high in enumerate([2, 2, 3]))).all("figure")
    assert limits(figure) == ["0", "2", "3"]


@pytest.mark.parametrize("values, heights", [
    ([5, 5], [48, 48]), ([-1.7e308, 1.7e308], [82, 14]), ([5e-324, 0], [48, 48]), ([0], [48]),
    ([1, 2, 3], [82, 48, 14])])
def test_any_numbers_are_drawn_within_the_picture(page, values, heights):
    figure, = page(Lines().end(measurements=[measured("a", one) for one in values])
                   .finish()).all("figure")
    assert coordinates(figure) == heights


# ---- bytes that would be more than text ------------------------------------------------

@pytest.mark.parametrize("hostile", HOSTILE, ids=range(len(HOSTILE)))
def test_what_a_run_says_is_text(page, hostile):
    shown, plain = page(hostile_run(hostile)), page(hostile_run("plain"))

    line = hostile.replace("\u202e", "�").replace("\u2066", "�")
    assert [one.tag for one in shown.tree.iter()] == [one.tag for one in plain.tree.iter()]
    assert [sorted(one.keys()) for one in shown.tree.iter()] == [
        sorted(one.keys()) for one in plain.tree.iter()]
    assert all(one.get("href", "#").startswith("#") for one in shown.tree.iter())
    told = shown.of["r1i1n1"]
    assert text(told.find("details/pre")) == "\n" + hostile
    assert text(told.find("p")) == hostile
    assert facts(told)["Files"] == f"{line}/{line}"
    assert facts(told)["Reason"] == hostile
    assert text(shown.all("h2")[0]) == f"{line}: {line} not finished"
    assert shown.rows()[0][0].find("a").get("title") == f"{line}/{line}"


def test_control_characters_are_pictures(page):
    said = "a\x00b\x1b[2Jc\x85d\ufffee\r\nf\tg"
    shown = page(Lines(device=said).end(output=said, description=said).finish())

    kept = "a␀b␛[2Jc�d�e\r\nf\tg"
    # XML's parser takes a carriage return that is written as it is for a line feed
    assert text(shown.of["r1i1"].find("details/pre")) == "\n" + kept
    assert text(shown.of["r1i1"].find("p")) == kept
    assert text(shown.of["r1"].find("h3")) == "a␀b␛[2Jc�d�e␍␊f␉g"


def test_nothing_is_loaded_and_no_script_is_there(page):
    shown = page(Lines().end(measurements=[measured("a", 1)]).finish())
    assert not {"script", "link", "img", "iframe", "object", "base"} & {
        one.tag for one in shown.tree.iter()}
    assert "url(" not in shown.text and "@import" not in shown.text
    policy, = [one for one in shown.all("meta") if one.get("http-equiv")]
    assert policy.get("content") == "default-src 'none'; style-src 'unsafe-inline'"


# ---- files that are not whole, or are none ---------------------------------------------

def test_a_file_that_is_cut_is_used_as_far_as_it_goes(page, tmp_path):
    lines = Lines(["G/A", "G/B", "G/C"]).end(0).start(1)
    lines.of_item("progress", 1, progress="40", result="-2", description="at 40")
    lines.lines.append('{"event":"end","ind')
    shown = page(lines, errors=f"fptest: {tmp_path}/0.jsonl: its last line is cut, and left out\n")

    assert [text(row[0]) for row in shown.rows()] == ["passed", "not ended", "not run"]
    assert shown.facts("r1i2") == {"Result": "-2", "Progress": "40",
                                   "Start": "2026-11-23T07:00:01.000Z"}
    assert text(shown.of["r1i2"].find("p")) == "at 40"
    assert "R 1 not ended" in text(shown.all("p", "tally")[0])
    run_facts = facts(shown.of["r1"])
    assert run_facts["Cut"] == "its last line is cut, and left out"
    assert run_facts["End"] == "not finished: the file ends while G/B runs"
    assert text(shown.all("h2")[0]) == "plan.xml: one not finished"


def test_a_run_that_was_killed_between_attempts_has_the_one_before(page):
    killed = Lines(retries=1).start().end(event="retry", outcome="failed", attempt=1)
    assert text(page(killed).rows()[0][0]) == "failed"
    again = page(killed.start(attempt=2))
    assert text(again.rows()[0][0]) == "not ended"
    assert [text(one) for one in again.of["r1i1"].iter("h6")] == [
        "Attempt 1 failed 0.250 s", "Attempt 2 not ended "]


def test_a_round_that_was_cut_off_has_cells_for_all_items(page):
    run = Lines(["G/A", "G/B"], rounds=2).end(0).end(1).end(2)
    shown = page(run)
    assert [text(row[1].find("div")) for row in shown.rows()] == ["PP", "P-"]
    assert facts(shown.of["r1"])["End"] == "not finished: the file ends before the run does"


@pytest.mark.parametrize("content, why", [
    ("", "is empty"), ('{"event":"run","for', "is cut in its first line")])
def test_a_file_without_a_run_is_named_beside_others(page, tmp_path, content, why):
    nothing = Lines()
    nothing.lines = [content]
    said = f"{tmp_path}/1.jsonl {why}: nothing is known of that run"
    shown = page(Lines().end().finish(), nothing, Lines(device="two").finish(),
                 errors=f"fptest: {said}\n")

    assert text(shown.all("p", "unknown")[0]) == said
    assert [text(row[0]) for row in shown.rows()] == ["one", "two"]
    alone = run(FPTEST, "html", tmp_path / "1.jsonl")
    assert alone == (2, "", f"fptest: {said}\n")
    _, out, err = run(FPTEST, "html", tmp_path / "1.jsonl", tmp_path / "1.jsonl")
    assert (out, err.splitlines()[-1]) == ("", "fptest: no file has a run: no page is written")


@pytest.mark.parametrize("content, complaint", [
    ("hello\n", " is not what fptest run --json writes"),
    ("<testsuites/>", " is not what fptest run --json writes"),
    ('{"event":"start"}\n{}\n', " is not what fptest run --json writes"),
    (Lines().text() + "hello\n{}\n",
     ":2: this is not what fptest run --json writes: it is no JSON object"),
    (Lines().text() + '{"event":"end","index":0,"group":"G","item":"B"}\n',
     ":2: this is not what fptest run --json writes: its item is not the one that the index says"),
    (Lines(labels=[7]).text(), ":1: this is not what fptest run --json writes: "),
    (Lines().text().replace('"format":2', '"format":3'),
     " has the format 3, and this fptest reads 2"),
])
def test_what_is_no_run_is_refused_in_one_line(tmp_path, content, complaint):
    good = Lines().finish().write(tmp_path / "good")
    bad = tmp_path / "bad"
    bad.write_text(content)
    status, out, err = run(FPTEST, "html", good, bad)
    assert (status, out) == (2, "")
    assert err.startswith(f"fptest: {bad}{complaint}")
    assert err.count("\n") == 1


def test_files_that_cannot_be_read_are_refused(tmp_path):
    assert run(FPTEST, "html", "nowhere") == (
        2, "", "fptest: nowhere: No such file or directory\n")
    assert run(FPTEST, "html", tmp_path) == (2, "", f"fptest: {tmp_path}: Is a directory\n")


def test_standard_input_is_a_file_once(tmp_path):
    text_of_run = Lines().end().finish().text()
    shown = Page(run(FPTEST, "html", "-", text=text_of_run))
    assert facts(shown.of["r1"])["File"] == "<stdin>"
    assert run(FPTEST, "html", "-", text="") == (
        2, "", "fptest: <stdin> is empty: nothing is known of that run\n")
    assert run(FPTEST, "html", "-", "-", text=text_of_run) == (
        2, "", "fptest: '-' is given twice: standard input can be read only once\n")


def test_no_file_is_wrong_usage():
    assert run(FPTEST, "html") == (2, "", USAGE)


# ---- a page that cannot be written -----------------------------------------------------

def test_a_full_disk_is_said_in_one_line(tmp_path):
    file = Lines().finish().write(tmp_path / "a")
    status, _, err = run("sh", "-c", '"$@" >/dev/full', "sh", FPTEST, "html", file)
    assert (status, err) == (3, "fptest: standard output: No space left on device: the page is "
                                "not whole\n")


def test_a_page_that_cannot_be_written_whole_is_not_left(tmp_path):
    file = Lines().finish().write(tmp_path / "a")
    (tmp_path / "page").write_text("before\n")
    status, _, err = run(
        "sh", "-c", '"$@" >>page', "sh", FPTEST, "html", file, cwd=tmp_path,
        preexec_fn=lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (1000, 1000)))
    assert (status, err) == (3, "fptest: standard output: File too large: no page is written\n")
    assert (tmp_path / "page").read_text() == "before\n"


def test_standard_output_that_is_closed_is_said(tmp_path):
    file = Lines().finish().write(tmp_path / "a")
    assert run("sh", "-c", '"$@" >&-', "sh", FPTEST, "html", file) == (
        3, "", "fptest: fptest html needs standard output, which is closed: open it\n")
