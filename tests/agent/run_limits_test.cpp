// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How far a run goes: --stop-after and --limit.
#include "run_test.h"

namespace
{

const Items kSomeFail = {{"Item", "report G 100 1 bad"},
                         {"Other", kPasses},
                         {"Third", ""},
                         {"Fourth", "note /tmp/scene/order"}};

using RunLimits = RunCommand;

TEST_F(RunLimits, EndAfterThatManyItemsThatDidNotPass)
{
    const Ended ended =
        run_group(kSomeFail, {"--stop-after", "2", "--tap", "--junit", work("junit")});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    EXPECT_THAT(outcomes(), ElementsAre("Item: failed", "Other: passed", "Third: no result",
                                        "Fourth: not run"));
    EXPECT_FALSE(is_there("order"));
    EXPECT_EQ(reasons().back(), "2 items did not pass (--stop-after 2)");
    EXPECT_EQ(events("run").at(0).at("stop_after"), 2);
    EXPECT_EQ(events("finish").at(0).at("finished"), true);
    EXPECT_EQ(events("finish").at(0).at("not_run"), 1);
    EXPECT_THAT(junit(), HasSubstr("<skipped message=\"2 items did not pass (--stop-after 2)\"/>"));
    EXPECT_THAT(ended.out, StartsWith("TAP version 14\n1..1\n"));
    EXPECT_THAT(ended.out,
                HasSubstr("ok 4 - Fourth # SKIP not run: 2 items did not pass (--stop-after 2)\n"));
}

TEST_F(RunLimits, CountWhatDidNotPassInAllRounds)
{
    const Items items = {{"Item", "report G 100 1 bad"}, {"Other", kPasses}};
    const Ended ended = run_group(items, {"--stop-after", "3", "--repeat", "5"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(ended.out,
                StartsWith("/tmp/scene/plan.xml: 2 items, vendor 0, at most 5 rounds\n"));
    EXPECT_THAT(ended.out, HasSubstr("\nended: 3 items did not pass (--stop-after 3)\n"));
    EXPECT_EQ(events("finish").at(0).at("rounds"), 3);
    EXPECT_EQ(events("finish").at(0).at("not_run"), 1);
    // one plan, when the number of rounds is known
    const Ended tap = run_group(items, {"--stop-after", "3", "--repeat", "5", "--tap"});
    EXPECT_THAT(tap.out, HasSubstr("\n1..3\n"));
    EXPECT_THAT(tap.out, Not(HasSubstr("1..5")));
}

TEST_F(RunLimits, DoNothingToARunThatStaysWithinThem)
{
    const Ended ended = run_group({{"Item", kPasses}}, {"--stop-after", "1", "--limit", "1h"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(events("finish").at(0).at("reason"), Json());
    EXPECT_EQ(events("run").at(0).at("limit"), 3600);
}

TEST_F(RunLimits, StopTheItemThatRunsWhenTheTimeIsOver)
{
    const Ended ended = run_group({{"Item", kPasses}, {"Other", kSleeps}, {"Third", kPasses}},
                                  {"--limit", "0.8", "--junit", work("junit")});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    EXPECT_LT(ended.seconds, 5);
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: stopped", "Third: not run"));
    EXPECT_THAT(reasons(), ElementsAre("", "stopped by --limit",
                                       "the limit of 0.800 s was over "
                                       "(--limit)"));
    EXPECT_EQ(read_file(work("signal")), "SIGTERM\n");
    EXPECT_EQ(events("finish").at(0).at("finished"), false);
    EXPECT_THAT(ended.out, HasSubstr("\nnot finished: the limit of 0.800 s was over (--limit)\n"));
    EXPECT_THAT(junit(), HasSubstr("name=\"finished\" value=\"false\""));
    expect_items_to_end();
}

TEST_F(RunLimits, KillAnItemThatGoesOn)
{
    const Ended ended = run_group({{"Item", "ignore-stop sleep 60"}, {"Other", kPasses}},
                                  {"--limit", "0.5", "--grace", "0.2", "--as-group"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_LT(ended.seconds, 5);
    EXPECT_THAT(outcomes(), ElementsAre("Item: stopped", "Other: not run"));
    EXPECT_EQ(reasons().at(0), "killed after the run was interrupted by --limit, as it did not end "
                               "when it was asked to");
    expect_items_to_end();
}

// Between two rounds nothing is left that could be stopped.
TEST_F(RunLimits, LeaveARunThatHadMoreToDoUnfinished)
{
    const Ended ended = run_group({{"Item", kPasses}}, {"--limit", "0.5", "--for", "1h"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(events("finish").at(0).at("finished"), false);
}

TEST_F(RunLimits, AreRefusedWhereTheyAreNone)
{
    expect_refusal(
        2,
        "fptest: --stop-after: '0' is not a whole number from 1 to 1000000; see fptest run "
        "--help",
        {"run", "--stop-after", "0"});
    expect_refusal(2,
                   "fptest: --limit: 'soon' is not a time such as 90, 90s, 10m, 2h or 1d; see "
                   "fptest run --help",
                   {"run", "--limit", "soon"});
}

} // namespace
