// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A process that reports writes back the whole plan as it was when it loaded it. No
// item passes because of what such a copy holds, and what it has overwritten is told.
#include "run_test.h"

#include <unistd.h>
#include <utility>

namespace
{

using OldCopy = RunCommand;

TEST_F(OldCopy, BringsBackNoResultOfAnEarlierRun)
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

    start_item_program({"/system/bin/Fourth",
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
    EXPECT_THAT(ended.out, HasSubstr("a process with an old copy of the plan has overwritten it"));
}

TEST_F(OldCopy, BringsBackNoResultWhereThePlanIsGivenAnew)
{
    const std::string old = device::group_of({{"Script", ""}});
    const std::size_t end = old.find("/>");
    file("old", std::string(old).insert(end, " progress=\"100\" result=\"0\" description=\"old\""));
    const Ended ended =
        run_group({{"Script", "'cat /tmp/scene/old >/data/vorlane/src1.xml; sleep 0.2'"}});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Script: no result"));
    EXPECT_THAT(reasons().at(0),
                StartsWith("a process with an old copy of the plan has overwritten it"));
}

TEST_F(OldCopy, BringsBackNoReportThatPasses)
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

TEST_F(OldCopy, CostsNothingThatIsReportedAfterIt)
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

TEST_F(OldCopy, PassesNoItemThatMayHaveReportedMore)
{
    const std::string leaves = "'(sleep 0.5; exec /system/bin/Item report-here G Script 50 0 one "
                               "await /tmp/scene/go report-here G Script 50 0 two sleep 5) &amp; "
                               "fptest report G Script --progress 100 --result 0'";
    run_group({{"Script", leaves},
               {"Item", "report-here G Item 10 0 begun sleep 1 report-here G Item 100 1 done "
                        "note /tmp/scene/go sleep 0.3"}});
    EXPECT_THAT(outcomes(), ElementsAre("Script: passed", "Item: failed"));
}

TEST_F(OldCopy, IsTheReasonWhereAReportIsWrittenOver)
{
    run_group(
        {{"Script", "'cp /data/vorlane/src1.xml /tmp/scene/old; fptest report G Script --progress "
                    "100 --result 0; sleep 0.3; cat /tmp/scene/old >/data/vorlane/src1.xml; sleep "
                    "0.3'"}});
    EXPECT_THAT(outcomes(), ElementsAre("Script: no result"));
    EXPECT_EQ(reasons().at(0),
              "a process with an old copy of the plan has written over what it had reported");
}

TEST_F(OldCopy, OfAnItemsDaemonIsNoReportOfASilentGatherer)
{
    run_group({{"Item", "sleep 0.1 &amp; /system/bin/Third report-here G Item 100 0 c sleep 0.7 "
                        "report-here G Item 100 0 c &amp; sleep 0.2"},
               {"SensorProbe", "--help >/dev/null; exec -a /system/bin/SensorProbe "
                               "/system/bin/Other gather sleep 1 report G "
                               "100 0 ok gather sleep 60"}},
              {"--repeat", "2", "--timeout", "2"});
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "SensorProbe: passed", "Item: passed",
                                        "SensorProbe: timed out"));
}

TEST_F(OldCopy, OfWhatAnItemLeftRunningIsNoReportWhereTheItemDestroyedThePlan)
{
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        run_group({{"Script", script("/system/bin/Item report-here G Script 10 -2 begun sleep 0.4 "
                                     "report-here G Script 100 0 late &amp; sleep 0.2; " +
                                     script_report("1", "broken") +
                                     "; echo broken >/data/vorlane/src1.xml")}},
                  {way});
        EXPECT_THAT(outcomes(), ElementsAre("Script: no result"));
    }
}

TEST_F(OldCopy, IsTheReasonWhereItIsOfAnotherPlan)
{
    file("other", device::plan_of({{"Q", {{"Other", ""}}}}));
    run_group({{"Script", "'cat /tmp/scene/other >/data/vorlane/src1.xml; sleep 0.2'"}});
    EXPECT_EQ(reasons().at(0), "another plan has been stored meanwhile, or saved by a process that "
                               "still had it");
}

} // namespace
