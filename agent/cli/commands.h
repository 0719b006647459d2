// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What fptest does, one function a sub-command. Each returns how the program is
// to end, or throws a Failure.
#pragma once

#include "check/check.h"
#include "util/failure.h"

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
    bool exit_status = false;      // one that is not 0 fails its item
    std::optional<int> repeat;
    std::optional<double> time_limit; // seconds after which no round begins
    bool until_fail = false;
    int pass_code = 0;
    std::string junit; // files, "-" for standard output; empty for none
    std::string json;
    std::string log;
};

struct CheckOptions {
    std::vector<std::string> files;
    PlanUse use = PlanUse::to_send;
};

struct ReportOptions {
    std::string group;
    std::string item;
    int progress = 0;
    int result = 0;
    std::string description;
    std::string log;
};

struct SendOptions {
    std::vector<std::string> commands;
    bool from_input = false; // separated by zero bytes, and the replies as well
    std::string log;
};

Exit run(RunOptions options);
Exit check_files(const CheckOptions &options);
Exit show(const std::string &file); // empty: the stored plan
Exit report(const ReportOptions &options);
Exit send(const SendOptions &options);

} // namespace fptest
