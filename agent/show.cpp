// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "commands.h"
#include "files.h"
#include "plan.h"
#include "terminal.h"
#include "text.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <unistd.h>

namespace fptest
{
namespace
{

using Row = std::array<std::string, 5>;

std::string shown(const std::optional<std::string> &text)
{
    return one_line(text.value_or("-"));
}

std::vector<Row> table(const Plan &plan)
{
    std::vector<Row> rows = {{"GROUP", "ITEM", "PROGRESS", "RESULT", "DESCRIPTION"}};
    for (const Plan::Group &group : plan.groups()) {
        for (const Plan::Element &item : group.items) {
            const Report &report = item.report;
            rows.push_back({one_line(group.name), shown(item.name), shown(report.progress),
                            report.result_without_value ? "?" : shown(report.result),
                            shown(report.description)});
        }
    }
    return rows;
}

// Numbers stand right, words left; a terminal's lines are cut to its width.
void print(const std::vector<Row> &rows)
{
    std::array<std::size_t, 5> widths{};
    for (const Row &row : rows) {
        for (std::size_t column = 0; column < row.size(); ++column) {
            widths[column] = std::max(widths[column], columns(row[column]));
        }
    }
    for (const Row &row : rows) {
        std::string line;
        for (std::size_t column = 0; column < row.size(); ++column) {
            const bool is_number = column == 2 || column == 3;
            const std::string blanks(widths[column] - columns(row[column]), ' ');
            line += (column > 0 ? "  " : "") +
                    (is_number ? blanks + row[column] : row[column] + blanks);
        }
        line.erase(line.find_last_not_of(' ') + 1);
        if (isatty(STDOUT_FILENO) != 0) {
            line = cut(line, terminal_width(stdout));
        }
        std::printf("%s\n", line.c_str());
    }
}

std::string read_shown(const std::string &file)
{
    const std::string path = file.empty() ? kStoredPlan : file;
    if (auto text = read_file(path)) {
        return *text;
    }
    if (file.empty() && errno == ENOENT) {
        throw Failure(Exit::environment, std::string("no plan is stored in ") + kStoredPlan +
                                             ": run one with fptest run --plan FILE, or name a "
                                             "file to show");
    }
    throw Failure(file.empty() ? Exit::environment : Exit::usage,
                  one_line(path) + ": " + why_unread());
}

} // namespace

Exit show(const std::string &file)
{
    const std::string name = file.empty() ? kStoredPlan : file == "-" ? "<stdin>" : one_line(file);
    const auto plan = Plan::read(read_shown(file));
    if (!plan) {
        throw Failure(Exit::usage,
                      name + " is no whole test plan: fptest check says what is wrong");
    }
    const auto rows = table(*plan);
    if (rows.size() == 1) {
        throw Failure(Exit::usage, name + " has no items: fptest check says more");
    }
    print(rows);
    return Exit::success;
}

} // namespace fptest
