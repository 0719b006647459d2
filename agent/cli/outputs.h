// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Where a run's results go, as the command line says.
#pragma once

#include "cli/commands.h"
#include "run/results.h"

#include <memory>
#include <vector>

namespace fptest
{

// That each file is wanted once, and standard output by one report at most.
void require_different_outputs(const RunOptions &options);

// The reports, and the view where none of them is standard output.
std::vector<std::unique_ptr<Listener>> make_listeners(const RunOptions &options);

} // namespace fptest
