// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The options of fptest run.
#pragma once

#include <optional>
#include <string>
#include <vector>

namespace fptest
{

struct RunOptions {
    std::string plan;               // a file, "-" for standard input; empty: the stored plan
    std::vector<std::string> paths; // also patterns; none for every group
    std::vector<std::string> skips;
    std::string failed_of; // JSON lines of a run before
    std::string resume;    // the same
    std::string shuffle;   // a seed, "true" for any; empty for the plan's order
    bool as_sent = false;  // store the plan by a command, which may cut it
    bool as_group = false;
    bool list = false;
    bool force = false;
    bool tap = false;
    bool quiet = false;
    std::optional<double> timeout; // seconds for each item
    double grace = 2;              // seconds before a stopped item is killed
    bool fail_on_exit_status = false;
    bool judge_limits = false; // of measurements
    std::optional<int> repeat;
    std::optional<double> time_limit; // seconds after which no new round begins
    bool until_fail = false;
    std::string expect;            // a file of known failures
    int retries = 0;               // of an item that does not pass
    std::optional<int> stop_after; // items that did not pass
    std::optional<double> limit;   // seconds for the whole run
    int pass_code = 0;
    std::string junit; // files, "-" for standard output; empty for none
    std::string json;
    std::string log;
    std::string files;               // a directory for those of items; empty for none
    std::vector<std::string> labels; // KEY=VALUE
    bool plain = false;              // lines, also on a terminal
    std::string hangup = "stop";     // or "go-on"
};

} // namespace fptest
