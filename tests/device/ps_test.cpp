// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// ps on the virtual device.
#include "launcher_runner.h"

#include <algorithm>
#include <cstddef>
#include <filesystem>
#include <regex>
#include <set>
#include <string>
#include <vector>

using namespace launcher;

namespace
{

class Ps : public Device
{
};

// The lines below the header, each in its columns.
std::vector<Words> processes(const Outcome &outcome)
{
    static const std::regex line("([^ ]+) +([0-9]+) +([0-9]+) +([0-9]+) +([0-9]+) +([0-9a-f]{8}) "
                                 "([0-9a-f]{8}) ([A-Za-z]) (.+)");
    std::vector<Words> result;
    const Words all = lines_of(outcome.out);

    EXPECT_EQ(all.empty() ? "" : all.front(), header);
    for (std::size_t i = 1; i < all.size(); ++i) {
        std::smatch columns;
        if (std::regex_match(all[i], columns, line)) {
            result.emplace_back(columns.begin() + 1, columns.end());
        } else {
            ADD_FAILURE() << "no process: " << all[i];
        }
    }
    return result;
}

enum Column : std::size_t { user, pid, parent, virtual_size, resident, wchan, pc, state, name };

// Those of them that the script has listed and that are its shell or below it: in a
// container others run beside.
std::vector<Words> own_processes(const std::string &script, const Words &options = {})
{
    Outcome outcome = shell("echo $$; " + script, options);
    const auto end = outcome.out.find('\n');
    std::set<std::string> own = {outcome.out.substr(0, end)};
    outcome.out.erase(0, end == std::string::npos ? end : end + 1);
    auto rows = processes(outcome);
    for (std::size_t before = 0; before != own.size();) {
        before = own.size();
        for (const Words &row : rows) {
            if (own.contains(row[parent])) {
                own.insert(row[pid]);
            }
        }
    }
    std::erase_if(rows, [&](const Words &row) { return !own.contains(row[pid]); });
    return rows;
}

Words column(const std::vector<Words> &rows, Column wanted)
{
    Words result;
    for (const Words &row : rows) {
        result.push_back(row[wanted]);
    }
    return result;
}

TEST_F(Ps, PrintsTheOldToolboxsColumns)
{
    const auto rows = own_processes("ps; :");

    ASSERT_EQ(rows.size(), 2U);
    for (const Words &row : rows) {
        EXPECT_EQ(row[user], way() == Way::namespaces ? "root" : row[user]);
    }
    EXPECT_EQ(rows.back()[name], "ps");
    EXPECT_EQ(rows.back()[parent], rows.front()[pid]);
    EXPECT_EQ(rows.front()[name], "sh");
    EXPECT_GT(std::stoi(rows.back()[virtual_size]), std::stoi(rows.back()[resident]));
    EXPECT_GT(std::stoi(rows.back()[resident]), 0);
}

TEST_F(Ps, ListsByProcessId)
{
    const auto ids = column(own_processes("sleep 9 & sleep 9 & sleep 9 & ps; :"), pid);

    EXPECT_EQ(ids.size(), 5U);
    EXPECT_TRUE(std::ranges::is_sorted(ids, {}, [](auto &id) { return std::stoi(id); }));
}

TEST_F(Ps, SelectsByTheStartOfTheLastPartOfTheProgramsPath)
{
    const std::string two = "sleep 9 & /system/bin/sleep 9 & sleep 0.3; ";

    for (const std::string wanted : {"s", "sle", "sleep"}) {
        auto names = column(own_processes(two + "ps " + wanted), name);
        std::erase(names, "sh");
        EXPECT_EQ(names, (Words{"sleep", "/system/bin/sleep"})) << wanted;
    }
    for (const std::string wanted : {"leep", "sleeper", "/system", "Sleep"}) {
        const Outcome outcome = shell(two + "ps " + wanted);
        EXPECT_EQ(outcome.out, header + "\n") << wanted;
        EXPECT_EQ(outcome.status, 0);
    }
}

TEST_F(Ps, WithAnEmptyNameListsEveryProcess)
{
    EXPECT_EQ(column(own_processes("ps ''; :"), name), (Words{"sh", "ps"}));
}

TEST_F(Ps, ShowsTheProgramWithoutItsArguments)
{
    const auto rows =
        own_processes("sh -c 'sleep 9; : /system/bin/SensorProbe' & sleep 0.3; ps; :");

    EXPECT_EQ(std::ranges::count(column(rows, name), "sh"), 2);
}

TEST_F(Ps, ShowsTheKernelsNameOfAZombie)
{
    // a program that never reaps takes the place of the shell that started a child
    const auto rows = own_processes("(sleep 0 & exec sleep 9) & sleep 0.4; ps sleep");

    EXPECT_EQ(std::ranges::count_if(
                  rows, [](auto &row) { return row[state] == "Z" && row[name] == "sleep"; }),
              1);
}

TEST_F(Ps, ShowsTheKernelsNameWhereTheProgramsIsEmpty)
{
    const auto rows = own_processes("(exec -a '' /usr/bin/sleep 9) & sleep 0.3; ps sleep");

    EXPECT_EQ(column(rows, name), Words{"sleep"});
}

TEST_F(Ps, ReadsAKernelsNameThatLooksLikeTheNextFields)
{
    const TemporaryDirectory own;
    fs::copy_file("/usr/bin/sleep", own.path() / "a) Z 7");

    const auto rows = own_processes("(exec -a '' '/system/bin/a) Z 7' 9) & sleep 0.3; ps 'a)'",
                                    {"--bin", own.path()});

    ASSERT_EQ(rows.size(), 1U);
    EXPECT_EQ(rows[0][name], "a) Z 7");
    EXPECT_EQ(rows[0][state], "S");
    EXPECT_NE(rows[0][parent], "7");
}

TEST_F(Ps, KeepsAProcessOnOneLine)
{
    const auto rows =
        own_processes("(exec -a $'two\\nlines' /usr/bin/sleep 9) & sleep 0.3; ps two");

    EXPECT_EQ(column(rows, name), Words{"two?lines"});
}

TEST_F(Ps, AQueryPipedIntoGrepNeverFindsItsOwnGrep)
{
    for (int i = 0; i < 10; ++i) {
        const Outcome outcome = shell("ps | grep /system/bin/SensorProbe");
        EXPECT_EQ(outcome.out, "");
        EXPECT_EQ(outcome.status, 1);
    }
}

TEST_F(Ps, AQueryForTheGathererFindsEveryVariantOfIt)
{
    for (const std::string program : {"SensorProbe", "SensorProbe_ca"}) {
        const Outcome outcome = shell("/system/bin/sh -c '/system/bin/" + program +
                                      " --group g' & sleep 0.4; ps | grep /system/bin/SensorProbe");
        ASSERT_EQ(lines_of(outcome.out).size(), 1U) << outcome.out;
        EXPECT_TRUE(outcome.out.ends_with(" /system/bin/" + program + "\n")) << outcome.out;
    }
}

TEST_F(Ps, SkipsProcessesThatEndMeanwhile)
{
    // in 300 runs, some meet a process that ends between two looks at it
    const Outcome outcome =
        shell("churn() { while :; do /system/bin/true; done; }; churn & first=$!; churn & "
              "i=0; while [ $((i += 1)) -le 300 ]; do ps >/tmp/list || exit 9; done; "
              "kill $! $first; cat /tmp/list");

    EXPECT_EQ(outcome.status, 0);
    EXPECT_GE(processes(outcome).size(), 5U);
}

TEST_F(Ps, TakesOneNameAndNoOptions)
{
    for (const Words &arguments : {Words{"ps", "-A"}, Words{"ps", "a", "b"}}) {
        const Outcome outcome = on_device(arguments);
        EXPECT_EQ(outcome.status, 1);
        EXPECT_EQ(outcome.out, "");
        EXPECT_EQ(last_line(outcome.err),
                  "ps: it takes no options and one name at most: ps [NAME]");
    }
}

TEST_F(NamespaceDevice, SeesOnlyItsOwnProcesses)
{
    const auto rows = processes(on_device({"ps"}));

    EXPECT_EQ(column(rows, name), (Words{"bwrap", "ps"}));
    EXPECT_EQ(column(rows, pid), (Words{"1", "2"}));
}

} // namespace
