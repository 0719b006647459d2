# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""device/run where namespaces are refused: what it advises, and the container or the
machine itself as the device. Tried only in a sandbox, which truly refuses them."""
import re
import shlex

import pytest

from support.outside import BUILD, GOES_ON, PS_HEADER, TREE, Outcome, on_machine

pytestmark = pytest.mark.usefixtures("namespaces")


# Machines, as on_machine takes them.
CONTAINER = {"is_container": True}
WORKING = {"refuses_namespaces": False}


def without(tool):
    return {"options": ["--ro-bind", "/dev/null", f"/usr/bin/{tool}"]}


def on_container(script, **others):
    return on_machine(script, **CONTAINER, **others)


def test_the_sandbox_truly_refuses_namespaces():
    nested = "bwrap --unshare-user-try --unshare-pid --ro-bind / / true"

    assert on_machine(nested).status != 0
    assert on_machine(nested, refuses_namespaces=False).status == 0


# ---- refusals ----------------------------------------------------------------

REFUSED = "namespaces are refused here; "
ADVICE = ("; or, on a machine that may be thrown away, use it as the device: as root, "
          "device/run --in-place, QUILLMARK_IN_PLACE=1 scripts/demo, QUILLMARK_IN_PLACE=1 "
          "scripts/test")
USER = {"user": 1000}


def refusal(complaint):
    return Outcome(125, "", f"device/run: {complaint}\n")


def switch(name, value):
    """A machine's sysctl that refuses namespaces."""
    return {"sysctls": {name: value}}


@pytest.mark.parametrize("machine, wanted", [
    (switch("user/max_user_namespaces", 0), "user.max_user_namespaces=15000"),
    (USER | switch("user/max_user_namespaces", 0), "user.max_user_namespaces=15000"),
    (USER | switch("kernel/unprivileged_userns_clone", 0),
     "kernel.unprivileged_userns_clone=1"),
    (USER | switch("kernel/apparmor_restrict_unprivileged_userns", 1),
     "kernel.apparmor_restrict_unprivileged_userns=0"),
])
def test_a_refusal_names_the_switch_that_explains_it(machine, wanted):
    assert on_machine('"$1" -- true', **machine) == refusal(
        f"{REFUSED}as root: sysctl {wanted}{ADVICE}")


@pytest.mark.parametrize("option, machine, complaint", [
    ("", USER | CONTAINER, f"{REFUSED}run this as root in this container"),
    ("--in-place", USER | CONTAINER, "--in-place needs root"),
    ("--in-place", USER, "--in-place needs root"),
    ("", without("bwrap"), "bwrap is missing; apt-get install bubblewrap"),
    ("", without("mksh"), "mksh is missing; apt-get install mksh"),
    ("", without("toybox"), "toybox is missing; apt-get install toybox"),
    ("--adb 5600", without("python3"),
     "/usr/bin/python3 is missing, for --adb; apt-get install python3"),
])
def test_a_refusal_names_what_is_wanted(option, machine, complaint):
    assert on_machine(f'"$1" {option} -- true', **machine) == refusal(complaint)


@pytest.mark.parametrize("user", [0, 1000])
def test_a_refusal_gives_bwraps_reason_where_no_switch_explains_it(user):
    reason = on_machine("bwrap --unshare-user --ro-bind / / true", user=user).err
    assert reason.startswith("bwrap: ")

    assert on_machine('"$1" -- true', user=user) == refusal(
        f"{REFUSED}enable user namespaces ({reason.rstrip()}){ADVICE}")


def test_a_refusal_does_not_blame_a_switch_that_leaves_root_alone():
    outcome = on_machine('"$1" -- true', sysctls={
        "kernel/unprivileged_userns_clone": 0,
        "kernel/apparmor_restrict_unprivileged_userns": 1,
    })

    assert outcome.err.startswith(f"device/run: {REFUSED}enable user namespaces (bwrap: ")


def test_a_box_that_fails_for_another_reason_is_no_refusal():
    # the container could be the device; but namespaces work, so it is not touched
    outcome = on_container(r"""
        mkdir /tmp/bin
        printf '%s\n' '#!/bin/sh' \
            'case $* in *--hostname*) echo "bwrap: no name" >&2; exit 1;; esac' \
            'exec /usr/bin/bwrap "$@"' >/tmp/bin/bwrap
        chmod +x /tmp/bin/bwrap
        PATH=/tmp/bin:$PATH "$1" -- true; echo $?; ls /""", refuses_namespaces=False)

    assert outcome.out.startswith("125\n")
    assert "system" not in outcome.out
    assert outcome.err == "device/run: bwrap cannot lay out the device: no name\n"


# ---- other places for the tree -----------------------------------------------

@pytest.mark.parametrize("parent", [
    "/tmp", "/root", "/home/user", "/data", "/data/vorlane", "/mnt", "/opt", "/srv/a/b"])
def test_a_tree_may_lie_in_any_directory(parent):
    place = f"{parent}/project"
    launcher = f"{place}/device/run"

    outcome = on_machine(f"{launcher} -- ls {launcher}", refuses_namespaces=False,
                         options=["--ro-bind", TREE, place])

    assert outcome.out == launcher + "\n", outcome.err


# ---- the gatherer's own port -------------------------------------------------

# Every connection is made from the library's port, so that it finds itself.
def test_a_gatherer_connected_to_itself_does_not_hold_the_librarys_port():
    gatherer = shlex.quote(str(BUILD / "device/bin/SensorProbe"))

    outcome = on_machine(f"""
        echo 34952 34953 >/proc/sys/net/ipv4/ip_local_port_range
        {gatherer} --group g &
        sleep 0.2
        printf 'gather again!' | timeout 3 toybox netcat -l -p 34952; echo $?
        kill $!""", refuses_namespaces=False)

    assert outcome.out == "0\n", outcome.err


# ---- in place ----------------------------------------------------------------

ANNOUNCEMENT = "device/run: in place: this container (/.dockerenv) refuses namespaces\n"
ASKED_FOR = "device/run: in place: asked for, "

WAYS = {
    "chosen by itself in a container that refuses namespaces": (
        '"$1"', CONTAINER, "in-place", ANNOUNCEMENT),
    "chosen where there is another container's mark": (
        'touch /run/.containerenv; "$1"', {}, "in-place",
        ANNOUNCEMENT.replace("/.dockerenv", "/run/.containerenv")),
    "chosen where a variable tells of a container": (
        'container=podman "$1"', {}, "in-place",
        ANNOUNCEMENT.replace("/.dockerenv", "the variable 'container'")),
    "not chosen where namespaces work": ('"$1"', CONTAINER | WORKING, "namespace", ""),
    "asked for where namespaces work": (
        '"$1" --in-place', CONTAINER | WORKING, "in-place",
        ASKED_FOR + "in this container (/.dockerenv)\n"),
    "asked for where there is no bwrap": (
        '"$1" --in-place', CONTAINER | without("bwrap"), "in-place",
        ASKED_FOR + "in this container (/.dockerenv)\n"),
    "asked for where no container is to be seen": (
        '"$1" --in-place', {}, "in-place", ASKED_FOR + "on this machine\n"),
    "asked for by a variable": (
        'QUILLMARK_IN_PLACE=1 "$1"', {}, "in-place", ASKED_FOR + "on this machine\n"),
}


@pytest.mark.parametrize("launcher, machine, way, said", WAYS.values(), ids=WAYS)
def test_it_is_in_place_or_not(launcher, machine, way, said):
    outcome = on_machine(
        f"{launcher} -- sh -c 'echo $QUILLMARK_DEVICE'; readlink /bin/sh", **machine)

    assert outcome == (0, f"{way}\n/usr/bin/dash\n", said)


@pytest.mark.parametrize("value", ["", "0"])
def test_it_is_not_asked_for_by_a_variable_that_is_empty_or_zero(value):
    outcome = on_machine(f'QUILLMARK_IN_PLACE={value} "$1" -- true')

    assert outcome.err.startswith("device/run: " + REFUSED)


def test_it_leaves_alone_what_a_machine_without_a_mark_has():
    outcome = on_machine('mkdir -p /data/vorlane; "$1" --in-place -- true')

    assert outcome.err == (
        ASKED_FOR + "on this machine\n"
        "device/run: in place: /data/vorlane exists already; move it away first\n")


def test_it_lays_out_the_device():
    outcome = on_container("""
        "$1" --vendor 2 -- sh -c 'ls -A /data/vorlane
        grep -c "<vendor>2</vendor>" /etc/vorlane/sysparms/vr_common_cfg.xml
        readlink /bin/sh; cd /system/bin
        ls -d SpiCheck_ca cat ps sh; ps | grep -c " ps$"; exit 9'""")

    assert outcome.out == "1\n/usr/bin/mksh\nSpiCheck_ca\ncat\nps\nsh\n1\n"
    assert outcome.status == 9


def test_it_puts_the_container_back():
    look = "ls -l /bin /var/lib /system /data /etc/vorlane 2>&1; ls -A /"
    before = on_container(look).out
    after = on_container('"$1" --vendor 1 -- touch /data/vorlane/x; ' + look).out

    assert "sh -> /usr/bin/dash" in before
    times = "[A-Z][a-z]{2} +[0-9]+ [0-9:]{5}"
    assert re.sub(times, "", after) == re.sub(times, "", before)


# Makes the next process of the script number 9, which then sleeps, and starts one more.
SLEEP_AS_PROCESS_9 = """
    until [ ${last:=0} -ge 8 ]; do : & last=$!; wait; done
    sleep 99 & [ $! = 9 ] || exit 99
    sleep 98 &"""

# A shell function that prints the command lines, of all processes, that match.
RUNNING = r"""
    running()
    {
        for p in /proc/[0-9]*; do
            echo $(tr '\0' ' ' 2>/dev/null <$p/cmdline)
        done | grep -xE "$1"
    }"""


def until(condition):
    return f"until {condition}; do sleep 0.05; done"


ON = until("[ -e /tmp/on ]")

IN_PLACE = {
    "it sets the three variables": (
        "\"$1\" -- sh -c 'echo $QUILLMARK_DEVICE $PATH $TMPDIR ${KSH_VERSION%% R*}'",
        "in-place /system/bin /tmp @(#)MIRBSD KSH\n"),
    "it runs the library's shell as mksh": (
        """ "$1" -- /system/bin/sh -c 'echo $0 ${KSH_VERSION%% R*}' """,
        "sh @(#)MIRBSD KSH\n"),
    "it leaves the arguments of the library's shell unchanged": (
        """ "$1" -- /system/bin/sh -c 'echo $0 "$@"' a 'b  c' """, "a b  c\n"),
    "it runs every other command while a process nine is alive": (
        SLEEP_AS_PROCESS_9 + """
        "$1" -- /system/bin/sh -c "kill $!; echo killed"; wait $!; echo $?; kill 9""",
        "killed\n143\n"),
    "it stops items while process nine is nobody": ("""
        sleep 0.1 & while [ $! -le 9 ]; do : & wait; done
        sleep 98 & "$1" -- /system/bin/sh -c "kill 9 $!"; wait $!; echo $?""",
        "143\n"),
    "it ends and puts back on SIGTERM": (RUNNING + f"""
        "$1" -- sh -c 'sleep 78 & touch /tmp/on; exec sleep 79' &
        {ON}; kill $!; wait $!; echo $?
        running 'sleep 7.'; readlink /bin/sh; ls -d /system""",
        "143\n/usr/bin/dash\n"),
    "the next run undoes what an interrupted one left": (f"""
        "$1" -- sh -c 'touch /data/vorlane/left; sleep 78 & sleep 79' &
        {until("[ -e /data/vorlane/left ]")}
        kill -KILL $!; wait $! 2>/dev/null; readlink /bin/sh
        "$1" -- sh -c 'ls -A /data/vorlane; ps sleep'; readlink /bin/sh; ls -d /system""",
        f"/usr/bin/mksh\n{PS_HEADER}\n/usr/bin/dash\n"),
    "SIGKILL of the launcher ends COMMAND": (RUNNING + f"""
        "$1" -- sleep 79 & {until("running 'sleep 79'")}
        kill -KILL $!; wait $! 2>/dev/null; sleep 0.3; running 'sleep 79'""",
        "sleep 79\n"),
    "a program that it cannot tell for its own does not hold the container": ("""
        "$1" -- sh -c '/usr/bin/env -i /usr/bin/sleep 99 &'; timeout 5 "$1" -- echo on""",
        "on\n"),
    "it keeps data in the directory named": ("""
        mkdir /tmp/kept; echo old >/tmp/kept/old
        "$1" --data /tmp/kept -- sh -c 'cat /data/vorlane/old; echo new >/data/vorlane/new'
        cat /tmp/kept/*; ls -d /data""",
        "old\nnew\nold\n"),
    "it has the ps of the release that is named": (
        """ "$1" --android 7 -- ps BurnIn; readlink /bin/sh """,
        "bad pid 'BurnIn'\n/usr/bin/dash\n"),
    "adb reaches it": (f"""
        export HOME=/tmp; "$1" --adb 5600 &
        {until("adb connect 127.0.0.1:5600 | grep -q '^connected'")}
        adb push "$1" /data/local/tmp | grep -c pushed
        adb shell 'echo $QUILLMARK_DEVICE; cd /data/local/tmp; ls; exit 3'; echo $?
        adb shell 'touch /tmp/on; exec sleep 79' & {ON}
        kill %1; wait %1; echo $?; wait; readlink /bin/sh; ls -d /data
        adb kill-server""",
        "1\nin-place\nrun\n3\n143\n/usr/bin/dash\n"),
    "it starts COMMAND in the directory whose files stay": ("""
        cd /tmp; "$1" --out out -- sh -c 'pwd; echo x >file'; cat out/file""",
        "/tmp/out\nx\n"),
}


@pytest.mark.parametrize("script, out", IN_PLACE.values(), ids=IN_PLACE)
def test_in_place(script, out):
    assert on_container(script).out == out


def test_a_stop_spares_the_containers_process_nine():
    outcome = on_container(SLEEP_AS_PROCESS_9 + """
        sleep 70 & "$1" -- /system/bin/sh -c "kill 9 $!"; echo $?
        wait $!; echo $?; kill -0 9 && echo alive; kill 9""")

    assert outcome.out == "1\n143\nalive\n"
    assert re.fullmatch(".*\n.*sh: kill: 4194305: No such process\n", outcome.err)


def test_it_ends_what_command_leaves_running():
    out = on_container(RUNNING + """
        sleep 77 & "$1" -- sh -c 'sleep 78 & /system/bin/sleep 79 &
            (trap "" TERM; exec -a deaf /usr/bin/sleep 80) &
            /usr/bin/env -i /system/bin/sleep 81 & sleep 0.5; ps sl; ps deaf'
        running '(.*sleep|deaf) [0-9]+'; kill %1""").out

    assert " sleep\n" in out
    assert " /system/bin/sleep\n" in out
    assert out.endswith(" deaf\nsleep 77\n"), out


def test_one_run_waits_for_another():
    outcome = on_container(f"""
        "$1" -- sh -c 'touch /tmp/on; sleep 1; echo first' &
        {ON}; "$1" -- echo second; wait""")

    assert outcome.out == "first\nsecond\n"
    assert outcome.err == (
        ANNOUNCEMENT + ANNOUNCEMENT +
        "device/run: in place: waiting for the run that has this container\n")


@pytest.mark.parametrize("path", ["/data/vorlane", "/system/bin", "/etc/vorlane"])
def test_it_leaves_alone_what_the_container_already_has(path):
    outcome = on_container(f"""
        mkdir -p {path}; touch {path}/precious; "$1" -- true; echo $?
        ls {path}; readlink /bin/sh""")

    assert outcome.out == "125\nprecious\n/usr/bin/dash\n"
    assert outcome.err == (
        f"{ANNOUNCEMENT}device/run: in place: {path} exists already; move it away first\n")


def test_it_says_that_the_root_cannot_be_changed():
    outcome = on_container('"$1" -- true', options=["--remount-ro", "/"])

    assert outcome == (125, "", ANNOUNCEMENT + "device/run: in place: mkdir: cannot create "
                       "directory '/var/lib/quillmark-device': Read-only file system\n")


# The device is started as a shell with job control starts it, with a group of its own.
# COMMAND says what it gets, and ends half a second later.
@pytest.mark.parametrize("signal", ["HUP", "INT", "TERM"])
@pytest.mark.parametrize("whom", ["$!", "-- -$!"], ids=["to it alone", "to its group"])
def test_signals_come_to_command_once(signal, whom):
    outcome = on_container(f"""
        set -m
        "$1" -- sh -c 'for s in HUP INT TERM; do trap "echo $s; left=10" $s; done
            left=200; touch /tmp/on
            while [ $((left -= 1)) -gt 0 ]; do sleep 0.05; done; exit 7' &
        {ON}; kill -{signal} {whom}; wait $!; echo $?; readlink /bin/sh""")

    assert outcome.out == f"{signal}\n7\n/usr/bin/dash\n"


def test_it_ends_a_command_that_goes_on_after_a_signal():
    outcome = on_container(f"""
        "$1" -- sh -c 'trap "" TERM; touch /tmp/on; while :; do sleep 0.1; done' &
        {ON}; kill $!; wait $!; echo $?; readlink /bin/sh""")

    assert outcome.out == "143\n/usr/bin/dash\n"
    assert outcome.err == ANNOUNCEMENT + GOES_ON
