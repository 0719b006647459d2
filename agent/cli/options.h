// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the subcommands' options have in common.
#pragma once

#include "cli/subcommands.h"

#include <string>
#include <vector>

namespace fptest
{

// Adds a subcommand. Where the command line names it, the action is the chosen one.
CLI::App &add_subcommand(CLI::App &app, const char *name, const char *purpose, const char *examples,
                         Action &chosen, Action action);

void add_log(CLI::App &command, std::string &log);

// --- what a value may be ------------------------------------------------------

// A number in that range, of seconds or of rounds. CLI11's own takes an empty text for 0.
CLI::Validator range(double least, double most);
CLI::Validator range(int least, int most);

// Seconds, or so many minutes, hours or days; put down in seconds.
CLI::Validator time_span();

// One of those words; "'x' " and otherwise is what is said of another.
CLI::Validator one_of(std::vector<std::string> words, std::string otherwise);

// The codes that the library has a text for, spelled as it does.
CLI::Validator result_code();

CLI::Validator not_empty();

// A plan that device/run has taken the working directory away from.
CLI::Validator desk_file();

} // namespace fptest
