// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Running plans: what is stored and sent to the library, which items that runs,
// and whose result is whose.
#include "run_test.h"

#include <filesystem>
#include <ostream>
#include <unistd.h>

namespace fs = std::filesystem;

namespace
{

const std::string kHasErrors =
    "fptest: the plan has errors: see fptest check /tmp/scene/plan.xml\n";

// --- the plan ---------------------------------------------------------------------

TEST_F(RunCommand, StoresThePlanThatIsGivenAsItIsInPlaceOfAnOlderOne)
{
    write_file(kPlanFile, group_of({{"Other", notes("old")}}) + std::string(3000, ' '));
    const std::string text = "<?xml version=\"1.0\"?>\n<P>\n\t<CmdGroup name='G'>\n"
                             "\t\t<Cmd name='Item' args=''/></CmdGroup> </P>\n\n";
    run({"--plan", plan(text), "P/G"});
    EXPECT_EQ(read_file(kPlanFile), text);
    EXPECT_THAT(outcomes(), ElementsAre("Item: no result"));
}

TEST_F(RunCommand, TakesThePlanFromStandardInput)
{
    const Ended ended = run_fptest({"run", "--plan", "-", "P/G"}, group_of(kThreeThatNote));
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(read_file(work("order")), "Item\nOther\nThird\n");
    EXPECT_THAT(ended.out, StartsWith("<stdin>: 3 items, vendor 0\n"));
}

TEST_F(RunCommand, UsesTheStoredPlanWhereNoneIsGiven)
{
    write_file(kPlanFile, group_of(kThreeThatNote));
    const Ended ended = run({"P/G"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(read_file(work("order")), "Item\nOther\nThird\n");
    EXPECT_THAT(ended.out, StartsWith("/data/vorlane/src1.xml: 3 items, vendor 0\n"));
}

TEST_F(RunCommand, SaysWhatItIsWarnedOfAndGoesOn)
{
    const std::string path = plan(plan_of({{"G", {{"Item", kPasses}}}, {"Empty", {}}}));
    const Ended ended = run({"--plan", path, "P/G"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "fptest: the plan has warnings: see fptest check " + path + "\n");
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed"));
    EXPECT_EQ(run_fptest({"run", "--quiet", "--plan", path, "P/G"}).err, "");
}

TEST_F(RunCommand, RunsAStoredPlanAgainWhateverHasBeenReported)
{
    // none of it could be stored by a command
    file("long", ":" + std::string(10000, 'd'));
    EXPECT_EQ(run_group({{"Item", "report G 100 0 'at 12.30'"},
                         {"Other", "report-file G 100 0 /tmp/scene/long"}})
                  .status,
              0);
    const Ended ended = run({"P/G/Item"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(ended.err, "");
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed"));
    EXPECT_THAT(read_file(kPlanFile), HasSubstr(":" + std::string(10000, 'd')));
}

TEST_F(RunCommand, RunsByForceWhatIsStoredOfAPlan)
{
    const std::string stored = group_of({{"Item", kPasses}}) + "\n";
    const Ended ended = run({"--force", "--plan", plan("::" + stored + ":and more"), "P/G"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed"));
}

// --- what is sent to the library ----------------------------------------------------

TEST_F(RunCommand, RunsAGroupItemByItemAndLeavesNoProcess)
{
    const Ended ended = run_group(kThreeThatNote);
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(ended.err, "");
    EXPECT_THAT(paths_run(), ElementsAre("P/G/Item", "P/G/Other", "P/G/Third"));
    EXPECT_EQ(read_file(work("order")), "Item\nOther\nThird\n");
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: passed", "Third: passed"));
    EXPECT_EQ(without_times(ended.out), work("plan.xml") + ": 3 items, vendor 0\n"
                                                           "G/Item: passed, result 0, T s: one\n"
                                                           "G/Other: passed, result 0, T s: two\n"
                                                           "G/Third: passed, result 0, T s: three\n"
                                                           "3 passed, 0 failed, T s\n");
    EXPECT_THAT(device::processes_named(FPTEST_PROGRAM), IsEmpty());
    EXPECT_THAT(running_items(), IsEmpty());
}

struct PathCase {
    std::string name;
    std::string plan;
    Lines arguments; // options and paths
    int status;
    Lines sent;  // paths
    Lines ran;   // items, as they note it themselves
    Lines ended; // their outcomes, with what they have described
    std::string errors{};
};

void PrintTo(const PathCase &one, std::ostream *stream)
{
    *stream << one.name;
}

const std::vector<PathCase> kPathCases = {
    {"GroupByOneCommandWhereThatIsWanted",
     group_of(kThreeThatNote),
     {"--as-group", "P/G"},
     0,
     {"P/G"},
     {"Item", "Other", "Third"},
     {"Item: passed one", "Other: passed two", "Third: passed three"}},
    {"TheOneItemThatIsNamed",
     group_of(kThreeThatNote),
     {"any root/G/Other"},
     0,
     {"any root/G/Other"},
     {"Other"},
     {"Other: passed two"}},
    {"SeveralPathsInTheOrderGiven",
     plan_of({{"A", {{"Item", "note /tmp/scene/order report A 100 0 of-a"}}},
              {"G", {{"Other", notes("b")}, {"Item", notes("of-g", "1")}}}}),
     {"P/G/Item", "P/A", "P/G"},
     1,
     {"P/G/Item", "P/A/Item", "P/G/Other", "P/G/Item"},
     {"Item", "Item", "Other", "Item"},
     {"Item: failed of-g", "Item: passed of-a", "Other: passed b", "Item: failed of-g"}},
    {"GroupInWhichNamesLeadElsewhereByOneCommand",
     kShifted,
     {"--force", "P/G"},
     1,
     {"P/G"},
     {"Item", "Other", "Third"},
     {"Item: passed one", "Other: failed two", "Third: passed three"},
     kHasErrors},
    {"WhatAGroupsCommandComesToBetweenItems",
     "<P><CmdGroup name=\"G\">"
     "<Cmd name=\"Item\" args=\"note /tmp/scene/order report G 100 0 one\"/><!-- about it -->"
     "<Cmd args=\"nobody\"/>"
     "<Cmd name=\"Other\" args=\"note /tmp/scene/order report G 100 1 two\"/>"
     "</CmdGroup></P>",
     {"--force", "P/G"},
     1,
     {"P/G"},
     {"Item", "Other"},
     {"Item: passed one", "Other: failed two"},
     kHasErrors},
    // both report for the first one; that the second had not yet is seen while it sleeps
    {"GroupWithANameTwiceByOneCommand",
     group_of({{"Item", notes("first")},
               {"Item", "note /tmp/scene/order sleep 1 report G 100 0 second"}}),
     {"--force", "P/G"},
     1,
     {"P/G"},
     {"Item", "Item"},
     {"Item: passed first", "Item: no result"},
     kHasErrors},
    {"ItemThatReallyRanAndNotTheOneNamed",
     kShifted,
     {"--force", "P/G/Item"},
     1,
     {"P/G/Item"},
     {"Other"},
     {"Other: failed two"},
     kHasErrors},
    // it is found in the group after it, and its place there taken in this one
    {"WhatTheLibraryTakesForAnUnknownItem",
     plan_of({{"G", {{"Item", notes("x")}}}, {"B", {{"Other", notes("y")}}}}),
     {"--force", "P/G/Other"},
     0,
     {"P/G/Other"},
     {"Item"},
     {"Item: passed x"}},
    {"NamesThatTheShellReadsAsItsOwn",
     group_of({{"$(echo Item)", "note /tmp/scene/order"}}),
     {"P/G"},
     1,
     {"P/G/$(echo Item)"},
     {"Item"},
     {"$(echo Item): no result"},
     "fptest: the plan has warnings: see fptest check /tmp/scene/plan.xml\n"},
    {"ItemTwiceThatIsNamedTwice",
     group_of({{"Item", "note /tmp/scene/order once /tmp/scene/item report G 100 0 once"}}),
     {"P/G/Item", "P/G/Item"},
     1,
     {"P/G/Item", "P/G/Item"},
     {"Item", "Item"},
     {"Item: passed once", "Item: no result"}},
};

class RunPaths : public RunCommand, public WithParamInterface<PathCase>
{
};

TEST_P(RunPaths, Runs)
{
    const PathCase &one = GetParam();
    Lines arguments = one.arguments;
    arguments.insert(arguments.begin(), {"--plan", plan(one.plan)});
    const Ended ended = run(arguments);
    EXPECT_EQ(ended.status, one.status);
    EXPECT_EQ(ended.err, one.errors);
    EXPECT_EQ(paths_run(), one.sent);
    EXPECT_EQ(lines_of(read_file(work("order"))), one.ran);
    Lines all;
    for (const Json &end : events("end")) {
        const Json &text = end.at("description");
        all.push_back(end.at("item").get<std::string>() + ": " +
                      end.at("outcome").get<std::string>() +
                      (text.is_null() ? "" : " " + text.get<std::string>()));
    }
    EXPECT_EQ(all, one.ended);
}

INSTANTIATE_TEST_SUITE_P(, RunPaths, ValuesIn(kPathCases),
                         [](const auto &one) { return one.param.name; });

TEST_F(RunCommand, RunsNothingWhereAPathLeadsToNothing)
{
    std::string text = kShifted;
    text.insert(text.find("</P>"), "<CmdGroup name=\"Empty\"/>");
    const std::string file = plan(text);
    for (const std::string path : {"P/G/Third", "P/Empty"}) {
        for (const char *way : {"--force", "--list"}) {
            const Ended ended =
                run_fptest({"run", "--force", way, "--plan", file, "P/G/Item", path});
            EXPECT_EQ(ended.status, 2);
            EXPECT_EQ(ended.out, "");
            EXPECT_THAT(ended.err, EndsWith("fptest: '" + path +
                                            "' leads to nothing that can be run: leave it out, "
                                            "or see fptest check\n"));
        }
    }
    EXPECT_FALSE(is_there("order"));
}

TEST_F(RunCommand, WritesTheLibrarysLogWhereItIsToldOrNowhere)
{
    Start start;
    start.environment["VR_LOG_FILE"] = std::nullopt;
    start.arguments = {"run", "--quiet", "--plan", plan(group_of(kThreeThatNote)), "P/G"};
    const Ended ended = run_fptest(start);
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "");
    EXPECT_EQ(ended.err, "");
    start.environment["VR_LOG_FILE"] = work("other");
    for (const std::string path : {"P/G/Item", "P/G/Other"}) {
        start.arguments = {"run", "--log", work("log"), path};
        EXPECT_EQ(run_fptest(start).status, 0);
    }
    EXPECT_THAT(paths_run(work("log")), ElementsAre("P/G/Item", "P/G/Other"));
    EXPECT_FALSE(is_there("other"));
}

TEST_F(RunCommand, DoesWithoutStandardStreams)
{
    const std::string command = "fptest run --json " + work("json") + " --plan " +
                                plan(group_of({{"Item", "say x report G 100 0 y"}})) + " P/G";
    for (const std::string closed : {" <&- >&- 2>&-", " >&-", " <&-", " 2>&-"}) {
        SCOPED_TRACE(closed);
        EXPECT_EQ(run_program({"/system/bin/sh", "-c", command + closed}).status, 0);
        EXPECT_THAT(outcomes(), ElementsAre("Item: passed"));
        EXPECT_EQ(output(0), "x\n");
    }
}

// --- while items run ------------------------------------------------------------------

TEST_F(RunCommand, KnowsEachItemsStartAndDuration)
{
    const auto time_of = [](const Json &event) { return event.at("start").get<std::string>(); };
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        run_group({{"Item", "sleep 0.3 report G 100 0 a"},
                   {"Other", "report G 100 0 b"},
                   {"Third", "sleep 0.2 report G 100 0 c"}},
                  {way});
        Lines order;
        for (const Json &event : events_of(json())) {
            const std::string kind = event.at("event");
            if (kind == "start" || kind == "end") {
                order.push_back(kind + " " + std::to_string(event.at("index").get<int>()));
            }
        }
        EXPECT_THAT(order, ElementsAre("start 0", "end 0", "start 1", "end 1", "start 2", "end 2"));
        const auto ends = events("end");
        ASSERT_THAT(ends, SizeIs(3));
        EXPECT_GE(ends[0].at("seconds"), 0.3);
        EXPECT_GE(ends[2].at("seconds"), 0.2);
        EXPECT_LT(time_of(ends[0]), time_of(ends[1]));
        EXPECT_LE(time_of(ends[1]), time_of(ends[2]));
        EXPECT_EQ(time_of(events("start").at(1)), time_of(ends[1]));
        EXPECT_GE(events("finish").at(0).at("seconds"), 0.5);
    }
}

TEST_F(RunCommand, ShowsProgressAndAsksTheLibraryForNothingWhileACommandRuns)
{
    FptestProcess fptest(
        with_group({{"Item", "report G 30 -2 begun sleep 0.1 report G 60 -2 b sleep 0.1 "
                             "note /tmp/scene/half await /tmp/scene/go report G 100 0 x"}}));
    ASSERT_TRUE(wait_for_events("progress", 2));
    const Json progress = events("progress")[0];
    EXPECT_EQ(progress.at("progress"), "30");
    EXPECT_EQ(progress.at("result"), "-2");
    EXPECT_EQ(progress.at("description"), "begun");
    ASSERT_TRUE(wait_for_file("half"));
    EXPECT_THAT(events("end"), IsEmpty());
    const std::string log = read_file(device::kLogFile);
    const std::string since = log.substr(log.find("Input cmdline : P/G/Item"));
    EXPECT_EQ(since.find("FPTEST_ExtractResultMsg"), since.npos) << since;
    EXPECT_EQ(since.find("FPTEST_RunTestCmd"), since.npos) << since;
    EXPECT_EQ(since.find("FPTEST_SuspendItemExecute"), since.npos) << since;
    file("go", "");
    EXPECT_EQ(fptest.wait().status, 0);
}

TEST_F(RunCommand, SeesReportsThatFollowEachOtherAtOnce)
{
    std::string reports;
    for (const std::string progress : {"10", "20", "30", "40", "50", "60", "70", "80", "100"}) {
        reports += "report G " + progress + " 0 x sleep 0.003 ";
    }
    run_group({{"Item", reports}});
    EXPECT_THAT(events("progress"), SizeIs(Ge(6))); // most of them, on a busy machine
}

// --- whose result it is -------------------------------------------------------------

TEST_F(RunCommand, TakesNoResultOfAnEarlierRoundForOneOfThis)
{
    const Ended ended = run_group(
        {{"Item", "once /tmp/scene/item report G 100 0 once"},
         {"Other", "report G 100 0 always"},
         {"Third", "$(test -e /tmp/scene/order &amp;&amp; echo crash) " + notes("once", "1")}},
        {"--repeat", "2"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: passed", "Third: failed",
                                        "Item: no result", "Other: passed", "Third: failed"));
    EXPECT_THAT(ended.out, HasSubstr("G/Item (round 1): passed"));
    EXPECT_THAT(ended.out, HasSubstr("G/Item (round 2): no result"));
    EXPECT_THAT(ended.out, HasSubstr("2 rounds"));
}

TEST_F(RunCommand, LeavesNoResultOfAnEarlierRunInThePlan)
{
    run_group({{"Item", "once /tmp/scene/item report G 100 0 once"}, {"Other", kPasses}});
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: passed"));
    EXPECT_EQ(run({"--until-fail", "P/G"}).status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Item: no result", "Other: not run"));
    EXPECT_THAT(read_file(kPlanFile), Not(HasSubstr("result=")));
}

TEST_F(RunCommand, TakesNoResultOfAnEarlierRunForOneOfThis)
{
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        fs::remove(work("item"));
        EXPECT_EQ(run_group({{"Item", "once /tmp/scene/item report G 100 0 once"},
                             {"Other", "report G 100 0 always"}},
                            {way})
                      .status,
                  0);
        EXPECT_EQ(run({way, "P/G"}).status, 1);
        EXPECT_THAT(outcomes(), ElementsAre("Item: no result", "Other: passed"));
        EXPECT_TRUE(end_of(0).at("result").is_null()) << end_of(0);
        EXPECT_TRUE(end_of(0).at("description").is_null()) << end_of(0);
    }
}

TEST_F(RunCommand, LeavesTheReportsOfItemsThatItDoesNotRun)
{
    EXPECT_EQ(run_group(kThreeThatNote).status, 0);
    EXPECT_EQ(run({"P/G/Other"}).status, 0);
    const std::string table = run_fptest({"show"}).out;
    EXPECT_THAT(table, HasSubstr("one"));
    EXPECT_THAT(table, HasSubstr("three"));
}

TEST_F(RunCommand, TakesTheCodeThatIsSaidToMeanPassed)
{
    const std::string path = plan(group_of({{"Item", "report G 100 0 a"},
                                            {"Other", "report G 100 1 b"},
                                            {"Third", "report G 100 -2 c"}}));
    const std::vector<std::pair<std::string, Lines>> codes = {
        {"0", {"Item: passed", "Other: failed", "Third: failed"}},
        {"1", {"Item: failed", "Other: passed", "Third: failed"}},
        {"-2", {"Item: failed", "Other: failed", "Third: passed"}}};
    for (const auto &[code, expected] : codes) {
        SCOPED_TRACE(code);
        EXPECT_EQ(run({"--pass-code", code, "--plan", path, "P/G"}).status, 1);
        EXPECT_EQ(outcomes(), expected);
        EXPECT_EQ(events("run").at(0).at("pass_code"), std::stoi(code));
    }
    EXPECT_EQ(run({"--pass-code", "-2", "P/G/Third"}).status, 0);
    EXPECT_EQ(run({"--pass-code", "1", "P/G/Third"}).status, 1);
}

TEST_F(RunCommand, PrintsNothingQuietlyButWhatDidNotPass)
{
    const std::string path = plan(group_of({{"Item", kPasses}, {"Other", "report G 100 1 b"}}));
    Ended ended = run_fptest({"run", "--quiet", "--plan", path, "P/G"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(without_times(ended.out), "G/Other: failed, result 1, T s: b\n");
    ended = run_fptest({"run", "--quiet", "P/G/Item"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "");
    EXPECT_EQ(ended.err, "");
}

TEST_F(RunCommand, RepairsAPlanThatAReportMadeUnloadableForTheNextItem)
{
    const Ended ended = run_group({{"Item", "report G 100 0 one"},
                                   {"Other", "report G 50 7 odd"}, // an attribute without a value
                                   {"Third", "report G 100 0 three"}});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: failed", "Third: passed"));
    EXPECT_EQ(reasons().at(1),
              "reported a result that is not 0, 1 or -2: the plan has no text for it");
    EXPECT_EQ(description(1), "odd");
    EXPECT_THAT(without_times(ended.out), HasSubstr("G/Other: failed, result ?, T s: odd\n"));
}

// --- what would be run ---------------------------------------------------------------

TEST_F(RunCommand, LosesNoReportThatComesAfterOneThatSpoilsThePlan)
{
    run_group(
        {{"Script", "'/system/bin/Item report-null G 100 0; fptest report G Script --progress "
                    "100 --result 1 --description dead'"},
         {"Item", "report G 100 0 fine"}});
    EXPECT_THAT(outcomes(), ElementsAre("Script: failed", "Item: passed"));
    EXPECT_EQ(description(0), "dead");
}

TEST_F(RunCommand, ShowsAReportForAnEarlierItemAsLate)
{
    const Ended ended = run_group({{"Item", "report G 100 0 fine"},
                                   {"Script", "'fptest report G Item --progress 100 --result 1 "
                                              "--description pasted'"}});
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Script: no result"));
    EXPECT_THAT(ended.out,
                HasSubstr("G/Item: late report, result 1: pasted; it changes nothing\n"));
}

TEST_F(RunCommand, EndsWhereTheStoredPlanIsGone)
{
    const std::string text = group_of(
        {{"Item", "sleep 0; rm /data/vorlane/src1.xml"}, {"Other", "report G 100 0 fine"}});
    const Ended ended = run_fptest({"run", "--json", work("json"), "--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err, "fptest: the plan has warnings: see fptest check /tmp/scene/plan.xml\n"
                         "fptest: the stored plan /data/vorlane/src1.xml is gone or damaged: "
                         "store it again\n");
    EXPECT_THAT(outcomes(), ElementsAre("Item: no result", "Other: not run"));
}

TEST_F(RunCommand, LeavesNoMarksOfItsOwnInThePlan)
{
    ASSERT_EQ(run_fptest({"run", "--plan", plan(kOnePasses), "P/G"}).status, 0);
    ASSERT_EQ(run_fptest({"run", "--repeat", "3", "P/G"}).status, 0);
    EXPECT_THAT(read_file(kPlanFile), Not(HasSubstr("fptest-run")));
    EXPECT_THAT(read_file(kPlanFile), HasSubstr("description=\"fine\""));
}

TEST_F(RunCommand, ListsWhatWouldBeRunAndLeavesEverythingAsItIs)
{
    const std::string stored = plan_of({{"Old", {{"Item", "note /tmp/scene/order"}}}});
    write_file(kPlanFile, stored);
    const auto written = fs::last_write_time(kPlanFile);
    const std::string text = plan_of({{"A", {{"Item", "note /tmp/scene/order"}}},
                                      {"Long one", {{"Other", "x"}, {"SensorProbe", ""}}}});
    const Ended ended = run_fptest({"run", "--list", "--plan", plan(text)});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(ended.out, "P/A/Item                /system/bin/Item note /tmp/scene/order\n"
                         "P/Long one/Other        /system/bin/Other x\n"
                         "P/Long one/SensorProbe  /system/bin/SensorProbe \n");
    EXPECT_EQ(read_file(kPlanFile), stored);
    EXPECT_EQ(fs::last_write_time(kPlanFile), written);
    EXPECT_FALSE(is_there("order"));
    EXPECT_THAT(programs_run(), IsEmpty());
    EXPECT_THAT(running_items(), IsEmpty());
}

struct ListCase {
    std::string name;
    std::string plan;
    Lines arguments;
    std::string out;
};

const std::string kHead = "<?xml version=\"1.0\"?>\n<!-- a plan -->\n";
const std::string kGroup = "<CmdGroup name=\"G\"><Cmd name=\"Item\" args=\"\"/></CmdGroup>";

TEST_F(RunCommand, ListsWithoutAStoredPlanAndStoresNone)
{
    const std::vector<ListCase> cases = {
        {"all under the plan's own name",
         kHead + "<TestPlan name=\"demo\">" + kGroup + "</TestPlan>",
         {},
         "demo/G/Item  /system/bin/Item \n"},
        {"or under its element's",
         kHead + "<Tests>" + kGroup + "</Tests>",
         {},
         "Tests/G/Item  /system/bin/Item \n"},
        {"command lines as far as they are run",
         group_of({{"Item", std::string(1100, 'a')}}),
         {"--force"},
         "P/G/Item  /system/bin/Item " + std::string(1007, 'a') + "\n"},
        {"the paths that are named only",
         plan_of({{"A", {{"Item", "x"}, {"Third", "y"}}}, {"B", {{"Other", ""}}}}),
         {"my/B", "my/A/Third"},
         "my/B/Other  /system/bin/Other \nmy/A/Third  /system/bin/Third y\n"},
        {"what a shifted name really runs",
         kShifted,
         {"--force", "P/G/Item"},
         "P/G/Other  /system/bin/Other note /tmp/scene/order report G 100 1 two\n"},
        {"what a group's command comes to between items",
         kPathCases.at(4).plan,
         {"--force", "P/G"},
         "P/G/Item   /system/bin/Item note /tmp/scene/order report G 100 0 one\n"
         "P/G/Other  /system/bin/Other note /tmp/scene/order report G 100 1 two\n"},
    };
    for (const ListCase &one : cases) {
        SCOPED_TRACE(one.name);
        Lines arguments = one.arguments;
        arguments.insert(arguments.begin(), {"run", "--list", "--plan", "-"});
        const Ended ended = run_fptest(arguments, one.plan);
        EXPECT_EQ(ended.status, 0) << ended.err;
        EXPECT_EQ(ended.out, one.out);
        EXPECT_FALSE(fs::exists(kPlanFile));
        EXPECT_FALSE(is_there("order"));
    }
}

TEST_F(RunCommand, RunsTheVendorsPrograms)
{
    const std::string path = plan(group_of({{"Item", notes("a")}, {"Other", "report G 100 0 b"}}));
    const std::map<std::string, std::string> suffixes = {{"1", "_ca"}, {"2", "_ca_qsee"}};
    for (const auto &[vendor, suffix] : suffixes) {
        SCOPED_TRACE(vendor);
        set_vendor(vendor);
        support::write_file(device::kLogFile, "");
        const Ended ended = run({"--plan", path, "P/G"});
        EXPECT_EQ(ended.status, 0) << ended.err;
        EXPECT_THAT(lines_of(ended.out).at(0), EndsWith(": 2 items, vendor " + vendor));
        EXPECT_THAT(programs_run(),
                    ElementsAre("/system/bin/Item" + suffix + " " + notes("a"),
                                "/system/bin/Other" + suffix + " report G 100 0 b"));
        EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: passed"));
        EXPECT_EQ(events("run").at(0).at("vendor"), std::stoi(vendor));
        EXPECT_THAT(run_fptest({"run", "--list", "P/G/Other"}).out,
                    "P/G/Other  /system/bin/Other" + suffix + " report G 100 0 b\n");
    }
}

TEST_F(RunCommand, StopsTheVendorsPrograms)
{
    set_vendor("2");
    EXPECT_EQ(run_group({{"Item", kSleeps}, {"Other", kPasses}}, {"--timeout", "0.5"}).status, 1);
    EXPECT_THAT(outcomes(), ElementsAre("Item: timed out", "Other: passed"));
    EXPECT_EQ(read_file(work("signal")), "SIGTERM\n");
}

} // namespace
