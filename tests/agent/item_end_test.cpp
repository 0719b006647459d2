// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How items end: time limits, exit statuses and signals, items that do not stop.
#include "run_test.h"

#include <algorithm>
#include <csignal>
#include <thread>
#include <unistd.h>

namespace
{

bool is_suspended(pid_t process)
{
    return device::status_field(process, "State").starts_with('T');
}

class ItemEnd : public RunCommand
{
  protected:
    static std::string reason(std::size_t item)
    {
        return reasons().at(item);
    }
};

// --- time limits -------------------------------------------------------------------

TEST_F(ItemEnd, PastTheLimitIsTimedOutThoughTheItemThenPasses)
{
    const Ended ended = run_group(
        {{"Item", "ignore-stop sleep 1 report G 100 0 fine"},
         {"Script", script("trap true TERM; sleep 1; sleep 0.5; " + script_report("0", "fine"))}},
        {"--timeout", "0.5"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Item: timed out", "Script: timed out"));
    EXPECT_THAT(end_of(0).at("seconds").get<double>(), AllOf(Ge(1.0), Lt(2.0)));
    EXPECT_THAT(reason(0), StartsWith("stopped after 1."));
}

TEST_F(ItemEnd, PastTheLimitIsTimedOutThoughNobodyWatched)
{
    FptestProcess fptest(with_group({{"Item", "note /tmp/scene/begun sleep 1 report G 100 0 fine"}},
                                    {"--timeout", "0.5"}));
    ASSERT_TRUE(wait_for_file("begun"));
    fptest.signal(SIGSTOP);
    ASSERT_TRUE(eventually([] { return running_items().empty(); }, 30));
    fptest.signal(SIGCONT);
    EXPECT_EQ(fptest.wait().status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Item: timed out"));
    EXPECT_THAT(reason(0), AllOf(StartsWith("ended by itself after 1."),
                                 HasSubstr(" s, past the limit of 0.500 s")));
}

// --- items that do not stop --------------------------------------------------------------

TEST_F(ItemEnd, ItemThatIgnoresTheStopIsKilledAndTheRunGoesOn)
{
    const Ended ended =
        run_group({{"Item", kPasses}, {"Stubborn", "ignore-stop sleep 60"}, {"Third", kPasses}},
                  {"--timeout", "0.5"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Stubborn: timed out", "Third: passed"));
    EXPECT_THAT(reason(1), AllOf(StartsWith("killed after 2."),
                                 HasSubstr(" s, as it did not end when it was asked to")));
    EXPECT_EQ(events("finish").at(0).at("finished"), true);
    EXPECT_THAT(running_items(), IsEmpty());
}

TEST_F(ItemEnd, GraceIsAsLongAsItIsSaidToBe)
{
    run_group({{"Item", "ignore-stop sleep 1 report G 100 0 fine"}},
              {"--timeout", "0.2", "--grace", "0.3"});
    EXPECT_THAT(reason(0), StartsWith("killed after 0."));
    run_group({{"Item", "ignore-stop sleep 2.5 report G 100 0 fine"}},
              {"--timeout", "0.2", "--grace", "20"});
    EXPECT_THAT(reason(0), StartsWith("stopped after 2."));
}

TEST_F(ItemEnd, ScriptAndItsChildrenAreKilledTogether)
{
    run_group(
        {{"Script", script("trap true TERM; /system/bin/Third ignore-stop sleep 60; sleep 60")},
         {"Other", kPasses}},
        {"--timeout", "0.3", "--grace", "0.5"});
    EXPECT_THAT(outcomes(), ElementsAre("Script: timed out", "Other: passed"));
    EXPECT_THAT(reason(0), StartsWith("killed after "));
    EXPECT_THAT(running_items(), IsEmpty());
}

TEST_F(ItemEnd, ItemThatIsSuspendedIsEndedAllTheSame)
{
    const Ended ended = run_group(
        {{"Script", script("kill -STOP $$; sleep 60")}, {"Other", kPasses}}, {"--timeout", "0.3"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Script: timed out", "Other: passed"));
    EXPECT_THAT(reason(0), StartsWith("stopped after 0."));
}

TEST_F(ItemEnd, SecondInterruptionLeavesNoItemThatIgnoresTheStop)
{
    FptestProcess fptest(with_group({{"Stubborn", "note /tmp/scene/begun ignore-stop sleep 60"}}));
    ASSERT_TRUE(wait_for_file("begun"));
    fptest.signal(SIGINT);
    std::this_thread::sleep_for(std::chrono::milliseconds(300));
    fptest.signal(SIGINT);
    EXPECT_EQ(fptest.wait().status, 130);
    EXPECT_TRUE(eventually([] { return running_items().empty(); }, 20));
}

TEST_F(ItemEnd, InterruptionBetweenTwoRoundsBeginsNoOtherRound)
{
    FptestProcess fptest(
        with_group({{"Item", "report G 100 0 fine; /system/bin/Third ignore-stop sleep 60 &amp;"}},
                   {"--grace", "0.9", "--repeat", "2"}));
    ASSERT_TRUE(eventually([] { return events("end").size() == 1; }));
    std::this_thread::sleep_for(std::chrono::milliseconds(300));
    fptest.signal(SIGTERM);
    EXPECT_EQ(fptest.wait().status, 130);
    EXPECT_EQ(events("finish").at(0).at("rounds"), 1);
    EXPECT_EQ(events("finish").at(0).at("not_run"), 1);
}

TEST_F(ItemEnd, LibrarysProcessThatEndsBetweenTwoRoundsCostsNothing)
{
    FptestProcess fptest(
        with_group({{"Item", "report G 100 0 fine; /system/bin/Third ignore-stop sleep 60 &amp;"}},
                   {"--grace", "0.9", "--repeat", "2"}));
    for (const std::size_t round : {1U, 2U}) {
        ASSERT_TRUE(eventually([&] { return events("end").size() == round; }));
        std::this_thread::sleep_for(std::chrono::milliseconds(300));
        kill(fptest.library(), SIGKILL);
    }
    EXPECT_EQ(fptest.wait().status, 0);
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Item: passed"));
    EXPECT_THAT(running_items(), IsEmpty());
}

TEST_F(ItemEnd, StopComesOnceSoThatItsHandlerCanEnd)
{
    const std::string cleans_up =
        "clean() { echo asked >>/tmp/scene/asked; sleep 0.6; exit 0; }; "
        "trap clean TERM; >/tmp/scene/ready; while true; do sleep 0.1; done";
    run_group({{"Script", script(cleans_up)}}, {"--timeout", "0.5"});
    EXPECT_THAT(reason(0), StartsWith("stopped after "));
    EXPECT_THAT(lines_of(read_file(work("asked"))), SizeIs(1));
    run_group({{"Script", script("rm /tmp/scene/ready; (" + cleans_up +
                                 ") &amp; until [ -e /tmp/scene/ready ]; do sleep 0.1; done; " +
                                 script_report("0", "fine"))}});
    EXPECT_THAT(lines_of(read_file(work("asked"))), SizeIs(2));
}

TEST_F(ItemEnd, LeftoverThatDestroysThePlanAtTheEndIsTold)
{
    const Ended ended = run_group(
        {{"Item",
          "report G 100 0 fine; (trap true TERM; sleep 60; rm /data/vorlane/src1.xml) &amp;"}});
    EXPECT_EQ(ended.status, 3);
    EXPECT_THAT(ended.err, HasSubstr("src1.xml is gone"));
}

// It is in the middle of a save when it is stopped.
TEST_F(ItemEnd, ReportThatAStopCutsShortIsUndone)
{
    for (const std::string kept : {"0", "40"}) {
        const std::string cuts =
            "trap &quot;head -c " + kept +
            " $p >$p.cut; cat $p.cut >$p; exit&quot; TERM; sleep 60 &amp; wait";
        const std::string plan_file = "p=/data/vorlane/src1.xml; ";
        const Ended ended =
            run_group({{"Item", kPasses},
                       {"Script", script(plan_file + cuts)},
                       {"Other", "report G 100 0 fine; " + plan_file + "(" + cuts + ") &amp;"},
                       {"Third", kPasses}},
                      {"--timeout", "0.3", "--repeat", "2"});
        EXPECT_EQ(ended.status, 1) << ended.err;
        EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Script: timed out", "Other: passed",
                                            "Third: passed", "Item: passed", "Script: timed out",
                                            "Other: passed", "Third: passed"));
        const std::string stored = read_file(device::kPlanFile);
        EXPECT_THAT(stored, EndsWith("</P>\n"));
        EXPECT_THAT(stored, Not(HasSubstr("fptest-run")));
    }
}

TEST_F(ItemEnd, RunIsOverWhenAllThatItLeftRunningHasEnded)
{
    FptestProcess fptest(
        with_group({{"Item", "report G 100 0 fine; /system/bin/Third ignore-stop sleep 60 &amp;"}},
                   {"--grace", "2.2", "--tap", "--junit", work("junit")}));
    ASSERT_TRUE(eventually([] { return events("end").size() == 1; }));
    std::this_thread::sleep_for(std::chrono::milliseconds(1300)); // until JUnit is written again
    EXPECT_THAT(junit(), HasSubstr("<testsuites name=\"fptest\" tests=\"2\" failures=\"0\" "
                                   "errors=\"1\""));
    EXPECT_THAT(junit(), HasSubstr("<testcase classname=\"rounds\" name=\"end of the run\""));
    fptest.signal(SIGTERM);
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 130);
    EXPECT_THAT(ended.out, HasSubstr("Bail out!  interrupted by SIGTERM"));
    EXPECT_EQ(events("finish").at(0).at("finished"), false);
    EXPECT_THAT(junit(), HasSubstr("errors=\"1\""));
}

TEST_F(ItemEnd, SignalThatIsSentToAllAndHandedOnIsOneInterruption)
{
    using Pair = std::pair<int, int>;
    for (const auto &[first, second] :
         {Pair(SIGINT, SIGHUP), Pair(SIGHUP, SIGHUP), Pair(SIGHUP, SIGTERM), Pair(SIGHUP, SIGINT),
          Pair(SIGTERM, SIGTERM), Pair(SIGINT, SIGTERM)}) {
        FptestProcess fptest(with_group(
            {{"Stubborn", "note /tmp/scene/begun ignore-stop sleep 60"}}, {"--grace", "0.4"}));
        ASSERT_TRUE(wait_for_file("begun"));
        fptest.signal(first);
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
        fptest.signal(second);
        EXPECT_EQ(fptest.wait().status, 130);
        EXPECT_EQ(fptest.err(), "");
        EXPECT_THAT(outcomes(), ElementsAre("Stubborn: stopped"));
        EXPECT_THAT(reason(0), StartsWith("killed after the run was interrupted by "));
        unlink(work("begun").c_str());
    }
}

// --- how the process ended -----------------------------------------------------------

TEST_F(ItemEnd, DeathByASignalIsAFailureWhateverWasReported)
{
    const Ended ended =
        run_group({{"Item", "report G 100 0 fine crash"}, {"Other", "crash"}, {"Third", kPasses}});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Item: failed", "Other: failed", "Third: passed"));
    EXPECT_EQ(reason(0), "died by SIGABRT, though it reported the result 0");
    EXPECT_EQ(reason(1), "died by SIGABRT");
}

TEST_F(ItemEnd, DeathByASignalIsAFailureHoweverTheArgsAreWritten)
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

TEST_F(ItemEnd, DeathByARealTimeSignalIsAFailure)
{
    run_group(
        {{"Script", "'fptest report G Script --progress 100 --result 0; kill -40 $$'; true"}});
    EXPECT_THAT(outcomes(), ElementsAre("Script: passed")); // the shell's end is what counts
    run_group({{"Script", "'fptest report G Script --progress 100 --result 0; kill -40 $$'"}});
    EXPECT_THAT(outcomes(), ElementsAre("Script: failed"));
    EXPECT_EQ(reasons().at(0), "died by signal 40, though it reported the result 0");
}

TEST_F(ItemEnd, ExitStatusFailsAnItemWhereThatIsWanted)
{
    const Items items = {{"Script", script(script_report("0", "fine") + "; exit 1")},
                         {"Item", kPasses}};
    EXPECT_EQ(run_group(items).status, 0);
    EXPECT_THAT(outcomes(), ElementsAre("Script: passed", "Item: passed"));

    EXPECT_EQ(run_group(items, {"--exit-status"}).status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Script: failed", "Item: passed"));
    EXPECT_EQ(reason(0), "ended with exit status 1, though it reported the result 0");

    run_group({{"Script", script(script_report("1", "bad") + "; exit 1")}}, {"--exit-status"});
    EXPECT_EQ(reason(0), "ended with exit status 1; it had reported the result 1");
}

TEST_F(ItemEnd, ItemThatSignalsItsProcessGroupEndsAlone)
{
    const Ended ended =
        run_group({{"Script", script(script_report("0", "fine") + "; kill 0")}, {"Item", kPasses}});
    EXPECT_EQ(ended.err, "");
    EXPECT_THAT(outcomes(), ElementsAre("Script: failed", "Item: passed"));
    EXPECT_EQ(reason(0), "died by SIGTERM, though it reported the result 0");
}

// --- a plan that a report has spoiled ------------------------------------------------

TEST_F(ItemEnd, DescriptionThatNoPlanCanHoldCostsNoOtherItem)
{
    const std::string odd = "report-here G Item 100 0 $(printf a\\\\001b)";
    const Ended ended = run_group({{"Item", odd}, {"Other", kPasses}}, {"--force"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: passed"));
    EXPECT_THAT(read_file(kPlanFile), HasSubstr("a\u2401b"));
}

TEST_F(ItemEnd, DescriptionThatIsNoXmlDoesNotKeepTheStoredPlanFromRunning)
{
    run_group({{"Item", "report-here G Item 100 0 $(printf a\\\\357\\\\277\\\\277b)"},
               {"Other", "sleep 0.1"}});
    EXPECT_THAT(events("late"), IsEmpty());
    const Ended ended = run({"P/G/Item"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(read_file(kPlanFile), HasSubstr("a\uFFFDb"));
}

TEST_F(ItemEnd, NullDescriptionCostsNoOtherItem)
{
    const Ended ended = run_group({{"Item", "report-null G 100 0"}, {"Other", kPasses}});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: passed"));
    EXPECT_TRUE(end_of(0).at("description").is_null());
    EXPECT_THAT(read_file(kPlanFile), HasSubstr("description=\"\""));
}

TEST_F(ItemEnd, ItemThatDestroysThePlanHasNoResultWhateverItReported)
{
    for (const std::string way : {"rm", "truncate -s 3"}) {
        run_group({{"Script", script(script_report("0", "fine") + "; sleep 0.1; " + way +
                                     " /data/vorlane/src1.xml")}});
        EXPECT_THAT(outcomes(), ElementsAre("Script: no result"));
        EXPECT_EQ(reason(0), "what it reported is lost: the stored plan is gone or damaged");
    }
}

TEST_F(ItemEnd, FifoInThePlansPlaceEndsTheRun)
{
    const Ended ended = run_group({{"Script", script("rm /data/vorlane/src1.xml; "
                                                     "mkfifo /data/vorlane/src1.xml")},
                                   {"Item", kPasses}});
    EXPECT_EQ(ended.status, 3);
    EXPECT_THAT(outcomes(), ElementsAre("Script: no result", "Item: not run"));
}

TEST_F(ItemEnd, ReportBeforeTheLibrarysProcessDiedIsRead)
{
    run_group({{"Script", script(script_report("0", "fine") + "; kill -KILL $PPID; sleep 60")},
               {"Item", kPasses}});
    EXPECT_THAT(outcomes(), ElementsAre("Script: failed", "Item: passed"));
    EXPECT_EQ(end_of(0).at("description"), "fine");
}

TEST_F(ItemEnd, LibrarysProcessThatIsSuspendedIsReplaced)
{
    const Ended ended = run_group({{"Script", script("kill -STOP $PPID")}, {"Item", kPasses}},
                                  {"--timeout", "0.3", "--grace", "0.3"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Script: timed out", "Item: passed"));
}

// --- the gatherer ------------------------------------------------------------------------

TEST_F(ItemEnd, GathererIsNoZombieThoughTheProcessThatStartedItIsGone)
{
    const std::string end_library = "report G 100 0 x; kill -KILL $PPID; sleep 5";
    const Ended ended = run_group(
        {{"SensorProbe", "--group G --seconds 0"},
         {"Item", end_library},
         {"Script", script("kill -KILL $(ps | grep /SensorProbe | (read a b c; echo $b))")},
         {"Third", end_library},
         {"Other", "report G 100 0 zombies-$(grep -l '^State.*Z' /proc/*/status | grep -c .)"}});
    EXPECT_THAT(device::processes_named(device::kProbe), IsEmpty()) << ended.out;
    EXPECT_EQ(end_of(4).at("description"), "zombies-0") << ended.err;
}

TEST_F(ItemEnd, GathererThatEndsAtItsStartHoldsUpNoRun)
{
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        const Ended ended = run_group({{"SensorProbe", "--nosuch"}, {"Other", kPasses}}, {way});
        EXPECT_EQ(ended.status, 1);
        EXPECT_EQ(ended.err, "");
        EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: no result", "Other: passed"));
        EXPECT_EQ(reason(0), "the gatherer ended before it connected");
        EXPECT_THAT(end_of(0).at("output").get<std::string>(), HasSubstr("SensorProbe: "));
        EXPECT_LT(ended.seconds, 10);
    }
}

TEST_F(ItemEnd, GathererThatEndsWithoutAReportIsNotWaitedFor)
{
    FptestProcess fptest(with_group({{"SensorProbe", "--group G --seconds 60"}}));
    ASSERT_TRUE(eventually([] { return processes_named(kProbe).size() == 1; }, 20));
    std::this_thread::sleep_for(std::chrono::milliseconds(500)); // it has been told by now
    for (const device::Process &process : processes_named(kProbe)) {
        kill(process.pid, SIGKILL);
    }
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(reason(0), "the gatherer ended before it had reported");
    EXPECT_LT(ended.seconds, 8);
}

TEST_F(ItemEnd, GathererThatDidNotReportInTimeReportsIntoNothingLater)
{
    const Items items = {{"SensorProbe", "--group G --seconds 1"},
                         {"Item", "sleep 0.9 report G 100 0 fine"}};
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        run_group(items,
                  {way, "--timeout", "0.4", "--grace", "0.2", "P/G/SensorProbe", "--repeat", "2"});
        for (const Json &end : events("end")) {
            EXPECT_EQ(end.at("outcome"), "timed out");
        }
        EXPECT_THAT(processes_named(kProbe), IsEmpty());
    }
}

TEST_F(ItemEnd, GathererThatIsSuspendedIsKilled)
{
    FptestProcess fptest(with_group({{"SensorProbe", "--group G --seconds 60"}},
                                    {"--timeout", "0.6", "--grace", "0.3"}));
    ASSERT_TRUE(eventually([] { return processes_named(kProbe).size() == 1; }, 20));
    for (const device::Process &process : processes_named(kProbe)) {
        kill(process.pid, SIGSTOP);
    }
    EXPECT_EQ(fptest.wait().status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: timed out"));
    EXPECT_THAT(processes_named(kProbe), IsEmpty());
}

// --- a run that is suspended ---------------------------------------------------------

TEST_F(ItemEnd, SuspendedRunSuspendsItsItemsAndNoTimePasses)
{
    const Start start{
        .arguments = with_group({{"Item", "note /tmp/scene/begun sleep 0.8 report G 100 0 fine"}},
                                {"--timeout", "1.4"}),
        .prepare = in_own_group};
    FptestProcess fptest(start);
    ASSERT_TRUE(wait_for_file("begun"));
    fptest.signal(SIGTSTP);
    ASSERT_TRUE(eventually([&] { return is_suspended(fptest.pid()); }, 20));
    for (const device::Process &process : processes_named("/system/bin/Item")) {
        EXPECT_TRUE(eventually([&] { return is_suspended(process.pid); }, 20));
    }
    std::this_thread::sleep_for(std::chrono::milliseconds(1500));
    fptest.signal(SIGCONT);
    EXPECT_EQ(fptest.wait().status, 0);
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed"));
}

TEST_F(ItemEnd, SuspendedRunSuspendsTheGatherer)
{
    const Start start{
        .arguments = with_group({{"SensorProbe", "--group G --seconds 1"}}, {"--timeout", "10"}),
        .prepare = in_own_group};
    FptestProcess fptest(start);
    ASSERT_TRUE(eventually([] { return processes_named(kProbe).size() == 1; }, 20));
    fptest.signal(SIGTSTP);
    ASSERT_TRUE(eventually([&] { return is_suspended(fptest.pid()); }, 20));
    for (const device::Process &process : processes_named(kProbe)) {
        EXPECT_TRUE(eventually([&] { return is_suspended(process.pid); }, 20));
    }
    fptest.signal(SIGCONT);
    EXPECT_EQ(fptest.wait().status, 0);
}

TEST_F(ItemEnd, RunThatNobodyCouldResumeIsNotSuspended)
{
    const Start start{
        .arguments = with_group({{"Item", "note /tmp/scene/begun sleep 1 report G 100 0 fine"}}),
        .prepare = in_own_session};
    FptestProcess fptest(start);
    ASSERT_TRUE(wait_for_file("begun"));
    fptest.signal(SIGTSTP);
    EXPECT_EQ(fptest.wait().status, 0);
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed"));
}

TEST_F(ItemEnd, RunThatIsKilledWhileSuspendedLeavesNoItem)
{
    const Start start{.arguments = with_group({{"Item", "note /tmp/scene/begun sleep 60"}}),
                      .prepare = in_own_group};
    FptestProcess fptest(start);
    ASSERT_TRUE(wait_for_file("begun"));
    fptest.signal(SIGTSTP);
    ASSERT_TRUE(eventually([&] { return is_suspended(fptest.pid()); }, 20));
    fptest.signal(SIGKILL);
    fptest.wait();
    EXPECT_TRUE(eventually([] { return running_items().empty(); }, 20));
    EXPECT_TRUE(eventually([] { return processes_named(FPTEST_PROGRAM).empty(); }, 20));
}

} // namespace
