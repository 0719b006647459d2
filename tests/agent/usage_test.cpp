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

const std::string kStoredBefore = group_of({{"Item", ""}});

class Usage : public FptestTest
{
  protected:
    static Lines with(Lines arguments, const std::string &last)
    {
        arguments.push_back(last);
        return arguments;
    }

    void SetUp() override
    {
        FptestTest::SetUp();
        write_file(device::kPlanFile, kStoredBefore);
    }

    static void expect_wrong(const Lines &arguments, const std::string &text)
    {
        expect_refusal(2, "fptest: " + text, arguments);
        EXPECT_EQ(read_file(device::kPlanFile), kStoredBefore);
    }
};

TEST_F(Usage, IsExplainedInOneLine)
{
    const std::vector<std::pair<Lines, std::string>> wrong = {
        {{"run", "--plan", "a", "--plan", "b", "P/G"},
         "--plan is given 2 times: give it once; see fptest run --help"},
        {{"report", "G", "I", "--progress", "1", "--progress", "2", "--progress", "3", "--result",
          "0"},
         "--progress is given 3 times: give it once; see fptest report --help"},
        {{"run", "P/G", "--repeat"}, "--repeat needs a value: --repeat N; see fptest run --help"},
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
         "--description needs a value: --description TEXT; see fptest report --help"},
        {{"run", "--list="}, "--list takes no value; see fptest run --help"},
        {{"run", "--list=3"}, "--list takes no value; see fptest run --help"},
        {{"run", "P/G", "--label", "device"},
         "--label: 'device' has no '=': write KEY=VALUE; see fptest run --help"},
        {{"run", "P/G", "--label", "=A7"},
         "--label: '' is no key: use letters, digits, '.', '_' and '-'; see fptest run --help"},
        {{"run", "--label", "rack row=3", "P/G"},
         "--label: 'rack row' is no key: use letters, digits, '.', '_' and '-'; see fptest run "
         "--help"},
        {{"run", "--label", "job=", "P/G"}, "--label: 'job' has no value; see fptest run --help"},
        {{"run", "--label=", "P/G"}, "--label: its value is empty; see fptest run --help"},
        {{"run", "--label", "plan=x", "P/G"},
         "--label: 'plan' is written by fptest itself: choose another key; see fptest run --help"},
        {{"run", "--label", "seed=7", "P/G"},
         "--label: 'seed' is written by fptest itself: choose another key; see fptest run --help"},
        {{"run", "--label", "job=1", "--label", "job=2", "P/G"},
         "--label job is given twice: give it once"},
        {{"run", "P/G", "--label"},
         "--label needs a value: --label KEY=VALUE; see fptest run --help"},
        {{"run", "--hangup", "ignore", "P/G"},
         "--hangup: 'ignore' is not stop or go-on; see fptest run --help"},
        {{"stop", "--wait", "-1"},
         "--wait: '-1' is not a number from 0 to 1000000; see fptest stop --help"},
        {{"stop", "now"}, "'now' is one argument too many; see fptest stop --help"},
        {{"status", "--json"}, "there is no option '--json'; see fptest status --help"},
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
        {{"run", "--bogus"}, "there is no option '--bogus'; see fptest run --help"},
        {{"check", "--bogus"}, "there is no option '--bogus'; see fptest check --help"},
        {{"report", "--bogus"}, "there is no option '--bogus'; see fptest report --help"},
        {{"send", "--bogus"}, "there is no option '--bogus'; see fptest send --help"},
        {{"show", "--group"}, "there is no option '--group'; see fptest show --help"},
        {{"show", "one", "two", "three"}, "'two' is one argument too many; see fptest show --help"},
        {{"report", "G", "I", "a\nb", "--progress", "1", "--result", "0"},
         "'a\u240Ab' is one argument too many; see fptest report --help"},
        {{"check"}, "FILE is required; see fptest check --help"},
        {{"html"}, "FILE is required; see fptest html --help"},
        {{"check", "--for", "file"}, "FILE is required; see fptest check --help"},
        {{"report", "--progress", "1", "--result", "0"},
         "GROUP is required; see fptest report --help"},
        {{"report", "G", "--progress", "1", "--result", "0"},
         "ITEM is required; see fptest report --help"},
        {{"report", "G", "I", "--result", "0"}, "--progress is required; see fptest report --help"},
        {{"report", "G"}, "ITEM is required; see fptest report --help"},
        {{"report", "G", "I", "--progress", "1"}, "--result is required; see fptest report --help"},
        {{"--versoin"},
         "there is no option '--versoin'; did you mean '--version'? See fptest --help"},
        {{"--help=3"}, "there is no option '--help=3'; did you mean '--help'? See fptest --help"},
        {{"send"}, "give COMMANDs as arguments, or with -0 on standard input"},
        {{"send", "-0", "pingtest"}, "give COMMANDs as arguments, or with -0 on standard input"},
        {{"bogus"},
         "there is no command 'bogus'; the commands are run, check, show, html, report, measure, "
         "send, doctor, status and stop"},
        {{"rum"},
         "there is no command 'rum'; did you mean 'run'? The commands are run, check, show, "
         "html, report, measure, send, doctor, status and stop"},
        {{}, "no command is given; see fptest --help"}};
    for (const auto &[arguments, text] : wrong) {
        expect_wrong(arguments, text);
    }
}

TEST_F(Usage, SaysWhatIsWrongWithAValue)
{
    const std::string path = plan(kStoredBefore);
    const struct {
        Lines before; // the value
        Lines values;
        std::string what; // they are
    } wrong[] = {
        {{"run", "--plan", path, "P/G", "--timeout"},
         {"0", "-1", "x", "nan", "+1", " 1", "0x1", "1 ", "1e999"},
         "is not a number from 0.001 to 1000000"},
        {{"run", "--plan", path, "P/G", "--repeat"},
         {"0", "-1", "x", "1.5"},
         "is not a whole number from 1 to 1000000"},
        {{"run", "--plan", path, "P/G", "--pass-code"}, {"2", "7", "-1", "x"}, "is not 0, 1 or -2"},
        {{"run", "P/G", "--for"},
         {"0", "-1", "x", "1w", "10mm", "1 h", "h", "nan", "0.0001", "+1", " 1", "0x1", "0x1d",
          "1e999"},
         "is not a time such as 90, 90s, 10m, 2h or 1d"},
        {{"run", "P/G", "--for"}, {"1001d", "99999999999d", "1e300d"}, "is longer than 1000 days"},
        {{"report", "G", "Item", "--progress", "1", "--result"},
         {"7", "2", "-1", "x"},
         "is not 0, 1 or -2"},
        // of more, the plan would hold the first 9 characters
        {{"report", "G", "Item", "--result", "0", "--progress"},
         {"1000000000", "-100000000", "50%", "half", "1.5"},
         "is not a whole number from -99999999 to 999999999"},
    };
    for (const auto &[before, values, what] : wrong) {
        const std::string end = "; see fptest " + before.front() + " --help";
        for (const std::string &value : values) {
            expect_wrong(with(before, value), before.back() + ": '" + value + "' " + what + end);
        }
        expect_wrong(with(before, ""), before.back() + ": its value is empty" + end);
    }
}

TEST_F(Usage, TakesAnEmptyDescription)
{
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
