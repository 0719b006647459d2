// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/log_option.h"
#include "cli/options.h"
#include "module/log_file.h"
#include "module/stored_plan.h"
#include "plan/plan.h"
#include "quillmark.h"
#include "util/files.h"
#include "util/spelling.h"
#include "util/text.h"
#include "util/write.h"

#include <algorithm>
#include <csignal>
#include <cstring>
#include <fmt/core.h>
#include <memory>
#include <string>

namespace fptest
{
namespace
{

constexpr char kReportExamples[] =
    "Lets a shell script be an item. RESULT is 0, 1 or -2: the library has a text for\n"
    "no other code.\n"
    "\n"
    "Examples:\n"
    "  fptest report Bringup SpiCheck --progress 50 --result -2\n"
    "  fptest report Bringup SpiCheck --progress 100 --result 0 \\\n"
    "      --description 'chip answers at 8 MHz'";

struct ReportOptions {
    std::string group;
    std::string item;
    int progress = 0;
    int result = 0;
    std::string description;
    std::string log;
};

// The most that a report adds to the file: attributes, and each byte as an entity.
constexpr std::size_t kLongestEntity = 6;
constexpr std::size_t kAttributes = 64;

Plan load_stored(std::string &text)
{
    std::string why;
    auto plan = made_of_stored_plan(
        text, [&why](const std::string &read) { return Plan::load_as_library(read, &why); });
    if (!plan) {
        throw Failure(Cause::device, "{} does not load ({}): store the plan again", kStoredPlan,
                      one_line(why));
    }
    return std::move(*plan);
}

[[noreturn]] void unknown(const std::string &where, const std::string &what,
                          const std::string &name, const std::vector<std::string> &names)
{
    throw Failure(Cause::input, "{} has no {} {}{}", where, what, in_quotes(name),
                  names.empty() ? "; it has none at all" : known_names(name, names, "it has"));
}

// The item's number in the plan. Only its own group is searched: the library would go
// on into later groups, and annotate another item.
std::size_t find_item(const Plan &plan, const ReportOptions &options)
{
    const auto groups = plan.groups();
    const auto group = std::ranges::find(groups, options.group, &Plan::Group::name);
    if (group == groups.end()) {
        unknown("the stored plan", "group", options.group, group_names(plan));
    }
    const auto item = std::ranges::find(group->items, options.item, &Plan::Element::name);
    if (item == group->items.end()) {
        unknown(fmt::format("group {} of the stored plan", in_quotes(options.group)), "item",
                options.item, item_names(plan, options.group));
    }
    return item->number;
}

// An item cannot help its run's log, and the report is worth more.
void choose_log_of_report(const std::string &option)
{
    try {
        choose_log(option, !option.empty());
    } catch (const Failure &failure) {
        if (!option.empty()) {
            throw;
        }
        say("{}; this report has no log", failure.what());
        choose_log("/dev/null");
    }
}

Exit report(const ReportOptions &options)
{
    require_log_of_its_own(options.log, StdoutUse::nothing);
    choose_log_of_report(options.log);
    mend_stored_plan(); // an earlier report may have spoiled it
    const Descriptor lock = lock_stored_plan();
    std::string text =
        require_stored_plan(", so nothing can be reported: store one with fptest run --plan FILE");
    const Plan plan = load_stored(text);
    const std::size_t number = find_item(plan, options);
    // such a plan would not load again
    const std::string description = sanitize_xml(options.description);
    if (description != options.description) {
        say("bytes of the description that no plan can hold are replaced");
    }
    const auto entities = std::ranges::count_if(
        description, [](char c) { return std::strchr("&<>\"", c) != nullptr; });
    require_room(text.size() + kAttributes + description.size() +
                 static_cast<std::size_t>(entities) * kLongestEntity);
    // a stop in the middle of it would cut the plan
    sigset_t stops;
    sigset_t before;
    sigemptyset(&stops);
    for (const int signal : {SIGHUP, SIGINT, SIGTERM}) {
        sigaddset(&stops, signal);
    }
    sigprocmask(SIG_BLOCK, &stops, &before);
    FPTEST_SetTransation(options.group.c_str(), options.item.c_str(), options.progress,
                         options.result, description.c_str());
    sigprocmask(SIG_SETMASK, &before, nullptr);

    const auto written = Plan::load_as_library(read_stored_plan().value_or(""));
    ItemReport wanted;
    wanted.progress = std::to_string(options.progress);
    wanted.result = std::to_string(options.result);
    wanted.description = as_loaded(description);
    if (!written || !(written->report(number) == wanted)) {
        throw Failure(Cause::device, "the report is not in {}: is it writable? --log FILE says why",
                      kStoredPlan);
    }
    return Exit::success;
}

} // namespace

void add_report(CLI::App &app, Action &chosen)
{
    const auto options = std::make_shared<ReportOptions>();
    CLI::App &command =
        add_subcommand(app, "report", "Write an item's progress and result into the stored plan",
                       kReportExamples, chosen, [options] { return report(*options); });
    command.add_option("GROUP", options->group, "the item's group")->type_name("")->required();
    command.add_option("ITEM", options->item, "the item's name")->type_name("")->required();
    command.add_option("--progress", options->progress, "a number, 100 for the end")
        ->type_name("N")
        ->required()
        ->transform(range(-99999999, 999999999));
    command.add_option("--result", options->result, "0, 1 or -2")
        ->type_name("R")
        ->required()
        ->check(result_code());
    command.add_option("--description", options->description, "free text")->type_name("TEXT");
    add_log(command, options->log);
}

} // namespace fptest
