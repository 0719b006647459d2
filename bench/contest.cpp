// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "contest.h"
#include "figures.h"

#include "quiet_vorlane.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <stdexcept>
#include <string_view>

namespace bench
{
namespace
{

using Lines = std::vector<std::string>;

Lines *heard;

// After the prefix: the function and the line differ between the two sides.
void hear(const char *format, va_list arguments)
{
    std::array<char, 8192> line{};
    std::vsnprintf(line.data(), line.size(), format, arguments);
    const std::string_view text(line.data());
    const std::size_t begin = text.find("=> ") + 3;
    heard->emplace_back(text.substr(begin, text.find_last_not_of('\n') + 1 - begin));
}

template <typename Job> Lines log_of(Job job)
{
    Lines lines;
    heard = &lines;
    quiet_on_log(hear);
    job();
    quiet_on_log(nullptr);
    return lines;
}

void expect_same_log(const std::string &name, const Lines &module, const Lines &floor)
{
    if (module == floor) {
        return;
    }
    const auto [here, there] =
        std::mismatch(module.begin(), module.end(), floor.begin(), floor.end());
    throw std::runtime_error(name + ": log line " + std::to_string(here - module.begin() + 1) +
                             " is '" + (here != module.end() ? *here : "(none)") +
                             "', its floor's is '" + (there != floor.end() ? *there : "(none)") +
                             "'; make the floor log what the library logs");
}

void expect_same_work(Contest &contest)
{
    std::string module;
    std::string floor;
    contest.prepare();
    const Lines module_log = log_of([&contest] { contest.module(contest.calls()); });
    module = contest.outcome();
    contest.clear();
    contest.prepare(); // or the floor would find done what it leaves out
    const Lines floor_log = log_of([&contest] { contest.floor(contest.calls()); });
    floor = contest.outcome();
    contest.clear();
    expect_same_log(contest.name(), module_log, floor_log);
    if (module != floor) {
        throw std::runtime_error(contest.name() + ": the floor leaves something else behind; make "
                                                  "it do what the library does");
    }
}

} // namespace

namespace
{

// Seconds: for the whole turn, and for one call.
struct Turn {
    double all;
    double one;
};

Turn turn(Contest &contest, Side side)
{
    contest.start();
    const auto start = std::chrono::steady_clock::now();
    if (side == Side::module) {
        contest.module(contest.calls());
    } else {
        contest.floor(contest.calls());
    }
    const std::chrono::duration<double> took = std::chrono::steady_clock::now() - start;
    contest.clear();
    return {took.count(), contest.for_one(took.count())};
}

Side other(Side side)
{
    return side == Side::module ? Side::floor : Side::module;
}

} // namespace

Match::Match(Contest &contest, double pace) : contest_(contest)
{
    expect_same_work(contest_);
    const double both = turn(contest_, Side::module).all + turn(contest_, Side::floor).all;
    const double turns = std::round(contest_.round() * pace / both);
    turns_ = static_cast<int>(std::clamp(turns, 1.0, 2001.0));
}

// Who has begun is second the next time: what one leaves in the caches, the
// other finds.
Round Match::round()
{
    std::vector<double> module;
    std::vector<double> floor;
    for (int at = 0; at < turns_; ++at) {
        for (const Side side : {first_, other(first_)}) {
            (side == Side::module ? module : floor).push_back(turn(contest_, side).one);
        }
        first_ = other(first_);
    }
    return {median(module), median(floor)};
}

double alone(Contest &contest, double seconds)
{
    std::vector<double> took;
    double all = 0;
    while (took.empty() || all < seconds) {
        const Turn last = turn(contest, Side::module);
        took.push_back(last.one);
        all += last.all;
    }
    return median(took);
}

} // namespace bench
