// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What fptest refuses to run, and what it says then.
#include "network.h"
#include "run_test.h"

#include <filesystem>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace fs = std::filesystem;

namespace
{

const std::string kTwoGroups =
    plan_of({{"Bringup", {{"Item", "note /tmp/scene/order"}, {"Other", ""}}},
             {"Endurance", {{"Third", ""}}}});

class Refusal : public RunCommand
{
  protected:
    // Runs it and expects that exit status, that line, and that nothing was started.
    static void expect(int status, const std::string &line, const Start &start)
    {
        const Ended ended = run_fptest(start);
        EXPECT_EQ(ended.status, status);
        EXPECT_EQ(ended.err, line + "\n");
        EXPECT_THAT(programs_run(), IsEmpty());
        EXPECT_FALSE(is_there("order"));
    }
    // What fptest says with a file as its standard input.
    static std::string errors_reading(const std::string &file, Lines arguments)
    {
        arguments.insert(arguments.begin(),
                         {"sh", "-c", "exec \"$@\" <" + file, "-", FPTEST_PROGRAM});
        return support::run({.arguments = std::move(arguments)}).err;
    }

    static void expect(int status, const std::string &line, Lines arguments)
    {
        SCOPED_TRACE(PrintToString(arguments));
        arguments.insert(arguments.begin(), "run");
        expect(status, line, Start{.arguments = arguments});
    }
};

// --- paths -----------------------------------------------------------------------------

TEST_F(Refusal, UnknownNameSuggestsTheNearestAndListsAll)
{
    write_file(kPlanFile, kTwoGroups);
    const std::string path = plan(kTwoGroups);
    expect(2,
           "fptest: no group 'Brngup' in /data/vorlane/src1.xml; did you mean 'Bringup'? The "
           "groups are Bringup and Endurance",
           {"P/Brngup"});
    expect(2,
           "fptest: no group 'xyz' in /data/vorlane/src1.xml; the groups are Bringup and Endurance",
           {"P/Bringup", "P/xyz"});
    expect(2,
           "fptest: no item 'Itm' in group 'Bringup' of /tmp/scene/plan.xml; did you mean 'Item'? "
           "The items of the group are Item and Other",
           {"--plan", path, "P/Bringup/Itm"});
    // the library would find it in the group after it
    expect(2,
           "fptest: no item 'Third' in group 'Bringup' of /tmp/scene/plan.xml; the items of the "
           "group are Item and Other",
           {"--plan", path, "P/Bringup/Third"});
}

TEST_F(Refusal, NamesWhatIsWrongWithAPath)
{
    write_file(kPlanFile, kTwoGroups);
    for (const std::string path : {"Bringup", "/Bringup/", "/"}) {
        expect(2,
               "fptest: '" + path +
                   "' names no group: a path is root/group or root/group/item; "
                   "the groups are Bringup and Endurance",
               {path});
    }
    expect(2,
           "fptest: 'P/Bringup/Item/x' has too many parts: a path is root/group or "
           "root/group/item",
           {"P/Bringup/Item/x"});
    expect(2,
           "fptest: 'P/Bring:up' has a ':', a tab or a line feed, at which the library would cut "
           "it: name it without",
           {"P/Bring:up"});
}

// --- plans -----------------------------------------------------------------------------

TEST_F(Refusal, OfAPlanWithErrorsSaysWhichAndForceRunsIt)
{
    const std::string path = plan(kShifted);
    const Ended ended = run_fptest({"run", "--plan", path, "P/G"});
    EXPECT_EQ(ended.status, 2);
    EXPECT_EQ(ended.out, "");
    EXPECT_THAT(ended.err, StartsWith(path + ":1:"));
    EXPECT_THAT(ended.err, HasSubstr(": error: "));
    EXPECT_THAT(ended.err, EndsWith("\nfptest: nothing was run, because the plan has errors; fix "
                                    "them, or run it as it is with --force\n"));
    const std::string findings = ended.err.substr(0, ended.err.rfind("fptest: "));
    EXPECT_THAT(run_fptest({"check", path}).out, StartsWith(findings));
    EXPECT_FALSE(fs::exists(kPlanFile));
    EXPECT_FALSE(is_there("order"));

    EXPECT_EQ(run_fptest({"run", "--force", "--plan", path, "P/G"}).status, 1);
    EXPECT_EQ(read_file(work("order")), "Item\nOther\nThird\n");
}

TEST_F(Refusal, OfAStoredPlanWithErrorsSaysWhich)
{
    write_file(kPlanFile, kShifted);
    const Ended ended = run_fptest({"run", "P/G"});
    EXPECT_EQ(ended.status, 2);
    EXPECT_THAT(ended.err, StartsWith("/data/vorlane/src1.xml:1:"));
    EXPECT_FALSE(is_there("order"));
}

TEST_F(Refusal, OfAPlanThatDoesNotLoadEvenWithForce)
{
    const Ended ended =
        run_fptest({"run", "--force", "--plan",
                    plan("<P><CmdGroup name='G'><Cmd name/></CmdGroup></P>"), "P/G"});
    EXPECT_EQ(ended.status, 2);
    EXPECT_THAT(lines_of(ended.err).back(),
                StartsWith("fptest: /tmp/scene/plan.xml: the library cannot load this plan: "));
    EXPECT_FALSE(fs::exists(kPlanFile));
}

TEST_F(Refusal, WithoutAPlan)
{
    expect(3, "fptest: no plan is stored in /data/vorlane/src1.xml: give one with --plan FILE",
           {"P/G"});
    expect(2, "fptest: /tmp/scene/none.xml: No such file or directory",
           {"--plan", work("none.xml"), "P/G"});
}

TEST_F(Refusal, OfAFifoOrADirectoryInPlaceOfTheStoredPlan)
{
    const std::string path = plan(kOnePasses);
    for (const auto &make : {mkfifo, mkdir}) {
        std::filesystem::remove(kPlanFile);
        ASSERT_EQ(make(kPlanFile, 0700), 0);
        for (const device::Lines &arguments :
             {device::Lines{"run", "--plan", path, "P/G"},
              {"run", "P/G"},
              {"run", "--list"},
              {"send", "pingtest"},
              {"show"},
              {"report", "G", "Item", "--progress", "1", "--result", "0"}}) {
            expect_refusal(3, "fptest: /data/vorlane/src1.xml is not a regular file: remove it",
                           arguments);
        }
    }
    std::filesystem::remove(kPlanFile);
}

TEST_F(Refusal, OfAPathThatTheLibraryWouldCut)
{
    const std::string path = std::string(2100, 'r') + "/G/Item";
    expect_refusal(2, "fptest: a path of 2107 bytes is cut at 2047: use a shorter root",
                   {"run", "--plan", plan(kOnePasses), path});
}

TEST_F(Refusal, OfAnEmptyNameForAFile)
{
    for (const std::string option : {"--plan", "--json", "--junit", "--log"}) {
        expect_refusal(2, "fptest: " + option + ": its value is empty; see fptest run --help",
                       {"run", option, "", "P/G"});
    }
    for (const std::string command : {"check", "show"}) {
        expect_refusal(2, "fptest: FILE: its value is empty; see fptest " + command + " --help",
                       {command, ""});
    }
}

TEST_F(Refusal, OfOneFileForTwoThings)
{
    const std::string plan_file = plan(kOnePasses);
    expect_refusal(
        2,
        "fptest: --json and --junit both want the file " + work("out") +
            ": give them files of their own",
        {"run", "--plan", plan_file, "--json", work("out"), "--junit", work("out"), "P/G"});
    expect_refusal(2,
                   "fptest: --plan and --json both want the file " + plan_file +
                       ": give them files of their own",
                   {"run", "--plan", plan_file, "--json", plan_file, "P/G"});
    const std::string want =
        " both want the file " + plan_file + ": give them files of their own\n";
    for (const std::string option : {"--json", "--junit", "--log"}) {
        EXPECT_EQ(errors_reading(plan_file, {"run", "--plan", "-", option, plan_file, "P/G"}),
                  "fptest: --plan and " + option + want);
    }
    EXPECT_EQ(errors_reading(plan_file, {"send", "-0", "--log", plan_file}),
              "fptest: standard input and --log" + want);
    EXPECT_EQ(read_file(plan_file), kOnePasses);
    EXPECT_EQ(run_fptest({"run", "--plan", plan_file, "--json", "/dev/null", "--junit", "/dev/null",
                          "P/G"})
                  .status,
              0);
}

TEST_F(Refusal, OfOneFifoForTwoReports)
{
    ASSERT_EQ(mkfifo(work("fifo").c_str(), 0600), 0);
    expect(2,
           "fptest: --json and --junit both want the file /tmp/scene/fifo: give them files of "
           "their own",
           {"--json", work("fifo"), "--junit", work("fifo"), "--plan",
            plan(group_of({{"Item", "note /tmp/scene/order"}})), "P/G"});
}

// --- devices ---------------------------------------------------------------------------

TEST_F(Refusal, WhereThePlansDirectoryIsNotWritable)
{
    fs::permissions("/data/vorlane", fs::perms::owner_read | fs::perms::owner_exec);
    const Start start{.arguments = {"run", "--plan", plan(kTwoGroups), "P/Bringup"},
                      .prepare = as_plain_user};
    expect(3,
           "fptest: /data/vorlane is not writable: Permission denied; make it, or run this as "
           "another user; see fptest doctor",
           start);
    EXPECT_FALSE(fs::exists(kPlanFile));
}

TEST_F(Refusal, OutsideOfADevice)
{
    if (is_in_place()) {
        GTEST_SKIP() << "in place, /system/bin cannot be hidden from one program";
    }
    const Start start{.arguments = {"run", "--plan", plan(kTwoGroups), "P/Bringup"},
                      .prepare = without_device};
    expect(
        3,
        "fptest: this machine is not a device: there is no /system/bin/sh; on a desk, run it as: "
        "device/run -- fptest ...; see fptest doctor",
        start);
}

TEST_F(Refusal, WhereTheGatherersPortIsTaken)
{
    const device::Socket taken = device::listen_on(device::kTriggerPort);
    const std::string path =
        plan(group_of({{"Item", "note /tmp/scene/order"}, {"SensorProbe", "--group G"}}));
    const std::string line = "fptest: port 34952 is not available: Address already in use; the "
                             "gatherer's run would never "
                             "end: stop what uses it (netstat -tanp names it); see fptest "
                             "doctor";
    expect(3, line, {"--plan", path, "P/G"});
    expect(3, line, {"--plan", path, "P/G/SensorProbe"});
    expect(3, line, {"--force", "--plan", path, "P/G/SensorProbe"});
    // nobody else needs it
    EXPECT_EQ(run_fptest({"run", "--plan", path, "P/G/Item"}).status, 1);
    EXPECT_TRUE(is_there("order"));
}

TEST_F(Refusal, WhereProgramsAreMissing)
{
    const std::string advice = " on this device: install what is missing (device/run --bin DIR "
                               "adds programs), or run the rest with --force";
    const std::string path = plan(group_of(
        {{"Item", "note /tmp/scene/order"}, {"Nobody", ""}, {"Third", ""}, {"Nothing", ""}}));
    expect(3, "fptest: no program /system/bin/Nobody and /system/bin/Nothing" + advice,
           {"--plan", path, "P/G"});
    expect(3, "fptest: no program /system/bin/Nobody" + advice,
           {"--plan", path, "P/G/Item", "P/G/Nobody", "P/G/Nobody"});
    set_vendor("1"); // there are Item_ca and Other_ca alone
    expect(3,
           "fptest: no program /system/bin/Nobody_ca, /system/bin/Third_ca and "
           "/system/bin/Nothing_ca" +
               advice,
           {"--plan", path, "P/G"});
}

TEST_F(RunCommand, RunsTheRestWhereProgramsAreMissingByForce)
{
    EXPECT_EQ(run_group({{"Nobody", ""}, {"Item", kPasses}}, {"--force"}).status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Nobody: no result", "Item: passed"));
    EXPECT_THAT(reasons(), ElementsAre("there is no program /system/bin/Nobody", ""));
}

TEST_F(Refusal, OfAVendorThatRunsNothing)
{
    for (const std::string vendor : {"7", "-1"}) {
        set_vendor(vendor);
        expect(3,
               "fptest: the vendor selector is " + vendor +
                   ", and the library runs nothing then: set device/SysParam/Quillmark/vendor to "
                   "0, 1 or 2 in /etc/vorlane/sysparms/vr_common_cfg.xml; see fptest doctor",
               {"--plan", plan(kTwoGroups), "P/Bringup"});
        EXPECT_FALSE(fs::exists(kPlanFile));
    }
}

TEST_F(Refusal, WhereAReportCannotBeWritten)
{
    const std::string path = plan(kTwoGroups);
    for (const std::string option : {"--junit", "--json"}) {
        expect(3, "fptest: /tmp/nowhere/file: No such file or directory; nothing was run",
               {option, "/tmp/nowhere/file", "--plan", path, "P/Bringup"});
        expect(3, "fptest: /tmp: Is a directory; nothing was run",
               {option, "/tmp", "--plan", path, "P/Bringup"});
    }
    expect(3,
           "fptest: --log /tmp/nowhere/log cannot be written: No such file or directory; name "
           "another file",
           {"--log", "/tmp/nowhere/log", "--plan", path, "P/Bringup"});
    expect(3,
           "fptest: --log /dev/full cannot be written: No space left on device; name another file",
           {"--log", "/dev/full", "--plan", path, "P/Bringup"});
}

TEST_F(Refusal, ReplacesNoReportThatIsReadOnly)
{
    const std::string report = file("report", "golden");
    chmod(report.c_str(), 0444);
    if (access(report.c_str(), W_OK) == 0) {
        GTEST_SKIP() << "in place, root may write everything";
    }
    for (const char *option : {"--json", "--junit"}) {
        expect(3, "fptest: " + report + ": Permission denied; nothing was run",
               {option, report, "--plan", plan(kTwoGroups), "P/Bringup"});
        EXPECT_EQ(read_file(report), "golden");
    }
}

TEST_F(Refusal, WhereAReportIsFullStoresNothing)
{
    write_file(kPlanFile, kOnePasses);
    for (const bool is_long : {false, true}) {
        const std::string other = plan("<P about=\"" + std::string(is_long ? 3000 : 1, 'x') +
                                       "\"><CmdGroup name=\"Other\">"
                                       "<Cmd name=\"Item\" args=\"\"/></CmdGroup></P>");
        const Ended ended = run_fptest({"run", "--json", "/dev/full", "--plan", other, "P/Other"});
        EXPECT_EQ(ended.status, 3);
        EXPECT_THAT(ended.err, HasSubstr("No space left on device; nothing was run"));
        EXPECT_EQ(read_file(kPlanFile), kOnePasses);
    }
}

TEST_F(Refusal, BesideAnItemOfAnEarlierRun)
{
    const pid_t left = start_item_program({"/system/bin/Item", "sleep", "60"});
    expect_refusal(3,
                   "fptest: /system/bin/Item of an earlier run is still running, as process " +
                       std::to_string(left) + ", and would report into this one: end it first",
                   {"run", "--plan", plan(kOnePasses), "P/G"});
    EXPECT_NE(access(kPlanFile, F_OK), 0);
}

TEST_F(Refusal, BesideAScriptOfAnEarlierRunOrAnotherVendorsItem)
{
    for (const Lines &words : {Lines{"/system/bin/Script", "kill -STOP $$"},
                               Lines{"/system/bin/Item_ca", "sleep", "60"}}) {
        const support::Start start{.arguments = words};
        const support::Process left(start);
        const std::string command = "/proc/" + std::to_string(left.pid()) + "/cmdline";
        ASSERT_TRUE(support::eventually(
            [&] { return read_file(command).find(words[0]) != std::string::npos; }));
        const Ended ended =
            run_group({{"Script", script(script_report("0", "fine"))}, {"Item", kPasses}});
        EXPECT_EQ(ended.status, 3);
        EXPECT_EQ(ended.err, "fptest: " + words[0] +
                                 " of an earlier run is still running, as process " +
                                 std::to_string(left.pid()) +
                                 ", and would report into this one: end it first\n");
    }
}

TEST_F(Refusal, OfASecondRunAtTheSameTime)
{
    FptestProcess first(
        with_group({{"Item", "note /tmp/scene/begun await /tmp/scene/go report G 100 0 x"}}));
    ASSERT_TRUE(wait_for_file("begun"));
    const std::string stored = read_file(kPlanFile);
    const Ended second = run_fptest({"run", "--plan", plan(kTwoGroups), "P/Bringup"});
    EXPECT_EQ(second.status, 4);
    EXPECT_THAT(second.err, StartsWith("fptest: another fptest is running on this device: "));
    EXPECT_EQ(read_file(kPlanFile), stored);
    EXPECT_FALSE(is_there("order"));
    file("go", "");
    EXPECT_EQ(first.wait().status, 0);
    EXPECT_EQ(run_fptest({"run", "P/G"}).status, 0);
}

class RunOnFullDisk : public Refusal
{
  protected:
    void SetUp() override
    {
        Refusal::SetUp();
        if (is_in_place()) {
            GTEST_SKIP() << "in place, the disk is the container's own and is not to be filled";
        }
    }
};

TEST_F(RunOnFullDisk, StoresNoPlan)
{
    fill_disk();
    expect(3,
           "fptest: the disk of /data/vorlane is full: make room for " +
               std::to_string(kTwoGroups.size()) +
               " bytes; the stored plan is as it was; see fptest doctor",
           {"--plan", plan(kTwoGroups), "P/Bringup"});
    EXPECT_FALSE(fs::exists(kPlanFile));
}

TEST_F(RunOnFullDisk, LeavesTheStoredPlanAsItWas)
{
    std::string reported = group_of({{"Item", notes("new")}});
    reported.insert(reported.find("/>"), " progress=\"100\" result=\"0\" description=\"old\"");
    write_file(kPlanFile, reported);
    fill_disk();
    expect(3,
           "fptest: /data/vorlane/src1.xml cannot be written: No space left on device; the old "
           "plan is still there",
           {"P/G"});
    EXPECT_EQ(read_file(kPlanFile), reported);
}

TEST_F(RunOnFullDisk, SaysThatTheLogLacksItsEnd)
{
    fill_disk();
    const std::string log = "/data/vorlane/log";
    const Ended ended = run_fptest({"send", "--log", log, "pingtest"});
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err, "fptest: --log " + log +
                             " is incomplete: No space left on device; make room, or name "
                             "another file\n");
}

TEST_F(RunOnFullDisk, StoresAPlanInTheRoomOfTheOldOne)
{
    write_file(kPlanFile, kTwoGroups);
    fill_disk();
    EXPECT_EQ(run_group(kThreeThatNote).status, 0);
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: passed", "Third: passed"));
}

} // namespace
