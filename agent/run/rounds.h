// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Runs all rounds of a run.
#pragma once

#include "module/library_process.h"
#include "run/earlier_run.h"
#include "run/planner.h"
#include "run/runner.h"
#include "util/failure.h"

#include <functional>
#include <vector>

namespace fptest
{

// Calls store() once every result file has begun. False if the run was interrupted. Throws a
// Failure if it broke off, the plan was not stored, or a result file is incomplete. What an
// earlier run came to is taken over; each job is of one item then.
bool run_rounds(const std::vector<Reporter *> &reporters, const Runner::Options &options,
                LibraryProcess &library, Signals &signals, Run &run, const RoundPlan &plan,
                const std::function<void()> &store, const EarlierRun *earlier = nullptr);

} // namespace fptest
