# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""device/run --android: ps as that release has it, and what the library makes of it."""
import contextlib
import functools
import re
import shlex
import shutil

import pytest

from support.outside import (BUILD, DEVICE_RUN, TREE, at_a_terminal, make_program, on_device,
                             shell, status_of)

# in place, where ps is the same, in_place_test.py tries one of them
pytestmark = pytest.mark.usefixtures("namespaces")

TOOLBOX, TOYBOX = (5, 7), (9, 14)
RELEASES = TOOLBOX + TOYBOX

HEADERS = {
    5: "USER     PID   PPID  VSIZE  RSS     WCHAN    PC        NAME",
    7: "USER      PID   PPID  VSIZE  RSS   WCHAN              PC  NAME",
    9: "USER           PID  PPID     VSZ    RSS WCHAN            ADDR S NAME" + 23 * " ",
    14: "USER         {0} P{0}        VSZ    RSS WCHAN            ADDR S NAME" + 23 * " ",
}

# that of a shell, without its name
LINES = {
    5: r"\w+ {1,8} \d{1,5} {1,5}\d{1,5} {1,5}\d{4,6} {1,3}\d{4,5}  ?"
       r"0000000[01] 00000000 [A-Z] ",
    7: r"\w+ {1,8} \d{1,5} {1,5}\d{1,5} {1,5}\d{4,6} {1,3}\d{4,5}  ?"
       r"[ \w.]{10} 0000000000 [A-Z] ",
    9: r"[\w+]+ {1,12} *\d+ +\d+ {1,4}\d{4,7} {1,3}\d{4,6} [\w.]+ +0 [A-Z] ",
    14: r"[\w+]+ {1,12} *\d+ +\d+ {3,7}\d{4,8} {1,3}\d{4,6} [\w.]+ +0 [A-Z] ",
}


@functools.cache
def width_of_ids():
    """Of the device, which may have a limit of its own."""
    return len(on_device("cat", "/proc/sys/kernel/pid_max").out.strip())


def header_of(release):
    blanks = (width_of_ids() - 3) * " " if release == 14 else ""
    return HEADERS[release].replace("{0} P{0}", f"{blanks}PID {blanks[1:]}PPID")


PROGRAMS = ("Short", "AVeryLongItemNameOfMine", "AnItemNameOfTwentyEightChars")


@pytest.fixture(scope="module", name="items")
def made_items(tmp_path_factory):
    """The directory of programs that sleep, and a script."""
    directory = tmp_path_factory.mktemp("items")
    for name in PROGRAMS:
        shutil.copy("/usr/bin/sleep", directory / name)
    make_program(directory / "ScriptItem", "#!/system/bin/sh\nsleep 9 &\nwait\n")
    return directory


def answer(release, script, *options, **others):
    """What a script says on that release, away from any terminal. The errors are those
    of the script alone."""
    outcome = shell(script, options=("--android", str(release), *options),
                    start_new_session=True, **others)
    return tuple(outcome)


def names(out):
    """The last column; a name with blanks loses its start."""
    return [line.split()[-1] for line in out.splitlines()[1:]]


RUNNING = "".join(f"/system/bin/{name} 9 & " for name in (*PROGRAMS, "ScriptItem")) + "sleep 0.3; "


# ---- what it lists -------------------------------------------------------------------

@pytest.mark.parametrize("release", RELEASES)
def test_the_columns_are_the_releases(release):
    status, out, err = answer(release, "ps $$")
    header, line = out.splitlines()

    assert (status, err) == (0, "")
    assert header == header_of(release)
    assert re.fullmatch(LINES[release] + "sh", line)


@pytest.mark.parametrize("release, program, script", [
    (5, "/system/bin/Short", "/system/bin/sh"), (7, "/system/bin/Short", "/system/bin/sh"),
    (9, "Short", "sh"), (14, "Short", "sh")])
def test_a_process_has_its_name_with_or_without_a_path(items, release, program, script):
    _, out, _ = answer(release, "/system/bin/Short 9 & one=$!; /system/bin/ScriptItem & "
                       "sleep 0.3; ps $one; ps $!", "--bin", items)

    assert [name for name in names(out) if name != "NAME"] == [program, script]


@pytest.mark.parametrize("release", RELEASES)
def test_a_zombie_has_the_kernels_name(release):
    _, out, _ = answer(release, "(sleep 0 & echo $!; exec sleep 30) | { read -r pid; "
                       "status=/proc/$pid/status; "
                       "until grep -q '^State:.Z' $status; do sleep 0.05; done; "
                       "ps $pid; kill $(sed -n 's/^PPid:.//p' $status); }")

    assert names(out) == ["sleep" if release in TOOLBOX else "[sleep]"]


@pytest.mark.parametrize("release", RELEASES)
def test_it_skips_processes_that_end_meanwhile(release):
    # in 200 runs, some meet a process that ends between two looks at it
    assert answer(release, "churn() { while :; do /system/bin/true; done; }; churn & "
                  "first=$!; churn & i=0; while [ $((i += 1)) -le 200 ]; do "
                  "ps >/tmp/list || exit 9; done; kill $! $first") == (0, "", "")


@pytest.mark.parametrize("release", RELEASES)
def test_grep_by_path_finds_a_running_gatherer_with_toolbox_alone(release):
    script = ("/system/bin/SensorProbe --group g & sleep 0.4; "
              "ps | grep -c SensorProbe; ps | grep -c /system/bin/SensorProbe")

    # the greps themselves are shown as grep
    assert answer(release, script)[1] == ("1\n1\n" if release in TOOLBOX else "1\n0\n")


# ---- whom it selects -----------------------------------------------------------------

BY_NAME = {
    "Short": ["/system/bin/Short"],
    "Sho": ["/system/bin/Short"],
    "ScriptItem": ["/system/bin/sh"],
    "AVeryLongItemNa": ["/system/bin/AVeryLongItemNameOfMine"],
    "AVeryLongItemNam": [],
    "AVeryLongItemNameOfMine": [],
    "AnItemNameOfTwentyEightChars": [],
    "hort": [],
    "/system/bin/Short": [],
    "Missing": [],
    "-A": [],
}


@pytest.mark.parametrize("name, found", BY_NAME.items())
def test_toolbox_of_5_selects_by_fifteen_characters_of_the_kernels_name(items, name, found):
    status, out, err = answer(5, f"{RUNNING} ps {name}", "--bin", items)

    assert (status, err, out.splitlines()[0]) == (0, "", header_of(5))
    assert names(out) == found


@pytest.mark.parametrize("release, out, err", [
    (7, "bad pid '{}'\n", ""), (9, "", "ps: {}\n"), (14, "", "ps: bad {}\n")])
def test_later_releases_select_by_no_name(items, release, out, err):
    wanted = (*PROGRAMS, "AVeryLongItemNa", "ScriptItem", "Missing")
    tried = "".join(f"ps {name}; status=$((status + $?)); " for name in wanted)

    assert answer(release, f"{RUNNING} {tried} exit $status", "--bin", items) == (
        len(wanted), "".join(map(out.format, wanted)), "".join(map(err.format, wanted)))


@pytest.mark.parametrize("release, status", [(5, 0), (7, 0), (9, 0), (14, 1)])
def test_without_a_process_of_that_id_the_header_remains(release, status):
    assert answer(release, "ps 99999999") == (status, header_of(release) + "\n", "")


HELP = ' (see "ps --help")\n'


@pytest.mark.parametrize("release, arguments, out, err", [
    (7, "--ppid x", "bad ppid 'x'\n", ""),
    (9, "-p 1,x,2", "", "ps: bad -p '1,x,2'\n" + 14 * " " + "^\n"),
    (14, "-p 0", "", "ps: bad -p '0'\n" + 12 * " " + "^\n"),
    (14, "1,2", "", "ps: bad 1,2\n"),
    (9, "-p", "", "ps: Missing argument to -p" + HELP),
    (9, "-Aq", "", "ps: Unknown option q" + HELP),
    (14, "-Aqz", "", "ps: Unknown option 'qz'" + HELP),
    (7, "-Z", "", "ps: -Z: device/run --android 7 imitates no other option than "
     "-c, -n, -p, -x, --ppid\n"),
    (14, "-ef", "", "ps: -f: device/run --android 14 imitates no other option than "
     "-A, -e, -p, -w\n"),
])
def test_what_it_does_not_take_is_refused_in_the_releases_words(release, arguments, out, err):
    assert answer(release, f"ps {arguments}") == (1, out, err)


@pytest.mark.parametrize("release, options, added", [
    (5, "-c -p -x -n", "CPU PRIO  NICE  RTPRI SCHED "),
    (7, "-n -x -p -c", "CPU PRIO  NICE  RTPRI SCHED ")])
def test_toolbox_has_more_columns_when_asked(release, options, added):
    header, line = answer(release, f"ps {options} $$")[1].splitlines()

    at = header_of(release).index("RSS") + (6 if release == 5 else 5)
    assert header == header_of(release)[:at] + added + header_of(release)[at:]
    assert re.fullmatch(r"0( +\d+){9} .* sh \(u:\d+, s:\d+\)", line)


def test_toolbox_of_7_selects_by_parent():
    assert names(answer(7, "sleep 9 & sleep 0.3; ps --ppid $$")[1]) == ["sleep", "ps"]


# Debian's own toybox, told to show what Android's shows by itself.
SAME = "toybox ps -o USER,PID:$width,PPID:$width,VSZ:10,RSS,WCHAN:10,ADDR:10,S,NAME"
ODD_NAMES = "/a/b 'a/b  c ' '' / x/ ' ' AnItemNameOfTwentyEightChars_AndMore"


# so large that its VSZ has eleven digits
LARGE = ("import mmap, subprocess; flags = mmap.MAP_PRIVATE | mmap.MAP_ANONYMOUS | 0x4000; "
         "room = mmap.mmap(-1, 20 << 40, flags); subprocess.run(['/usr/bin/sleep', '9'])")


def both(odd_names):
    """What Android's ps says of processes with these names, and what toybox says."""
    return ("width=$(cat /proc/sys/kernel/pid_max); width=${#width}; pids=1; "
            f"for name in {odd_names}; do (exec -a \"$name\" /usr/bin/sleep 9) & pids=$pids,$!; "
            f"done; /usr/bin/python3 -c {shlex.quote(LARGE)} & pids=$pids,$!; "
            f"sleep 0.6; ps -p $pids; echo; {SAME} -p $pids")


def test_the_lines_of_14_are_those_of_toybox():
    _, out, _ = answer(14, both(ODD_NAMES + r" $'two\nlines'"))
    imitated, real = out.split("\n\n")

    assert len(real.splitlines()) == 11
    assert re.search(" 2[0-9]{10} ", real)
    assert imitated + "\n" == real


# ---- on a terminal -------------------------------------------------------------------

def shown_at_a_terminal(release, script):
    """What a script prints there, its lines ended as everywhere."""
    shown = b""
    words = (DEVICE_RUN, "--android", str(release), "--", "sh", "-c", script)
    with at_a_terminal(*words) as (process, terminal):
        with contextlib.suppress(OSError):  # nobody has the other side open any more
            while more := terminal.read(4096):
                shown += more
        assert status_of(process) == 0
    return shown.decode().replace("\r\n", "\n")


@pytest.mark.parametrize("release", RELEASES)
def test_at_a_terminal_toybox_lists_that_terminals_processes_alone(release):
    found = shown_at_a_terminal(
        release, "setsid /system/bin/sleep 9 </dev/null >/dev/null 2>&1 & "
        "/usr/bin/sleep 8 & sleep 0.3; ps | grep -c /sleep; ps | grep -c sleep; "
        + ("" if release in TOOLBOX else "ps -A | grep -c sleep; ps </dev/null 2>&1 | wc -l"))

    # with neither input nor output there, it finds no process at all
    assert found.splitlines()[-4:] == (["2", "2"] if release in TOOLBOX else
                                       ["0", "1", "2", "1"])


@pytest.mark.parametrize("columns", [30, 60, 75, 80, 120])
def test_at_a_terminal_the_lines_of_14_are_cut_as_toyboxs(columns):
    # the colours that it puts around control characters are not imitated
    out = shown_at_a_terminal(14, f"export COLUMNS={columns}; {both(ODD_NAMES)}")
    imitated, real = out.split("\n\n")

    assert len(real.splitlines()) == 10
    assert imitated + "\n" == real


# ---- what the library makes of it ----------------------------------------------------

# A host agent of few lines; PLAN's group is G.
HOST = f"""
import ctypes, glob, os, signal, sys, threading, time

library = ctypes.CDLL("{BUILD}/libquillmark.so")

def command(text):
    reply = ctypes.create_string_buffer(64)
    library.FPTEST_RunTestCmd(ctypes.create_string_buffer(text.encode()), reply, 64)

def running(name):
    found = []
    for path in glob.glob("/proc/[0-9]*/cmdline"):
        try:
            words = open(path).read().split("\\0")
        except OSError:
            continue
        if "/system/bin/" + name in words[:2]:
            found.append(int(path.split("/")[2]))
    return found

def until(condition):
    end = time.monotonic() + 10
    while not condition() and time.monotonic() < end:
        time.sleep(0.01)

def store(name, arguments):
    command("XMLFile::<?xml version='1.0'?><P><CmdGroup name='G'>"
            f"<Cmd name='{{name}}' args='{{arguments}}'/></CmdGroup></P>")

name = sys.argv[1]
"""

STOP = HOST + """
store(name, "60")
threading.Thread(target=command, args=["XMLNodePath::P/G/" + name], daemon=True).start()
until(lambda: running(name))
time.sleep(0.1)
status = library.FPTEST_SuspendItemExecute()
time.sleep(0.5)
print("stop", status, "runs on" if running(name) else "stopped", flush=True)
os._exit(0)
"""

TRIGGER = HOST + """
store(name, "--group G")
for i in range(2):
    command("XMLNodePath::P/G/" + name)
    time.sleep(0.5)
print("gatherers", len(running(name)), flush=True)
os._exit(0)
"""

# PATH with a ps in front that answers on every device.
HELPED = f"{BUILD}/libexec/quillmark/bin:/system/bin"


def library_does(program, name, release, items, path="/system/bin"):
    """The last line of a host."""
    options = ("--bin", items) + (("--android", str(release)) if release else ())
    outcome = on_device("sh", "-c", f"PATH={path} exec /usr/bin/python3 -c {shlex.quote(program)} "
                        f"{name}", options=options, start_new_session=True)
    return [line for line in outcome.out.splitlines() if "vendor" not in line][-1]


@pytest.mark.parametrize("release, name, done", [
    (None, "Short", "stop 0 stopped"),
    (None, "AnItemNameOfTwentyEightChars", "stop 0 stopped"),
    (5, "Short", "stop 0 stopped"),
    (5, "ScriptItem", "stop 0 stopped"),
    (5, "AVeryLongItemNameOfMine", "stop -1 runs on"),
    (7, "Short", "stop -1 runs on"),
    (9, "Short", "stop -1 runs on"),
    (14, "Short", "stop -1 runs on"),
])
def test_the_library_stops_an_item_or_not(items, release, name, done):
    assert library_does(STOP, name, release, items) == done


@pytest.mark.parametrize("release, count", [(None, 1), (5, 1), (7, 1), (9, 2), (14, 2)])
def test_the_library_finds_the_gatherer_or_starts_one_more(items, release, count):
    assert library_does(TRIGGER, "SensorProbe", release, items) == f"gatherers {count}"


@pytest.mark.parametrize("release", RELEASES)
def test_another_ps_in_front_of_the_devices_answers_the_library(items, release):
    name = "AnItemNameOfTwentyEightChars"

    assert library_does(STOP, name, release, items, HELPED) == "stop 0 stopped"
    assert library_does(TRIGGER, "SensorProbe", release, items, HELPED) == "gatherers 1"


@pytest.mark.parametrize("release", RELEASES)
def test_the_demo_passes(release):
    status, out, err = on_device(TREE / "agent/demo", BUILD / "agent/fptest", "plans/demo.xml",
                                 options=("--android", str(release), "--vendor", "0"),
                                 start_new_session=True)

    assert status == 0, out
    assert "this device's ps does not answer the library: " in out + err
    assert "gathering 2, 64 samples\n" in out


def getprop(release, *names):
    return shell("; ".join(f"getprop {name}" for name in names),
                 options=("--android", str(release))).out.splitlines()


@pytest.mark.parametrize("release, full, sdk", [
    (5, "5.1.1", "22"), (7, "7.1.2", "25"), (9, "9", "28"), (14, "14", "34")])
def test_getprop_tells_the_release(release, full, sdk):
    assert getprop(release, "ro.build.version.release", "ro.build.version.sdk",
                   "ro.no.such.name", "ro.no.such.name 7") == [full, sdk, "", "7"]


@pytest.mark.parametrize("release, size, why", [
    (5, 15, None),
    (5, 16, "ps of Android 5.1.1 finds no name of more than 15"),
    (7, 28, None),
    (14, 28, None),
    (14, 29, "ps is asked for the first 28 alone"),
])
def test_check_knows_how_much_of_a_name_ps_finds(tmp_path, release, size, why):
    (tmp_path / "plan.xml").write_text(
        f'<?xml version="1.0"?><P><CmdGroup name="G"><Cmd name="{size * "n"}" args=""/>'
        "</CmdGroup></P>\n")

    out = on_device("fptest", "check", "plan.xml",
                    options=("--out", tmp_path, "--android", str(release))).out

    assert (f"has {size} bytes, but {why}; shorten it" in out) if why else ("stopped" not in out)
