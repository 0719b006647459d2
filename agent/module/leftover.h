// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <string>
#include <sys/types.h>

namespace fptest
{

// A process that an item has left running at its end.
struct Leftover {
    std::string name; // of its program, without the path
    pid_t process = 0;
    pid_t group = 0;             // of processes
    unsigned long long born = 0; // on the kernel's clock: its number may be another's later
};

} // namespace fptest
