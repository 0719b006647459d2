// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Runs of the gatherer, and of the vendors' programs.
#include "gatherer.h"
#include "network.h"
#include "run_test.h"

#include <algorithm>
#include <csignal>
#include <fcntl.h>
#include <map>
#include <sys/stat.h>
#include <sys/types.h>
#include <unistd.h>

namespace
{

// Something goes on in the gatherer's place, and connects nowhere.
const Items kGathererThatNeverComes = {{"SensorProbe", "--help; exec sleep 30"},
                                       {"Other", kPasses}};

class RunGatherer : public RunCommand
{
  protected:
    static bool library_waits_for_gatherer()
    {
        const Lines all = device::listeners();
        return std::ranges::find(all, "00000000:8888") != all.end();
    }
    static void signal_gatherer(int number)
    {
        for (const device::Process &process : processes_named(kProbe)) {
            kill(process.pid, number);
        }
    }
};

TEST_F(RunGatherer, WaitsForItsReport)
{
    Ended ended = run_group({{"SensorProbe", "--group G --seconds 1"}});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(ended.out, HasSubstr("gathering 1, 64 samples\n"));
    EXPECT_GE(end_of(0).at("seconds"), 1.0);
    ASSERT_THAT(processes_named(kProbe), SizeIs(1));
    const pid_t gatherer = processes_named(kProbe)[0].pid;

    ended = run({"P/G/SensorProbe"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(ended.out, HasSubstr("gathering 2, 64 samples\n"));
    ASSERT_THAT(processes_named(kProbe), SizeIs(1));
    EXPECT_EQ(processes_named(kProbe)[0].pid, gatherer);
    EXPECT_EQ(ended.err, "");
}

TEST_F(RunGatherer, IsDoneOnceItHasReportedProgress100WhateverItReportsNext)
{
    const std::string reports = "gather report G 100 0 done sleep 0.05 report G 0 -2 idle ";
    const Gatherer gatherer(reports + reports + reports + "sleep 60");
    run_group({{"SensorProbe", ""}, {"Item", "sleep 0.3 report G 100 0 fine"}},
              {"--as-group", "--repeat", "3"});
    EXPECT_THAT(outcomes(), AllOf(SizeIs(6), Each(EndsWith(": passed"))));
}

TEST_F(RunGatherer, InterruptedInAGroupsCommandIsFollowedByNoOtherItem)
{
    FptestProcess fptest(with_group(
        {{"SensorProbe", "--help; exec sleep 30"}, {"Other", notes("x")}}, {"--as-group"}));
    EXPECT_TRUE(eventually([] { return library_waits_for_gatherer(); }, 30));
    fptest.signal(SIGINT);
    EXPECT_EQ(fptest.wait().status, 130);
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: stopped", "Other: not run"));
    EXPECT_FALSE(is_there("order"));
}

TEST_F(RunGatherer, IsStartedAnewWhereTheOneOfTheLastRoundIsStillEnding)
{
    run_group({{"SensorProbe", "--help; exec -a /system/bin/SensorProbe /system/bin/Item gather "
                               "report G 100 0 fine sleep 0.4"}},
              {"--repeat", "4"});
    EXPECT_THAT(outcomes(), AllOf(SizeIs(4), Each("SensorProbe: passed")));
    EXPECT_THAT(events("start"), SizeIs(4));
}

// As one that looks for its hardware first.
TEST_F(RunGatherer, KeepsWhatItReportedWhereItEndsWithoutConnecting)
{
    for (const std::string way : {"--repeat=1", "--as-group"}) {
        run_group({{"SensorProbe", "--help; exec /system/bin/Item report-here G SensorProbe 100 1 "
                                   "'no spidev'"}},
                  {way});
        EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: failed"));
        EXPECT_EQ(end_of(0).at("description"), "no spidev");
        EXPECT_EQ(reasons().at(0), "the gatherer ended before it connected; it had reported the "
                                   "result 1");
        run_group({{"SensorProbe", "--help; exec /system/bin/Item report-here G SensorProbe 100 0 "
                                   "early"}},
                  {way});
        EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: failed"));
        EXPECT_EQ(reasons().at(0), "the gatherer ended before it connected, though it reported the "
                                   "result 0");
    }
}

// The next trigger would start another one beside them.
TEST_F(RunGatherer, WhatIsLeftOfOneThatHasEndedIsNamedAndEndedWithTheRun)
{
    for (const std::string rest :
         {"sleep 61 &amp; /system/bin/Item gather report-here G SensorProbe 100 0 fine",
          "exec -a sleep /system/bin/Item gather report-here G SensorProbe 100 0 fine "
          "gather sleep 61"}) {
        const std::size_t others = processes_named("sleep").size(); // of this container
        const Ended ended = run_group({{"SensorProbe", "--help; " + rest}});
        EXPECT_EQ(ended.status, 0) << ended.err;
        EXPECT_THAT(end_of(0).at("left_running").dump(), HasSubstr("\"sleep\"")) << rest;
        EXPECT_THAT(processes_named("sleep"), SizeIs(others)) << rest;
        run_group({{"SensorProbe", "--help; " + rest}, {"Item", "sleep 0.3 report G 100 0 fine"}},
                  {"--as-group"});
        EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: passed", "Item: passed"));
        EXPECT_THAT(end_of(1).at("left_running").dump(), HasSubstr("\"sleep\"")) << rest;
    }
}

TEST_F(RunGatherer, DoesNotCountTheNextItemOfItsGroupAsLeftRunning)
{
    EXPECT_EQ(
        run_group({{"SensorProbe", "--help"}, {"Item", "ignore-stop sleep 30"}, {"Other", kPasses}},
                  {"--as-group", "--timeout", "0.6", "--grace", "0.3"})
            .status,
        1);
    EXPECT_THAT(outcomes(),
                ElementsAre("SensorProbe: no result", "Item: timed out", "Other: passed"));
    EXPECT_EQ(end_of(0).at("left_running"), nlohmann::json::array());
}

TEST_F(RunGatherer, RunsTheNextItemOfAGroupWhileItGathers)
{
    FptestProcess fptest(with_group(
        {{"SensorProbe", "--group G --seconds 1"}, {"Item", notes("x")}}, {"--as-group"}));
    EXPECT_TRUE(wait_for_file("order"));
    EXPECT_EQ(read_file("/data/vorlane/readings.txt"), "");
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: passed", "Item: passed"));
    EXPECT_THAT(ended.out, HasSubstr("gathering 1, 64 samples\n"));
}

TEST_F(RunGatherer, GathersInEveryRound)
{
    const Ended ended = run_group({{"SensorProbe", "--group G --seconds 0.1"}}, {"--repeat", "3"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    for (const std::string gathering : {"1", "2", "3"}) {
        EXPECT_THAT(ended.out, HasSubstr("gathering " + gathering + ", 64 samples\n"));
    }
}

// Each trigger leaves a descriptor open.
TEST_F(RunGatherer, IsOneHoweverOftenItGathers)
{
    const Ended ended = run_limited("-n 30", with_group({{"SensorProbe", "--group G --seconds 0"}},
                                                        {"--repeat", "28", "--quiet"}));
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(events("end").back().at("description"), "gathering 28, 64 samples");
    EXPECT_THAT(processes_named(kProbe), SizeIs(1));
}

TEST_F(RunGatherer, GoesOnWhereItNeverConnects)
{
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        EXPECT_EQ(run_group(kGathererThatNeverComes, {way, "--timeout", "0.6"}).status, 1);
        EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: timed out", "Other: passed"));
        EXPECT_THAT(reasons(), ElementsAre(StartsWith("stopped after 1."), ""));
    }
}

TEST_F(RunGatherer, GoesOnWhereARunningOneHangs)
{
    EXPECT_EQ(run_group({{"SensorProbe", "--group G --seconds 0.1"}, {"Other", kPasses}}).status,
              0);
    signal_gatherer(SIGSTOP);
    EXPECT_EQ(run({"--timeout", "0.5", "P/G"}).status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: timed out", "Other: passed"));
    signal_gatherer(SIGCONT);
}

TEST_F(RunGatherer, IsNotOverBeforeProgress100)
{
    const Gatherer gatherer(
        "gather report G 50 0 half note /tmp/scene/half await /tmp/scene/go report G 100 1 whole");
    FptestProcess fptest(with_group({{"SensorProbe", ""}, {"Item", "note /tmp/scene/next"}}));
    ASSERT_TRUE(wait_for_events("progress", 1));
    EXPECT_THAT(events("end"), IsEmpty());
    file("go", "");
    EXPECT_EQ(fptest.wait().status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: failed", "Item: no result"));
    EXPECT_EQ(description(0), "whole");
}

TEST_F(RunGatherer, WaitsTenSecondsForItsReportAndSaysMeanwhileWhatItHasSaid)
{
    // it reports for a group that there is not
    const Ended ended =
        run_group({{"SensorProbe", "--help >/dev/null; exec -a " + std::string(kProbe) +
                                       " /system/bin/Item say one sleep 1 gather "
                                       "report H 100 0 elsewhere sleep 60"}});
    EXPECT_EQ(ended.status, 1);
    EXPECT_GE(ended.seconds, 11);
    EXPECT_LT(ended.seconds, 25);
    EXPECT_THAT(ended.out, ContainsRegex("\nG/SensorProbe: running, 10[.][0-9] s\n    [|] one\n"
                                         "G/SensorProbe: no result, "));
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: no result"));
    EXPECT_EQ(reasons().at(0), "no result was reported within 10.0 s");
}

TEST_F(RunGatherer, MayReportFromACopyOfThePlanThatItKeeps)
{
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        const std::string reports = "gather report-here G SensorProbe 100 0 ";
        const Gatherer gatherer(reports + "one " + reports + "two " + reports + "three sleep 60");
        run_group({{"SensorProbe", ""}, {"Item", "sleep 0.2 report G 100 0 fine"}},
                  {way, "--repeat", "3"});
        EXPECT_THAT(outcomes(), AllOf(SizeIs(6), Each(EndsWith(": passed"))));
    }
}

TEST_F(RunGatherer, MaySayTheSameAgainFromItsCopy)
{
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        const std::string reports = "gather report-here G SensorProbe 100 0 done sleep 0.2 "
                                    "report-here G SensorProbe 100 1 late ";
        const Gatherer gatherer(reports + reports + reports + "sleep 60");
        run_group({{"SensorProbe", ""}, {"Item", "sleep 0.35 report G 100 0 fine"}},
                  {way, "--repeat", "3", "--timeout", "3"});
        EXPECT_THAT(outcomes(), AllOf(SizeIs(6), Each(EndsWith(": passed"))));
        EXPECT_THAT(events("late"), SizeIs(3));
    }
    std::filesystem::remove(kPlanFile); // or the next one would be ended with it
    const std::string report = "gather report-here G SensorProbe 100 0 done ";
    const Gatherer gatherer(report + report + report + "sleep 60");
    for (int number = 0; number < 3; ++number) {
        run_group({{"Item", kPasses}, {"SensorProbe", ""}, {"Other", kPasses}});
        EXPECT_THAT(outcomes(), AllOf(SizeIs(3), Each(EndsWith(": passed")))) << number;
    }
}

TEST_F(RunGatherer, HasNoResultWhereItOnlySaysTheSameOfAnotherItemAgain)
{
    for (const std::string way : {"--quiet", "--as-group"}) {
        const std::string other = "gather report-here G Item 50 0 x sleep 0.2 ";
        const Gatherer gatherer(other + "report-here G SensorProbe 100 0 done " + other +
                                "sleep 60");
        run_group({{"SensorProbe", ""}, {"Item", "sleep 0.4 report G 100 0 fine"}},
                  {way, "--repeat", "2", "--timeout", "0.8"});
        EXPECT_EQ(outcomes().at(0), "SensorProbe: passed");
        EXPECT_EQ(outcomes().at(2), "SensorProbe: timed out");
    }
}

TEST_F(RunGatherer, CostsTheItemsAfterItNothingByALateReportFromItsCopy)
{
    const Gatherer gatherer(
        "gather report-here G SensorProbe 100 0 one sleep 0.6 report-here G SensorProbe 0 -2 idle "
        "gather sleep 0.1 report-here G SensorProbe 100 0 two sleep 60");
    const std::string keeps_copy =
        "report-here G Item 0 -2 begun sleep 0.2 report-here G Item 100 0 fine";
    run_group({{"SensorProbe", ""}, {"Item", keeps_copy}}, {"--as-group", "P/G"});
    EXPECT_THAT(outcomes(), AllOf(SizeIs(4), Each(EndsWith(": passed"))));
}

TEST_F(RunGatherer, ReasonSaysThatAnItemsOldCopyErasedItsReport)
{
    const Gatherer gatherer("gather sleep 0.1 report G 50 0 half sleep 0.2");
    run_group({{"SensorProbe", ""},
               {"Item", "report-here G Item 0 -2 begun sleep 0.25 report-here G Item 100 0 fine"}},
              {"--as-group"});
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: no result", "Item: passed"));
    EXPECT_EQ(reasons().at(0),
              "a process with an old copy of the plan has written over what it had reported");
}

TEST_F(RunGatherer, HasNoReportOfAnEarlierGatheringTakenForItsOwn)
{
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        const Gatherer gatherer(
            "gather report G 100 0 one await /tmp/scene/second report G 100 0 'one, stored' note "
            "/tmp/scene/stored gather report G 100 1 two sleep 60");
        run_group({{"Script", script("if test -e /tmp/scene/first; then touch /tmp/scene/second; "
                                     "while ! test -e /tmp/scene/stored; do sleep 0.02; done; fi; "
                                     "touch /tmp/scene/first; " +
                                     script_report("0", "fine"))},
                   {"SensorProbe", ""}},
                  {way, "--repeat", "2"});
        EXPECT_THAT(outcomes(), ElementsAre("Script: passed", "SensorProbe: passed",
                                            "Script: passed", "SensorProbe: failed"));
        ASSERT_THAT(events("late"), SizeIs(1));
        EXPECT_EQ(events("late")[0].at("description"), "one, stored");
        for (const char *name : {"first", "second", "stored"}) {
            unlink(work(name).c_str());
        }
    }
}

TEST_F(RunGatherer, ReportBeforeTriggerIsLate)
{
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        const Gatherer gatherer("gather report G 100 0 one sleep 0.5 report G 100 0 'one, stored' "
                                "gather report G 100 1 two sleep 60");
        run_group({{"SensorProbe", ""}}, {way, "--repeat", "2"});
        EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: passed", "SensorProbe: failed"));
        ASSERT_THAT(events("late"), SizeIs(1));
        EXPECT_EQ(events("late")[0].at("description"), "one, stored");
        EXPECT_EQ(events("late")[0].at("round"), 1);
    }
}

TEST_F(RunGatherer, TakesItsTimeUntilItsReportAlsoBesideOtherItems)
{
    run_group({{"SensorProbe", "--group G --seconds 0.5"}, {"Item", kPasses}},
              {"--as-group", "--repeat", "2"});
    EXPECT_THAT(outcomes(), AllOf(SizeIs(4), Each(EndsWith(": passed"))));
    for (const std::size_t gathering : {0U, 2U}) {
        EXPECT_GE(end_of(gathering).at("seconds"), 0.49);
    }
}

TEST_F(RunGatherer, ShowsHowItGetsOnBeforeItConnectsForTheFirstTime)
{
    const std::string start = "--help; exec -a " + std::string(kProbe) +
                              " /system/bin/Item report G 20 0 ready sleep 0.3 gather ";
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        run_group({{"SensorProbe", start + "report G 100 0 fine"}}, {way});
        EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: passed"));
        run_group({{"SensorProbe", start + "sleep 0.1"}}, {way});
        EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: no result"));
        EXPECT_EQ(reasons().at(0), "the gatherer ended before it had reported");
        EXPECT_THAT(events("late"), IsEmpty());
        ASSERT_THAT(events("progress"), SizeIs(1));
        EXPECT_EQ(events("progress")[0].at("description"), "ready");
    }
}

TEST_F(RunGatherer, ThatIsReadyLeavesWhatIsReportedForItemsToCome)
{
    run_group({{"SensorProbe", "--help; /system/bin/Item report-here G Item 100 0 early; exec -a " +
                                   std::string(kProbe) +
                                   " /system/bin/Item report G 20 0 ready gather report G 100 0 x"},
               {"Item", "sleep 0.1"}},
              {"--as-group"});
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: passed", "Item: passed"));
}

TEST_F(RunGatherer, MayHaveTakenTheReportOfAnItemThatSeemsToHaveNone)
{
    const Gatherer gatherer("gather report-here G SensorProbe 50 -2 half await /tmp/scene/fine "
                            "report-here G SensorProbe 100 0 whole sleep 60");
    run_group({{"SensorProbe", ""},
               {"Item", "sleep 0.3 report G 100 0 fine note /tmp/scene/fine sleep 0.2"}},
              {"--as-group"});
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: passed", "Item: no result"));
    EXPECT_THAT(
        reasons().at(1),
        AnyOf("no report is there: there was none, or a process that has reported meanwhile "
              "has written over it with its old copy of the plan",
              "a process with an old copy of the plan has written over what it had "
              "reported"));
}

TEST_F(RunGatherer, IsNoItemWhoseNameBeginsAsItsOwn)
{
    run_group({{"SensorProbe2", "ignore-stop sleep 30"},
               {"Item", "report G 100 0 fine; /system/bin/SensorProbe2 sleep 60 &amp;"}},
              {"--timeout", "0.5", "--grace", "0.3"});
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe2: timed out", "Item: passed"));
    EXPECT_THAT(reasons().at(0), StartsWith("killed after "));
    EXPECT_THAT(end_of(1).at("left_running"), SizeIs(1));
    EXPECT_THAT(processes_named("/system/bin/SensorProbe2"), IsEmpty());
}

TEST_F(RunGatherer, IsStartedThoughAnItemLeftAProcessWhoseNameBeginsAsItsOwn)
{
    const Items items = {{"Item", "report G 100 0 fine; /system/bin/SensorProbe2 sleep 60 &amp;"},
                         {"SensorProbe", "--group G --seconds 0.1"}};
    run_group(items, {"--as-group"});
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "SensorProbe: no result"));
    EXPECT_THAT(reasons().at(1), StartsWith("the gatherer ended before it connected, or the "
                                            "library took /system/bin/SensorProbe2 (pid "));
    run_group(items);
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "SensorProbe: passed"));
}

TEST_F(RunGatherer, MayRunAnotherProgramInItsOwnPlace)
{
    const std::string gatherer =
        "--help; exec -a " + std::string(kProbe) +
        ".real /system/bin/Item gather report-here G SensorProbe 100 0 "
        "one gather sleep 0.6 report-here G SensorProbe 100 0 two sleep 60";
    std::string told;
    for (const char *description : {"one", "two"}) {
        told = run_group({{"SensorProbe", gatherer}}, {"--timeout", "5"}).err;
        EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: passed"));
        EXPECT_EQ(end_of(0).at("description"), description);
    }
    EXPECT_THAT(told, HasSubstr("fptest: a gatherer is running already, as "
                                "'/system/bin/SensorProbe.real gather "));
}

TEST_F(RunGatherer, IsNotTheScriptThatRunsFptest)
{
    Lines words = with_group({{"SensorProbe", "--group G --seconds 0.1"}});
    words.insert(words.begin(),
                 {"sh", file("SensorProbe_bringup.sh", "\"$@\" && echo goes on"), FPTEST_PROGRAM});
    const Ended ended = support::run({.arguments = words});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(ended.out, EndsWith("goes on\n"));
}

TEST_F(RunGatherer, IsWaitedForNoLongerOnceItHasReportedAResultThatThePlanHasNoTextFor)
{
    const Gatherer gatherer("gather report G 100 7 seven sleep 60");
    const Ended ended = run_group({{"SensorProbe", ""}});
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: failed"));
    EXPECT_LT(ended.seconds, 8);
}

TEST_F(RunGatherer, HasTheLateReportsShownOfEachRound)
{
    const Gatherer gatherer(
        "gather report-here G SensorProbe 100 0 one gather report-here G SensorProbe 100 0 two "
        "sleep 0.2 report-here G SensorProbe 100 1 'two, later' sleep 60");
    run_group({{"SensorProbe", ""}, {"Item", "sleep 0.5 report G 100 0 fine"}}, {"--repeat", "2"});
    EXPECT_THAT(outcomes(), Each(EndsWith(": passed")));
    ASSERT_THAT(events("late"), SizeIs(1));
    EXPECT_EQ(events("late")[0].at("description"), "two, later");
    EXPECT_EQ(events("late")[0].at("round"), 2);
}

TEST_F(RunGatherer, IsInterruptedWhileItWaitsForIt)
{
    FptestProcess fptest(with_group(kGathererThatNeverComes));
    EXPECT_TRUE(eventually([] { return library_waits_for_gatherer(); }, 30));
    fptest.signal(SIGINT);
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 130);
    EXPECT_LT(ended.seconds, 15);
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: stopped", "Other: not run"));
}

TEST_F(RunGatherer, LetsItsPortGoWhenItIsKilled)
{
    FptestProcess fptest(with_group(kGathererThatNeverComes));
    ASSERT_TRUE(eventually([] { return library_waits_for_gatherer(); }, 30));
    fptest.signal(SIGKILL);
    EXPECT_TRUE(eventually([] { return !library_waits_for_gatherer(); }, 20));
    EXPECT_TRUE(eventually([] { return processes_named(FPTEST_PROGRAM).empty(); }, 20));
}

TEST_F(RunGatherer, FailsWhereItEndsBeforeItIsDone)
{
    FptestProcess fptest({"run", "--json", work("json"), "--plan",
                          plan(group_of({{"SensorProbe", "--group G --seconds 60"}})), "P/G"});
    ASSERT_TRUE(
        eventually([] { return processes_named("/system/bin/SensorProbe").size() == 1; }, 20));
    usleep(500'000); // it has been told by now
    ASSERT_EQ(
        run_fptest({"report", "G", "SensorProbe", "--progress", "50", "--result", "0"}).status, 0);
    kill(processes_named(kProbe).at(0).pid, SIGSEGV);
    EXPECT_EQ(fptest.wait().status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: failed"));
    EXPECT_EQ(reasons().at(0),
              "the gatherer ended at progress 50, though it reported the result 0");
}

TEST_F(RunGatherer, IsNotRunWhereAnItemHasTakenItsPort)
{
    const Items items = {
        {"Script",
         "'fptest report G Script --progress 100 --result 0; nc -l -p 34952 "
         "&lt;/dev/null >/dev/null 2>/dev/null &amp; until netstat -ltn | grep -q 34952; do "
         "sleep 0.05; done'"},
        {"SensorProbe", "--group G --seconds 0"}};
    Ended ended = run_group(items);
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(
        lines_of(ended.err).back(),
        "fptest: port 34952 is not available: Address already in use; the gatherer's run would "
        "never end: stop what uses it (netstat -tanp names it)");
    EXPECT_THAT(outcomes(), ElementsAre("Script: passed", "SensorProbe: not run"));

    // where the library comes to it without being asked first
    ended = run_group(items, {"--as-group", "--timeout", "0.5", "--grace", "0.2"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Script: passed", "SensorProbe: timed out"));
    EXPECT_LT(ended.seconds, 20);
}

TEST_F(RunGatherer, IsKilledInAGroupsCommandWhereItIgnoresTheStop)
{
    run_group({{"SensorProbe",
                "--help >/dev/null; exec /system/bin/Stubborn ignore-stop gather sleep 60"},
               {"Item", "sleep 4 report G 100 0 fine"}},
              {"--as-group", "--timeout", "0.5", "--grace", "0.2"});
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: timed out", "Item: timed out"));
    EXPECT_THAT(reasons().at(0), StartsWith("killed after 0."));
    EXPECT_THAT(processes_named("/system/bin/Stubborn"), IsEmpty());
}

TEST_F(RunGatherer, IsStartedForEachRoundWhereItHasAnotherName)
{
    // the library does not find it by its name, and one that is left would answer for it
    run_group({{"SensorProbe", "--help >/dev/null; exec /system/bin/Item gather report-here G "
                               "SensorProbe 100 0 fine sleep 30"}},
              {"--repeat", "3"});
    EXPECT_THAT(outcomes(),
                ElementsAre("SensorProbe: passed", "SensorProbe: passed", "SensorProbe: passed"));
    EXPECT_THAT(processes_named("/system/bin/Item"), IsEmpty());
}

TEST_F(RunGatherer, HasRoomForWhatItPrintsAfterTheRun)
{
    run_group({{"SensorProbe", "--group G --seconds 0"}});
    const auto gatherers = processes_named(kProbe);
    ASSERT_EQ(gatherers.size(), 1U);
    const std::string output = "/proc/" + std::to_string(gatherers[0].pid) + "/fd/1";
    const std::string text(100 * 1024, 'x');
    const Descriptor again(open(output.c_str(), O_WRONLY | O_CLOEXEC));
    struct stat status {
    };
    ASSERT_EQ(fstat(again.get(), &status), 0);
    const auto room = status.st_size;
    EXPECT_GE(room, 1024 * 1024);
    EXPECT_EQ(pwrite(again.get(), text.data(), text.size(), room - 100 * 1024), 100 * 1024);
    EXPECT_LT(pwrite(again.get(), text.data(), text.size(), room), 0); // and no more than that
}

TEST_F(RunGatherer, HasWhatItLeavesRunningNamed)
{
    run_group(
        {{"SensorProbe", "--help >/dev/null; setsid sleep 30 &amp; exec /system/bin/Item gather "
                         "report-here G SensorProbe 100 0 fine"},
         {"Item", "report G 100 0 fine"}});
    const auto ends = events("end");
    ASSERT_THAT(outcomes(), ElementsAre("SensorProbe: passed", "Item: passed"));
    ASSERT_EQ(ends.at(0).at("left_running").size(), 1U);
    EXPECT_TRUE(ends.at(1).at("left_running").empty());
}

TEST_F(RunGatherer, HasADaemonOfItsOwnNamedAndEndedWhereItIsStopped)
{
    run_group({{"SensorProbe", "--help >/dev/null; (setsid /system/bin/Third sleep 1.3 report-here "
                               "G SensorProbe 100 0 late &amp;) ; exec /system/bin/Item gather "
                               "sleep 30"},
               {"Item", "report G 100 0 fine"}},
              {"--repeat", "2", "--timeout", "0.6"});
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: timed out", "Item: passed",
                                        "SensorProbe: timed out", "Item: passed"));
    const auto ends = events("end");
    for (const std::size_t round : {0U, 2U}) {
        EXPECT_EQ(ends.at(round).at("left_running").at(0).at("name"), "Third");
        EXPECT_TRUE(ends.at(round + 1).at("left_running").empty());
    }
}

// --- vendors -------------------------------------------------------------------------

TEST_F(RunGatherer, IsTriggeredWhereItIsTheFirstVendors)
{
    set_vendor("1");
    const Ended ended = run_group({{"SensorProbe", "--group G --seconds 0.1"}});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(processes_named("/system/bin/SensorProbe_ca"), SizeIs(1));
    EXPECT_THAT(ended.out, HasSubstr("gathering 1, 64 samples\n"));
}

TEST_F(RunGatherer, IsAnyOtherItemWhereItIsTheSecondVendors)
{
    set_vendor("2");
    const device::Socket taken = device::listen_on(device::kTriggerPort);
    const Items items = {{"SensorProbe", "--group G --seconds 0.1"}};
    const Ended ended = run_group(items);
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(running_items(), IsEmpty());

    const Gatherer of_another_vendor("sleep 60");
    EXPECT_EQ(run_group(items).err, "");
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: passed"));
}

} // namespace
