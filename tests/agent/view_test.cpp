// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The live view, on a terminal as people have it.
#include "fptest_runner.h"
#include "terminal_session.h"

#include <algorithm>
#include <regex>

namespace
{

constexpr int kGreen = 2;
constexpr int kRed = 1;
constexpr int kYellow = 3;

class LiveView : public FptestTest
{
  protected:
    static Lines run(Lines arguments)
    {
        arguments.insert(arguments.begin(), {FPTEST_PROGRAM, "run", "--plan", work("plan.xml")});
        return arguments;
    }

    static void let_go()
    {
        file("go", "");
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
        return session.colour(row, static_cast<int>(whole.find(text)));
    }
};

const std::string kTwoThatReport = plan_of(
    {{"Bringup",
      {{"Item",
        "report Bringup 50 -2 'half of it' await /tmp/scene/go report Bringup 100 0 'all of it'"},
       {"Other", "report Bringup 100 1 broken say why-it-broke"}}}});

} // namespace

TEST_F(LiveView, ShowsAnItemsBarTimeResultAndDescriptionWhileItRuns)
{
    plan(kTwoThatReport);
    TerminalSession session(run({"P/Bringup"}), 80, 24);
    ASSERT_TRUE(session.wait_for([&] {
        return session.text().find("half of it") != std::string::npos &&
               session.all_lines().back().find("to go") != std::string::npos;
    })) << session.text();
    EXPECT_THAT(without_times(session.all_lines()),
                ElementsAre("/tmp/scene/plan.xml: 2 items, vendor 0", //
                            "Bringup",                                //
                            "  Item     [####    ]  50%  T s  running   -2  half of it",
                            "0 passed, 0 failed, 2 to go, T s"));
    let_go();
    EXPECT_EQ(session.wait_for_end(), 1);
}

TEST_F(LiveView, LeavesALineForEachItemAndTheTotalBehind)
{
    plan(kTwoThatReport);
    let_go();
    TerminalSession session(run({"P/Bringup"}), 80, 24);
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_THAT(without_times(session.all_lines()),
                ElementsAre("/tmp/scene/plan.xml: 2 items, vendor 0", //
                            "Bringup",                                //
                            "  Item     [########] 100%  T s  passed     0  all of it",
                            "  Other    [########] 100%  T s  failed     1  broken",
                            "    | why-it-broke", //
                            "1 passed, 1 failed, T s"));
}

TEST_F(LiveView, CountsTheSecondsOfWhatRuns)
{
    plan(kTwoThatReport);
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
    std::string text = "<P><CmdGroup name=\"G\">";
    for (int at = 0; at < 4; ++at) {
        for (const std::string name : {"Item", "Other", "Third"}) {
            text += "<Cmd name=\"" + name + "\" args=\"report G 100 0 ok\"/>";
        }
    }
    plan(text + "</CmdGroup></P>");
    TerminalSession session(run({"--force", "P/G"}), 80, 6);
    EXPECT_EQ(session.wait_for_end(), 1);
    const auto lines = session.all_lines();
    // by the group's command only the first of a name reports
    EXPECT_THAT(lines, Contains(HasSubstr("  passed     0  ok")).Times(3));
    EXPECT_THAT(lines, Not(Contains(HasSubstr("to go"))));
}

TEST_F(LiveView, FitsItsLinesIntoANarrowTerminal)
{
    plan(group_of({{"Item", "report G 100 0 'a description that takes more than the whole of a "
                            "line that narrow'"}}));
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
    plan(kTwoThatReport);
    let_go();
    for (const int columns : {39, 20, 3}) {
        SCOPED_TRACE(columns);
        TerminalSession session(run({"P/Bringup"}), columns, 24);
        EXPECT_EQ(session.wait_for_end(), 1);
        EXPECT_EQ(session.written().find('\x1b'), std::string::npos);
        EXPECT_THAT(session.written(), HasSubstr("Bringup/Other: failed, result 1"));
    }
}

TEST_F(LiveView, LeavesNoOldLinesOnATerminalThatWasVeryNarrowForAWhile)
{
    plan(kTwoThatReport);
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
    plan(kTwoThatReport);
    TerminalSession session(run({"P/Bringup"}), 100, 24);
    ASSERT_TRUE(session.wait_for_text("half of it"));
    session.resize(50, 24);
    EXPECT_TRUE(session.wait_for([&] {
        return Matches(Contains(AllOf(HasSubstr("running"), Not(HasSubstr("[")))).Times(1))(
            session.all_lines());
    })) << session.text();
    session.resize(100, 24);
    EXPECT_TRUE(session.wait_for_text("[########        ]")) << session.text();
    let_go();
    EXPECT_EQ(session.wait_for_end(), 1);
    const auto lines = session.all_lines();
    EXPECT_THAT(lines, Contains(HasSubstr("Item")).Times(1));
    EXPECT_THAT(lines, Not(Contains(HasSubstr("running")))) << session.text();
}

TEST_F(LiveView, ColoursWhatBecameOfAnItem)
{
    plan(group_of(
        {{"Item", "report G 100 0 fine"}, {"Other", "report G 100 1 bad"}, {"Third", "sleep 0"}}));
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
    plan(kTwoThatReport);
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
    plan(kTwoThatReport);
    let_go();
    TerminalSession session(run({"P/Bringup"}), 80, 24, {{"NO_COLOR", ""}});
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_EQ(colour_of(session, "  Item", "passed"), kGreen);
}

TEST_F(LiveView, IsPlainOnATerminalThatCannotMoveItsCursor)
{
    plan(kTwoThatReport);
    let_go();
    TerminalSession session(run({"P/Bringup"}), 80, 24, {{"TERM", "dumb"}});
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_EQ(session.written().find('\x1b'), std::string::npos);
    EXPECT_THAT(without_times(session.all_lines()),
                ElementsAre("/tmp/scene/plan.xml: 2 items, vendor 0",
                            "Bringup/Item: passed, result 0, T s: all of it",
                            "Bringup/Other: failed, result 1, T s: broken", "    | why-it-broke",
                            "1 passed, 1 failed, T s"));
}

TEST_F(LiveView, LetsNoDescriptionMoveTheCursor)
{
    file("description", "a\tb\nc");
    file("say", "\x1b[2J\x1b[31mred\n");
    plan(group_of({{"Item", "report-file G 100 0 /tmp/scene/description"},
                   {"Other", "report G 100 1 x; cat /tmp/scene/say"}}));
    TerminalSession session(run({"P/G"}), 80, 24);
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_THAT(session.text(), HasSubstr("a␉b␊c"));
    EXPECT_THAT(session.text(), HasSubstr("    | ␛[2J␛[31mred"));
    EXPECT_THAT(session.text(), HasSubstr("vendor 0"));
}

TEST_F(LiveView, CountsTheColumnsOfWideCharacters)
{
    plan(group_of({{"Item", "report G 50 -2 '指紋センサーの検査を行っています。お待ちください' "
                            "await /tmp/scene/go report G 100 0 x"}}));
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
    plan(kTwoThatReport);
    TerminalSession session(run({"P/Bringup"}), 80, 24);
    ASSERT_TRUE(session.wait_for_text("half of it"));
    const std::string stored = read_file(kPlanFile);
    for (const std::size_t part : {stored.size() / 2, stored.size() - 3, std::size_t{0}}) {
        write_file(kPlanFile, stored.substr(0, part));
        EXPECT_FALSE(session.wait_for(
            [&] { return session.text().find("half of it") == std::string::npos; }, 0.4))
            << session.text();
    }
    write_file(kPlanFile, stored);
    let_go();
    EXPECT_EQ(session.wait_for_end(), 1);
    EXPECT_THAT(session.text(), HasSubstr("all of it"));
}

// --- Ctrl-C -------------------------------------------------------------------

TEST_F(LiveView, CtrlCStopsTheItemThroughTheLibrary)
{
    plan(group_of({{"Item", "tell-signal /tmp/scene/signal report G 10 -2 begun sleep 60"},
                   {"Other", "report G 100 0 ok"}}));
    TerminalSession session(run({"--log", work("log"), "P/G"}), 80, 24);
    ASSERT_TRUE(session.wait_for_text("begun"));
    session.type("\x03");
    EXPECT_EQ(session.wait_for_end(), 130);
    // the terminal's own signal has not reached the item
    EXPECT_EQ(read_file(work("signal")), "SIGTERM\n");
    EXPECT_THAT(read_file(work("log")), HasSubstr("FPTEST_SuspendItemExecute"));
    const std::string text = session.text();
    EXPECT_THAT(text, HasSubstr("stopped   -2"));
    EXPECT_THAT(text, HasSubstr("stopped by Ctrl-C: begun"));
    EXPECT_THAT(text, HasSubstr("not finished: interrupted by Ctrl-C"));
    EXPECT_THAT(text, HasSubstr("0 passed, 1 failed, 1 not run"));
}

TEST_F(LiveView, CtrlCTwiceLeavesAtOnce)
{
    plan(group_of({{"Stubborn", "ignore-stop report G 10 -2 begun sleep 60"}}));
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
