// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/runner.h"

#include "module/stored_plan.h"
#include "plan/plan_text.h"
#include "run/trigger.h"
#include "util/files.h"
#include "util/text.h"

#include <algorithm>
#include <cstdlib>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

namespace fptest
{
namespace
{

using namespace std::chrono_literals;
using Seconds = std::chrono::duration<double>;

constexpr auto kTurn = 25ms;
// The gatherer's command returns when the gatherer has been told; its report
// comes in its own time.
constexpr Seconds kGathering = 10s;
// A gatherer that is being started may not be there yet.
constexpr auto kBeforeMissed = 500ms;
constexpr auto kBetweenLooks = 250ms;
constexpr std::size_t kOutputKept = std::size_t{64} * 1024;

void append_output(std::string &output, const std::string &text)
{
    output += text;
    if (output.size() > kOutputKept) {
        output.erase(0, output.size() - kOutputKept);
    }
}

std::string reported(const ItemReport &report)
{
    return report.result_without_value
               ? "reported a result that is none of 0, 1 and -2: the plan has no text for it"
               : "reported the result " + report.result.value_or("");
}

// As it reads once the plan has been made loadable.
ItemReport as_made_loadable(ItemReport report)
{
    if (report.result_without_value) {
        report.result_without_value = false;
        report.result = "";
    }
    report.description = report.description.value_or("");
    return report;
}

// What the item died by; 0 where it ended by itself. A shell that has not become the
// item, as for quotes in its arguments, says so by its own exit status.
int signal_of(int status)
{
    if (WIFSIGNALED(status)) {
        return WTERMSIG(status);
    }
    const int signal = WEXITSTATUS(status) - 128;
    return name_of_signal(signal).starts_with("SIG") ? signal : 0;
}

// Whether that element is the item still, and not one of another plan.
bool is_item(const Plan &plan, std::size_t number, const std::string &name)
{
    if (number >= plan.elements().size()) {
        return false;
    }
    const char *found = mxmlElementGetAttr(plan.elements()[number], "name");
    return found != nullptr && name == found;
}

// Whether a process with an old copy of the plan may have brought that back.
bool is_earlier(const ItemReport &report, const ItemReport &last)
{
    const auto progress = [](const ItemReport &one) {
        return std::atol(one.progress.value_or("0").c_str());
    };
    return report.result == last.result && progress(report) < progress(last);
}

// One without it is as a process with an old copy of the plan has written it.
bool bears_mark(const Plan &plan, const Job::Target &target)
{
    const char *found = mxmlElementGetAttr(plan.elements()[target.element], kMark);
    return target.mark.empty() || (found != nullptr && target.mark == found);
}

} // namespace

// --- a job --------------------------------------------------------------------

Runner::Runner(Host &host, Signals &signals, Run &run, const std::vector<Listener *> &listeners,
               const Limits &limits)
    : host_(host), signals_(signals), run_(run), listeners_(listeners), limits_(limits)
{
    signals_.take_suspensions();
    host_.hold_at_ends();
}

Runner::TimePoint Runner::now() const
{
    return on_run_clock(SteadyClock::now());
}

Runner::TimePoint Runner::on_run_clock(TimePoint time) const
{
    // what happened before the last suspension may be heard of after it
    return time - (time < last_suspension_ ? suspended_ - last_suspended_ : suspended_);
}

void Runner::give_up(const std::string &why)
{
    if (run_.why_unfinished.empty()) {
        run_.why_unfinished = why;
    }
}

bool Runner::run(const Job &job)
{
    read_signals();
    if (!run_.why_unfinished.empty()) {
        return false;
    }
    module_gone_.clear();
    std::vector<std::string> names;
    for (const auto &target : job.targets) {
        if (target) {
            names.push_back(run_.suites[job.suite].items[target->item].name);
        }
    }
    // a process that reports, such as a gatherer, truncates the plan before it writes it:
    // the library may load it until it has come to the first item
    Descriptor plan = lock_stored_plan();
    host_.command("XMLNodePath::" + job.path, names);

    std::size_t next = 0;
    bool runs = true;
    while ((runs || !active_.empty()) && !broken_) {
        if (const auto event = host_.wait(kTurn, signals_.descriptor())) {
            plan = Descriptor(-1);
            handle(*event, job, next, runs);
        }
        watch(runs);
    }
    if (!broken_) {
        require_all_started(job, next);
        require_plan();
    }
    tell_ended();
    return run_.why_unfinished.empty();
}

// A command that returns without having come to its items has run nothing, for
// whatever cause: that is no success.
void Runner::require_all_started(const Job &job, std::size_t next)
{
    for (; next < job.targets.size() && signal_ == 0; ++next) {
        if (!job.targets[next]) {
            continue;
        }
        const Place place{job.suite, job.targets[next]->item};
        ItemRun &result = item(place);
        result.start = std::chrono::system_clock::now();
        for (Listener *listener : listeners_) {
            listener->started(run_, place);
        }
        result.seconds = 0;
        result.outcome = Outcome::silent;
        result.reason = module_gone_.empty()
                            ? "the library never reached it; run with --log FILE to see why"
                            : "the library never reached it: " + module_gone_;
        for (Listener *listener : listeners_) {
            listener->ended(run_, place);
        }
    }
}

// Without a stored plan nothing that comes can report.
void Runner::require_plan()
{
    const std::string text = whole_stored_plan();
    if (Plan::read(text) || Plan::load(text)) {
        return;
    }
    give_up(std::string("the stored plan ") + kStoredPlan +
            " is gone, or not whole any more: store it again");
    broken_ = true;
}

void Runner::handle(const Host::Event &event, const Job &job, std::size_t &next, bool &runs)
{
    switch (event.kind) {
    case Host::Event::Kind::item:
        move_on(event);
        start_next(job, next, event);
        break;
    case Host::Event::Kind::ended:
        end_item(event);
        break;
    case Host::Event::Kind::returned:
        runs = false;
        move_on(event);
        break;
    case Host::Event::Kind::stopped:
        note_stop(event);
        break;
    case Host::Event::Kind::gone:
        runs = false;
        lose_module(event);
        break;
    }
}

// It costs the items that it was running; the next ones get another.
void Runner::lose_module(const Host::Event &event)
{
    module_gone_ = "the library's process ended " + event.text + "; --log FILE keeps what it says";
    stop_asked_ = false;
    if (!active_.empty()) {
        append_output(item(active_.back().place).output, host_.take_output(event.output));
    }
    read_reports(whole_stored_plan());
    for (Active &active : active_) {
        finish(active, on_run_clock(event.time));
    }
    tell_ended();
    end_left_running();
    if (!broken_) {
        host_.restart();
    }
}

void Runner::watch(bool command_runs)
{
    read_signals();
    look();
    stop_what_is_due(command_runs);
    tell_ended();
    tick();
}

void Runner::tick()
{
    run_.seconds = Seconds(now() - began_).count();
    const std::string output = host_.take_output();
    if (!active_.empty()) {
        append_output(item(active_.back().place).output, output);
    }
    for (const Active &active : active_) {
        item(active.place).running = std::max(0.0, Seconds(now() - active.start).count());
        item(active.place).stopping = active.stop.has_value();
    }
    for (Listener *listener : listeners_) {
        listener->tick(run_);
    }
}

ItemRun &Runner::item(const Place &place)
{
    return run_.suites[place.suite].items[place.item];
}

const ItemRun &Runner::item(const Place &place) const
{
    return run_.suites[place.suite].items[place.item];
}

bool Runner::gathers(const Active &active) const
{
    return is_gatherer(item(active.place).name, vendor_);
}

// --- an item's start and end --------------------------------------------------

void Runner::start_next(const Job &job, std::size_t &next, const Host::Event &event)
{
    vendor_ = event.value;
    const std::size_t at = next++;
    if (at >= job.targets.size() || !job.targets[at]) {
        return;
    }
    Active active;
    active.place = {job.suite, job.targets[at]->item};
    active.target = *job.targets[at];
    active.start = on_run_clock(event.time);
    if (signal_ != 0) {
        active.stop = Outcome::stopped;
        active.stop_wanted_at = now();
    }
    active_.push_back(active);
    item(active.place).start = std::chrono::system_clock::now() -
                               std::chrono::duration_cast<std::chrono::system_clock::duration>(
                                   SteadyClock::now() - event.time);
    for (Listener *listener : listeners_) {
        listener->started(run_, active.place);
    }
    if (vendor_ != run_.vendor) {
        append_output(item(active.place).output,
                      "fptest: the vendor is " + std::to_string(vendor_) + " by now\n");
    }
}

// The item's process has ended, and the library waits: what stands in the plan now is
// what the item has reported.
void Runner::end_item(const Host::Event &event)
{
    const std::string output = host_.take_output(event.output);
    const bool is_watched = !active_.empty() && !active_.back().moved_on;
    if (is_watched) {
        const std::string plan = whole_stored_plan();
        read_reports(plan); // before what it has left can report again
        active_.back().report_lost = !Plan::read(plan);
    }
    const std::vector<Leftover> left =
        event.left_running
            ? note_left_running(is_watched ? active_.back().target.element : kNoElement)
            : std::vector<Leftover>();
    if (is_watched) {
        Active &active = active_.back();
        ItemRun &result = item(active.place);
        append_output(result.output, output);
        active.moved_on = true;
        active.moved_on_at = on_run_clock(event.time);
        const int signal = signal_of(event.value);
        if (signal == 0) {
            result.exit_status = WEXITSTATUS(event.value);
        } else if (!active.was_stopped) { // else it is fptest's own, or the library's
            result.signal = signal;
        }
        result.left_running = left;
        finish(active, active.moved_on_at);
        tell_ended();
    }
    host_.go_on();
}

// The library has gone on to its next item, or has returned: it was with the
// gatherer, or with an item that it could not start.
void Runner::move_on(const Host::Event &event)
{
    const std::string output = host_.take_output(event.output);
    if (active_.empty()) {
        return;
    }
    Active &active = active_.back();
    append_output(item(active.place).output, output);
    if (active.moved_on) {
        return;
    }
    active.moved_on = true;
    active.moved_on_at = on_run_clock(event.time);
    read_reports(event.kind == Host::Event::Kind::returned ? host_.read_back()
                                                           : whole_stored_plan());
    if (!gathers(active) || !active.gatherer_end.empty()) {
        finish(active, active.moved_on_at);
        tell_ended();
    }
}

void Runner::finish(Active &active, TimePoint end)
{
    if (active.done) {
        return;
    }
    active.done = true;
    ItemRun &result = item(active.place);
    result.seconds = std::max(0.0, Seconds(end - active.start).count());
    result.stopping = false;
    if (!active.stop && limits_.item && *result.seconds > limits_.item->count()) {
        active.stop = Outcome::timed_out; // over before that was seen
    }
    judge(active);
    if (gathers(active) && active_.size() == 1 && !active.stop) {
        result.left_running = note_left_running(active.target.element);
    }
    if (gathers(active) && !(result.report.progress == "100" && result.report.result)) {
        gatherer_may_report_late_ = true;
        signal_each(host_.processes().of_gatherer(), SIGTERM);
    }
    judged_.push_back({active.place, active.target, result.report});
    mend_stored_plan();
}

void Runner::judge(const Active &active)
{
    ItemRun &result = item(active.place);
    const ItemReport &report = result.report;
    const bool has_reported = report.result || report.result_without_value;
    if (active.stop == Outcome::timed_out ||
        (active.stop == Outcome::stopped && active.was_stopped)) {
        result.outcome = *active.stop;
        result.reason = why_stopped(active);
    } else if (!module_gone_.empty()) {
        result.outcome = has_reported ? Outcome::failed : Outcome::silent;
        result.reason = module_gone_;
        result.overruled = has_reported;
    } else if (result.signal != 0) {
        result.outcome = Outcome::failed;
        result.reason = "died by " + name_of_signal(result.signal) +
                        (has_reported ? ", though it " + reported(report) : "");
    } else if (!has_reported || active.report_lost) {
        result.outcome = Outcome::silent;
        result.reason = why_silent(active);
    } else if (!active.gatherer_end.empty() && report.progress != "100") {
        result.outcome = Outcome::failed;
        result.reason = "the gatherer ended at progress " + report.progress.value_or("0") +
                        ", though it " + reported(report);
        result.overruled = true;
    } else if (limits_.exit_status && result.exit_status.value_or(0) != 0) {
        result.outcome = Outcome::failed;
        result.reason = "ended with exit status " + std::to_string(*result.exit_status) +
                        ", though it " + reported(report);
    } else if (report.result == std::to_string(run_.pass_code)) {
        result.outcome = Outcome::passed;
    } else {
        result.outcome = Outcome::failed;
        result.reason = reported(report);
    }
}

std::string Runner::why_stopped(const Active &active)
{
    if (!active.was_stopped && !module_gone_.empty()) {
        return "past the limit of " + fine_duration(limits_.item->count()) + ": " + module_gone_;
    }
    if (!active.was_stopped) {
        return "ended by itself after " + fine_duration(*item(active.place).seconds) +
               ", past the limit of " + fine_duration(limits_.item->count());
    }
    const std::string interruption =
        (active.killed ? " after the run was interrupted by " : " by ") + signal_name(signal_);
    const std::string how = active.stop == Outcome::stopped
                                ? interruption
                                : " after " + duration(*item(active.place).seconds);
    return (active.killed ? "killed" : "stopped") + how +
           (active.killed ? ", as it did not end when it was asked to" : "");
}

std::string Runner::why_silent(const Active &active)
{
    const auto suffix = vendor_suffix(vendor_);
    if (!suffix) {
        return "vendor " + std::to_string(vendor_) + " runs no item";
    }
    const std::string program = program_of(item(active.place).name, *suffix);
    if (is_plain_name(item(active.place).name) && access(program.c_str(), X_OK) != 0) {
        return "there is no program " + one_line(program);
    }
    if (!active.gatherer_end.empty()) {
        return active.gatherer_end;
    }
    if (active.overwritten) {
        return "a process with an old copy of the plan has written it over; what the plan says "
               "now is of an earlier run";
    }
    if (active.undone) {
        return "a process with an old copy of the plan has written over what it had reported";
    }
    if (active.report_lost) {
        return "what it reported is lost: the stored plan is gone, or not whole any more";
    }
    const std::string text = read_stored_plan().value_or("");
    std::string why;
    if (Plan::read(text) && !Plan::load(text, &why)) {
        return "no report can be written any more: the stored plan does not load (" + why + ")";
    }
    if (text.empty()) {
        return "no report could be written: the stored plan is gone";
    }
    if (!Plan::read(text)) {
        return "no report could be written: the stored plan is not whole any more";
    }
    return gathers(active) ? "no result was reported within " +
                                 fine_duration(limits_.item.value_or(kGathering).count())
                           : "ended without reporting a result";
}

// In the order of their starts, because that is the order of their numbers.
void Runner::tell_ended()
{
    while (!active_.empty() && active_.front().done) {
        const Place place = active_.front().place;
        active_.pop_front();
        for (Listener *listener : listeners_) {
            listener->ended(run_, place);
        }
    }
}

// --- reports ------------------------------------------------------------------

// Reads the plan where it has changed; one that is being written is left for the
// next time.
void Runner::look()
{
    struct stat status {
    };
    if ((!active_.empty() || !judged_.empty()) && stat(kStoredPlan, &status) == 0 &&
        S_ISREG(status.st_mode) &&
        (status.st_mtim.tv_sec != plan_status_.st_mtim.tv_sec ||
         status.st_mtim.tv_nsec != plan_status_.st_mtim.tv_nsec ||
         status.st_size != plan_status_.st_size || status.st_ino != plan_status_.st_ino)) {
        const auto text = read_stored_plan();
        if (text && Plan::read(*text)) {
            plan_status_ = status;
            read_reports(*text);
            if (!Plan::load(*text)) {
                mend_stored_plan(); // or who reports next could not
            }
        }
    }
    for (Active &active : active_) {
        look_for_gatherer(active);
        const ItemReport &report = item(active.place).report;
        const bool has_ended = report.progress == "100" && report.result;
        if (active.moved_on && !active.done &&
            (has_ended || !active.gatherer_end.empty() ||
             (!limits_.item && now() - active.moved_on_at > kGathering))) {
            finish(active, now());
        }
    }
}

// Without it the library would wait at its port without end, and what has died
// reports no more.
void Runner::look_for_gatherer(Active &active)
{
    if (active.done || !active.gatherer_end.empty() || !gathers(active) ||
        now() - active.gatherer_looked_for < kBetweenLooks) {
        return;
    }
    active.gatherer_looked_for = now();
    active.gatherer_missed = host_.processes().has_gatherer() ? 0 : active.gatherer_missed + 1;
    if (active.gatherer_missed < 2 || now() - active.start < kBeforeMissed) {
        return;
    }
    active.gatherer_end = active.moved_on ? "the gatherer ended before it had reported"
                                          : "the gatherer ended before it connected";
    if (!active.moved_on) {
        release_trigger();
    }
}

void Runner::read_reports(const std::string &text)
{
    const auto plan = Plan::read(text);
    if (!plan) {
        return;
    }
    for (Active &active : active_) {
        read_report(active, *plan);
    }
    for (Judged &judged : judged_) {
        read_late_report(judged, *plan);
    }
}

void Runner::read_report(Active &active, const Plan &plan)
{
    const std::size_t number = active.target.element;
    if (active.done || !is_item(plan, number, item(active.place).name)) {
        return;
    }
    active.overwritten = !bears_mark(plan, active.target);
    if (active.overwritten) {
        return; // what it says is of an earlier run
    }
    ItemRun &result = item(active.place);
    ItemReport report = plan.report(number);
    if (report.result == "") { // it has been made loadable already
        report.result.reset();
        report.result_without_value = true;
    }
    if (as_made_loadable(report) == as_made_loadable(result.report)) {
        return;
    }
    active.undone = result.report.result && !report.result;
    result.report = std::move(report);
    for (Listener *listener : listeners_) {
        listener->progressed(run_, active.place);
    }
}

void Runner::read_late_report(Judged &judged, const Plan &plan)
{
    const std::size_t number = judged.target.element;
    if (!is_item(plan, number, item(judged.place).name) || !bears_mark(plan, judged.target)) {
        return;
    }
    const auto is_same = [&](const Active &active) {
        return active.place.suite == judged.place.suite && active.place.item == judged.place.item;
    };
    if (std::ranges::any_of(active_, is_same)) {
        plan_status_ = {}; // its end is told first: look again then
        return;
    }
    const ItemReport report = plan.report(number);
    const bool has_reported = report.result || report.result_without_value;
    if (!has_reported || as_made_loadable(report) == as_made_loadable(judged.report) ||
        is_earlier(report, judged.report)) {
        return;
    }
    judged.report = report;
    for (Listener *listener : listeners_) {
        listener->late(run_, judged.place, report);
    }
}

} // namespace fptest
