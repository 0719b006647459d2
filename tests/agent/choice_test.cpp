// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What fptest run chooses of a plan, by paths, patterns and --skip.
#include "run_test.h"

namespace
{

const std::string kThreeGroups =
    plan_of({{"Bringup", {{"Item", "report Bringup 100 0 a"}, {"Other", "report Bringup 100 0 b"}}},
             {"Burn", {{"Item", "report Burn 100 0 c"}, {"Third", "report Burn 100 0 d"}}},
             {"Endurance", {{"Fourth", "report Endurance 100 0 e"}}}});

class ChoosingItems : public RunCommand
{
  protected:
    // The paths that --list tells for these arguments.
    static Lines listed(Lines arguments, const std::string &text = kThreeGroups)
    {
        arguments.insert(arguments.begin(), {"run", "--list", "--plan", plan(text)});
        const Ended ended = run_fptest(arguments);
        EXPECT_EQ(ended.status, 0) << ended.err;
        Lines paths = lines_of(ended.out);
        for (std::string &line : paths) {
            line.resize(line.find("  "));
        }
        return paths;
    }
    static void expect_refused(const std::string &line, Lines arguments,
                               const std::string &text = kThreeGroups)
    {
        SCOPED_TRACE(PrintToString(arguments));
        arguments.insert(arguments.begin(), {"run", "--plan", plan(text)});
        expect_refusal(2, "fptest: " + line, arguments);
    }
};

TEST_F(ChoosingItems, RunsEveryGroupWithoutAPath)
{
    const Ended ended = run({"--plan", plan(kThreeGroups)});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(paths_run(), ElementsAre("P/Bringup/Item", "P/Bringup/Other", "P/Burn/Item",
                                         "P/Burn/Third", "P/Endurance/Fourth"));
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: passed", "Item: passed",
                                        "Third: passed", "Fourth: passed"));
}

TEST_F(ChoosingItems, TakesPatternsOfTheShell)
{
    EXPECT_THAT(listed({"x/B*"}),
                ElementsAre("x/Bringup/Item", "x/Bringup/Other", "x/Burn/Item", "x/Burn/Third"));
    EXPECT_THAT(listed({"x/*/Item"}), ElementsAre("x/Bringup/Item", "x/Burn/Item"));
    EXPECT_THAT(listed({"x/*/*[ht]*h*"}), ElementsAre("x/Bringup/Other", "x/Endurance/Fourth"));
    EXPECT_THAT(listed({"x/B??n/Third"}), ElementsAre("x/Burn/Third"));
    // its own root where the word is none; each in the order of the command line
    EXPECT_THAT(listed({"*/E*", "x/Burn/*"}),
                ElementsAre("P/Endurance/Fourth", "x/Burn/Item", "x/Burn/Third"));
    // a name is itself, whatever is in it
    EXPECT_THAT(listed({"x/a*"}, plan_of({{"a*", {{"Item", ""}}}, {"ab", {{"Other", ""}}}})),
                ElementsAre("x/a*/Item"));
    EXPECT_EQ(run({"--plan", plan(kThreeGroups), "x/*/Item"}).status, 0);
    EXPECT_THAT(paths_run(), ElementsAre("x/Bringup/Item", "x/Burn/Item"));
}

TEST_F(ChoosingItems, LeavesOutWhatIsSkipped)
{
    EXPECT_THAT(listed({"--skip", "x/B*"}), ElementsAre("P/Endurance/Fourth"));
    EXPECT_THAT(listed({"--skip", "x/*/Item", "--skip=x/Endurance", "x/*"}),
                ElementsAre("x/Bringup/Other", "x/Burn/Third"));
    EXPECT_THAT(listed({"x/Burn/Item", "x/Bringup", "--skip", "x/Burn/Item"}),
                ElementsAre("x/Bringup/Item", "x/Bringup/Other"));
    EXPECT_EQ(run({"--plan", plan(kThreeGroups), "--skip", "any/*/[IO]*"}).status, 0);
    EXPECT_THAT(paths_run(), ElementsAre("P/Burn/Third", "P/Endurance/Fourth"));
}

TEST_F(ChoosingItems, RefusesWhatMatchesNothing)
{
    const std::string groups =
        " matches nothing in /tmp/scene/plan.xml; the groups are Bringup, Burn and Endurance";
    expect_refused("'x/z*'" + groups, {"x/Burn", "x/z*"});
    expect_refused("'x/Burn/F*'" + groups, {"x/Burn/F*"});
    expect_refused("--skip 'x/Burn/F*'" + groups, {"--skip", "x/Burn/F*"});
    expect_refused("--skip 'x/Brun'" + groups, {"--skip", "x/Brun"});
    expect_refused("'F*' names no group: a path is root/group or root/group/item; the groups are "
                   "Bringup, Burn and Endurance",
                   {"--skip", "F*"});
    expect_refused("nothing is left to run: --skip leaves out all of it",
                   {"x/Burn/Item", "--skip", "x/Burn"});
    expect_refused("/tmp/scene/plan.xml has nothing to run; there are no groups",
                   {"--force", "--quiet"}, "<P/>");
}

TEST_F(ChoosingItems, RefusesAPartOfWhatRunsAsOne)
{
    expect_refused("--as-group runs all of group 'Burn', and a part of it is to be left out: leave "
                   "--as-group out",
                   {"--as-group", "--skip", "x/Burn/Item"});
    // the first of that name is all that a path reaches
    const std::string twice = group_of({{"Item", kPasses}, {"Other", kPasses}, {"Item", kPasses}});
    EXPECT_THAT(listed({"--force", "P/G/I*"}, twice), ElementsAre("P/G/Item"));
    expect_refused("item 'Other' of group 'G' cannot be run by its name: run the whole group, or "
                   "see fptest check",
                   {"--force", "--quiet", "P/G/O*"}, kShifted);
}

} // namespace
