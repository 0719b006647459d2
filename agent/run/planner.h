// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the paths of a command line are to run of a plan.
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
    std::string item; // empty where it names a group
};

// What each round runs, one job after another.
struct RoundPlan {
    std::vector<Suite> suites;
    std::vector<Job> jobs;
};

// Throws a Failure where it is no path, or names nothing that there is. With force an
// item need not be there. The plan's name is for people.
Path parse_path(const std::string &text, const Plan &plan, const std::string &plan_name,
                bool force);

// "; the groups are a, b and c"
std::string known_groups(const Plan &plan);

// One for each group of the plan that has something to run.
std::vector<Path> all_paths(const Plan &plan);

// A command for each item; for each path where that is wanted, or an item has no path
// of its own. Throws a Failure where a path leads to nothing that can be run.
RoundPlan plan_round(const std::vector<Path> &paths, const Plan &plan, bool as_group);

// The path of each item with the command line that runs it. Throws as plan_round().
std::vector<std::pair<std::string, std::string>>
commands_of(const std::vector<Path> &paths, const Plan &plan, const std::string &suffix);

} // namespace fptest
