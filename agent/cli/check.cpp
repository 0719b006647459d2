// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/finding_printer.h"
#include "cli/desk_paths.h"
#include "cli/options.h"
#include "plan/plan.h"
#include "util/files.h"
#include "util/text.h"
#include "util/write.h"

#include <algorithm>
#include <cstdio>
#include <fmt/core.h>
#include <memory>
#include <string>
#include <vector>

namespace fptest
{
namespace
{

constexpr char kCheckExamples[] = "Examples:\n"
                                  "  fptest check plans/*.xml";

struct CheckOptions {
    std::vector<std::string> files;
    Storing storing = Storing::by_command;
};

// Groups and items are counted only if the plan loads.
std::string size_of(const CheckedPlan &checked)
{
    std::string size = checked.storing == Storing::as_file
                           ? plural(checked.text.size(), "byte")
                           : fmt::format("{} of {} bytes", checked.text.size(), kPlanLimit);
    if (const auto &plan = checked.whole().plan) {
        std::size_t items = 0;
        const auto groups = plan->groups();
        for (const Plan::Group &group : groups) {
            items += group.items.size();
        }
        size =
            fmt::format("{}, {}, {}", plural(groups.size(), "group"), plural(items, "item"), size);
    }
    return size;
}

// False if the plan has errors.
bool check_file(const std::string &file, const std::string &text, Storing storing)
{
    const CheckedPlan plan = check(one_line(name_of_plan(file)), text, storing);
    print(stdout, plan);
    const auto errors =
        static_cast<std::size_t>(std::ranges::count_if(plan.findings, &Finding::is_error));
    const std::size_t warnings = plan.findings.size() - errors;
    print_to(stdout, "{}: {}, {} ({})\n", plan.name, plural(errors, "error"),
             plural(warnings, "warning"), size_of(plan));
    return errors == 0;
}

Exit check_files(const CheckOptions &options)
{
    require_standard_output("fptest check");
    if (std::ranges::count(options.files, "-") > 1) {
        throw Failure(Cause::input, "'-' is given twice: standard input can be read only once");
    }
    bool sound = true;
    bool readable = true;
    for (const std::string &file : options.files) {
        if (const auto text = read_file(file)) {
            sound = check_file(file, *text, options.storing) && sound;
        } else {
            say("{}: {}", one_line(file), why_unread());
            readable = false;
        }
    }
    if (!readable) {
        return Exit::usage;
    }
    return sound ? Exit::success : Exit::items_failed;
}

} // namespace

void add_check(CLI::App &app, Action &chosen)
{
    const auto options = std::make_shared<CheckOptions>();
    CLI::App &command =
        add_subcommand(app, "check", "Say what the library would make of a plan", kCheckExamples,
                       chosen, [options] { return check_files(*options); });
    command.add_option("FILE", options->files, "test plans ('-': standard input)")
        ->type_name("")
        ->transform(desk_file())
        ->check(not_empty())
        ->required();
    const auto set_storing = [options](const std::string &how) {
        options->storing = how == "file" ? Storing::as_file : Storing::by_command;
    };
    command
        .add_option_function<std::string>("--for", set_storing,
                                          "how it is to be stored: by a command, which\n"
                                          "cuts it, or as a file")
        ->type_name("command|file")
        ->check(one_of({"command", "file"}, "is neither command nor file"));
}

} // namespace fptest
