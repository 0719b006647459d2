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

// The run that --failed-of or --resume names; a resumed one goes on as it was begun, which the
// options are made to say. Says if its file is cut.
std::optional<EarlierRun> read_earlier_run(RunOptions &options);

bool leaves_nothing(const RunOptions &options, const EarlierRun &earlier);

// Throws a Failure if the run was one of a plan with another digest than that of the one so named.
void require_same_plan(const EarlierRun &earlier, const std::string &digest,
                       const std::string &plan);

// The run that this one goes on with, or null. Throws a Failure if it is of another device.
const EarlierRun *take_up(Run &run, const RunOptions &options,
                          const std::optional<EarlierRun> &given);

// Says the seed that it chooses.
std::optional<int> seed_of(const RunOptions &options);

RoundPlan chosen_round(const RunOptions &options, const CheckedPlan &checked,
                       const std::optional<EarlierRun> &earlier, std::optional<int> seed);

} // namespace fptest
