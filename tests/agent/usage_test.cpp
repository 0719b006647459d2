// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What fptest says of arguments that it cannot take: one line each, with the option
// and the command.
#include "fptest_runner.h"

#include <string>
#include <utility>
#include <vector>

using namespace fptest_runner;
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
        {{"run", "P/G", "--plan="},
         "--plan lacks its value: give it as --plan FILE; see fptest run --help"},
        {{"report", "G", "I", "--progress", "1", "--result", "0", "--description"},
         "--description lacks its value: give it as --description TEXT; see fptest report --help"},
        {{"run", "--list=3"}, "--list takes no value; see fptest run --help"},
        {{"run", "P/G", "--quiet=no"}, "--quiet takes no value; see fptest run --help"},
        {{"run", "P/G", "--pla", "a"},
         "there is no option '--pla'; did you mean '--plan'? See fptest run --help"},
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

} // namespace
