// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/rounds.h"

#include "module/preflight.h"
#include "module/stored_plan.h"
#include "plan/plan.h"
#include "plan/plan_text.h"
#include "util/text.h"
#include "util/write.h"

#include <algorithm>
#include <chrono>
#include <fmt/core.h>
#include <poll.h>
#include <unistd.h>
#include <utility>

namespace fptest
{
namespace
{

using Clock = std::chrono::steady_clock;

// --- the stored plan ----------------------------------------------------------

std::string new_mark()
{
    static unsigned count = 0;
    const auto now = std::chrono::system_clock::now().time_since_epoch().count();
    return fmt::format("{:x}-{:x}", now, ++count);
}

// Shows only this run's results: removes old ones, and marks the items, to recognise
// a stale report that is written back.
void clear_reports(Job &job)
{
    std::vector<std::size_t> numbers;
    for (const auto &target : job.targets) {
        if (target) {
            numbers.push_back(target->element);
        }
    }
    const std::string mark = new_mark();
    const Descriptor lock = lock_stored_plan();
    std::string text;
    const auto cleared = made_of_stored_plan(
        text, [&](const std::string &plan) { return without_reports(plan, numbers, mark); });
    if (!cleared && Plan::load_as_library(text)) {
        return; // a forced one that is not well-formed: nobody has reported in it
    }
    if (!cleared) {
        throw Failure(Cause::device, "{} is gone, or not whole any more: store it again",
                      kStoredPlan);
    }
    try {
        require_room(cleared->size());
        replace_stored_plan(*cleared);
    } catch (const Failure &) {
        if (without_marks(*cleared) == without_marks(text)) {
            return; // nothing has to go, and the disk has no room for the mark
        }
        throw;
    }
    job.mark = mark;
}

void clear_marks()
{
    const Descriptor lock = lock_stored_plan();
    std::string text;
    const auto cleared = made_of_stored_plan(text, without_marks);
    try {
        if (cleared && *cleared != text) {
            replace_stored_plan(*cleared);
        }
    } catch (const Failure &) {
        return; // the disk is full: they stay, and the next run replaces them
    }
}

// --- rounds -------------------------------------------------------------------

class Rounds
{
  public:
    Rounds(Runner &runner, Run &run, const std::vector<Reporter *> &reporters, const Work &work)
        : runner_(runner), run_(run), reporters_(reporters), work_(work)
    {
    }

    // Whether all has been done that was asked for, and nothing of it runs any more.
    bool run_all()
    {
        while (run_one()) {
            runner_.end_round();
            if (!runner_.goes_on()) {
                return false;
            }
            if (is_last()) {
                return true;
            }
            begin_next();
        }
        if (!runner_.broken()) {
            runner_.end_round();
        }
        return false;
    }

  private:
    // Whether it has come to its end.
    bool run_one()
    {
        for (Job job : work_.jobs) {
            runner_.make_way_for(job);
            clear_reports(job);
            if (!runner_.run(job)) {
                return false;
            }
            if (run_.until_fail && has_failed(job)) {
                break;
            }
        }
        return true;
    }

    bool is_last() const
    {
        return !run_.why_ended.empty() || run_.round == run_.rounds ||
               (run_.time_limit && run_.seconds >= *run_.time_limit);
    }

    bool has_failed(const Job &job)
    {
        const auto failed = std::ranges::find_if(job.targets, [&](const auto &target) {
            return target && item_at(run_, {job.suite, target->item}).outcome != Outcome::passed;
        });
        if (failed == job.targets.end()) {
            return false;
        }
        const ItemRun &item = item_at(run_, {job.suite, (*failed)->item});
        run_.why_ended = title(run_, item) + " did not pass (--until-fail)";
        return true;
    }

    void begin_next()
    {
        summarize(run_);
        for (Reporter *reporter : reporters_) {
            reporter->round_over(run_);
        }
        for (const Suite &suite : run_.suites) {
            run_.before += count(suite.items);
        }
        run_.suites = work_.suites;
        ++run_.round;
    }

    Runner &runner_;
    Run &run_;
    const std::vector<Reporter *> &reporters_;
    const Work &work_;
};

// --- reporters ----------------------------------------------------------------

std::string failures(const std::vector<Reporter *> &reporters)
{
    std::vector<std::string> all;
    for (const Reporter *reporter : reporters) {
        if (std::string failure = reporter->failure(); !failure.empty()) {
            all.push_back(std::move(failure));
        }
    }
    return join_and(all);
}

// Nothing where standard error has no reader any more.
void say_at_end(const std::string &text)
{
    pollfd errors{STDERR_FILENO, POLLOUT, 0};
    if (!text.empty() && poll(&errors, 1, 0) > 0) {
        say("{}", text);
    }
}

// Now that nothing runs any more, readers are waited for: not for long where the run
// was interrupted. False where a signal has come first, or the time is over.
bool flush(const std::vector<Reporter *> &reporters, Signals &signals, bool is_interrupted)
{
    const auto begin = Clock::now();
    const auto is_done = [](Reporter *reporter) { return reporter->flush(); };
    while (!std::ranges::all_of(reporters, is_done)) {
        if (is_interrupted && Clock::now() - begin > std::chrono::seconds(2)) {
            return false;
        }
        pollfd signal{signals.descriptor(), POLLIN, 0};
        poll(&signal, 1, 10);
        const int taken = signals.take();
        if (taken == SIGTSTP) {
            Signals::suspend();
        } else if (taken != 0) {
            return false;
        }
    }
    return true;
}

void finish(Run &run, const std::vector<Reporter *> &reporters)
{
    summarize(run);
    for (Reporter *reporter : reporters) {
        reporter->finish(run);
    }
}

// A terminal that closes is met as an error as well: its signal is what counts.
bool is_interrupted(const Signals &signals)
{
    pollfd signal{signals.descriptor(), POLLIN, 0};
    return poll(&signal, 1, 100) > 0;
}

[[noreturn]] void run_nothing(const std::string &why, Run &run,
                              const std::vector<Reporter *> &begun, Signals &signals)
{
    run.why_unfinished = why;
    finish(run, begun);
    flush(begun, signals, true);
    throw Failure(Cause::device, "{}", why);
}

// The view first: it writes nothing over. Where one of them fails, those that have begun
// say so.
void begin(Run &run, const std::vector<Reporter *> &reporters, Signals &signals)
{
    std::vector<Reporter *> begun;
    for (Reporter *reporter : std::vector(reporters.rbegin(), reporters.rend())) {
        reporter->begin(run);
        begun.push_back(reporter);
        const std::string failure = reporter->failure();
        if (!failure.empty() && !is_interrupted(signals)) {
            run_nothing(fmt::format("{}; nothing was run", failure), run, begun, signals);
        }
    }
}

} // namespace

bool run_rounds(const std::vector<Reporter *> &reporters, const Runner::Limits &limits,
                LibraryProcess &library, Signals &signals, Run &run, const Work &work,
                const std::function<void()> &store)
{
    run.suites = work.suites;
    run.start = std::chrono::system_clock::now();
    begin(run, reporters, signals);
    const std::string earlier_plan = read_stored_plan().value_or("");
    try {
        store();
    } catch (const Failure &failure) {
        run_nothing(failure.what(), run, reporters, signals);
    }
    Runner runner(library, signals, run, reporters, limits);
    runner.note_earlier_plan(earlier_plan);
    try {
        run.finished = Rounds(runner, run, reporters, work).run_all();
        if (!runner.broken()) {
            clear_marks();
        }
    } catch (const Failure &failure) {
        runner.break_off(failure.what());
    }
    finish(run, reporters);
    if (!flush(reporters, signals, runner.signal() != 0)) {
        say_at_end("a result file is incomplete: its reader stopped reading");
        return false;
    }
    const std::string failure = failures(reporters);
    if (runner.signal() != 0 && !run.finished) {
        say_at_end(failure);
        return false;
    }
    if (!failure.empty() && runner.broken()) {
        say_at_end(failure);
    } else if (!failure.empty()) {
        throw Failure(Cause::device, "{}; the run went on all the same", failure);
    }
    if (runner.broken()) {
        throw Failure(Cause::device, "{}", run.why_unfinished);
    }
    return true;
}

} // namespace fptest
