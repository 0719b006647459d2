// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The subcommands, one per file: each function adds one, with its options, help and
// examples.
#pragma once

#include "util/failure.h"

#include <CLI/CLI.hpp>

#include <functional>

namespace fptest
{

enum class Exit {
    success = 0,
    items_failed = 1,  // or a checked plan has errors
    usage = 2,         // or an error in the plan
    environment = 3,   // the device is not ready
    busy = 4,          // another fptest uses the device
    interrupted = 130, // by a signal
};

// Returns the exit status, or throws a Failure.
using Action = std::function<Exit()>;

// If the command line names the subcommand, it becomes the chosen action.
void add_run(CLI::App &app, Action &chosen);
void add_check(CLI::App &app, Action &chosen);
void add_show(CLI::App &app, Action &chosen);
void add_html(CLI::App &app, Action &chosen);
void add_report(CLI::App &app, Action &chosen);
void add_measure(CLI::App &app, Action &chosen);
// A line of output that is malformed, lest a script that goes on pass without a word.
void print_refused_measurement(const std::string &why);
void add_send(CLI::App &app, Action &chosen);
void add_doctor(CLI::App &app, Action &chosen);
void add_status(CLI::App &app, Action &chosen);
void add_stop(CLI::App &app, Action &chosen);

} // namespace fptest
