// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// device/run where namespaces are refused: what it advises, and the container or the
// machine itself as the device. Tried only in a sandbox, which truly refuses them.
#include "../quoted.h"
#include "launcher_machine.h"

#include <regex>

using namespace launcher;

namespace
{

class Refusal : public Sandbox
{
};

TEST_F(Sandbox, TrulyRefusesNamespaces)
{
    const std::string nested = "bwrap --unshare-user-try --unshare-pid --ro-bind / / true";

    EXPECT_NE(Machine{}.run(nested).status, 0);
    EXPECT_EQ(Machine{.refuses_namespaces = false}.run(nested).status, 0);
}

const std::string advice =
    "; or, on a machine that may be thrown away, make it the device: as root, device/run "
    "--in-place, QUILLMARK_IN_PLACE=1 scripts/demo, QUILLMARK_IN_PLACE=1 scripts/test";

void expect_refusal(const Machine &machine, const std::string &complaint,
                    const std::string &options = "")
{
    const Outcome outcome = machine.run("\"$1\" " + options + " -- true");

    EXPECT_EQ(outcome.err, "device/run: " + complaint + "\n");
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.status, 125);
}

TEST_F(Refusal, NamesTheNumberOfNamespaces)
{
    for (const int user : {0, 1000}) {
        expect_refusal(
            {.user = user, .sysctls = {{"user/max_user_namespaces", "0"}}},
            "namespaces are refused here; as root: sysctl user.max_user_namespaces=15000" + advice);
    }
}

TEST_F(Refusal, NamesTheSwitchForUsersOtherThanRoot)
{
    expect_refusal(
        {.user = 1000, .sysctls = {{"kernel/unprivileged_userns_clone", "0"}}},
        "namespaces are refused here; as root: sysctl kernel.unprivileged_userns_clone=1" + advice);
}

TEST_F(Refusal, NamesTheSwitchOfAppArmor)
{
    expect_refusal(
        {.user = 1000, .sysctls = {{"kernel/apparmor_restrict_unprivileged_userns", "1"}}},
        "namespaces are refused here; as root: sysctl "
        "kernel.apparmor_restrict_unprivileged_userns=0" +
            advice);
}

TEST_F(Refusal, GivesBwrapsReasonWhereNoSwitchExplainsIt)
{
    for (const int user : {0, 1000}) {
        const std::string reason =
            Machine{.user = user}.run("bwrap --unshare-user --ro-bind / / true").err;
        ASSERT_TRUE(reason.starts_with("bwrap: ")) << reason;

        expect_refusal({.user = user}, "namespaces are refused here; enable user namespaces (" +
                                           reason.substr(0, reason.size() - 1) + ")" + advice);
    }
}

TEST_F(Refusal, DoesNotBlameASwitchThatLeavesRootAlone)
{
    const Outcome outcome = Machine{
        .sysctls = {{"kernel/unprivileged_userns_clone", "0"},
                    {"kernel/apparmor_restrict_unprivileged_userns",
                     "1"}}}.run("\"$1\" -- true");

    EXPECT_TRUE(outcome.err.starts_with(
        "device/run: namespaces are refused here; enable user namespaces (bwrap: "))
        << outcome.err;
}

TEST_F(Refusal, TellsAUserOfAContainerToBeRoot)
{
    expect_refusal({.is_container = true, .user = 1000},
                   "namespaces are refused here; run this as root in this container");
}

TEST_F(Refusal, NamesThePackageOfAMissingTool)
{
    const std::map<std::string, std::string> packages = {
        {"bwrap", "bubblewrap"}, {"mksh", "mksh"}, {"toybox", "toybox"}};

    for (const auto &[tool, package] : packages) {
        const Words hidden = {"--ro-bind", "/dev/null", "/usr/bin/" + tool};
        expect_refusal({.options = hidden}, tool + " is missing; apt-get install " + package);
    }
}

TEST_F(Refusal, GoesInPlaceOnlyForRoot)
{
    expect_refusal({.is_container = true, .user = 1000}, "--in-place needs root", "--in-place");
    expect_refusal({.user = 1000}, "--in-place needs root", "--in-place");
}

TEST_F(Refusal, ABoxThatFailsForAnotherReasonIsNoRefusal)
{
    // the container could be the device; but namespaces work, so it is not touched
    const Outcome outcome = Machine{.refuses_namespaces = false, .is_container = true}.run(
        "mkdir /tmp/bin; printf '%s\\n' '#!/bin/sh' "
        "'case $* in *--hostname*) echo \"bwrap: no name\" >&2; exit 1;; esac' "
        "'exec /usr/bin/bwrap \"$@\"' >/tmp/bin/bwrap; chmod +x /tmp/bin/bwrap; "
        "PATH=/tmp/bin:$PATH \"$1\" -- true; echo $?; ls /");

    EXPECT_TRUE(outcome.out.starts_with("125\n")) << outcome.out;
    EXPECT_EQ(outcome.out.find("system"), std::string::npos) << outcome.out;
    EXPECT_EQ(outcome.err, "device/run: bwrap cannot lay out the device: no name\n");
}

// ---- other places for the tree ----------------------------------------------

TEST_F(Sandbox, ATreeMayLieInAnyDirectory)
{
    for (const std::string parent :
         {"/tmp", "/root", "/home/user", "/data", "/data/vorlane", "/mnt", "/opt", "/srv/a/b"}) {
        const std::string place = parent + "/project";
        const Machine machine{.refuses_namespaces = false, .options = {"--ro-bind", tree, place}};

        const Outcome outcome = machine.run(place + "/device/run -- ls " + place + "/device/run");

        EXPECT_EQ(outcome.out, place + "/device/run\n") << outcome.err;
    }
}

// ---- the gatherer's own port ------------------------------------------------

// Every connection is made from the library's port, so that it finds itself.
TEST_F(Sandbox, AGathererConnectedToItselfDoesNotHoldTheModulesPort)
{
    const std::string gatherer = quoted(build / "device/bin/SensorProbe");

    const Outcome outcome = Machine{.refuses_namespaces = false}.run(
        "echo 34952 34953 >/proc/sys/net/ipv4/ip_local_port_range; " + gatherer +
        " --group g & sleep 0.2; printf 'gather again!' | timeout 3 toybox netcat -l -p 34952; "
        "echo $?; kill $!");

    EXPECT_EQ(outcome.out, "0\n") << outcome.err;
}

// ---- in place ---------------------------------------------------------------

class InPlace : public Sandbox
{
  protected:
    const Machine container{.is_container = true};
    const std::string announcement =
        "device/run: in place: this container (/.dockerenv) refuses namespaces\n";
};

TEST_F(InPlace, IsChosenByItselfInAContainerThatRefusesNamespaces)
{
    const Outcome outcome =
        container.run("\"$1\" -- sh -c 'echo $QUILLMARK_DEVICE $PATH $TMPDIR $KSH_VERSION'");

    EXPECT_TRUE(outcome.out.starts_with("in-place /system/bin /tmp @(#)MIRBSD KSH")) << outcome.out;
    EXPECT_EQ(outcome.err, announcement);
    EXPECT_EQ(outcome.status, 0);
}

TEST_F(InPlace, IsNotChosenWhereNamespacesWork)
{
    const Outcome outcome = Machine{.refuses_namespaces = false, .is_container = true}.run(
        "\"$1\" -- printenv QUILLMARK_DEVICE");

    EXPECT_EQ(outcome.out, "namespace\n");
    EXPECT_EQ(outcome.err, "");
}

TEST_F(InPlace, CanBeAskedFor)
{
    const Outcome outcome = Machine{.refuses_namespaces = false, .is_container = true}.run(
        "\"$1\" --in-place -- printenv QUILLMARK_DEVICE");

    EXPECT_EQ(outcome.out, "in-place\n");
    EXPECT_EQ(outcome.err, "device/run: in place: asked for, in this container (/.dockerenv)\n");
}

TEST_F(InPlace, CanBeAskedForWhereNoContainerIsToBeSeen)
{
    const std::string here = "device/run: in place: asked for, on this machine\n";
    const std::string ask = "-- sh -c 'echo $QUILLMARK_DEVICE'; readlink /bin/sh";
    for (const std::string way : {"\"$1\" --in-place ", "QUILLMARK_IN_PLACE=1 \"$1\" "}) {
        const Outcome outcome = Machine{}.run(way + ask);

        EXPECT_EQ(outcome.out, "in-place\n/usr/bin/dash\n");
        EXPECT_EQ(outcome.err, here);
    }
}

TEST_F(InPlace, IsNotAskedForByAVariableThatIsEmptyOrZero)
{
    for (const std::string value : {"", "0"}) {
        const Outcome outcome = Machine{}.run("QUILLMARK_IN_PLACE=" + value + " \"$1\" -- true");
        EXPECT_TRUE(outcome.err.starts_with("device/run: namespaces are refused here; "));
    }
}

TEST_F(InPlace, LeavesAloneWhatAMachineWithoutAMarkHas)
{
    EXPECT_EQ(Machine{}.run("mkdir -p /data/vorlane; \"$1\" --in-place -- true").err,
              "device/run: in place: asked for, on this machine\n"
              "device/run: in place: /data/vorlane exists already; move it away first\n");
}

TEST_F(InPlace, NeedsNoBwrapWhenAskedFor)
{
    const Machine without_bwrap{.is_container = true,
                                .options = {"--ro-bind", "/dev/null", "/usr/bin/bwrap"}};

    EXPECT_EQ(without_bwrap.run("\"$1\" --in-place -- true").status, 0);
}

TEST_F(InPlace, KnowsAContainerByOtherMarks)
{
    EXPECT_EQ(Machine{}.run("touch /run/.containerenv; \"$1\" -- true").err,
              "device/run: in place: this container (/run/.containerenv) refuses namespaces\n");
    EXPECT_EQ(Machine{}.run("container=podman \"$1\" -- true").err,
              "device/run: in place: this container (the variable 'container') refuses "
              "namespaces\n");
}

TEST_F(InPlace, LaysOutTheDevice)
{
    const Outcome outcome = container.run(
        "\"$1\" --vendor 2 -- sh -c 'ls -A /data/vorlane; grep -c \"<vendor>2</vendor>\" "
        "/etc/vorlane/sysparms/vr_common_cfg.xml; readlink /bin/sh; cd /system/bin; "
        "ls -d SpiCheck_ca cat ps sh; ps | grep -c \" ps$\"; exit 9'");

    EXPECT_EQ(outcome.out, "1\n/usr/bin/mksh\nSpiCheck_ca\ncat\nps\nsh\n1\n");
    EXPECT_EQ(outcome.status, 9);
}

TEST_F(InPlace, PutsTheContainerBack)
{
    const std::string look = "ls -l /bin /var/lib /system /data /etc/vorlane 2>&1; ls -A /; ";
    const Outcome before = container.run(look);
    const Outcome after = container.run("\"$1\" --vendor 1 -- touch /data/vorlane/x; " + look);
    const auto without_times = [](const std::string &text) {
        return std::regex_replace(text, std::regex("[A-Z][a-z]{2} +[0-9]+ [0-9:]{5}"), "");
    };

    EXPECT_NE(before.out.find("sh -> /usr/bin/dash"), std::string::npos) << before.out;
    EXPECT_EQ(without_times(after.out), without_times(before.out));
}

TEST_F(InPlace, RunsTheModulesShellAsMkshWithItsArgumentsUnchanged)
{
    const Outcome outcome =
        container.run("\"$1\" -- /system/bin/sh -c 'echo $0 ${KSH_VERSION%% R*} \"$@\"' a 'b  c'");

    EXPECT_EQ(outcome.out, "a @(#)MIRBSD KSH b  c\n");
    EXPECT_EQ(container.run("\"$1\" -- /system/bin/sh -c 'echo $0'").out, "sh\n");
}

// Makes the next process of the script number 9, which then sleeps.
const std::string sleep_as_process_9 =
    "until [ ${last:=0} -ge 8 ]; do : & last=$!; wait; done; sleep 99 & [ $! = 9 ] || exit 99; ";

TEST_F(InPlace, RefusesToStopItemsWhileAProcessNineIsAlive)
{
    const Outcome outcome =
        container.run(sleep_as_process_9 + "sleep 98 & \"$1\" -- /system/bin/sh -c \"kill 9 $!\"; "
                                           "echo $?; kill -0 9 $! && echo alive; "
                                           "kill 9 $!");

    EXPECT_EQ(outcome.out, "1\nalive\n");
    std::smatch id;
    EXPECT_TRUE(std::regex_search(
        outcome.err, id,
        std::regex("\ndevice/run: 'kill 9 [0-9]+' is not run: process 9 is alive here and would "
                   "get the signal\n")))
        << outcome.err;
    EXPECT_EQ(lines_of(outcome.err).size(), 2U) << outcome.err;
}

TEST_F(InPlace, RunsEveryOtherCommandWhileAProcessNineIsAlive)
{
    const Outcome outcome =
        container.run(sleep_as_process_9 + "sleep 98 & \"$1\" -- /system/bin/sh -c \"kill $!; echo "
                                           "killed\"; wait $!; echo $?; kill 9");

    EXPECT_EQ(outcome.out, "killed\n143\n");
}

TEST_F(InPlace, StopsItemsWhileProcessNineIsNobody)
{
    const Outcome outcome =
        container.run("sleep 0.1 & while [ $! -le 9 ]; do : & wait; done; sleep 98 & "
                      "\"$1\" -- /system/bin/sh -c \"kill 9 $!\"; wait $!; echo $?");

    EXPECT_EQ(outcome.out, "143\n");
}

// A shell function that prints the command lines, of all processes, that match.
const std::string running =
    "running() { for p in /proc/[0-9]*; do "
    "echo $(tr '\\0' ' ' 2>/dev/null <$p/cmdline); done | grep -xE \"$1\"; }; ";

TEST_F(InPlace, EndsWhatCommandLeavesRunning)
{
    const Outcome outcome = container.run(
        running + "sleep 77 & \"$1\" -- sh -c 'sleep 78 & /system/bin/sleep 79 & "
                  "(trap \"\" TERM; exec -a deaf /usr/bin/sleep 80) & "
                  "/usr/bin/env -i /system/bin/sleep 81 & sleep 0.5; ps sl; ps deaf'; "
                  "running '(.*sleep|deaf) [0-9]+'; kill %1");

    for (const std::string left : {" sleep\n", " /system/bin/sleep\n", " deaf\n"}) {
        EXPECT_NE(outcome.out.find(left), std::string::npos) << outcome.out;
    }
    EXPECT_TRUE(outcome.out.ends_with(" deaf\nsleep 77\n")) << outcome.out;
}

TEST_F(InPlace, EndsAndPutsBackOnSigterm)
{
    const Outcome outcome = container.run(
        running + "\"$1\" -- sh -c 'sleep 78 & touch /tmp/on; exec sleep 79' & "
                  "until [ -e /tmp/on ]; do sleep 0.05; done; kill $!; wait $!; echo $?; "
                  "running 'sleep 7.'; readlink /bin/sh; ls -d /system");

    EXPECT_EQ(outcome.out, "143\n/usr/bin/dash\n");
}

TEST_F(InPlace, TheNextRunUndoesWhatAnInterruptedOneLeft)
{
    const Outcome outcome = container.run(
        "\"$1\" -- sh -c 'touch /data/vorlane/left; sleep 78 & sleep 79' & "
        "until [ -e /data/vorlane/left ]; do sleep 0.05; done; "
        "kill -KILL $!; wait $! 2>/dev/null; readlink /bin/sh; "
        "\"$1\" -- sh -c 'ls -A /data/vorlane; ps sleep'; readlink /bin/sh; ls -d /system");

    EXPECT_EQ(outcome.out, "/usr/bin/mksh\n" + header + "\n/usr/bin/dash\n");
}

TEST_F(InPlace, SigkillOfTheLauncherEndsCommand)
{
    const Outcome outcome = container.run(
        running + "\"$1\" -- sleep 79 & until running 'sleep 79'; do sleep 0.05; done; "
                  "kill -KILL $!; wait $! 2>/dev/null; sleep 0.3; running 'sleep 79'");

    EXPECT_EQ(outcome.out, "sleep 79\n");
}

TEST_F(InPlace, OneRunWaitsForAnother)
{
    const Outcome outcome =
        container.run("\"$1\" -- sh -c 'touch /tmp/on; sleep 1; echo first' & "
                      "until [ -e /tmp/on ]; do sleep 0.05; done; \"$1\" -- echo second; wait");

    EXPECT_EQ(outcome.out, "first\nsecond\n");
    EXPECT_EQ(outcome.err,
              announcement + announcement +
                  "device/run: in place: waiting for the run that has this container\n");
}

TEST_F(InPlace, AProgramThatItCannotTellForItsOwnDoesNotHoldTheContainer)
{
    const Outcome outcome = container.run("\"$1\" -- sh -c '/usr/bin/env -i /usr/bin/sleep 99 &'; "
                                          "timeout 5 \"$1\" -- echo on");

    EXPECT_EQ(outcome.out, "on\n");
}

TEST_F(InPlace, KeepsDataInTheDirectoryNamed)
{
    const Outcome outcome = container.run(
        "mkdir /tmp/kept; echo old >/tmp/kept/old; "
        "\"$1\" --data /tmp/kept -- sh -c 'cat /data/vorlane/old; echo new >/data/vorlane/new'; "
        "cat /tmp/kept/*; ls -d /data");

    EXPECT_EQ(outcome.out, "old\nnew\nold\n");
}

TEST_F(InPlace, StartsCommandInTheDirectoryWhoseFilesStay)
{
    const Outcome outcome = container.run("cd /tmp; \"$1\" --out out -- sh -c 'pwd; echo x >file'; "
                                          "cat out/file");

    EXPECT_EQ(outcome.out, "/tmp/out\nx\n");
}

TEST_F(InPlace, LeavesAloneWhatTheContainerAlreadyHas)
{
    for (const std::string path : {"/data/vorlane", "/system/bin", "/etc/vorlane"}) {
        const Outcome outcome =
            container.run("mkdir -p " + path + "; touch " + path +
                          "/precious; \"$1\" -- true; echo $?; ls " + path + "; readlink /bin/sh");

        EXPECT_EQ(outcome.out, "125\nprecious\n/usr/bin/dash\n");
        EXPECT_EQ(outcome.err, announcement + "device/run: in place: " + path +
                                   " exists already; move it away first\n");
    }
}

TEST_F(InPlace, SaysThatTheRootCannotBeChanged)
{
    const Machine read_only{.is_container = true, .options = {"--remount-ro", "/"}};

    const Outcome outcome = read_only.run("\"$1\" -- true");

    EXPECT_EQ(outcome.status, 125);
    EXPECT_EQ(outcome.err, announcement + "device/run: in place: mkdir: cannot create directory "
                                          "'/var/lib/quillmark-device': Read-only file system\n");
}

// Started as a shell with job control starts it, with a group of its own. COMMAND says
// what it gets, and ends half a second later.
const std::string listener =
    "set -m; \"$1\" -- sh -c 'for s in HUP INT TERM; do trap \"echo $s; left=10\" $s; done; "
    "touch /tmp/on; left=200; while [ $((left -= 1)) -gt 0 ]; do sleep 0.05; done; exit 7' & "
    "until [ -e /tmp/on ]; do sleep 0.05; done; ";

TEST_F(InPlace, SignalsToItAloneAreHandedOnToCommandOnce)
{
    for (const std::string signal : {"HUP", "INT", "TERM"}) {
        const Outcome outcome =
            container.run(listener + "kill -" + signal + " $!; wait $!; echo $?; readlink /bin/sh");

        EXPECT_EQ(outcome.out, signal + "\n7\n/usr/bin/dash\n");
    }
}

TEST_F(InPlace, SignalsToItsGroupComeToCommandOnce)
{
    for (const std::string signal : {"HUP", "INT", "TERM"}) {
        const Outcome outcome = container.run(listener + "kill -" + signal +
                                              " -- -$!; wait $!; echo $?; readlink /bin/sh");

        EXPECT_EQ(outcome.out, signal + "\n7\n/usr/bin/dash\n");
    }
}

TEST_F(InPlace, EndsACommandThatGoesOnAfterASignal)
{
    const Outcome outcome = container.run(
        "\"$1\" -- sh -c 'trap \"\" TERM; touch /tmp/on; while :; do sleep 0.1; done' "
        "& until [ -e /tmp/on ]; do sleep 0.05; done; "
        "kill $!; wait $!; echo $?; readlink /bin/sh");

    EXPECT_EQ(outcome.out, "143\n/usr/bin/dash\n");
    EXPECT_EQ(outcome.err, announcement + "device/run: COMMAND goes on 10 s after SIGTERM, and is "
                                          "ended with its device\n");
}

} // namespace
