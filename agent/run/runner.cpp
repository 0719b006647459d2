// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/runner.h"

#include "module/processes.h"
#include "module/stored_plan.h"
#include "plan/plan.h"
#include "run/verdict.h"
#include "util/text.h"

#include <algorithm>
#include <array>
#include <csignal>
#include <fmt/core.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <utility>

namespace fptest
{
namespace
{

using namespace std::chrono_literals;
using Seconds = std::chrono::duration<double>;

void append_output(std::string &output, std::string_view text)
{
    output += text;
    constexpr std::size_t kKept = std::size_t{64} << 10U;
    if (output.size() > kKept) {
        output.erase(0, output.size() - kKept);
    }
}

constexpr off_t kMostWaiting = off_t{64} << 20U; // of output

// A gatherer that is just starting may not be visible yet.
constexpr auto kBeforeMissed = 500ms;
constexpr auto kBetweenPolls = 250ms;
constexpr auto kToPrint = 100ms;    // of a gatherer that has reported
constexpr auto kForReading = 100ms; // of output, while nothing else is looked at

// Long enough for a save that is under way as an item ends, and not for the next report of
// what it left running.
constexpr auto kForPlanBesideOthers = 50ms;

// The signal that killed the item, or 0. A shell that did not exec the item (because of
// quotes in its arguments, say) reports it by its own exit status.
int signal_of(int status)
{
    if (WIFSIGNALED(status)) {
        return WTERMSIG(status);
    }
    constexpr std::array kHarmless{SIGCHLD, SIGCONT, SIGSTOP, SIGTSTP,
                                   SIGTTIN, SIGTTOU, SIGURG,  SIGWINCH};
    const int signal = WEXITSTATUS(status) - 128;
    return signal > 0 && signal < NSIG && std::ranges::find(kHarmless, signal) == kHarmless.end()
               ? signal
               : 0;
}

// What it comes to besides its report: it was tried before, or known to fail.
void judge_by_the_run(ItemRun &item)
{
    const auto how = [](const ItemRun &one) {
        return fmt::format("{} {}{}", one.outcome == Outcome::no_result ? "had" : "was",
                           word(one.outcome), one.reason.empty() ? "" : ": " + one.reason);
    };
    const bool has_passed = item.outcome == Outcome::passed;
    if (!item.expected.empty() && has_passed) {
        item.outcome = Outcome::unexpected;
        item.reason = "passed, but was expected to fail: " + one_line(item.expected);
    } else if (!item.expected.empty() && item.outcome != Outcome::stopped) {
        item.reason = fmt::format("{}; it {}", one_line(item.expected), how(item));
        item.outcome = Outcome::expected;
    } else if (!item.earlier.empty() && has_passed) {
        item.outcome = Outcome::flaky;
        item.reason = fmt::format("passed on attempt {}; before, it {}", item.earlier.size() + 1,
                                  how(item.earlier.back()));
    }
}

} // namespace

Runner::Runner(LibraryProcess &library, Signals &signals, Run &run,
               const std::vector<Reporter *> &reporters, Options options)
    : library_(library), signals_(signals), run_(run), reporters_(reporters),
      options_(std::move(options)), reader_(run, reporters, running_), files_(options_.files)
{
    signals_.take_suspensions();
    library_.hold_at_ends();
}

Runner::TimePoint Runner::now() const
{
    return on_run_clock(SteadyClock::now());
}

Runner::TimePoint Runner::on_run_clock(TimePoint time) const
{
    // an event may arrive after a suspension that it preceded
    return time - (time < last_suspension_ ? suspended_ - last_suspended_ : suspended_);
}

void Runner::give_up(const std::string &why)
{
    if (run_.why_unfinished.empty()) {
        run_.why_unfinished = why;
    }
}

void Runner::break_off(const std::string &why)
{
    broken_ = true;
    give_up(why);
}

bool Runner::goes_on()
{
    read_signals();
    return run_.why_unfinished.empty();
}

bool Runner::run(const Job &job)
{
    if (!goes_on()) {
        return false;
    }
    library_gone_.clear();
    run_command(job);
    if (missed_gatherer_ && !broken_ && goes_on()) {
        gatherer_runs_ = note_gatherer();
        run_command(job);
    }
    missed_gatherer_ = false;
    settle_directories();
    if (!broken_) {
        require_all_started();
        require_plan();
    }
    notify_ended();
    return run_.why_unfinished.empty();
}

void Runner::run_command(const Job &job)
{
    std::vector<std::string> names;
    for (const auto &target : job.targets) {
        if (target) {
            names.push_back(run_.suites[job.suite].items[target->item].name);
        }
    }
    drain_events();
    if (library_.has_many_descriptors() && item_processes().empty() && left_.empty()) {
        library_.quit();
        stop_asked_ = false; // it answers no more
    }
    library_.restart(); // also if something ended it since the last job
    library_.give_directories(make_directories(job));
    // the library loads the plan until it reaches the first item, and a process that
    // reports meanwhile, such as a gatherer, truncates the plan before it writes it
    Descriptor plan = lock_stored_plan();
    library_.command("XMLNodePath::" + job.path, names);
    heard_of_at_ = now();

    running_ = {job, true, 0, {}};
    while ((running_.command_runs || !running_.items.empty()) && !broken_) {
        if (const auto event =
                library_.wait(kTurn, {signals_.descriptor(), reader_.descriptor()})) {
            plan = Descriptor(-1);
            heard_of_at_ = now();
            handle(*event);
        }
        watch();
    }
}

// One for each target.
std::vector<std::string> Runner::make_directories(const Job &job)
{
    std::vector<std::string> directories;
    if (options_.files.empty()) {
        return directories;
    }
    for (const auto &target : job.targets) {
        if (target) {
            ItemRun &item = item_at(run_, {job.suite, target->item});
            directories.push_back(files_.make(item, has_rounds(run_) ? run_.round : 0,
                                              is_gatherer(item.name, vendor_)));
        } else {
            directories.emplace_back();
        }
    }
    return directories;
}

// Of the items that were not reached, or not waited for.
void Runner::settle_directories()
{
    for (const auto &target : running_.job.targets) {
        if (target) {
            ItemRun &item = item_at(run_, {running_.job.suite, target->item});
            if (item.outcome == Outcome::not_run) {
                files_.settle(item, is_gatherer(item.name, vendor_));
            }
        }
    }
}

// A command that returns without reaching its items is no success, whatever the cause.
void Runner::require_all_started()
{
    for (; running_.next < running_.job.targets.size() && !is_stopping(); ++running_.next) {
        if (!running_.job.targets[running_.next]) {
            continue;
        }
        const Place place{running_.job.suite, running_.job.targets[running_.next]->item};
        ItemRun &result = item_at(run_, place);
        result.start = std::chrono::system_clock::now();
        for (Reporter *reporter : reporters_) {
            reporter->started(run_, place);
        }
        result.seconds = 0;
        result.outcome = Outcome::no_result;
        result.reason = library_gone_.empty()
                            ? "the library never reached it; run with --log FILE to see why"
                            : fmt::format("the library never reached it: {}", library_gone_);
        notify_end_of(place);
    }
}

// Without a stored plan no later item can report.
void Runner::require_plan()
{
    if (!whole_stored_plan().is_usable && !restore_plan()) {
        break_off(fmt::format("the stored plan {} {}: store it again", kStoredPlan, kPlanLost));
    }
}

// A stop may come in the middle of a report, which leaves no plan to report into.
bool Runner::restore_plan()
{
    return std::exchange(has_signalled_, false) && restore_stored_plan();
}

void Runner::handle(const LibraryProcess::Event &event)
{
    switch (event.kind) {
    case LibraryProcess::Event::Kind::item:
        move_on(event);
        start_next(event);
        break;
    case LibraryProcess::Event::Kind::ended:
        end_item(event);
        break;
    case LibraryProcess::Event::Kind::connected:
        reader_.begin_gathering();
        library_.go_on();
        break;
    case LibraryProcess::Event::Kind::returned:
        running_.command_runs = false;
        move_on(event);
        break;
    case LibraryProcess::Event::Kind::stopped:
        end_stop(event);
        break;
    case LibraryProcess::Event::Kind::gone:
        running_.command_runs = false;
        lose_library(event);
        break;
    }
}

// The library's process may end between two jobs: what it started is this process's
// child then.
void Runner::drain_events()
{
    while (const auto event = library_.wait(0ms)) {
        if (event->kind == LibraryProcess::Event::Kind::stopped) {
            end_stop(*event);
        } else if (event->kind == LibraryProcess::Event::Kind::gone) {
            stop_asked_ = false; // it answers no more
        }
    }
}

// Only the items that it was running are lost.
void Runner::lose_library(const LibraryProcess::Event &event)
{
    library_gone_ = gone_text(event);
    stop_asked_ = false;
    take_output(event.output);
    reader_.read(whole_stored_plan().annotated);
    for (RunningItem &active : running_.items) {
        finish(active, on_run_clock(event.time));
    }
    notify_ended();
    end_left_running();
    if (!broken_) {
        library_.restart();
    }
}

void Runner::watch()
{
    read_signals();
    reader_.poll();
    poll_gatherers();
    stop_what_is_due();
    notify_ended();
    tick();
}

void Runner::poll_gatherers()
{
    for (RunningItem &active : running_.items) {
        poll_gatherer(active);
        const ItemReport &report = item_at(run_, active.place).report;
        if (active.moved_on && !active.done &&
            (has_finished(report) || !active.gatherer_end.empty() ||
             (!options_.timeout && now() - active.moved_on_at > kForGathering))) {
            finish(active, has_finished(report)
                               ? std::max(active.moved_on_at, now() - reader_.since_change())
                               : now());
        }
    }
}

// Without a gatherer the library would wait at the trigger port for ever.
void Runner::poll_gatherer(RunningItem &active)
{
    if (active.done || !active.gatherer_end.empty() || !active.gathers ||
        now() - active.gatherer_looked_for < kBetweenPolls) {
        return;
    }
    active.gatherer_looked_for = now();
    active.gatherer_missed = note_gatherer() ? 0 : active.gatherer_missed + 1;
    if (active.gatherer_missed < 2 || now() - active.start < kBeforeMissed) {
        return;
    }
    active.gatherer_end = active.moved_on ? "the gatherer ended before it had reported"
                                          : "the gatherer ended before it connected";
    if (!active.moved_on) {
        if (const auto other = found_as_gatherer()) {
            active.gatherer_end += fmt::format(", or the library took {} (pid {}) for it",
                                               one_line(other->first), other->second);
        }
        release_command();
    }
}

// What is printed is the current item's, or else the next one's. All of it is read for
// measurements, unless it comes faster than that.
void Runner::take_output(off_t end, TimePoint until)
{
    if (running_.items.empty()) {
        return;
    }
    RunningItem &active = running_.items.back();
    ItemRun &result = item_at(run_, active.place);
    const auto use = [&](std::string_view text) {
        append_output(result.output, text);
        active.measuring.read(text, result.measured);
    };
    if (library_.output().skip(end, kMostWaiting)) {
        result.measured.is_read = false;
        active.measuring.skip();
    }
    library_.output().take(end, use, until);
    if (library_.output().was_truncated()) {
        result.measured.is_cut = true;
    }
}

void Runner::take_output(TimePoint until)
{
    if (const auto size = library_.output_size()) {
        take_output(*size, until);
    }
}

// Between two items.
void Runner::drop_output()
{
    const auto size = library_.output_size();
    if (running_.items.empty() && size) {
        library_.output().skip(*size);
        library_.output().was_truncated();
    }
}

void Runner::tick()
{
    run_.seconds = run_.seconds_before + Seconds(now() - began_).count();
    take_output(SteadyClock::now() + kForReading);
    for (const RunningItem &active : running_.items) {
        item_at(run_, active.place).running = std::max(0.0, Seconds(now() - active.start).count());
        item_at(run_, active.place).stopping = active.stop.has_value();
    }
    for (Reporter *reporter : reporters_) {
        reporter->tick(run_);
    }
}

void Runner::start_next(const LibraryProcess::Event &event)
{
    vendor_ = event.value;
    const std::size_t at = running_.next++;
    if (at >= running_.job.targets.size() || !running_.job.targets[at]) {
        return;
    }
    RunningItem active;
    active.place = {running_.job.suite, running_.job.targets[at]->item};
    active.element = running_.job.targets[at]->element;
    active.gathers = is_gatherer(item_at(run_, active.place).name, vendor_);
    if (active.gathers) {
        active.starts_gatherer = !std::exchange(gatherer_runs_, true);
        active.reporting.expected = active.starts_gatherer;
    }
    active.start = on_run_clock(event.time);
    if (is_stopping()) {
        active.stop = Outcome::stopped;
        active.stop_wanted_at = now();
    }
    running_.items.push_back(active);
    if (!missed_gatherer_) {
        item_at(run_, active.place).start =
            std::chrono::system_clock::now() -
            std::chrono::duration_cast<std::chrono::system_clock::duration>(SteadyClock::now() -
                                                                            event.time);
        for (Reporter *reporter : reporters_) {
            reporter->started(run_, active.place);
        }
    }
    if (vendor_ != run_.vendor) {
        append_output(item_at(run_, active.place).output,
                      fmt::format("fptest: the vendor is {} now\n", vendor_));
    }
}

// The library is held, so the plan has what the item reported, and nothing newer.
void Runner::end_item(const LibraryProcess::Event &event)
{
    const bool is_watched = !running_.items.empty() && !running_.items.back().moved_on;
    if (is_watched) {
        take_output(event.output);
    } else {
        library_.output().skip(event.output);
    }
    if (is_watched) {
        // before anything that it left running can report again
        const bool is_beside_others = event.left_running && !item_processes().empty();
        const auto plan =
            whole_stored_plan(is_beside_others ? kForPlanBesideOthers : kForWholePlan).annotated;
        reader_.read(plan);
        running_.items.back().reporting.lost = !plan && !restore_plan();
    }
    const std::vector<Leftover> left =
        event.left_running
            ? note_left_running(is_watched ? running_.items.back().element : kNoElement)
            : std::vector<Leftover>();
    if (is_watched) {
        take_output(); // also of a tee or the like, which ends a little later
        RunningItem &active = running_.items.back();
        ItemRun &result = item_at(run_, active.place);
        active.moved_on = true;
        active.moved_on_at = on_run_clock(event.time);
        const int signal = signal_of(event.value);
        if (signal == 0) {
            result.exit_status = WEXITSTATUS(event.value);
        } else if (!active.was_stopped) { // else fptest or the library sent it
            result.signal = signal;
        }
        result.left_running = left;
        finish(active, active.moved_on_at);
        notify_ended();
    }
    if (starts_no_more()) {
        library_.kill_library();
    } else {
        library_.go_on();
    }
}

// The library went on or returned without the end of an item: that was the gatherer, or
// could not be started.
void Runner::move_on(const LibraryProcess::Event &event)
{
    take_output(event.output);
    if (running_.items.empty()) {
        return;
    }
    RunningItem &active = running_.items.back();
    if (active.moved_on) {
        return;
    }
    active.moved_on = true;
    active.moved_on_at = on_run_clock(event.time);
    active.reporting.expected = true;
    reader_.read(event.kind == LibraryProcess::Event::Kind::returned
                     ? ParsedPlan(library_.read_back()).annotated()
                     : whole_stored_plan().annotated);
    // One that gathers once was still ending when the library took it for the gatherer, and
    // started none. With other items in its command, these would run twice.
    if (active.gathers && !active.gatherer_end.empty() && !active.starts_gatherer && !active.stop &&
        running_.job.targets.size() == 1 && !missed_gatherer_) {
        missed_gatherer_ = true;
        running_.items.pop_back();
        return;
    }
    if (!active.gathers || !active.gatherer_end.empty()) {
        finish(active, active.moved_on_at);
        notify_ended();
    }
}

void Runner::finish(RunningItem &active, TimePoint end)
{
    if (active.done) {
        return;
    }
    // the library may be at the command's next item already, which is not left running; what
    // the gatherer leaves is named with the last one then
    const bool is_last = running_.items.size() == 1 && running_.next >= running_.job.targets.size();
    if (active.gathers) {
        reader_.poll(ReportReader::When::at_once);
        if (is_last && active.gatherer_end.empty() && !active.stop) {
            std::this_thread::sleep_for(kToPrint);
        }
        take_output(); // with its report
    }
    active.done = true;
    ItemRun &result = item_at(run_, active.place);
    active.measuring.end(result.measured);
    files_.settle(result, active.gathers);
    add_warning(result, warning_of(result.measured));
    result.seconds = std::max(0.0, Seconds(end - active.start).count());
    result.stopping = false;
    if (!active.stop && options_.timeout && *result.seconds > options_.timeout->count()) {
        active.stop = Outcome::timed_out; // ended before the limit was checked
    }
    const Verdict verdict =
        judge(active, result,
              {run_.pass_code, vendor_, options_.timeout, options_.fail_on_exit_status,
               options_.judge_limits, signal_, library_gone_, over_limit_});
    result.outcome = verdict.outcome;
    result.reason = verdict.reason;
    result.overruled = verdict.overruled;
    if (active.gathers && is_last) {
        result.left_running = note_left_running(active.element);
    }
    if (is_last && (active.gathers || running_.job.targets.size() > 1)) {
        for (const Leftover &one : left_by_gatherer()) {
            if (std::ranges::find(result.left_running, one.process, &Leftover::process) ==
                result.left_running.end()) {
                result.left_running.push_back(one);
            }
        }
    }
    if (active.gathers && !has_finished(result.report)) {
        gatherer_may_report_late_ = true;
        has_signalled_ = true;
        signal_each(gatherer_processes(), SIGTERM);
    }
    reader_.watch_for_late_reports(active);
    mend_stored_plan();
}

// In the order of their starts.
void Runner::notify_ended()
{
    while (!running_.items.empty() && running_.items.front().done) {
        const Place place = running_.items.front().place;
        running_.items.pop_front();
        notify_end_of(place);
    }
}

// An item that is tried again has not ended, even where that is left to a run that completes
// this one.
void Runner::notify_end_of(Place place)
{
    ItemRun &item = item_at(run_, place);
    judge_by_the_run(item);
    const bool is_tried_again = !is_success(item.outcome) && item.outcome != Outcome::stopped &&
                                item.expected.empty() &&
                                (run_.why_unfinished.empty() || is_stopping()) &&
                                item.earlier.size() < static_cast<std::size_t>(run_.retries);
    for (Reporter *reporter : reporters_) {
        is_tried_again ? reporter->retried(run_, place) : reporter->ended(run_, place);
    }
    if (is_tried_again) {
        begin_attempt(item);
    }
}

} // namespace fptest
