// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Whether an item that has ended passed, and if not, why.
#pragma once

#include "run/job.h"
#include "run/results.h"

#include <chrono>
#include <optional>
#include <string>

namespace fptest
{

// A gatherer's command returns as soon as the gatherer is triggered; its report may take
// this much longer.
inline constexpr std::chrono::duration<double> kForGathering{10};

struct Verdict {
    Outcome outcome = Outcome::failed;
    std::string reason = {};
    bool overruled = false; // it failed whatever it reported
};

struct JudgeContext {
    int pass_code = 0;
    int vendor = 0;
    std::optional<std::chrono::duration<double>> timeout;
    bool fail_on_exit_status = false;
    bool judge_limits = false; // of measurements
    int signal = 0;            // that interrupted the run
    std::string library_gone;  // why, if the library's process ended
    bool over_limit = false;   // the whole run was, and stopped therefore
};

Verdict judge(const RunningItem &active, const ItemRun &item, const JudgeContext &context);

} // namespace fptest
