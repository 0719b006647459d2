// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "results.h"

namespace fptest
{

Counts count(const std::vector<ItemRun> &items)
{
    Counts counts;
    for (const ItemRun &item : items) {
        switch (item.outcome) {
        case Outcome::not_run:
            ++counts.to_go;
            break;
        case Outcome::passed:
            ++counts.passed;
            break;
        case Outcome::failed:
        case Outcome::silent:
        case Outcome::timed_out:
        case Outcome::stopped:
            ++counts.failed;
            break;
        }
    }
    return counts;
}

Counts count(const Run &run)
{
    Counts sum;
    for (const Suite &suite : run.suites) {
        const Counts counts = count(suite.items);
        sum.passed += counts.passed;
        sum.failed += counts.failed;
        sum.to_go += counts.to_go;
    }
    return sum;
}

const char *word(Outcome outcome)
{
    switch (outcome) {
    case Outcome::not_run:
        return "not run";
    case Outcome::passed:
        return "passed";
    case Outcome::failed:
        return "failed";
    case Outcome::silent:
        return "no result";
    case Outcome::timed_out:
        return "timed out";
    case Outcome::stopped:
        return "stopped";
    }
    return "";
}

std::string title(const Run &run, const Suite &suite)
{
    return run.rounds > 1 ? suite.group + " (round " + std::to_string(suite.round) + ")"
                          : suite.group;
}

} // namespace fptest
