// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Runs of many rounds: how they end, and what they take.
#include "fptest_runner.h"
#include "support/reports.h"

#include <gmock/gmock.h>
#include <nlohmann/json.hpp>

#include <csignal>
#include <fstream>
#include <regex>
#include <string>
#include <unistd.h>

namespace
{

class Rounds : public FptestTest
{
  protected:
    static std::string fails_in_round_two()
    {
        return plan(
            group_of({{"Item", "report G 100 0 fine"},
                      {"Other", "report G 100 1 broken once /tmp/scene/second report G 100 0 ok"},
                      {"Third", "report G 100 0 fine"}}));
    }

    // "Case: verdict" of each.
    static device::Lines verdicts()
    {
        device::Lines all;
        for (const Element &suite : parse_xml(read_file(work("junit"))).all("testsuite")) {
            for (const Element &test : suite.all("testcase")) {
                all.push_back(test.attributes.at("name") + ": " + verdict_of(test));
            }
        }
        return all;
    }
};

TEST_F(Rounds, EndWithTheFirstItemThatDoesNotPass)
{
    const Ended ended = run_fptest({"run", "--until-fail", "--junit", work("junit"), "--json",
                                    work("json"), "--plan", fails_in_round_two(), "P/G"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    const std::string shown =
        std::regex_replace(ended.out, std::regex(R"([0-9]\.[0-9]{3} s)"), "T.TTT s");
    EXPECT_EQ(without_times(shown),
              "/tmp/scene/plan.xml: 3 items, vendor 0, rounds until an item fails\n"
              "G/Item (round 1): passed, result 0, T s: fine\n"
              "G/Other (round 1): passed, result 0, T s: ok\n"
              "G/Third (round 1): passed, result 0, T s: fine\n"
              "G/Item (round 2): passed, result 0, T s: fine\n"
              "G/Other (round 2): failed, result 1, T s: broken\n"
              "ended: G/Other (round 2) did not pass (--until-fail)\n"
              "ITEM     PASSED    LEAST   MEDIAN  LONGEST\n"
              "G/Item   2 of 2  T.TTT s  T.TTT s  T.TTT s\n"
              "G/Other  1 of 2  T.TTT s  T.TTT s  T.TTT s\n"
              "G/Third  1 of 1  T.TTT s  T.TTT s  T.TTT s\n"
              "4 passed, 1 failed, 1 not run, T s\n");
    EXPECT_THAT(verdicts(), ElementsAre("Item (round 1): passed", "Other (round 1): passed",
                                        "Third (round 1): passed", "Item (round 2): passed",
                                        "Other (round 2): failure", "Third (round 2): skipped"));
    const auto finish = events_of(read_file(work("json")), "finish").at(0);
    EXPECT_EQ(finish.at("finished"), true);
    EXPECT_EQ(finish.at("reason"), "G/Other (round 2) did not pass (--until-fail)");
    EXPECT_EQ(finish.at("not_run"), 1);
}

TEST_F(Rounds, EndAfterTheirNumberWhereNothingFails)
{
    const Ended ended =
        run_fptest({"run", "--until-fail", "--repeat", "2", "--plan", plan(kOnePasses), "P/G"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_THAT(ended.out, StartsWith("/tmp/scene/plan.xml: 1 item, vendor 0, at most 2 rounds "
                                      "until an item fails\n"));
    EXPECT_THAT(without_times(ended.out), HasSubstr("\n2 passed, 0 failed, T s\n"));
    // one that reports nothing has failed as well
    const std::string silent = group_of({{"Item", ""}});
    EXPECT_THAT(run_fptest({"run", "--until-fail", "--plan", plan(silent), "P/G"}).out,
                HasSubstr("\nended: G/Item"));
}

TEST_F(Rounds, BeginNoneOnceTheTimeIsOverAndCompleteTheOneThatRuns)
{
    const std::string path = plan(group_of(
        {{"Item", "sleep 0.3 report G 100 0 fine"}, {"Other", "sleep 0.3 report G 100 0 fine"}}));
    const Ended ended =
        run_fptest({"run", "--for", "1s", "--json", work("json"), "--plan", path, "P/G"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_THAT(ended.out, StartsWith("/tmp/scene/plan.xml: 2 items, vendor 0, rounds for 1 s\n"));
    const std::string json = read_file(work("json"));
    const auto finish = events_of(json, "finish").at(0);
    const int rounds = finish.at("rounds");
    EXPECT_EQ(finish.at("finished"), true);
    EXPECT_EQ(finish.at("passed"), 2 * rounds);
    EXPECT_EQ(finish.at("not_run"), 0);
    EXPECT_GE(rounds, 1);
    EXPECT_LE(rounds, 2) << "of at least 0.6 s";
    EXPECT_GE(finish.at("seconds"), 0.6);
}

TEST_F(Rounds, EndAfterTheirNumberWhereThatComesBeforeTheTime)
{
    const Ended ended =
        run_fptest({"run", "--for", "1h", "--repeat", "2", "--plan", plan(kOnePasses), "P/G"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_THAT(ended.out,
                StartsWith("/tmp/scene/plan.xml: 1 item, vendor 0, at most 2 rounds for 1 h\n"));
    EXPECT_THAT(without_times(ended.out), HasSubstr("\n2 passed, 0 failed, T s\n"));
}

TEST_F(Rounds, AreListedOnce)
{
    const Ended ended =
        run_fptest({"run", "--list", "--repeat", "1000000", "--plan", plan(kOnePasses), "P/G"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "P/G/Item  /system/bin/Item report G 100 0 fine\n");
    EXPECT_LT(ended.seconds, 5);
}

// A million planned rounds take no more memory and output than one.
TEST_F(Rounds, CostNothingBeforeTheyBegin)
{
    FptestProcess fptest({"run", "--repeat", "1000000", "--json", work("json"), "--junit",
                          work("junit"), "--tap", "--plan", plan(kOnePasses), "P/G"});
    ASSERT_TRUE(eventually(
        [&] { return fptest.out().find("ok 3 - G (round 3)") != std::string::npos; }, 20));
    const std::string most = device::status_field(fptest.pid(), "VmHWM");
    EXPECT_LT(std::stol(most), 32 * 1024) << most;
    fptest.signal(SIGTERM);
    const Ended ended = fptest.wait(10);
    EXPECT_EQ(ended.status, 130);
    const std::string json = read_file(work("json"));
    EXPECT_LT(json.size(), 1U << 20);
    EXPECT_EQ(events_of(json, "run").at(0).at("items").size(), 1U);
    const auto finish = events_of(json, "finish").at(0);
    const int rounds = finish.at("rounds");
    EXPECT_EQ(events_of(json, "end").size(), static_cast<std::size_t>(rounds));
    EXPECT_EQ(finish.at("passed").get<int>() + finish.at("failed").get<int>() +
                  finish.at("not_run").get<int>(),
              1'000'000);
    EXPECT_EQ(verdicts().back(), "rounds " + std::to_string(rounds + 1) + " to 1000000: not run");
    EXPECT_THAT(ended.out, StartsWith("TAP version 14\n1..1000000\n"));
    EXPECT_THAT(ended.out, EndsWith("\nBail out!  interrupted by SIGTERM\n"));
}

TEST_F(Rounds, TakeNoMoreMemoryHoweverManyHaveBeenRun)
{
    FptestProcess fptest({"run", "--repeat", "500", "--json", work("json"), "--tap", "--plan",
                          plan(group_of({{"Item", "await /tmp/scene/plan.xml"}})), "P/G"});
    const pid_t library = fptest.library();
    const auto held_in = [&](int round) {
        EXPECT_TRUE(eventually(
            [&] {
                return fptest.out().find(" - G (round " + std::to_string(round) + ")\n") !=
                       std::string::npos;
            },
            60));
        return std::pair(std::stol(device::status_field(fptest.pid(), "VmHWM")),
                         std::stol(device::status_field(library, "VmRSS")));
    };
    const auto [early, early_library] = held_in(50);
    const auto [late, late_library] = held_in(490);
    EXPECT_LT(late, early + 512) << "KiB";
    EXPECT_LT(late_library, early_library + 512) << "KiB";
    EXPECT_EQ(fptest.wait().status, 1);
}

// The signal has come before anything was run.
TEST_F(Rounds, LookAtSignalsFromTheFirstMomentOn)
{
    const Start start{
        .arguments = {"run", "--repeat", "1000000", "--plan", plan(kOnePasses), "P/G"},
        .prepare = interrupted_before};
    const Ended ended = run_fptest(start);
    EXPECT_EQ(ended.status, 130);
    EXPECT_EQ(without_times(ended.out), "/tmp/scene/plan.xml: 1 item, vendor 0, 1000000 rounds\n"
                                        "not finished: interrupted by Ctrl-C\n"
                                        "0 passed, 0 failed, 1000000 not run, T s\n");
    EXPECT_LT(ended.seconds, 5);
}

// What a run that was killed leaves is no success.
TEST_F(Rounds, AreRedInJunitWhereTheRunIsKilled)
{
    const std::string path = plan(group_of({{"Item", "report G 100 0 fine"},
                                            {"Other", "note /tmp/scene/begun sleep 60"},
                                            {"Third", ""}}));
    FptestProcess fptest({"run", "--repeat", "5", "--junit", work("junit"), "--plan", path, "P/G"});
    ASSERT_TRUE(wait_for_file("begun"));
    const auto is_running = [] {
        return verdicts() == device::Lines{"Item (round 1): passed", "Other (round 1): running",
                                           "Third (round 1): not run", "rounds 2 to 5: not run"};
    };
    EXPECT_TRUE(eventually(is_running, 10)) << read_file(work("junit"));
    fptest.signal(SIGKILL);
    EXPECT_EQ(fptest.wait().status, -SIGKILL);
    const Element top = parse_xml(read_file(work("junit")));
    EXPECT_EQ(top.attributes.at("errors"), "3");
    EXPECT_EQ(top.attributes.at("skipped"), "0");
    expect_items_to_end();
}

} // namespace
