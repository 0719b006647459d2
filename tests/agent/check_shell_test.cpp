// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the plan checker says of command lines that the shell would take for more,
// or less, than an item and its arguments.
#include "check/messages.h"

#include "check/shell_reader.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <fcntl.h>
#include <random>
#include <string>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>
#include <vector>

using fptest::check;
using fptest::Finding;
using fptest::PlanUse;
using fptest::read_shell_line;
using fptest::Shell;
using fptest::ShellReading;

namespace
{

// An item on the third line; its args begin in column 21.
std::string plan_with(const std::string &args, const std::string &name = "X")
{
    return "<P>\n<CmdGroup name=\"A\">\n<Cmd name=\"" + name + "\" args=\"" + args +
           "\"/>\n</CmdGroup>\n</P>\n";
}

std::string messages(const std::string &text)
{
    std::string all;
    for (const Finding &finding : check(text, PlanUse::stored)) {
        all += fptest::Messages("p.xml", text).of(finding);
    }
    return all;
}

// The finding's line and the place that the caret points to, of the one there is.
std::string finding_of(const std::string &args, const std::string &name = "X")
{
    std::string text = messages(plan_with(args, name));
    return text.substr(0, text.find('\n'));
}

bool has_error(const std::string &args)
{
    return fptest::has_errors(check(plan_with(args), PlanUse::stored));
}

// What stands for a text in an attribute.
std::string escaped(const std::string &text)
{
    std::string escaped;
    for (const char c : text) {
        escaped += c == '<' ? "&lt;" : c == '&' ? "&amp;" : c == '"' ? "&quot;" : std::string(1, c);
    }
    return escaped;
}

// Whether the shell does run a line with these args, written as in an attribute.
bool runs(std::string args)
{
    for (std::size_t at = 0; (at = args.find("&quot;", at)) != args.npos;) {
        args.replace(at, 6, "\"");
    }
    const std::string line = "true " + args + "\necho done";
    const pid_t process = fork();
    if (process == 0) {
        const int null = open("/dev/null", O_RDWR);
        dup2(null, STDIN_FILENO);
        dup2(null, STDERR_FILENO);
        execl("/system/bin/sh", "sh", "-c", ("(" + line + ") | grep -q done").c_str(), nullptr);
        _exit(127);
    }
    int status = -1;
    waitpid(process, &status, 0);
    return status == 0;
}

// --- a line feed ------------------------------------------------------------------

TEST(CheckedLineFeed, EndsTheItemsCommand)
{
    EXPECT_EQ(messages(plan_with("--group G\n   touch /tmp/x")),
              "p.xml:3:30: error: the shell would end the command of item 'X' at the line feed "
              "here, and run 'touch /tmp/x' as a command of its own; write a blank in its place\n"
              "<Cmd name=\"X\" args=\"--group G\n"
              "                             ^\n");
}

TEST(CheckedLineFeed, IsFoundWhereItIsWrittenAsAReference)
{
    for (const std::string reference : {"&#10;", "&#xA;", "&#x0a;", "&#0010;"}) {
        EXPECT_EQ(messages(plan_with("'&amp;' \xC3\xA9&#233;&#x20AC;" + reference + "b")),
                  "p.xml:3:44: error: the shell would end the command of item 'X' at the line "
                  "feed here, and run 'b' as a command of its own; write a blank in its place\n"
                  "<Cmd name=\"X\" args=\"'&amp;' \xC3\xA9&#233;&#x20AC;" +
                      reference + "b\"/>\n" + std::string(43, ' ') + "^\n")
            << reference;
    }
}

TEST(CheckedLineFeed, IsSaidOnceOfSeveral)
{
    EXPECT_EQ(finding_of("a\n\n b c\n d"),
              "p.xml:3:22: error: the shell would end the command of item 'X' at the line feed "
              "here, and run 'b c' as a command of its own; write a blank in its place");
    EXPECT_EQ(check(plan_with("a\n\n b c\n d"), PlanUse::stored).size(), 1U);
}

TEST(CheckedLineFeed, IsOfNoMatterWhereNoCommandFollows)
{
    for (const std::string args : {"a\n", "a &#10; \t&#10;", "a\\\n b", "'a\nb'",
                                   "&quot;a&#10;b&quot;", "a$'\n'", "a\n# b"}) {
        const auto findings = check(plan_with(args), PlanUse::stored);
        EXPECT_TRUE(findings.empty() || findings[0].text.find("comment") != std::string::npos)
            << args << " " << findings[0].text;
    }
}

TEST(CheckedLineFeed, IsSaidAfterAnotherCommandAsWell)
{
    const auto findings = check(plan_with("a; b\nc"), PlanUse::stored);
    ASSERT_EQ(findings.size(), 2U);
    EXPECT_EQ(findings[0].severity, Finding::Severity::warning);
    EXPECT_EQ(findings[1].severity, Finding::Severity::error);
    EXPECT_EQ(findings[1].text, "the shell would end the command of item 'X' at the line feed "
                                "here, and run 'c' as a command of its own; write a blank in its "
                                "place");
}

TEST(CheckedLineFeed, HasATabAndACarriageReturnBesideIt)
{
    EXPECT_EQ(finding_of("a\tb&#9;c"), "");
    EXPECT_EQ(finding_of("a\r\n  b"),
              "p.xml:3:23: error: the shell would end the command of item 'X' at the line feed "
              "here, and run 'b' as a command of its own; write a blank in its place");
    EXPECT_EQ(messages(plan_with("a b&#13;")),
              "p.xml:3:24: warning: the shell takes the carriage return here for a character like "
              "any other, and would hand it to item 'X'; leave it out\n"
              "<Cmd name=\"X\" args=\"a b&#13;\"/>\n"
              "                       ^\n");
}

// --- what has no end --------------------------------------------------------------

TEST(CheckedQuotes, HaveNoEnd)
{
    EXPECT_EQ(messages(plan_with("it's")),
              "p.xml:3:23: error: the shell would refuse the command line of item 'X': it finds no "
              "end of the ''' here; end it, or put a '\\' before it\n"
              "<Cmd name=\"X\" args=\"it's\"/>\n"
              "                      ^\n");
    const std::string begin = "error: the shell would refuse the command line of item 'X': it "
                              "finds no end of the '";
    const std::string end = "' here; end it, or put a '\\' before it";
    EXPECT_EQ(finding_of("a &quot;b"), "p.xml:3:23: " + begin + "\"" + end);
    EXPECT_EQ(finding_of("&quot;a&quot; `b"), "p.xml:3:35: " + begin + "`" + end);
    EXPECT_EQ(finding_of("a $(b"), "p.xml:3:23: " + begin + "$(" + end);
    EXPECT_EQ(finding_of("a ${b"), "p.xml:3:23: " + begin + "${" + end);
    EXPECT_EQ(finding_of("a $((1 + (2)"), "p.xml:3:23: " + begin + "$((" + end);
    EXPECT_EQ(finding_of("a $'b\\'"), "p.xml:3:23: " + begin + "$'" + end);
    EXPECT_EQ(finding_of("a @(b"), "p.xml:3:24: " + begin + "(" + end);
    EXPECT_EQ(finding_of("a &lt;&lt;E"), "p.xml:3:23: " + begin + "<<E" + end);
}

TEST(CheckedParentheses, AreTakenInQuotesOnly)
{
    EXPECT_EQ(finding_of("a (b)"),
              "p.xml:3:23: error: the shell would refuse the command line of item 'X': it takes no "
              "'(' here; put it in quotes, or leave it out");
    EXPECT_EQ(finding_of("a b)"),
              "p.xml:3:24: error: the shell would refuse the command line of item 'X': it takes no "
              "')' here; put it in quotes, or leave it out");
    EXPECT_EQ(finding_of("'(' \\) &quot;(&quot;"), "");
    EXPECT_EQ(finding_of("() b"),
              "p.xml:3:21: error: the shell would make a function of item 'X' here, and run "
              "nothing; put the '(' in quotes if it is meant for the item");
}

TEST(CheckedOperator, HasNothingAfterIt)
{
    for (const auto &[args, mark] : std::vector<std::pair<std::string, std::string>>{
             {"a |", "|"}, {"a &amp;&amp; ", "&&"}, {"a ||", "||"}, {"a &gt;", ">"}}) {
        EXPECT_EQ(finding_of(args),
                  "p.xml:3:23: error: the shell would refuse the command line of item 'X': nothing "
                  "follows the '" +
                      mark + "' here; put it in quotes, or leave it out");
    }
}

// Only where there is a shell to be asked.
TEST(CheckedGrammar, IsTheShellsToJudge)
{
    std::string why;
    ASSERT_EQ(Shell().ask("/system/bin/X a; if", why), Shell::Answer::refused);
    EXPECT_EQ(why, "syntax error: unmatched 'if'");
    EXPECT_EQ(finding_of("a; if"), "p.xml:3:21: error: the shell would refuse the command line of "
                                   "item 'X': syntax error: unmatched 'if'; fix its args");
    // which is not what one would think, and accepted all the same
    ASSERT_TRUE(read_shell_line("/system/bin/X \\<<\\\n<<E").fault);
    ASSERT_EQ(Shell().ask("/system/bin/X \\<<\\\n<<E", why), Shell::Answer::accepted);
    EXPECT_EQ(finding_of("\\&lt;&lt;\\\n&lt;&lt;E").find("error"), std::string::npos);
}

// With -n it accepts these all the same.
TEST(CheckedGrammar, IsTheShellsBetweenBackticksToo)
{
    EXPECT_EQ(messages(plan_with("a `if` b")),
              "p.xml:3:23: error: the shell would refuse the command line of item 'X': between the "
              "backticks here, syntax error: unmatched 'if'; put a '\\' before them if they are "
              "meant for the item\n"
              "<Cmd name=\"X\" args=\"a `if` b\"/>\n"
              "                      ^\n");
    for (const std::string args : {"`&quot;`", "&quot;`(`&quot;", "``(``"}) {
        EXPECT_TRUE(has_error(args)) << args;
        EXPECT_FALSE(runs(args)) << args;
    }
    for (const std::string args :
         {"``", "`echo \\`echo b\\``", "`echo \\`(\\``", "`echo '(' \\$HOME`",
          "&quot;`echo \\&quot;a b\\&quot;`&quot;"}) {
        EXPECT_FALSE(has_error(args)) << args;
        EXPECT_TRUE(runs(args)) << args;
    }
}

TEST(CheckedExpansion, IsAnErrorWhereTheShellGivesUpAtIt)
{
    EXPECT_EQ(messages(plan_with("a ${b c} d")),
              "p.xml:3:23: error: the shell would refuse the command line of item 'X': ${b c}: bad "
              "substitution; put a '\\' before the '$' here if it is meant for the item\n"
              "<Cmd name=\"X\" args=\"a ${b c} d\"/>\n"
              "                      ^\n");
    for (const std::string args : {"${}", "${x;y}", "&quot;${a b}&quot;", "${a^}", "${.}", "${a,}",
                                   "${a.b}", "$((1 + ${a b}))", "$((1+))", "$((1/0))", "${x!y}",
                                   "${1:=x}", "$((a b))", "${x[a b]}", "&quot;$((2 **))&quot;"}) {
        EXPECT_TRUE(has_error(args)) << args;
        EXPECT_FALSE(runs(args)) << args;
    }
    for (const std::string args :
         {"${a}",     "${a:-b c}", "${a-${b c}}x", "${#a}",      "${a#b}",   "${a%%b}",
          "${a/b/c}", "${a@Q}",    "${a:0:1}",     "${1}",       "${10}",    "${*}",
          "${@}",     "${#}",      "${?}",         "${$}",       "${!}",     "${-}",
          "${a[1]}",  "${a[*]}",   "$'${'",        "\\${a b}",   "'${a b}'", "x || : ${a b}",
          "${!a}",    "${%a}",     "${HOME?}",     "$((1 + 2))", "${a:=b}",  "$((a = 3, 4))"}) {
        EXPECT_FALSE(has_error(args)) << args;
        EXPECT_TRUE(runs("; a=b; : " + args)) << args;
    }
}

TEST(CheckedGrammar, IsJudgedWithoutRunningAnything)
{
    const std::string file = "/tmp/is_not_made";
    std::string why;
    for (const std::string args :
         {"; touch ", "$(touch ", "`touch ", "\ntouch ", "&& touch ", ">"}) {
        const std::string end = args[0] == '$' ? ")" : args[0] == '`' ? "`" : "";
        EXPECT_EQ(Shell().ask("/system/bin/true " + args + file + end, why),
                  Shell::Answer::accepted);
        EXPECT_NE(access(file.c_str(), F_OK), 0) << args;
    }
    for (const std::string &run : {"$(touch " + file + ")", "`touch " + file + "`"}) {
        for (const std::string &expansion :
             {"$((1 + " + run + "))", "${a:-" + run + "}", "${a[" + run + "]}", "$((" + run + "))",
              "${ touch " + file + ";}", "${|touch " + file + ";}",
              "$((1)); touch " + file + "; ((1))"}) {
            EXPECT_EQ(Shell().ask_to_expand(expansion, why), Shell::Answer::unknown);
            EXPECT_NE(access(file.c_str(), F_OK), 0) << expansion;
        }
    }
}

TEST(CheckedGrammar, IsAskedOfTheShellForFiveSecondsInAll)
{
    std::string items;
    for (int number = 0; number < 20000; ++number) {
        items += "<Cmd name=\"X\" args=\"'" + std::to_string(number) + "'\"/>\n";
    }
    const auto begin = std::chrono::steady_clock::now();
    const auto findings =
        check("<P>\n<CmdGroup name=\"A\">\n" + items + "</CmdGroup>\n</P>\n", PlanUse::stored);
    EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(12));
    EXPECT_EQ(std::ranges::count(findings,
                                 "the device's shell has been asked for as long as fptest waits "
                                 "for it: from item 'X' on, what it would refuse may be missed; "
                                 "check the rest as a plan of its own",
                                 &Finding::text),
              1);
}

// --- what is run besides ------------------------------------------------------------

TEST(CheckedCommand, BeginsAtAnOperator)
{
    EXPECT_EQ(messages(plan_with("a; touch /tmp/x")),
              "p.xml:3:22: warning: the shell would run 'touch /tmp/x' as a command of its own, "
              "after item 'X'; put the ';' in quotes if it is meant for the item\n"
              "<Cmd name=\"X\" args=\"a; touch /tmp/x\"/>\n"
              "                     ^\n");
    EXPECT_EQ(finding_of("a &amp;&amp; b; c"),
              "p.xml:3:23: warning: the shell would run 'b; c' as a command of its own where item "
              "'X' succeeds; put the '&&' in quotes if it is meant for the item");
    EXPECT_EQ(finding_of("a||b"),
              "p.xml:3:22: warning: the shell would run 'b' as a command of its own where item 'X' "
              "fails; put the '||' in quotes if it is meant for the item");
    EXPECT_EQ(finding_of("a | b"),
              "p.xml:3:23: warning: the shell would run 'b' as a command of its own on what item "
              "'X' prints; put the '|' in quotes if it is meant for the item");
    EXPECT_EQ(finding_of("a &amp; b"),
              "p.xml:3:23: warning: the shell would run item 'X' in the background, and run 'b' as "
              "a command of its own; put the '&' in quotes if it is meant for the item");
}

TEST(CheckedCommand, MayBeOver)
{
    EXPECT_EQ(finding_of("a &amp;"),
              "p.xml:3:23: warning: the shell would run item 'X' in the background, so that it "
              "ends at once for the library; put the '&' in quotes if it is meant for the item");
    EXPECT_EQ(finding_of("a ;"),
              "p.xml:3:23: warning: the shell would end the command of item 'X' here, and not hand "
              "it the ';'; put the ';' in quotes if it is meant for the item");
}

TEST(CheckedCommand, IsPutInPlaceOfWhatItPrints)
{
    const std::string end = "' as a command of its own before item 'X', and put what that prints "
                            "here; put a '\\' before it if it is meant for the item";
    EXPECT_EQ(finding_of("--at $(date +%s) b"),
              "p.xml:3:26: warning: the shell would run 'date +%s" + end);
    EXPECT_EQ(finding_of("&quot;`id`&quot;"), "p.xml:3:27: warning: the shell would run 'id" + end);
    EXPECT_EQ(finding_of("$(case a in a) b;; esac)"),
              "p.xml:3:21: warning: the shell would run 'case a in a) b;; esac" + end);
    EXPECT_EQ(finding_of("${ id;}"), "p.xml:3:21: warning: the shell would run 'id;" + end);
}

TEST(CheckedCommand, IsRedirected)
{
    for (const auto &[args, text] :
         std::vector<std::pair<std::string, std::string>>{{"a &gt; /tmp/x", "> /tmp/x"},
                                                          {"a 2&gt;&amp;1", "2>&1"},
                                                          {"a &lt;f", "<f"},
                                                          {"a &amp;>f b", "&>f"},
                                                          {"a &lt;&lt;E&#10;b&#10;E", "<<E"}}) {
        const std::string mark = text.substr(0, text.find_first_of(" f1E/"));
        const std::string only = mark.find('2') == 0 ? ">&" : mark;
        EXPECT_EQ(finding_of(args), "p.xml:3:23: warning: the shell would redirect item 'X' by '" +
                                        text + "', and not hand it that; put the '" + only +
                                        "' in quotes if it is meant for the item");
    }
}

TEST(CheckedCommand, HasACommentAfterIt)
{
    EXPECT_EQ(
        finding_of("--color #fff it's"),
        "p.xml:3:29: warning: the shell would take '#fff it's' for a comment, and not hand it "
        "to item 'X'; put the '#' in quotes if it is meant for the item");
    EXPECT_EQ(finding_of("a#b"), "");
}

TEST(CheckedCommand, IsTheItemsAloneWithPlainArgs)
{
    for (const std::string args :
         {"", "--group G -x 1,2 a=b c/d", "'a; b' &quot;c &amp; d&quot; e\\;f", "$HOME ${x:-y}",
          "$((1 + 2))", "a{b,c} * ? [d] ~ !", "&quot;\\`&quot; '$(x)'", "a\\", "{ } ! if esac",
          "@(a|b) *(c;d)", "$$ $? x$'\\'y'", "&quot;${a:-'}&quot;", "\xE2\x80\x9C"}) {
        EXPECT_EQ(messages(plan_with(args)), "") << args;
    }
}

// --- names --------------------------------------------------------------------------

TEST(CheckedName, MayKeepTheShellFromRunningIt)
{
    EXPECT_EQ(messages(plan_with("a", "it's")),
              "p.xml:3:12: error: item 'it's' has ''' in its name, which the shell reads as its "
              "own: it would refuse the command line; rename it\n"
              "<Cmd name=\"it's\" args=\"a\"/>\n"
              "           ^\n");
    EXPECT_EQ(finding_of("a", "b;c"),
              "p.xml:3:12: warning: item 'b;c' has ';' in its name, which the shell reads as its "
              "own: it would not run a program of that name; rename it");
}

TEST(CheckedName, IsToldFromArgsThatDoSo)
{
    const auto findings = check(plan_with("(", "b*"), PlanUse::stored);
    ASSERT_EQ(findings.size(), 2U);
    EXPECT_EQ(findings[0].text, "item 'b*' has '*' in its name, which the shell reads as its own: "
                                "it would not run a program of that name; rename it");
    EXPECT_EQ(findings[1].text, "the shell would refuse the command line of item 'b*': it takes no "
                                "'(' here; put it in quotes, or leave it out");
}

// --- any args -------------------------------------------------------------------------

TEST(CheckedArgs, OfAnyKindAreErrorsWhereTheShellRefusesThem)
{
    const std::vector<std::string> pieces = {"a",   " ", "'", "\"", "`",  "\\", "$(", "${",
                                             "}",   "(", ")", ";",  "&",  "|",  "<",  ">",
                                             "<<E", "#", "$", "$'", "((", "@(", "!",  "2>"};
    std::mt19937 random(11);
    Shell shell(60);
    std::size_t refused = 0;
    std::size_t known = 0;
    for (int round = 0; round < 600; ++round) {
        std::string args;
        for (std::size_t left = 1 + random() % 6; left > 0; --left) {
            args += pieces[random() % pieces.size()];
        }
        const std::string line = "/system/bin/X " + args;
        std::string why;
        const Shell::Answer answer = shell.ask(line, why);
        ASSERT_NE(answer, Shell::Answer::unknown);
        const ShellReading reading = read_shell_line(line);
        const bool is_error =
            std::ranges::any_of(reading.effects, [&](const ShellReading::Effect &effect) {
                return effect.kind == ShellReading::Effect::Kind::function ||
                       (effect.kind == ShellReading::Effect::Kind::expansion &&
                        shell.ask_to_expand(effect.text, why) == Shell::Answer::refused) ||
                       (effect.mark == "`" &&
                        shell.ask(effect.text, why) == Shell::Answer::refused);
            });
        EXPECT_EQ(has_error(escaped(args)), answer == Shell::Answer::refused || is_error) << line;
        if (answer == Shell::Answer::accepted) {
            EXPECT_FALSE(reading.fault) << line;
        } else {
            ++refused;
            known += reading.fault ? 1 : 0;
        }
    }
    EXPECT_GT(refused, 200U); // else little has been tried
    EXPECT_LT(refused, 580U);
    EXPECT_GT(known, refused * 95 / 100); // where there is no shell to be asked
}

} // namespace
