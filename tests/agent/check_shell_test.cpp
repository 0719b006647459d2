// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Where the plan checker and the device's shell must be of one mind; what is said of
// command lines is in check/programs.txt.
#include "check/check.h"
#include "check/device_shell.h"
#include "check/shell_reader.h"
#include "support/process.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <random>
#include <string>
#include <unistd.h>
#include <vector>

using fptest::DeviceShell;
using fptest::Finding;
using fptest::read_shell_line;
using fptest::ShellReading;
using fptest::Storing;

namespace
{

bool has_error(const std::string &args)
{
    std::string escaped;
    for (const char c : args) {
        escaped += c == '<' ? "&lt;" : c == '&' ? "&amp;" : c == '"' ? "&quot;" : std::string(1, c);
    }
    const std::string plan =
        "<P><CmdGroup name=\"A\"><Cmd name=\"X\" args=\"" + escaped + "\"/></CmdGroup></P>";
    return fptest::has_errors(fptest::check("plan", plan, Storing::as_file).findings);
}

// Whether the shell does run a line with these args.
bool runs(const std::string &args)
{
    const std::string line = "(true " + args + "\necho done) | grep -q done";
    return support::run({.arguments = {"/system/bin/sh", "-c", line}}).status == 0;
}

// Only if there is a shell to be asked.
TEST(CheckedGrammar, ShellDecidesWhatIsASyntaxError)
{
    std::string why;
    ASSERT_EQ(DeviceShell().ask("/system/bin/X a; if", why), DeviceShell::Answer::refused);
    EXPECT_EQ(why, "syntax error: unmatched 'if'");
    // which is not what one would think, and accepted all the same
    ASSERT_TRUE(read_shell_line("/system/bin/X \\<<\\\n<<E").fault);
    ASSERT_EQ(DeviceShell().ask("/system/bin/X \\<<\\\n<<E", why), DeviceShell::Answer::accepted);
    EXPECT_FALSE(has_error("\\<<\\\n<<E"));
}

// With -n it accepts these all the same.
TEST(CheckedGrammar, IsTheShellsBetweenBackticksToo)
{
    for (const std::string args : {"`\"`", "\"`(`\"", "``(``", "$(`echo (b)`)",
                                   "$(echo \"`echo (b)`\")", "`echo \\\"(b)`", "`+x (b)`"}) {
        EXPECT_TRUE(has_error(args)) << args;
        EXPECT_FALSE(runs(args)) << args;
    }
    for (const std::string args :
         {"``", "`echo \\`echo b\\``", "`echo \\`(\\``", "`echo '(' \\$HOME`",
          "\"`echo \\\"a b\\\"`\"", "$(`echo b`)", "`echo \\\"b`", "`-v`", "`-c`"}) {
        EXPECT_FALSE(has_error(args)) << args;
        EXPECT_TRUE(runs(args)) << args;
    }
}

TEST(CheckedExpansion, IsAnErrorWhereTheShellGivesUpAtIt)
{
    for (const std::string args :
         {"${}", "${x;y}", "\"${a b}\"", "${a^}", "${.}", "${a,}", "${a.b}", "$((1 + ${a b}))",
          "$((1+))", "$((1.5))", "$((1?2))", "$((x[))", "$((1/0))", "${x!y}", "${1:=x}", "$((a b))",
          "${x[a b]}", "\"$((2 **))\""}) {
        EXPECT_TRUE(has_error(args)) << args;
        EXPECT_FALSE(runs(args)) << args;
    }
    for (const std::string args : {"${a}",         "${a:-b c}",    "${a-${b c}}x",
                                   "${#a}",        "${a#b}",       "${a%%b}",
                                   "${a/b/c}",     "${a@Q}",       "${a:0:1}",
                                   "${1}",         "${10}",        "${*}",
                                   "${@}",         "${#}",         "${?}",
                                   "${$}",         "${!}",         "${-}",
                                   "${a[1]}",      "${a[*]}",      "$'${'",
                                   "\\${a b}",     "'${a b}'",     "x || : ${a b}",
                                   "${!a}",        "${%a}",        "${HOME?}",
                                   "$((1 + 2))",   "${a:=b}",      "$((a = 3, 4))",
                                   "${b:-'c\"d'}", "\"${a#'}'}\"", "$(((1 + 2) * (3)))",
                                   "${b:-'c}d'}"}) {
        EXPECT_FALSE(has_error(args)) << args;
        EXPECT_TRUE(runs("; a=b; : " + args)) << args;
    }
}

TEST(CheckedGrammar, IsJudgedWithoutRunningAnything)
{
    ASSERT_EQ(chdir("/tmp"), 0);
    const std::string file = "is_not_made"; // with a '/' an expansion is left alone
    std::string why;
    for (const std::string args :
         {"; touch ", "$(touch ", "`touch ", "\ntouch ", "&& touch ", ">"}) {
        const std::string end = args[0] == '$' ? ")" : args[0] == '`' ? "`" : "";
        EXPECT_EQ(DeviceShell().ask("/system/bin/true " + args + file + end, why),
                  DeviceShell::Answer::accepted);
        EXPECT_NE(access(file.c_str(), F_OK), 0) << args;
    }
    for (const std::string &run : {"$(touch " + file + ")", "`touch " + file + "`"}) {
        for (const std::string &expansion :
             {"$((1 + " + run + "))", "${a:-" + run + "}", "${a[" + run + "]}", "$((" + run + "))",
              "${ touch " + file + ";}", "${|touch " + file + ";}",
              "$((a[${x:-$}{${y} touch " + file + " &}]))", "$((1)); touch " + file + "; ((1))",
              "${x:-'}\"; touch " + file + "; : \"'}", "${x[1]:-'}\"; touch " + file + "; : \"'}",
              "${|touch " + file + "}", "${<" + file + "}", "${(touch " + file + ")}"}) {
            EXPECT_EQ(DeviceShell().ask_to_expand(expansion, why), DeviceShell::Answer::unknown);
            EXPECT_NE(access(file.c_str(), F_OK), 0) << expansion;
        }
    }
}

TEST(CheckedGrammar, IsReadInATimeThatDoesNotDoubleWithEachLevel)
{
    for (const auto &[begin, end] : {std::pair("$((", ") )"), std::pair("$(((", ") ) )")}) {
        std::string line = "x";
        for (int level = 0; level < 100; ++level) {
            line = begin + line + end;
        }
        const auto start = std::chrono::steady_clock::now();
        read_shell_line("/system/bin/X " + line);
        EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(2)) << begin;
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
        fptest::check("plan", "<P>\n<CmdGroup name=\"A\">\n" + items + "</CmdGroup>\n</P>\n",
                      Storing::as_file)
            .findings;
    EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(12));
    EXPECT_EQ(std::ranges::count(findings,
                                 "the device's shell has been asked for as long as fptest waits "
                                 "for it: from item 'X' on, what it would refuse may be missed; "
                                 "check the rest as a plan of its own",
                                 &Finding::text),
              1);
}

TEST(CheckedArgs, OfAnyKindAreErrorsWhereTheShellRefusesThem)
{
    const std::vector<std::string> pieces = {"a",   " ", "'", "\"", "`",  "\\", "$(", "${",
                                             "}",   "(", ")", ";",  "&",  "|",  "<",  ">",
                                             "<<E", "#", "$", "$'", "((", "@(", "!",  "2>"};
    std::mt19937 random(11);
    DeviceShell shell(60);
    std::size_t refused = 0;
    std::size_t known = 0;
    for (int round = 0; round < 600; ++round) {
        std::string args;
        for (std::size_t left = 1 + random() % 6; left > 0; --left) {
            args += pieces[random() % pieces.size()];
        }
        const std::string line = "/system/bin/X " + args;
        std::string why;
        const DeviceShell::Answer answer = shell.ask(line, why);
        ASSERT_NE(answer, DeviceShell::Answer::unknown);
        const ShellReading reading = read_shell_line(line);
        const bool is_error =
            std::ranges::any_of(reading.effects, [&](const ShellReading::Effect &effect) {
                return effect.kind == ShellReading::Effect::Kind::function ||
                       effect.kind == ShellReading::Effect::Kind::no_descriptor ||
                       (effect.kind == ShellReading::Effect::Kind::expansion &&
                        shell.ask_to_expand(effect.text, why) == DeviceShell::Answer::refused) ||
                       (effect.mark == "`" &&
                        shell.ask(effect.text, why) == DeviceShell::Answer::refused);
            });
        EXPECT_EQ(has_error(args), answer == DeviceShell::Answer::refused || is_error) << line;
        if (answer == DeviceShell::Answer::accepted) {
            EXPECT_FALSE(reading.fault) << line;
        } else {
            ++refused;
            known += reading.fault ? 1 : 0;
        }
    }
    EXPECT_GT(refused, 200U); // else little has been tried
    EXPECT_LT(refused, 580U);
    EXPECT_GT(known, refused * 95 / 100); // if there is no shell to be asked
}

} // namespace
