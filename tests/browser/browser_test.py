# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What a browser makes of the pages of fptest html; scripts/test-html runs it."""
import re

import pytest

from support.chromium import look_at
from support.json_lines import HOSTILE, hostile_run
from support.outside import BUILD, output_of
from support.rack import runs_of

pytestmark = pytest.mark.usefixtures("device")

TAGS = set("html head meta title style body h1 h2 h3 h4 h5 h6 p section article div span small a "
           "table thead tbody tfoot tr th td dl dt dd ul li b strong details summary pre figure "
           "figcaption svg path circle text".split())
# What must be noticed, lest nothing is.
BAD = """<!DOCTYPE html><title>good</title><body>
<a href="#nowhere">x</a><a href="javascript:1">y</a>
<img src="http://127.0.0.1:9/none" onerror="document.title='x'"><div style="width: 999px">wide</div>
<script>document.title = 'x'</script>"""


@pytest.fixture(scope="module")
def directory(tmp_path_factory):
    """Has the pages, each also without the policy that forbids scripts."""
    directory = tmp_path_factory.mktemp("pages")
    runs = {"rack": runs_of(directory / "rack", 3),
            "rounds": runs_of(directory / "rounds", 1, "--repeat", "3"),
            "hostile": [hostile_run(said).write(directory / f"{at}.jsonl")
                        for at, said in enumerate(HOSTILE)],
            "hostile_rack": [hostile_run(said, plan_digest="d").write(directory / f"{at}.of_rack")
                             for at, said in enumerate(HOSTILE)]}
    runs["one"] = runs["rack"][:1]
    for name, files in runs.items():
        page = output_of(BUILD / "agent/fptest", "html", *files)
        bare = re.sub('<meta http-equiv="Content-Security-Policy".*?/>', "", page)
        assert bare != page
        (directory / f"{name}.html").write_text(page)
        (directory / f"{name}_bare.html").write_text(bare)
    (directory / "bad.html").write_text(BAD)
    return directory


def names_in(directory):
    return sorted(path.name for path in directory.glob("*.html") if path.name != "look.html")


@pytest.fixture(scope="module")
def pages(directory):
    """What a browser makes of them, on a phone."""
    return look_at(directory, names_in(directory))


@pytest.fixture(scope="module")
def good(pages):
    assert len(pages) == 11
    return {name: page for name, page in pages.items() if name != "bad.html"}


def test_what_is_wrong_with_a_page_is_noticed(pages):
    bad = pages["bad.html"]
    assert (bad["title"], bad["width"] > 360, bad["acting"]) == ("x", True, ["src", "onerror"])
    assert bad["dead"] == ["#nowhere", "javascript:1"]
    assert len(bad["loaded"]) == 1 and {"script", "img"} <= set(bad["tags"])


def test_nothing_is_loaded(good):
    assert {name: page["loaded"] for name, page in good.items()} == dict.fromkeys(good, [])


def test_no_script_runs_and_no_element_comes_of_what_a_run_says(good):
    for name, page in good.items():
        assert re.fullmatch(r"(\d+ [a-z ]+, )*\d+ [a-z ]+: fptest", page["title"]), name
        assert set(page["tags"]) <= TAGS, name
        assert page["acting"] == [], name


def test_what_a_run_says_can_be_read(good):
    for name in ("hostile.html", "hostile_rack.html"):
        for said in HOSTILE:
            assert said in good[name]["text"], said


def test_a_page_is_no_wider_than_a_phone(good):
    assert {name: page["width"] for name, page in good.items()} == dict.fromkeys(good, 360)


def test_links_lead_to_what_is_there(good):
    for name, page in good.items():
        assert page["links"] and page["dead"] == [], name
        assert all(-1 < top < 640 for top in page["reached"]), name  # they are rounded


def test_a_dark_scheme_has_a_dark_page(directory, pages):
    dark = look_at(directory, ["rack.html"], "--force-dark-mode")["rack.html"]
    assert pages["rack.html"]["background"] == "rgb(255, 255, 255)"
    assert max(map(int, re.findall(r"\d+", dark["background"]))) < 64


def test_a_rack_shows_what_became_of_it(good):
    text = good["rack.html"]["text"]
    assert re.search(r"line-3.xml: 3 devices", text)
    assert re.search(r"Supply vcore 1\.\d+ to 1\.\d+ V, 3 devices", text)
