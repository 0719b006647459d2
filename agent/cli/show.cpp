// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/desk_paths.h"
#include "cli/options.h"
#include "module/stored_plan.h"
#include "plan/plan.h"
#include "util/files.h"
#include "util/terminal.h"
#include "util/text.h"
#include "util/write.h"

#include <cstdio>
#include <memory>
#include <optional>
#include <string>
#include <unistd.h>
#include <vector>

namespace fptest
{
namespace
{

constexpr char kShowExamples[] = "Examples:\n"
                                 "  fptest show\n"
                                 "  fptest show results/annotated.xml";

using Row = std::vector<std::string>;

std::string shown(const std::optional<std::string> &text)
{
    return one_line(text.value_or("-"));
}

std::vector<Row> table(const Plan &plan)
{
    std::vector<Row> rows = {{"GROUP", "ITEM", "PROGRESS", "RESULT", "DESCRIPTION"}};
    for (const Plan::Group &group : plan.groups()) {
        for (const Plan::Element &item : group.items) {
            const ItemReport &report = item.report;
            rows.push_back(
                {one_line(group.name), shown(item.name), shown(report.progress),
                 report.result_without_value || report.result == "" ? "?" : shown(report.result),
                 shown(report.description)});
        }
    }
    return rows;
}

// A terminal's lines are cut to its width.
void print(const std::vector<Row> &rows)
{
    for (const std::string &line : aligned(rows, {false, false, true, true, false})) {
        const bool is_cut = isatty(STDOUT_FILENO) != 0;
        print_to(stdout, "{}\n", is_cut ? ellipsize(line, terminal_width(stdout)) : line);
    }
}

std::shared_ptr<const Plan> read_shown(const std::string &file)
{
    if (file.empty()) {
        require_stored_plan(": run one with fptest run --plan FILE, or name a file to show");
        return whole_stored_plan().annotated;
    }
    return ParsedPlan(require_file(file)).annotated();
}

Exit show(const std::string &file)
{
    require_standard_output("fptest show");
    const std::string name = one_line(name_of_plan(file));
    const auto plan = read_shown(file);
    if (!plan) {
        throw Failure(Cause::input, "{} is not a whole test plan: fptest check says what is wrong",
                      name);
    }
    const auto rows = table(*plan);
    if (rows.size() == 1) {
        throw Failure(Cause::input, "{} has no items: fptest check says more", name);
    }
    print(rows);
    return Exit::success;
}

} // namespace

void add_show(CLI::App &app, Action &chosen)
{
    const auto file = std::make_shared<std::string>();
    CLI::App &command = add_subcommand(app, "show", "Print an annotated plan as a table",
                                       kShowExamples, chosen, [file] { return show(*file); });
    command
        .add_option("FILE", *file,
                    "the plan ('-': standard input); without, the\n"
                    "stored one")
        ->type_name("")
        ->transform(desk_file())
        ->check(not_empty());
}

} // namespace fptest
