// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Nothing counts as passed that has not passed in this run, and nothing that the
// user has asked for is left out without a word.
#include "run_test.h"

#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

namespace
{

class Trust : public Run
{
  protected:
    // A value of an item's end.
    static std::string of_end(std::size_t item, const char *name)
    {
        return end_of(item).at(name);
    }
    // Of fptest with a file as its standard input.
    static std::string errors_reading(const std::string &file, device::Lines arguments)
    {
        arguments.insert(arguments.begin(),
                         {"sh", "-c", "exec \"$@\" <" + file, "-", FPTEST_PROGRAM});
        return support::run({.arguments = std::move(arguments)}).err;
    }
};

} // namespace

TEST_F(Trust, TakesNoResultThatAProcessWithAnOldCopyOfThePlanWritesBack)
{
    // it passes in the first run and reports nothing in the second
    const std::string text = plan_of({{"G",
                                       {{"Item", "note /tmp/scene/runs await /tmp/scene/written "
                                                 "once /tmp/scene/ran report G 100 0 fine"}}},
                                      {"Other", {{"Other", ""}}}});
    file("written", "");
    ASSERT_EQ(run_fptest({"run", "--plan", plan(text), "P/G"}).status, 0);
    unlink(work("runs").c_str());
    unlink(work("written").c_str());

    start_program({"/system/bin/Fourth",
                   "report-here",
                   "Other",
                   "Other",
                   "1",
                   "-2",
                   "a copy",
                   "note",
                   work("loaded"),
                   "await",
                   work("runs"),
                   "report-here",
                   "Other",
                   "Other",
                   "2",
                   "-2",
                   "the copy again",
                   "note",
                   work("written"),
                   "sleep",
                   "60"});
    ASSERT_TRUE(wait_for_file("loaded"));
    const Ended ended = run_fptest({"run", "--json", work("json"), "P/G"});
    EXPECT_THAT(read_file(kPlanFile), HasSubstr("the copy again"));
    EXPECT_THAT(read_file(kPlanFile), Not(HasSubstr("description=\"fine\"")));
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Item: no result"));
    EXPECT_THAT(ended.out, HasSubstr("a process with an old copy of the plan has written it over"));
}

TEST_F(Trust, TakesWhatIsReportedAfterAnOldCopyOfThePlanWasWritten)
{
    const std::string writes_old_copy = "fptest report G Script --progress 0 --result -2; "
                                        "sleep 0.1; cat /tmp/scene/old "
                                        "&gt;/data/vorlane/src1.xml; sleep 0.3; "
                                        "fptest report G Script --progress 100 --result 0";
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        const Items items = {{"Script", script(writes_old_copy)}, {"Item", kPasses}};
        file("old", device::group_of({{"Script", ""}, {"Item", ""}}));
        EXPECT_EQ(run_group(items, {way}).status, 0);
        EXPECT_THAT(outcomes(), ElementsAre("Script: passed", "Item: passed"));
    }
}

TEST_F(Trust, TakesNoResultOfAnEarlierRunThoughThePlanIsGivenAnew)
{
    const std::string old = device::group_of({{"Script", ""}});
    const std::size_t end = old.find("/>");
    file("old", std::string(old).insert(end, " progress=\"100\" result=\"0\" description=\"old\""));
    const Ended ended =
        run_group({{"Script", "'cat /tmp/scene/old >/data/vorlane/src1.xml; sleep 0.2'"}});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Script: no result"));
    EXPECT_THAT(of_end(0, "reason"),
                StartsWith("a process with an old copy of the plan has written it over"));
}

TEST_F(Trust, TellsThatAnotherPlanHasBeenStoredMeanwhile)
{
    file("other", device::plan_of({{"Q", {{"Other", ""}}}}));
    run_group({{"Script", "'cat /tmp/scene/other >/data/vorlane/src1.xml; sleep 0.2'"}});
    EXPECT_EQ(of_end(0, "reason"), "the stored plan is another one by now: a process that knows "
                                   "that one has saved it");
}

TEST_F(Trust, TellsAReportThatIsWrittenOverFromNone)
{
    run_group(
        {{"Script", "'cp /data/vorlane/src1.xml /tmp/scene/old; fptest report G Script --progress "
                    "100 --result 0; sleep 0.3; cat /tmp/scene/old >/data/vorlane/src1.xml; sleep "
                    "0.3'"}});
    EXPECT_THAT(outcomes(), ElementsAre("Script: no result"));
    EXPECT_EQ(of_end(0, "reason"),
              "a process with an old copy of the plan has written over what it had reported");
}

// As "> /dev/stderr" does: the file is no pipe.
TEST_F(Trust, KeepsWhatIsPrintedAfterAnItemHasTruncatedItsOutput)
{
    run_group(
        {{"Item", "flood 30000"},
         {"Script", "'echo before; sleep 0.2; echo checking >/dev/stderr; sleep 0.2; echo after'"},
         {"Other", "say other sleep 0.2 complain again"},
         {"Third", "flood 60000"}});
    EXPECT_EQ(of_end(1, "output"), "before\nchecking\nafter\n");
    EXPECT_EQ(of_end(2, "output"), "other\nagain\n");
    EXPECT_THAT(of_end(3, "output"), StartsWith("line 1\nline 2\n"));
}

TEST_F(Trust, NamesEveryReportThatFailsThoughTheRunIsInterrupted)
{
    for (const int signal : {0, SIGINT}) {
        std::vector<Descriptor> readers;
        for (const std::string name : {"json", "junit"}) {
            unlink(work(name).c_str());
            ASSERT_EQ(mkfifo(work(name).c_str(), 0600), 0);
            readers.emplace_back(open(work(name).c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
        }
        const std::string text = device::group_of(
            {{"Item", "note /tmp/scene/begun await /tmp/scene/go report G 100 0 x"}});
        FptestProcess fptest(
            {"run", "--json", work("json"), "--junit", work("junit"), "--plan", plan(text), "P/G"});
        ASSERT_TRUE(wait_for_file("begun"));
        readers.clear();
        signal == 0 ? static_cast<void>(file("go", "")) : fptest.signal(signal);
        const Ended ended = fptest.wait();
        EXPECT_EQ(ended.status, signal == 0 ? 3 : 130);
        EXPECT_THAT(ended.err, HasSubstr(work("json") + ": Broken pipe"));
        EXPECT_THAT(ended.err, HasSubstr(work("junit") + ": Broken pipe"));
        unlink(work("go").c_str());
        unlink(work("begun").c_str());
    }
}

TEST_F(Trust, LeavesNoMarksOfItsOwnInThePlan)
{
    ASSERT_EQ(run_fptest({"run", "--plan", plan(kOnePasses), "P/G"}).status, 0);
    ASSERT_EQ(run_fptest({"run", "--repeat", "3", "P/G"}).status, 0);
    EXPECT_THAT(read_file(kPlanFile), Not(HasSubstr("fptest-run")));
    EXPECT_THAT(read_file(kPlanFile), HasSubstr("description=\"fine\""));
}

TEST_F(Trust, EndsTheRunWhenTheStoredPlanIsGone)
{
    const std::string text = group_of(
        {{"Item", "sleep 0; rm /data/vorlane/src1.xml"}, {"Other", "report G 100 0 fine"}});
    const Ended ended = run_fptest({"run", "--json", work("json"), "--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err, "fptest: the plan has warnings: see fptest check /tmp/scene/plan.xml\n"
                         "fptest: the stored plan /data/vorlane/src1.xml is gone, or not whole any "
                         "more: store it again\n");
    EXPECT_THAT(outcomes(), ElementsAre("Item: no result", "Other: not run"));
}

TEST_F(Trust, DoesNotBeginBesideAnItemOfAnEarlierRun)
{
    const pid_t left = start_program({"/system/bin/Item", "sleep", "60"});
    expect_refusal(3,
                   "fptest: /system/bin/Item of an earlier run is still running, as process " +
                       std::to_string(left) + ", and would report into this one: end it first",
                   {"run", "--plan", plan(kOnePasses), "P/G"});
    EXPECT_NE(access(kPlanFile, F_OK), 0);
}

TEST_F(Trust, RefusesAPathThatTheLibraryWouldCut)
{
    const std::string path = std::string(2100, 'r') + "/G/Item";
    expect_refusal(2, "fptest: a path of 2107 bytes is cut at 2047: name the root with less",
                   {"run", "--plan", plan(kOnePasses), path});
}

TEST_F(Trust, TakesNoEmptyNameForAFile)
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

TEST_F(Trust, WritesNoTwoThingsIntoOneFile)
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

// --- what an item counts as, whatever it reported -----------------------------------

TEST_F(Trust, FailsWhatHasCrashedHoweverItsArgsAreWritten)
{
    const std::string crash = "report G 100 0 fine crash";
    const Ended ended = run_group({{"Item", crash + " 'a b'"},
                                   {"Other", crash + " $((1+1))"},
                                   {"Third", crash + " 2>&amp;1"},
                                   {"Fourth", "report G 100 0 fine"}});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(),
                ElementsAre("Item: failed", "Other: failed", "Third: failed", "Fourth: passed"));
    EXPECT_EQ(reasons().at(0), "died by SIGABRT, though it reported the result 0");
}

TEST_F(Trust, TellsALateReportAlsoOfLessProgressOrInTheMomentOfTheItemsEnd)
{
    // that child ends before it would count as left running
    for (const std::string late : {"0.3; fptest report G Script --progress 90",
                                   "0.05; fptest report G Script --progress 100"}) {
        const Ended ended =
            run_group({{"Script", "'(sleep " + late +
                                      " --result 1 --description late) &amp; fptest report G "
                                      "Script --progress 100 --result 0'"},
                       {"Item", "sleep 0.8 report G 100 0 fine"}});
        EXPECT_THAT(outcomes(), ElementsAre("Script: passed", "Item: passed"));
        EXPECT_THAT(ended.out,
                    HasSubstr("G/Script: late report, result 1: late; it changes nothing\n"));
    }
}

TEST_F(Trust, PassesNothingByAnEarlierReportThatAnOldCopyBringsBack)
{
    const std::string leaves =
        "'(sleep 0.5; exec /system/bin/Item report-here G Script 50 0 one sleep 0.9 report-here G "
        "Script 50 0 two sleep 5) &amp; fptest report G Script --progress 100 --result 0'";
    for (const auto &[first, last] : {std::pair("0", "1"), std::pair("-2", "0")}) {
        run_group(
            {{"Script", leaves},
             {"Item", std::string("report-here G Item 10 ") + first +
                          " begun sleep 1 report-here G Item 100 " + last + " done sleep 0.8"}});
        EXPECT_THAT(outcomes(), ElementsAre("Script: passed", "Item: failed"));
        EXPECT_EQ(reasons().at(1),
                  std::string("reported the result ") + last +
                      "; a process with an old copy of the plan has then written back what it had "
                      "reported before");
    }
}

TEST_F(Trust, PassesNothingThatIsNotDoneAndMayHaveBeenWrittenOver)
{
    const std::string leaves = "'(sleep 0.5; exec /system/bin/Item report-here G Script 50 0 one "
                               "await /tmp/scene/go report-here G Script 50 0 two sleep 5) &amp; "
                               "fptest report G Script --progress 100 --result 0'";
    run_group({{"Script", leaves},
               {"Item", "report-here G Item 10 0 begun sleep 1 report-here G Item 100 1 done "
                        "note /tmp/scene/go sleep 0.3"}});
    EXPECT_THAT(outcomes(), ElementsAre("Script: passed", "Item: failed"));
}

TEST_F(Trust, FailsWhatARealTimeSignalHasKilled)
{
    run_group(
        {{"Script", "'fptest report G Script --progress 100 --result 0; kill -40 $$'; true"}});
    EXPECT_THAT(outcomes(), ElementsAre("Script: passed")); // the shell's end is what counts
    run_group({{"Script", "'fptest report G Script --progress 100 --result 0; kill -40 $$'"}});
    EXPECT_THAT(outcomes(), ElementsAre("Script: failed"));
    EXPECT_EQ(reasons().at(0), "died by signal 40, though it reported the result 0");
}

TEST_F(Trust, TellsAReportThatGoesIntoAnItemBeforeItsOwn)
{
    const Ended ended = run_group({{"Item", "report G 100 0 fine"},
                                   {"Script", "'fptest report G Item --progress 100 --result 1 "
                                              "--description pasted'"}});
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Script: no result"));
    EXPECT_THAT(ended.out,
                HasSubstr("G/Item: late report, result 1: pasted; it changes nothing\n"));
}

TEST_F(Trust, LosesNoReportThatComesAfterOneThatSpoilsThePlan)
{
    run_group(
        {{"Script", "'/system/bin/Item report-null G 100 0; fptest report G Script --progress "
                    "100 --result 1 --description dead'"},
         {"Item", "report G 100 0 fine"}});
    EXPECT_THAT(outcomes(), ElementsAre("Script: failed", "Item: passed"));
    EXPECT_EQ(description(0), "dead");
}

// --- limits of the machine ------------------------------------------------------------

// The run of the plan, with these options, where no file may be longer than so many
// blocks of 512 bytes.
Ended run_with_limit(int blocks, const std::string &options)
{
    support::Start start;
    start.arguments = {"/system/bin/sh", "-c",
                       "ulimit -f " + std::to_string(blocks) + "; exec fptest run --quiet " +
                           options + " --plan /tmp/scene/plan.xml P/G"};
    start.environment = {{"VR_LOG_FILE", std::nullopt}}; // items write to it
    return support::run(start);
}

TEST_F(Trust, CountsNoOutputOfEarlierItemsAgainstTheLimitOfFiles)
{
    plan(device::plan_of({{"G",
                           {{"Script", "'head -c 12000 /dev/zero; fptest report G Script "
                                       "--progress 100 --result 0'"}}}}));
    EXPECT_EQ(run_with_limit(60, "--repeat 4").status, 0);
}

TEST_F(Trust, GoesOnWhereAReportIsTooLongForTheLimitOfFiles)
{
    plan(kOnePasses);
    const Ended ended = run_with_limit(2, "--repeat 20 --json /tmp/scene/json");
    EXPECT_EQ(ended.status, 3);
    EXPECT_THAT(ended.err, EndsWith("fptest: /tmp/scene/json: File too large; the run "
                                    "went on all the same\n"));
}

TEST_F(Trust, TakesNoFifoAndNoDirectoryForThePlan)
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

TEST_F(Trust, GoesOnWhereTheLibraryIsSuspendedBetweenTwoItems)
{
    const std::string path =
        plan(group_of({{"Item", "report G 100 0 fine; (sleep 0.02; kill -STOP $PPID) &amp;"},
                       {"Other", "report G 100 0 fine"}}));
    EXPECT_THAT(run_fptest({"run", "--plan", path, "--timeout", "1", "P/G"}).out,
                HasSubstr("2 passed"));
}

// --- the caller's ways -----------------------------------------------------------------

TEST_F(Trust, KnowsHowItemsEndWhereItsCallerIgnoresTheEndsOfChildren)
{
    plan(group_of({{"Item", "report G 100 0 fine; kill -SEGV $$"}}));
    support::Start start;
    start.arguments = {FPTEST_PROGRAM, "run", "--plan", work("plan.xml"), "P/G"};
    start.prepare = [] { std::signal(SIGCHLD, SIG_IGN); };
    const support::Ended ended = support::run(start);
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(ended.out, HasSubstr("G/Item: failed, result 0, died by SIGSEGV"));
}

TEST_F(Trust, EmptiesNoFileThatStandardErrorIs)
{
    const std::string script = "exec 2>>/tmp/scene/errors; echo before >&2\n"
                               "exec \"$0\" run --plan \"$1\" --json /dev/stderr P/G";
    support::run({.arguments = {"sh", "-c", script, FPTEST_PROGRAM, plan(kOnePasses)}});
    EXPECT_EQ(read_file(work("errors")), "before\nfptest: --json /dev/stderr is standard error, "
                                         "and would be emptied: name another file\n");
}

TEST_F(Trust, LogsIntoAFifoThatAReaderWaitsAt)
{
    const std::string script = "mkfifo /tmp/scene/f; cat /tmp/scene/f >/tmp/scene/log & sleep 0.2\n"
                               "\"$0\" run --plan \"$1\" --log /tmp/scene/f P/G; wait";
    const Ended ended =
        support::run({.arguments = {"sh", "-c", script, FPTEST_PROGRAM, plan(kOnePasses)}});
    EXPECT_THAT(ended.out, HasSubstr("1 passed"));
    EXPECT_THAT(read_file(work("log")), HasSubstr("fptest_ItemsTest"));
}

TEST_F(Trust, StoresNothingWhereAReportCannotBeWritten)
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

TEST_F(Trust, ShowWaitsForAPlanThatIsBeingWritten)
{
    const std::string whole = kOnePasses;
    write_file(kPlanFile, whole.substr(0, whole.size() / 2));
    std::thread writer([&] {
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
        write_file(kPlanFile, whole);
    });
    EXPECT_EQ(run_fptest({"show"}).status, 0);
    writer.join();
}
