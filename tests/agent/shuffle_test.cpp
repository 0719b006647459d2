// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// fptest run --shuffle.
#include "run_test.h"

#include <set>

namespace
{

const std::string kFourGroups =
    plan_of({{"A", {{"Item", "say 1"}, {"Other", "say 2"}, {"Third", "say 3"}}},
             {"B", {{"Item", "say 4"}, {"Other", "say 5"}, {"Fourth", "say 6"}}},
             {"C", {{"Item", "say 7"}}},
             {"D", {{"Item", "say 8"}}}});

class ShuffledRun : public RunCommand
{
  protected:
    static Ended list(Lines options)
    {
        options.insert(options.begin(), {"run", "--list", "--plan", plan(kFourGroups)});
        return run_fptest(options);
    }
};

TEST_F(ShuffledRun, HasTheOrderOfItsSeed)
{
    const Ended in_order = list({});
    const Ended once = list({"--shuffle=7"});
    EXPECT_EQ(once.status, 0);
    EXPECT_EQ(once.err, "");
    EXPECT_EQ(list({"--shuffle", "7"}).out, once.out);
    EXPECT_NE(list({"--shuffle=8"}).out, once.out);
    EXPECT_NE(once.out, in_order.out);
    // on every device
    EXPECT_EQ(once.out, "P/C/Item    /system/bin/Item say 7\n"
                        "P/B/Fourth  /system/bin/Fourth say 6\n"
                        "P/B/Item    /system/bin/Item say 4\n"
                        "P/B/Other   /system/bin/Other say 5\n"
                        "P/A/Other   /system/bin/Other say 2\n"
                        "P/A/Third   /system/bin/Third say 3\n"
                        "P/A/Item    /system/bin/Item say 1\n"
                        "P/D/Item    /system/bin/Item say 8\n");
    const auto sorted = [](const Ended &ended) {
        const Lines lines = lines_of(ended.out);
        return std::multiset<std::string>(lines.begin(), lines.end());
    };
    EXPECT_EQ(sorted(once), sorted(in_order));
}

TEST_F(ShuffledRun, KeepsTheItemsOfAGroupTogether)
{
    for (int seed = 0; seed < 10; ++seed) {
        Lines groups;
        for (const std::string &line : lines_of(list({"--shuffle=" + std::to_string(seed)}).out)) {
            if (groups.empty() || groups.back() != line.substr(2, 1)) {
                groups.push_back(line.substr(2, 1));
            }
        }
        EXPECT_THAT(groups, ::testing::UnorderedElementsAre("A", "B", "C", "D")) << seed;
    }
}

TEST_F(ShuffledRun, TellsTheSeedInAllResults)
{
    const Lines arguments = {"--plan", plan(kFourGroups), "--junit", work("junit")};
    const auto with = [&](Lines more) {
        more.insert(more.begin(), arguments.begin(), arguments.end());
        return run(more);
    };
    const Ended chosen = with({"--shuffle", "P/*"});
    const int seed = events("run").at(0).at("seed");
    const std::string said = "shuffled with seed " + std::to_string(seed);
    EXPECT_EQ(chosen.err, "fptest: " + said + ": --shuffle=" + std::to_string(seed) +
                              " runs this order again\n");
    EXPECT_THAT(chosen.out, StartsWith("/tmp/scene/plan.xml: 8 items, vendor 0, " + said + "\n"));
    EXPECT_THAT(junit(), HasSubstr("name=\"seed\" value=\"" + std::to_string(seed) + "\""));
    const Lines order = outcomes();
    const Ended again = with({"--shuffle", std::to_string(seed), "--tap"});
    EXPECT_EQ(again.err, "");
    EXPECT_THAT(again.out, HasSubstr("\n# " + said + "\n"));
    EXPECT_EQ(outcomes(), order);
    EXPECT_EQ(events("run").at(0).at("items").size(), 8U);
}

TEST_F(ShuffledRun, IsTheSameInEachRoundAndOfWholeGroupsAsOneCommand)
{
    run({"--plan", plan(kFourGroups), "--shuffle=7", "--as-group", "--repeat", "2"});
    const Lines all = paths_run();
    ASSERT_EQ(all.size(), 8U);
    EXPECT_EQ(Lines(all.begin(), all.begin() + 4), Lines(all.begin() + 4, all.end()));
    EXPECT_THAT(Lines(all.begin(), all.begin() + 4),
                ::testing::UnorderedElementsAre("P/A", "P/B", "P/C", "P/D"));
}

TEST_F(ShuffledRun, RefusesWhatIsNoSeed)
{
    for (const std::string seed : {"x", "1000000", "-1"}) {
        expect_refusal(2,
                       "fptest: --shuffle: '" + seed +
                           "' is not a whole number from 0 to 999999; see fptest run --help",
                       {"run", "--shuffle=" + seed});
    }
    expect_refusal(2, "fptest: --shuffle: its value is empty; see fptest run --help",
                   {"run", "--shuffle="});
}

} // namespace
