// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What people see of a run.
#pragma once

#include "run/results.h"

#include <cstdio>
#include <memory>

namespace fptest
{

// On a terminal: finished items above, those that run with a progress bar and a
// running total below, redrawn in the terminal's width.
std::unique_ptr<Reporter> live_view(std::FILE *terminal, bool colour);

// Anywhere else: a line for each item that has ended, one from time to time for
// one that takes long. Quiet leaves those that passed and the total out.
std::unique_ptr<Reporter> plain_view(std::FILE *stream, bool quiet);

// The view that suits the stream: live on a terminal that can move its cursor,
// in colour unless NO_COLOR is set.
std::unique_ptr<Reporter> suitable_view(std::FILE *stream, bool quiet);

} // namespace fptest
