// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Running plans: what is sent to the library, what becomes of the items, and what
// is told of it.
#include "fptest_runner.h"
#include "network.h"
#include "support/reports.h"

#include <algorithm>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <nlohmann/json.hpp>
#include <optional>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace fptest_runner;
using device::eventually;
using device::kPlanFile;
using device::kTriggerPort;
using device::Lines;
using device::plan_of;
using device::processes_named;
using device::read_file;
using device::set_vendor;
using device::write_file;
using support::Element;
using support::events_of;
using support::outcomes;
using support::parse_tap;
using support::parse_xml;
using support::Point;
using support::reasons;
using support::Tally;
using support::tally_of_json;
using support::tally_of_junit;
using support::tally_of_tap;
using support::Tap;
using ::testing::Each;
using ::testing::EndsWith;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::StartsWith;

namespace fs = std::filesystem;

namespace
{

using Json = nlohmann::json;

// --- plans ------------------------------------------------------------------------

constexpr char kItemPasses[] = "report G 100 0 fine";

// The group G of these items, each with its arguments.
std::string group_of(const std::vector<device::PlanItem> &items)
{
    return plan_of({{"G", items}});
}

std::string three_that_note()
{
    return group_of({{"Item", "note /tmp/scene/order report G 100 0 one"},
                     {"Other", "note /tmp/scene/order report G 100 0 two"},
                     {"Third", "note /tmp/scene/order report G 100 0 three"}});
}

const std::string kNotedInOrder = "Item\nOther\nThird\n";

// The gatherer's port, taken.
device::Socket take_trigger_port()
{
    device::Socket server(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    sockaddr_in address = device::loopback(kTriggerPort);
    const int on = 1;
    setsockopt(server.get(), SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
    EXPECT_EQ(bind(server.get(), reinterpret_cast<sockaddr *>(&address), sizeof address), 0);
    EXPECT_EQ(listen(server.get(), 1), 0);
    return server;
}

bool module_waits_for_gatherer()
{
    const Lines all = device::listeners();
    return std::ranges::find(all, "00000000:8888") != all.end();
}

class Run : public FptestTest
{
  protected:
    // Runs "fptest run --json FILE" with these; what() is in JSON then.
    static Ended run(std::vector<std::string> arguments)
    {
        return run_fptest(with_json(std::move(arguments)));
    }

    static std::vector<std::string> with_json(std::vector<std::string> arguments)
    {
        arguments.insert(arguments.begin(), {"run", "--json", work("json")});
        return arguments;
    }

    static std::string json()
    {
        return read_file(work("json"));
    }

    // Of those that have been written whole.
    static std::size_t events_so_far(const std::string &kind)
    {
        const std::string text = json();
        return events_of(text.substr(0, text.rfind('\n') + 1), kind).size();
    }
};

// --- the plan ---------------------------------------------------------------------

TEST_F(Run, StoresThePlanThatIsGivenAsItIs)
{
    const std::string text = "<?xml version=\"1.0\"?>\n<P>\n\t<CmdGroup name='G'>\n"
                             "\t\t<Cmd name='Item' args=''/></CmdGroup> </P>\n\n";
    run({"--plan", plan(text), "P/G"});
    EXPECT_EQ(read_file(kPlanFile), text);
}

TEST_F(Run, TakesThePlanFromStandardInput)
{
    const Ended ended = run_fptest({"run", "--plan", "-", "P/G"}, three_that_note());
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(read_file(work("order")), kNotedInOrder);
    EXPECT_THAT(ended.out, StartsWith("<stdin>: 3 items, vendor 0\n"));
}

TEST_F(Run, UsesTheStoredPlanWhereNoneIsGiven)
{
    write_file(kPlanFile, three_that_note());
    const Ended ended = run({"P/G"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(read_file(work("order")), kNotedInOrder);
    EXPECT_THAT(ended.out, StartsWith("/data/vorlane/src1.xml: 3 items, vendor 0\n"));
}

TEST_F(Run, ReplacesAStoredPlanByTheOneGiven)
{
    write_file(kPlanFile, group_of({{"Other", "note /tmp/scene/order"}}) + std::string(3000, ' '));
    EXPECT_EQ(run({"--plan", plan(group_of({{"Item", kItemPasses}})), "P/G"}).status, 0);
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed"));
    EXPECT_EQ(read_file(kPlanFile).find("Other"), std::string::npos);
}

TEST_F(Run, SaysWhatItIsWarnedOfAndGoesOn)
{
    const std::string path = plan(plan_of({{"G", {{"Item", kItemPasses}}}, {"Empty", {}}}));
    const Ended ended = run({"--plan", path, "P/G"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "fptest: the plan has warnings: see fptest check " + path + "\n");
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed"));
    EXPECT_EQ(run_fptest({"run", "--quiet", "--plan", path, "P/G"}).err, "");
}

TEST_F(Run, RunsAStoredPlanAgainWhateverHasBeenReported)
{
    // none of it could be stored by a command
    const std::string text = group_of(
        {{"Item", "report G 100 0 'at 12.30'"}, {"Other", "report-file G 100 0 /tmp/scene/long"}});
    file("long", ":" + std::string(10000, 'd'));
    EXPECT_EQ(run({"--plan", plan(text), "P/G"}).status, 0);
    const Ended ended = run({"P/G/Item"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(ended.err, "");
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed"));
    EXPECT_THAT(read_file(kPlanFile), HasSubstr(":" + std::string(10000, 'd')));
}

TEST_F(Run, RunsByForceWhatIsStoredOfAPlan)
{
    const std::string stored = group_of({{"Item", kItemPasses}}) + "\n";
    const Ended ended = run({"--force", "--plan", plan("::" + stored + ":and more"), "P/G"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed"));
}

// --- what is sent to the library ----------------------------------------------------

TEST_F(Run, RunsAGroupItemByItem)
{
    const Ended ended = run({"--plan", plan(three_that_note()), "P/G"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(ended.err, "");
    EXPECT_THAT(paths_run(), ElementsAre("P/G/Item", "P/G/Other", "P/G/Third"));
    EXPECT_EQ(read_file(work("order")), kNotedInOrder);
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed", "Other: passed", "Third: passed"));
    EXPECT_EQ(without_times(ended.out), work("plan.xml") + ": 3 items, vendor 0\n"
                                                           "G/Item: passed, result 0, T s: one\n"
                                                           "G/Other: passed, result 0, T s: two\n"
                                                           "G/Third: passed, result 0, T s: three\n"
                                                           "3 passed, 0 failed, T s\n");
}

TEST_F(Run, LeavesNoProcessBehind)
{
    EXPECT_EQ(run({"--plan", plan(three_that_note()), "P/G"}).status, 0);
    EXPECT_THAT(processes_named(FPTEST_PROGRAM), IsEmpty());
    EXPECT_THAT(running_items(), IsEmpty());
}

TEST_F(Run, WritesTheModulesLogWhereItIsToldOrNowhere)
{
    Start start;
    start.environment["VR_LOG_FILE"] = std::nullopt;
    start.arguments = {"run", "--quiet", "--plan", plan(three_that_note()), "P/G"};
    Ended ended = run_fptest(start);
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "");
    EXPECT_EQ(ended.err, "");
    start.environment["VR_LOG_FILE"] = work("other");
    start.arguments = {"run", "--log", work("log"), "P/G/Item"};
    EXPECT_EQ(run_fptest(start).status, 0);
    start.arguments.back() = "P/G/Other";
    EXPECT_EQ(run_fptest(start).status, 0);
    EXPECT_THAT(paths_run(work("log")), ElementsAre("P/G/Item", "P/G/Other"));
    EXPECT_FALSE(is_there("other"));
}

TEST_F(Run, DoesWithoutStandardStreams)
{
    const std::string command = "fptest run --json " + work("json") + " --plan " +
                                plan(group_of({{"Item", "say x report G 100 0 y"}})) + " P/G";
    for (const std::string closed : {" <&- >&- 2>&-", " >&-", " <&-", " 2>&-"}) {
        SCOPED_TRACE(closed);
        EXPECT_EQ(run_program({"/system/bin/sh", "-c", command + closed}).status, 0);
        EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed"));
        EXPECT_EQ(events_of(json(), "end").at(0).at("output"), "x\n");
    }
}

TEST_F(Run, RunsAGroupByOneCommandWhereThatIsWanted)
{
    const Ended ended = run({"--as-group", "--plan", plan(three_that_note()), "P/G"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(paths_run(), ElementsAre("P/G"));
    EXPECT_EQ(read_file(work("order")), kNotedInOrder);
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed", "Other: passed", "Third: passed"));
}

TEST_F(Run, RunsTheOneItemThatIsNamed)
{
    const Ended ended = run({"--plan", plan(three_that_note()), "any root/G/Other"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(paths_run(), ElementsAre("any root/G/Other"));
    EXPECT_EQ(read_file(work("order")), "Other\n");
}

TEST_F(Run, RunsSeveralPathsInTheOrderGiven)
{
    const std::string text = plan_of({{"A", {{"Item", "note /tmp/scene/order report A 100 0 a"}}},
                                      {"B",
                                       {{"Other", "note /tmp/scene/order report B 100 0 b"},
                                        {"Third", "note /tmp/scene/order report B 100 0 c"}}}});
    EXPECT_EQ(run({"--plan", plan(text), "P/B/Third", "P/A", "P/B"}).status, 0);
    EXPECT_EQ(read_file(work("order")), "Third\nItem\nOther\nThird\n");
    EXPECT_THAT(outcomes(json()),
                ElementsAre("Third: passed", "Item: passed", "Other: passed", "Third: passed"));
}

// An event's time of day, as its text compares.
std::string time_of(const Json &event)
{
    return event.at("start");
}

TEST_F(Run, KnowsEachItemsStartAndDuration)
{
    for (const std::string way : {"", "--as-group"}) {
        SCOPED_TRACE(way);
        const std::string path = plan(group_of({{"Item", "sleep 0.3 report G 100 0 a"},
                                                {"Other", "report G 100 0 b"},
                                                {"Third", "sleep 0.2 report G 100 0 c"}}));
        run(way.empty() ? Lines{"--plan", path, "P/G"} : Lines{way, "--plan", path, "P/G"});

        Lines order;
        for (const Json &event : events_of(json())) {
            const std::string kind = event.at("event");
            if (kind == "start" || kind == "end") {
                order.push_back(kind + " " + std::to_string(event.at("index").get<int>()));
            }
        }
        EXPECT_THAT(order, ElementsAre("start 0", "end 0", "start 1", "end 1", "start 2", "end 2"));
        const auto ends = events_of(json(), "end");
        ASSERT_THAT(ends, SizeIs(3));
        EXPECT_GE(ends[0].at("seconds"), 0.3);
        EXPECT_GE(ends[2].at("seconds"), 0.2);
        EXPECT_LT(time_of(ends[0]), time_of(ends[1]));
        EXPECT_LE(time_of(ends[1]), time_of(ends[2]));
        const auto starts = events_of(json(), "start");
        EXPECT_EQ(time_of(starts.at(1)), time_of(ends[1]));
        const double all = events_of(json(), "finish").at(0).at("seconds");
        EXPECT_GE(all, 0.5);
    }
}

TEST_F(Run, ShowsProgressWhileAnItemRuns)
{
    FptestProcess fptest(with_json(
        {"--plan",
         plan(group_of({{"Item", "report G 30 -2 begun await /tmp/scene/go report G 100 0 x"}})),
         "P/G"}));
    ASSERT_TRUE(eventually([] { return events_so_far("progress") == 1; }, 30));
    const Json progress = events_of(json(), "progress")[0];
    EXPECT_EQ(progress.at("progress"), "30");
    EXPECT_EQ(progress.at("result"), "-2");
    EXPECT_EQ(progress.at("description"), "begun");
    EXPECT_THAT(events_of(json(), "end"), IsEmpty());
    file("go", "");
    EXPECT_EQ(fptest.wait().status, 0);
}

TEST_F(Run, AsksTheModuleForNothingWhileACommandRuns)
{
    FptestProcess fptest(with_json(
        {"--plan",
         plan(group_of({{"Item", "report G 30 -2 a sleep 0.1 report G 60 -2 b sleep 0.1 "
                                 "note /tmp/scene/half await /tmp/scene/go report G 100 0 x"}})),
         "P/G"}));
    ASSERT_TRUE(eventually([] { return events_so_far("progress") > 1; }, 30));
    ASSERT_TRUE(wait_for_file("half"));
    const std::string log = read_file(device::kLogFile);
    const std::string since = log.substr(log.find("Input cmdline : P/G/Item"));
    EXPECT_EQ(since.find("FPTEST_ExtractResultMsg"), since.npos) << since;
    EXPECT_EQ(since.find("FPTEST_RunTestCmd"), since.npos) << since;
    EXPECT_EQ(since.find("FPTEST_SuspendItemExecute"), since.npos) << since;
    file("go", "");
    EXPECT_EQ(fptest.wait().status, 0);
}

TEST_F(Run, TellsItemsOfOneNameInTwoGroupsApart)
{
    const std::string text = plan_of(
        {{"A", {{"Item", "report A 100 0 of-a"}}}, {"B", {{"Item", "report B 100 1 of-b"}}}});
    EXPECT_EQ(run({"--plan", plan(text), "P/B", "P/A"}).status, 1);
    EXPECT_THAT(paths_run(), ElementsAre("P/B/Item", "P/A/Item"));
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: failed", "Item: passed"));
    EXPECT_EQ(events_of(json(), "end").at(0).at("description"), "of-b");
    EXPECT_EQ(events_of(json(), "end").at(1).at("description"), "of-a");
}

// A comment in the group: the library counts it, and every name leads one after
// its item.
const std::string kShifted =
    "<P><CmdGroup name=\"G\"><!-- about it -->"
    "<Cmd name=\"Item\" args=\"note /tmp/scene/order report G 100 0 one\"/>"
    "<Cmd name=\"Other\" args=\"note /tmp/scene/order report G 100 1 two\"/>"
    "<Cmd name=\"Third\" args=\"note /tmp/scene/order report G 100 0 three\"/>"
    "</CmdGroup></P>";

TEST_F(Run, RunsAGroupInWhichNamesLeadElsewhereByOneCommand)
{
    const Ended ended = run({"--force", "--plan", plan(kShifted), "P/G"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(paths_run(), ElementsAre("P/G"));
    EXPECT_EQ(read_file(work("order")), kNotedInOrder);
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed", "Other: failed", "Third: passed"));
    EXPECT_EQ(ended.err,
              "fptest: the plan has errors: see fptest check " + work("plan.xml") + "\n");
}

TEST_F(Run, KnowsWhatAGroupsCommandComesToBetweenItems)
{
    const std::string text =
        "<P><CmdGroup name=\"G\">"
        "<Cmd name=\"Item\" args=\"note /tmp/scene/order report G 100 0 one\"/><!-- about it -->"
        "<Cmd args=\"nobody\"/>"
        "<Cmd name=\"Other\" args=\"note /tmp/scene/order report G 100 1 two\"/>"
        "</CmdGroup></P>";
    EXPECT_EQ(run_fptest({"run", "--list", "--force", "--plan", plan(text), "P/G"}).out,
              "P/G/Item   /system/bin/Item note /tmp/scene/order report G 100 0 one\n"
              "P/G/Other  /system/bin/Other note /tmp/scene/order report G 100 1 two\n");
    EXPECT_EQ(run({"--force", "--plan", plan(text), "P/G"}).status, 1);
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed", "Other: failed"));
    const auto ends = events_of(json(), "end");
    EXPECT_EQ(ends.at(0).at("description"), "one");
    EXPECT_EQ(ends.at(1).at("description"), "two");
}

TEST_F(Run, LeavesNamesToTheShellThatItReadsAsItsOwn)
{
    const std::string text = group_of({{"$(echo Item)", "note /tmp/scene/order"}});
    const Ended ended = run({"--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 1) << ended.err;
    EXPECT_EQ(read_file(work("order")), "Item\n") << json() << read_file(device::kLogFile);
    EXPECT_THAT(outcomes(json()), ElementsAre("$(echo Item): no result"));
    EXPECT_THAT(reasons(json()), ElementsAre("ended without reporting a result"));
}

TEST_F(Run, CreditsTheItemThatReallyRanAndNotTheOneNamed)
{
    const Ended ended = run({"--force", "--plan", plan(kShifted), "P/G/Item"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(paths_run(), ElementsAre("P/G/Item"));
    EXPECT_EQ(read_file(work("order")), "Other\n");
    EXPECT_THAT(outcomes(json()), ElementsAre("Other: failed"));
}

TEST_F(Run, RunsByForceWhatTheModuleTakesForAnUnknownItem)
{
    // it is found in the group after it, and its place there taken in this one
    const std::string text =
        plan_of({{"A", {{"Item", "report A 100 0 x"}}}, {"B", {{"Other", "report B 100 0 x"}}}});
    EXPECT_EQ(run({"--force", "--plan", plan(text), "P/A/Other"}).status, 0);
    EXPECT_THAT(paths_run(), ElementsAre("P/A/Other"));
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed"));
    EXPECT_THAT(programs_run(), ElementsAre("/system/bin/Item report A 100 0 x"));
}

TEST_F(Run, RunsAGroupWithANameTwiceByOneCommand)
{
    const std::string text =
        group_of({{"Item", "note /tmp/scene/order report G 100 0 first"},
                  {"Item", "note /tmp/scene/order sleep 1 report G 100 0 second"}});
    EXPECT_EQ(run({"--force", "--plan", plan(text), "P/G"}).status, 1);
    EXPECT_THAT(paths_run(), ElementsAre("P/G"));
    EXPECT_EQ(read_file(work("order")), "Item\nItem\n");
    // both have reported for the first one; that the second had not yet is seen
    // while it sleeps
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed", "Item: no result"));
    EXPECT_EQ(events_of(json(), "end").at(0).at("description"), "first");
}

TEST_F(Run, SaysWhereANameLeadsToNothing)
{
    const Ended ended = run({"--force", "--plan", plan(kShifted), "P/G/Third"});
    EXPECT_EQ(ended.status, 2);
    EXPECT_THAT(ended.err, EndsWith("fptest: there is nothing to run: the groups named have no "
                                    "items\n"));
    EXPECT_FALSE(is_there("order"));
}

// --- whose result it is -------------------------------------------------------------

TEST_F(Run, TakesNoResultOfAnEarlierRoundForOneOfThis)
{
    const std::string path = plan(group_of(
        {{"Item", "once /tmp/scene/item report G 100 0 once"},
         {"Other", "report G 100 0 always"},
         {"Third", "$(test -e /tmp/scene/order &amp;&amp; echo crash) note /tmp/scene/order "
                   "report G 100 1 once"}}));
    const Ended ended = run({"--repeat", "2", "--plan", path, "P/G"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(json()),
                ElementsAre("Item: passed", "Other: passed", "Third: failed", "Item: no result",
                            "Other: passed", "Third: no result"));
    EXPECT_THAT(ended.out, HasSubstr("G/Item (round 1): passed"));
    EXPECT_THAT(ended.out, HasSubstr("G/Item (round 2): no result"));
    EXPECT_THAT(ended.out, HasSubstr("2 rounds"));
}

TEST_F(Run, TakesNoResultOfAnEarlierRunForOneOfThis)
{
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        const std::string text = group_of({{"Item", "once /tmp/scene/item report G 100 0 once"},
                                           {"Other", "report G 100 0 always"}});
        fs::remove(work("item"));
        EXPECT_EQ(run({way, "--plan", plan(text), "P/G"}).status, 0);
        EXPECT_EQ(run({way, "P/G"}).status, 1);
        EXPECT_THAT(outcomes(json()), ElementsAre("Item: no result", "Other: passed"));
        const Json end = events_of(json(), "end").at(0);
        EXPECT_TRUE(end.at("result").is_null()) << end;
        EXPECT_TRUE(end.at("description").is_null()) << end;
    }
}

TEST_F(Run, LeavesTheReportsOfItemsThatItDoesNotRun)
{
    EXPECT_EQ(run({"--plan", plan(three_that_note()), "P/G"}).status, 0);
    EXPECT_EQ(run({"P/G/Other"}).status, 0);
    const std::string table = run_fptest({"show"}).out;
    EXPECT_THAT(table, HasSubstr("one"));
    EXPECT_THAT(table, HasSubstr("three"));
}

TEST_F(Run, RunsAnItemTwiceThatIsNamedTwice)
{
    const std::string text =
        group_of({{"Item", "note /tmp/scene/order once /tmp/scene/item report G 100 0 once"}});
    const Ended ended = run({"--plan", plan(text), "P/G/Item", "P/G/Item"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(read_file(work("order")), "Item\nItem\n");
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed", "Item: no result"));
}

TEST_F(Run, TellsAnItemThatCrashesFromOneThatPasses)
{
    const std::string text = group_of(
        {{"Item", "report G 50 -2 half crash"}, {"Other", "crash"}, {"Third", kItemPasses}});
    EXPECT_EQ(run({"--plan", plan(text), "P/G"}).status, 1);
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: failed", "Other: failed", "Third: passed"));
    EXPECT_THAT(reasons(json()), ElementsAre("died by SIGABRT, though it reported the result -2",
                                             "died by SIGABRT", ""));
}

TEST_F(Run, TakesTheCodeThatIsSaidToMeanPassed)
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
        EXPECT_EQ(outcomes(json()), expected);
        EXPECT_EQ(events_of(json(), "run").at(0).at("pass_code"), std::stoi(code));
    }
    EXPECT_EQ(run({"--pass-code", "-2", "P/G/Third"}).status, 0);
    EXPECT_EQ(run({"--pass-code", "1", "P/G/Third"}).status, 1);
}

TEST_F(Run, PrintsNothingQuietlyButWhatDidNotPass)
{
    const std::string path = plan(group_of({{"Item", kItemPasses}, {"Other", "report G 100 1 b"}}));
    Ended ended = run_fptest({"run", "--quiet", "--plan", path, "P/G"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(without_times(ended.out), "G/Other: failed, result 1, T s: b\n");
    ended = run_fptest({"run", "--quiet", "P/G/Item"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "");
    EXPECT_EQ(ended.err, "");
}

// --- items that take too long --------------------------------------------------------

constexpr char kSleeps[] = "tell-signal /tmp/scene/signal report G 10 -2 begun sleep 60";

TEST_F(Run, StopsAnItemThatTakesTooLongThroughTheModule)
{
    const std::string text = group_of({{"Item", kSleeps}, {"Other", kItemPasses}});
    const Ended ended = run({"--timeout", "1", "--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: timed out", "Other: passed"));
    EXPECT_THAT(reasons(json()), ElementsAre("stopped after 1.0 s", ""));
    EXPECT_THAT(processes_stopped(), Not(IsEmpty()));
    EXPECT_EQ(read_file(work("signal")), "SIGTERM\n");
    const Json end = events_of(json(), "end").at(0);
    EXPECT_EQ(end.at("description"), "begun");
    EXPECT_GE(end.at("seconds"), 1.0);
    EXPECT_THAT(without_times(ended.out),
                HasSubstr("G/Item: timed out, result -2, T s: stopped after T s: begun\n"));
    EXPECT_THAT(running_items(), IsEmpty());
}

TEST_F(Run, StopsItemsOfAGroupsCommandOneByOne)
{
    const std::string text = group_of(
        {{"Item", kSleeps}, {"Other", kItemPasses}, {"Third", kSleeps}, {"Fourth", kItemPasses}});
    const Ended ended = run({"--as-group", "--timeout", "1", "--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(paths_run(), ElementsAre("P/G"));
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: timed out", "Other: passed",
                                              "Third: timed out", "Fourth: passed"));
    EXPECT_EQ(read_file(work("signal")), "SIGTERM\nSIGTERM\n");
}

TEST_F(Run, LeavesAnItemAloneThatIsWithinItsTime)
{
    const std::string text =
        group_of({{"Item", "sleep 1.5 report G 100 0 a"}, {"Other", "sleep 1.5 report G 100 0 b"}});
    // a limit for each item and not for all of them
    EXPECT_EQ(run({"--timeout", "2.9", "--plan", plan(text), "P/G"}).status, 0);
    EXPECT_THAT(processes_stopped(), IsEmpty());
    EXPECT_EQ(run({"--as-group", "--timeout", "2.9", "P/G"}).status, 0);
    EXPECT_THAT(processes_stopped(), IsEmpty());
}

// --- items that are scripts ----------------------------------------------------------

// Its argument within quotes for the shell.
std::string script(const std::string &text)
{
    return "'" + text + "'";
}

TEST_F(Run, TakesTheReportsOfAShellScript)
{
    const std::string text =
        group_of({{"Script", script("fptest report G Script --progress 50 --result -2; "
                                    "while ! test -e /tmp/scene/go; do sleep 0.02; done; "
                                    "fptest report G Script --progress 100 --result 0 "
                                    "--description &quot;by a script&quot;")}});
    FptestProcess fptest(with_json({"--plan", plan(text), "P/G"}));
    EXPECT_TRUE(eventually([] { return events_so_far("progress") > 0; }, 30));
    file("go", "");
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(without_times(lines_of(ended.out).at(1)),
              "G/Script: passed, result 0, T s: by a script");
}

TEST_F(Run, StopsAScriptThatIsNotFoundByItsName)
{
    const std::string text =
        group_of({{"Script", script("echo x >/tmp/scene/begun; /system/bin/Third sleep 60; "
                                    "echo x >/tmp/scene/after")},
                  {"Other", kItemPasses}});
    const Ended ended = run({"--timeout", "0.5", "--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    EXPECT_TRUE(is_there("begun"));
    EXPECT_FALSE(is_there("after"));
    EXPECT_THAT(outcomes(json()), ElementsAre("Script: timed out", "Other: passed"));
    EXPECT_THAT(running_items(), IsEmpty());
    EXPECT_LT(ended.seconds, 15);
}

// --- the gatherer --------------------------------------------------------------------

TEST_F(Run, WaitsForTheGatherersReport)
{
    const std::string text = group_of({{"SensorProbe", "--group G --seconds 1"}});
    Ended ended = run({"--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(ended.out, HasSubstr("gathering 1, 64 samples\n"));
    EXPECT_GE(events_of(json(), "end").at(0).at("seconds"), 1.0);
    ASSERT_THAT(processes_named("/system/bin/SensorProbe"), SizeIs(1));
    const pid_t gatherer = processes_named("/system/bin/SensorProbe")[0].pid;

    ended = run({"P/G/SensorProbe"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(ended.out, HasSubstr("gathering 2, 64 samples\n"));
    ASSERT_THAT(processes_named("/system/bin/SensorProbe"), SizeIs(1));
    EXPECT_EQ(processes_named("/system/bin/SensorProbe")[0].pid, gatherer);
}

TEST_F(Run, RunsTheNextItemOfAGroupWhileTheGathererGathers)
{
    const std::string text = group_of({{"SensorProbe", "--group G --seconds 1"},
                                       {"Item", "note /tmp/scene/order report G 100 0 x"}});
    FptestProcess fptest(with_json({"--as-group", "--plan", plan(text), "P/G"}));
    EXPECT_TRUE(wait_for_file("order"));
    EXPECT_EQ(read_file("/data/vorlane/readings.txt"), "");
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(outcomes(json()), ElementsAre("SensorProbe: passed", "Item: passed"));
    EXPECT_THAT(ended.out, HasSubstr("gathering 1, 64 samples\n"));
}

TEST_F(Run, GetsTheGathererToGatherInEveryRound)
{
    const std::string text = group_of({{"SensorProbe", "--group G --seconds 0.1"}});
    const Ended ended = run({"--repeat", "3", "--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    for (const std::string gathering : {"1", "2", "3"}) {
        EXPECT_THAT(ended.out, HasSubstr("gathering " + gathering + ", 64 samples\n"));
    }
}

// Something goes on in the gatherer's place, and connects nowhere.
const std::string kGathererThatNeverComes =
    group_of({{"SensorProbe", "--help; exec sleep 30"}, {"Other", kItemPasses}});

TEST_F(Run, GoesOnWhereTheGathererNeverConnects)
{
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        const Ended ended =
            run({way, "--timeout", "1", "--plan", plan(kGathererThatNeverComes), "P/G"});
        EXPECT_EQ(ended.status, 1);
        EXPECT_THAT(outcomes(json()), ElementsAre("SensorProbe: timed out", "Other: passed"));
        EXPECT_THAT(reasons(json()), ElementsAre(StartsWith("stopped after 1."), ""));
    }
}

TEST_F(Run, GoesOnWhereARunningGathererHangs)
{
    const std::string text =
        group_of({{"SensorProbe", "--group G --seconds 0.1"}, {"Other", kItemPasses}});
    EXPECT_EQ(run({"--plan", plan(text), "P/G"}).status, 0);
    for (const device::Process &process : processes_named("/system/bin/SensorProbe")) {
        kill(process.pid, SIGSTOP);
    }
    EXPECT_EQ(run({"--timeout", "1", "P/G"}).status, 1);
    EXPECT_THAT(outcomes(json()), ElementsAre("SensorProbe: timed out", "Other: passed"));
    for (const device::Process &process : processes_named("/system/bin/SensorProbe")) {
        kill(process.pid, SIGCONT);
    }
}

TEST_F(Run, StopsAGathererThatDoesNotReportInTime)
{
    const std::string text =
        group_of({{"SensorProbe", "--group G --seconds 30"}, {"Other", kItemPasses}});
    EXPECT_EQ(run({"--timeout", "1", "--plan", plan(text), "P/G"}).status, 1);
    EXPECT_THAT(outcomes(json()), ElementsAre("SensorProbe: timed out", "Other: passed"));
    EXPECT_TRUE(eventually([] { return processes_named("/system/bin/SensorProbe").empty(); }));
}

// A gatherer of the test's own that is running already. It reports in steps.
support::Start gatherer_of(Lines words)
{
    words.insert(words.begin(), "/system/bin/SensorProbe");
    return {.arguments = words, .program = "/system/bin/Item"};
}

TEST_F(Run, TakesNoStepOfAGathererForItsEnd)
{
    support::Process gatherer(
        gatherer_of({"gather", "report", "G", "50", "0", "half", "note", "/tmp/scene/half", "await",
                     "/tmp/scene/go", "report", "G", "100", "1", "whole"}));
    EXPECT_TRUE(eventually([] { return !processes_named("/system/bin/SensorProbe").empty(); }));
    FptestProcess fptest(with_json(
        {"--plan", plan(group_of({{"SensorProbe", ""}, {"Item", "note /tmp/scene/next"}})),
         "P/G"}));
    ASSERT_TRUE(eventually([] { return events_so_far("progress") == 1; }, 30));
    EXPECT_THAT(events_of(json(), "end"), IsEmpty());
    file("go", "");
    EXPECT_EQ(fptest.wait().status, 1);
    EXPECT_THAT(outcomes(json()), ElementsAre("SensorProbe: failed", "Item: no result"));
    EXPECT_EQ(events_of(json(), "end").at(0).at("description"), "whole");
    // a stop would take what is left of it for an item
    gatherer.wait();
}

TEST_F(Run, WaitsOnlySoLongForAGatherersReport)
{
    // it reports for a group that there is not
    const std::string text = group_of({{"SensorProbe", "--group H --seconds 0"}});
    const Ended ended = run({"--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_LT(ended.seconds, 25);
    EXPECT_THAT(outcomes(json()), ElementsAre("SensorProbe: no result"));
    EXPECT_THAT(reasons(json()).at(0), StartsWith("no result was reported within "));
}

TEST_F(Run, InterruptsTheWaitForAGatherer)
{
    FptestProcess fptest(with_json({"--plan", plan(kGathererThatNeverComes), "P/G"}));
    EXPECT_TRUE(eventually([] { return module_waits_for_gatherer(); }, 30));
    fptest.signal(SIGINT);
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 130);
    EXPECT_LT(ended.seconds, 15);
    EXPECT_THAT(outcomes(json()), ElementsAre("SensorProbe: stopped", "Other: not run"));
}

// --- vendors -------------------------------------------------------------------------

TEST_F(Run, RunsTheVendorsPrograms)
{
    const std::string path = plan(group_of(
        {{"Item", "note /tmp/scene/order report G 100 0 a"}, {"Other", "report G 100 0 b"}}));
    const std::map<std::string, std::string> suffixes = {{"1", "_ca"}, {"2", "_ca_qsee"}};
    for (const auto &[vendor, suffix] : suffixes) {
        SCOPED_TRACE(vendor);
        set_vendor(vendor);
        write_file(device::kLogFile, "");
        const Ended ended = run({"--plan", path, "P/G"});
        EXPECT_EQ(ended.status, 0) << ended.err;
        EXPECT_THAT(lines_of(ended.out).at(0), EndsWith(": 2 items, vendor " + vendor));
        EXPECT_THAT(
            programs_run(),
            ElementsAre("/system/bin/Item" + suffix + " note /tmp/scene/order report G 100 0 a",
                        "/system/bin/Other" + suffix + " report G 100 0 b"));
        EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed", "Other: passed"));
        EXPECT_EQ(events_of(json(), "run").at(0).at("vendor"), std::stoi(vendor));
        EXPECT_THAT(run_fptest({"run", "--list", "P/G/Other"}).out,
                    "P/G/Other  /system/bin/Other" + suffix + " report G 100 0 b\n");
    }
}

TEST_F(Run, StopsTheVendorsPrograms)
{
    set_vendor("2");
    const std::string text = group_of({{"Item", kSleeps}, {"Other", kItemPasses}});
    EXPECT_EQ(run({"--timeout", "1", "--plan", plan(text), "P/G"}).status, 1);
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: timed out", "Other: passed"));
    EXPECT_EQ(read_file(work("signal")), "SIGTERM\n");
}

TEST_F(Run, TriggersTheFirstVendorsGatherer)
{
    set_vendor("1");
    const std::string text = group_of({{"SensorProbe", "--group G --seconds 0.1"}});
    const Ended ended = run({"--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(processes_named("/system/bin/SensorProbe_ca"), SizeIs(1));
    EXPECT_THAT(ended.out, HasSubstr("gathering 1, 64 samples\n"));
}

TEST_F(Run, TakesTheSecondVendorsGathererForAnyOtherItem)
{
    set_vendor("2");
    const device::Socket taken = take_trigger_port();
    const std::string text = group_of({{"SensorProbe", "--group G --seconds 0.1"}});
    const Ended ended = run({"--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(running_items(), IsEmpty());
}

// --- what would be run ---------------------------------------------------------------

TEST_F(Run, ListsWhatWouldBeRunAndLeavesEverythingAsItIs)
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

TEST_F(Run, ListsAllUnderThePlansOwnName)
{
    const std::string group = "<CmdGroup name=\"G\"><Cmd name=\"Item\" args=\"\"/></CmdGroup>";
    const std::string head = "<?xml version=\"1.0\"?>\n<!-- a plan -->\n";
    EXPECT_EQ(run_fptest({"run", "--list", "--plan", "-"},
                         head + "<TestPlan name=\"demo\">" + group + "</TestPlan>")
                  .out,
              "demo/G/Item  /system/bin/Item \n");
    EXPECT_EQ(
        run_fptest({"run", "--list", "--plan", "-"}, head + "<Tests>" + group + "</Tests>").out,
        "Tests/G/Item  /system/bin/Item \n");
}

TEST_F(Run, ListsCommandLinesAsFarAsTheyAreRun)
{
    const std::string text = group_of({{"Item", std::string(1100, 'a')}});
    const std::string line = "/system/bin/Item " + std::string(1100, 'a');
    EXPECT_EQ(run_fptest({"run", "--list", "--force", "--plan", plan(text)}).out,
              "P/G/Item  " + line.substr(0, 1024) + "\n");
}

TEST_F(Run, ListsThePathsThatAreNamedOnly)
{
    write_file(kPlanFile,
               plan_of({{"A", {{"Item", "x"}, {"Third", "y"}}}, {"B", {{"Other", ""}}}}));
    EXPECT_EQ(run_fptest({"run", "--list", "my/B", "my/A/Third"}).out,
              "my/B/Other  /system/bin/Other \n"
              "my/A/Third  /system/bin/Third y\n");
}

TEST_F(Run, ListsWithoutAStoredPlanAndStoresNone)
{
    EXPECT_EQ(run_fptest({"run", "--list", "--plan", plan(three_that_note()), "P/G"}).status, 0);
    EXPECT_FALSE(fs::exists(kPlanFile));
    EXPECT_FALSE(is_there("order"));
}

TEST_F(Run, ListsWhatAShiftedNameReallyRuns)
{
    const Ended ended =
        run_fptest({"run", "--list", "--force", "--plan", plan(kShifted), "P/G/Item"});
    EXPECT_EQ(ended.out, "P/G/Other  /system/bin/Other note /tmp/scene/order report G 100 1 two\n");
}

// --- the reports ---------------------------------------------------------------------

// One of each kind of end.
const std::string kOneOfEach = plan_of(
    {{"A #1", {{"Item", "report 'A #1' 100 0 fine"}, {"Other", "report 'A #1' 100 1 bad"}}},
     {"B", {{"Third", "say nothing"}, {"Stubborn", "sleep 60"}, {"Fourth", "report B 100 0 x"}}}});

TEST_F(Run, TellsTheSameCountsInEveryReport)
{
    const Ended ended =
        run_fptest({"run", "--tap", "--junit", work("junit"), "--json", work("json"), "--timeout",
                    "1", "--plan", plan(kOneOfEach), "P/A #1", "P/B"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(tally_of_json(json()), (Tally{2, 3, 0}));
    EXPECT_EQ(tally_of_junit(read_file(work("junit"))), (Tally{2, 3, 0}));
    EXPECT_EQ(tally_of_tap(ended.out), (Tally{2, 3, 0}));
    EXPECT_EQ(parse_tap(ended.out).version, "14");
    EXPECT_EQ(parse_tap(ended.out).points.at(0).name, "A #1");
    EXPECT_EQ(parse_tap(ended.out).points.at(1).name, "B");
    EXPECT_EQ(parse_tap(ended.out).points.at(1).inside.at(1).name, "Stubborn");
    EXPECT_FALSE(parse_tap(ended.out).bail_out);
    EXPECT_EQ(events_of(json(), "finish").at(0).at("finished"), true);
    for (const Element &suite : parse_xml(read_file(work("junit"))).all("testsuite")) {
        EXPECT_EQ(suite.properties()["finished"], "true");
    }
}

TEST_F(Run, WritesJsonToStandardOutputInPlaceOfTheView)
{
    const Ended ended =
        run_fptest({"run", "--json", "-", "--plan", plan(three_that_note()), "P/G"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(tally_of_json(ended.out), (Tally{3, 0, 0}));
}

TEST_F(Run, IsATestForProve)
{
    const std::string text =
        plan_of({{"G", {{"Item", kItemPasses}}}, {"Bad", {{"Other", "report Bad 100 1 x"}}}});
    write_file(kPlanFile, text);
    Ended ended = run_program({"/usr/bin/prove", "--exec", "/system/bin/fptest run --tap", "P/G"});
    EXPECT_EQ(ended.status, 0) << ended.out;
    EXPECT_THAT(ended.out, HasSubstr("Result: PASS")) << ended.out;
    ended =
        run_program({"/usr/bin/prove", "--exec", "/system/bin/fptest run --tap", "P/G", "P/Bad"});
    EXPECT_EQ(ended.status, 1) << ended.out;
    EXPECT_THAT(ended.out, HasSubstr("Files=2, Tests=2"));
    EXPECT_THAT(ended.out, HasSubstr("Result: FAIL"));
}

TEST_F(Run, WritesTapThatProveReads)
{
    Start start;
    start.environment["HARNESS_ACTIVE"] = "1";
    start.arguments = {"run", "--tap", "--plan", plan(three_that_note()), "P/G"};
    Ended ended = run_fptest(start);
    EXPECT_EQ(ended.status, 0) << ended.err;
    Ended finished = support::prove(file("tap", ended.out));
    EXPECT_EQ(finished.status, 0) << finished.out;
    EXPECT_THAT(finished.out, HasSubstr("All tests successful."));

    start.arguments = {"run", "--tap", "--plan", plan(group_of({{"Item", "report G 100 1 x"}})),
                       "P/G"};
    ended = run_fptest(start);
    EXPECT_EQ(ended.status, 1);
    finished = support::prove(file("tap", ended.out));
    EXPECT_EQ(finished.status, 1) << finished.out;
    EXPECT_THAT(finished.out, HasSubstr("Failed test:  1"));
}

struct Hostile {
    std::string name;
    std::string bytes;
    std::string shown; // what must be in every report
};

std::string hundred_times(const std::string &text)
{
    std::string all;
    for (int at = 0; at < 100; ++at) {
        all += text;
    }
    return all;
}

const std::vector<Hostile> kHostile = {
    {"ControlBytes",
     "a\x01"
     "b\x1b[2Jc\x7f",
     "a␁b␛[2Jc␡"},
    {"InvalidUtf8", "a\xff\xc3(\xed\xa0\x80z", ""},
    {"EndOfCdata", "]]>", "]]>"},
    {"TenThousandCharacters", hundred_times(hundred_times("x")), hundred_times(hundred_times("x"))},
    {"Markup", "<a b='c'>&amp;\"</a>", "<a b='c'>&amp;\"</a>"},
    {"Tap", "# SKIP \\ x # TODO", "# SKIP \\ x # TODO"},
    {"LineFeeds", "one\ntwo\nBail out!", "one\ntwo\nBail out!"},
};

class HostileDescription : public Run, public ::testing::WithParamInterface<Hostile>
{
};

TEST_P(HostileDescription, IsTheSameInEveryReport)
{
    const auto &[name, bytes, shown] = GetParam();
    file("description", bytes);
    const std::string text =
        group_of({{"Item", "report-file G 100 1 /tmp/scene/description say '#' "
                           "complain-file /tmp/scene/description"}});
    const Ended ended = run_fptest({"run", "--tap", "--junit", work("junit"), "--json",
                                    work("json"), "--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 1) << ended.err;
    EXPECT_EQ(tally_of_json(json()), (Tally{0, 1, 0}));
    EXPECT_EQ(tally_of_junit(read_file(work("junit"))), (Tally{0, 1, 0}));
    EXPECT_EQ(tally_of_tap(ended.out), (Tally{0, 1, 0}));

    const std::string in_json = events_of(json(), "end").at(0).at("description");
    const auto junit = parse_xml(read_file(work("junit")));
    auto test = junit.children.at(0).all("testcase").at(0);
    EXPECT_EQ(test.properties()["description"], in_json);
    EXPECT_EQ(parse_tap(ended.out).points.at(0).inside.at(0).diagnosis.at("description"), in_json);
    if (shown.empty()) {
        EXPECT_THAT(in_json, StartsWith("a�"));
        EXPECT_THAT(in_json, EndsWith("z"));
    } else {
        EXPECT_EQ(in_json, shown);
    }
    EXPECT_EQ(test.all("system-out").at(0).text, "#\n" + in_json + "\n");
    EXPECT_EQ(events_of(json(), "end").at(0).at("output"), "#\n" + in_json + "\n");
}

INSTANTIATE_TEST_SUITE_P(, HostileDescription, ::testing::ValuesIn(kHostile),
                         [](const auto &hostile) { return hostile.param.name; });

TEST_F(Run, MendsAPlanThatAReportMadeUnloadableForTheNextItem)
{
    const std::string text =
        group_of({{"Item", "report G 100 0 one"},
                  {"Other", "report G 50 7 odd"}, // an attribute without a value
                  {"Third", "report G 100 0 three"}});
    const Ended ended = run({"--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed", "Other: failed", "Third: passed"));
    EXPECT_EQ(reasons(json()).at(1),
              "reported a result that is none of 0, 1 and -2: the plan has no text for it");
    EXPECT_EQ(events_of(json(), "end").at(1).at("description"), "odd");
    EXPECT_THAT(without_times(ended.out), HasSubstr("G/Other: failed, result ?, T s: odd\n"));
}

// --- what items print ------------------------------------------------------------------

TEST_F(Run, KeepsWhatItemsPrintForTheReports)
{
    const std::string text =
        group_of({{"Item", "say out complain err report G 100 0 fine"}, {"Other", kItemPasses}});
    const Ended ended = run_fptest(
        {"run", "--junit", work("junit"), "--json", work("json"), "--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(without_times(ended.out), work("plan.xml") + ": 2 items, vendor 0\n"
                                                           "G/Item: passed, result 0, T s: fine\n"
                                                           "G/Other: passed, result 0, T s: fine\n"
                                                           "2 passed, 0 failed, T s\n");
    const auto ends = events_of(json(), "end");
    EXPECT_EQ(ends.at(0).at("output"), "out\nerr\n");
    EXPECT_EQ(ends.at(1).at("output"), "");
    const auto tests = parse_xml(read_file(work("junit"))).children.at(0).all("testcase");
    EXPECT_EQ(tests.at(0).all("system-out").at(0).text, "out\nerr\n");
    EXPECT_THAT(tests.at(1).all("system-out"), IsEmpty());
}

TEST_F(Run, KeepsApartWhatItemsPrintThoughItComesLate)
{
    const std::string text = group_of(
        {{"Item", "say one note /tmp/scene/begun await /tmp/scene/go report G 100 0 x complain 1"},
         {"Other", "say two report G 100 0 x"},
         {"Third", "say three report G 100 0 x"},
         {"Fourth", "say four note /tmp/scene/last await /tmp/scene/end report G 100 0 x"}});
    FptestProcess fptest(with_json({"--as-group", "--plan", plan(text), "P/G"}));
    ASSERT_TRUE(wait_for_file("begun"));
    fptest.signal(SIGSTOP);
    file("go", "");
    ASSERT_TRUE(eventually([] { return running_items().empty(); }, 30));
    fptest.signal(SIGCONT);
    ASSERT_TRUE(wait_for_file("last"));
    file("end", "");
    EXPECT_EQ(fptest.wait().status, 0);
    Lines outputs;
    for (const Json &end : events_of(json(), "end")) {
        outputs.push_back(end.at("output"));
    }
    EXPECT_THAT(outputs, ElementsAre("one\n1\n", "two\n", "three\n", "four\n"));
}

TEST_F(Run, LetsNothingThatItemsPrintIntoTheTap)
{
    const std::string text = group_of(
        {{"Item", "say 'ok 1 - faked' say '1..7' complain 'Bail out!' report G 100 0 fine"},
         {"Other", "say 'not ok 2 - faked' report G 100 1 bad"}});
    const Ended ended = run_fptest({"run", "--tap", "--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(tally_of_tap(ended.out), (Tally{1, 1, 0}));
    EXPECT_EQ(ended.out.find("faked"), std::string::npos) << ended.out;
    EXPECT_EQ(ended.out.find("Bail out!"), std::string::npos) << ended.out;
}

// The memory that a process holds in a file without a name, in bytes.
long long memory_behind(const std::string &descriptor)
{
    struct stat status {
    };
    EXPECT_EQ(stat(descriptor.c_str(), &status), 0) << descriptor;
    return status.st_blocks * 512LL;
}

TEST_F(Run, KeepsTheEndOfALongOutput)
{
    const std::string text = group_of(
        {{"Item", "flood 1000000 say 'the last line' report G 100 1 x"}, {"Other", "say short"}});
    EXPECT_EQ(run({"--plan", plan(text), "P/G"}).status, 1);
    const auto ends = events_of(json(), "end");
    const std::string output = ends.at(0).at("output");
    EXPECT_THAT(output, EndsWith("\nthe last line\n"));
    EXPECT_GE(output.size(), 10000U);
    EXPECT_LE(output.size(), 65536U);
    EXPECT_EQ(ends.at(1).at("output"), "short\n");
}

TEST_F(Run, HoldsNoMoreOfAnOutputThanItTells)
{
    const std::string text =
        group_of({{"Item", "flood 60000000 say end note /tmp/scene/printed await /tmp/scene/go"}});
    FptestProcess fptest(with_json({"--plan", plan(text), "P/G"}));
    ASSERT_TRUE(wait_for_file("printed"));
    const std::string output = "/proc/" + std::to_string(fptest.module()) + "/fd/1";
    EXPECT_TRUE(eventually([&] { return memory_behind(output) < 1000000; }))
        << memory_behind(output);
    const std::string highest = device::status_field(fptest.pid(), "VmHWM");
    EXPECT_LT(std::stol(highest), 50000) << highest;
    file("go", "");
    EXPECT_EQ(fptest.wait().status, 1);
    EXPECT_THAT(events_of(json(), "end").at(0).at("output").get<std::string>(), EndsWith("end\n"));
}

TEST_F(Run, StartsItemsAsAnyProgramIsStarted)
{
    const std::string text =
        group_of({{"Item", "note /tmp/scene/begun await /tmp/scene/go report G 100 0 x"}});
    FptestProcess fptest(with_json({"--junit", work("junit"), "--plan", plan(text), "P/G"}));
    ASSERT_TRUE(wait_for_file("begun"));
    const pid_t item = processes_named("/system/bin/Item").at(0).pid;
    EXPECT_EQ(std::stoull(device::status_field(item, "SigBlk"), nullptr, 16), 0U);
    // the C library's own after the usual ones are the caller's
    EXPECT_EQ(std::stoull(device::status_field(item, "SigIgn"), nullptr, 16) & 0x7fffffffU, 0U);
    EXPECT_NE(getpgid(item), getpgid(fptest.pid())) << "Ctrl-C would reach it";
    // of those that the library leaves open, and of nothing else
    for (const auto &entry : fs::directory_iterator("/proc/" + std::to_string(item) + "/fd")) {
        const std::string name = entry.path().filename();
        const std::string target = fs::read_symlink(entry.path());
        if (name == "0") {
            EXPECT_EQ(target, "/dev/null");
        } else if (name == "1" || name == "2") {
            EXPECT_EQ(target, "/memfd:fptest-output (deleted)");
        } else {
            EXPECT_TRUE(target == kPlanFile || target == device::kLogFile ||
                        target == std::string(kPlanFile) + " (deleted)")
                << target;
        }
    }
    file("go", "");
    EXPECT_EQ(fptest.wait().status, 0);
}

TEST_F(Run, GivesItemsNoInput)
{
    const std::string text = group_of({{"Item", "count-input report G 100 0 x"}});
    Start start;
    start.arguments = with_json({"--plan", plan(text), "P/G"});
    start.input = "for somebody else\n";
    EXPECT_EQ(run_fptest(start).status, 0);
    EXPECT_EQ(events_of(json(), "end").at(0).at("output"), "0 bytes of input\n");
}

// --- interrupted ---------------------------------------------------------------------

class Interrupted : public Run, public ::testing::WithParamInterface<int>
{
  protected:
    static std::string name()
    {
        return GetParam() == SIGINT ? "Ctrl-C" : GetParam() == SIGTERM ? "SIGTERM" : "SIGHUP";
    }
};

TEST_P(Interrupted, StopsTheItemAndMarksTheRest)
{
    const std::string text = group_of({{"Item", kItemPasses},
                                       {"Other", std::string("note /tmp/scene/begun ") + kSleeps},
                                       {"Third", "note /tmp/scene/after"},
                                       {"Fourth", "note /tmp/scene/after"}});
    FptestProcess fptest({"run", "--tap", "--junit", work("junit"), "--json", work("json"),
                          "--plan", plan(text), "P/G", "P/G/Item"});
    ASSERT_TRUE(eventually([] { return events_so_far("progress") == 2; }, 30));
    fptest.signal(GetParam());
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 130);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(read_file(work("signal")), "SIGTERM\n");
    EXPECT_THAT(processes_stopped(), Not(IsEmpty()));
    EXPECT_FALSE(is_there("after"));
    EXPECT_THAT(paths_run(), ElementsAre("P/G/Item", "P/G/Other"));

    const std::string reason = "interrupted by " + name();
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed", "Other: stopped", "Third: not run",
                                              "Fourth: not run", "Item: not run"));
    EXPECT_THAT(reasons(json()), ElementsAre("", "stopped by " + name(), reason, reason, reason));
    const Json finish = events_of(json(), "finish").at(0);
    EXPECT_EQ(finish.at("finished"), false);
    EXPECT_EQ(finish.at("reason"), reason);
    EXPECT_EQ(tally_of_json(json()), (Tally{1, 1, 3}));

    const std::string junit = read_file(work("junit"));
    EXPECT_EQ(tally_of_junit(junit), (Tally{1, 1, 3}));
    // what a break has kept from being run is no success
    EXPECT_EQ(parse_xml(junit).attributes.at("skipped"), "0");
    for (const Element &suite : parse_xml(junit).all("testsuite")) {
        EXPECT_EQ(suite.properties()["finished"], "false");
        for (const Element &test : suite.all("testcase")) {
            for (const Element &skipped : test.all("skipped")) {
                EXPECT_EQ(skipped.attributes.at("message"), reason);
            }
        }
    }

    EXPECT_EQ(tally_of_tap(ended.out), (Tally{1, 1, 3}));
    const Tap tap = parse_tap(ended.out);
    EXPECT_EQ(tap.bail_out, reason);
    for (const Point &suite : tap.points) {
        for (const Point &point : suite.inside) {
            if (point.skipped) {
                EXPECT_EQ(point.skipped, "not run: " + reason);
            }
        }
    }
}

TEST_P(Interrupted, SaysSoInTheView)
{
    FptestProcess fptest(
        with_json({"--plan", plan(group_of({{"Item", kSleeps}, {"Other", kItemPasses}})), "P/G"}));
    ASSERT_TRUE(eventually([] { return events_so_far("progress") == 1; }, 30));
    fptest.signal(GetParam());
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 130);
    EXPECT_EQ(without_times(ended.out), work("plan.xml") +
                                            ": 2 items, vendor 0\n"
                                            "G/Item: stopped, result -2, T s: stopped by " +
                                            name() + ": begun\n" + "not finished: interrupted by " +
                                            name() + "\n0 passed, 1 failed, 1 not run, T s\n");
}

INSTANTIATE_TEST_SUITE_P(, Interrupted, ::testing::Values(SIGINT, SIGTERM, SIGHUP),
                         [](const auto &signal) {
                             return std::string("BySIG") + sigabbrev_np(signal.param);
                         });

TEST_F(Run, RunsNothingWhereItIsInterruptedBefore)
{
    Start start;
    start.prepare = interrupted_before;
    start.arguments = with_json({"--plan", plan(three_that_note()), "P/G"});
    const Ended ended = run_fptest(start);
    EXPECT_EQ(ended.status, 130);
    EXPECT_THAT(paths_run(), IsEmpty());
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: not run", "Other: not run", "Third: not run"));
    EXPECT_THAT(reasons(json()), Each("interrupted by Ctrl-C"));
}

TEST_F(Run, StopsWhatAnInterruptedGroupsCommandStartsNext)
{
    const std::string sleeps = "note /tmp/scene/order tell-signal /tmp/scene/signal sleep 60";
    const std::string text = group_of({{"Item", sleeps}, {"Other", sleeps}, {"Third", sleeps}});
    FptestProcess fptest(with_json({"--as-group", "--plan", plan(text), "P/G", "P/G"}));
    ASSERT_TRUE(wait_for_file("order"));
    fptest.signal(SIGINT);
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 130);
    EXPECT_LT(ended.seconds, 20);
    EXPECT_THAT(paths_run(), ElementsAre("P/G"));
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: stopped", "Other: stopped", "Third: stopped",
                                              "Item: not run", "Other: not run", "Third: not run"));
    EXPECT_THAT(running_items(), IsEmpty());
    EXPECT_THAT(reasons(json()).at(2), "stopped by Ctrl-C");
}

TEST_F(Run, StopsAScriptThatIsInterrupted)
{
    const std::string text =
        group_of({{"Script", script("echo x >/tmp/scene/begun; /system/bin/Third sleep 60; "
                                    "echo x >/tmp/scene/after")}});
    FptestProcess fptest(with_json({"--plan", plan(text), "P/G"}));
    ASSERT_TRUE(wait_for_file("begun"));
    fptest.signal(SIGINT);
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 130);
    EXPECT_THAT(outcomes(json()), ElementsAre("Script: stopped"));
    EXPECT_FALSE(is_there("after"));
    EXPECT_THAT(running_items(), IsEmpty());
}

// Seconds that it takes to end after this signal.
double seconds_to_end(FptestProcess &fptest, int signal)
{
    const auto start = std::chrono::steady_clock::now();
    fptest.signal(signal);
    EXPECT_EQ(fptest.wait().status, 130);
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

TEST_F(Run, LeavesAtOnceWhenInterruptedTwice)
{
    // a stop does not end it, and no second one is needed to leave
    const std::string text = group_of({{"Item", kItemPasses},
                                       {"Stubborn", "ignore-stop note /tmp/scene/begun sleep 60"},
                                       {"Third", "note /tmp/scene/after"}});
    for (const auto &[first, second] :
         {std::pair{SIGINT, SIGINT}, {SIGTERM, SIGTERM}, {SIGINT, SIGTERM}}) {
        SCOPED_TRACE(first + second);
        fs::remove(work("begun"));
        write_file(device::kLogFile, "");
        FptestProcess fptest(with_json({"--junit", work("junit"), "--plan", plan(text), "P/G"}));
        ASSERT_TRUE(wait_for_file("begun"));
        fptest.signal(first);
        ASSERT_TRUE(eventually([] { return !processes_stopped().empty(); }, 30));
        EXPECT_FALSE(fptest.has_ended());
        EXPECT_LT(seconds_to_end(fptest, second), 1);
        EXPECT_EQ(fptest.err(),
                  "\nfptest: interrupted again: exiting now, stopping the running item\n");
        EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed"));
        EXPECT_THAT(events_of(json(), "finish"), IsEmpty());
        const Element junit = parse_xml(read_file(work("junit")));
        EXPECT_EQ(junit.children.at(0).properties()["finished"], "false");
        // it has its item stopped, which would be taken for the next one's first stop
        EXPECT_TRUE(eventually([] { return processes_named(FPTEST_PROGRAM).empty(); }, 20));
        DeviceTest::TearDown();
    }
    EXPECT_FALSE(is_there("after"));
}

TEST_F(Run, StopsWhatRunsAfterItHasLeftAtOnce)
{
    // the first signal is not seen to its end: the second one comes with it
    const std::string text = group_of({{"Item", std::string("note /tmp/scene/begun ") + kSleeps},
                                       {"Other", "note /tmp/scene/after"}});
    FptestProcess fptest(with_json({"--as-group", "--plan", plan(text), "P/G"}));
    ASSERT_TRUE(eventually([] { return events_so_far("progress") == 1; }, 30));
    fptest.signal(SIGINT);
    fptest.signal(SIGTERM);
    EXPECT_EQ(fptest.wait().status, 130);
    expect_items_to_end();
    EXPECT_FALSE(is_there("after"));
}

// --- cut off -------------------------------------------------------------------------

class CutOff : public Run
{
  protected:
    // Ends fptest while its second item runs, and looks at what it leaves behind.
    static void kill_in_mid_run(const device::PlanItem &second, const std::string &way)
    {
        const std::string text = group_of(
            {{"Item", kItemPasses}, second, {"Third", "note /tmp/scene/after"}, {"Fourth", ""}});
        FptestProcess fptest(
            with_json({way, "--junit", work("junit"), "--plan", plan(text), "P/G"}));
        ASSERT_TRUE(wait_for_file("begun"));
        ASSERT_TRUE(eventually([] { return events_so_far("start") == 2; }, 30));
        fptest.signal(SIGKILL);
        EXPECT_EQ(fptest.wait().status, -SIGKILL);

        EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed"));
        EXPECT_THAT(events_of(json(), "finish"), IsEmpty());
        EXPECT_EQ(events_of(json(), "run").at(0).at("items").size(), 4U);
        const std::string junit = read_file(work("junit"));
        const Element suite = parse_xml(junit).children.at(0);
        EXPECT_EQ(Element(suite).properties()["finished"], "false");
        EXPECT_THAT(suite.all("testcase"), SizeIs(4));

        expect_items_to_end();
        EXPECT_FALSE(is_there("after"));
        EXPECT_TRUE(eventually([] { return processes_named(FPTEST_PROGRAM).empty(); }, 20));
    }
};

TEST_F(CutOff, LeavesWhatWasKnownAndNoItemRunning)
{
    kill_in_mid_run({"Other", "note /tmp/scene/begun sleep 60"}, "--quiet");
}

TEST_F(CutOff, LeavesNoItemOfAGroupsCommandRunning)
{
    kill_in_mid_run({"Other", "note /tmp/scene/begun sleep 60"}, "--as-group");
}

TEST_F(CutOff, LeavesNoScriptRunning)
{
    kill_in_mid_run({"Script", script("echo x >/tmp/scene/begun; /system/bin/Third sleep 60")},
                    "--quiet");
}

TEST_F(CutOff, LetsTheNextRunBeginWhenItsItemsHaveEnded)
{
    const std::string text =
        group_of({{"Script", script("echo x >/tmp/scene/begun; /system/bin/Third sleep 60")},
                  {"SensorProbe", "--group G --seconds 0"}});
    FptestProcess fptest({"run", "--plan", plan(text), "P/G"});
    ASSERT_TRUE(wait_for_file("begun"));
    fptest.signal(SIGKILL);
    fptest.wait();
    Ended ended;
    EXPECT_TRUE(eventually([&] {
        ended = run({"P/G/SensorProbe"});
        return ended.status != 3;
    }));
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(outcomes(json()), ElementsAre("SensorProbe: passed"));
}

TEST_F(CutOff, LetsThePortGoThatAGathererWasWaitedForAt)
{
    FptestProcess fptest({"run", "--plan", plan(kGathererThatNeverComes), "P/G"});
    ASSERT_TRUE(eventually([] { return module_waits_for_gatherer(); }, 30));
    fptest.signal(SIGKILL);
    EXPECT_TRUE(eventually([] { return !module_waits_for_gatherer(); }, 20));
    EXPECT_TRUE(eventually([] { return processes_named(FPTEST_PROGRAM).empty(); }, 20));
}

TEST_F(CutOff, LosesTheItemInWhichTheModulesProcessEndedAndNoOther)
{
    const std::string text = group_of({{"Item", kItemPasses},
                                       {"Other", "note /tmp/scene/begun sleep 60"},
                                       {"Third", kItemPasses}});
    FptestProcess fptest({"run", "--tap", "--junit", work("junit"), "--json", work("json"),
                          "--plan", plan(text), "P/G"});
    ASSERT_TRUE(wait_for_file("begun"));
    kill(fptest.module(), SIGKILL);
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed", "Other: no result", "Third: passed"));
    EXPECT_EQ(reasons(json()).at(1), "the library's process ended by signal 9; --log FILE keeps "
                                     "what it says");
    EXPECT_EQ(tally_of_json(json()), (Tally{2, 1, 0}));
    EXPECT_EQ(tally_of_junit(read_file(work("junit"))), (Tally{2, 1, 0}));
    EXPECT_EQ(tally_of_tap(ended.out), (Tally{2, 1, 0}));
    EXPECT_THAT(running_items(), IsEmpty());
}

TEST_F(CutOff, LosesWhatTheModulesProcessWouldHaveComeToInAGroupsCommand)
{
    const std::string text =
        group_of({{"Item", "note /tmp/scene/begun sleep 60"}, {"Other", kItemPasses}});
    FptestProcess fptest(with_json({"--as-group", "--plan", plan(text), "P/G"}));
    ASSERT_TRUE(wait_for_file("begun"));
    kill(fptest.module(), SIGKILL);
    EXPECT_EQ(fptest.wait().status, 1);
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: no result", "Other: no result"));
    EXPECT_EQ(reasons(json()).at(1),
              "the library never reached it: the library's process ended by signal 9; --log FILE "
              "keeps what it says");
}

// --- refused --------------------------------------------------------------------------

class Refusal : public Run
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

    static void expect(int status, const std::string &line,
                       const std::vector<std::string> &arguments)
    {
        Start start;
        start.arguments = arguments;
        start.arguments.insert(start.arguments.begin(), "run");
        expect(status, line, start);
    }
};

const std::string kTwoGroups =
    plan_of({{"Bringup", {{"Item", "note /tmp/scene/order"}, {"Other", ""}}},
             {"Endurance", {{"Third", ""}}}});

TEST_F(Refusal, OfAnUnknownGroupNamesTheNearestAndTheGroupsThereAre)
{
    write_file(kPlanFile, kTwoGroups);
    expect(2,
           "fptest: no group 'Brngup' in /data/vorlane/src1.xml; did you mean 'Bringup'? The "
           "groups are Bringup and Endurance",
           {"P/Brngup"});
    expect(2,
           "fptest: no group 'xyz' in /data/vorlane/src1.xml; the groups are Bringup and Endurance",
           {"P/Bringup", "P/xyz"});
}

TEST_F(Refusal, OfAnUnknownItemNamesTheNearestAndTheItemsThereAre)
{
    const std::string path = plan(kTwoGroups);
    expect(2,
           "fptest: no item 'Itm' in group 'Bringup' of /tmp/scene/plan.xml; did you mean 'Item'? "
           "The items of the group are Item and Other",
           {"--plan", path, "P/Bringup/Itm"});
    // the library would find it in the group after it
    expect(2,
           "fptest: no item 'Third' in group 'Bringup' of /tmp/scene/plan.xml; the items of the "
           "group are Item and Other",
           {"--plan", path, "P/Bringup/Third"});
    EXPECT_FALSE(fs::exists(kPlanFile));
}

TEST_F(Refusal, OfAPathThatIsNone)
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
           "fptest: no PATH given: say what to run, as root/group or root/group/item; the groups "
           "are Bringup and Endurance",
           std::vector<std::string>{});
    expect(2,
           "fptest: 'P/Bring:up' has a ':', a tab or a line feed, at which the library would cut "
           "it: name it without",
           {"P/Bring:up"});
}

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
    EXPECT_EQ(read_file(work("order")), kNotedInOrder);
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

TEST_F(Refusal, WhereADirectoryIsInThePlansPlace)
{
    fs::create_directories(std::string(kPlanFile) + "/full");
    expect(3,
           "fptest: /data/vorlane/src1.xml cannot be read: Is a directory; give a plan with "
           "--plan FILE",
           {"P/G"});
    const std::string text = group_of({{"Item", "note /tmp/scene/order"}});
    expect(3,
           "fptest: the plan was not stored: 0 of " + std::to_string(text.size()) +
               " bytes are in /data/vorlane/src1.xml; make room and store it again",
           {"--plan", plan(text), "P/G"});
}

TEST_F(Refusal, WhereThePlansDirectoryIsNotWritable)
{
    fs::permissions("/data/vorlane", fs::perms::owner_read | fs::perms::owner_exec);
    Start start;
    start.prepare = as_plain_user;
    start.arguments = {"run", "--plan", plan(kTwoGroups), "P/Bringup"};
    expect(3,
           "fptest: /data/vorlane is not writable: Permission denied; make it, or run this as "
           "another user",
           start);
    EXPECT_FALSE(fs::exists(kPlanFile));
}

TEST_F(Refusal, OutsideOfADevice)
{
    if (is_in_place()) {
        GTEST_SKIP() << "in place, /system/bin cannot be hidden from one program";
    }
    Start start;
    start.prepare = without_device;
    start.arguments = {"run", "--plan", plan(kTwoGroups), "P/Bringup"};
    expect(3,
           "fptest: this machine is no device: there is no /system/bin/sh; on a desk, run it as: "
           "device/run -- fptest ...",
           start);
}

TEST_F(Refusal, WhereTheGatherersPortIsTaken)
{
    const device::Socket taken = take_trigger_port();
    const std::string path =
        plan(group_of({{"Item", "note /tmp/scene/order"}, {"SensorProbe", "--group G"}}));
    const std::string line = "fptest: port 34952 is not available: Address already in use; the "
                             "gatherer's run would never "
                             "end: stop what listens there (netstat -ltnp names it)";
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
    const std::string sound = plan(group_of(
        {{"Item", "note /tmp/scene/order"}, {"Nobody", ""}, {"Third", ""}, {"Nothing", ""}}));
    expect(3, "fptest: no program /system/bin/Nobody and /system/bin/Nothing" + advice,
           {"--plan", sound, "P/G"});
    expect(3, "fptest: no program /system/bin/Nobody" + advice,
           {"--plan", sound, "P/G/Item", "P/G/Nobody", "P/G/Nobody"});
    set_vendor("1"); // there are Item_ca and Other_ca alone
    expect(3,
           "fptest: no program /system/bin/Nobody_ca, /system/bin/Third_ca and "
           "/system/bin/Nothing_ca" +
               advice,
           {"--plan", sound, "P/G"});
}

TEST_F(Run, RunsTheRestWhereProgramsAreMissingByForce)
{
    const std::string text = group_of({{"Nobody", ""}, {"Item", kItemPasses}});
    const Ended ended = run({"--force", "--plan", plan(text), "P/G"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(json()), ElementsAre("Nobody: no result", "Item: passed"));
    EXPECT_THAT(reasons(json()), ElementsAre("there is no program /system/bin/Nobody", ""));
}

TEST_F(Refusal, OfAVendorThatRunsNothing)
{
    for (const std::string vendor : {"7", "-1"}) {
        set_vendor(vendor);
        expect(3,
               "fptest: the vendor selector is " + vendor +
                   ", and the library runs nothing then: set device/SysParam/Quillmark/vendor to "
                   "0, 1 or 2 in /etc/vorlane/sysparms/vr_common_cfg.xml",
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

TEST_F(Run, SaysThatAReportCouldNotBeWrittenToItsEnd)
{
    const std::string text = group_of({{"Item", kItemPasses}});
    Start start;
    start.arguments = {"run", "--tap", "--plan", plan(text), "P/G"};
    start.output = "/dev/full";
    const Ended ended = run_fptest(start);
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err, "fptest: the TAP output: No space left on device; nothing was run\n");
}

TEST_F(Run, GoesOnWithoutAReportThatCannotBeWrittenAnyMore)
{
    const std::string fifo = work("fifo");
    ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
    std::optional<device::Socket> reader(std::in_place,
                                         open(fifo.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
    const std::string text =
        group_of({{"Item", "note /tmp/scene/begun await /tmp/scene/go report G 100 0 x"},
                  {"Other", kItemPasses}});
    FptestProcess fptest({"run", "--json", fifo, "--plan", plan(text), "P/G"});
    ASSERT_TRUE(wait_for_file("begun"))
        << fptest.out() << fptest.err() << read_file(device::kLogFile);
    reader.reset();
    file("go", "");
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err, "fptest: /tmp/scene/fifo: Broken pipe; the run went on without it\n");
    EXPECT_THAT(ended.out, HasSubstr("\n2 passed, 0 failed, "));
}

TEST_F(Refusal, OfASecondRunAtTheSameTime)
{
    write_file(kPlanFile, group_of({{"Item", "await /tmp/scene/go report G 100 0 x"}}));
    FptestProcess first({"run", "P/G"});
    ASSERT_TRUE(eventually([] { return !processes_named("/system/bin/Item").empty(); }, 30));
    const std::string stored = read_file(kPlanFile);
    const Ended second = run_fptest({"run", "--plan", plan(kTwoGroups), "P/Bringup"});
    EXPECT_EQ(second.status, 3);
    EXPECT_EQ(second.err, "fptest: another fptest is running a plan on this device: wait for its "
                          "end, or stop it\n");
    EXPECT_EQ(read_file(kPlanFile), stored);
    EXPECT_FALSE(is_there("order"));
    file("go", "");
    EXPECT_EQ(first.wait().status, 0);
    EXPECT_EQ(run_fptest({"run", "P/G"}).status, 0);
}

class FullDisk : public Refusal
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

TEST_F(FullDisk, StoresNoPlan)
{
    fill_disk();
    expect(3,
           "fptest: the disk of /data/vorlane is full: make room for " +
               std::to_string(kTwoGroups.size()) + " bytes; the stored plan is as it was",
           {"--plan", plan(kTwoGroups), "P/Bringup"});
    EXPECT_FALSE(fs::exists(kPlanFile));
}

TEST_F(FullDisk, LeavesTheStoredPlanAsItWas)
{
    const std::string text = group_of({{"Item", "note /tmp/scene/order report G 100 0 new"}});
    std::string reported = text;
    reported.insert(reported.find("/>"), " progress=\"100\" result=\"0\" description=\"old\"");
    write_file(kPlanFile, reported);
    fill_disk();
    expect(3,
           "fptest: /data/vorlane/src1.xml cannot be written: No space left on device; the old "
           "plan is still there",
           {"P/G"});
    EXPECT_EQ(read_file(kPlanFile), reported);
}

TEST_F(FullDisk, StoresAPlanInTheRoomOfTheOldOne)
{
    write_file(kPlanFile, kTwoGroups);
    fill_disk();
    EXPECT_EQ(run({"--plan", plan(three_that_note()), "P/G"}).status, 0);
    EXPECT_THAT(outcomes(json()), ElementsAre("Item: passed", "Other: passed", "Third: passed"));
}

} // namespace
