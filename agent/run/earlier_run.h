// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A run that has left its results as JSON lines, also one that was cut off.
#pragma once

#include "plan/plan.h"
#include "run/results.h"
#include "util/failure.h"

#include <cstddef>
#include <map>
#include <set>
#include <string>
#include <utility>
#include <vector>

namespace fptest
{

struct EarlierRun {
    using Name = std::pair<std::string, std::string>; // a group's and an item's, as sanitized

    std::string file;
    std::string version;     // of the fptest that ran
    bool is_cut = false;     // its last line, of which nothing is used
    Run run;                 // as it was begun, and how it ended; without items
    std::vector<Name> items; // of each round

    // By their indices over all rounds; those before the last one as its earlier ones.
    std::map<std::size_t, ItemRun> attempts;
    std::set<std::size_t> ended; // and with an outcome of their own
    std::set<Name> failed;       // in any round, or begun and not ended

    // What has no outcome of its own: stopped, not run, or, with a start, running to the last
    // line. The attempts are among its earlier ones.
    std::map<std::size_t, ItemRun> unended;

    std::multimap<std::size_t, TimedReport> late; // reports after the end
};

// The file ends before it says what was to be run.
class NothingKnown : public Failure
{
  public:
    using Failure::Failure;
};

// Throws a Failure if the file is none of these, or has a line that fptest did not write.
// The name is what is said of it.
EarlierRun read_earlier_run(const std::string &file, const std::string &name);

// Throws a Failure that names those of these items that the plan has not.
void require_items(const EarlierRun &earlier, const std::set<EarlierRun::Name> &items,
                   const Plan &plan, const std::string &plan_name);

} // namespace fptest
