// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What fptest run is to run: paths and patterns, what an earlier run leaves to do, and how
// often, in which order and how far.
#pragma once

#include "check/check.h"
#include "cli/options.h"
#include "cli/run_options.h"
#include "run/earlier_run.h"
#include "run/planner.h"

#include <optional>

namespace fptest
{

void add_selection(CLI::App &command, RunOptions &options);

// The run that --failed-of or --resume names; a resumed one goes on as it was begun. Says if
// its file is cut.
std::optional<EarlierRun> read_earlier_run(RunOptions &options);

// Says so.
bool leaves_nothing(const RunOptions &options, const EarlierRun &earlier);

// Says the seed that it chooses.
std::optional<int> seed_of(const RunOptions &options);

RoundPlan chosen_round(const RunOptions &options, const CheckedPlan &checked,
                       const std::optional<EarlierRun> &earlier, std::optional<int> seed);

} // namespace fptest
