// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What people see of a run.
#pragma once

#include "run/results.h"

#include <cstdio>
#include <memory>

namespace fptest
{

// For a terminal: finished items above; below, redrawn in the terminal's width, those
// that run, each with a progress bar, and a running total.
std::unique_ptr<Reporter> make_live_view(std::FILE *terminal, bool colour);

// For anything else: a line for each item that has ended, and now and then one for an
// item that takes long. Quiet leaves out items that passed and the total.
std::unique_ptr<Reporter> make_plain_view(std::FILE *stream, bool quiet);

// The view that suits the stream: live on a terminal that can move its cursor, in
// colour unless NO_COLOR is set.
std::unique_ptr<Reporter> make_suitable_view(std::FILE *stream, bool quiet);

} // namespace fptest
