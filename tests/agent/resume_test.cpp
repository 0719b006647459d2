// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// fptest run --resume: one whole report of a run that was cut off and went on.
#include "gatherer.h"
#include "run_test.h"

#include <csignal>
#include <filesystem>

namespace
{

// Sleeps at its first attempt, until the run is ended there, and passes at the next one.
const std::string kSleepsOnce = "report G 100 0 ok once /tmp/scene/slept sleep 60";

const Items kThreeOfWhichOneSleeps = {
    {"Item", "say first report G 100 1 bad"}, {"Other", kSleepsOnce}, {"Third", kPasses}};

class ResumedRun : public RunCommand
{
  protected:
    // The JSON lines of a run that is ended by a signal where it sleeps.
    static std::string cut_off(const Items &items, int signal, const Lines &options = {})
    {
        FptestProcess fptest(with_group(items, options));
        EXPECT_TRUE(wait_for_file("slept"));
        fptest.signal(signal);
        fptest.wait();
        expect_items_to_end();
        std::filesystem::rename(work("json"), work("before"));
        std::filesystem::remove(device::kLogFile);
        return work("before");
    }
    static Ended resume(const Items &items, Lines options = {})
    {
        options.insert(options.begin(),
                       {"--resume", work("before"), "--plan", plan(group_of(items))});
        return run(std::move(options));
    }
    static void expect_refused(const std::string &line, Lines options = {},
                               const Items &items = kThreeOfWhichOneSleeps)
    {
        SCOPED_TRACE(PrintToString(options));
        options.insert(options.begin(),
                       {"run", "--resume", work("before"), "--plan", plan(group_of(items))});
        expect_refusal(2, "fptest: " + line, options);
    }
};

TEST_F(ResumedRun, HasOneWholeReportAfterAnInterruption)
{
    const std::string before = cut_off(kThreeOfWhichOneSleeps, SIGINT);
    const Json first = support::events_of(read_file(before), "end").at(0);
    const Ended ended = resume(kThreeOfWhichOneSleeps, {"--junit", work("junit")});
    EXPECT_EQ(ended.status, 1) << "as one has failed";
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(without_times(ended.out),
              "/tmp/scene/plan.xml: 3 items, vendor 0, resumed from /tmp/scene/before\n"
              "G/Item: failed, result 1, T s: bad\n"
              "    | first\n"
              "G/Other: passed, result 0, T s: ok\n"
              "G/Third: passed, result 0, T s: fine\n"
              "2 passed, 1 failed, T s\n");
    EXPECT_THAT(paths_run(), ElementsAre("P/G/Other", "P/G/Third"));
    EXPECT_THAT(outcomes(), ElementsAre("Item: failed", "Other: passed", "Third: passed"));
    EXPECT_EQ(end_of(0), first);
    EXPECT_EQ(events("run").at(0).at("resumed"), before);
    const Json finish = events("finish").at(0);
    EXPECT_EQ(finish.at("finished"), true);
    EXPECT_EQ(finish.at("passed"), 2);
    const Element suite = parse_xml(junit()).all("testsuite").at(0);
    EXPECT_EQ(suite.attributes.at("tests"), "3");
    EXPECT_EQ(suite.attributes.at("failures"), "1");
    EXPECT_EQ(suite.properties().at("resumed"), before);
    // what has been completed is complete
    std::filesystem::rename(work("json"), work("before"));
    const Ended again = resume(kThreeOfWhichOneSleeps);
    EXPECT_EQ(again.status, 1) << "a loop until it is 0 would take it for passed";
    EXPECT_EQ(again.err,
              "fptest: " + before + ": that run has finished, with failures: nothing to do\n");
    EXPECT_EQ(again.out, "");
    EXPECT_FALSE(is_there("json"));
    expect_refused(before + " is of another plan: /tmp/scene/plan.xml has other items, or other "
                            "args; run it anew",
                   {}, {{"Item", kPasses}});
}

TEST_F(ResumedRun, LeavesItsOwnReportsInTheStoredPlan)
{
    const Items items = {
        {"Item", "say first report G 100 1 bad"}, {"Third", kPasses}, {"Other", kSleepsOnce}};
    for (const Lines &options : {Lines{}, Lines{"--plan", work("plan.xml")}}) {
        SCOPED_TRACE(PrintToString(options));
        std::filesystem::remove(work("slept"));
        Lines words = {"--resume", cut_off(items, SIGKILL)};
        run_fptest({"report", "G", "Third", "--progress", "7", "--result", "0"});
        words.insert(words.end(), options.begin(), options.end());
        EXPECT_EQ(run(words).status, 1);
        EXPECT_EQ(run_fptest({"show"}).out, "GROUP  ITEM   PROGRESS  RESULT  DESCRIPTION\n"
                                            "G      Item        100       1  bad\n"
                                            "G      Third         -       -  -\n"
                                            "G      Other       100       0  ok\n");
    }
}

TEST_F(ResumedRun, LeavesItsReportsOfEarlierRoundsInTheStoredPlan)
{
    const Items items = {{"Item", kPasses},
                         {"Script", script("test -e /tmp/scene/first &amp;&amp; touch "
                                           "/tmp/scene/slept &amp;&amp; exec sleep 60; touch "
                                           "/tmp/scene/first; " +
                                           script_report("0", "ok"))},
                         {"Third", kPasses}};
    FptestProcess fptest(with_json({"--resume", cut_off(items, SIGINT, {"--repeat", "2"})}));
    ASSERT_TRUE(wait_for_events("start", 5));
    EXPECT_EQ(run_fptest({"show"}).out, "GROUP  ITEM    PROGRESS  RESULT  DESCRIPTION\n"
                                        "G      Item         100       0  fine\n"
                                        "G      Script         -       -  -\n"
                                        "G      Third        100       0  fine\n");
    fptest.signal(SIGINT);
    fptest.wait();
}

TEST_F(ResumedRun, GoesOnAfterTheDeviceHasGoneDown)
{
    const std::string before = cut_off(kThreeOfWhichOneSleeps, SIGKILL);
    std::ofstream(before, std::ios::app) << "{\"event\":\"end\",\"index\":1,\"gro";
    const Ended ended = resume(kThreeOfWhichOneSleeps, {"--tap"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "fptest: " + before + ": its last line is cut, and left out\n");
    EXPECT_THAT(outcomes(), ElementsAre("Item: failed", "Other: passed", "Third: passed"));
    EXPECT_THAT(paths_run(), ElementsAre("P/G/Other", "P/G/Third"));
    const Tap tap = parse_tap(ended.out);
    EXPECT_EQ(tap.points.at(0).inside.size(), 3U);
    EXPECT_THAT(tap.comments, ::testing::Contains("resumed from " + before));
}

// What is known of the run is not lost with the one that was to complete it.
TEST_F(ResumedRun, HasTheEarlierResultsBeforeAnythingElse)
{
    const Items &items = kThreeOfWhichOneSleeps;
    cut_off(items, SIGKILL);
    const Gatherer gatherer("ignore-stop gather"); // which is ended first
    FptestProcess fptest(with_json({"--resume", work("before"), "--plan", plan(group_of(items)),
                                    "--grace", "1", "--junit", work("junit")}));
    EXPECT_TRUE(wait_for_events("end", 1));
    EXPECT_FALSE(processes_named(device::kProbe).empty());
    fptest.signal(SIGINT);
    EXPECT_EQ(fptest.wait(10).status, 130);
    EXPECT_THAT(outcomes(), ElementsAre("Item: failed", "Other: not run", "Third: not run"));
    EXPECT_EQ(parse_xml(junit()).all("testsuite").at(0).attributes.at("failures"), "1");
    EXPECT_THAT(paths_run(), IsEmpty());
}

TEST_F(ResumedRun, HasTheEarlierResultsWhereAnotherFileCannotBegin)
{
    cut_off(kThreeOfWhichOneSleeps, SIGINT);
    const Ended ended = run_fptest({"run", "--resume", work("before"), "--plan",
                                    plan(group_of(kThreeOfWhichOneSleeps)), "--json", "/dev/full",
                                    "--junit", work("junit")});
    EXPECT_EQ(ended.status, 3);
    EXPECT_THAT(ended.err, HasSubstr("/dev/full: No space left on device; nothing was run\n"));
    EXPECT_EQ(parse_xml(junit()).all("testsuite").at(0).attributes.at("failures"), "1");
}

TEST_F(ResumedRun, GoesOnInTheRoundThatWasCutOff)
{
    const Items items = {{"Item", kPasses}, {"Other", "report G 100 0 ok await /tmp/scene/go"}};
    file("go", "");
    FptestProcess fptest(with_group(items, {"--repeat", "3", "--stop-after", "9"}));
    ASSERT_TRUE(wait_for_events("end", 1));
    std::filesystem::remove(work("go"));
    const auto waits = [&] { return events("start").size() > events("end").size(); };
    ASSERT_TRUE(eventually(waits, 10));
    std::this_thread::sleep_for(std::chrono::milliseconds(200));
    fptest.signal(SIGKILL);
    fptest.wait();
    file("go", "");
    expect_items_to_end();
    std::filesystem::rename(work("json"), work("before"));
    std::filesystem::remove(device::kLogFile);
    const std::size_t ended = support::events_of(read_file(work("before")), "end").size();
    EXPECT_EQ(resume(items).status, 0);
    EXPECT_EQ(events("end").size(), 6U);
    EXPECT_EQ(paths_run().size(), 6 - ended);
    EXPECT_EQ(events("run").at(0).at("rounds"), 3);
    EXPECT_EQ(events("run").at(0).at("stop_after"), 9);
    EXPECT_EQ(events("finish").at(0).at("passed"), 6);
    EXPECT_EQ(events("finish").at(0).at("summary").at(0).at("run"), 3);
}

TEST_F(ResumedRun, KeepsLateReports)
{
    const Items items = {{"Item", "report G 100 0 ok; (sleep 0.3; exec /system/bin/Item report G "
                                  "100 1 late) &amp;"},
                         {"Third", "sleep 0.7 report G 100 0 fine"},
                         {"Other", kSleepsOnce}};
    const std::string before = cut_off(items, SIGINT);
    const auto told = support::events_of(read_file(before), "late");
    ASSERT_EQ(told.size(), 1U);
    const Ended ended = resume(items, {"--junit", work("junit")});
    EXPECT_EQ(ended.status, 0);
    EXPECT_THAT(ended.out, HasSubstr("\nG/Item: late report"));
    ASSERT_EQ(events("late").size(), 1U);
    EXPECT_EQ(events("late").at(0), told.at(0));
    EXPECT_THAT(junit(), HasSubstr("<property name=\"late_report\""));
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Third: passed", "Other: passed"));
    std::filesystem::rename(work("json"), before);
    const Ended again = resume(items);
    EXPECT_EQ(again.status, 0);
    EXPECT_THAT(again.err, EndsWith(before + ": that run has finished: nothing to do\n"));
}

// Under --as-group items may run after the one that ends the run.
TEST_F(ResumedRun, KeepsWhatRanAfterTheFailureThatEndsIt)
{
    const Items items = {{"Item", "report G 100 1 bad"},
                         {"Third", kPasses},
                         {"Other", kSleepsOnce},
                         {"Fourth", kPasses}};
    for (const Lines &rule : {Lines{"--until-fail"}, Lines{"--stop-after", "1"}}) {
        Lines options = rule;
        options.emplace_back("--as-group");
        cut_off(items, SIGKILL, options);
        EXPECT_EQ(resume(items).status, 1);
        EXPECT_THAT(outcomes(), ElementsAre("Item: failed", "Third: passed", "Other: not run",
                                            "Fourth: not run"));
        EXPECT_THAT(paths_run(), IsEmpty());
        std::filesystem::remove(work("slept"));
    }
}

TEST_F(ResumedRun, KeepsAttemptsAndWhatWasExpected)
{
    const Items items = {{"Item", "report G 100 1 bad"},
                         {"Third", "sleep 0.4 report G 100 1 worse"},
                         {"Fourth", "report G 100 0 ok once /tmp/scene/once report G 100 1 loose"},
                         {"Other", "report G 100 0 ok once /tmp/scene/slept sleep 60"}};
    const std::string expect = file("known", "P/G/Item QM-7\n");
    cut_off(items, SIGKILL, {"--retry", "1", "--expect", expect});
    const Ended ended = resume(items);
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(),
                ElementsAre("Item: expected", "Third: failed", "Fourth: flaky", "Other: passed"));
    EXPECT_EQ(events("retry").size(), 2U);
    const Json finish = events("finish").at(0);
    EXPECT_EQ(finish.at("retries"), 2);
    EXPECT_EQ(finish.at("expected"), 1);
    EXPECT_GE(finish.at("seconds"), 0.8) << "what every attempt took";
    EXPECT_THAT(paths_run(), ElementsAre("P/G/Other"));
}

TEST_F(ResumedRun, HasTheOrderOfTheRunAndListsWhatIsLeft)
{
    cut_off(kThreeOfWhichOneSleeps, SIGKILL, {"--shuffle=3"});
    const auto items = support::events_of(read_file(work("before")), "run").at(0).at("items");
    const std::size_t done = support::events_of(read_file(work("before")), "end").size();
    const Ended list = run_fptest({"run", "--list", "--resume", work("before"), "--plan",
                                   plan(group_of(kThreeOfWhichOneSleeps))});
    EXPECT_EQ(lines_of(list.out).size(), 3 - done);
    resume(kThreeOfWhichOneSleeps);
    EXPECT_EQ(events("run").at(0).at("items"), items);
    EXPECT_EQ(events("run").at(0).at("seed"), 3);
}

TEST_F(ResumedRun, ListsWhatIsLeftOfSeveralRounds)
{
    const Items items = {{"Item", kPasses}, {"Other", "report G 100 1 bad"}, {"Third", kPasses}};
    const auto listed_after = [&](std::size_t ends) {
        std::string text;
        std::size_t ended = 0;
        for (const std::string &line : lines_of(json())) {
            if (ended < ends && !line.starts_with("{\"event\":\"finish\"")) {
                text += line + "\n";
            }
            ended += line.starts_with("{\"event\":\"end\"") ? 1 : 0;
        }
        Lines paths;
        const Ended list = run_fptest({"run", "--list", "--resume", file("before", text)});
        for (const std::string &line : lines_of(list.out)) {
            paths.push_back(line.substr(0, line.find(' ')));
        }
        return paths;
    };
    run_group(items, {"--repeat", "2"});
    EXPECT_EQ(listed_after(2).size(), 3U);
    EXPECT_EQ(listed_after(3).size(), 3U);
    EXPECT_THAT(listed_after(4), ElementsAre("P/G/Other", "P/G/Third"));
    EXPECT_THAT(listed_after(5), ElementsAre("P/G/Third"));
    EXPECT_THAT(listed_after(6), IsEmpty());
    run_group(items, {"--for", "0.001", "--stop-after", "3"});
    EXPECT_THAT(listed_after(2), ElementsAre("P/G/Third"));
    EXPECT_THAT(listed_after(3), IsEmpty()) << "as the time is over";
    run_group(items, {"--until-fail"});
    EXPECT_EQ(listed_after(1).size(), 3U) << "as further rounds may begin";
    EXPECT_THAT(listed_after(2), IsEmpty());
}

TEST_F(ResumedRun, RefusesAnotherPlanOrDevice)
{
    const std::string before = cut_off(kThreeOfWhichOneSleeps, SIGKILL);
    expect_refused(before + " is of another plan: it has G/Other and G/Third, and "
                            "/tmp/scene/plan.xml has not",
                   {}, {{"Item", kPasses}, {"Fourth", kPasses}});
    expect_refused(
        before + " is of another plan: /tmp/scene/plan.xml has other items, or other "
                 "args; run it anew",
        {}, {{"Item", kPasses}, {"Other", kPasses}, {"Third", std::string(kPasses) + " say more"}});
    const std::string text = read_file(before);
    file("before", std::string(text).replace(text.find("\"vendor\":0"), 10, "\"vendor\":1"));
    expect_refused(before + " is of vendor 1, and this device's is 0: their items are other "
                            "programs");
    EXPECT_THAT(paths_run(), IsEmpty());
}

TEST_F(ResumedRun, IsOfTheSameDeviceWithItsLabels)
{
    const std::string before =
        cut_off(kThreeOfWhichOneSleeps, SIGKILL, {"--label", "device=U5", "--label", "job=1"});
    const Json labels = {{"device", "U5"}, {"job", "1"}};
    const std::string is_of = before + " is of device 'U5', and this is ";
    const std::string advice = ": if it is that one all the same, say --label device=U5";
    expect_refused(is_of + "'U6'" + advice, {"--label", "device=U6"});
    expect_refused(is_of + "'quillmark'" + advice);
    EXPECT_THAT(paths_run(), IsEmpty());

    resume(kThreeOfWhichOneSleeps, {"--label", "device=U5"});
    EXPECT_EQ(events("run").at(0).at("labels"), labels);
    EXPECT_THAT(outcomes(), ElementsAre("Item: failed", "Other: passed", "Third: passed"));
    std::filesystem::remove(work("json"));
    resume(kThreeOfWhichOneSleeps, {"--label", "job=2", "--label", "device=U5"});
    EXPECT_EQ(events("run").at(0).at("labels"), Json({{"device", "U5"}, {"job", "2"}}));
}

TEST_F(ResumedRun, RefusesWhatTheRunBeganWith)
{
    cut_off(kThreeOfWhichOneSleeps, SIGKILL);
    const std::pair<std::string, Lines> given[] = {{"PATH", {"P/G"}},
                                                   {"--skip", {"--skip", "P/G"}},
                                                   {"--failed-of", {"--failed-of", "x"}},
                                                   {"--shuffle", {"--shuffle"}},
                                                   {"--as-group", {"--as-group"}},
                                                   {"--repeat", {"--repeat", "2"}},
                                                   {"--for", {"--for", "1h"}},
                                                   {"--until-fail", {"--until-fail"}},
                                                   {"--stop-after", {"--stop-after", "1"}},
                                                   {"--retry", {"--retry", "1"}},
                                                   {"--pass-code", {"--pass-code", "1"}}};
    for (const auto &[name, options] : given) {
        expect_refused("--resume goes on with a run as it was begun: leave " + name + " out",
                       options);
    }
    const Ended same = run_fptest({"run", "--resume", work("before"), "--json", work("before")});
    EXPECT_EQ(same.status, 2);
    EXPECT_FALSE(read_file(work("before")).empty());
}

} // namespace
