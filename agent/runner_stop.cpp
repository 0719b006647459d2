// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the runner stops: an item that takes too long, all where the run is
// interrupted, what items have left running.
#include "runner.h"

#include "text.h"
#include "trigger.h"

#include <algorithm>
#include <csignal>
#include <cstdio>
#include <poll.h>
#include <thread>
#include <unistd.h>

namespace fptest
{
namespace
{

using namespace std::chrono_literals;

constexpr auto kTurn = 25ms;
constexpr auto kBetweenStops = 250ms;
constexpr auto kBeforeRelease = 300ms;
constexpr auto kBeforeGivingUp = 10s; // on what was killed
// What only takes a moment longer to end has not been left running.
constexpr auto kEnding = 100ms;

// "sh (pid 812, state D)"
std::string described(const std::vector<Leftover> &processes)
{
    std::vector<std::string> all;
    for (const Leftover &one : processes) {
        all.push_back(one_line(one.name) + " (pid " + std::to_string(one.process) + ", state " +
                      state_of(one.process) + ")");
    }
    return listing(all);
}

} // namespace

// --- signals ------------------------------------------------------------------

void Runner::read_signals()
{
    for (int signal = signals_.take(); signal != 0; signal = signals_.take()) {
        if (signal == SIGTSTP) {
            suspend();
            continue;
        }
        if (signal_ != 0 && signal == SIGHUP) {
            continue; // a terminal that closes sends it once more, or after its Ctrl-C
        }
        if (signal_ != 0) {
            // the reports are as far as they were written; the host's process
            // sees that this one is gone and stops what runs
            pollfd errors{STDERR_FILENO, POLLOUT, 0};
            if (poll(&errors, 1, 0) > 0) { // a terminal may be stopped
                std::fputs("\nfptest: left at once; what runs is asked to stop\n", stderr);
            }
            _exit(static_cast<int>(128 + SIGINT));
        }
        signal_ = signal;
        give_up("interrupted by " + signal_name(signal));
        for (Active &active : active_) {
            if (!active.stop) {
                active.stop = Outcome::stopped;
                active.stop_wanted_at = now();
            }
        }
    }
}

// Nobody would watch them meanwhile, so the items stop as well, and no time passes
// for them.
void Runner::suspend()
{
    for (Listener *listener : listeners_) {
        listener->paused(run_);
    }
    const auto begin = SteadyClock::now();
    host_.suspend();
    Signals::suspend();
    host_.resume();
    suspended_ += SteadyClock::now() - begin;
    for (Listener *listener : listeners_) {
        listener->resumed(run_);
    }
}

// --- items --------------------------------------------------------------------

void Runner::stop_what_is_due(bool command_runs)
{
    for (Active &active : active_) {
        if (!active.done && !active.stop && limits_.item && now() - active.start > *limits_.item) {
            active.stop = Outcome::timed_out;
            active.stop_wanted_at = now();
        }
    }
    if (!active_.empty() && !active_.back().done && active_.back().stop) {
        press_stop(active_.back(), command_runs);
    }
    // the module stops only what it started last: an earlier gatherer is left alone
    for (Active &active : active_) {
        if (&active != &active_.back() && !active.done && active.stop) {
            active.was_stopped = true;
            finish(active, now());
        }
    }
}

// Through the module, again and again, as the item may only just be starting; and
// by a signal that nothing can ignore where that does not help in time.
void Runner::press_stop(Active &active, bool command_runs)
{
    const auto waited = now() - active.stop_wanted_at;
    const bool gatherer = gathers(active);
    if (!gatherer && waited > limits_.grace + kBeforeGivingUp) {
        cannot_stop(active);
        return;
    }
    if (active.stop_tried_at != TimePoint{} && now() - active.stop_tried_at < kBetweenStops) {
        return;
    }
    active.stop_tried_at = now();
    if (!stop_asked_) {
        host_.stop(item(active.place).name);
        stop_asked_ = true;
    }
    if (gatherer) {
        stop_gatherer(active, command_runs, waited);
    } else if (waited > limits_.grace && host_.processes().signal_items(SIGKILL)) {
        active.was_stopped = true;
        active.killed = true;
    }
}

void Runner::stop_gatherer(Active &active, bool command_runs, SteadyClock::duration waited)
{
    if (command_runs && waited > kBeforeRelease) {
        active.was_stopped = true;
        release_trigger();
    }
    if (waited > limits_.grace) {
        host_.processes().kill_gatherer(); // unless it is none of this host
        active.was_stopped = true;
    }
    if (active.was_stopped && active.moved_on) {
        finish(active, now());
    }
}

// A stop that found nothing has met an item whose process has another name, as a
// script's is its shell's.
void Runner::note_stop(const Host::Event &event)
{
    stop_asked_ = false;
    if (active_.empty() || active_.back().done) {
        return;
    }
    Active &active = active_.back();
    if (event.value == 0) {
        active.was_stopped = true;
    } else if (!gathers(active)) {
        const ModuleProcesses processes = host_.processes();
        if (processes.signal_items(SIGTERM)) {
            processes.signal_items(SIGCONT); // one that is suspended would not see it
            active.was_stopped = true;
        }
    }
}

void Runner::cannot_stop(Active &active)
{
    const std::vector<Leftover> left = host_.processes().of_items();
    broken_ = true;
    give_up(item(active.place).group + "/" + item(active.place).name + " cannot be killed: " +
            (left.empty() ? "the module waits for it" : described(left) + " goes on running"));
    active.was_stopped = true;
    active.killed = true;
    finish(active, now());
    item(active.place).reason += ", and goes on running";
}

// --- what they leave running ---------------------------------------------------

void Runner::note_left_running(Active &active)
{
    const ModuleProcesses processes = host_.processes();
    std::vector<Leftover> found = processes.of_items();
    for (const auto begin = SteadyClock::now();
         !found.empty() && SteadyClock::now() - begin < kEnding;) {
        std::this_thread::sleep_for(kTurn);
        found = processes.of_items();
    }
    for (const Leftover &one : found) {
        if (std::ranges::find(left_, one.process, &Left::process) == left_.end()) {
            left_.push_back({active.target.element, one.process});
            item(active.place).left_running.push_back(one);
        }
    }
}

void Runner::make_way_for(const Job &job)
{
    const auto is_of_job = [&](std::size_t element) {
        return std::ranges::any_of(
            job.targets, [&](const auto &target) { return target && target->element == element; });
    };
    if (std::ranges::any_of(left_, is_of_job, &Left::element)) {
        end_left_running();
    }
    look();
    std::erase_if(judged_, [&](const Judged &judged) { return is_of_job(judged.target.element); });
}

void Runner::end_round()
{
    if (!left_.empty()) {
        end_left_running();
    }
    look();
    judged_.clear();
}

void Runner::end_left_running()
{
    const ModuleProcesses processes = host_.processes();
    const auto begin = now();
    for (TimePoint asked; !processes.of_items().empty(); std::this_thread::sleep_for(kTurn)) {
        const auto waited = now() - begin;
        if (waited > limits_.grace + kBeforeGivingUp) {
            give_up(described(processes.of_items()) + " cannot be killed, and would report into "
                                                      "the next round");
            broken_ = true;
            return;
        }
        if (now() - asked > kBetweenStops) {
            asked = now();
            processes.signal_items(waited > limits_.grace ? SIGKILL : SIGTERM);
            processes.signal_items(SIGCONT);
        }
        read_signals();
        look();
        tick();
    }
    left_.clear();
}

} // namespace fptest
