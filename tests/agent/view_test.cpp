// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The live view, on a terminal as people have it.
#include "device_test.h"
#include "terminal_session.h"
#include "util/text.h"

#include <algorithm>
#include <fstream>
#include <regex>
#include <unistd.h>

namespace
{

constexpr char kFptest[] = QUILLMARK_BINARY_DIR "/agent/fptest";
constexpr char kViewed[] = "/tmp/plan.xml";
constexpr int kGreen = 2;
constexpr int kRed = 1;
constexpr int kYellow = 3;

// Times differ from run to run.
std::string masked(const std::string &line)
{
    static const std::regex time(R"(\b\d+\.\d s)");
    return std::regex_replace(line, time, "T.T s");
}

std::vector<std::string> masked(std::vector<std::string> lines)
{
    for (std::string &line : lines) {
        line = masked(line);
    }
    return lines;
}

class LiveView : public DeviceTest
{
  protected:
    void SetUp() override
    {
        DeviceTest::SetUp();
        unlink("/tmp/go");
        unlink("/tmp/signal");
        unlink("/tmp/log");
    }

    static void use_plan(const std::string &text)
    {
        write_file(kViewed, text);
    }

    static std::vector<std::string> run(const std::vector<std::string> &arguments)
    {
        std::vector<std::string> all = {kFptest, "run", "--plan", kViewed};
        all.insert(all.end(), arguments.begin(), arguments.end());
        return all;
    }

    static void let_go()
    {
        write_file("/tmp/go", "");
    }

    // The row of a text.
    static int row_of(const TerminalSession &session, const std::string &text)
    {
        const auto lines = session.lines();
        const auto found = std::ranges::find_if(
            lines, [&](const std::string &line) { return line.find(text) != std::string::npos; });
        EXPECT_NE(found, lines.end()) << text << " is not in\n" << session.text();
        return static_cast<int>(found - lines.begin());
    }

    // The colour of the first character of a text on the screen.
    static int colour_of(const TerminalSession &session, const std::string &line,
                         const std::string &text)
    {
        const int row = row_of(session, line);
        const std::string whole = session.lines()[static_cast<std::size_t>(row)];
        return session.cell(row, static_cast<int>(whole.find(text))).colour;
    }
};

constexpr char kTwoThatReport[] =
    "<P><CmdGroup name=\"Bringup\">"
    "<Cmd name=\"Item\" args=\"report Bringup 50 -2 'half of it' await /tmp/go "
    "report Bringup 100 0 'all of it'\"/>"
    "<Cmd name=\"Other\" args=\"report Bringup 100 1 broken say why-it-broke\"/>"
    "</CmdGroup></P>";

} // namespace

TEST_F(LiveView, ShowsAnItemsBarTimeResultAndDescriptionWhileItRuns)
{
    use_plan(kTwoThatReport);
    TerminalSession session(run({"P/Bringup"}), 80, 24);
    ASSERT_TRUE(session.wait_for([&] {
        return session.text().find("half of it") != std::string::npos &&
               session.all_lines().back().find("to go") != std::string::npos;
    })) << session.text();
    EXPECT_THAT(masked(session.all_lines()),
                ElementsAre("/tmp/plan.xml: 2 items, vendor 0", //
                            "Bringup",                          //
                            "  Item     [####    ]  50%  T.T s  running   -2  half of it",
                            "0 passed, 0 failed, 2 to go, T.T s"));
    let_go();
    EXPECT_EQ(session.wait_for_end(), 1);
}

TEST_F(LiveView, LeavesALineForEachItemAndTheTotalBehind)
{
    use_plan(kTwoThatReport);
    let_go();
    TerminalSession session(run({"P/Bringup"}), 80, 24);
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_THAT(masked(session.all_lines()),
                ElementsAre("/tmp/plan.xml: 2 items, vendor 0", //
                            "Bringup",                          //
                            "  Item     [########] 100%  T.T s  passed     0  all of it",
                            "  Other    [########] 100%  T.T s  failed     1  broken",
                            "    | why-it-broke", //
                            "1 passed, 1 failed, T.T s"));
}

TEST_F(LiveView, CountsTheSecondsOfWhatRuns)
{
    use_plan(kTwoThatReport);
    TerminalSession session(run({"P/Bringup"}), 80, 24);
    const auto shows = [&session](const char *time) {
        return [&session, shape = std::regex(std::string(time) + " s  running")] {
            return std::regex_search(session.text(), shape);
        };
    };
    ASSERT_TRUE(session.wait_for(shows(" 0\\.\\d")));
    EXPECT_TRUE(session.wait_for(shows(" [1-9]\\.\\d"))) << session.text();
    let_go();
    session.wait_for_end();
}

TEST_F(LiveView, ScrollsWhereThereAreMoreItemsThanLines)
{
    std::string plan = "<P><CmdGroup name=\"G\">";
    for (int at = 0; at < 4; ++at) {
        for (const std::string name : {"Item", "Other", "Third"}) {
            plan += "<Cmd name=\"" + name + "\" args=\"report G 100 0 ok\"/>";
        }
    }
    use_plan(plan + "</CmdGroup></P>");
    TerminalSession session(run({"--force", "P/G"}), 80, 6);
    EXPECT_EQ(session.wait_for_end(), 1);
    const auto lines = session.all_lines();
    EXPECT_EQ(std::ranges::count_if(lines,
                                    [](const std::string &line) {
                                        return line.find("  passed     0  ok") != std::string::npos;
                                    }),
              3)
        << session.text(); // by the group's command only the first of a name reports
    EXPECT_EQ(
        std::ranges::count_if(
            lines, [](const std::string &line) { return line.find("to go") != std::string::npos; }),
        0)
        << session.text();
}

TEST_F(LiveView, FitsItsLinesIntoANarrowTerminal)
{
    use_plan("<P><CmdGroup name=\"G\"><Cmd name=\"Item\" args=\"report G 100 0 "
             "'a description that takes more than the whole of a line that narrow'\"/>"
             "</CmdGroup></P>");
    for (const int columns : {79, 60, 45, 40}) {
        SCOPED_TRACE(columns);
        TerminalSession session(run({"P/G"}), columns, 24);
        EXPECT_EQ(session.wait_for_end(), 0);
        const auto lines = session.all_lines();
        // wrapped lines would take more rows
        EXPECT_THAT(lines, SizeIs(5)) << session.text();
        EXPECT_EQ(lines[2].find("  Item"), 0U) << session.text();
        EXPECT_EQ(lines[3].find("      a descri"), 0U) << session.text();
        EXPECT_EQ(lines[2].find('[') != std::string::npos, columns > 60) << session.text();
    }
}

TEST_F(LiveView, IsPlainWhereALineHasNoRoomForAResult)
{
    use_plan(kTwoThatReport);
    let_go();
    for (const int columns : {39, 20, 3}) {
        SCOPED_TRACE(columns);
        TerminalSession session(run({"P/Bringup"}), columns, 24);
        EXPECT_EQ(session.wait_for_end(), 1);
        EXPECT_EQ(session.written().find('\x1b'), std::string::npos);
        EXPECT_THAT(session.written(), HasSubstr("Bringup/Other: failed, result 1"));
    }
}

TEST_F(LiveView, LeavesNothingAfterOnATerminalThatBecomesVeryNarrow)
{
    use_plan(kTwoThatReport);
    TerminalSession session(run({"P/Bringup"}), 80, 24);
    ASSERT_TRUE(session.wait_for_text("half of it"));
    session.resize(10, 24);
    session.wait_for([] { return false; }, 0.5);
    session.resize(80, 24);
    let_go();
    EXPECT_EQ(session.wait_for_end(), 1);
    const auto lines = session.all_lines();
    EXPECT_LE(lines.size(), 10U) << session.text();
    EXPECT_THAT(session.text(), HasSubstr("passed     0  all of it"));
}

TEST_F(LiveView, UsesTheNewWidthOfAResizedTerminal)
{
    use_plan(kTwoThatReport);
    TerminalSession session(run({"P/Bringup"}), 100, 24);
    ASSERT_TRUE(session.wait_for_text("half of it"));
    session.resize(50, 24);
    const auto narrow = [&] {
        const auto lines = session.all_lines();
        return std::ranges::count_if(lines, [](const std::string &line) {
                   return line.find("running") != std::string::npos &&
                          line.find('[') == std::string::npos;
               }) == 1;
    };
    EXPECT_TRUE(session.wait_for(narrow)) << session.text();
    session.resize(100, 24);
    EXPECT_TRUE(session.wait_for_text("[########        ]")) << session.text();
    let_go();
    EXPECT_EQ(session.wait_for_end(), 1);
    const auto lines = session.all_lines();
    EXPECT_EQ(
        std::ranges::count_if(
            lines, [](const std::string &line) { return line.find("Item") != std::string::npos; }),
        1)
        << session.text();
    EXPECT_THAT(lines, Not(Contains(HasSubstr("running")))) << session.text();
}

TEST_F(LiveView, ColoursWhatBecameOfAnItem)
{
    use_plan("<P><CmdGroup name=\"G\">"
             "<Cmd name=\"Item\" args=\"report G 100 0 fine\"/>"
             "<Cmd name=\"Other\" args=\"report G 100 1 bad\"/>"
             "<Cmd name=\"Third\" args=\"sleep 0\"/>"
             "</CmdGroup></P>");
    TerminalSession session(run({"P/G"}), 80, 24);
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_EQ(colour_of(session, "  Item", "passed"), kGreen) << session.text();
    EXPECT_EQ(colour_of(session, "  Other", "failed"), kRed);
    EXPECT_EQ(colour_of(session, "  Third", "no result"), kYellow);
    EXPECT_EQ(colour_of(session, "1 passed, 2 failed", "1"), kGreen);
    EXPECT_EQ(colour_of(session, "1 passed, 2 failed", "2"), kRed);
    EXPECT_EQ(colour_of(session, "  Item", "fine"), -1);
}

TEST_F(LiveView, UsesNoColourWhereThatIsNotWanted)
{
    use_plan(kTwoThatReport);
    let_go();
    TerminalSession session(run({"P/Bringup"}), 80, 24, {{"NO_COLOR", "1"}});
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_THAT(session.written(), HasSubstr("\x1b["));
    EXPECT_FALSE(std::regex_search(session.written(), std::regex("\x1b\\[[0-9;]*m")))
        << session.written();
    EXPECT_THAT(session.text(), HasSubstr("passed     0  all of it"));
}

TEST_F(LiveView, IsColouredWhereNoColorIsSetToNothing)
{
    use_plan(kTwoThatReport);
    let_go();
    TerminalSession session(run({"P/Bringup"}), 80, 24, {{"NO_COLOR", ""}});
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_EQ(colour_of(session, "  Item", "passed"), kGreen);
}

TEST_F(LiveView, IsPlainOnATerminalThatCannotMoveItsCursor)
{
    use_plan(kTwoThatReport);
    let_go();
    TerminalSession session(run({"P/Bringup"}), 80, 24, {{"TERM", "dumb"}});
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_EQ(session.written().find('\x1b'), std::string::npos);
    EXPECT_THAT(masked(session.all_lines()),
                ElementsAre("/tmp/plan.xml: 2 items, vendor 0",
                            "Bringup/Item: passed, result 0, T.T s: all of it",
                            "Bringup/Other: failed, result 1, T.T s: broken", "    | why-it-broke",
                            "1 passed, 1 failed, T.T s"));
}

TEST_F(LiveView, LetsNoDescriptionMoveTheCursor)
{
    write_file("/tmp/description", "a\tb\nc");
    write_file("/tmp/say", "\x1b[2J\x1b[31mred\n");
    use_plan("<P><CmdGroup name=\"G\">"
             "<Cmd name=\"Item\" args=\"report-file G 100 0 /tmp/description\"/>"
             "<Cmd name=\"Other\" args=\"report G 100 1 x; cat /tmp/say\"/>"
             "</CmdGroup></P>");
    TerminalSession session(run({"P/G"}), 80, 24);
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_THAT(session.text(), HasSubstr("a␉b␊c"));
    EXPECT_THAT(session.text(), HasSubstr("    | ␛[2J␛[31mred"));
    EXPECT_THAT(session.text(), HasSubstr("vendor 0"));
}

TEST_F(LiveView, CountsTheColumnsOfWideCharacters)
{
    use_plan("<P><CmdGroup name=\"G\"><Cmd name=\"Item\" args=\"report G 50 -2 "
             "'指紋センサーの検査を行っています。お待ちください' await /tmp/go report G 100 0 x\"/>"
             "</CmdGroup></P>");
    TerminalSession session(run({"P/G"}), 80, 24);
    ASSERT_TRUE(session.wait_for_text("指紋"));
    // a line that was taken for shorter than it is would wrap
    EXPECT_TRUE(session.wait_for([&] { return session.all_lines().size() == 4; }))
        << session.text();
    EXPECT_THAT(session.all_lines().back(), HasSubstr("1 to go"));
    let_go();
    EXPECT_EQ(session.wait_for_end(), 0);
}

TEST_F(LiveView, KeepsWhatItKnewWhileThePlanIsHalfWritten)
{
    use_plan(kTwoThatReport);
    TerminalSession session(run({"P/Bringup"}), 80, 24);
    ASSERT_TRUE(session.wait_for_text("half of it"));
    const std::string plan = read_file(kPlanFile);
    for (const std::size_t part : {plan.size() / 2, plan.size() - 3, std::size_t{0}}) {
        write_file(kPlanFile, plan.substr(0, part));
        EXPECT_FALSE(session.wait_for(
            [&] { return session.text().find("half of it") == std::string::npos; }, 0.4))
            << session.text();
    }
    write_file(kPlanFile, plan);
    let_go();
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_THAT(session.text(), HasSubstr("all of it"));
}

// --- Ctrl-C -------------------------------------------------------------------

TEST_F(LiveView, CtrlCStopsTheItemThroughTheLibrary)
{
    use_plan("<P><CmdGroup name=\"G\">"
             "<Cmd name=\"Item\" args=\"tell-signal /tmp/signal report G 10 -2 begun sleep 60\"/>"
             "<Cmd name=\"Other\" args=\"report G 100 0 ok\"/>"
             "</CmdGroup></P>");
    TerminalSession session(run({"--log", "/tmp/log", "P/G"}), 80, 24);
    ASSERT_TRUE(session.wait_for_text("begun"));
    session.type("\x03");
    EXPECT_EQ(session.wait_for_end(), 130);
    // the terminal's own signal has not reached the item
    EXPECT_EQ(read_file("/tmp/signal"), "SIGTERM\n");
    EXPECT_THAT(read_file("/tmp/log"), HasSubstr("FPTEST_SuspendItemExecute"));
    const std::string text = session.text();
    EXPECT_THAT(text, HasSubstr("stopped   -2"));
    EXPECT_THAT(text, HasSubstr("stopped by Ctrl-C: begun"));
    EXPECT_THAT(text, HasSubstr("not finished: interrupted by Ctrl-C"));
    EXPECT_THAT(text, HasSubstr("0 passed, 1 failed, 1 not run"));
}

TEST_F(LiveView, CtrlCTwiceLeavesAtOnce)
{
    use_plan("<P><CmdGroup name=\"G\">"
             "<Cmd name=\"Stubborn\" args=\"ignore-stop report G 10 -2 begun sleep 60\"/>"
             "</CmdGroup></P>");
    TerminalSession session(run({"P/G"}), 80, 24);
    ASSERT_TRUE(session.wait_for_text("begun"));
    session.type("\x03");
    ASSERT_TRUE(session.wait_for_text("not run"));
    EXPECT_THAT(session.text(), HasSubstr("  stopping  -2"));
    EXPECT_THAT(session.text(), HasSubstr("Ctrl-C again leaves at once"));
    session.type("\x03");
    EXPECT_EQ(session.wait_for_end(2), 130);
    EXPECT_THAT(session.text(), HasSubstr("fptest: interrupted again"));
}
