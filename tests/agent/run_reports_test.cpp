// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Runs with reports: that all of them tell the same, of whatever items report and
// print.
#include "run_test.h"

#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <optional>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

namespace fs = std::filesystem;

namespace
{

// --- the reports ---------------------------------------------------------------------

TEST_F(RunCommand, TellsTheSameCountsInEveryReport)
{
    // one of each kind of end
    const std::string text = plan_of(
        {{"A #1", {{"Item", "report 'A #1' 100 0 fine"}, {"Other", "report 'A #1' 100 1 bad"}}},
         {"B",
          {{"Third", "say nothing"}, {"Stubborn", "sleep 60"}, {"Fourth", "report B 100 0 x"}}}});
    const Ended ended = run({"--tap", "--junit", work("junit"), "--timeout", "0.6", "--plan",
                             plan(text), "P/A #1", "P/B"});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(tally_of_json(json()), (Tally{2, 3, 0}));
    EXPECT_EQ(tally_of_junit(junit()), (Tally{2, 3, 0}));
    EXPECT_EQ(tally_of_tap(ended.out), (Tally{2, 3, 0}));
    const Tap tap = parse_tap(ended.out);
    EXPECT_EQ(tap.version, "14");
    EXPECT_EQ(tap.points.at(0).name, "A #1");
    EXPECT_EQ(tap.points.at(1).name, "B");
    EXPECT_EQ(tap.points.at(1).inside.at(1).name, "Stubborn");
    EXPECT_FALSE(tap.bail_out);
    EXPECT_EQ(events("finish").at(0).at("finished"), true);
    for (const Element &suite : parse_xml(junit()).all("testsuite")) {
        EXPECT_EQ(suite.properties()["finished"], "true");
    }
}

// As after a text that was cut to a size, and of Java's own UTF-8.
TEST_F(RunCommand, ReportWithAPartOfACharacterCostsNoOther)
{
    run_group({{"Item", "report G 100 0 $(printf '25\\302')"},
               {"Other", "report G 100 0 $(printf '\\355\\240\\275')"},
               {"Third", kPasses}});
    EXPECT_THAT(outcomes(), Each(EndsWith(": passed")));
    EXPECT_EQ(end_of(0).at("description"), "25\uFFFD");
    EXPECT_THAT(events("late"), IsEmpty());
    const Ended again = run({"P/G/Third"});
    EXPECT_EQ(again.status, 0) << again.err;
}

// The library takes every plan for UTF-8, and saves it as that.
TEST_F(RunCommand, ReportBeyondAPlansDeclaredEncodingCostsNoLaterRun)
{
    std::string text = "<?xml version='1.0' encoding='us-ascii'?>" +
                       group_of({{"Item", "report G 100 0 25*C"}, {"Other", kPasses}});
    text.replace(text.find('*'), 1, "&#176;");
    EXPECT_EQ(run({"--plan", plan(text), "P/G"}).status, 0);
    const Ended again = run({"P/G/Other"});
    EXPECT_EQ(again.status, 0) << again.err;
}

TEST_F(RunCommand, WritesJsonToStandardOutputInPlaceOfTheView)
{
    const Ended ended =
        run_fptest({"run", "--json", "-", "--plan", plan(group_of(kThreeThatNote)), "P/G"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(tally_of_json(ended.out), (Tally{3, 0, 0}));
}

TEST_F(RunCommand, IsATestForProve)
{
    support::write_file(kPlanFile, plan_of({{"G", {{"Item", kPasses}}},
                                            {"Bad", {{"Other", "report Bad 100 1 x"}}}}));
    Lines arguments = {"/usr/bin/prove", "--exec", "/system/bin/fptest run --tap", "P/G"};
    Ended ended = run_program(arguments);
    EXPECT_EQ(ended.status, 0) << ended.out;
    EXPECT_THAT(ended.out, HasSubstr("All tests successful."));
    EXPECT_THAT(ended.out, HasSubstr("Result: PASS"));
    arguments.emplace_back("P/Bad");
    ended = run_program(arguments);
    EXPECT_EQ(ended.status, 1) << ended.out;
    EXPECT_THAT(ended.out, HasSubstr("Failed test:  1"));
    EXPECT_THAT(ended.out, HasSubstr("Files=2, Tests=2"));
    EXPECT_THAT(ended.out, HasSubstr("Result: FAIL"));
}

TEST_F(RunCommand, TellsAHostileDescriptionTheSameInEveryReport)
{
    const std::string plain =
        "]]> <a b='c'>&amp;\"</a> # SKIP \\ x # TODO\none\nok 1 - faked\n1..7\n"
        "Bail out!\n" +
        std::string(10000, 'x');
    file("description", "a\x01"
                        "b\x1b[2Jc\x7f \xff\xc3(\xed\xa0\x80z " +
                            plain);
    const Ended ended = run_group({{"Item", "report-file G 100 1 /tmp/scene/description say '#' "
                                            "complain-file /tmp/scene/description"}},
                                  {"--tap", "--junit", work("junit")});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(tally_of_json(json()), (Tally{0, 1, 0}));
    EXPECT_EQ(tally_of_junit(junit()), (Tally{0, 1, 0}));
    EXPECT_EQ(tally_of_tap(ended.out), (Tally{0, 1, 0}));

    const std::string in_json = description(0);
    EXPECT_THAT(in_json, StartsWith("a␁b␛[2Jc␡ ��("));
    EXPECT_THAT(in_json, EndsWith("z " + plain));
    const Element test = parse_xml(junit()).children.at(0).all("testcase").at(0);
    EXPECT_EQ(test.properties()["description"], in_json);
    EXPECT_EQ(parse_tap(ended.out).points.at(0).inside.at(0).diagnosis.at("description"), in_json);
    EXPECT_EQ(test.all("system-out").at(0).text, "#\n" + in_json + "\n");
    EXPECT_EQ(output(0), "#\n" + in_json + "\n");
}

// --- what items print ------------------------------------------------------------------

TEST_F(RunCommand, KeepsWhatItemsPrintForTheReports)
{
    const Ended ended =
        run_group({{"Item", "say out complain err report G 100 0 fine"}, {"Other", kPasses}},
                  {"--junit", work("junit")});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(without_times(ended.out), work("plan.xml") + ": 2 items, vendor 0\n"
                                                           "G/Item: passed, result 0, T s: fine\n"
                                                           "G/Other: passed, result 0, T s: fine\n"
                                                           "2 passed, 0 failed, T s\n");
    EXPECT_EQ(output(0), "out\nerr\n");
    EXPECT_EQ(output(1), "");
    const auto tests = parse_xml(junit()).children.at(0).all("testcase");
    EXPECT_EQ(tests.at(0).all("system-out").at(0).text, "out\nerr\n");
    EXPECT_THAT(tests.at(1).all("system-out"), IsEmpty());
}

TEST_F(RunCommand, KeepsApartWhatItemsPrintThoughItComesLate)
{
    FptestProcess fptest(with_group(
        {{"Item", "say one note /tmp/scene/begun await /tmp/scene/go report G 100 0 x complain 1"},
         {"Other", "say two report G 100 0 x"},
         {"Third", "say three report G 100 0 x"},
         {"Fourth", "say four note /tmp/scene/last await /tmp/scene/end report G 100 0 x"}},
        {"--as-group"}));
    ASSERT_TRUE(wait_for_file("begun"));
    fptest.signal(SIGSTOP);
    file("go", "");
    ASSERT_TRUE(eventually([] { return running_items().empty(); }, 30));
    fptest.signal(SIGCONT);
    ASSERT_TRUE(wait_for_file("last"));
    file("end", "");
    EXPECT_EQ(fptest.wait().status, 0);
    EXPECT_EQ(output(0), "one\n1\n");
    EXPECT_EQ(output(1), "two\n");
    EXPECT_EQ(output(2), "three\n");
    EXPECT_EQ(output(3), "four\n");
}

// As "> /dev/stderr" does: the file is no pipe.
TEST_F(RunCommand, KeepsWhatIsPrintedAfterAnItemHasTruncatedItsOutput)
{
    run_group(
        {{"Item", "flood 30000"},
         {"Script", "'echo before; sleep 0.2; echo checking >/dev/stderr; sleep 0.2; echo after'"},
         {"Other", "say other sleep 0.2 complain again"},
         {"Third", "flood 60000"}});
    EXPECT_EQ(output(1), "before\nchecking\nafter\n");
    EXPECT_EQ(output(2), "other\nagain\n");
    EXPECT_THAT(output(3), StartsWith("line 1\nline 2\n"));
    EXPECT_THAT(end_of(1).at("warning").get<std::string>(),
                StartsWith("it has opened its output anew"));
    EXPECT_EQ(end_of(2).at("warning"), nullptr);
}

TEST_F(RunCommand, TakesWhatAGathererPrintsJustAfterItsReportForItsOwn)
{
    run_group({{"SensorProbe", "--help; exec /system/bin/Item gather report-here G SensorProbe 100 "
                               "0 fine sleep 0.02 say '#measure v 5 V 0 1' sleep 60"},
               {"Item", kPasses}},
              {"--judge-limits"});
    EXPECT_THAT(outcomes(), ElementsAre("SensorProbe: failed", "Item: passed"));
    EXPECT_THAT(output(0), EndsWith("#measure v 5 V 0 1\n"));
}

TEST_F(RunCommand, KeepsTheEndOfALongOutput)
{
    const Ended ended = run_group(
        {{"Item", "flood 1000000 say 'the last line' report G 100 1 x"}, {"Other", "say short"}});
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(output(0), EndsWith("\nthe last line\n"));
    EXPECT_GE(output(0).size(), 10000U);
    EXPECT_LE(output(0).size(), 65536U);
    EXPECT_EQ(output(1), "short\n");
}

// The memory that a process holds in a file without a name, in bytes.
long long memory_behind(const std::string &descriptor)
{
    struct stat status {
    };
    EXPECT_EQ(stat(descriptor.c_str(), &status), 0) << descriptor;
    return status.st_blocks * 512LL;
}

TEST_F(RunCommand, HoldsNoMoreOfAnOutputThanItTells)
{
    FptestProcess fptest(with_group(
        {{"Item", "flood 60000000 say end note /tmp/scene/printed await /tmp/scene/go"}}));
    ASSERT_TRUE(wait_for_file("printed"));
    const std::string held = "/proc/" + std::to_string(fptest.library()) + "/fd/1";
    EXPECT_TRUE(eventually([&] { return memory_behind(held) < 1000000; })) << memory_behind(held);
    const std::string highest = device::status_field(fptest.pid(), "VmHWM");
    EXPECT_LT(std::stol(highest), 50000) << highest;
    file("go", "");
    EXPECT_EQ(fptest.wait().status, 1);
    EXPECT_THAT(output(0), EndsWith("end\n"));
}

TEST_F(RunCommand, StartsItemsAsAnyProgramIsStarted)
{
    FptestProcess fptest(
        with_group({{"Item", "note /tmp/scene/begun await /tmp/scene/go report G 100 0 x"}},
                   {"--junit", work("junit")}));
    ASSERT_TRUE(wait_for_file("begun"));
    const pid_t item = processes_named("/system/bin/Item").at(0).pid;
    EXPECT_EQ(std::stoull(device::status_field(item, "SigBlk"), nullptr, 16), 0U);
    // the C library's own after the usual ones are the caller's
    EXPECT_EQ(std::stoull(device::status_field(item, "SigIgn"), nullptr, 16) & 0x7fffffffU, 0U);
    EXPECT_NE(getpgid(item), getpgid(fptest.pid())) << "Ctrl-C would reach it";
    // of those that the library leaves open, and of nothing else
    for (const auto &entry : fs::directory_iterator("/proc/" + std::to_string(item) + "/fd")) {
        const std::string name = entry.path().filename();
        const std::string target = fs::read_symlink(entry.path());
        if (name == "0") {
            EXPECT_EQ(target, "/dev/null");
        } else if (name == "1" || name == "2") {
            EXPECT_EQ(target, "/memfd:fptest-output (deleted)");
        } else {
            // the last of them it is only just closing
            EXPECT_TRUE(target == kPlanFile || target == device::kLogFile ||
                        target == std::string(kPlanFile) + " (deleted)" || target == work("begun"))
                << target;
        }
    }
    file("go", "");
    EXPECT_EQ(fptest.wait().status, 0);
}

// --- reports that cannot be written ----------------------------------------------------

TEST_F(RunCommand, RunsNothingWhereItsTapCannotBeWritten)
{
    const Start start{
        .arguments = {"run", "--tap", "--plan", plan(group_of({{"Item", kPasses}})), "P/G"},
        .output = "/dev/full"};
    const Ended ended = run_fptest(start);
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err, "fptest: the TAP output: No space left on device; nothing was run\n");
}

TEST_F(RunCommand, GoesOnWithoutAReportThatCannotBeWrittenAnyMore)
{
    const std::string fifo = work("json");
    ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
    Descriptor reader(open(fifo.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
    FptestProcess fptest(
        with_group({{"Item", "note /tmp/scene/begun await /tmp/scene/go report G 100 0 x"},
                    {"Other", kPasses}}));
    ASSERT_TRUE(wait_for_file("begun"))
        << fptest.out() << fptest.err() << read_file(device::kLogFile);
    reader = Descriptor(-1);
    file("go", "");
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err, "fptest: /tmp/scene/json: Broken pipe; the run went on all the same\n");
    EXPECT_THAT(ended.out, HasSubstr("\n2 passed, 0 failed, "));
}

TEST_F(RunCommand, NamesEveryReportThatFailsThoughTheRunIsInterrupted)
{
    for (const int signal : {0, SIGINT}) {
        std::vector<Descriptor> readers;
        for (const std::string name : {"json", "junit"}) {
            unlink(work(name).c_str());
            ASSERT_EQ(mkfifo(work(name).c_str(), 0600), 0);
            readers.emplace_back(open(work(name).c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
        }
        const std::string text = device::group_of(
            {{"Item", "note /tmp/scene/begun await /tmp/scene/go report G 100 0 x"}});
        FptestProcess fptest(
            {"run", "--json", work("json"), "--junit", work("junit"), "--plan", plan(text), "P/G"});
        ASSERT_TRUE(wait_for_file("begun"));
        readers.clear();
        signal == 0 ? static_cast<void>(file("go", "")) : fptest.signal(signal);
        const Ended ended = fptest.wait();
        EXPECT_EQ(ended.status, signal == 0 ? 3 : 130);
        EXPECT_THAT(ended.err, HasSubstr(work("json") + ": Broken pipe"));
        EXPECT_THAT(ended.err, HasSubstr(work("junit") + ": Broken pipe"));
        unlink(work("go").c_str());
        unlink(work("begun").c_str());
    }
}

TEST_F(RunCommand, CountsNoOutputOfEarlierItemsAgainstTheLimitOfFiles)
{
    const Items items = {{"Script", "'head -c 12000 /dev/zero; fptest report G Script "
                                    "--progress 100 --result 0'"}};
    const std::string path = plan(group_of(items));
    EXPECT_EQ(run_limited("-f 60", {"run", "--repeat", "4", "--plan", path, "P/G"}).status, 0);
}

TEST_F(RunCommand, GoesOnWhereAReportIsTooLongForTheLimitOfFiles)
{
    const Ended ended =
        run_limited("-f 2", with_group({{"Item", kPasses}}, {"--repeat", "20", "--quiet"}));
    EXPECT_EQ(ended.status, 3);
    EXPECT_THAT(ended.err, EndsWith("fptest: /tmp/scene/json: File too large; the run "
                                    "went on all the same\n"));
}

} // namespace
