// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Where a run's results go.
#pragma once

#include "cli/run_options.h"
#include "run/results.h"

#include <memory>
#include <vector>

namespace fptest
{

// Refuses files that are named twice, and a second use of standard output. Turns every
// other name of standard output into "-".
void resolve_output_conflicts(RunOptions &options);

// Refuses the run unless every result file can be begun, before any is overwritten, and
// items can have directories.
void require_writable_results(const RunOptions &options);

// Those of the result files, and the view if no results go to standard output.
std::vector<std::unique_ptr<Reporter>> make_reporters(const RunOptions &options);

} // namespace fptest
