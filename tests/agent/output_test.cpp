// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Where results go, and readers that do not read them.
#include "fptest_runner.h"
#include "report_files.h"
#include "terminal_session.h"

#include <gmock/gmock.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <array>
#include <csignal>
#include <fcntl.h>
#include <regex>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

using namespace fptest_runner;
using device::read_file;
using device::wait_for;
using report_files::events_of;
using report_files::outcomes;
using report_files::parse_xml;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::SizeIs;

namespace
{

constexpr char kStop[] = "\x13";     // Ctrl-S
constexpr char kContinue[] = "\x11"; // Ctrl-Q

// The first one overruns its time.
constexpr char kTwoItems[] = "<P><CmdGroup name=\"G\">"
                             "<Cmd name=\"Item\" args=\"note /tmp/scene/begun sleep 30\"/>"
                             "<Cmd name=\"Other\" args=\"report G 100 0 fine\"/>"
                             "</CmdGroup></P>";

// It says so much that no pipe holds it.
constexpr char kLoud[] = "<P><CmdGroup name=\"G\">"
                         "<Cmd name=\"Item\" args=\"flood 60000 report G 100 1 loud\"/>"
                         "<Cmd name=\"Other\" args=\"flood 60000 report G 100 1 loud\"/>"
                         "<Cmd name=\"Third\" args=\"note /tmp/scene/third report G 100 0 fine\"/>"
                         "</CmdGroup></P>";

class Output : public FptestTest
{
  protected:
    static bool has_finished_in_json()
    {
        const std::string text = is_there("json") ? read_file(work("json")) : "";
        return text.find("\"event\":\"finish\"") != std::string::npos;
    }

    // A FIFO, and its reader that does not read.
    static Descriptor unread_fifo()
    {
        EXPECT_EQ(mkfifo(work("fifo").c_str(), 0600), 0);
        return Descriptor(open(work("fifo").c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
    }

    static std::string read_to_end(const Descriptor &reader)
    {
        fcntl(reader.get(), F_SETFL, 0);
        std::string text;
        std::array<char, 65536> buffer{};
        for (ssize_t got = 1; got > 0;) {
            got = read(reader.get(), buffer.data(), buffer.size());
            text.append(buffer.data(), static_cast<std::size_t>(std::max<ssize_t>(got, 0)));
        }
        return text;
    }
};

TEST_F(Output, TerminalThatIsStoppedHoldsUpNothing)
{
    TerminalSession session({FPTEST_PROGRAM, "run", "--timeout", "1", "--json", work("json"),
                             "--plan", plan(kTwoItems), "P/G"},
                            80, 24);
    ASSERT_TRUE(session.wait_for_text("running"));
    session.type(kStop);
    EXPECT_TRUE(wait_for(has_finished_in_json, 20));
    EXPECT_THAT(outcomes(read_file(work("json"))), ElementsAre("Item: timed out", "Other: passed"));
    EXPECT_LT(events_of(read_file(work("json")), "end").at(0).at("seconds"), 2.5);
    EXPECT_THAT(session.text(), ::testing::Not(HasSubstr("timed out")));
    session.type(kContinue);
    EXPECT_EQ(session.wait_for_end(), 1);
    device::Lines lines;
    for (const std::string &line : session.all_lines()) {
        lines.push_back(without_times(line));
    }
    EXPECT_THAT(lines, ElementsAre("/tmp/scene/plan.xml: 2 items, vendor 0", "G",
                                   "  Item     [        ]       T s  timed out  -  "
                                   "stopped after T s",
                                   "  Other    [########] 100%  T s  passed     0  fine",
                                   "1 passed, 1 failed, T s"));
}

TEST_F(Output, PipeThatIsFullHoldsUpNothingAndLosesNothing)
{
    const Descriptor reader = unread_fifo();
    Start start;
    start.arguments = {"run", "--json", work("fifo"), "--plan", plan(kLoud), "P/G"};
    FptestProcess fptest(start);
    EXPECT_TRUE(wait_for_file("third"));
    EXPECT_TRUE(
        wait_for([&] { return fptest.out().find("1 passed, 2 failed") != std::string::npos; }, 20))
        << fptest.out();
    EXPECT_FALSE(fptest.has_ended()) << "what is written waits for its reader";
    const std::string text = read_to_end(reader);
    EXPECT_EQ(fptest.wait().status, 1);
    EXPECT_THAT(events_of(text, "end"), SizeIs(3));
    EXPECT_THAT(events_of(text, "finish"), SizeIs(1));
    EXPECT_GT(events_of(text, "end").at(0).at("output").get<std::string>().size(), 50'000U);
}

TEST_F(Output, FifoWithoutAReaderHoldsUpNothing)
{
    ASSERT_EQ(mkfifo(work("fifo").c_str(), 0600), 0);
    FptestProcess fptest({"run", "--timeout", "1", "--json", work("fifo"), "--junit", work("junit"),
                          "--plan", plan(kTwoItems), "P/G"});
    EXPECT_TRUE(
        wait_for([&] { return fptest.out().find("1 passed, 1 failed") != std::string::npos; }, 20))
        << fptest.out();
    EXPECT_EQ(parse_xml(read_file(work("junit"))).children.at(0).properties()["finished"], "true");
    const Descriptor reader(open(work("fifo").c_str(), O_RDONLY | O_CLOEXEC));
    EXPECT_THAT(events_of(read_to_end(reader), "finish"), SizeIs(1));
    EXPECT_EQ(fptest.wait().status, 1);
}

TEST_F(Output, SignalEndsTheWaitForAReader)
{
    const Descriptor reader = unread_fifo();
    FptestProcess fptest({"run", "--json", work("fifo"), "--plan", plan(kLoud), "P/G"});
    ASSERT_TRUE(
        wait_for([&] { return fptest.out().find("1 passed, 2 failed") != std::string::npos; }, 30));
    fptest.signal(SIGINT);
    const Ended ended = fptest.wait(5);
    EXPECT_EQ(ended.status, 130);
}

TEST_F(Output, InterruptedRunEndsItsItemWhileNobodyReads)
{
    const Descriptor reader = unread_fifo();
    FptestProcess fptest({"run", "--tap", "--json", work("fifo"), "--plan",
                          plan("<P><CmdGroup name=\"G\">"
                               "<Cmd name=\"Item\" args=\"flood 60000 report G 100 1 loud\"/>"
                               "<Cmd name=\"Other\" args=\"flood 60000 report G 100 1 loud\"/>"
                               "<Cmd name=\"Third\" args=\"note /tmp/scene/third sleep 60\"/>"
                               "</CmdGroup></P>"),
                          "P/G"});
    ASSERT_TRUE(wait_for_file("third"));
    fptest.signal(SIGTERM);
    expect_items_to_end();
    EXPECT_TRUE(wait_for([&] { return fptest.out().find("Bail out!") != std::string::npos; }, 20));
    fptest.signal(SIGTERM);
    EXPECT_EQ(fptest.wait(5).status, 130);
}

// --- "-" ----------------------------------------------------------------------------

TEST_F(Output, JunitGoesToStandardOutputInPlaceOfTheView)
{
    const Ended ended = run_fptest({"run", "--junit", "-", "--plan", plan(kLoud), "P/G/Third"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(parse_xml(ended.out).attributes.at("tests"), "1");
    EXPECT_FALSE(is_there("-"));
}

TEST_F(Output, OneReportAtMostGoesToStandardOutput)
{
    const std::string path = plan(kLoud);
    expect_refusal(2,
                   "fptest: --tap and --json - each want standard output: give all but one a file",
                   {"run", "--tap", "--json", "-", "--plan", path, "P/G"});
    expect_refusal(2,
                   "fptest: --json - and --junit - each want standard output: give all but one a "
                   "file",
                   {"run", "--json", "-", "--junit", "-", "--plan", path, "P/G"});
    expect_refusal(2,
                   "fptest: --tap, --json - and --junit - each want standard output: give all but "
                   "one a file",
                   {"run", "--tap", "--json", "-", "--junit", "-", "--plan", path, "P/G"});
}

TEST_F(Output, JunitMayNameStandardOutputThatIsAFile)
{
    Start start;
    start.arguments = {"run",    "--quiet",   "--junit",  "/dev/stdout",
                       "--plan", plan(kLoud), "P/G/Third"};
    start.output = work("out");
    const Ended ended = run_fptest(start);
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(parse_xml(read_file(work("out"))).attributes.at("tests"), "1");
}

TEST_F(Output, FileThatHasTwoNamesIsWantedByOne)
{
    const std::string path = plan(kLoud);
    file("one", "");
    ASSERT_EQ(link(work("one").c_str(), work("two").c_str()), 0);
    expect_refusal(2,
                   "fptest: --json and --junit both want the file /tmp/scene/one: give them files "
                   "of their own",
                   {"run", "--json", work("one"), "--junit", work("two"), "--plan", path, "P/G"});
}

// --- while an item runs ---------------------------------------------------------------

TEST_F(Output, ShowsWhatAnItemSaysWhileItRuns)
{
    TerminalSession session({FPTEST_PROGRAM, "run", "--plan",
                             plan("<P><CmdGroup name=\"G\"><Cmd name=\"Item\" args=\"say before "
                                  "say waiting-for-a-finger await /tmp/scene/go "
                                  "report G 100 0 fine\"/></CmdGroup></P>"),
                             "P/G"},
                            80, 24);
    EXPECT_TRUE(session.wait_for_text("running    -  waiting-for-a-finger")) << session.text();
    file("go", "");
    EXPECT_EQ(session.wait_for_end(), 0);
    EXPECT_THAT(session.text(), HasSubstr("passed     0  fine"));
}

TEST_F(Output, ShowsThatAnItemPastItsLimitIsStopping)
{
    TerminalSession session({FPTEST_PROGRAM, "run", "--timeout", "0.5", "--grace", "20", "--plan",
                             plan("<P><CmdGroup name=\"G\"><Cmd name=\"Item\" args=\"ignore-stop "
                                  "say going-on await /tmp/scene/go\"/></CmdGroup></P>"),
                             "P/G"},
                            80, 24);
    const std::regex line("  Item .* 1\\.[0-9] s  stopping   -  going-on\n");
    EXPECT_TRUE(session.wait_for([&] { return std::regex_search(session.text(), line); }))
        << session.text();
    file("go", "");
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_THAT(session.text(), HasSubstr("timed out  -  stopped after "));
    EXPECT_THAT(session.text(), ::testing::Not(HasSubstr("stopping")));
}

TEST_F(Output, ShowsWhatTheGathererSaysBeforeItReports)
{
    TerminalSession session(
        {FPTEST_PROGRAM, "run", "--plan",
         plan("<P><CmdGroup name=\"G\"><Cmd name=\"SensorProbe\" args=\"--help >/dev/null; exec "
              "/system/bin/Item say warming-up await /tmp/scene/warm gather say gathering await "
              "/tmp/scene/go\"/></CmdGroup></P>"),
         "P/G"},
        80, 24);
    EXPECT_TRUE(session.wait_for_text("running    -  warming-up")) << session.text();
    file("warm", "");
    EXPECT_TRUE(session.wait_for_text("running    -  gathering")) << session.text();
    file("go", "");
    EXPECT_EQ(session.wait_for_end(), 1);
}

TEST_F(Output, SaysEveryTenSecondsWhatAnItemHasSaid)
{
    FptestProcess fptest({"run", "--plan",
                          plan("<P><CmdGroup name=\"G\"><Cmd name=\"Item\" args=\"say one sleep 11 "
                               "say two sleep 10 report G 100 0 fine\"/></CmdGroup></P>"),
                          "P/G"});
    const Ended ended = fptest.wait(60);
    EXPECT_EQ(without_times(ended.out), "/tmp/scene/plan.xml: 1 item, vendor 0\n"
                                        "G/Item: running, T s\n"
                                        "    | one\n"
                                        "G/Item: running, T s\n"
                                        "    | two\n"
                                        "G/Item: passed, result 0, T s: fine\n"
                                        "1 passed, 0 failed, T s\n");
}

} // namespace
