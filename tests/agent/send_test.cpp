// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Raw commands, one process for all of them.
#include "fptest_runner.h"

#include <algorithm>
#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <sys/file.h>
#include <thread>
#include <unistd.h>

namespace
{

using namespace std::string_literals;

using Send = FptestTest;

TEST_F(Send, PrintsALineForEachReply)
{
    const Ended ended = run_fptest({"send", "pingtest", "unknown::x", "XMLFile::<P/>"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "Ping Success!\n\n\n");
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(read_file(kPlanFile), "<P/>");
}

TEST_F(Send, HandsAllCommandsToOneProcess)
{
    // the library answers one ping in the life of a process
    EXPECT_EQ(run_fptest({"send", "pingtest", "pingtest"}).out, "Ping Success!\n\n");
    EXPECT_EQ(run_fptest({"send", "pingtest"}).out, "Ping Success!\n");
}

TEST_F(Send, PassesCommandsOnAsTheyAre)
{
    EXPECT_EQ(run_fptest({"send", "", "XMLFile::<P>\n\t::</P>", "::XMLNodePath::::a/b c"}).out,
              "\n\n\n");
    EXPECT_EQ(read_file(kPlanFile), "<P>\n\t");
    EXPECT_THAT(paths_run(), ElementsAre("a/b c"));
}

TEST_F(Send, SaysThatAPlanWasNotStored)
{
    if (is_in_place()) {
        GTEST_SKIP() << "in place, the disk is the container's own and is not to be filled";
    }
    fill_disk();
    const Ended ended = run_fptest({"send", "pingtest", "XMLFile::<P>::</P>", "XMLNodePath::P/G"});
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.out, "Ping Success!\n\n"); // no reply to what was not sent any more
    EXPECT_EQ(ended.err, "fptest: the plan was not stored: 0 of 3 bytes are in "
                         "/data/vorlane/src1.xml; make room and store it again, or see "
                         "why with --log FILE\n");
    EXPECT_THAT(paths_run(), ElementsAre());
}

TEST_F(Send, StoresWhatACommandCanHold)
{
    const std::string text = "<P>" + std::string(3000, ' ') + "</P>";
    EXPECT_EQ(run_fptest({"send", "XMLFile::" + text}).status, 0);
    EXPECT_EQ(read_file(kPlanFile), text.substr(0, 2048));
    EXPECT_EQ(run_fptest({"send", ":XMLFiles:::a:b"}).status, 0);
    EXPECT_EQ(read_file(kPlanFile), "a");
    EXPECT_EQ(run_fptest({"send", "XMLFile"}).status, 0);
    EXPECT_EQ(read_file(kPlanFile), "");
}

TEST_F(Send, ReadsAndWritesZeroBytesWhereThatIsWanted)
{
    Ended ended = run_fptest({"send", "-0"}, "pingtest\0pingtest\0"s);
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "Ping Success!\0\0"s);
    // the last one needs no zero byte, and an empty command is one as well
    ended = run_fptest({"send", "-0"}, "\0XMLFile::<P>\n</P>\0pingtest"s);
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "\0\0Ping Success!\0"s);
    EXPECT_EQ(read_file(kPlanFile), "<P>\n</P>");
    ended = run_fptest({"send", "-0"}, "");
    EXPECT_EQ(ended.status, 2);
    EXPECT_EQ(ended.err, "fptest: no command can be read from standard input\n");
    ended = run_fptest({"send", "-0"}, std::string((16U << 20U) + 1, 'x'));
    EXPECT_EQ(ended.status, 2);
    EXPECT_EQ(ended.err, "fptest: no command can be read from standard input: longer than the 16 "
                         "MiB that fptest reads\n");
}

TEST_F(Send, StoresAndRunsAPlan)
{
    const std::string text = group_of({{"Item", "note /tmp/scene/order report G 100 0 a"},
                                       {"Other", "note /tmp/scene/order report G 100 1 b"}});
    const Ended ended = run_fptest({"send", "-0"}, "XMLFile::" + text + '\0' + "XMLNodePath::P/G" +
                                                       '\0' + "pingtest" + '\0');
    // what the items make of it is not looked at
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "\0\0Ping Success!\0"s);
    EXPECT_EQ(read_file(work("order")), "Item\nOther\n");
    EXPECT_THAT(paths_run(), ElementsAre("P/G"));
    EXPECT_THAT(run_fptest({"show"}).out, HasSubstr("G      Other       100       1  b\n"));
}

TEST_F(Send, PrintsWhatItemsPrintToStandardError)
{
    write_file(kPlanFile, group_of({{"Item", "say out complain err"}, {"Other", "say 2"}}));
    const Ended ended = run_fptest({"send", "XMLNodePath::P/G", "pingtest"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "\nPing Success!\n");
    for (const std::string text : {"out\nerr\n", "2\n", "vendor = 0\n"}) {
        EXPECT_THAT(ended.err, HasSubstr(text));
    }
}

TEST_F(Send, ShowsWhatAnItemPrintsWhileItRuns)
{
    write_file(kPlanFile, group_of({{"Item", "say begun await /tmp/scene/go"}}));
    FptestProcess fptest({"send", "pingtest", "XMLNodePath::P/G", "XMLNodePath::P/G"});
    EXPECT_TRUE(eventually([&] { return fptest.err().find("begun\n") != std::string::npos; }, 30));
    // a reply as soon as there is one
    EXPECT_EQ(fptest.out(), "Ping Success!\n");
    file("go", "");
    EXPECT_EQ(fptest.wait().status, 0);
}

TEST_F(Send, GivesItemsNoInput)
{
    write_file(kPlanFile, group_of({{"Item", "count-input"}}));
    EXPECT_THAT(run_fptest({"send", "-0"}, "XMLNodePath::P/G/Item\0pingtest"s).err,
                HasSubstr("0 bytes of input\n"));
    EXPECT_THAT(run_fptest({"send", "XMLNodePath::P/G/Item"}, "text").err,
                HasSubstr("0 bytes of input\n"));
}

TEST_F(Send, WritesTheLibrarysLogWhereItIsTold)
{
    EXPECT_EQ(run_fptest({"send", "--log", work("log"), "XMLNodePath::one/path"}).status, 0);
    EXPECT_EQ(run_fptest({"send", "--log", work("log"), "XMLNodePath::other/path"}).status, 0);
    EXPECT_THAT(paths_run(work("log")), ElementsAre("one/path", "other/path"));
    EXPECT_THAT(paths_run(), IsEmpty());
}

TEST_F(Send, PrintsAllOfALongOutput)
{
    ASSERT_EQ(run_fptest({"send", "XMLFile::" + group_of({{"Item", "flood 1000000"}})}).status, 0);
    const Ended ended = run_fptest({"send", "XMLNodePath::P/G/Item"});
    const auto lines = lines_of(ended.err);
    const auto first = std::ranges::find(lines, "line 1");
    ASSERT_NE(first, lines.end());
    std::size_t number = 0;
    for (auto line = first; line != lines.end() && line->starts_with("line "); ++line) {
        EXPECT_EQ(*line, "line " + std::to_string(++number));
    }
    EXPECT_GT(number, 80000U);
}

TEST_F(Send, PrintsEachOutputWhereItBelongsThoughItIsReadLate)
{
    const std::string text =
        group_of({{"Item", "say one note /tmp/scene/begun await /tmp/scene/go say 1"},
                  {"Other", "say two note /tmp/scene/last await /tmp/scene/end"}});
    FptestProcess fptest({"send", "XMLFile::" + text, "XMLNodePath::P/G"});
    ASSERT_TRUE(wait_for_file("begun"));
    fptest.signal(SIGSTOP);
    file("go", "");
    ASSERT_TRUE(wait_for_file("last"));
    fptest.signal(SIGCONT);
    file("end", "");
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "vendor = 0\none\n1\nvendor = 0\ntwo\n");
}

TEST_F(Send, IsRefusedDuringARun)
{
    const std::string text =
        group_of({{"Item", "note /tmp/scene/begun await /tmp/scene/go report G 100 0 fine"}});
    FptestProcess fptest({"run", "--plan", plan(text), "P/G"});
    ASSERT_TRUE(wait_for_file("begun"));
    FptestProcess sends_plan({"send", "XMLFile::<P/>"});
    FptestProcess sends_path({"send", "XMLNodePath::P/G"});
    for (FptestProcess *refused : {&sends_plan, &sends_path}) {
        const Ended ended = refused->wait();
        EXPECT_EQ(ended.status, 4);
        EXPECT_EQ(ended.out, "");
        EXPECT_THAT(ended.err, StartsWith("fptest: another fptest is running on this device: "));
    }
    EXPECT_EQ(run_fptest({"send", "pingtest"}).out, "Ping Success!\n");
    file("go", "");
    EXPECT_EQ(fptest.wait().status, 0);
}

TEST_F(Send, StopsTheItemOfAnInterruptedCommand)
{
    write_file(kPlanFile, group_of({{"Item", "tell-signal /tmp/scene/signal note /tmp/scene/begun "
                                             "sleep 60"},
                                    {"Other", "note /tmp/scene/after"}}));
    for (const int number : {SIGINT, SIGTERM}) {
        SCOPED_TRACE(number);
        std::filesystem::remove(work("begun"));
        FptestProcess fptest(
            {"send", "pingtest", "XMLNodePath::P/G/Item", "XMLNodePath::P/G/Other"});
        ASSERT_TRUE(wait_for_file("begun"));
        fptest.signal(number);
        const Ended ended = fptest.wait();
        EXPECT_EQ(ended.status, 130);
        EXPECT_EQ(ended.out, "Ping Success!\n");
        expect_items_to_end();
        EXPECT_FALSE(is_there("after"));
    }
    EXPECT_EQ(read_file(work("signal")), "SIGTERM\nSIGTERM\n");
    EXPECT_THAT(processes_stopped(), Not(IsEmpty()));
}

TEST_F(Send, StopsAlsoWhatAnInterruptedGroupWouldStartNext)
{
    const std::string sleeps = "note /tmp/scene/order sleep 60";
    write_file(kPlanFile, group_of({{"Item", sleeps}, {"Other", sleeps}, {"Third", sleeps}}));
    FptestProcess fptest({"send", "XMLNodePath::P/G"});
    ASSERT_TRUE(wait_for_file("order"));
    fptest.signal(SIGINT);
    EXPECT_EQ(fptest.wait().status, 130);
    expect_items_to_end();
    EXPECT_TRUE(eventually([] { return processes_named(FPTEST_PROGRAM).empty(); }, 20));
}

TEST_F(Send, WaitsForTheEndOfAReportBeforeItsPlanIsLoaded)
{
    const std::string text = group_of({{"Item", "note /tmp/scene/ran"}});
    // a report empties the file, and holds its lock until all is written
    write_file(kPlanFile, "");
    const Descriptor report(open(kPlanFile, O_WRONLY | O_CLOEXEC));
    ASSERT_EQ(flock(report.get(), LOCK_EX), 0);
    FptestProcess fptest({"send", "XMLNodePath::P/G/Item"});
    std::this_thread::sleep_for(std::chrono::milliseconds(300));
    EXPECT_FALSE(fptest.has_ended());
    ASSERT_EQ(write(report.get(), text.data(), text.size()), static_cast<ssize_t>(text.size()));
    ASSERT_EQ(flock(report.get(), LOCK_UN), 0);
    EXPECT_EQ(fptest.wait().status, 0);
    EXPECT_TRUE(is_there("ran"));
}

TEST_F(Send, StopsAScriptAsWell)
{
    write_file(kPlanFile,
               group_of({{"Script", "'echo x >/tmp/scene/begun; /system/bin/Third sleep 60'"}}));
    FptestProcess fptest({"send", "XMLNodePath::P/G"});
    ASSERT_TRUE(wait_for_file("begun"));
    fptest.signal(SIGINT);
    EXPECT_EQ(fptest.wait().status, 130);
    expect_items_to_end();
}

TEST_F(Send, SaysThatTheLibrarysProcessEnded)
{
    write_file(kPlanFile, group_of({{"Item", "note /tmp/scene/begun sleep 60"}}));
    FptestProcess fptest({"send", "XMLNodePath::P/G", "pingtest"});
    ASSERT_TRUE(wait_for_file("begun"));
    kill(fptest.library(), SIGKILL);
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.out, "");
    EXPECT_EQ(lines_of(ended.err).back(),
              "fptest: the library's process ended by signal 9; --log FILE keeps what it says");
}

TEST_F(Send, SaysThatRepliesCannotBeWritten)
{
    const Start start{.arguments = {"send", "pingtest", "XMLFile::<P/>"}, .output = "/dev/full"};
    const Ended ended = run_fptest(start);
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err, "fptest: replies cannot be written to standard output\n");
    EXPECT_FALSE(std::filesystem::exists(kPlanFile));
}

TEST_F(Send, WantsADevice)
{
    if (is_in_place()) {
        GTEST_SKIP() << "in place, /system/bin cannot be hidden from one program";
    }
    const Start start{.arguments = {"send", "XMLFile::<P/>"}, .prepare = without_device};
    const Ended ended = run_fptest(start);
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err,
              "fptest: this machine is not a device: there is no /system/bin/sh; on a desk, "
              "run it as: device/run -- fptest ...; see fptest doctor\n");
    EXPECT_FALSE(std::filesystem::exists(kPlanFile));
}

} // namespace
