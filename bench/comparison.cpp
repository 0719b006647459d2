// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "comparison.h"

#include "figures.h"
#include "quiet_vorlane.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdarg>
#include <cstddef>
#include <cstdio>
#include <stdexcept>
#include <string_view>
#include <utility>
#include <vector>

namespace bench
{
namespace
{

struct Work {
    std::vector<std::string> log;
    std::string outcome;
};

Work *work;

// After the prefix: the function and the line differ between the two sides.
void hear(const char *format, va_list arguments)
{
    std::array<char, 8192> line{};
    std::vsnprintf(line.data(), line.size(), format, arguments);
    const std::string_view text(line.data());
    const std::size_t begin = text.find("=> ") + 3;
    work->log.emplace_back(text.substr(begin, text.find_last_not_of('\n') + 1 - begin));
}

void take_turn(const Comparison &comparison, const std::function<void()> &side)
{
    for (int call = 0; call < comparison.calls; ++call) {
        side();
    }
}

// Prepared anew for each side, or the baseline would find done what it leaves out.
Work work_of(const Comparison &comparison, const std::function<void()> &side)
{
    Work done;
    comparison.prepare();
    work = &done;
    quiet_on_log(hear);
    take_turn(comparison, side);
    quiet_on_log(nullptr);
    work = nullptr;
    done.outcome = comparison.outcome();
    comparison.clear();
    return done;
}

void expect_same_work(const Comparison &comparison)
{
    Work library = work_of(comparison, comparison.library);
    Work baseline = work_of(comparison, comparison.baseline);
    if (library.outcome != baseline.outcome) {
        throw std::runtime_error(comparison.name + ": the baseline leaves something else behind; "
                                                   "make it do what the library does");
    }
    if (library.log == baseline.log) {
        return;
    }
    library.log.emplace_back("(none)");
    baseline.log.emplace_back("(none)");
    const auto [here, there] = std::ranges::mismatch(library.log, baseline.log);
    throw std::runtime_error(comparison.name + ": log line " +
                             std::to_string(here - library.log.begin() + 1) + " is '" + *here +
                             "', its baseline's is '" + *there +
                             "'; make the baseline log what the library logs");
}

// Seconds: for the whole turn, and for one call.
struct Turn {
    double all;
    double one;
};

Turn timed_turn(const Comparison &comparison, const std::function<void()> &side)
{
    comparison.start();
    const double all = seconds_of([&] { take_turn(comparison, side); });
    comparison.clear();
    return {all,
            comparison.seconds_for_one ? comparison.seconds_for_one() : all / comparison.calls};
}

} // namespace

PairedRun::PairedRun(Comparison comparison, double pace) : comparison_(std::move(comparison))
{
    expect_same_work(comparison_);
    const double both = timed_turn(comparison_, comparison_.library).all +
                        timed_turn(comparison_, comparison_.baseline).all;
    const double turns = std::round(comparison_.seconds * pace / both);
    turns_ = static_cast<int>(std::clamp(turns, 1.0, 2001.0));
}

// Who has begun is second the next time: what one leaves in the caches, the
// other finds.
Round PairedRun::round()
{
    std::vector<double> library;
    std::vector<double> baseline;
    for (int turn = 0; turn < 2 * turns_; ++turn) {
        const bool is_baseline = (turn % 2 == 1) != baseline_first_;
        (is_baseline ? baseline : library)
            .push_back(
                timed_turn(comparison_, is_baseline ? comparison_.baseline : comparison_.library)
                    .one);
        if (turn % 2 == 1) {
            baseline_first_ = !baseline_first_;
        }
    }
    return {median(library), median(baseline)};
}

double measure(const Comparison &comparison, double seconds)
{
    std::vector<double> took;
    comparison.prepare();
    for (double all = 0; took.empty() || all < seconds;) {
        const Turn turn = timed_turn(comparison, comparison.library);
        took.push_back(turn.one);
        all += turn.all;
    }
    return median(took);
}

} // namespace bench
