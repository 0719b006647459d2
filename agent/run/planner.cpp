// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/planner.h"

#include "util/failure.h"
#include "util/spelling.h"
#include "util/text.h"

#include <algorithm>
#include <fmt/core.h>
#include <optional>
#include <utility>

namespace fptest
{
namespace
{

// "; did you mean 'x'? The groups are a, b and c", for a name that is not there.
std::string instead(const std::string &name, const std::vector<std::string> &names,
                    const std::string &what)
{
    if (names.empty()) {
        return fmt::format("; there are no {}", what);
    }
    return known_names(name, names, fmt::format("the {} are", what));
}

} // namespace

Path split_path(const std::string &text, const Plan &plan)
{
    std::vector<std::string> parts;
    for (std::size_t at = 0; at < text.size();) {
        const std::size_t end = std::min(text.find('/', at), text.size());
        if (end > at) {
            parts.push_back(text.substr(at, end - at));
        }
        at = end + 1;
    }
    if (parts.size() < 2) {
        throw Failure(Cause::input, "{} names no group: a path is root/group or root/group/item{}",
                      in_quotes(text), instead("", group_names(plan), "groups"));
    }
    if (parts.size() > 3) {
        throw Failure(Cause::input,
                      "{} has too many parts: a path is root/group or root/group/item",
                      in_quotes(text));
    }
    if (text.find_first_of(":\t\n") != std::string::npos) {
        throw Failure(Cause::input,
                      "{} has a ':', a tab or a line feed, at which the library would cut it: name "
                      "it without",
                      in_quotes(text));
    }
    if (text.size() > kPathLimit) {
        throw Failure(Cause::input, "a path of {} bytes is cut at {}: use a shorter root",
                      text.size(), kPathLimit);
    }
    if (parts.size() == 3) {
        return {text, parts[0], parts[1], parts[2]};
    }
    return {text, parts[0], parts[1], ""};
}

namespace
{

void require_known(const Path &path, const Plan &plan, const std::string &plan_name, bool force)
{
    const auto groups = group_names(plan);
    if (std::ranges::find(groups, path.group) == groups.end()) {
        throw Failure(Cause::input, "no group {} in {}{}", in_quotes(path.group),
                      one_line(plan_name), instead(path.group, groups, "groups"));
    }
    const auto items = item_names(plan, path.group);
    if (path.item.empty() || force || std::ranges::find(items, path.item) != items.end()) {
        return;
    }
    throw Failure(Cause::input, "no item {} in group {} of {}{}", in_quotes(path.item),
                  in_quotes(path.group), one_line(plan_name),
                  instead(path.item, items, "items of the group"));
}

bool runs_something(const std::optional<Plan::Element> &element)
{
    return element && element->name && !element->name->empty();
}

// Throws a Failure if the library runs nothing for it.
std::vector<std::optional<Plan::Element>> resolve(const Path &path, const Plan &plan)
{
    auto items = path.item.empty() ? plan.resolve(path.group)
                                   : std::vector{plan.resolve(path.group, path.item)};
    if (std::ranges::none_of(items, runs_something)) {
        throw Failure(Cause::input,
                      "{} leads to nothing that can be run: leave it out, or see fptest check",
                      in_quotes(path.text));
    }
    return items;
}

// Whether a path with an item's name runs that item, for every item of the group.
bool have_paths_of_their_own(const Plan &plan, const std::string &group,
                             const std::vector<std::optional<Plan::Element>> &items)
{
    return std::ranges::all_of(items, [&](const auto &item) {
        if (!item || !item->name || !is_addressable(*item->name)) {
            return false;
        }
        const auto found = plan.resolve(group, *item->name);
        return found && found->number == item->number;
    });
}

class RoundPlanner
{
  public:
    RoundPlanner(const Plan &plan, bool as_group) : plan_(plan), as_group_(as_group)
    {
    }

    void add(const Path &path)
    {
        const auto items = resolve(path, plan_);
        if (as_group_ || !path.item.empty() || !have_paths_of_their_own(plan_, path.group, items)) {
            add_job(path.text, path.group, items);
            return;
        }
        for (const auto &item : items) {
            add_job(path.root + "/" + path.group + "/" + item->name.value(), path.group, {item});
        }
    }

    RoundPlan take()
    {
        return std::move(round_);
    }

  private:
    void add_job(const std::string &path, const std::string &group,
                 const std::vector<std::optional<Plan::Element>> &items)
    {
        if (std::ranges::none_of(items, runs_something)) {
            return;
        }
        if (round_.suites.empty() || round_.suites.back().group != group) {
            round_.suites.push_back({group, {}});
        }
        Suite &suite = round_.suites.back();
        Job job;
        job.path = path;
        job.suite = round_.suites.size() - 1;
        for (const auto &item : items) {
            if (!runs_something(item)) {
                job.targets.emplace_back(std::nullopt);
                continue;
            }
            job.targets.emplace_back(Job::Target{suite.items.size(), item->number});
            ItemRun run;
            run.group = group;
            run.name = *item->name;
            suite.items.push_back(run);
        }
        round_.jobs.push_back(std::move(job));
    }

    const Plan &plan_;
    bool as_group_;
    RoundPlan round_;
};

} // namespace

Path parse_path(const std::string &text, const Plan &plan, const std::string &plan_name, bool force)
{
    Path path = split_path(text, plan);
    require_known(path, plan, plan_name, force);
    return path;
}

std::string known_groups(const Plan &plan)
{
    return instead("", group_names(plan), "groups");
}

std::vector<Path> all_paths(const Plan &plan)
{
    std::string root = "plan";
    if (mxml_node_t *const node = plan.root(); node != nullptr) {
        const std::string name = attribute(node, "name").value_or(mxmlGetElement(node));
        root = is_addressable(name) ? name : root;
    }
    std::vector<Path> paths;
    for (const std::string &group : group_names(plan)) {
        if (std::ranges::any_of(plan.resolve(group), runs_something)) {
            paths.push_back({root + "/" + group, root, group, ""});
        }
    }
    return paths;
}

std::vector<std::string> runnable_items(const Plan &plan, const std::string &group)
{
    std::vector<std::string> names;
    for (const auto &item : plan.resolve(group)) {
        if (runs_something(item) && std::ranges::count(names, *item->name) == 0) {
            names.push_back(*item->name);
        }
    }
    return names;
}

bool has_path_of_its_own(const Plan &plan, const std::string &group, const std::string &item)
{
    const auto items = plan.resolve(group);
    const auto first = std::ranges::find_if(
        items, [&](const auto &one) { return runs_something(one) && *one->name == item; });
    return first != items.end() && have_paths_of_their_own(plan, group, {*first});
}

RoundPlan plan_round(const std::vector<Path> &paths, const Plan &plan, bool as_group)
{
    RoundPlanner planner(plan, as_group);
    for (const Path &path : paths) {
        planner.add(path);
    }
    return planner.take();
}

std::vector<std::pair<std::string, std::string>>
commands_of(const RoundPlan &round, const Plan &plan, const std::string &suffix)
{
    std::vector<std::pair<std::string, std::string>> commands;
    for (const Job &job : round.jobs) {
        const std::size_t root = job.path.find_first_not_of('/');
        for (const auto &target : job.targets) {
            if (!target) {
                continue;
            }
            const ItemRun &item = round.suites[job.suite].items[target->item];
            const auto args = attribute(plan.elements()[target->element], "args");
            commands.emplace_back(
                fmt::format("{}/{}/{}", job.path.substr(root, job.path.find('/', root) - root),
                            item.group, item.name),
                command_line(item.name, args, suffix).substr(0, kCommandLimit));
        }
    }
    return commands;
}

} // namespace fptest
