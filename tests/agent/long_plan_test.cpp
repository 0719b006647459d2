// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Plans that are longer than what a command stores, and files that are longer than
// any plan.
#include "fptest_runner.h"

#include <filesystem>

namespace fs = std::filesystem;

namespace
{

using LongPlan = FptestTest;

constexpr std::size_t kLimit = 2048;

// Groups of items that report their own result each, and the paths of the groups.
struct Plan {
    std::string text;
    Lines paths;
};

Plan plan_of_groups(int count, const std::string &description)
{
    const Lines names = {"Item", "Other", "Third"};
    Plan plan;
    std::vector<std::pair<std::string, std::vector<device::PlanItem>>> groups;
    for (int number = 0; number < count; ++number) {
        const std::string group = "G" + std::to_string(number);
        std::vector<device::PlanItem> items;
        for (const std::string &name : names) {
            items.push_back(
                {name, "report " + group + " 100 " +
                           std::string(name == "Third" && number % 10 == 7 ? "1" : "0") + " " +
                           description + std::to_string(number)});
        }
        groups.push_back({group, items});
        plan.paths.push_back("P/" + group);
    }
    plan.text = plan_of(groups);
    return plan;
}

std::string placed(const std::string &name, const std::string &text)
{
    return "fptest: " + name + ": its " + std::to_string(text.size()) +
           " bytes are more than the 2048 that a command stores, so it is placed as the file "
           "/data/vorlane/src1.xml\n";
}

TEST_F(LongPlan, OfAHundredAndFiftyItemsIsPlacedAndRun)
{
    const Plan long_plan = plan_of_groups(50, "at");
    ASSERT_GT(long_plan.text.size(), kLimit);
    // an earlier one with the same names, which the library has looked at by then
    write_file(kPlanFile, plan_of({{"G7", {{"Third", "report G7 100 0 old"}}}}));
    Lines arguments = {"run", "--plan", plan(long_plan.text)};
    arguments.insert(arguments.end(), long_plan.paths.begin(), long_plan.paths.end());
    const Ended ended = run_fptest(arguments);
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, placed("/tmp/scene/plan.xml", long_plan.text));
    const Lines lines = lines_of(without_times(ended.out));
    ASSERT_THAT(lines, SizeIs(152));
    EXPECT_EQ(lines[0], "/tmp/scene/plan.xml: 150 items, vendor 0");
    EXPECT_THAT(lines[1], StartsWith("G0/Item: passed, result 0, "));
    EXPECT_THAT(lines[24], StartsWith("G7/Third: failed, result 1, "));
    EXPECT_THAT(lines[24], EndsWith(": at7"));
    EXPECT_THAT(lines[150], StartsWith("G49/Third: passed, result 0, "));
    EXPECT_THAT(lines[151], StartsWith("145 passed, 5 failed, "));
    const Lines table = lines_of(run_fptest({"show"}).out);
    ASSERT_THAT(table, SizeIs(151));
    EXPECT_EQ(table[150], "G49    Third       100       0  at49");
    EXPECT_FALSE(fs::exists(std::string(kPlanFile) + ".new"));
}

TEST_F(LongPlan, MayComeFromStandardInputAndHoldColons)
{
    const Plan long_plan = plan_of_groups(20, "12:30,");
    ASSERT_GT(long_plan.text.size(), kLimit);
    const Ended ended = run_fptest({"run", "--plan", "-", "P/G19/Item"}, long_plan.text);
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, placed("<stdin>", long_plan.text));
    EXPECT_THAT(ended.out, HasSubstr("G19/Item: passed, result 0, "));
    EXPECT_THAT(ended.out, HasSubstr(": 12:30,19\n"));
}

TEST_F(LongPlan, IsPlacedWithoutAWordWhereItIsToBeQuiet)
{
    const Ended ended =
        run_fptest({"run", "--quiet", "--plan", plan(plan_of_groups(20, "").text), "P/G0/Item"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "");
}

TEST_F(LongPlan, IsNotPlacedWhereNothingIsRun)
{
    const std::string old = plan_of({{"Old", {{"Item", ""}}}});
    write_file(kPlanFile, old);
    const std::string file = plan(plan_of_groups(20, "").text);
    EXPECT_EQ(run_fptest({"run", "--plan", file, "--list"}).err, "");
    EXPECT_EQ(run_fptest({"run", "--plan", file, "P/None"}).status, 2);
    EXPECT_EQ(read_file(kPlanFile), old);
}

TEST_F(LongPlan, IsCutAtTheCommandsLimitWithAsSent)
{
    const Plan long_plan = plan_of_groups(20, "");
    const std::string file = plan(long_plan.text);
    Ended ended = run_fptest({"run", "--as-sent", "--plan", file, "P/G0/Item"});
    EXPECT_EQ(ended.status, 2);
    EXPECT_EQ(ended.out, "");
    EXPECT_THAT(ended.err, HasSubstr(" more than the 2048 that a command stores: the plan would be "
                                     "cut here, and the library would "));
    EXPECT_THAT(ended.err, HasSubstr("; shorten it, or have fptest run --plan place it as a "
                                     "file, without --as-sent\n"));
    EXPECT_FALSE(fs::exists(kPlanFile));

    // cut where it still loads
    std::string cut = group_of({{"Item", "report G 100 0 a"}});
    cut += std::string(kLimit, ' ') + "\n";
    ended = run_fptest({"run", "--as-sent", "--plan", plan(cut), "P/G"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(ended.err, "");
    cut += "<!-- -->";
    ended = run_fptest({"run", "--as-sent", "--force", "--plan", plan(cut), "P/G"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(ended.err, "fptest: the plan has errors: see fptest check /tmp/scene/plan.xml\n");

    expect_refusal(2, "fptest: --as-sent is of no use without --plan FILE, which is sent",
                   {"run", "--as-sent", "P/G"});
}

TEST_F(LongPlan, IsCheckedForHowItIsStored)
{
    const Plan long_plan = plan_of_groups(20, "12:30,");
    const std::string size = std::to_string(long_plan.text.size());
    const std::string file = plan(long_plan.text);
    Ended ended = run_fptest({"check", "--for", "file", file});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out,
              file + ": 0 errors, 0 warnings (20 groups, 60 items, " + size + " bytes)\n");
    ended = run_fptest({"check", "--for", "command", file});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(lines_of(ended.out).back(),
              file + ": 2 errors, 0 warnings (20 groups, 60 items, " + size + " of 2048 bytes)");
    EXPECT_EQ(run_fptest({"check", file}).out, ended.out);
    expect_refusal(2, "fptest: --for: 'both' is neither command nor file; see fptest check --help",
                   {"check", "--for", "both", file});
}

TEST_F(LongPlan, WithWarningsNamesTheCheckThatTellsThem)
{
    std::string text = plan_of_groups(20, "").text;
    text.replace(text.find("report G0 100"), 0, "# ");
    const Ended ended = run_fptest({"run", "--plan", plan(text), "P/G1/Item"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "fptest: the plan has warnings: see fptest check --for file "
                         "/tmp/scene/plan.xml\n" +
                             placed("/tmp/scene/plan.xml", text));
}

TEST_F(LongPlan, LeavesTheOldOneOnAFullDisk)
{
    if (is_in_place()) {
        GTEST_SKIP() << "in place, the disk is the container's own and is not to be filled";
    }
    const std::string old = plan_of({{"Old", {{"Item", ""}}}});
    write_file(kPlanFile, old);
    const Plan long_plan = plan_of_groups(100, "");
    fill_disk();
    const Ended ended = run_fptest({"run", "--plan", plan(long_plan.text), "P/G0/Item"});
    EXPECT_EQ(ended.status, 3);
    EXPECT_THAT(lines_of(ended.err), SizeIs(1)) << ended.err;
    EXPECT_EQ(read_file(kPlanFile), old);
}

// --- longer than any plan -----------------------------------------------------------

TEST_F(LongPlan, IsReadUpToSixteenMebibytes)
{
    const std::string why = "longer than the 16 MiB that fptest reads";
    expect_refusal(2, "fptest: /dev/zero: " + why, {"check", "/dev/zero"});
    expect_refusal(2, "fptest: /dev/zero: " + why, {"show", "/dev/zero"});
    expect_refusal(2, "fptest: /dev/zero: " + why, {"run", "--plan", "/dev/zero", "P/G"});
    const std::string text = group_of({{"Item", ""}});
    const std::size_t most = 16U << 20U;
    const std::string longest = text + std::string(most - text.size(), '\n');
    Ended ended = run_fptest({"check", "--for", "file", "-"}, longest);
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "<stdin>: 0 errors, 0 warnings (1 group, 1 item, " + std::to_string(most) +
                             " bytes)\n");
    ended = run_fptest({"check", "--for", "file", "-"}, longest + "\n");
    EXPECT_EQ(ended.status, 2);
    EXPECT_EQ(ended.err, "fptest: -: " + why + "\n");
}

TEST_F(LongPlan, HasAThousandFindingsShownAndNoWarningInAnErrorsPlace)
{
    std::string items;
    for (int number = 0; number < 1001; ++number) {
        // too long for some releases' ps; the shell, which has 5 s for all, is asked of none
        items += "<Cmd name=\"ItemOfManyLetters" + std::to_string(number) + "\" args=\"a\"/>";
    }
    items += "<Cmd name=\"last\"/>";
    const Ended ended = run_fptest({"check", "--for", "file", "-"},
                                   "<P><CmdGroup name=\"G\">" + items + "</CmdGroup></P>");
    EXPECT_EQ(ended.status, 1);
    const Lines lines = lines_of(ended.out);
    ASSERT_THAT(lines, SizeIs(3002));
    EXPECT_THAT(lines[2997], HasSubstr(": error: item 'last' "));
    EXPECT_EQ(lines[3000], "<stdin>: 2 more are not shown");
    EXPECT_THAT(lines[3001], StartsWith("<stdin>: 1 error, 1001 warnings (1 group, 1002 items, "));
}

} // namespace
