// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Runs that stop their items: at a time limit, by a signal, or when fptest itself or
// the process that holds the library is killed.
#include "run_test.h"

#include <chrono>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <utility>

namespace fs = std::filesystem;

namespace
{

const std::string kBeginsAndSleeps = std::string("note /tmp/scene/begun ") + kSleeps;
// It is not found by its name, and neither is what it starts.
const device::PlanItem kScriptThatSleeps = {
    "Script", script("echo x >/tmp/scene/begun; /system/bin/Third sleep 60; "
                     "echo x >/tmp/scene/after")};

// --- items that take too long --------------------------------------------------------

TEST_F(RunCommand, StopsAnItemThatTakesTooLongThroughTheLibrary)
{
    const Ended ended = run_group({{"Item", kSleeps}, {"Other", kPasses}}, {"--timeout", "1"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    EXPECT_THAT(outcomes(), ElementsAre("Item: timed out", "Other: passed"));
    EXPECT_THAT(reasons(), ElementsAre(StartsWith("stopped after 1."), ""));
    EXPECT_THAT(processes_stopped(), Not(IsEmpty()));
    EXPECT_EQ(read_file(work("signal")), "SIGTERM\n");
    EXPECT_EQ(description(0), "begun");
    EXPECT_GE(end_of(0).at("seconds"), 1.0);
    EXPECT_THAT(without_times(ended.out),
                HasSubstr("G/Item: timed out, result -2, T s: stopped after T s: begun\n"));
    EXPECT_THAT(running_items(), IsEmpty());
}

TEST_F(RunCommand, AsksTheItemToStopWhereAnotherProcessHasItsName)
{
    run_group({{"Other", "report G 100 0 fine; /system/bin/Item ignore-stop sleep 60 &amp;"},
               {"Item", kSleeps}},
              {"--timeout", "0.6", "--grace", "0.3"});
    EXPECT_THAT(reasons(), ElementsAre("", StartsWith("stopped after 0.")));
    EXPECT_EQ(read_file(work("signal")), "SIGTERM\n");
}

TEST_F(RunCommand, AsksTheItemToStopWhereAScriptsNameBeginsAsItsOwn)
{
    run_group({{"Script", script("trap true TERM; " + script_report("0", "fine") +
                                 "; while true; do sleep 0.1; done &amp;")},
               {"Scrip", kSleeps}},
              {"--timeout", "0.6", "--grace", "0.3"});
    EXPECT_THAT(reasons(), ElementsAre("", StartsWith("stopped after 0.")));
    EXPECT_EQ(read_file(work("signal")), "SIGTERM\n");
}

TEST_F(RunCommand, StopsItemsOfAGroupsCommandOneByOne)
{
    const Ended ended =
        run_group({{"Item", kSleeps}, {"Other", kPasses}, {"Third", kSleeps}, {"Fourth", kPasses}},
                  {"--as-group", "--timeout", "0.6"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(paths_run(), ElementsAre("P/G"));
    EXPECT_THAT(outcomes(), ElementsAre("Item: timed out", "Other: passed", "Third: timed out",
                                        "Fourth: passed"));
    EXPECT_EQ(read_file(work("signal")), "SIGTERM\nSIGTERM\n");
}

TEST_F(RunCommand, LeavesAnItemAloneThatIsWithinItsTime)
{
    // a limit for each item and not for all of them
    for (const std::string way : {"--quiet", "--as-group"}) {
        EXPECT_EQ(run_group({{"Item", "sleep 0.6 report G 100 0 a"},
                             {"Other", "sleep 0.6 report G 100 0 b"}},
                            {way, "--timeout", "1.1"})
                      .status,
                  0);
        EXPECT_THAT(processes_stopped(), IsEmpty());
    }
}

// --- items that are scripts ----------------------------------------------------------

TEST_F(RunCommand, TakesTheReportsOfAShellScript)
{
    FptestProcess fptest(
        with_group({{"Script", script("fptest report G Script --progress 50 --result -2; "
                                      "while ! test -e /tmp/scene/go; do sleep 0.02; done; "
                                      "fptest report G Script --progress 100 --result 0 "
                                      "--description &quot;by a script&quot;")}}));
    EXPECT_TRUE(wait_for_events("progress", 1));
    file("go", "");
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(without_times(lines_of(ended.out).at(1)),
              "G/Script: passed, result 0, T s: by a script");
}

TEST_F(RunCommand, StopsAScriptAtItsLimitThatIsNotFoundByItsName)
{
    const Ended ended = run_group({kScriptThatSleeps, {"Other", kPasses}}, {"--timeout", "0.5"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    EXPECT_TRUE(is_there("begun"));
    EXPECT_FALSE(is_there("after"));
    EXPECT_THAT(outcomes(), ElementsAre("Script: timed out", "Other: passed"));
    EXPECT_THAT(reasons().at(0), StartsWith("stopped after 0."));
    EXPECT_LT(end_of(0).at("seconds"), 1.0);
    EXPECT_THAT(running_items(), IsEmpty());
}

// --- interrupted ---------------------------------------------------------------------

class Interrupted : public RunCommand, public WithParamInterface<int>
{
};

TEST_P(Interrupted, StopsTheItemAndMarksTheRest)
{
    const std::string name =
        GetParam() == SIGINT ? "Ctrl-C" : std::string("SIG") + sigabbrev_np(GetParam());
    const std::string reason = "interrupted by " + name;
    const Items items = {{"Item", kPasses},
                         {"Other", kBeginsAndSleeps},
                         {"Third", "note /tmp/scene/after"},
                         {"Fourth", "note /tmp/scene/after"}};
    FptestProcess fptest(with_json(
        {"--tap", "--junit", work("junit"), "--plan", plan(group_of(items)), "P/G", "P/G/Item"}));
    ASSERT_TRUE(wait_for_events("progress", 2));
    fptest.signal(GetParam());
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 130);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(read_file(work("signal")), "SIGTERM\n");
    EXPECT_THAT(processes_stopped(), Not(IsEmpty()));
    EXPECT_FALSE(is_there("after"));
    EXPECT_THAT(paths_run(), ElementsAre("P/G/Item", "P/G/Other"));

    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: stopped", "Third: not run",
                                        "Fourth: not run", "Item: not run"));
    EXPECT_THAT(reasons(), ElementsAre("", "stopped by " + name, reason, reason, reason));
    EXPECT_EQ(events("finish").at(0).at("finished"), false);
    EXPECT_EQ(events("finish").at(0).at("reason"), reason);
    EXPECT_EQ(tally_of_json(json()), (Tally{1, 1, 3}));

    EXPECT_EQ(tally_of_junit(junit()), (Tally{1, 1, 3}));
    // what a break has kept from being run is no success
    EXPECT_EQ(parse_xml(junit()).attributes.at("skipped"), "0");
    for (const Element &suite : parse_xml(junit()).all("testsuite")) {
        EXPECT_EQ(suite.properties()["finished"], "false");
    }

    EXPECT_EQ(tally_of_tap(ended.out), (Tally{1, 1, 3}));
    const Tap tap = parse_tap(ended.out);
    EXPECT_EQ(tap.bail_out, reason);
    for (const Point &suite : tap.points) {
        for (const Point &point : suite.inside) {
            EXPECT_EQ(point.skipped.value_or("not run: " + reason), "not run: " + reason);
        }
    }
}

INSTANTIATE_TEST_SUITE_P(, Interrupted, Values(SIGINT, SIGTERM, SIGHUP), [](const auto &signal) {
    return std::string("BySIG") + sigabbrev_np(signal.param);
});

TEST_F(RunCommand, SaysInTheViewThatItWasInterrupted)
{
    FptestProcess fptest(with_group({{"Item", kSleeps}, {"Other", kPasses}}));
    ASSERT_TRUE(wait_for_events("progress", 1));
    fptest.signal(SIGTERM);
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 130);
    EXPECT_EQ(without_times(ended.out), work("plan.xml") +
                                            ": 2 items, vendor 0\n"
                                            "G/Item: stopped, result -2, T s: stopped by "
                                            "SIGTERM: begun\nnot finished: interrupted by "
                                            "SIGTERM\n0 passed, 1 failed, 1 not run, T s\n");
}

TEST_F(RunCommand, RunsNothingWhereItIsInterruptedBefore)
{
    const Start start{.arguments = with_group(kThreeThatNote), .prepare = interrupted_before};
    EXPECT_EQ(run_fptest(start).status, 130);
    EXPECT_THAT(paths_run(), IsEmpty());
    EXPECT_THAT(outcomes(), ElementsAre("Item: not run", "Other: not run", "Third: not run"));
    EXPECT_THAT(reasons(), Each("interrupted by Ctrl-C"));
}

TEST_F(RunCommand, StartsNoOtherItemOfAnInterruptedGroupsCommand)
{
    const std::string sleeps = "note /tmp/scene/order tell-signal /tmp/scene/signal sleep 60";
    FptestProcess fptest(with_group({{"Item", sleeps}, {"Other", sleeps}, {"Third", sleeps}},
                                    {"--as-group", "P/G"}));
    ASSERT_TRUE(wait_for_file("order"));
    fptest.signal(SIGINT);
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 130);
    EXPECT_LT(ended.seconds, 20);
    EXPECT_THAT(paths_run(), ElementsAre("P/G"));
    EXPECT_THAT(outcomes(), ElementsAre("Item: stopped", "Other: not run", "Third: not run",
                                        "Item: not run", "Other: not run", "Third: not run"));
    EXPECT_THAT(lines_of(read_file(work("order"))), SizeIs(1));
    EXPECT_THAT(running_items(), IsEmpty());
    EXPECT_EQ(reasons().at(2), "interrupted by Ctrl-C");
}

TEST_F(RunCommand, StopsAScriptThatIsInterrupted)
{
    FptestProcess fptest(with_group({kScriptThatSleeps}));
    ASSERT_TRUE(wait_for_file("begun"));
    fptest.signal(SIGINT);
    EXPECT_EQ(fptest.wait().status, 130);
    EXPECT_THAT(outcomes(), ElementsAre("Script: stopped"));
    EXPECT_FALSE(is_there("after"));
    EXPECT_THAT(running_items(), IsEmpty());
}

TEST_F(RunCommand, LeavesAtOnceWhenInterruptedTwice)
{
    // a stop does not end it, and no second one is needed to leave
    const Items items = {{"Item", kPasses},
                         {"Stubborn", "ignore-stop note /tmp/scene/begun sleep 60"},
                         {"Third", "note /tmp/scene/after"}};
    for (const auto &[first, second] :
         {std::pair{SIGINT, SIGINT}, {SIGTERM, SIGINT}, {SIGINT, SIGTERM}}) {
        SCOPED_TRACE(first + second);
        fs::remove(work("begun"));
        support::write_file(device::kLogFile, "");
        FptestProcess fptest(with_group(items, {"--junit", work("junit")}));
        ASSERT_TRUE(wait_for_file("begun"));
        fptest.signal(first);
        ASSERT_TRUE(eventually([] { return !processes_stopped().empty(); }, 30));
        if (second == SIGTERM) {
            sleep(1);
        }
        EXPECT_FALSE(fptest.has_ended());
        const auto start = std::chrono::steady_clock::now();
        fptest.signal(second);
        EXPECT_EQ(fptest.wait().status, 130);
        EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(1));
        EXPECT_EQ(fptest.err(),
                  "\nfptest: interrupted again: exiting now, stopping the running item\n");
        EXPECT_THAT(outcomes(), ElementsAre("Item: passed"));
        EXPECT_THAT(events("finish"), IsEmpty());
        EXPECT_EQ(parse_xml(junit()).children.at(0).properties()["finished"], "false");
        // it has its item stopped, which would be taken for the next one's first stop
        EXPECT_TRUE(eventually([] { return processes_named(FPTEST_PROGRAM).empty(); }, 20));
        DeviceTest::TearDown();
    }
    EXPECT_FALSE(is_there("after"));
}

TEST_F(RunCommand, StopsWhatRunsAfterItHasLeftAtOnce)
{
    // the first signal is not seen to its end: the second one comes with it
    FptestProcess fptest(with_group(
        {{"Item", kBeginsAndSleeps}, {"Other", "note /tmp/scene/after"}}, {"--as-group"}));
    ASSERT_TRUE(wait_for_events("progress", 1));
    fptest.signal(SIGINT);
    fptest.signal(SIGTERM);
    EXPECT_EQ(fptest.wait().status, 130);
    expect_items_to_end();
    EXPECT_FALSE(is_there("after"));
}

// --- cut off -------------------------------------------------------------------------

struct CutOffCase {
    std::string name;
    device::PlanItem second;
    std::string way;
};

class CutOff : public RunCommand, public WithParamInterface<CutOffCase>
{
};

TEST_P(CutOff, LeavesWhatWasKnownAndNothingRunning)
{
    const auto &[name, second, way] = GetParam();
    FptestProcess fptest(
        with_group({{"Item", kPasses}, second, {"Third", "note /tmp/scene/after"}, {"Fourth", ""}},
                   {way, "--junit", work("junit")}));
    ASSERT_TRUE(wait_for_file("begun"));
    ASSERT_TRUE(wait_for_events("start", 2));
    fptest.signal(SIGKILL);
    EXPECT_EQ(fptest.wait().status, -SIGKILL);

    EXPECT_THAT(outcomes(), ElementsAre("Item: passed"));
    EXPECT_THAT(events("finish"), IsEmpty());
    EXPECT_EQ(events("run").at(0).at("items").size(), 4U);
    const Element suite = parse_xml(junit()).children.at(0);
    EXPECT_EQ(suite.properties()["finished"], "false");
    EXPECT_THAT(suite.all("testcase"), SizeIs(4));

    expect_items_to_end();
    EXPECT_FALSE(is_there("after"));
    EXPECT_TRUE(eventually([] { return processes_named(FPTEST_PROGRAM).empty(); }, 20));
}

INSTANTIATE_TEST_SUITE_P(
    , CutOff,
    Values(CutOffCase{"Item", {"Other", "note /tmp/scene/begun sleep 60"}, "--quiet"},
           CutOffCase{
               "ItemOfAGroupsCommand", {"Other", "note /tmp/scene/begun sleep 60"}, "--as-group"},
           CutOffCase{"Script", kScriptThatSleeps, "--quiet"}),
    [](const auto &one) { return "Of" + one.param.name; });

TEST_F(RunCommand, BeginsAfterOneThatWasKilledWhenItsItemsHaveEnded)
{
    FptestProcess fptest(with_group({kScriptThatSleeps, {"SensorProbe", "--group G --seconds 0"}}));
    ASSERT_TRUE(wait_for_file("begun"));
    fptest.signal(SIGKILL);
    fptest.wait();
    Ended ended;
    EXPECT_TRUE(eventually([&] {
        ended = run({"P/G/SensorProbe"});
        return ended.status != 3 && ended.status != 4;
    }));
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: passed"));
}

TEST_F(RunCommand, IsStoppedByASignalToAllOfItsProcesses)
{
    const PlanItem gathers = {"SensorProbe", "--group G --seconds 60"};
    const PlanItem sleeps = {"Item", "note /tmp/scene/begun sleep 60"};
    for (const int number : {SIGINT, SIGTERM, SIGHUP}) {
        for (const PlanItem &item : {gathers, sleeps}) {
            SCOPED_TRACE(std::to_string(number) + " " + item.name);
            fs::remove(work("begun"));
            FptestProcess fptest(with_group({item, {"Other", kPasses}}));
            ASSERT_TRUE(wait_for_events("start", 1));
            ASSERT_TRUE(item.name == sleeps.name ? wait_for_file("begun") : eventually([] {
                return !processes_named(kProbe).empty();
            }));
            kill(fptest.library(), number);
            fptest.signal(number);
            EXPECT_EQ(fptest.wait().status, 130);
            EXPECT_THAT(outcomes(), ElementsAre(item.name + ": stopped", "Other: not run"));
        }
    }
}

TEST_F(RunCommand, LosesTheItemInWhichTheLibrarysProcessEndedAndNoOther)
{
    FptestProcess fptest(with_group(
        {{"Item", kPasses}, {"Other", "note /tmp/scene/begun sleep 60"}, {"Third", kPasses}},
        {"--tap", "--junit", work("junit")}));
    ASSERT_TRUE(wait_for_file("begun"));
    kill(fptest.library(), SIGKILL);
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: no result", "Third: passed"));
    EXPECT_EQ(reasons().at(1), "the library's process ended by signal 9; --log FILE keeps what it "
                               "says");
    EXPECT_EQ(tally_of_json(json()), (Tally{2, 1, 0}));
    EXPECT_EQ(tally_of_junit(junit()), (Tally{2, 1, 0}));
    EXPECT_EQ(tally_of_tap(ended.out), (Tally{2, 1, 0}));
    EXPECT_THAT(running_items(), IsEmpty());
}

TEST_F(RunCommand, LosesTheRestOfAGroupsCommandInWhichTheLibrarysProcessEnded)
{
    FptestProcess fptest(with_group(
        {{"Item", "note /tmp/scene/begun sleep 60"}, {"Other", kPasses}}, {"--as-group"}));
    ASSERT_TRUE(wait_for_file("begun"));
    kill(fptest.library(), SIGKILL);
    EXPECT_EQ(fptest.wait().status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Item: no result", "Other: no result"));
    EXPECT_EQ(reasons().at(1), "the library never reached it: the library's process ended by "
                               "signal 9; --log FILE keeps what it says");
}

TEST_F(RunCommand, GoesOnWhereTheLibrarysProcessIsSuspendedBetweenTwoItems)
{
    const std::string path =
        plan(group_of({{"Item", "report G 100 0 fine; (sleep 0.02; kill -STOP $PPID) &amp;"},
                       {"Other", "report G 100 0 fine"}}));
    EXPECT_THAT(run_fptest({"run", "--plan", path, "--timeout", "1", "P/G"}).out,
                HasSubstr("2 passed"));
}

} // namespace
