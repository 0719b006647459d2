// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/choice.h"

#include "util/failure.h"
#include "util/text.h"

#include <algorithm>
#include <fnmatch.h>
#include <random>
#include <utility>

namespace fptest
{
namespace
{

bool fits(const std::string &pattern, const std::string &name)
{
    return pattern == name || fnmatch(pattern.c_str(), name.c_str(), 0) == 0;
}

bool is_pattern(const std::string &text)
{
    return text.find_first_of("*?[") != std::string::npos;
}

class Chooser
{
  public:
    Chooser(const Choice &choice, const Plan &plan, const std::string &plan_name)
        : choice_(choice), plan_(plan), plan_name_(plan_name)
    {
        for (const std::string &text : choice.skips) {
            skips_.emplace_back(text, plan);
            if (!skips_.back().matches_some_of(plan)) {
                throw no_match("--skip " + in_quotes(text));
            }
        }
    }

    std::vector<Path> chosen()
    {
        for (const std::string &text : choice_.paths) {
            add(text);
        }
        if (choice_.paths.empty()) {
            for (const Path &path : all_paths(plan_)) {
                add_rest(path);
            }
        }
        if (chosen_.empty() && (!skips_.empty() || choice_.only)) {
            throw Failure(Cause::input, "nothing is left to run: {} all of it",
                          !choice_.only    ? "--skip leaves out"
                          : skips_.empty() ? "--failed-of leaves out"
                                           : "--skip and --failed-of leave out");
        }
        return chosen_;
    }

  private:
    Failure no_match(const std::string &what) const
    {
        return {Cause::input, "{} matches nothing in {}{}", what, one_line(plan_name_),
                known_groups(plan_)};
    }

    void add(const std::string &text)
    {
        const Path path = split_path(text, plan_);
        const bool is_name =
            std::ranges::count(group_names(plan_), path.group) > 0 &&
            (path.item.empty() || std::ranges::count(item_names(plan_, path.group), path.item) > 0);
        if (is_name || !is_pattern(path.group + path.item)) {
            add_rest(parse_path(text, plan_, plan_name_, choice_.force));
            return;
        }
        bool is_found = false;
        for (Path group : all_paths(plan_)) {
            group.root = is_pattern(path.root) ? group.root : path.root;
            group.text = group.root + "/" + group.group;
            if (!fits(path.group, group.group)) {
                continue;
            }
            if (path.item.empty()) {
                is_found = true;
                add_rest(group);
                continue;
            }
            for (const std::string &item : runnable_items(plan_, group.group)) {
                if (fits(path.item, item)) {
                    is_found = true;
                    add_rest(item_path(plan_, group, item));
                }
            }
        }
        if (!is_found) {
            throw no_match(in_quotes(text));
        }
    }

    bool is_left_out(const std::string &group, const std::string &item) const
    {
        const auto is_skipped = [&](const PathPattern &skip) { return skip.matches(group, item); };
        return std::ranges::any_of(skips_, is_skipped) ||
               (choice_.only &&
                !choice_.only->contains({sanitize_utf8(group), sanitize_utf8(item)}));
    }

    // What is not left out of it.
    void add_rest(const Path &path)
    {
        const auto is_skipped = [&](const std::string &item) {
            return is_left_out(path.group, item);
        };
        if (!path.item.empty()) {
            if (!is_skipped(path.item)) {
                chosen_.push_back(path);
            }
            return;
        }
        const std::vector<std::string> items = runnable_items(plan_, path.group);
        const auto skipped = std::ranges::count_if(items, is_skipped);
        if (skipped == 0) {
            chosen_.push_back(path);
        } else if (skipped < static_cast<std::ptrdiff_t>(items.size())) {
            if (choice_.as_group) {
                throw Failure(Cause::input,
                              "--as-group runs all of group {}, and a part of it is to be left "
                              "out: leave --as-group out",
                              in_quotes(path.group));
            }
            for (const std::string &item : items) {
                if (!is_skipped(item)) {
                    chosen_.push_back(item_path(plan_, path, item));
                }
            }
        }
    }

    const Choice &choice_;
    const Plan &plan_;
    const std::string &plan_name_;
    std::vector<PathPattern> skips_;
    std::vector<Path> chosen_;
};

} // namespace

Path item_path(const Plan &plan, const Path &group, const std::string &item)
{
    if (!has_path_of_its_own(plan, group.group, item)) {
        throw Failure(Cause::input,
                      "item {} of group {} cannot be run by its name: run the whole group, or see "
                      "fptest check",
                      in_quotes(item), in_quotes(group.group));
    }
    return {group.root + "/" + group.group + "/" + item, group.root, group.group, item};
}

bool PathPattern::matches_group(const std::string &group) const
{
    return path_.item.empty() && fits(path_.group, group);
}

bool PathPattern::matches(const std::string &group, const std::string &item) const
{
    return fits(path_.group, group) && (path_.item.empty() || fits(path_.item, item));
}

bool PathPattern::matches_some_of(const Plan &plan) const
{
    return std::ranges::any_of(group_names(plan), [&](const std::string &group) {
        return matches_group(group) ||
               std::ranges::any_of(item_names(plan, group),
                                   [&](const std::string &item) { return matches(group, item); });
    });
}

std::vector<Path> choose(const Choice &choice, const Plan &plan, const std::string &plan_name)
{
    return Chooser(choice, plan, plan_name).chosen();
}

RoundPlan shuffled(const RoundPlan &round, int seed)
{
    // std::shuffle differs from one C++ library to another
    std::mt19937 random(static_cast<std::mt19937::result_type>(seed));
    const auto shuffle = [&random](auto &list) {
        for (std::size_t rest = list.size(); rest > 1; --rest) {
            std::swap(list[rest - 1], list[random() % rest]);
        }
    };
    std::vector<std::vector<Job>> jobs(round.suites.size());
    for (const Job &job : round.jobs) {
        jobs[job.suite].push_back(job);
    }
    std::ranges::for_each(jobs, shuffle);
    shuffle(jobs);
    RoundPlan all;
    for (std::vector<Job> &of_suite : jobs) {
        const Suite &from = round.suites[of_suite.front().suite];
        Suite &to = all.suites.emplace_back(Suite{from.group, {}});
        for (Job &job : of_suite) {
            job.suite = all.suites.size() - 1;
            for (auto &target : job.targets) {
                if (target) {
                    to.items.push_back(from.items[target->item]);
                    target->item = to.items.size() - 1;
                }
            }
            all.jobs.push_back(std::move(job));
        }
    }
    return all;
}

} // namespace fptest
