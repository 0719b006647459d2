// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Where results go, and readers that do not read them.
#include "fptest_runner.h"
#include "support/reports.h"
#include "terminal_session.h"
#include "util/text.h"

#include <gmock/gmock.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <array>
#include <csignal>
#include <fcntl.h>
#include <regex>
#include <string>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace
{

constexpr char kStop[] = "\x13";     // Ctrl-S
constexpr char kContinue[] = "\x11"; // Ctrl-Q

// The first one overruns its time.
const std::string kTwoItems =
    group_of({{"Item", "note /tmp/scene/begun sleep 30"}, {"Other", "report G 100 0 fine"}});

// It says so much that no pipe holds it.
const std::string kLoud = group_of({{"Item", "flood 60000 report G 100 1 loud"},
                                    {"Other", "flood 60000 report G 100 1 loud"},
                                    {"Third", "note /tmp/scene/third report G 100 0 fine"}});

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

    // Of the log that --log names, and of one that VR_LOG_FILE does. The text has "{}" for
    // what names it, "{=}" if the file follows. Standard output is a file.
    static void expect_log_refusal(int status, const device::Lines &arguments,
                                   const std::string &log, const std::string &text)
    {
        for (const std::string name : {"--log", "VR_LOG_FILE"}) {
            Start start{.arguments = arguments, .output = work("out")};
            if (name == "--log") {
                start.arguments.insert(start.arguments.begin() + 1, {name, log});
            } else {
                start.environment[name] = log;
            }
            const fptest::Replacement names[] = {
                {"{}", name}, {"{=}", name == "--log" ? "--log " : "VR_LOG_FILE="}};
            const Ended ended = run_fptest(start);
            EXPECT_EQ(ended.status, status) << PrintToString(arguments);
            EXPECT_EQ(ended.err, "fptest: " + fptest::replaced(text, names) + "\n");
            EXPECT_EQ(read_file(work("out")), "");
        }
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
    TerminalSession session({FPTEST_PROGRAM, "run", "--timeout", "0.6", "--json", work("json"),
                             "--plan", plan(kTwoItems), "P/G"},
                            80, 24);
    ASSERT_TRUE(session.wait_for_text("running"));
    session.type(kStop);
    EXPECT_TRUE(eventually(has_finished_in_json, 20));
    EXPECT_THAT(outcomes(read_file(work("json"))), ElementsAre("Item: timed out", "Other: passed"));
    EXPECT_LT(events_of(read_file(work("json")), "end").at(0).at("seconds"), 2.5);
    EXPECT_THAT(session.text(), Not(HasSubstr("timed out")));
    session.type(kContinue);
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_THAT(without_times(session.all_lines()),
                ElementsAre("/tmp/scene/plan.xml: 2 items, vendor 0", "G",
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
    EXPECT_TRUE(eventually(
        [&] { return fptest.out().find("1 passed, 2 failed") != std::string::npos; }, 20))
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
    FptestProcess fptest({"run", "--timeout", "0.5", "--json", work("fifo"), "--junit",
                          work("junit"), "--plan", plan(kTwoItems), "P/G"});
    EXPECT_TRUE(eventually(
        [&] { return fptest.out().find("1 passed, 1 failed") != std::string::npos; }, 20))
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
    ASSERT_TRUE(eventually(
        [&] { return fptest.out().find("1 passed, 2 failed") != std::string::npos; }, 30));
    fptest.signal(SIGINT);
    const Ended ended = fptest.wait(5);
    EXPECT_EQ(ended.status, 130);
}

TEST_F(Output, InterruptedRunEndsItsItemWhileNobodyReads)
{
    const Descriptor reader = unread_fifo();
    FptestProcess fptest({"run", "--tap", "--json", work("fifo"), "--plan",
                          plan(group_of({{"Item", "flood 60000 report G 100 1 loud"},
                                         {"Other", "flood 60000 report G 100 1 loud"},
                                         {"Third", "note /tmp/scene/third sleep 60"}})),
                          "P/G"});
    ASSERT_TRUE(wait_for_file("third"));
    fptest.signal(SIGTERM);
    expect_items_to_end();
    EXPECT_TRUE(
        eventually([&] { return fptest.out().find("Bail out!") != std::string::npos; }, 20));
    fptest.signal(SIGTERM); // the same interruption, handed on
    usleep(100'000);
    EXPECT_THAT(events_of(read_to_end(reader), "finish"), SizeIs(1));
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

TEST_F(Output, StandardOutputMayHaveAnotherName)
{
    for (const std::string name :
         {"/dev/stdout", "/proc/self/fd/1", "/dev/fd/1", "/tmp/scene/out"}) {
        SCOPED_TRACE(name);
        Start start{.arguments = {"run", "--junit", name, "--plan", plan(kLoud), "P/G/Third"},
                    .output = work("out")};
        Ended ended = run_fptest(start);
        EXPECT_EQ(ended.status, 0);
        EXPECT_EQ(ended.err, "");
        EXPECT_EQ(parse_xml(read_file(work("out"))).attributes.at("tests"), "1");
        start.arguments.at(1) = "--json";
        EXPECT_EQ(run_fptest(start).status, 0);
        EXPECT_THAT(outcomes(read_file(work("out"))), ElementsAre("Third: passed"));
        EXPECT_THAT(read_file(work("out")), StartsWith("{\"event\":\"run\""));
    }
}

TEST_F(Output, OneReportAtMostGoesToStandardOutputByWhateverName)
{
    for (const std::string name : {"/dev/stdout", "/proc/self/fd/1", "/tmp/scene/out"}) {
        const Start start{
            .arguments = {"run", "--tap", "--json", name, "--plan", plan(kLoud), "P/G/Third"},
            .output = work("out")};
        const Ended ended = run_fptest(start);
        EXPECT_EQ(ended.status, 2);
        EXPECT_EQ(ended.err, "fptest: --tap and --json " + name +
                                 " each want standard output: give all but one a file\n");
        EXPECT_EQ(read_file(work("out")), "");
    }
}

TEST_F(Output, DevNullMayBeNamedForEveryReport)
{
    const Start start{.arguments = {"run", "--tap", "--json", "/dev/null", "--junit", "/dev/stdout",
                                    "--plan", plan(kLoud), "P/G/Third"},
                      .output = "/dev/null"};
    const Ended ended = run_fptest(start);
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "");
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
    // nor are they there yet
    ASSERT_EQ(chdir(kWork), 0);
    ASSERT_EQ(symlink("none", work("three").c_str()), 0);
    ASSERT_EQ(symlink("none", work("four").c_str()), 0);
    for (const auto &[one, two] :
         {std::pair{"x", "./x"}, {"x", "/tmp/scene/x"}, {"three", "four"}}) {
        expect_refusal(2,
                       std::string("fptest: --json and --junit both want the file ") + one +
                           ": give them files of their own",
                       {"run", "--json", one, "--junit", two, "--plan", path, "P/G"});
    }
}

TEST_F(Output, FileThatStandardErrorIsIsNotEmptied)
{
    const std::string script = "exec 2>>/tmp/scene/errors; echo before >&2\n"
                               "exec \"$0\" run --plan \"$1\" --json /dev/stderr P/G";
    support::run({.arguments = {"sh", "-c", script, FPTEST_PROGRAM, plan(kOnePasses)}});
    EXPECT_EQ(read_file(work("errors")), "before\nfptest: --json /dev/stderr is standard error, "
                                         "and would be emptied: name another file\n");
}

TEST_F(Output, ListHasNoReports)
{
    for (const device::Lines &report :
         {device::Lines{"--junit", work("out")}, {"--json", "-"}, {"--tap"}}) {
        device::Lines arguments = {"run", "--list", "--plan", plan("<P/>")};
        arguments.insert(arguments.end(), report.begin(), report.end());
        expect_refusal(2,
                       "fptest: --list runs nothing, so " + report.front() +
                           " would be empty: leave one of them out",
                       arguments);
    }
    EXPECT_FALSE(is_there("out"));
}

// --- the library's log -----------------------------------------------------------------

TEST_F(Output, LogIsAFileOfItsOwnWhoeverNamesIt)
{
    const std::string path = plan(kLoud);
    const std::vector<std::pair<device::Lines, std::string>> commands = {
        {{"run", "--json", work("file"), "--plan", path, "P/G"}, "--json"},
        {{"run", "--junit", work("file"), "--plan", path, "P/G"}, "--junit"},
        {{"run", "--plan", work("file"), "P/G"}, "--plan"}};
    file("file", kLoud);
    for (const auto &[arguments, option] : commands) {
        expect_log_refusal(2, arguments, work("file"),
                           option + " and {} both want the file /tmp/scene/file: give them files "
                                    "of their own");
    }
    EXPECT_EQ(read_file(work("file")), kLoud);
}

const std::vector<device::Lines> kWithLog = {
    {"run", "P/G"},
    {"send", "pingtest"},
    {"report", "G", "Item", "--progress", "1", "--result", "0"}};

TEST_F(Output, LogMayBeAFifoThatAReaderWaitsAt)
{
    const std::string script = "mkfifo /tmp/scene/f; cat /tmp/scene/f >/tmp/scene/log & sleep 0.2\n"
                               "\"$0\" run --plan \"$1\" --log /tmp/scene/f P/G; wait";
    const Ended ended =
        support::run({.arguments = {"sh", "-c", script, FPTEST_PROGRAM, plan(kOnePasses)}});
    EXPECT_THAT(ended.out, HasSubstr("1 passed"));
    EXPECT_THAT(read_file(work("log")), HasSubstr("fptest_ItemsTest"));
}

TEST_F(Output, LogIsNeverTheStoredPlan)
{
    device::write_file(device::kPlanFile, kLoud);
    for (const device::Lines &arguments : kWithLog) {
        expect_log_refusal(2, arguments, device::kPlanFile,
                           "{} and the library both want the file /data/vorlane/src1.xml: give "
                           "them files of their own");
    }
    EXPECT_EQ(read_file(device::kPlanFile), kLoud);
    const std::string note = "/data/vorlane/fptest.run";
    EXPECT_EQ(run_fptest({"run", "--json", note, "P/G"}).err,
              "fptest: --json and fptest itself both want the file " + note +
                  ": give them files of their own\n");
}

TEST_F(Output, LogThatCannotBeWrittenIsRefusedWhoeverNamesIt)
{
    device::write_file(device::kPlanFile, kLoud);
    for (const device::Lines &arguments : {device::Lines{"run", "P/G"}, {"send", "pingtest"}}) {
        expect_log_refusal(3, arguments, "/nowhere/log",
                           "{=}/nowhere/log cannot be written: No such file or directory; name "
                           "another file");
    }
}

TEST_F(Output, LogIsNotStandardOutput)
{
    device::write_file(device::kPlanFile, kLoud);
    const std::string why = " is standard output, which is not for the library's log: name a file "
                            "for that";
    for (const device::Lines &arguments : kWithLog) {
        expect_log_refusal(2, arguments, "-", "{=}-" + why);
    }
    for (const device::Lines &arguments :
         {device::Lines{"run", "P/G"}, {"run", "--tap", "P/G"}, {"send", "pingtest"}}) {
        expect_log_refusal(2, arguments, "/dev/stdout", "{=}/dev/stdout" + why);
        expect_log_refusal(2, arguments, work("out"), "{=}/tmp/scene/out" + why);
    }
    EXPECT_FALSE(is_there("-"));
}

// In the library's process it would be where items print.
TEST_F(Output, LogIsTheSameFileForItemsInOtherDirectories)
{
    plan(group_of({{"Item", "say x >/dev/null; cd /; /system/bin/Item report G 100 0 fine"}}));
    const Ended ended = run_program(
        {"/system/bin/sh", "-c",
         "cd " + work("") + "; exec '" FPTEST_PROGRAM "' run --log log --plan plan.xml P/G"});
    EXPECT_EQ(ended.status, 0) << ended.out;
    EXPECT_THAT(read_file(work("log")), HasSubstr("FPTEST_SetTransation"));
}

TEST_F(Output, LogThatIsCutIsIncomplete)
{
    Start start;
    start.arguments = {"send", "--log", work("log"), "pingtest"};
    start.prepare = [] {
        const rlimit limit{100, 100};
        setrlimit(RLIMIT_FSIZE, &limit);
    };
    const Ended ended = run_fptest(start);
    EXPECT_EQ(read_file(work("log")).size(), 100U);
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err, "fptest: --log " + work("log") +
                             " is incomplete: its last line is cut; make room, or name another "
                             "file\n");
}

TEST_F(Output, LogMayBeStandardError)
{
    const Ended ended = run_fptest({"run", "--log", "/dev/stderr", "--json", work("json"), "--plan",
                                    plan(kLoud), "P/G/Third"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_THAT(ended.err, HasSubstr("=> Input cmdline : P/G/Third"));
    EXPECT_EQ(events_of(read_file(work("json")), "end").at(0).at("output"), "");
}

// --- a report that cannot be begun ------------------------------------------------------

TEST_F(Output, ReportThatCannotBeBegunCostsNoOther)
{
    device::write_file(device::kPlanFile, kLoud);
    const std::string earlier = "what an earlier run has left";
    file("json", earlier);
    file("junit", earlier);
    expect_refusal(3, "fptest: /nowhere/x: No such file or directory; nothing was run",
                   {"run", "--json", work("json"), "--junit", "/nowhere/x", "P/G"});
    expect_refusal(3, "fptest: /nowhere/x: No such file or directory; nothing was run",
                   {"run", "--junit", work("junit"), "--json", "/nowhere/x", "P/G"});
    const Start start{.arguments = {"run", "--json", work("json"), "--junit", work("junit"), "P/G"},
                      .output = "/dev/full"};
    const Ended ended = run_fptest(start);
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err, "fptest: standard output: No space left on device; nothing was run\n");
    EXPECT_EQ(read_file(work("json")), earlier);
    EXPECT_EQ(read_file(work("junit")), earlier);
    EXPECT_EQ(read_file(device::kPlanFile), kLoud);
    expect_refusal(3, "fptest: /nowhere/x: No such file or directory; nothing was run",
                   {"run", "--json", work("new"), "--junit", "/nowhere/x", "P/G"});
    EXPECT_FALSE(is_there("new"));
}

TEST_F(Output, ReportThatHasBegunSaysThatNothingWasRun)
{
    if (is_in_place()) {
        GTEST_SKIP() << "in place, the disk is the container's own and is not to be filled";
    }
    device::write_file(device::kPlanFile, kLoud);
    fill_disk();
    const Ended ended =
        run_fptest({"run", "--json", "/data/vorlane/json", "--junit", work("junit"), "P/G/Third"});
    const std::string why = "/data/vorlane/json: No space left on device; nothing was run";
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err, "fptest: " + why + "\n");
    EXPECT_THAT(ended.out, HasSubstr("\nnot finished: " + why + "\n"));
    auto suite = parse_xml(read_file(work("junit"))).children.at(0);
    EXPECT_EQ(suite.properties()["finished"], "false");
    EXPECT_EQ(suite.properties()["reason"], why);
}

// --- lines on a terminal --------------------------------------------------------------

TEST_F(Output, PlainLinesAreForTerminalsToo)
{
    TerminalSession session(
        {FPTEST_PROGRAM, "run", "--plain", "--plan",
         plan(group_of({{"Item", "report G 100 0 fine"}, {"Other", "report G 100 1 bad"}})), "P/G"},
        80, 24);
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_THAT(session.written(), Not(HasSubstr("\x1b")));
    EXPECT_THAT(without_times(session.all_lines()),
                ElementsAre("/tmp/scene/plan.xml: 2 items, vendor 0",
                            "G/Item: passed, result 0, T s: fine",
                            "G/Other: failed, result 1, T s: bad", "1 passed, 1 failed, T s"));
}

// --- while an item runs ---------------------------------------------------------------

TEST_F(Output, ShowsWhatAnItemSaysWhileItRuns)
{
    TerminalSession session({FPTEST_PROGRAM, "run", "--plan",
                             plan(group_of({{"Item", "say before say waiting-for-a-finger await "
                                                     "/tmp/scene/go report G 100 0 fine"}})),
                             "P/G"},
                            80, 24);
    EXPECT_TRUE(session.wait_for_text("running    -  waiting-for-a-finger")) << session.text();
    file("go", "");
    EXPECT_EQ(session.wait_for_end(), 0);
    EXPECT_THAT(session.text(), HasSubstr("passed     0  fine"));
}

TEST_F(Output, ShowsThatAnItemPastItsLimitIsStopping)
{
    TerminalSession session(
        {FPTEST_PROGRAM, "run", "--timeout", "0.5", "--grace", "20", "--plan",
         plan(group_of({{"Item", "ignore-stop say going-on await /tmp/scene/go"}})), "P/G"},
        80, 24);
    const std::regex line("  Item .* 1\\.[0-9] s  stopping   -  going-on\n");
    EXPECT_TRUE(session.wait_for([&] { return std::regex_search(session.text(), line); }))
        << session.text();
    file("go", "");
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_THAT(session.text(), HasSubstr("timed out  -  stopped after "));
    EXPECT_THAT(session.text(), Not(HasSubstr("stopping")));
}

TEST_F(Output, ShowsWhatTheGathererSaysBeforeItReports)
{
    TerminalSession session(
        {FPTEST_PROGRAM, "run", "--plan",
         plan(group_of(
             {{"SensorProbe", "--help >/dev/null; exec /system/bin/Item say warming-up await "
                              "/tmp/scene/warm gather say gathering await /tmp/scene/go"}})),
         "P/G"},
        80, 24);
    EXPECT_TRUE(session.wait_for_text("running    -  warming-up")) << session.text();
    file("warm", "");
    EXPECT_TRUE(session.wait_for_text("running    -  gathering")) << session.text();
    file("go", "");
    EXPECT_EQ(session.wait_for_end(), 1);
}

} // namespace
