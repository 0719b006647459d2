// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A gatherer that an earlier run has left: what it keeps of that, and who ends it.
#include "gatherer.h"

#include <csignal>
#include <filesystem>

namespace fs = std::filesystem;

namespace
{

using EarlierGatherer = RunCommand;

constexpr char kEndedFirst[] =
    "fptest: the running gatherer is ended first: it may have kept an earlier plan, and would "
    "write it back\n";

TEST_F(EarlierGatherer, IsEndedWithItsHelpers)
{
    if (is_in_place()) {
        GTEST_SKIP() << "a shell cannot have another name there";
    }
    const support::Process gatherer(
        {.arguments = {"sh", "-c",
                       "exec -a " + std::string(kProbe) +
                           " sh -c '/system/bin/Item gather; /system/bin/Third ignore-stop sleep "
                           "1.2 report-here G SensorProbe 100 0 helper & wait'"}});
    ASSERT_TRUE(eventually([] { return !processes_named(kProbe).empty(); }));
    run_group({{"SensorProbe", "--help; exec sleep 30"}},
              {"--repeat", "2", "--timeout", "0.5", "--grace", "0.3"});
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: timed out", "SensorProbe: timed out"));
    EXPECT_THAT(events("progress"), IsEmpty());
}

TEST_F(EarlierGatherer, IsEndedLestItWriteAnotherPlanBack)
{
    std::string words = "gather report-here G SensorProbe 100 0 done ignore-stop";
    for (int times = 0; times < 60; ++times) {
        words += " sleep 0.05 report-here G SensorProbe 50 -2 more";
    }
    const Items before = {{"SensorProbe", "--group G --seconds 0"}, {"Item", kPasses}};
    Items after = before;
    after[1].args += " say more";
    for (const std::string way : {"--quiet", "--as-group"}) {
        SCOPED_TRACE(way);
        write_file(kPlanFile, group_of(before));
        const Gatherer gatherer(words);
        EXPECT_EQ(run({"P/G/SensorProbe"}).err,
                  "fptest: a gatherer is running already, as '/system/bin/SensorProbe " + words +
                      "': the library triggers that one, and starts none\n");
        const Ended ended = run_group(after, {way, "--grace", "0.5"});
        EXPECT_EQ(ended.err, way == "--quiet" ? "" : kEndedFirst);
        EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: passed", "Item: passed"));
        EXPECT_THAT(read_file(kPlanFile), HasSubstr("say more"));
        for (const device::Process &process : processes_named(kProbe)) {
            kill(process.pid, SIGKILL);
        }
        EXPECT_TRUE(eventually([] { return processes_named(kProbe).empty(); }));
    }
}

TEST_F(EarlierGatherer, IsEndedAsItMayStillWorkForARunThatWasKilled)
{
    const Items items = {{"SensorProbe", "--group G --seconds 0"}};
    const Gatherer gatherer("gather note /tmp/scene/gathering sleep 60");
    FptestProcess fptest(with_group(items));
    ASSERT_TRUE(wait_for_file("gathering"));
    fptest.signal(SIGKILL);
    fptest.wait();
    const Ended ended = run_group(items);
    EXPECT_EQ(ended.err, kEndedFirst);
    EXPECT_THAT(ended.out, HasSubstr("gathering 1, 64 samples\n"));
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: passed"));
    EXPECT_THAT(events("late"), IsEmpty());
}

TEST_F(EarlierGatherer, IsEndedWhereItsProgramIsAnotherFileNow)
{
    const Lines group = with_group({{"SensorProbe", "--group G --seconds 0"}});
    EXPECT_EQ(run_fptest(group).status, 0);
    const Ended same = run_fptest(group);
    EXPECT_EQ(same.err, "");
    EXPECT_THAT(same.out, HasSubstr("gathering 2, 64 samples\n"));

    ASSERT_TRUE(fs::copy_file(kProbe, work("SensorProbe")));
    ASSERT_EQ(kill(processes_named(kProbe).at(0).pid, SIGKILL), 0);
    ASSERT_TRUE(eventually([] { return processes_named(kProbe).empty(); }));
    const support::Process gatherer(
        {.arguments = {"sh", "-c",
                       "exec -a " + std::string(kProbe) + " " + work("SensorProbe") +
                           " --group G --seconds 0"}});
    ASSERT_TRUE(eventually([] { return !processes_named(kProbe).empty(); }));
    fs::remove(work("SensorProbe"));
    const Ended ended = run_fptest(group);
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "fptest: the running gatherer is ended first: its program has been "
                         "replaced since it started\n");
    EXPECT_THAT(ended.out, HasSubstr("gathering 1, 64 samples\n"));
    EXPECT_EQ(run_fptest(group).err, "");
}

TEST_F(EarlierGatherer, IsNotTakenForReplacedWhereItsWrapperGivesItsOwnName)
{
    ASSERT_TRUE(fs::copy_file("/system/bin/Item", work("SensorProbe.real")));
    const Lines group = with_group(
        {{"SensorProbe", "--help; exec -a " + std::string(kProbe) + " " + work("SensorProbe.real") +
                             " gather report G 100 0 one gather report G 100 0 two sleep 60"}});
    EXPECT_EQ(run_fptest(group).status, 0);
    EXPECT_THAT(run_fptest(group).err, Not(HasSubstr("replaced")));
}

TEST_F(EarlierGatherer, MayKeepItsCopyWhileThePlanIsStoredAnew)
{
    const Gatherer gatherer("gather report-here G SensorProbe 100 0 one gather report-here G "
                            "SensorProbe 100 0 two sleep 60");
    const Lines group = with_group({{"SensorProbe", ""}, {"Item", kPasses}});
    EXPECT_EQ(run_fptest(group).status, 0);
    EXPECT_EQ(run({"--plan", work("plan.xml"), "P/G/Item"}).status, 0);
    EXPECT_EQ(run_fptest(group).status, 0);
}

TEST_F(EarlierGatherer, HasNoResultFromWhatItsCopyOfThePlanSaysOfAnEarlierRun)
{
    const Gatherer gatherer("gather report-here G SensorProbe 100 0 one gather report-here G Item "
                            "0 -2 'by it' sleep 0.2 report-here G SensorProbe 100 1 two sleep 60");
    const Items items = {{"SensorProbe", ""}, {"Item", kPasses}};
    run_group(items);
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: passed", "Item: passed"));
    run_group(items);
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: failed", "Item: passed"));
}

// What they say is the same in every run, and each saves its own copy of the plan.
TEST_F(EarlierGatherer, IsNotTakenForTheOneAfterIt)
{
    const Items items = {{"Item", kPasses},
                         {"SensorProbe", "--help; exec -a /system/bin/SensorProbe /system/bin/Item "
                                         "gather report-here G SensorProbe 100 1 bad "
                                         "gather report-here G SensorProbe 100 0 good sleep 60"}};
    for (int run = 1; run <= 3; ++run) {
        run_group(items, {"--judge-limits", "--retry", "1", "--timeout", "3"});
        EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "SensorProbe: flaky")) << run;
    }
}

} // namespace
