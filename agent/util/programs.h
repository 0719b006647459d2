// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Programs that are asked something, and may not answer.
#pragma once

#include <chrono>
#include <string>
#include <unistd.h>
#include <vector>

namespace fptest
{

struct Said {
    bool is_whole = false; // it has closed its outputs and ended, in time
    int status = -1;       // as waitpid() gives it
    std::string output;
    std::string errors;
};

// Runs a program, the first of the words its path, in a process group of its own and without
// input. What has not ended by then is killed with its group, and nothing of it stays.
Said ask_program(const std::vector<std::string> &words, std::chrono::steady_clock::time_point end,
                 char *const *environment = environ);

} // namespace fptest
