// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "runner.h"

#include "files.h"
#include "text.h"

#include <algorithm>
#include <arpa/inet.h>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <netinet/in.h>
#include <sys/signalfd.h>
#include <sys/socket.h>
#include <system_error>
#include <thread>
#include <unistd.h>

namespace fptest
{
namespace
{

using namespace std::chrono_literals;
using Seconds = std::chrono::duration<double>;

constexpr auto kTurn = 25ms;
constexpr auto kBetweenStops = 250ms;
// The gatherer's command returns when the gatherer has been told; its report
// comes in its own time.
constexpr Seconds kGathering = 10s;
constexpr auto kBeforeRelease = 300ms;
constexpr auto kBeforeTerm = 2s;
constexpr auto kBeforeGivingUp = 10s;
constexpr std::size_t kOutputKept = std::size_t{64} * 1024;

void append_output(std::string &output, const std::string &text)
{
    output += text;
    if (output.size() > kOutputKept) {
        output.erase(0, output.size() - kOutputKept);
    }
}

// Takes the place of a gatherer that will not come: the module waits for one
// without end, and sends what it has to whoever connects.
void release_trigger()
{
    const Descriptor connection(socket(AF_INET, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0));
    sockaddr_in module{};
    module.sin_family = AF_INET;
    module.sin_port = htons(kTriggerPort);
    module.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    static_cast<void>(
        connect(connection.get(), reinterpret_cast<const sockaddr *>(&module), sizeof module));
    // long enough to be accepted; nothing depends on what is read
    std::this_thread::sleep_for(kTurn);
}

std::string reported(const Report &report)
{
    return report.result_without_value
               ? "reported a result that is none of 0, 1 and -2: the plan has no text for it"
               : "reported the result " + report.result.value_or("");
}

} // namespace

// --- signals ------------------------------------------------------------------

Signals::Signals() : descriptor_(-1)
{
    sigset_t set;
    sigemptyset(&set);
    for (const int signal : {SIGINT, SIGTERM, SIGHUP}) {
        sigaddset(&set, signal);
    }
    sigprocmask(SIG_BLOCK, &set, nullptr);
    descriptor_ = Descriptor(signalfd(-1, &set, SFD_NONBLOCK | SFD_CLOEXEC));
    if (!descriptor_.is_open()) {
        throw std::system_error(errno, std::generic_category(), "signals cannot be received");
    }
}

int Signals::descriptor() const
{
    return descriptor_.get();
}

int Signals::take()
{
    signalfd_siginfo info{};
    const ssize_t got = read(descriptor_.get(), &info, sizeof info);
    return got == static_cast<ssize_t>(sizeof info) ? static_cast<int>(info.ssi_signo) : 0;
}

std::string signal_name(int signal)
{
    switch (signal) {
    case SIGINT:
        return "Ctrl-C";
    case SIGTERM:
        return "SIGTERM";
    default:
        return "SIGHUP";
    }
}

// --- a job --------------------------------------------------------------------

Runner::Runner(Host &host, Signals &signals, Run &run, const std::vector<Listener *> &listeners,
               const Limits &limits)
    : host_(host), signals_(signals), run_(run), listeners_(listeners), limits_(limits)
{
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
    std::vector<std::string> names;
    for (const auto &target : job.targets) {
        if (target) {
            names.push_back(run_.suites[job.suite].items[target->item].name);
        }
    }
    host_.command("XMLNodePath::" + job.path, names);

    std::size_t next = 0;
    bool runs = true;
    while ((runs || !active_.empty()) && !broken_) {
        if (const auto event = host_.wait(kTurn, signals_.descriptor())) {
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
        result.reason = "the module did not come to it: --log FILE tells why";
        for (Listener *listener : listeners_) {
            listener->ended(run_, place);
        }
    }
}

// Without a stored plan nothing that comes can report.
void Runner::require_plan()
{
    for (int tries = 0; tries < 20; ++tries) { // it may just be written
        const std::string text = read_file(kStoredPlan).value_or("");
        if (Plan::read(text) || Plan::load(text)) {
            return;
        }
        std::this_thread::sleep_for(10ms);
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
    case Host::Event::Kind::returned:
        runs = false;
        move_on(event);
        break;
    case Host::Event::Kind::stopped:
        stop_asked_ = false;
        if (event.value == 0 && !active_.empty()) {
            active_.back().was_stopped = true;
        }
        break;
    case Host::Event::Kind::gone:
        broken_ = true;
        give_up("the module's process ended " + event.text);
        advice_ = "; --log FILE keeps what it says";
        host_.end_items();
        if (!active_.empty()) {
            append_output(item(active_.back().place).output, host_.take_output(event.output));
        }
        for (Active &active : active_) {
            finish(active);
        }
        break;
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
    run_.seconds = Seconds(Clock::now() - began_).count();
    const std::string output = host_.take_output();
    if (!active_.empty()) {
        append_output(item(active_.back().place).output, output);
    }
    for (const Active &active : active_) {
        item(active.place).running = Seconds(Clock::now() - active.start).count();
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

bool Runner::gathers(const Active &active)
{
    return is_gatherer(item(active.place).name, run_.vendor);
}

// --- an item's start and end --------------------------------------------------

void Runner::start_next(const Job &job, std::size_t &next, const Host::Event &event)
{
    run_.vendor = event.value;
    const std::size_t at = next++;
    if (at >= job.targets.size() || !job.targets[at]) {
        return;
    }
    Active active;
    active.place = {job.suite, job.targets[at]->item};
    active.target = *job.targets[at];
    active.start = event.time;
    if (signal_ != 0) {
        active.stop = Outcome::stopped;
        active.stop_wanted_at = Clock::now();
    }
    active_.push_back(active);
    item(active.place).start =
        std::chrono::system_clock::now() -
        std::chrono::duration_cast<std::chrono::system_clock::duration>(Clock::now() - event.time);
    for (Listener *listener : listeners_) {
        listener->started(run_, active.place);
    }
}

// The module has gone on to its next item, or has returned.
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
    active.moved_on_at = event.time;

    // an item that has ended leaves a whole plan; a gatherer may be writing still
    std::string text;
    for (int tries = 0; tries < 20; ++tries) {
        text = event.kind == Host::Event::Kind::returned ? host_.read_back()
                                                         : read_file(kStoredPlan).value_or("");
        if (Plan::read(text)) {
            break;
        }
        std::this_thread::sleep_for(10ms);
    }
    read_reports(text);
    if (!gathers(active) || active.was_stopped) {
        finish(active, event.time);
        tell_ended();
    }
}

void Runner::finish(Active &active, Clock::time_point end)
{
    if (active.done) {
        return;
    }
    active.done = true;
    ItemRun &result = item(active.place);
    result.seconds = Seconds(end - active.start).count();
    judge(active);
}

void Runner::judge(const Active &active)
{
    ItemRun &result = item(active.place);
    const Report &report = result.report;
    if (active.stop == Outcome::timed_out && active.was_stopped) {
        result.outcome = Outcome::timed_out;
        result.reason = "stopped after " + duration(limits_.item->count());
    } else if (active.stop == Outcome::stopped && active.was_stopped) {
        result.outcome = Outcome::stopped;
        result.reason = "stopped by " + signal_name(signal_);
    } else if (!report.result && !report.result_without_value) {
        result.outcome = Outcome::silent;
        result.reason = why_silent(active);
    } else if (report.result == std::to_string(run_.pass_code)) {
        result.outcome = Outcome::passed;
    } else {
        result.outcome = Outcome::failed;
        result.reason = reported(report);
    }
}

std::string Runner::why_silent(const Active &active)
{
    const auto suffix = vendor_suffix(run_.vendor);
    if (!suffix) {
        return "vendor " + std::to_string(run_.vendor) + " runs no item";
    }
    const std::string program = program_of(item(active.place).name, *suffix);
    if (is_plain_name(item(active.place).name) && access(program.c_str(), X_OK) != 0) {
        return "there is no program " + one_line(program);
    }
    if (broken_) {
        return run_.why_unfinished;
    }
    if (active.overwritten) {
        return "a process with an old copy of the plan has written it over; what the plan says "
               "now is of an earlier run";
    }
    const std::string text = read_file(kStoredPlan).value_or("");
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
                                 duration(limits_.item.value_or(kGathering).count())
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
    if (!active_.empty() && stat(kStoredPlan, &status) == 0 && S_ISREG(status.st_mode) &&
        (status.st_mtim.tv_sec != plan_status_.st_mtim.tv_sec ||
         status.st_mtim.tv_nsec != plan_status_.st_mtim.tv_nsec ||
         status.st_size != plan_status_.st_size || status.st_ino != plan_status_.st_ino)) {
        const auto text = read_file(kStoredPlan);
        if (text && Plan::read(*text)) {
            plan_status_ = status;
            read_reports(*text);
        }
    }
    for (Active &active : active_) {
        const Report &report = item(active.place).report;
        const auto patience = limits_.item.value_or(kGathering);
        const bool reported = report.progress == "100" && report.result;
        if (active.moved_on && !active.done &&
            (reported || active.was_stopped ||
             (!limits_.item && Clock::now() - active.moved_on_at > patience))) {
            finish(active);
        }
    }
}

void Runner::read_reports(const std::string &text)
{
    const auto plan = Plan::read(text);
    if (!plan) {
        return;
    }
    for (Active &active : active_) {
        ItemRun &result = item(active.place);
        const std::size_t number = active.target.element;
        if (active.done || number >= plan->elements().size()) {
            continue;
        }
        const char *name = mxmlElementGetAttr(plan->elements()[number], "name");
        if (name == nullptr || result.name != name) {
            continue; // another plan
        }
        const std::string &mark = active.target.mark;
        const char *found = mxmlElementGetAttr(plan->elements()[number], kMark);
        active.overwritten = !mark.empty() && (found == nullptr || mark != found);
        if (active.overwritten) {
            continue; // what it says is of an earlier run
        }
        Report report = plan->report(number);
        if (report == result.report) {
            continue;
        }
        result.report = std::move(report);
        for (Listener *listener : listeners_) {
            listener->progressed(run_, active.place);
        }
    }
}

// --- stopping -----------------------------------------------------------------

void Runner::read_signals()
{
    for (int signal = signals_.take(); signal != 0; signal = signals_.take()) {
        if (signal_ != 0) {
            // the reports are as far as they were written; the host's process
            // sees that this one is gone and stops what runs
            std::fputs("\nfptest: left at once; what runs is asked to stop\n", stderr);
            _exit(static_cast<int>(128 + SIGINT));
        }
        signal_ = signal;
        give_up("interrupted by " + signal_name(signal));
        for (Active &active : active_) {
            if (!active.stop) {
                active.stop = Outcome::stopped;
                active.stop_wanted_at = Clock::now();
            }
        }
    }
}

void Runner::stop_what_is_due(bool command_runs)
{
    for (Active &active : active_) {
        if (!active.done && !active.stop && limits_.item &&
            Clock::now() - active.start > *limits_.item) {
            active.stop = Outcome::timed_out;
            active.stop_wanted_at = Clock::now();
        }
    }
    if (!active_.empty() && !active_.back().done && active_.back().stop) {
        press_stop(active_.back(), command_runs);
    }
    // the module stops only what it started last: an earlier gatherer is left alone
    for (Active &active : active_) {
        if (&active != &active_.back() && !active.done && active.stop) {
            active.was_stopped = true;
            finish(active);
        }
    }
}

void Runner::press_stop(Active &active, bool command_runs)
{
    const auto now = Clock::now();
    // one that no stop has met may not have been started yet when that was tried
    if (stop_asked_ || (active.was_stopped && now - active.stop_tried_at < kBetweenStops)) {
        return;
    }
    active.stop_tried_at = now;
    const auto waited = now - active.stop_wanted_at;
    host_.stop(item(active.place).name);
    stop_asked_ = true;
    if (command_runs && gathers(active) && waited > kBeforeRelease) {
        active.was_stopped = true;
        release_trigger();
    } else if (waited > kBeforeGivingUp || (active.moved_on && waited > kBeforeTerm)) {
        cannot_stop(active);
    } else if (waited > kBeforeTerm && host_.end_items()) {
        // its process has a name that the module does not find, as a script's is
        // its shell's
        active.was_stopped = true;
    }
}

void Runner::cannot_stop(Active &active)
{
    if (active.moved_on) { // a gatherer that is gone, or is none of this host
        active.was_stopped = true;
        finish(active);
        return;
    }
    broken_ = true;
    give_up(item(active.place).group + "/" + item(active.place).name +
            " cannot be stopped: it goes on running");
    active.was_stopped = true;
    finish(active);
    item(active.place).reason += ", but it goes on running";
}

} // namespace fptest
