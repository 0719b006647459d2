# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""The README's picture of a page: scripts/test-html --picture."""
from support.chromium import picture
from support.outside import BUILD, TREE, output_of
from support.rack import runs_of


def test_takes_the_picture(device, tmp_path):
    page = output_of(BUILD / "agent/fptest", "html", *runs_of(tmp_path, 8))
    (tmp_path / "page.html").write_text(page)
    picture(tmp_path, "page.html", TREE / "docs/report.png", 800, 890)
    assert (TREE / "docs/report.png").stat().st_size < 100_000
