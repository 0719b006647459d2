# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""The list of quillmark-ps."""
import collections
import re

from support.outside import PS_HEADER, shell

LINE = re.compile(r"([^ ]+) +([0-9]+) +([0-9]+) +([0-9]+) +([0-9]+) +([0-9a-f]{8}) "
                  r"([0-9a-f]{8}) ([A-Za-z]) (.+)")
Process = collections.namedtuple(
    "Process", "user pid parent size resident wchan pc state name")


def processes(header, *lines):
    """Those that ps lists."""
    assert header == PS_HEADER
    listed = [LINE.fullmatch(line) for line in lines]
    assert None not in listed, lines
    return [Process(*line.groups()) for line in listed]


def own_processes(script, **others):
    """Those that the script lists and that are its shell or below it: in a container
    others run beside."""
    first, *lines = shell("echo $$; " + script, **others).out.splitlines()
    listed = processes(*lines)
    own = {first}
    while more := {each.pid for each in listed if each.parent in own} - own:
        own |= more
    return [each for each in listed if each.pid in own]


def names(listed):
    return [each.name for each in listed]
