// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the paths of a command line run.
#pragma once

#include "plan/plan.h"
#include "run/job.h"
#include "run/results.h"

#include <string>
#include <utility>
#include <vector>

namespace fptest
{

struct Path {
    std::string text; // as the command carries it
    std::string root;
    std::string group;
    std::string item; // empty for a whole group
};

// What each round runs, one job after another.
struct RoundPlan {
    std::vector<Suite> suites;
    std::vector<Job> jobs;
};

// Throws a Failure if it is no path. Nothing of it need be in the plan.
Path split_path(const std::string &text, const Plan &plan);

// Throws a Failure if it is no path, or names nothing in the plan; with force the item need
// not be there. The plan's name is for messages.
Path parse_path(const std::string &text, const Plan &plan, const std::string &plan_name,
                bool force);

// "; the groups are a, b and c"
std::string known_groups(const Plan &plan);

// One for each group that runs something.
std::vector<Path> all_paths(const Plan &plan);

// The names of what the library runs for a group, each once.
std::vector<std::string> runnable_items(const Plan &plan, const std::string &group);
// Whether the path with an item's name runs that item, the first of this name.
bool has_path_of_its_own(const Plan &plan, const std::string &group, const std::string &item);

// One command for each item; for each path if as_group, or if an item has no path of its
// own. Throws a Failure if a path leads to nothing that can be run.
RoundPlan plan_round(const std::vector<Path> &paths, const Plan &plan, bool as_group);

// The path of each item with the command line that runs it.
std::vector<std::pair<std::string, std::string>>
commands_of(const RoundPlan &round, const Plan &plan, const std::string &suffix);

} // namespace fptest
