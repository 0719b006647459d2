// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Runs jobs, watches their items, stops them.
#pragma once

#include "module/library_process.h"
#include "run/item_files.h"
#include "run/job.h"
#include "run/report_reader.h"
#include "run/results.h"
#include "run/signals.h"

#include <chrono>
#include <cstddef>
#include <functional>
#include <optional>
#include <string>
#include <sys/types.h>
#include <utility>
#include <vector>

namespace fptest
{

class Runner
{
  public:
    struct Options {
        std::optional<std::chrono::duration<double>> timeout; // then an item is stopped
        std::chrono::duration<double> grace{2};               // and after that it is killed
        bool fail_on_exit_status = false;
        bool judge_limits = false;                          // of measurements
        std::string files;                                  // a directory; empty for none
        std::optional<std::chrono::duration<double>> limit; // then the run is stopped
        bool ends_gatherer = false;                         // one that runs already
        std::function<void()> on_second_interrupt;          // does not return
    };

    // All of them outlive the runner.
    Runner(LibraryProcess &library, Signals &signals, Run &run,
           const std::vector<Reporter *> &reporters, Options options);

    // What there was before the run: its stored plan, of which a gatherer may have kept a
    // copy, and the gatherer, if it is to be ended.
    void begin(const std::string &earlier_plan);

    // Runs a job and fills in its items. False if the run is over; the run says why.
    bool run(const Job &job);

    bool goes_on();

    // Ends what earlier items left running and would report into this job. To be called
    // before its reports are cleared from the plan.
    void make_way_for(const Job &job);

    // Ends whatever items have left running.
    void end_round();

    // The signal that interrupted the run, or 0.
    int signal() const
    {
        return signal_;
    }
    // Whether the device broke the run off.
    bool broken() const
    {
        return broken_;
    }
    // Ends the run early; the reason is given for all that was not run.
    void give_up(const std::string &why);
    // The same, because of the device.
    void break_off(const std::string &why);

  private:
    using SteadyClock = std::chrono::steady_clock;
    using TimePoint = RunningItem::TimePoint;

    static constexpr std::chrono::milliseconds kTurn{25}; // at most, between two polls
    static constexpr std::size_t kNoElement = static_cast<std::size_t>(-1);

    TimePoint now() const;
    TimePoint on_run_clock(TimePoint time) const; // of a time on the steady clock

    void watch();
    void handle(const LibraryProcess::Event &event);
    void start_next(const LibraryProcess::Event &event);
    void end_item(const LibraryProcess::Event &event);
    void move_on(const LibraryProcess::Event &event);
    void drain_events();
    void lose_library(const LibraryProcess::Event &event);
    void run_command(const Job &job);
    std::vector<std::string> make_directories(const Job &job);
    void settle_directories();
    void require_all_started();
    void require_plan();
    bool restore_plan();
    void poll_gatherers();
    void poll_gatherer(RunningItem &active);
    void read_signals();
    void look_at_limit();
    void stop_items();
    bool is_stopping() const
    {
        return signal_ != 0 || over_limit_;
    }
    void suspend();
    void stop_what_is_due();
    void try_stop(RunningItem &active);
    void stop_gatherer(RunningItem &active);
    void release_command();
    bool is_stuck() const;
    bool starts_no_more() const;
    void end_stop(const LibraryProcess::Event &event);
    void cannot_stop(RunningItem &active);
    std::vector<Leftover> item_processes() const;
    std::vector<Leftover> processes_of(const RunningItem &active);
    bool note_gatherer();
    std::vector<Leftover> gatherer_processes();
    std::vector<Leftover> left_by_gatherer();
    std::vector<Leftover> note_left_running(std::size_t element);
    std::vector<Leftover> left_by_others(const Job &job) const;
    void end_left_running();
    void end_gatherer();
    template <typename Find> void end_all(const Find &find);
    void finish(RunningItem &active, TimePoint end);
    void notify_ended();
    void take_output(off_t end, TimePoint until = TimePoint::max());
    void take_output(TimePoint until = TimePoint::max());
    void drop_output();
    void notify_end_of(Place place);
    void tick();

    LibraryProcess &library_;
    Signals &signals_;
    Run &run_;
    const std::vector<Reporter *> &reporters_;
    Options options_;
    RunningJob running_;
    ReportReader reader_;
    ItemFiles files_;
    std::vector<std::pair<std::size_t, Leftover>> left_; // in this round, by an element's item
    std::vector<Leftover> gatherers_;                    // also helpers that outlive the gatherer
    SteadyClock::duration suspended_{};
    TimePoint last_suspension_;
    SteadyClock::duration last_suspended_{};
    TimePoint began_ = now();
    TimePoint heard_of_at_ = began_; // the library
    int vendor_ = run_.vendor;       // which the library read for its last item
    int signal_ = 0;
    TimePoint signal_taken_at_;
    bool over_limit_ = false;
    TimePoint stopping_since_;              // a signal, or the limit
    bool stop_asked_ = false;               // and not yet answered
    bool has_signalled_ = false;            // processes that may have been reporting
    bool gatherer_runs_ = false;            // before the job's next item
    bool gatherer_may_report_late_ = false; // it was triggered and has not reported
    std::string library_gone_;              // why, if its process ended in this job
    bool missed_gatherer_ = false;          // the command is run once more to start one
    bool broken_ = false;
};

} // namespace fptest
