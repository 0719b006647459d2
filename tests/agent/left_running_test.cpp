// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What items leave running, and reports that come late.
#include "run_test.h"

namespace
{

class LeftRunning : public RunCommand
{
};

// A script that leaves this to a child of its own the first time that it runs.
std::string leaving(const std::string &text)
{
    return script("if ! test -e /tmp/scene/left; then (" + text +
                  ") &amp; fi; echo x >/tmp/scene/left; sleep 0.3");
}

TEST_F(LeftRunning, ChildOfAnEarlierRoundReportsIntoNoLaterOne)
{
    const std::string late = "sleep 0.6; " + script_report("0", "of round 1");
    const Ended ended =
        run_group({{"Script", leaving(late)}, {"Item", kPasses}}, {"--repeat", "3"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Script: no result", "Item: passed", "Script: no result",
                                        "Item: passed", "Script: no result", "Item: passed"));
}

TEST_F(LeftRunning, IsNamed)
{
    const Ended ended = run_group(
        {{"Script", script("/system/bin/Third sleep 60 &amp; " + script_report("0", "fine"))},
         {"Item", kPasses}});
    const Json left = end_of(0).at("left_running");
    ASSERT_EQ(left.size(), 1U);
    EXPECT_EQ(left.at(0).at("name"), "Third");
    EXPECT_THAT(ended.out, HasSubstr("    left running: Third (pid " +
                                     std::to_string(left.at(0).at("pid").get<int>()) + ")\n"));
    EXPECT_THAT(end_of(1).at("left_running"), IsEmpty());
}

TEST_F(LeftRunning, ChildOnlyJustEndingIsNotLeftRunning)
{
    run_group({{"Script", script("sleep 0.05 &amp; " + script_report("0", "fine"))}});
    EXPECT_THAT(end_of(0).at("left_running"), IsEmpty());
}

TEST_F(LeftRunning, ReportAfterTheItemsEndIsToldAndChangesNothing)
{
    const Ended ended =
        run_group({{"Script", leaving("sleep 0.6; " + script_report("0", "too late"))},
                   {"Item", "sleep 1 report G 100 0 fine"}});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Script: no result", "Item: passed"));
    const auto late = events("late");
    ASSERT_EQ(late.size(), 1U);
    EXPECT_EQ(late.at(0).at("item"), "Script");
    EXPECT_EQ(late.at(0).at("description"), "too late");
    EXPECT_THAT(ended.out, HasSubstr("G/Script: late report, result 0: too late; it changes "
                                     "nothing\n"));
}

TEST_F(LeftRunning, LateReportIsToldAlsoOfLessProgressOrInTheMomentOfTheEnd)
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

TEST_F(LeftRunning, IsEndedBeforeTheNextRoundAndAtTheEnd)
{
    const Items items = {
        {"Script", script("/system/bin/Third note /tmp/scene/order sleep 60 &amp; " +
                          script_report("0", "fine"))},
        {"Item", "await /tmp/scene/order sleep 0.2 report G 100 0 fine"}};
    EXPECT_EQ(run_group(items, {"--repeat", "2"}).status, 0);
    EXPECT_EQ(read_file(work("order")), "Third\nThird\n");
    EXPECT_THAT(running_items(), IsEmpty());
}

TEST_F(LeftRunning, ChildOfAnItemReportsIntoNoSecondRunOfItInTheSameRound)
{
    const std::string late = "sleep 0.6; " + script_report("0", "of the first");
    EXPECT_EQ(run_group({{"Script", leaving(late)}}, {"P/G/Script"}).status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Script: no result", "Script: no result"));
}

TEST_F(LeftRunning, IsGoneWhenTheNextRoundBegins)
{
    run_group({{"Script", script("ps Third >>/tmp/scene/seen; " + script_report("0", "fine"))},
               {"Item", "report G 100 0 fine; /system/bin/Third sleep 60 &amp;"}},
              {"--repeat", "2"});
    EXPECT_THAT(end_of(1).at("left_running").size(), 1U);
    EXPECT_THAT(read_file(work("seen")), AllOf(HasSubstr("USER"), Not(HasSubstr("Third"))));
}

TEST_F(LeftRunning, ServesTheRestOfItsRound)
{
    const Items items = {
        {"Script", script("/system/bin/Third await /tmp/scene/asked note /tmp/scene/answered "
                          "sleep 60 &amp; " +
                          script_report("0", "fine"))},
        {"Item", "note /tmp/scene/asked await /tmp/scene/answered report G 100 0 fine"}};
    EXPECT_EQ(run_group(items, {"--timeout", "20"}).status, 0);
}

TEST_F(LeftRunning, IsKilledWhereItDoesNotEnd)
{
    const Ended ended =
        run_group({{"Script", script("/system/bin/Third ignore-stop sleep 60 &amp; sleep 0.2; " +
                                     script_report("0", "fine"))}},
                  {"--grace", "0.5", "--repeat", "2"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_THAT(running_items(), IsEmpty());
}

TEST_F(LeftRunning, IsFoundAlsoWhereItsFirstThreadHasEnded)
{
    run_group({{"Item", "report G 100 0 fine; /system/bin/Third sleep-on 60 &amp; sleep 0.2"}},
              {"--repeat", "2"});
    EXPECT_EQ(end_of(0).at("left_running").size(), 1U);
    EXPECT_THAT(running_items(), IsEmpty());
    EXPECT_THAT(device::processes_named("Third"), IsEmpty()); // as it has no arguments any more
}

TEST_F(LeftRunning, OutlivesTheTimeOutOfAnotherItem)
{
    run_group({{"Item", "report G 100 0 fine; /system/bin/Third sleep 60 &amp;"},
               {"Script", script("sleep 60")},
               {"Other", "report G 100 0 $(ps Third | grep -c Third)"}},
              {"--timeout", "0.5"});
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Script: timed out", "Other: passed"));
    EXPECT_EQ(end_of(2).at("description"), "1");
}

TEST_F(LeftRunning, IsNotTheNextItemsWhateverItStarts)
{
    run_group({{"Item", "report G 100 0 fine; while true; do sleep 0.05; done &amp;"},
               {"Other", "sleep 0.3 report G 100 0 fine"}});
    EXPECT_THAT(end_of(0).at("left_running").size(), Ge(1U));
    EXPECT_THAT(end_of(1).at("left_running"), IsEmpty());
}

TEST_F(LeftRunning, InASessionOfItsOwnIsFound)
{
    run_group({{"Item", "report G 100 0 fine; setsid /system/bin/Third sleep 60 &amp;"}});
    EXPECT_THAT(end_of(0).at("left_running").size(), 1U);
    EXPECT_THAT(running_items(), IsEmpty());
}

TEST_F(LeftRunning, EndsWithARunThatBreaksOff)
{
    const Ended ended =
        run_group({{"Item", "/system/bin/Third sleep 60 &amp; rm /data/vorlane/src1.xml"},
                   {"Other", kPasses}});
    EXPECT_EQ(ended.status, 3);
    EXPECT_THAT(running_items(), IsEmpty());
}

TEST_F(LeftRunning, ServesOnWhereAnotherItemThatLeavesSomethingRunsAgain)
{
    run_group({{"Item", "report G 100 0 fine; /system/bin/Third sleep 60 &amp;"},
               {"Script", script("sleep 60 &amp; " + script_report("0", "fine"))},
               {"Other", "report G 100 0 $(ps Third | grep -c Third)"}},
              {"P/G/Script"});
    EXPECT_EQ(end_of(3).at("description"), "1");
    EXPECT_THAT(end_of(2).at("left_running"), SizeIs(1));
    EXPECT_THAT(running_items(), IsEmpty());
}

} // namespace
