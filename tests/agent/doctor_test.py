# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""fptest doctor: what it says of a device that has everything, and of one that lacks it."""
import json
import os
import re
import shutil

import pytest

from support.outside import (BUILD, DEVICE_RUN, PS_HEADER, TREE, make_program, on_device,
                             on_machine, output_of, run, shell)

pytestmark = pytest.mark.usefixtures("namespaces")

QUESTIONS = ["descriptors", "proc", "shell", "grep", "ps", "kill", "data", "vendor", "port",
             "process-9", "mini-xml", "library"]
FPTEST = BUILD / "agent/fptest"
OWN_PS = BUILD / "libexec/quillmark/bin"
FILE = "/etc/vorlane/sysparms/vr_common_cfg.xml"


def lines_of(outcome):
    """{question: (mark, text)}, in order."""
    assert outcome.err == ""
    return {name: (mark, text) for mark, name, text in
            (re.fullmatch(r"(ok|!!|! )  (\S+) +(.+)", line).groups()
             for line in outcome.out.splitlines())}


def said_of(question, outcome):
    """Its line, where every other one is ok."""
    lines = lines_of(outcome)
    line = lines.pop(question)
    assert {name: text for name, text in lines.items() if text[0] != "ok"} == {}
    assert outcome.status == (3 if line[0] == "!!" else 0)
    return line


def examined(script="", **others):
    return shell(f"{script}\nfptest doctor", **others)


def on_bare_machine(script, shell_link="/usr/bin/mksh", options=()):
    """A script's doctor where the device's own directories are to be had otherwise."""
    return on_machine(f"PATH={OWN_PS}:$PATH; {script}", options=(
        "--dir", "/data", "--tmpfs", "/data/vorlane", "--dir", "/system/bin",
        "--symlink", shell_link, "/system/bin/sh", *options))


# ---- a device that is ready ----------------------------------------------------------

def test_a_device_that_has_everything_is_ready():
    outcome = examined(options=("--vendor", "1"))
    lines = lines_of(outcome)

    assert outcome.status == 0
    assert list(lines) == QUESTIONS
    assert {mark for mark, _ in lines.values()} == {"ok"}
    assert lines["shell"][1] == "/system/bin/sh is there, and the C library's runs"
    assert lines["ps"][1] == "quillmark-ps, or a ps like it, finds gatherers and items"
    assert lines["vendor"][1] == "the vendor selector is 1"
    assert re.fullmatch(r"/\S+/libmxml\.so\S+; fptest is built for \d\.\d+",
                        lines["mini-xml"][1])
    assert re.fullmatch(r"/\S+/libquillmark\.so\S* has the four functions and the variable",
                        lines["library"][1])


def test_it_is_quick_and_leaves_nothing_running():
    ids = output_of(DEVICE_RUN, "--", "sh", "-c",
                    "ps >/tmp/before; fptest doctor >/dev/null; ps >/tmp/after; "
                    "cut -c60- /tmp/before /tmp/after").splitlines()

    assert ids[:len(ids) // 2] == ids[len(ids) // 2:]


def test_json_is_one_object():
    outcome = on_device("fptest", "doctor", "--json", options=("--vendor", "7"))
    found = json.loads(outcome.out)

    assert outcome.status == 3
    assert outcome.out.count("\n") == 1
    assert list(found) == ["format", "program", "version", "ready", "answers"]
    assert (found["format"], found["program"], found["ready"]) == (1, "fptest", False)
    assert [one["question"] for one in found["answers"]] == QUESTIONS
    assert {one["verdict"] for one in found["answers"] if one["question"] != "vendor"} == {"ok"}
    vendor, = (one for one in found["answers"] if one["question"] == "vendor")
    assert vendor["verdict"] == "error"
    assert vendor["text"].startswith("the vendor selector is 7, and ")


def test_json_says_that_a_device_is_ready():
    outcome = shell("ulimit -n 64; fptest doctor --json")
    found = json.loads(outcome.out)

    assert (outcome.status, found["ready"]) == (0, True)
    assert [one["question"] for one in found["answers"] if one["verdict"] == "warning"] == [
        "descriptors"]


@pytest.mark.parametrize("variables, first", [("", "\x1b[32mok\x1b[0m  descr"),
                                              ("NO_COLOR=1", "ok  descr"),
                                              ("TERM=dumb", "ok  descr")])
def test_a_terminals_lines_are_folded(variables, first):
    out = output_of("script", "-qec", f"stty cols 60; {variables} {DEVICE_RUN} -- "
                    "fptest doctor", "/dev/null", env={"TERM": "xterm", "NO_COLOR": None})
    lines = re.sub("\x1b.*?m|\r", "", out).splitlines()
    # a word alone, such as a path, may be longer
    lengths = [len(line) for line in lines if " " in line[17:]]

    assert out.startswith(first)
    assert max(lengths) in range(50, 60)
    assert len(lines) > len([line for line in lines if line.startswith("ok")]) == len(QUESTIONS)


def test_help_says_what_the_status_means():
    assert "Exit status: 0 the device is ready; 3 it is not." in output_of(
        FPTEST, "doctor", "--help")


def test_an_argument_is_one_too_many():
    outcome = run(FPTEST, "doctor", "now")

    assert outcome == (2, "", "fptest: 'now' is one argument too many; see fptest doctor --help\n")


# ---- what is missing -----------------------------------------------------------------

PS_ADVICE = (f"; fptest uses {OWN_PS}/ps instead: put that directory first in the PATH of other "
             "agents")
LONE_PS_ADVICE = "; put quillmark-ps first in PATH"
NO_GATHERER = "no running gatherer (each trigger starts another one)"
NO_ITEM = "no item to stop (it runs on)"


@pytest.mark.parametrize("kind, mark, text", [
    ("toolbox5", "! ", "toolbox's ps, of Android up to 5.1, finds an item to stop by 15 "
                       "characters of its name at most"),
    ("toolbox6", "!!", f"toolbox's ps, of Android 6 or 7, finds {NO_ITEM}"),
    ("toolbox7", "!!", f"toolbox's ps, of Android 6 or 7, (bad pid 'NAME') finds {NO_ITEM}"),
    ("toybox", "!!", "toybox's ps, of Android 8 and later, (ps: bad NAME) finds "
                     f"{NO_GATHERER} and {NO_ITEM}"),
    ("arguments", "!!", "a ps of no known kind finds a gatherer where none runs (none is "
                        "started)"),
    ("hangs", "!!", "ps does not list processes: ps has not answered within 2 s"),
])
@pytest.mark.parametrize("has_own", [True, False])
def test_a_ps_that_does_not_answer(tmp_path, kind, mark, text, has_own):
    if not has_own:
        shutil.copy(FPTEST, tmp_path / "fptest")
    (tmp_path / kind).mkdir()
    shutil.copy(TREE / "tests/support/any_ps.py", tmp_path / kind / "ps")
    (tmp_path / kind / "ps").chmod(0o755)

    found, said = said_of("ps", examined(f"PATH=$PWD:$PWD/{kind}:$PATH", cwd=tmp_path))

    assert found == ("! " if has_own else mark)
    assert re.sub(r"Fptest\d+Asks\w+", "NAME", said) == text + (
        PS_ADVICE if has_own else LONE_PS_ADVICE)


def test_a_ps_that_hangs_is_ended(tmp_path):
    (tmp_path / "ps").write_text("#!/system/bin/sh\nsleep 60 & sleep 60\n")
    (tmp_path / "ps").chmod(0o755)
    outcome = shell("PATH=$PWD:$PATH fptest doctor >/dev/null; /system/bin/ps sleep; "
                    "/system/bin/ps Fptest", cwd=tmp_path)

    assert outcome.out == f"{PS_HEADER}\n" * 2


def test_a_ps_of_ones_own_that_does_not_run(tmp_path):
    shutil.copy(FPTEST, tmp_path / "fptest")
    (tmp_path / "quillmark/bin").mkdir(parents=True)
    make_program(tmp_path / "quillmark/bin/ps", "#!/nowhere\n")
    (tmp_path / "plan.xml").write_text('<?xml version="1.0"?><P><CmdGroup name="G">'
                                       '<Cmd name="true" args=""/></CmdGroup></P>')

    outcome = on_device("sh", "-c", "./fptest doctor; ./fptest run --plan plan.xml P/G",
                        options=("--out", tmp_path, "--android", "14"))

    own = tmp_path / "quillmark/bin/ps"
    assert (f"; {own} does not answer either: put a quillmark-ps that is built for this device "
            "there\n") in outcome.out
    assert outcome.out.count("!!  ps") == 1
    assert outcome.err == (f"fptest: neither this device's ps nor {own} answers the library: fptest "
                           "doctor says what that leads to\n")


def test_no_ps_and_no_grep():
    outcome = shell("PATH=/nowhere /system/bin/fptest doctor")
    lines = lines_of(outcome)

    assert outcome.status == 3
    assert [name for name, (mark, _) in lines.items() if mark != "ok"] == ["grep", "ps"]
    assert lines["ps"] == ("! ", "it cannot be asked for the gatherer without grep")
    assert re.fullmatch("grep does not find the gatherer's path: .*not found, so that each "
                        "trigger starts another gatherer; install it in PATH", lines["grep"][1])


def test_a_kill_that_does_nothing(tmp_path):
    make_program(tmp_path / "sh", """#!/usr/bin/mksh
        case $2 in kill*) exit 0 ;; esac
        exec -a "$0" /usr/bin/mksh "$@"
        """)
    (tmp_path / "sh").chmod(0o755)
    outcome = on_bare_machine(f"{FPTEST} doctor", tmp_path / "sh",
                              options=("--ro-bind", tmp_path, tmp_path))

    assert lines_of(outcome)["kill"] == (
        "!!", "kill does not end the processes that it is given, and neither does a stop; "
        "install a shell at /system/bin/sh that has it, or kill in PATH")


NO_DEVICE = ("this machine is not a device: there is no /system/bin/sh; on a desk, run it as: "
             "device/run -- fptest ...")
NO_SHELL = ("the C library's shell, by which the library runs items, does not run; install "
            "/bin/sh")


def test_no_shell():
    lines = lines_of(on_bare_machine(f"{FPTEST} doctor", "/nowhere"))

    assert lines["shell"] == ("!!", NO_DEVICE)
    assert lines["ps"] == (
        "! ", "it could not be asked: /system/bin/sh does not run under another name")
    assert lines["kill"][0] == "!!"


@pytest.mark.parametrize("program, advice", [
    ("/system/bin/fptest", ""),
    ("/vendor/bin/fptest", ", or /vendor/bin/sh, as Android 9 to 13 have it for a program in "
                           "/vendor"),
])
def test_no_shell_of_the_c_library(program, advice):
    outcome = on_bare_machine(f"{program} doctor; {program} run x/y", options=(
        "--tmpfs", "/bin", "--ro-bind", FPTEST, program))

    assert f"!!  shell        {NO_SHELL}{advice}\n" in outcome.out
    assert (outcome.status, outcome.err) == (3, f"fptest: {NO_SHELL}{advice}; see fptest doctor\n")


@pytest.mark.parametrize("script, text", [
    ("chmod 500 /data/vorlane",
     "/data/vorlane is not writable: Permission denied; make it, or run this as another user"),
    ("head -c 17000000 /dev/zero >/data/vorlane/fill 2>/dev/null",
     "the disk of /data/vorlane is full: make room for 2048 bytes; the stored plan is as it was"),
])
def test_plans_that_cannot_be_stored(script, text):
    assert said_of("data", examined(script)) == ("!!", text)


@pytest.mark.parametrize("make", ["mkdir", "mkfifo"])
def test_something_else_in_the_stored_plans_place(make):
    lines = lines_of(examined(f"{make} /data/vorlane/src1.xml"))
    found = {name: line for name, line in lines.items() if line[0] != "ok"}

    what = ("!!", "/data/vorlane/src1.xml is not a regular file: remove it")
    assert found == {"data": what, "vendor": what}


def test_no_directory_for_plans():
    outcome = on_machine(f"{FPTEST} doctor")

    assert lines_of(outcome)["data"] == ("!!", "/data/vorlane is not writable: No such file or "
                                         "directory; make it, or run this as another user")


@pytest.mark.parametrize("vendor", [0, 1, 2])
def test_a_vendor_selector(vendor):
    assert said_of("vendor", examined(options=("--vendor", str(vendor)))) == (
        "ok", f"the vendor selector is {vendor}")


def test_no_vendor_selector():
    assert said_of("vendor", examined()) == (
        "ok", f"the vendor selector is 0, as there is no {FILE}")


def test_a_vendor_selector_that_runs_nothing():
    assert said_of("vendor", examined(options=("--vendor", "3"))) == (
        "!!", "the vendor selector is 3, and the library runs nothing then: set "
        f"device/SysParam/Quillmark/vendor to 0, 1 or 2 in {FILE}")


@pytest.mark.parametrize("script, why", [
    (f"chmod 0 {FILE}", "is not readable: Permission denied"),
    (f"echo '<a' >{FILE}", "has no device/SysParam/Quillmark/vendor"),
])
def test_a_vendor_selector_that_cannot_be_read(script, why):
    plan = "/tmp/plan.xml"
    asked = examined(script, options=("--vendor", "1"))
    _, _, err = shell(
        f"{script}\necho '<?xml version=\"1.0\"?><P><CmdGroup name=\"G\"><Cmd name=\"true\" "
        f"args=\"\"/></CmdGroup></P>' >{plan}; fptest run --plan {plan} P/G", options=("--vendor", "1"))

    assert said_of("vendor", asked) == (
        "! ", f"the vendor selector is 0, as {FILE} {why}; mend that if this device's programs "
        "have a vendor's suffix")
    assert err == f"fptest: {FILE} {why}: the library takes 0 for the vendor selector\n"


def test_a_vendor_file_that_would_never_be_read():
    assert said_of("vendor", examined(f"rm {FILE}; mkfifo {FILE}", options=("--vendor", "1"))) == (
        "!!", f"{FILE} is not a regular file: remove it")


def test_a_port_that_is_taken():
    found, said = said_of("port", examined(
        "nc -l -p 34952 & until netstat -ltn | grep -q 34952; do sleep 0.05; done"))

    assert found == "!!"
    assert said.startswith("port 34952 is not available: Address already in use; ")


def test_a_process_9():
    outcome = on_bare_machine("until /usr/bin/sleep 9 & [[ $! -ge 9 ]]; do kill $!; done; "
                              f"{FPTEST} doctor")

    assert said_of("process-9", outcome) == (
        "! ", "process 9 (sleep) is alive, and each stop by the library sends it SIGTERM as "
        "well; stop no items while it matters")


def test_a_proc_that_hides_processes():
    # group 0 of the machine itself is shown everything
    is_root = os.geteuid() == 0
    user = "" if is_root else "--user --map-root-user"
    drop = ("--reuid 65534 --regid 65534 --clear-groups" if is_root else
            "--bounding-set=-all --inh-caps=-all")
    outcome = run(*f"unshare {user} --mount --pid --fork --mount-proc --net --kill-child".split(),
                  "bash", "-c", "mount -t proc -o hidepid=2 proc /proc && "
                  f"setpriv {drop} {FPTEST} doctor; :")

    assert lines_of(outcome)["proc"] == (
        "! ", "/proc hides other users' processes (hidepid): no ps finds their gatherer or "
        "items; run agent, items and gatherer as one user, or as root")


@pytest.mark.parametrize("limit, mark, why", [
    (255, "! ", "of which each stored plan, trigger and stop takes one for ever"),
    (15, "!!", "and fptest run needs more"),
])
def test_few_descriptors(limit, mark, why):
    outcome = examined(f"ulimit -n {limit}")

    assert outcome.status == (3 if mark == "!!" else 0)
    assert lines_of(outcome)["descriptors"] == (
        mark, f"a process may open {limit} files only, {why}; raise the limit (ulimit -n 1024)")


@pytest.mark.parametrize("limit", [16, 256])
def test_as_many_descriptors_as_are_needed(limit):
    lines = lines_of(examined(f"ulimit -n {limit}"))

    assert lines["descriptors"][0] == ("ok" if limit == 256 else "! ")


def shared_library(directory, name, source):
    (directory / "it.c").write_text(source)
    output_of("cc", "-shared", "-fPIC", "-o", directory / name, directory / "it.c")


def test_a_later_mini_xml(tmp_path):
    shared_library(tmp_path, "later.so", "void *mxmlOptionsNew(void) { return 0; }")
    found, said = said_of("mini-xml", shell("LD_PRELOAD=$PWD/later.so fptest doctor",
                                            cwd=tmp_path))

    assert found == "!!"
    assert re.fullmatch(r"/\S+/libmxml\.so\S+ is not Mini-XML 2\.7 to 3\.x; install that, fptest "
                        r"is built for \d\.\d+", said)


def test_a_library_that_lacks_something(tmp_path):
    shared_library(tmp_path, "libquillmark.so.1", """
        int FPTEST_RunTestCmd(void) { return 0; } int FPTEST_SetTransation(void) { return 0; }
        void FPTEST_ExtractResultMsg(void) {}""")
    lines = lines_of(shell("LD_LIBRARY_PATH=$PWD fptest doctor", cwd=tmp_path))

    assert lines["library"] == (
        "!!", f"{tmp_path}/libquillmark.so.1 has no FPTEST_SuspendItemExecute and g_TestCmdTree; "
        "install a whole libquillmark")
