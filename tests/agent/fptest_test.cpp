// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The program as a whole: what it says of itself, and the commands that only read.
#include "fptest_runner.h"
#include "terminal_session.h"

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <regex>
#include <set>
#include <thread>

namespace fs = std::filesystem;

namespace
{

const Lines kCommands = {"run", "check", "show", "report", "send"};

using Fptest = FptestTest;

// The columns of a text in UTF-8 without wide characters.
std::size_t display_width(const std::string &text)
{
    return static_cast<std::size_t>(
        std::ranges::count_if(text, [](unsigned char c) { return (c & 0xc0U) != 0x80U; }));
}

// --- help -----------------------------------------------------------------------------

std::string help_of(const std::string &command)
{
    const Ended ended = run_fptest(command.empty() ? Lines{"--help"} : Lines{command, "--help"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "");
    return ended.out;
}

// Those that a help names at the beginnings of its lines.
std::set<std::string> options_of(const std::string &command)
{
    static const std::regex line(R"(^ +((-\w|--[\w-]+)(,(-\w|--[\w-]+))*)( .*)?$)");
    static const std::regex option(R"(--?\w[\w-]*)");
    std::set<std::string> options;
    for (const std::string &text : lines_of(help_of(command))) {
        std::smatch match;
        if (!std::regex_match(text, match, line)) {
            continue;
        }
        const std::string names = match[1];
        for (std::sregex_iterator at(names.begin(), names.end(), option), end; at != end; ++at) {
            options.insert(at->str());
        }
    }
    return options;
}

TEST_F(Fptest, HasHelpWithExamplesForEveryCommand)
{
    for (const std::string &command :
         Lines{"", "run", "check", "show", "report", "measure", "send"}) {
        SCOPED_TRACE(command);
        const std::string help = help_of(command);
        EXPECT_THAT(help, HasSubstr("\nExamples:\n  fptest " + command));
        for (const std::string &line : lines_of(help)) {
            EXPECT_LE(display_width(line), 80U) << line;
            EXPECT_EQ(line.find_last_not_of(' ') + 1, line.size()) << line;
        }
    }
    EXPECT_EQ(run_fptest({"-h"}).out, help_of(""));
}

TEST_F(Fptest, NamesItsCommandsAndExitCodesInItsHelp)
{
    const std::string help = help_of("");
    for (const std::string &command : kCommands) {
        EXPECT_THAT(help, HasSubstr("\n  " + command + " ")) << command;
    }
    const std::string codes = help.substr(help.find("Exit status:"));
    for (const std::string code : {"0", "1", "2", "3", "130"}) {
        EXPECT_TRUE(std::regex_search(codes, std::regex("\\b" + code + "\\b"))) << codes;
    }
}

TEST_F(Fptest, NamesEveryOptionInItsHelp)
{
    EXPECT_THAT(
        options_of("run"),
        IsSupersetOf({"--plan",        "--as-sent", "--as-group", "--timeout",      "--grace",
                      "--exit-status", "--repeat",  "--for",      "--until-fail",   "--list",
                      "--junit",       "--json",    "--tap",      "--pass-code",    "--force",
                      "--quiet",       "--log",     "--help",     "--judge-limits", "--files"}));
    EXPECT_THAT(options_of("report"),
                IsSupersetOf({"--progress", "--result", "--description", "--log"}));
    EXPECT_THAT(options_of("check"), IsSupersetOf({"--for"}));
    EXPECT_THAT(options_of("send"), IsSupersetOf({"-0", "--log"}));
    EXPECT_THAT(options_of(""), IsSupersetOf({"--version", "--help"}));
}

TEST_F(Fptest, TellsItsVersion)
{
    const Ended ended = run_fptest({"--version"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "fptest " FPTEST_VERSION "\n");
    EXPECT_EQ(ended.err, "");
}

// --- show -------------------------------------------------------------------------------

TEST_F(Fptest, ShowsTheStoredPlanAsATable)
{
    write_file(kPlanFile,
               "<P><CmdGroup name=\"Bringup\">"
               "<Cmd name=\"SpiCheck\" args=\"\" progress=\"100\" result=\"0\" "
               "description=\"chip 0x1a2b &amp; more\"/>"
               "<Cmd name=\"DeadPixel\" progress=\"5\" result=\"-2\" description=\"\"/>"
               "<Cmd name=\"指紋\"/></CmdGroup>"
               "<CmdGroup name=\"G\"><Cmd name=\"x\" description=\"two\nlines\"/></CmdGroup></P>");
    const Ended ended = run_fptest({"show"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(ended.out, "GROUP    ITEM       PROGRESS  RESULT  DESCRIPTION\n"
                         "Bringup  SpiCheck        100       0  chip 0x1a2b & more\n"
                         "Bringup  DeadPixel         5      -2\n"
                         "Bringup  指紋              -       -  -\n"
                         "G        x                 -       -  two␊lines\n");
}

TEST_F(Fptest, ShowsAResultWithoutAValue)
{
    write_file(kPlanFile, "<P><CmdGroup name=\"G\"><Cmd name=\"a\" progress=\"1\" result "
                          "description=\"d\"/><Cmd name=\"b\"/></CmdGroup></P>");
    const Ended ended = run_fptest({"show"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "GROUP  ITEM  PROGRESS  RESULT  DESCRIPTION\n"
                         "G      a            1       ?  d\n"
                         "G      b            -       -  -\n");
}

TEST_F(Fptest, ShowsAFileAndStandardInput)
{
    const std::string text = group_of({{"Item", ""}});
    const std::string table = "GROUP  ITEM  PROGRESS  RESULT  DESCRIPTION\n"
                              "G      Item         -       -  -\n";
    EXPECT_EQ(run_fptest({"show", plan(text)}).out, table);
    EXPECT_EQ(run_fptest({"show", "-"}, text).out, table);
    EXPECT_FALSE(fs::exists(kPlanFile));
}

TEST_F(Fptest, ShowsWhatNoByteOfADescriptionCanChange)
{
    write_file(kPlanFile, "<P><CmdGroup name=\"G\"><Cmd name=\"a\" progress=\"1\" result=\"0\" "
                          "description=\"\x1b[31m\x01\xff]]>\"/></CmdGroup></P>");
    EXPECT_EQ(run_fptest({"show"}).out, "GROUP  ITEM  PROGRESS  RESULT  DESCRIPTION\n"
                                        "G      a            1       0  ␛[31m␁�]]>\n");
}

TEST_F(Fptest, SaysInOneLineWhyItShowsNothing)
{
    expect_refusal(
        3,
        "fptest: no plan is stored in /data/vorlane/src1.xml: run one with fptest run --plan "
        "FILE, or name a file to show",
        {"show"});
    expect_refusal(2, "fptest: /tmp/scene/none: No such file or directory", {"show", work("none")});
    const std::string half = "<P><CmdGroup name=\"G\"><Cmd name=\"a\"/><Cmd nam";
    expect_refusal(
        2, "fptest: /tmp/scene/plan.xml is not a whole test plan: fptest check says what is wrong",
        {"show", plan(half)});
    expect_refusal(2, "fptest: <stdin> is not a whole test plan: fptest check says what is wrong",
                   {"show", "-"}, half);
    expect_refusal(2, "fptest: <stdin> has no items: fptest check says more", {"show", "-"},
                   "<P><CmdGroup name=\"G\"/></P>");
    write_file(kPlanFile, half);
    expect_refusal(
        2,
        "fptest: /data/vorlane/src1.xml is not a whole test plan: fptest check says what is wrong",
        {"show"});
}

TEST_F(Fptest, ShowsAPlanOnceAllOfItIsWritten)
{
    const std::string whole = kOnePasses;
    write_file(kPlanFile, whole.substr(0, whole.size() / 2));
    std::thread writer([&] {
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
        write_file(kPlanFile, whole);
    });
    EXPECT_EQ(run_fptest({"show"}).status, 0);
    writer.join();
}

TEST_F(Fptest, CutsTheTableToTheTerminal)
{
    write_file(kPlanFile, "<P><CmdGroup name=\"G\"><Cmd name=\"a\" progress=\"1\" result=\"0\" "
                          "description=\"" +
                              std::string(200, 'd') + "\"/></CmdGroup></P>");
    TerminalSession session({FPTEST_PROGRAM, "show"}, 50, 24);
    EXPECT_EQ(session.wait_for_end(), 0);
    EXPECT_THAT(session.all_lines(),
                ElementsAre("GROUP  ITEM  PROGRESS  RESULT  DESCRIPTION",
                            "G      a            1       0  dddddddddddddddd..."));
}

// --- check ------------------------------------------------------------------------------

TEST_F(Fptest, ChecksAPlan)
{
    const std::string sound = group_of({{"Item", ""}, {"Other", ""}});
    const Ended ended = run_fptest({"check", plan(sound)});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(ended.out, "/tmp/scene/plan.xml: 0 errors, 0 warnings (1 group, 2 items, " +
                             std::to_string(sound.size()) + " of 2048 bytes)\n");
    EXPECT_FALSE(fs::exists(kPlanFile));
}

TEST_F(Fptest, ChecksWithAMessageASourceLineAndACaret)
{
    const std::string text = "<P>\n"
                             "  <CmdGroup name=\"G\">\n"
                             "    <Cmd name=\"a/b\" args=\"\"/>\n"
                             "  </CmdGroup>\n"
                             "</P>\n";
    const Ended ended = run_fptest({"check", plan(text)});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    const Lines lines = lines_of(ended.out);
    ASSERT_THAT(lines, SizeIs(4));
    const std::string place = "/tmp/scene/plan.xml:3:";
    EXPECT_THAT(lines[0], StartsWith(place));
    EXPECT_TRUE(std::regex_match(lines[0].substr(place.size()), std::regex(R"(\d+: error: .+)")))
        << lines[0];
    EXPECT_EQ(lines[1], "    <Cmd name=\"a/b\" args=\"\"/>");
    const std::size_t column = std::stoul(lines[0].substr(place.size()));
    EXPECT_EQ(lines[2], std::string(column - 1, ' ') + "^");
    EXPECT_EQ(lines[3],
              "/tmp/scene/plan.xml: 1 error, 0 warnings (1 group, 1 item, 75 of 2048 bytes)");
}

TEST_F(Fptest, CountsNothingInAPlanThatDoesNotLoad)
{
    const Ended ended = run_fptest({"check", "-"}, "<P><CmdGroup name=\"G\"></P>");
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(lines_of(ended.out).back(), "<stdin>: 1 error, 0 warnings (26 of 2048 bytes)");
}

TEST_F(Fptest, ChecksArgsWhereThereIsNoShellToAsk)
{
    if (is_in_place()) {
        GTEST_SKIP() << "in place, /system/bin cannot be hidden from one program";
    }
    const std::string before = "<P><CmdGroup name=\"G\"><Cmd name=\"X\" args=\"";
    const std::string after = "\"/></CmdGroup></P>";
    Start start;
    start.prepare = without_device;
    start.arguments = {"check", "-"};
    start.input = before + "it's" + after;
    EXPECT_EQ(lines_of(run_fptest(start).out).front(),
              "<stdin>:1:45: error: the shell would refuse the command line of item 'X': it finds "
              "no end of the ''' here; end it, or put a '\\' before it");
    // a fault that only the shell knows
    start.input = before + "a; if" + after;
    EXPECT_EQ(lines_of(run_fptest(start).out).front(),
              "<stdin>:1:44: warning: the shell would run 'if' as a command of its own, after item "
              "'X'; put the ';' in quotes if it is meant for the item");
}

TEST_F(Fptest, ChecksSeveralFilesAndStandardInput)
{
    const std::string sound = file("sound.xml", group_of({{"Item", ""}}));
    const std::string broken = file("broken.xml", "<P><CmdGroup></P>");
    EXPECT_EQ(run_fptest({"check", sound, sound}).status, 0);
    const Ended ended = run_fptest({"check", broken, "-", sound}, "<P/>");
    EXPECT_EQ(ended.status, 1);
    Lines summaries = lines_of(ended.out);
    std::erase_if(summaries,
                  [](const std::string &line) { return line.find("warning") == line.npos; });
    EXPECT_THAT(summaries, ElementsAre(StartsWith("/tmp/scene/broken.xml: 1 error, 0 warnings ("),
                                       StartsWith("<stdin>: 1 error, 0 warnings ("),
                                       StartsWith("/tmp/scene/sound.xml: 0 errors, 0 warnings (")));
    EXPECT_EQ(run_fptest({"check", "-"}, group_of({{"Item", ""}})).status, 0);
}

TEST_F(Fptest, PassesAPlanWithWarningsAlone)
{
    const std::string name(30, 'n'); // too long to be stopped by
    const Ended ended = run_fptest({"check", plan(group_of({{name, ""}}))});
    EXPECT_EQ(ended.status, 0);
    EXPECT_THAT(ended.out, HasSubstr(": warning: "));
    EXPECT_THAT(ended.out, HasSubstr(": 0 errors, 1 warning (1 group, 1 item, "));
}

TEST_F(Fptest, SaysWhichFilesItCannotCheck)
{
    const std::string sound = file("sound.xml", group_of({{"Item", ""}}));
    const std::string broken = file("broken.xml", "<P><CmdGroup></P>");
    const Ended ended = run_fptest({"check", work("none"), sound, kWork, broken});
    EXPECT_EQ(ended.status, 2);
    EXPECT_EQ(ended.err, "fptest: /tmp/scene/none: No such file or directory\n"
                         "fptest: /tmp/scene: Is a directory\n");
    EXPECT_THAT(ended.out, StartsWith("/tmp/scene/sound.xml: 0 errors"));
    EXPECT_THAT(ended.out, HasSubstr("\n/tmp/scene/broken.xml: 1 error"));
}

TEST_F(Fptest, SaysThatStandardOutputCannotBeWritten)
{
    write_file(kPlanFile, group_of({{"Item", ""}}));
    const std::string broken = file("broken.xml", "<P><CmdGroup></P>");
    for (const Lines &arguments : {Lines{"show"}, Lines{"check", kPlanFile}, Lines{"check", broken},
                                   Lines{"--help"}, Lines{"run", "--list"}}) {
        const Start start{.arguments = arguments, .output = "/dev/full"};
        const Ended ended = run_fptest(start);
        EXPECT_EQ(ended.status, 3) << arguments[0];
        EXPECT_EQ(ended.err, "fptest: standard output cannot be written\n") << arguments[0];
    }
}

TEST_F(Fptest, SaysThatStandardOutputIsClosed)
{
    write_file(kPlanFile, group_of({{"Item", ""}}));
    const std::vector<std::pair<std::string, std::string>> commands = {
        {"show", "fptest show"},
        {std::string("check ") + kPlanFile, "fptest check"},
        {"send 'XMLFile::<P/>'", "fptest send"},
        {"run --list", "--list"}};
    const std::string before = read_file(kPlanFile);
    for (const auto &[command, who] : commands) {
        const Ended ended = run_program({"/system/bin/sh", "-c", "fptest " + command + " >&-"});
        EXPECT_EQ(ended.status, 3) << command;
        EXPECT_EQ(ended.out,
                  "fptest: " + who + " needs standard output, which is closed: open it\n");
    }
    for (const std::string file : {"--json /dev/stdout", "--junit /proc/self/fd/1",
                                   "--log /dev/fd/1", "--json /tmp/scene/link"}) {
        std::filesystem::remove(work("link"));
        std::filesystem::create_symlink("/dev/stdout", work("link"));
        const Ended ended = run_program({"/system/bin/sh", "-c", "fptest run " + file + " >&-"});
        EXPECT_EQ(ended.status, 3) << file;
        EXPECT_EQ(ended.out, "fptest: " + file + " is closed: open it, or name a file\n");
    }
    EXPECT_EQ(run_program({"/system/bin/sh", "-c", "fptest run --expect /dev/stdin <&-"}).out,
              "fptest: --expect /dev/stdin is closed: open it, or name a file\n");
    EXPECT_EQ(read_file(kPlanFile), before);
}

// --- manual pages -----------------------------------------------------------------------

constexpr char kDocuments[] = QUILLMARK_SOURCE_DIR "/docs/";

// As a person reads it, without bold and underlined characters.
std::string manual(const std::string &page)
{
    const Ended ended =
        run_program({"/usr/bin/mandoc", "-T", "utf8", "-O", "width=78", kDocuments + page});
    EXPECT_EQ(ended.status, 0) << ended.out;
    std::string text;
    for (const char c : ended.out) {
        if (c == '\b' && !text.empty()) {
            text.pop_back();
        } else if (c != '\b') {
            text += c;
        }
    }
    return text;
}

void expect_no_complaints(const std::string &page)
{
    const Ended ended =
        run_program({"/usr/bin/mandoc", "-T", "lint", "-W", "warning", kDocuments + page});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "");
}

TEST_F(Fptest, HasAManualPageWithEveryCommandAndOption)
{
    expect_no_complaints("fptest.1");
    const std::string text = manual("fptest.1");
    EXPECT_THAT(text, StartsWith("FPTEST(1)"));
    for (const std::string &command : kCommands) {
        EXPECT_THAT(text, HasSubstr("fptest " + command));
        for (const std::string &option : options_of(command)) {
            EXPECT_TRUE(std::regex_search(text, std::regex("[ \\[|(,]" + option + "\\b")))
                << option << " of " << command;
        }
    }
    for (const std::string &option : options_of("")) {
        EXPECT_THAT(text, HasSubstr(option));
    }
    for (const std::string word : {"EXIT STATUS", "EXAMPLES", "130", "quillmark-plan(5)",
                                   "/data/vorlane/src1.xml", "NO_COLOR"}) {
        EXPECT_THAT(text, HasSubstr(word)) << word;
    }
}

TEST_F(Fptest, HasAManualPageOfItsResults)
{
    expect_no_complaints("fptest-results.5");
    const std::string text = manual("fptest-results.5");
    EXPECT_THAT(text, StartsWith("FPTEST-RESULTS(5)"));
    for (const std::string word : {"timed out", "not run", "unexpected", "left_running",
                                   "flakyFailure", "ATTACHMENT", "# TODO", "UTF-8", "fptest(1)"}) {
        EXPECT_THAT(text, HasSubstr(word)) << word;
    }
}

TEST_F(Fptest, HasAManualPageOfThePlansFormat)
{
    expect_no_complaints("quillmark-plan.5");
    const std::string text = manual("quillmark-plan.5");
    EXPECT_THAT(text, StartsWith("QUILLMARK-PLAN(5)"));
    for (const std::string word :
         {"CmdGroup", "Cmd", "name", "args", "progress", "result", "description", "2048",
          "SensorProbe", "fptest(1)", "/data/vorlane/src1.xml", "EXAMPLES"}) {
        EXPECT_THAT(text, HasSubstr(word)) << word;
    }
}

// --- completion -------------------------------------------------------------------------

TEST_F(Fptest, CompletesOnATerminalWithWhatThePlansHold)
{
    write_file(kPlanFile, plan_of({{"Stored", {{"SpiCheck", ""}, {"DeadPixel", ""}}}}));
    plan(plan_of({{"Given", {{"Other", ""}}}}));
    TerminalSession session({"/usr/bin/bash", "--norc", "--noprofile", "-i"}, 80, 24,
                            {{"PS1", "ready> "},
                             {"PATH", "/system/bin:/usr/bin"},
                             {"COMPLETION", QUILLMARK_SOURCE_DIR "/agent/completion/fptest"}});
    ASSERT_TRUE(session.wait_for_text("ready>")) << session.text();
    session.type("source /usr/share/bash-completion/bash_completion; source \"$COMPLETION\""
                 "; echo soon-$((1 + 1))\n");
    ASSERT_TRUE(session.wait_for_text("soon-2")) << session.text();
    session.type("fptest rep\t");
    EXPECT_TRUE(session.wait_for_text("ready> fptest report")) << session.text();
    session.type("St\tSpi\t");
    EXPECT_TRUE(session.wait_for_text("report Stored SpiCheck")) << session.text();
    for (const std::string plan : {"", "--plan /tmp/scene/plan.xml "}) {
        session.type("\025fptest run " + plan + "P/\t"); // Ctrl-U: on an empty line
        EXPECT_TRUE(session.wait_for_text("run " + plan + (plan.empty() ? "P/Stored" : "P/Given")))
            << session.text();
    }
}

} // namespace
