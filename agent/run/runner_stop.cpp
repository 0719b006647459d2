// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How the runner stops items: at the time limit, at an interrupt, and what they leave
// running.
#include "run/runner.h"

#include "module/preflight.h"
#include "module/stored_plan.h"
#include "run/trigger.h"
#include "util/text.h"
#include "util/times.h"

#include <algorithm>
#include <csignal>
#include <fmt/core.h>
#include <set>
#include <thread>

namespace fptest
{
namespace
{

using namespace std::chrono_literals;

constexpr auto kBetweenStops = 250ms;
constexpr auto kBeforeRelease = 300ms;
constexpr auto kBeforeGivingUp = 5s; // on what was killed: device/run waits for 10 s in all
constexpr auto kForALongPlan = 60s;  // to load and save a large plan, between two items
// A process that ends within this was not left running.
constexpr auto kEnding = 100ms;

// "sh (pid 812, state D)"
std::string described(const std::vector<Leftover> &processes)
{
    std::vector<std::string> all;
    for (const Leftover &one : processes) {
        all.push_back(fmt::format("{} (pid {}, state {})", one_line(one.name), one.process,
                                  state_of(one.process)));
    }
    return join_and(all);
}

std::string interrupted_by(int signal)
{
    return fmt::format("interrupted by {}", name_for_people(signal));
}

// Those that do not end at once.
template <typename Find> std::vector<Leftover> still_found(const Find &find)
{
    std::vector<Leftover> found = find();
    for (const auto begin = std::chrono::steady_clock::now();
         !found.empty() && std::chrono::steady_clock::now() - begin < kEnding;) {
        std::this_thread::sleep_for(10ms);
        found = find();
    }
    return found;
}

} // namespace

void Runner::read_signals()
{
    for (int signal = signals_.take(); signal != 0; signal = signals_.take()) {
        if (signal == SIGTSTP) {
            suspend();
            continue;
        }
        if (signal_ != 0 && (signal == SIGHUP || signal == kStopRequest)) {
            continue; // a terminal that closes sends it once more, or after its Ctrl-C
        }
        // sent to all processes, and handed on by a script or by timeout; of two that are
        // pending, SIGHUP is taken before the Ctrl-C that came first
        if (signal_ != 0 && (signal == SIGTERM || signal_ == SIGHUP) &&
            now() - signal_taken_at_ < 1s) {
            if (signal == SIGINT && run_.why_unfinished == interrupted_by(signal_)) {
                signal_ = signal;
                run_.why_unfinished = interrupted_by(signal);
            }
            continue;
        }
        if (signal_ != 0) {
            options_.on_second_interrupt();
        }
        signal_ = signal;
        signal_taken_at_ = now();
        give_up(interrupted_by(signal));
        stop_items();
    }
    look_at_limit();
}

void Runner::look_at_limit()
{
    if (!is_stopping() && options_.limit && now() - began_ > *options_.limit) {
        over_limit_ = true;
        give_up(fmt::format("the limit of {} was over (--limit)",
                            fine_duration(options_.limit->count())));
        stop_items();
    }
}

void Runner::stop_items()
{
    stopping_since_ = now();
    for (RunningItem &active : running_.items) {
        if (!active.stop) {
            active.stop = Outcome::stopped;
            active.stop_wanted_at = now();
        }
    }
}

// Nobody watches the items meanwhile, so they are suspended too, and their clock stops.
void Runner::suspend()
{
    for (Reporter *reporter : reporters_) {
        reporter->paused(run_);
    }
    const auto begin = SteadyClock::now();
    library_.suspend();
    Signals::suspend();
    library_.resume();
    last_suspension_ = begin;
    last_suspended_ = SteadyClock::now() - begin;
    suspended_ += last_suspended_;
    for (Reporter *reporter : reporters_) {
        reporter->resumed(run_);
    }
}

void Runner::stop_what_is_due()
{
    for (RunningItem &active : running_.items) {
        if (!active.done && !active.stop && options_.timeout &&
            now() - active.start > *options_.timeout) {
            active.stop = Outcome::timed_out;
            active.stop_wanted_at = now();
        }
    }
    if (!running_.items.empty() && !running_.items.back().done && running_.items.back().stop) {
        try_stop(running_.items.back());
    }
    if (running_.items.empty() && running_.command_runs && is_stuck()) {
        library_.kill_library(); // it reaches no item, and does not return
    }
    // the library stops only what it started last: earlier gatherers are just signalled
    for (RunningItem &active : running_.items) {
        if (&active != &running_.items.back() && !active.done && active.stop) {
            stop_gatherer(active);
        }
    }
}

// Between two items: one may have suspended the library, or replaced the plan by something
// that has no end.
bool Runner::is_stuck() const
{
    const auto silent = now() - heard_of_at_;
    return (is_stopping() && now() - stopping_since_ > options_.grace + kBeforeGivingUp) ||
           (silent > kBeforeGivingUp && library_.is_suspended()) ||
           (options_.timeout && silent > *options_.timeout + kForALongPlan);
}

// Asks the library again and again, as the item may be just starting; kills after the
// grace time.
void Runner::try_stop(RunningItem &active)
{
    const auto waited = now() - active.stop_wanted_at;
    const bool gatherer = active.gathers;
    if ((!gatherer || !active.moved_on) && waited > options_.grace + kBeforeGivingUp) {
        if (gatherer || item_processes().empty()) {
            library_.kill_library(); // not an item, but the library hangs
        } else {
            cannot_stop(active);
        }
        return;
    }
    if (active.stop_tried_at != TimePoint{} && now() - active.stop_tried_at < kBetweenStops) {
        return;
    }
    active.stop_tried_at = now();
    has_signalled_ = true;
    // once: a second SIGTERM would restart its clean-up
    if (!stop_asked_ && !active.was_stopped) {
        const auto met = met_by_stop(item_at(run_, active.place).name);
        active.meets_other =
            met && !std::ranges::any_of(processes_of(active),
                                        [&](const auto &one) { return one.process == *met; });
        library_.stop(item_at(run_, active.place).name);
        stop_asked_ = true;
    }
    if (gatherer) {
        stop_gatherer(active);
    } else if (waited > options_.grace && signal_each(item_processes(), SIGKILL)) {
        active.was_stopped = true;
        active.killed = true;
    }
}

// The command waits for a gatherer that will not connect.
void Runner::release_command()
{
    if (starts_no_more()) {
        library_.kill_library();
    } else {
        release_trigger();
    }
}

// Whether the command's next items must not start. Only the end of the library's process
// prevents that.
bool Runner::starts_no_more() const
{
    return is_stopping() && running_.next < running_.job.targets.size();
}

void Runner::stop_gatherer(RunningItem &active)
{
    const auto waited = now() - active.stop_wanted_at;
    const bool is_last = &active == &running_.items.back();
    if (is_last && running_.command_runs && waited > kBeforeRelease) {
        active.was_stopped = true;
        release_command();
    }
    const std::vector<Leftover> left = gatherer_processes();
    has_signalled_ = true;
    if (!is_last && !active.was_stopped && ask_to_end(left)) {
        active.was_stopped = true;
    }
    if (waited > options_.grace && signal_each(left, SIGKILL)) {
        active.was_stopped = true;
        active.killed = true;
    }
    if (active.moved_on && left.empty()) {
        active.was_stopped = true;
        finish(active, now());
    }
}

// The library finds the process by name: it misses a script, whose process is its shell,
// and may hit another process whose name begins like the item's.
void Runner::end_stop(const LibraryProcess::Event &event)
{
    stop_asked_ = false;
    if (running_.items.empty() || running_.items.back().done) {
        return;
    }
    RunningItem &active = running_.items.back();
    const std::vector<Leftover> processes = processes_of(active);
    if ((event.value == 0 && !active.meets_other) || ask_to_end(processes)) {
        active.was_stopped = true;
    }
}

void Runner::cannot_stop(RunningItem &active)
{
    const std::vector<Leftover> left = item_processes();
    const ItemRun &result = item_at(run_, active.place);
    break_off(fmt::format("{} cannot be killed: {} goes on running",
                          one_line(result.group + "/" + result.name), described(left)));
    active.was_stopped = true;
    active.killed = true;
    active.goes_on = true;
    finish(active, now());
}

// Without those that earlier items left running.
std::vector<Leftover> Runner::item_processes() const
{
    return library_.processes().of_items(left_by_others({}));
}

// Whether the gatherer runs. What comes of it is known from then on.
bool Runner::note_gatherer()
{
    std::erase_if(gatherers_, [](const Leftover &one) { return !lives(one); });
    const std::vector<Leftover> found = library_.processes().of_gatherer();
    for (const Leftover &one : found) { // its shell may have become another program
        std::erase_if(gatherers_,
                      [&one](const Leftover &known) { return known.process == one.process; });
        gatherers_.push_back(one);
    }
    return !found.empty();
}

std::vector<Leftover> Runner::gatherer_processes()
{
    note_gatherer();
    return gatherers_;
}

// What is left of one that has ended, or has another name now.
std::vector<Leftover> Runner::left_by_gatherer()
{
    return still_found(
        [this] { return found_as_gatherer() ? std::vector<Leftover>() : gatherer_processes(); });
}

std::vector<Leftover> Runner::processes_of(const RunningItem &active)
{
    return active.gathers ? gatherer_processes() : item_processes();
}

std::vector<Leftover> Runner::note_left_running(std::size_t element)
{
    std::vector<Leftover> found = still_found([this] { return item_processes(); });
    for (const Leftover &one : found) {
        left_.emplace_back(element, one);
    }
    return found;
}

std::vector<Leftover> Runner::left_by_others(const Job &job) const
{
    std::vector<Leftover> all;
    for (const auto &[element, process] : left_) {
        if (!job.has(element)) {
            all.push_back(process);
        }
    }
    return all;
}

// Ends the processes found, until none is left.
template <typename Find> void Runner::end_all(const Find &find)
{
    const auto begin = now();
    const auto find_all = [&] {
        drain_events();
        return find();
    };
    std::set<pid_t> asked;
    for (auto left = find_all(); !left.empty(); left = find_all()) {
        const auto waited = now() - begin;
        has_signalled_ = true;
        if (waited > options_.grace + kBeforeGivingUp) {
            break_off(fmt::format("{} cannot be killed, and might still report", described(left)));
            return;
        }
        if (waited > options_.grace) {
            signal_each(left, SIGKILL);
        }
        // once: a second SIGTERM would restart their clean-up
        std::erase_if(left, [&](const Leftover &one) { return !asked.insert(one.process).second; });
        ask_to_end(left);
        std::this_thread::sleep_for(kTurn);
        drop_output(); // what is being ended prints for no later item
        read_signals();
        reader_.poll();
        tick();
    }
}

void Runner::begin(const std::string &earlier_plan)
{
    reader_.note_gathered(earlier_plan, vendor_);
    if (options_.ends_gatherer) {
        end_gatherer();
    }
}

void Runner::make_way_for(const Job &job)
{
    const std::vector<Leftover> others = left_by_others(job);
    if (others.size() < left_.size()) {
        end_all([&] { return library_.processes().of_items(others); });
        std::erase_if(left_, [&job](const auto &one) { return job.has(one.first); });
    }
    const auto is_gatherers = [&](const auto &target) {
        return target && is_gatherer(run_.suites[job.suite].items[target->item].name, vendor_);
    };
    if (std::ranges::any_of(job.targets, is_gatherers)) {
        end_all([this] { // or the library would start no gatherer beside them
            auto left = library_.processes().of_items();
            std::erase_if(left, [](const auto &one) { return !is_found_as_gatherer(one.process); });
            return left;
        });
        reader_.note_gathered(read_stored_plan().value_or(""), vendor_);
        // or what it has measured out of limits, or not to be judged, would not be measured again
        const auto measures_again = [&](const auto &target) {
            if (!target) {
                return false;
            }
            const std::vector<ItemRun> &earlier = item_at(run_, {job.suite, target->item}).earlier;
            return options_.judge_limits && !earlier.empty() &&
                   (earlier.back().measured.out > 0 ||
                    !what_is_lost(earlier.back().measured).empty());
        };
        // the library does not see one under another name, and would start another beside it
        if (gatherer_may_report_late_ || std::ranges::any_of(job.targets, measures_again) ||
            !left_by_gatherer().empty()) {
            end_gatherer();
        }
        gatherer_runs_ = note_gatherer();
        require_trigger_port(); // an item may have taken it
    }
    if (has_signalled_) {
        require_plan();
    }
    reader_.poll(ReportReader::When::at_once);
    reader_.forget(job);
}

void Runner::end_round()
{
    if (!left_.empty()) {
        end_left_running();
        require_plan();
    }
    // what no trigger reaches would wait for the next one beside the gatherer that it starts
    if (gatherer_may_report_late_ || !left_by_gatherer().empty()) {
        end_gatherer();
    }
    reader_.poll(ReportReader::When::at_once);
    reader_.forget_round();
}

void Runner::end_left_running()
{
    end_all([this] { return library_.processes().of_items(); });
    left_.clear();
}

void Runner::end_gatherer()
{
    end_all([this] { return gatherer_processes(); });
    gatherer_may_report_late_ = false;
}

} // namespace fptest
