// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the command line says of a run.
#pragma once

#include <optional>
#include <string>
#include <vector>

namespace fptest
{

struct RunOptions {
    std::string plan; // a file, "-" for standard input; empty: the stored plan
    std::vector<std::string> paths;
    bool as_sent = false; // a plan of any length by a command, which may cut it
    bool as_group = false;
    bool list = false;
    bool force = false;
    bool tap = false;
    bool quiet = false;
    std::optional<double> timeout; // seconds for each item
    double grace = 2;              // seconds that a stopped item has to end
    bool fail_on_exit_status = false;
    std::optional<int> repeat;
    std::optional<double> time_limit; // seconds after which no round begins
    bool until_fail = false;
    int pass_code = 0;
    std::string junit; // files, "-" for standard output; empty for none
    std::string json;
    std::string log;
};

} // namespace fptest
