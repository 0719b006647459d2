# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""Debian's Chromium without a window, and without a network where that can be taken away."""
import html
import json
import re

from support.outside import run

ALONE = "bwrap --dev-bind / / --unshare-net --unshare-pid --proc /proc --die-with-parent".split()
WORDS = ["chromium", "--headless", "--no-sandbox", "--disable-gpu", "--disable-dev-shm-usage",
         "--hide-scrollbars", "--allow-file-access-from-files"]

# Reads each of the pages in a frame as wide as a phone, once all are loaded.
LOOK = """<!DOCTYPE html><meta charset="utf-8"><meta name="color-scheme" content="light dark">
<body><script>
function look(frame) {
  const page = frame.contentDocument, root = page.documentElement;
  const all = [...page.querySelectorAll('*')];
  const links = [...page.querySelectorAll('[href]')].map(one => one.getAttribute('href'));
  const reached = [links[0], links[links.length >> 1], links.at(-1)].map(link => {
    frame.contentWindow.location.hash = link;
    return page.querySelector(':target')?.getBoundingClientRect().top; });
  // what is not in sight would not be measured
  page.head.append(Object.assign(page.createElement('style'),
    {textContent: '* { content-visibility: visible !important; }'}));
  return {title: page.title, width: root.scrollWidth, text: page.body.textContent,
    loaded: frame.contentWindow.performance.getEntriesByType('resource').map(one => one.name),
    tags: [...new Set(all.map(one => one.localName))],
    acting: all.flatMap(one => one.getAttributeNames()).filter(name => /^on|^src$/.test(name)),
    links, reached,
    dead: links.filter(link => link[0] != '#' || !page.getElementById(link.slice(1))),
    background: getComputedStyle(page.body).backgroundColor};
}
onload = () => {
  const said = document.createElement('pre');
  said.textContent = JSON.stringify([...document.querySelectorAll('iframe')].map(look));
  document.body.replaceChildren(said);
};
</script>
%s
"""


def chromium(directory, *words):
    alone = ALONE if run(*ALONE, "true").status == 0 else []
    outcome = run(*alone, *WORDS, f"--user-data-dir={directory}/profile", *words, cwd=directory)
    assert outcome.status == 0, outcome.err
    return outcome


def look_at(directory, names, *options, width=360):
    """What a browser makes of these pages of the directory."""
    frames = "".join(f'<iframe src="{name}" width="{width}" height="640" style="border: 0">'
                     '</iframe>' for name in names)
    (directory / "look.html").write_text(LOOK % frames)
    dom, = re.findall("<pre>(.*)</pre>", chromium(
        directory, "--dump-dom", *options, f"file://{directory}/look.html").out, re.DOTALL)
    return dict(zip(names, json.loads(html.unescape(dom)), strict=True))


def picture(directory, name, file, width, height):
    """Takes a picture of a page."""
    chromium(directory, f"--window-size={width},{height}", f"--screenshot={file}",
             f"file://{directory}/{name}")
