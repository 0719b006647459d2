# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""JSON lines as fptest run --json writes them, of runs that never were."""
import json

END = {"progress": "100", "result": "0", "description": "fine", "reason": None,
       "start": "2026-11-23T07:00:01.000Z", "seconds": 0.25, "exit_status": 0, "signal": None,
       "left_running": [], "measurements": [], "directory": None, "files": [], "warning": None,
       "output": ""}
NOT_RUN = {"progress": None, "result": None, "description": None, "start": None,
           "seconds": None, "exit_status": None}


def measured(name, value, unit=None, low=None, high=None):
    return {"name": name, "value": value, "unit": unit, "low": low, "high": high}


class Lines:
    """The lines of one run of these items, each GROUP/ITEM, as it goes on."""

    def __init__(self, items=("G/A",), device="one", **others):
        self.names = [dict(zip(("group", "item"), item.split("/", 1))) for item in items]
        self.lines = []
        begin = {"format": 2, "program": "fptest", "version": "1.0.0", "library_version": "1.0.0",
                 "plan": "plan.xml", "plan_digest": "d1", "vendor": 0, "rounds": 1,
                 "time_limit": None, "until_fail": False, "pass_code": 0,
                 "labels": {"device": device}, "start": "2026-11-23T07:00:00.000Z"}
        self.add("run", **begin | others, items=self.names)

    def add(self, event, **keys):
        self.lines.append(json.dumps({"event": event, **keys}, separators=(",", ":")) + "\n")
        return self

    def of_item(self, event, index, **keys):
        return self.add(event, index=index, **self.names[index % len(self.names)],
                        round=index // len(self.names) + 1, **keys)

    def start(self, index=0, **keys):
        return self.of_item("start", index, start=END["start"], **keys)

    def end(self, index=0, outcome="passed", event="end", **keys):
        known = END | (NOT_RUN if outcome == "not run" else {})
        return self.of_item(event, index, **{"outcome": outcome} | known | keys)

    def finish(self, reason=None, finished=True):
        return self.add("finish", finished=finished, reason=reason, rounds=1, seconds=1.5)

    def text(self):
        return "".join(self.lines)

    def write(self, path):
        path.write_text(self.text())
        return path


# What would be more than text in a page that took it as it is.
HOSTILE = ["</pre></script></style></title><script>document.title='x'</script>",
           "<img src=http://127.0.0.1:9/x onerror=\"document.title='x'\">",
           "<svg onload=document.title='x'>",
           "\" autofocus onfocus=\"document.title='x'\" x=\"", "' onclick='document.title=1",
           "javascript:document.title='x'", "&lt;b&gt; &amp; &#60; &quot;", "]]><!--",
           "{{constructor}} {} {0} %s", "a\u202eb\u2066c", "wide" * 500]


def hostile_run(said, **others):
    """A run that says it in every field."""
    begin = {"plan": said, "plan_digest": said, "version": said, "library_version": said,
             "resumed": said, "rounds": 2}
    lines = Lines([f"{said}/{said}"], device=said, **begin | others)
    for index, outcome in enumerate(("failed", "passed")):
        lines.end(index, outcome, result=said, progress=said, description=said, reason=said,
                  signal=said, warning=said, directory=said, files=[said], output=said,
                  left_running=[{"name": said, "pid": 1}], expected=said,
                  measurements=[measured(said, 1, said, 0, 2)])
    return lines.finish(said, finished=False)
