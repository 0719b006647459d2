// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Runs the rounds of a run, and tells of them.
#pragma once

#include "module/library_process.h"
#include "run/planner.h"
#include "run/runner.h"
#include "util/failure.h"

#include <functional>
#include <vector>

namespace fptest
{

// False where it was interrupted. Throws a Failure where the run, or one of its reports,
// could not be carried through. The plan is stored once each report has been begun; where
// that throws a Failure, they are ended.
bool run_rounds(const std::vector<Reporter *> &reporters, const Runner::Limits &limits,
                LibraryProcess &library, Signals &signals, Run &run, const Work &work,
                const std::function<void()> &store);

} // namespace fptest
