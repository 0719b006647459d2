// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Runs what is to be run, watches it, stops it.
#pragma once

#include "host.h"
#include "plan.h"
#include "results.h"

#include <chrono>
#include <cstddef>
#include <deque>
#include <optional>
#include <string>
#include <sys/stat.h>
#include <vector>

namespace fptest
{

// SIGINT, SIGTERM and SIGHUP of this process, as something to wait for.
class Signals
{
  public:
    Signals();
    int descriptor() const;
    // The number of one that has come; 0 where none has.
    int take();

  private:
    Descriptor descriptor_;
};

// "Ctrl-C", "SIGTERM"
std::string signal_name(int signal);

// One command and the items that the module comes to in it.
struct Job {
    struct Target {
        std::size_t item = 0;    // in the suite
        std::size_t element = 0; // in the plan
        std::string mark;        // that its element bears; empty for none
    };

    std::string path;
    std::size_t suite = 0;
    // nothing where the module comes to what it cannot run
    std::vector<std::optional<Target>> targets;
};

class Runner
{
  public:
    struct Limits {
        std::optional<std::chrono::duration<double>> item; // then it is stopped
        std::chrono::duration<double> grace{2};            // and after that it is killed
        bool exit_status = false; // an item whose exit status is not 0 has failed
    };

    // All of them outlive the runner.
    Runner(Host &host, Signals &signals, Run &run, const std::vector<Listener *> &listeners,
           const Limits &limits);

    // Runs one job after another and fills in the run. False where the run has
    // come to its end: the run then says why.
    bool run(const Job &job);

    // The signal that interrupted the run; 0 where none has.
    int signal() const
    {
        return signal_;
    }
    // Whether the run ended because the device is not as it should be.
    bool broken() const
    {
        return broken_;
    }
    // What to do about it, to be said behind why the run is unfinished.
    const std::string &advice() const
    {
        return advice_;
    }
    // Ends the run early: what was not run stays so, for this reason.
    void give_up(const std::string &why);

  private:
    using Clock = std::chrono::steady_clock;

    // An item from its start until its end has been told.
    struct Active {
        Place place;
        Job::Target target;
        Clock::time_point start;
        bool moved_on = false; // the module has: only a gatherer is still at work then
        Clock::time_point moved_on_at;
        bool done = false;
        std::optional<Outcome> stop; // timed_out or stopped, once that is wanted
        bool was_stopped = false;    // a stop has met it
        bool overwritten = false;    // its element bears another mark
        Clock::time_point stop_wanted_at;
        Clock::time_point stop_tried_at;
    };

    void watch(bool command_runs);
    void handle(const Host::Event &event, const Job &job, std::size_t &next, bool &runs);
    void start_next(const Job &job, std::size_t &next, const Host::Event &event);
    void move_on(const Host::Event &event);
    void require_all_started(const Job &job, std::size_t next);
    void require_plan();
    void look();
    void read_reports(const std::string &text);
    void read_signals();
    void stop_what_is_due(bool command_runs);
    void press_stop(Active &active, bool command_runs);
    void cannot_stop(Active &active);
    void finish(Active &active, Clock::time_point end = Clock::now());
    void judge(const Active &active);
    std::string why_silent(const Active &active);
    void tell_ended();
    void tick();

    ItemRun &item(const Place &place);
    bool gathers(const Active &active);

    Host &host_;
    Signals &signals_;
    Run &run_;
    const std::vector<Listener *> &listeners_;
    Limits limits_;
    std::deque<Active> active_;
    struct stat plan_status_ {
    };
    Clock::time_point began_ = Clock::now();
    int signal_ = 0;
    bool stop_asked_ = false; // and not yet answered
    bool broken_ = false;
    std::string advice_;
};

} // namespace fptest
