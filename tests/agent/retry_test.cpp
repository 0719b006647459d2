// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// fptest run --retry: attempts, and what all results say of them.
#include "run_test.h"

#include <csignal>
#include <filesystem>

namespace
{

// Fails at its first attempt and passes at the next one.
const std::string kFlaky = "say tried report G 100 0 ok once /tmp/scene/tried report G 100 1 loose";

const Items kOneOfEach = {
    {"Item", kPasses}, {"Other", kFlaky}, {"Third", "say again report G 100 1 bad"}};

class RetriedRun : public RunCommand
{
  protected:
    // "Other 1 failed" for each retry and end, in order.
    static Lines attempts()
    {
        Lines all;
        for (const Json &event : support::events_of(json())) {
            if (event.at("event") == "retry" || event.at("event") == "end") {
                all.push_back(event.at("item").get<std::string>() + " " +
                              std::to_string(event.at("attempt").get<int>()) + " " +
                              event.at("outcome").get<std::string>());
            }
        }
        return all;
    }
};

TEST_F(RetriedRun, HasEveryAttemptInJson)
{
    EXPECT_EQ(run_group(kOneOfEach, {"--retry", "2"}).status, 1);
    EXPECT_THAT(attempts(), ElementsAre("Item 1 passed", "Other 1 failed", "Other 2 flaky",
                                        "Third 1 failed", "Third 2 failed", "Third 3 failed"));
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: flaky", "Third: failed"));
    EXPECT_EQ(events("start").size(), 6U);
    EXPECT_EQ(events("start").back().at("attempt"), 3);
    EXPECT_EQ(events("retry").at(0).at("description"), "loose");
    EXPECT_EQ(events("retry").at(0).at("output"), "tried\n");
    EXPECT_EQ(end_of(1).at("reason"),
              "passed on attempt 2; before, it was failed: reported the result 1");
    const Json finish = events("finish").at(0);
    EXPECT_EQ(finish.at("passed"), 1);
    EXPECT_EQ(finish.at("failed"), 1);
    EXPECT_EQ(finish.at("flaky"), 1);
    EXPECT_EQ(finish.at("retries"), 3);
    EXPECT_EQ(finish.at("summary").at(1).at("run"), 2);
    EXPECT_EQ(finish.at("summary").at(1).at("passed"), 1);
    EXPECT_EQ(events("run").at(0).at("retries"), 2);
    EXPECT_THAT(paths_run(), ElementsAre("P/G/Item", "P/G/Other", "P/G/Other", "P/G/Third",
                                         "P/G/Third", "P/G/Third"));
}

TEST_F(RetriedRun, ShowsEveryAttempt)
{
    const Ended ended = run_group(kOneOfEach, {"--retry", "1"});
    EXPECT_EQ(without_times(ended.out),
              "/tmp/scene/plan.xml: 3 items, vendor 0\n"
              "G/Item: passed, result 0, T s: fine\n"
              "G/Other: attempt 1 of 2: failed, result 1, T s: loose\n"
              "    | tried\n"
              "G/Other: flaky, result 0, attempt 2 of 2, T s: passed on attempt 2; before, it was "
              "failed: reported the result 1: ok\n"
              "G/Third: attempt 1 of 2: failed, result 1, T s: bad\n"
              "    | again\n"
              "G/Third: failed, result 1, attempt 2 of 2, T s: bad\n"
              "    | again\n"
              "1 passed, 1 failed, 1 flaky, 2 retries, T s\n");
}

// A flaky item is no failure of the run, and is not hidden either.
TEST_F(RetriedRun, SucceedsWhereAllPassedInTheEnd)
{
    const Ended ended = run_group({{"Other", kFlaky}}, {"--retry", "1", "--quiet"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_THAT(ended.out, HasSubstr("\nG/Other: flaky, result 0, attempt 2 of 2, "));
    // nothing is tried again that passes
    EXPECT_EQ(run_group({{"Item", kPasses}}, {"--retry", "1"}).status, 0);
    EXPECT_THAT(attempts(), ElementsAre("Item 1 passed"));
}

TEST_F(RetriedRun, HasEveryAttemptInTap)
{
    const Ended ended = run_group(kOneOfEach, {"--retry", "1", "--tap"});
    EXPECT_THAT(ended.out,
                HasSubstr("\n    # G/Other: attempt 1 of 2: failed, result 1: loose\n"
                          "    ok 2 - Other # flaky\n      ---\n      outcome: \"flaky\"\n"));
    EXPECT_THAT(ended.out, HasSubstr("\n      attempts: 2\n"));
    EXPECT_THAT(ended.out, HasSubstr("\n    not ok 3 - Third\n"));
    EXPECT_THAT(ended.out, HasSubstr("\n# 1 passed, 1 failed, 1 flaky, 2 retries, 0 not run in "));
}

TEST_F(RetriedRun, HasEveryAttemptInJunit)
{
    run_group(kOneOfEach, {"--retry", "2", "--junit", work("junit")});
    const Element suite = parse_xml(junit()).all("testsuite").at(0);
    EXPECT_EQ(suite.attributes.at("failures"), "1");
    EXPECT_EQ(suite.attributes.at("errors"), "0");
    const auto cases = suite.all("testcase");
    ASSERT_EQ(cases.size(), 3U);
    EXPECT_TRUE(cases[0].all("flakyFailure").empty());
    ASSERT_EQ(cases[1].all("flakyFailure").size(), 1U);
    EXPECT_EQ(cases[1].all("flakyFailure")[0].attributes.at("message"), "reported the result 1");
    EXPECT_THAT(cases[1].all("flakyFailure")[0].text, HasSubstr("output:\ntried\n"));
    EXPECT_TRUE(cases[1].all("failure").empty());
    EXPECT_EQ(cases[2].all("failure").size(), 1U);
    EXPECT_EQ(cases[2].all("rerunFailure").size(), 2U);
    EXPECT_THAT(junit(), HasSubstr("<property name=\"outcome\" value=\"flaky\"/>"));
    EXPECT_THAT(junit(), HasSubstr("<property name=\"attempts\" value=\"3\"/>"));
    EXPECT_THAT(junit(), HasSubstr("<property name=\"flaky\" value=\"1\"/>"));
    EXPECT_THAT(junit(), HasSubstr("<property name=\"retries\" value=\"3\"/>"));
}

TEST_F(RetriedRun, TriesAgainWhateverTheFailure)
{
    const Items items = {{"Item", ""}, {"Other", "crash"}, {"Third", "sleep 60"}};
    run_group(items, {"--retry", "1", "--timeout", "0.5"});
    EXPECT_THAT(attempts(),
                ElementsAre("Item 1 no result", "Item 2 no result", "Other 1 failed",
                            "Other 2 failed", "Third 1 timed out", "Third 2 timed out"));
}

// Each item again, in each round.
TEST_F(RetriedRun, CountsItemsNotAttemptsForTheEndOfTheRun)
{
    run_group(kOneOfEach, {"--retry", "1", "--stop-after", "2", "--repeat", "3"});
    const Json finish = events("finish").at(0);
    EXPECT_EQ(finish.at("rounds"), 2);
    EXPECT_EQ(finish.at("failed"), 2);
    EXPECT_EQ(finish.at("flaky"), 1);
    EXPECT_EQ(finish.at("passed"), 3);
    std::filesystem::remove(work("tried"));
    run_group(kOneOfEach, {"--retry", "1", "--until-fail"});
    EXPECT_EQ(events("finish").at(0).at("reason"), "G/Third (round 1) did not pass (--until-fail)");
}

TEST_F(RetriedRun, StopsAtAnInterruptInAnAttempt)
{
    const std::string text = "report G 100 1 bad once /tmp/scene/tried " + std::string(kSleeps);
    // which sleeps at its first attempt only
    FptestProcess fptest(
        with_group({{"Item", "report G 100 1 first"}, {"Other", text}}, {"--retry", "3"}));
    ASSERT_TRUE(wait_for_events("start", 5));
    ASSERT_TRUE(wait_for_file("tried"));
    fptest.signal(SIGINT);
    EXPECT_EQ(fptest.wait(10).status, 130);
    EXPECT_THAT(attempts(), ElementsAre("Item 1 failed", "Item 2 failed", "Item 3 failed",
                                        "Item 4 failed", "Other 1 stopped"));
    EXPECT_EQ(events("finish").at(0).at("finished"), false);
    expect_items_to_end();
}

// An item that is to be tried again has not ended: what is interrupted is its next attempt.
TEST_F(RetriedRun, HasNotEndedWhereItIsInterruptedBetweenAttempts)
{
    // what it leaves running is ended before the next attempt, and takes its time
    const std::string leaves = "; /system/bin/Third ignore-stop sleep 60 &amp;";
    const std::string text = plan(group_of({{"Other", kFlaky + leaves}}));
    const Lines options = {"--plan", text, "--grace", "0.5"};
    Lines first = with_json(options);
    first.insert(first.end(), {"--retry", "2", "--junit", work("junit")});
    FptestProcess fptest(first);
    ASSERT_TRUE(wait_for_events("retry", 1));
    fptest.signal(SIGINT);
    const Ended ended = fptest.wait(10);
    EXPECT_EQ(ended.status, 130);
    EXPECT_THAT(without_times(ended.out),
                HasSubstr("\n0 passed, 1 failed, 0 flaky, 1 retry, 0 not run, T s\n"));
    EXPECT_THAT(attempts(), ElementsAre("Other 1 failed", "Other 2 stopped"));
    EXPECT_THAT(reasons(), ElementsAre("interrupted by Ctrl-C, before attempt 2"));
    EXPECT_EQ(events("finish").at(0).at("retries"), 1);
    EXPECT_EQ(events("finish").at(0).at("summary").at(0).at("run"), 1);
    const Element only = parse_xml(junit()).all("testsuite").at(0).all("testcase").at(0);
    EXPECT_EQ(only.all("error").at(0).attributes.at("type"), "stopped");
    EXPECT_EQ(only.all("rerunFailure").size(), 1U);
    EXPECT_EQ(only.properties().at("attempts"), "2");

    std::filesystem::rename(work("json"), work("before"));
    const Ended listed = run_fptest({"run", "--list", "--failed-of", work("before")});
    EXPECT_THAT(listed.out, StartsWith("P/G/Other  "));
    Lines second = options;
    second.insert(second.end(), {"--resume", work("before")});
    EXPECT_EQ(run(second).status, 0);
    EXPECT_THAT(attempts(), ElementsAre("Other 1 failed", "Other 2 flaky"));
}

TEST_F(RetriedRun, RefusesWhatRunsAsOneCommand)
{
    expect_refusal(
        2,
        "fptest: --retry runs items by their own paths, and 'P/G' runs as one command: "
        "leave --as-group out, or see fptest check",
        {"run", "--retry", "1", "--as-group", "--plan", plan(group_of(kOneOfEach)), "P/G"});
    expect_refusal(
        2, "fptest: --retry: '0' is not a whole number from 1 to 100; see fptest run --help",
        {"run", "--retry", "0"});
}

// Or a run that completes this one would take its first failure for the last.
TEST_F(RetriedRun, LeavesARetryToDoWhereAFailureMeetsAnInterruption)
{
    for (int tries = 0; tries < 10; ++tries) {
        std::filesystem::remove(work("pid"));
        FptestProcess fptest(with_group({{"Item", "await /tmp/scene/pid report G 100 1 bad; "
                                                  "kill -INT $(cat /tmp/scene/pid)"}},
                                        {"--retry", "1"}));
        support::write_file(work("new"), std::to_string(fptest.pid()));
        std::filesystem::rename(work("new"), work("pid"));
        EXPECT_EQ(fptest.wait().status, 130);
        EXPECT_THAT(attempts().back(), Not("Item 1 failed"));
    }
}

} // namespace
