// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The processes below another one.
#pragma once

#include <optional>
#include <string>
#include <sys/types.h>
#include <utility>
#include <vector>

namespace fptest
{

// Whether one is running that a stop finds by one of the items' names: ps is
// asked for the first characters of it.
bool runs_below(pid_t ancestor, const std::vector<std::string> &items);

// One that was started as one of these programs, by its whole path. All processes
// are read once, however many programs there are.
std::optional<std::pair<std::string, pid_t>>
process_of_any(const std::vector<std::string> &programs);

// Sends SIGTERM to all of them but the gatherer. False where there are none.
bool end_below(pid_t ancestor);

} // namespace fptest
