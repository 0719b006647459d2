// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/results.h"

#include <algorithm>
#include <array>
#include <csignal>
#include <fmt/core.h>
#include <iterator>
#include <utility>

namespace fptest
{

ItemRun &item_at(Run &run, Place place)
{
    return run.suites[place.suite].items[place.item];
}

const ItemRun &item_at(const Run &run, Place place)
{
    return run.suites[place.suite].items[place.item];
}

bool is_success(Outcome outcome)
{
    return outcome == Outcome::passed || outcome == Outcome::flaky || outcome == Outcome::expected;
}

void begin_attempt(ItemRun &item)
{
    ItemRun next;
    next.group = item.group;
    next.name = item.name;
    next.expected = item.expected;
    next.earlier = std::exchange(item.earlier, {});
    next.earlier.push_back(std::move(item));
    item = std::move(next);
}

Counts count(const std::vector<ItemRun> &items)
{
    Counts counts;
    for (const ItemRun &item : items) {
        ++(item.outcome == Outcome::not_run    ? counts.not_run
           : item.outcome == Outcome::passed   ? counts.passed
           : item.outcome == Outcome::flaky    ? counts.flaky
           : item.outcome == Outcome::expected ? counts.expected
                                               : counts.failed);
        counts.retries += item.earlier.size();
    }
    return counts;
}

Counts count(const Run &run)
{
    Counts sum = run.before;
    std::size_t items = 0;
    for (const Suite &suite : run.suites) {
        sum += count(suite.items);
        items += suite.items.size();
    }
    sum.not_run += rounds_to_come(run) * items;
    return sum;
}

bool has_ended(const Run &run)
{
    return run.finished || !run.why_unfinished.empty();
}

const std::string &why_not_all(const Run &run)
{
    return run.finished ? run.why_ended : run.why_unfinished;
}

bool has_rounds(const Run &run)
{
    return run.rounds != 1;
}

bool has_fixed_rounds(const Run &run)
{
    return run.rounds && !run.time_limit && !run.until_fail &&
           (!run.stop_after || !has_rounds(run));
}

std::size_t rounds_to_come(const Run &run)
{
    const bool is_known = run.rounds && !run.time_limit && !run.finished;
    return is_known ? static_cast<std::size_t>(*run.rounds - run.round) : 0;
}

void summarize(Run &run)
{
    const bool is_first = run.summary.empty();
    std::size_t at = 0;
    for (const Suite &suite : run.suites) {
        for (const ItemRun &item : suite.items) {
            if (is_first) {
                run.summary.push_back({item.group, item.name, 0, {}});
            }
            Summary &summary = run.summary[at++];
            const bool has_passed = item.outcome == Outcome::passed ||
                                    item.outcome == Outcome::flaky ||
                                    item.outcome == Outcome::unexpected;
            summary.passed += has_passed ? 1 : 0;
            for (const ItemRun &attempt : item.earlier) {
                summary.times.add(attempt.seconds.value_or(0));
            }
            if (item.seconds) {
                summary.times.add(*item.seconds);
            }
        }
    }
}

const char *word(Outcome outcome)
{
    static constexpr std::array kWords{"not run", "passed", "failed",   "no result", "timed out",
                                       "stopped", "flaky",  "expected", "unexpected"};
    return kWords.at(static_cast<std::size_t>(outcome));
}

std::string name_of_signal(int signal)
{
    // the C library's own table has no name that all of them have
    static constexpr std::pair<int, const char *> kNames[] = {
        {SIGHUP, "SIGHUP"},   {SIGINT, "SIGINT"},   {SIGQUIT, "SIGQUIT"}, {SIGILL, "SIGILL"},
        {SIGTRAP, "SIGTRAP"}, {SIGABRT, "SIGABRT"}, {SIGBUS, "SIGBUS"},   {SIGFPE, "SIGFPE"},
        {SIGKILL, "SIGKILL"}, {SIGUSR1, "SIGUSR1"}, {SIGSEGV, "SIGSEGV"}, {SIGUSR2, "SIGUSR2"},
        {SIGPIPE, "SIGPIPE"}, {SIGALRM, "SIGALRM"}, {SIGTERM, "SIGTERM"}, {SIGXCPU, "SIGXCPU"},
        {SIGXFSZ, "SIGXFSZ"}, {SIGSYS, "SIGSYS"},
    };
    const auto *const found =
        std::ranges::find(kNames, signal, &std::pair<int, const char *>::first);
    return found != std::end(kNames) ? found->second : fmt::format("signal {}", signal);
}

std::string of_round(const Run &run)
{
    return has_rounds(run) ? fmt::format(" (round {})", run.round) : "";
}

std::string title(const Run &run, const Suite &suite)
{
    return suite.group + of_round(run);
}

std::string title(const Run &run, const ItemRun &item)
{
    return item.group + "/" + item.name + of_round(run);
}

} // namespace fptest
