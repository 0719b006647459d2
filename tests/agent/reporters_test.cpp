// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0
// What all reports of a run have in common.
#include "reporters_test.h"

#include <random>

using namespace reporters_test;

namespace
{

RunOfItems random_run(std::mt19937 &random)
{
    const std::vector<Text> texts = hostile_texts_for_xml();
    const auto below = [&](std::size_t limit) { return random() % limit; };
    const auto text = [&] {
        const std::string &chosen = texts[below(texts.size())].reported;
        return below(2) == 0 ? chosen.substr(0, 40) : "Item" + std::to_string(below(9));
    };
    const auto maybe = [&] { return below(2) == 0 ? std::optional(text()) : std::nullopt; };
    std::vector<Suite> suites;
    for (std::size_t count = below(5); count > 0; --count) {
        std::vector<ItemRun> items;
        for (std::size_t size = below(6); size > 0; --size) {
            ItemRun one = item(text(), static_cast<Outcome>(below(6)), text());
            one.report = {maybe(), maybe(), below(4) == 0, maybe()};
            one.output = text();
            items.push_back(one);
        }
        suites.push_back(suite(text(), items));
    }
    RunOfItems run = run_of(suites);
    run.finished = below(2) == 0;
    run.why_unfinished = run.finished ? "" : text();
    return run;
}

Tally counted_by_hand(const RunOfItems &run)
{
    Tally tally;
    for (const Suite &one : run.suites) {
        for (const ItemRun &item : one.items) {
            ++(item.outcome == Outcome::passed    ? tally.passed
               : item.outcome == Outcome::not_run ? tally.not_run
                                                  : tally.failed);
        }
    }
    return tally;
}

TEST_F(Reports, AgreeOnTheCountsOfAnyRun)
{
    std::mt19937 random(7);
    for (int round = 0; round < 300 && !HasFailure(); ++round) {
        const RunOfItems run = random_run(random);
        const Tally expected = counted_by_hand(run);
        const auto &[passed, failed, not_run] = expected;
        EXPECT_EQ(count(run).passed, passed);
        EXPECT_EQ(count(run).failed, failed);
        EXPECT_EQ(count(run).not_run, not_run);
        EXPECT_EQ(count(run).all(), passed + failed + not_run);
        const std::string json = json_of(run);
        const std::string text = tap_of(run);
        EXPECT_EQ(tally_of_json(json), expected);
        const std::string junit = junit_of(run);
        const bool is_cut_at_end = junit.find("name=\"end of the run\"") != junit.npos;
        Tally with_end = expected;
        with_end.not_run += is_cut_at_end ? 1 : 0;
        EXPECT_EQ(tally_of_junit(junit), with_end);
        EXPECT_TRUE(run.finished ? !is_cut_at_end : junit.find("<error") != junit.npos);
        EXPECT_EQ(tally_of_tap(text), expected);
        EXPECT_EQ(events_of(json).back().at("finished"), run.finished);
        const Tap tap = parse_tap(text);
        EXPECT_EQ(tap.bail_out.has_value(), !run.finished);
        EXPECT_THAT(tap.comments,
                    ElementsAre(std::to_string(passed) + " passed, " + std::to_string(failed) +
                                " failed, " + std::to_string(not_run) + " not run in 2.5 s"));
    }
}

TEST_F(Reports, AreReadableAndUnfinishedWhereTheRunWasCutOff)
{
    std::mt19937 random(8);
    for (int round = 0; round < 100 && !HasFailure(); ++round) {
        const RunOfItems run = random_run(random);
        const std::size_t stop = random() % 6;
        const auto play_a_part = [&](Reporter &reporter) {
            Playback playback(reporter, run);
            playback.begin();
            for (std::size_t suite = 0; suite < run.suites.size() && suite < stop; ++suite) {
                for (std::size_t at = 0; at < run.suites[suite].items.size() && at < stop; ++at) {
                    playback.start({suite, at});
                    if (at + 1 < stop) {
                        playback.end_item({suite, at});
                    }
                }
            }
        };
        play_a_part(*make_json_reporter(path("json")));
        EXPECT_TRUE(events(events_of(read_file(path("json"))), "finish").empty());
        play_a_part(*make_junit_reporter(path("xml")));
        for (const Element &group : parse_xml(read_file(path("xml"))).all("testsuite")) {
            if (group.attributes.at("name") != "end of the run") {
                EXPECT_EQ(group.properties().at("finished"), "false");
            }
        }
        play_tap(play_a_part);
        const Tap tap = parse_tap(read_file(path("tap")));
        EXPECT_EQ(tap.planned, run.suites.size());
        EXPECT_TRUE(tap.comments.empty());
    }
}

TEST(Counts, TakeEveryOtherOutcomeForFailed)
{
    const Counts counts = count(mixed_run());
    EXPECT_EQ(counts.passed, 1U);
    EXPECT_EQ(counts.failed, 4U);
    EXPECT_EQ(counts.not_run, 1U);
    EXPECT_EQ(count(mixed_run().suites[1].items).failed, 2U);
}

} // namespace
