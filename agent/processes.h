// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The processes below another one.
#pragma once

#include <string>
#include <sys/types.h>
#include <vector>

namespace fptest
{

// Whether one is running that a stop finds by one of the items' names: ps is
// asked for the first characters of it.
bool runs_below(pid_t ancestor, const std::vector<std::string> &items);

// One that was started as this program, by its whole path; 0 where none runs.
pid_t process_of(const std::string &program);

// Sends SIGTERM to all of them but the gatherer. False where there are none.
bool end_below(pid_t ancestor);

} // namespace fptest
