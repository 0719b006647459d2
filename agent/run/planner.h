// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the paths of a command line are to run of a plan.
#pragma once

#include "plan/plan.h"
#include "run/job.h"
#include "run/results.h"

#include <string>
#include <vector>

namespace fptest
{

struct Path {
    std::string text; // as the command carries it
    std::string root;
    std::string group;
    std::string item; // empty where it names a group
};

// A round: what is run in it, one job after another.
struct Work {
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
Work work_of(const std::vector<Path> &paths, const Plan &plan, bool as_group);

// Prints the items with the commands that would be run for them. Throws as work_of().
void list_items(const std::vector<Path> &paths, const Plan &plan, const std::string &suffix);

} // namespace fptest
