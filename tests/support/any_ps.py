#!/usr/bin/python3
# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""ps as an Android had it, by the name of its directory: toolbox5, toolbox6, toolbox7,
toybox; that of arguments shows those of processes, and that of hangs does not end."""
import pathlib
import sys
import time

KIND = pathlib.Path(sys.argv[0]).parent.name
WANTED = sys.argv[1:]
HEADERS = {"toybox": "USER       PID  PPID     VSZ    RSS WCHAN            ADDR S NAME",
           "toolbox5": "USER     PID   PPID  VSIZE  RSS     WCHAN    PC         NAME"}
OLD_HEADER = "USER      PID   PPID  VSIZE  RSS   WCHAN              PC  NAME"

if KIND == "hangs":
    time.sleep(60)
if KIND == "toybox" and WANTED:
    sys.exit(f"ps: bad {WANTED[0]}")
if KIND == "toolbox7" and WANTED:
    print(f"bad pid '{WANTED[0]}'")
    sys.exit()
print(HEADERS.get(KIND, OLD_HEADER))
for entry in sorted(pathlib.Path("/proc").glob("[0-9]*"), key=lambda path: int(path.name)):
    try:
        arguments = (entry / "cmdline").read_bytes().decode().split("\0")
        kernels = (entry / "comm").read_text().strip()
    except OSError:
        continue  # it has ended
    name = arguments[0] or kernels
    if KIND == "toybox":
        name = name.rsplit("/", 1)[-1]
    elif KIND == "arguments":
        name = " ".join(arguments)
    compared = {"toolbox5": kernels, "toolbox6": name}.get(KIND, arguments[0].rsplit("/", 1)[-1])
    if not WANTED or compared.startswith(WANTED[0]):
        print(f"root {entry.name} 1 8 8 0 0 S {name}")
