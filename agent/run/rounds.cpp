// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/rounds.h"

#include "module/stored_plan.h"
#include "run/report_reader.h"
#include "util/text.h"
#include "util/write.h"

#include <algorithm>
#include <chrono>
#include <fmt/core.h>
#include <optional>
#include <poll.h>
#include <unistd.h>
#include <utility>

namespace fptest
{
namespace
{

using Clock = std::chrono::steady_clock;

bool is_between_attempts(const ItemRun &item)
{
    return item.outcome == Outcome::not_run && !item.earlier.empty();
}

// What an earlier run came to, which the results of this one have as well.
class TakenOver
{
  public:
    TakenOver(Run &run, const std::vector<Reporter *> &reporters, const RoundPlan &plan,
              const EarlierRun *earlier)
        : run_(run), reporters_(reporters), plan_(plan), earlier_(earlier),
          reports_(plan.jobs.size())
    {
        take_over_round();
        while (has_more() && std::ranges::find(is_over_, false) == is_over_.end()) {
            begin_next();
        }
    }

    // Whether this job of the round has ended by that.
    bool is_over(std::size_t at) const
    {
        return is_over_[at];
    }

    // What it reported when it last ended by that, in any round.
    const std::optional<ItemReport> &report(std::size_t at) const
    {
        return reports_[at];
    }

    // Of rounds to come.
    bool has_more() const
    {
        return earlier_ != nullptr && !earlier_->attempts.empty() &&
               earlier_->attempts.rbegin()->first >=
                   static_cast<std::size_t>(run_.round) * plan_.jobs.size();
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
        run_.suites = plan_.suites;
        ++run_.round;
        take_over_round();
    }

  private:
    void take_over_round()
    {
        is_over_.assign(plan_.jobs.size(), false);
        const std::size_t first = (static_cast<std::size_t>(run_.round) - 1) * plan_.jobs.size();
        for (std::size_t at = 0; earlier_ != nullptr && at < plan_.jobs.size(); ++at) {
            if (earlier_->attempts.contains(first + at)) {
                take_over(plan_.jobs[at], first + at);
                is_over_[at] = earlier_->ended.contains(first + at);
            }
            if (is_over_[at]) {
                reports_[at] = earlier_->attempts.at(first + at).report;
            }
        }
    }

    void take_over(const Job &job, std::size_t index)
    {
        const Place place{job.suite, job.targets.front()->item};
        ItemRun last = earlier_->attempts.at(index);
        std::vector<ItemRun> attempts = std::exchange(last.earlier, {});
        const bool is_over = earlier_->ended.contains(index);
        if (!is_over) {
            attempts.push_back(last);
        }
        for (const ItemRun &attempt : attempts) {
            tell_again(place, attempt, &Reporter::retried);
            begin_attempt(item_at(run_, place));
        }
        if (is_over) {
            tell_again(place, last, &Reporter::ended);
        }
        const auto [begin, end] = earlier_->late.equal_range(index);
        for (auto late = begin; late != end; ++late) {
            for (Reporter *reporter : reporters_) {
                reporter->late(run_, place, late->second);
            }
        }
    }

    void tell_again(Place place, ItemRun attempt, void (Reporter::*how)(const Run &, Place))
    {
        ItemRun &item = item_at(run_, place);
        attempt.group = item.group; // as the plan has them
        attempt.name = item.name;
        attempt.earlier = std::move(item.earlier);
        item = std::move(attempt);
        for (Reporter *reporter : reporters_) {
            reporter->started(run_, place);
            (reporter->*how)(run_, place);
        }
    }

    Run &run_;
    const std::vector<Reporter *> &reporters_;
    const RoundPlan &plan_;
    const EarlierRun *earlier_;
    std::vector<bool> is_over_;                      // each job of the round
    std::vector<std::optional<ItemReport>> reports_; // of each job
};

class Rounds
{
  public:
    Rounds(Runner &runner, Run &run, const RoundPlan &plan, TakenOver &taken_over)
        : runner_(runner), run_(run), plan_(plan), taken_over_(taken_over)
    {
    }

    // Whether everything ran, and nothing of it still does.
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
            taken_over_.begin_next();
        }
        if (!runner_.broken()) {
            runner_.end_round();
        }
        return false;
    }

  private:
    // False if the run was cut short.
    bool run_one()
    {
        for (std::size_t at = 0; at < plan_.jobs.size(); ++at) {
            Job job = plan_.jobs[at];
            bool is_over = taken_over_.is_over(at);
            while (!is_over) {
                runner_.make_way_for(job);
                job.mark = clear_reports(job.elements());
                if (!runner_.run(job)) {
                    return false;
                }
                is_over = !is_tried_again(job);
            }
            if ((run_.until_fail && has_failed(job)) || has_failed_enough()) {
                break;
            }
        }
        return true;
    }

    bool is_last() const
    {
        return !run_.why_ended.empty() || run_.round == run_.rounds ||
               (run_.time_limit && run_.seconds >= *run_.time_limit && !taken_over_.has_more());
    }

    bool has_failed(const Job &job)
    {
        const auto failed = std::ranges::find_if(job.targets, [&](const auto &target) {
            return target && !is_success(item_at(run_, {job.suite, target->item}).outcome);
        });
        if (failed == job.targets.end()) {
            return false;
        }
        const ItemRun &item = item_at(run_, {job.suite, (*failed)->item});
        run_.why_ended = one_line(title(run_, item)) + " did not pass (--until-fail)";
        return true;
    }

    bool is_tried_again(const Job &job) const
    {
        return std::ranges::any_of(job.targets, [&](const auto &target) {
            return target && is_between_attempts(item_at(run_, {job.suite, target->item}));
        });
    }

    bool has_failed_enough()
    {
        const std::size_t failed = run_.stop_after ? count(run_).failed : 0;
        if (!run_.stop_after || failed < static_cast<std::size_t>(*run_.stop_after)) {
            return false;
        }
        run_.why_ended = fmt::format("{} did not pass (--stop-after {})", plural(failed, "item"),
                                     *run_.stop_after);
        return true;
    }

    Runner &runner_;
    Run &run_;
    const RoundPlan &plan_;
    TakenOver &taken_over_;
};

std::string failures(const std::vector<Reporter *> &reporters)
{
    std::vector<std::string> all;
    for (const Reporter *reporter : reporters) {
        if (std::string failure = reporter->failure(); !failure.empty() && reporter->is_needed) {
            all.push_back(std::move(failure));
        }
    }
    return join_and(all);
}

// Standard error may have lost its reader.
void say_at_end(const std::string &text)
{
    pollfd errors{STDERR_FILENO, POLLOUT, 0};
    if (!text.empty() && poll(&errors, 1, 0) > 0) {
        say("{}", text);
    }
}

// Waits for the readers of results, but not for long after an interrupt, which several
// processes may hand on once more. False if another one comes first, or the time is up.
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
        } else if (taken == SIGINT || (taken != 0 && !is_interrupted)) {
            return false;
        }
    }
    return true;
}

// One that has failed, and is not tried again as the run has ended, counts as stopped.
void stop_between_attempts(Run &run, const std::vector<Reporter *> &reporters)
{
    for (std::size_t suite = 0; suite < run.suites.size(); ++suite) {
        for (std::size_t at = 0; at < run.suites[suite].items.size(); ++at) {
            const Place place{suite, at};
            ItemRun &item = item_at(run, place);
            if (!is_between_attempts(item)) {
                continue;
            }
            item.start = std::chrono::system_clock::now();
            for (Reporter *reporter : reporters) {
                reporter->started(run, place);
            }
            item.seconds = 0;
            item.outcome = Outcome::stopped;
            item.reason =
                fmt::format("{}, before attempt {}", run.why_unfinished, item.earlier.size() + 1);
            for (Reporter *reporter : reporters) {
                reporter->ended(run, place);
            }
            item.seconds.reset(); // no attempt that a summary would count
        }
    }
}

void finish(Run &run, const std::vector<Reporter *> &reporters)
{
    stop_between_attempts(run, reporters);
    summarize(run);
    for (Reporter *reporter : reporters) {
        reporter->finish(run);
    }
}

// A terminal that closes causes a write error as well; its signal is what counts.
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

// The view first, as it overwrites nothing. If one fails, those that have begun are to say so.
std::string begin(const Run &run, const std::vector<Reporter *> &reporters, const Signals &signals,
                  std::vector<Reporter *> &begun)
{
    for (Reporter *reporter : std::vector(reporters.rbegin(), reporters.rend())) {
        reporter->begin(run);
        begun.push_back(reporter);
        std::string failure = reporter->failure();
        if (!failure.empty() && reporter->is_needed && !is_interrupted(signals)) {
            return failure;
        }
    }
    return {};
}

// Those whose reports in the stored plan are not this run's, also if it will not reach them.
std::vector<std::size_t> elements_of_others(const RoundPlan &plan, const TakenOver &taken_over)
{
    const auto stored = parse_stored_plan().annotated();
    std::vector<std::size_t> all;
    for (std::size_t at = 0; at < plan.jobs.size(); ++at) {
        for (const std::size_t element : plan.jobs[at].elements()) {
            if (!stored || !taken_over.report(at) ||
                !is_same(report_of(*stored, element), *taken_over.report(at))) {
                all.push_back(element);
            }
        }
    }
    return all;
}

} // namespace

bool run_rounds(const std::vector<Reporter *> &reporters, const Runner::Options &options,
                LibraryProcess &library, Signals &signals, Run &run, const RoundPlan &plan,
                const std::function<void()> &store, const EarlierRun *earlier)
{
    run.suites = plan.suites;
    run.start = std::chrono::system_clock::now();
    std::vector<Reporter *> begun;
    const std::string not_begun = begin(run, reporters, signals, begun);
    // before all that takes time, and may be interrupted
    TakenOver taken_over(run, not_begun.empty() ? reporters : std::as_const(begun), plan, earlier);
    if (!not_begun.empty()) {
        run_nothing(fmt::format("{}; nothing was run", not_begun), run, begun, signals);
    }
    Runner runner(library, signals, run, reporters, options);
    runner.begin(read_stored_plan().value_or(""));
    const bool goes_on = !options.ends_gatherer || runner.goes_on();
    try {
        if (goes_on) {
            store();
        }
    } catch (const Failure &failure) {
        run_nothing(failure.what(), run, reporters, signals);
    }
    try {
        if (goes_on) {
            clear_reports(elements_of_others(plan, taken_over));
            run.finished = Rounds(runner, run, plan, taken_over).run_all();
        }
        if (!runner.broken()) {
            remove_marks();
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
