// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What a command line chooses of a plan.
#pragma once

#include "plan/plan.h"
#include "run/earlier_run.h"
#include "run/planner.h"

#include <optional>
#include <set>
#include <string>
#include <vector>

namespace fptest
{

struct Choice {
    std::vector<std::string> paths; // also patterns; none for every group
    std::vector<std::string> skips; // patterns
    bool as_group = false;
    bool force = false; // the items need not be there
    std::optional<std::set<EarlierRun::Name>> only = std::nullopt;
};

// A path whose words may be patterns of the shell. Its root may be any word.
class PathPattern
{
  public:
    // Throws a Failure if it is no path.
    PathPattern(const std::string &text, const Plan &plan) : path_(split_path(text, plan))
    {
    }

    bool matches_group(const std::string &group) const;
    // Also every item of a group that it matches.
    bool matches(const std::string &group, const std::string &item) const;
    bool matches_some_of(const Plan &plan) const;

  private:
    Path path_;
};

// Of an item in a group. Throws a Failure if it has none of its own.
Path item_path(const Plan &plan, const Path &group, const std::string &item);

// In the order of the paths, and for each in the plan's. Throws a Failure if one is no path or
// leads to nothing.
std::vector<Path> choose(const Choice &choice, const Plan &plan, const std::string &plan_name);

inline constexpr int kSeedLimit = 999999;

// The suites in another order, and the jobs of each: the same for a seed on every device.
RoundPlan shuffled(const RoundPlan &round, int seed);

} // namespace fptest
