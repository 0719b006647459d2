// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What fptest says of arguments that it cannot take: one line each, with the option
// and the command.
#include "fptest_runner.h"

#include <string>
#include <utility>
#include <vector>

using device::Lines;

namespace
{

using Usage = FptestTest;

TEST_F(Usage, IsExplainedInOneLine)
{
    const std::vector<std::pair<Lines, std::string>> wrong = {
        {{"run", "--plan", "a", "--plan", "b", "P/G"},
         "--plan is given 2 times: give it once; see fptest run --help"},
        {{"report", "G", "I", "--progress", "1", "--progress", "2", "--progress", "3", "--result",
          "0"},
         "--progress is given 3 times: give it once; see fptest report --help"},
        {{"run", "P/G", "--repeat"},
         "--repeat lacks its value: give it as --repeat N; see fptest run --help"},
        {{"run", "--plan=", "P/G"}, "--plan: its value is empty; see fptest run --help"},
        {{"run", "--json=", "P/G", "P/H"}, "--json: its value is empty; see fptest run --help"},
        {{"run", "--junit=", "P/G", "P/H"}, "--junit: its value is empty; see fptest run --help"},
        {{"run", "--log=", "P/G", "P/H"}, "--log: its value is empty; see fptest run --help"},
        {{"run", "--timeout=", "30", "P/G"},
         "--timeout: its value is empty; see fptest run --help"},
        {{"run", "P/G", "--for="}, "--for: its value is empty; see fptest run --help"},
        {{"report", "G", "I", "--progress", "1", "--result="},
         "--result: its value is empty; see fptest report --help"},
        {{"check", "--for=", "file"}, "--for: its value is empty; see fptest check --help"},
        {{"report", "G", "I", "--progress", "1", "--result", "0", "--description"},
         "--description lacks its value: give it as --description TEXT; see fptest report --help"},
        {{"run", "--list="}, "--list takes no value; see fptest run --help"},
        {{"run", "--list=3"}, "--list takes no value; see fptest run --help"},
        {{"run", "P/G", "--quiet=no"}, "--quiet takes no value; see fptest run --help"},
        {{"run", "P/G", "--pla", "a"},
         "there is no option '--pla'; did you mean '--plan'? See fptest run --help"},
        {{"run", "--rep", "2", "P/G"},
         "there is no option '--rep'; did you mean '--repeat'? See fptest run --help"},
        {{"run", "--as-s=1", "P/G"},
         "there is no option '--as-s=1'; did you mean '--as-sent'? See fptest run --help"},
        {{"run", "P/G", "--", "--quiet"},
         "--quiet is not an option after --: put it before; see fptest run --help"},
        {{"run", "P/G", "--", "--quit"},
         "there is no option '--quit'; did you mean '--quiet'? See fptest run --help"},
        {{"run", "-x"}, "there is no option '-x'; see fptest run --help"},
        {{"show", "--group"}, "there is no option '--group'; see fptest show --help"},
        {{"show", "one", "two", "three"}, "'two' is one argument too many; see fptest show --help"},
        {{"report", "G", "I", "a\nb", "--progress", "1", "--result", "0"},
         "'a\u240Ab' is one argument too many; see fptest report --help"},
        {{"check"}, "FILE is required; see fptest check --help"},
        {{"check", "--for", "file"}, "FILE is required; see fptest check --help"},
        {{"report", "G"}, "ITEM is required; see fptest report --help"},
        {{"report", "G", "I", "--progress", "1"}, "--result is required; see fptest report --help"},
        {{"--versoin"},
         "there is no option '--versoin'; did you mean '--version'? See fptest --help"},
        {{"--help=3"}, "there is no option '--help=3'; did you mean '--help'? See fptest --help"},
        {{}, "no command is given; see fptest --help"}};
    for (const auto &[arguments, text] : wrong) {
        expect_refusal(2, "fptest: " + text, arguments);
    }
}

TEST_F(Usage, TakesAnEmptyDescription)
{
    device::write_file(device::kPlanFile,
                       "<P><CmdGroup name=\"G\"><Cmd name=\"Item\"/></CmdGroup></P>");
    EXPECT_EQ(
        run_fptest({"report", "G", "Item", "--progress", "100", "--description=", "--result", "0"})
            .status,
        0);
    EXPECT_EQ(run_fptest({"show"}).out, "GROUP  ITEM  PROGRESS  RESULT  DESCRIPTION\n"
                                        "G      Item       100       0\n");
}

TEST_F(Usage, ReadsStandardInputOnce)
{
    expect_refusal(2, "fptest: '-' is given twice: standard input can be read only once",
                   {"check", "-", "-"});
}

} // namespace
