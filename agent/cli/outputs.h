// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Where a run's results go, as the command line says.
#pragma once

#include "cli/run_options.h"
#include "run/results.h"

#include <memory>
#include <string>
#include <vector>

namespace fptest
{

// That each file is wanted once, and standard output by one report at most. A report
// that names it in another way is called "-" afterwards.
void settle_outputs(RunOptions &options);

// That the reports can be begun, all of them: none is written over where one cannot.
void require_writable_reports(const RunOptions &options);

// That the library's log, which --log names or else VR_LOG_FILE, goes neither into the
// stored plan nor into what this program itself writes to standard output: a view may
// have it in its terminal or pipe, but a file both would write over, and who reads
// results expects no log among them.
enum class Beside { nothing, view, results };
void require_log_of_its_own(const std::string &log, Beside beside);

// The reports, and the view where none of them is standard output.
std::vector<std::unique_ptr<Reporter>> make_reporters(const RunOptions &options);

} // namespace fptest
