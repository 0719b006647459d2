// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the subcommands' options share.
#pragma once

#include "cli/subcommands.h"

#include <string>
#include <vector>

namespace fptest
{

// Adds a subcommand. If the command line names it, its action is chosen.
CLI::App &add_subcommand(CLI::App &app, const char *name, const char *purpose, const char *examples,
                         Action &chosen, Action action);

// --- what a value may be ------------------------------------------------------

// A number in that range. CLI11's own validator takes an empty text for 0.
CLI::Validator range(double least, double most);
CLI::Validator range(int least, int most);

// A time in seconds, minutes, hours or days, converted to seconds.
CLI::Validator time_span();

// One of those words; of another the error says "'x' " and otherwise.
CLI::Validator one_of(std::vector<std::string> words, std::string otherwise);

// The codes that the library has a text for, in its spelling.
CLI::Validator result_code();

CLI::Validator not_empty();

// Of an option that is also a flag, without a value "true".
CLI::Validator order_seed();

// A plan, also one relative to the directory that device/run was called in.
CLI::Validator desk_file();

} // namespace fptest
