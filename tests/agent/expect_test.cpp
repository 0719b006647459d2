// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// fptest run --expect: failures that are known.
#include "run_test.h"

namespace
{

class ExpectedFailures : public RunCommand
{
  protected:
    static std::string known(const std::string &text)
    {
        return file("known", text);
    }
};

const Items kItems = {
    {"Item", kPasses}, {"Other", "say dim report G 100 1 dark"}, {"Third", "report G 100 0 fine"}};

TEST_F(ExpectedFailures, DoNotFailTheRunAndAreShown)
{
    const std::string file = known("# what we know\n\n  any/G/Oth*\t QM-7: the #2 glue \r\n");
    const Ended ended = run_group(kItems, {"--expect", file, "--junit", work("junit")});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(without_times(ended.out),
              "/tmp/scene/plan.xml: 3 items, vendor 0\n"
              "G/Item: passed, result 0, T s: fine\n"
              "G/Other: expected, result 1, T s: QM-7: the #2 glue; it was failed: reported the "
              "result 1: dark\n"
              "G/Third: passed, result 0, T s: fine\n"
              "2 passed, 0 failed, 1 failed as expected, T s\n");
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: expected", "Third: passed"));
    EXPECT_EQ(end_of(1).at("expected"), "QM-7: the #2 glue");
    EXPECT_FALSE(end_of(0).contains("expected"));
    EXPECT_EQ(events("finish").at(0).at("expected"), 1);
    EXPECT_EQ(events("finish").at(0).at("failed"), 0);
    const Element suite = parse_xml(junit()).all("testsuite").at(0);
    EXPECT_EQ(suite.attributes.at("skipped"), "1");
    EXPECT_EQ(suite.attributes.at("failures"), "0");
    EXPECT_EQ(suite.all("testcase").at(1).all("skipped").at(0).attributes.at("message"),
              "QM-7: the #2 glue; it was failed: reported the result 1");
    EXPECT_EQ(suite.all("testcase").at(1).properties().at("outcome"), "expected");
}

TEST_F(ExpectedFailures, FailTheRunWhereTheyPass)
{
    const std::string file = known("P/G QM-8\n");
    const Ended ended = run_group(kItems, {"--expect", file, "--tap", "--junit", work("junit")});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(outcomes(),
                ElementsAre("Item: unexpected", "Other: expected", "Third: unexpected"));
    EXPECT_THAT(ended.out, HasSubstr("\n    not ok 1 - Item # unexpected\n"));
    EXPECT_THAT(ended.out, HasSubstr("\n    not ok 2 - Other # TODO QM-8\n"));
    EXPECT_THAT(ended.out, HasSubstr("\nnot ok 1 - G\n"));
    EXPECT_THAT(ended.out, HasSubstr("\n# 0 passed, 2 failed, 1 failed as expected, "));
    EXPECT_EQ(events("finish").at(0).at("failed"), 2);
    const Element suite = parse_xml(junit()).all("testsuite").at(0);
    EXPECT_EQ(suite.attributes.at("failures"), "2");
    EXPECT_EQ(suite.all("testcase").at(0).all("failure").at(0).attributes.at("message"),
              "passed, but was expected to fail: QM-8");
}

TEST_F(ExpectedFailures, MayBeOfAnyKindButAnInterruption)
{
    const Items items = {{"Item", ""}, {"Other", "crash"}, {"Third", kSleeps}};
    run_group(items, {"--expect", known("P/* QM-9"), "--timeout", "0.5", "--retry", "2"});
    EXPECT_THAT(outcomes(), ElementsAre("Item: expected", "Other: expected", "Third: expected"));
    EXPECT_EQ(reasons().at(0), "QM-9; it had no result: ended without reporting a result");
    EXPECT_EQ(events("finish").at(0).at("retries"), 0);
    run_group({{"Item", kSleeps}}, {"--expect", known("P/* QM-9"), "--limit", "0.5"});
    EXPECT_THAT(outcomes(), ElementsAre("Item: stopped"));
}

TEST_F(ExpectedFailures, EndNoRunThatIsToEndWithAFailure)
{
    run_group(kItems, {"--expect", known("P/*/Other QM-7"), "--until-fail", "--repeat", "2"});
    EXPECT_EQ(events("finish").at(0).at("rounds"), 2);
    EXPECT_EQ(events("finish").at(0).at("expected"), 2);
}

TEST_F(ExpectedFailures, MayBeOfAnotherPlan)
{
    const std::string file = known("P/Oter/* QM-1\nP/G/Other QM-7\n");
    const Ended ended = run_group(kItems, {"--expect", file});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "fptest: " + file +
                             ":1: 'P/Oter/*' matches nothing in "
                             "/tmp/scene/plan.xml\n");
}

TEST_F(ExpectedFailures, AreRefusedWithoutAReasonOrAPath)
{
    const std::string path = plan(group_of(kItems));
    const std::string file = known("\nP/G/Other \n");
    expect_refusal(
        2, "fptest: " + file + ":2: 'P/G/Other' has no reason: write behind it why it fails",
        {"run", "--expect", file, "--plan", path});
    expect_refusal(2,
                   "fptest: " + known("Other dark") +
                       ":1: 'Other' names no group: a path is root/group or root/group/item; the "
                       "groups are G",
                   {"run", "--expect", file, "--plan", path});
    expect_refusal(2,
                   "fptest: " + known(std::string(100'000, 'x')) + ":1: '" + std::string(97, 'x') +
                       "...' has no reason: write behind it why it fails",
                   {"run", "--expect", file, "--plan", path});
    expect_refusal(2, "fptest: /tmp/scene/none: No such file or directory",
                   {"run", "--expect", work("none"), "--plan", path});
    expect_refusal(2, "fptest: /dev/zero: longer than the 16 MiB that fptest reads",
                   {"run", "--expect", "/dev/zero", "--plan", path});
}

} // namespace
