// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Runs what is to be run, watches it, stops it.
#pragma once

#include "module/library_process.h"
#include "run/job.h"
#include "run/report_reader.h"
#include "run/results.h"
#include "run/signals.h"

#include <chrono>
#include <cstddef>
#include <optional>
#include <string>
#include <vector>

namespace fptest
{

class Runner
{
  public:
    struct Limits {
        std::optional<std::chrono::duration<double>> item; // then it is stopped
        std::chrono::duration<double> grace{2};            // and after that it is killed
        bool exit_status = false; // an item whose exit status is not 0 has failed
    };

    // All of them outlive the runner.
    Runner(LibraryProcess &library, Signals &signals, Run &run,
           const std::vector<Reporter *> &reporters, const Limits &limits);

    // The stored plan before the run: a gatherer may have kept a copy of it.
    void note_earlier_plan(const std::string &text)
    {
        reader_.note_gathered(text);
    }

    // Runs a job and fills in its items. False where the run has come to its end: the run
    // then says why.
    bool run(const Job &job);

    // Whether the run goes on: no signal has come, and nothing has ended it.
    bool goes_on();

    // Before the reports of its items are cleared from the plan: what an earlier
    // run of them left running would report into this one, and is ended.
    void make_way_for(const Job &job);

    // Ends all that items have left running.
    void end_round();

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
    // Ends the run early: what was not run stays so, for this reason.
    void give_up(const std::string &why);
    // The same, as the device is not as it should be.
    void break_off(const std::string &why);

  private:
    using SteadyClock = std::chrono::steady_clock;
    using TimePoint = RunningItem::TimePoint;

    // The gatherer's command returns when the gatherer has been told; its report comes in
    // its own time.
    static constexpr std::chrono::duration<double> kForGathering{10};
    static constexpr std::chrono::milliseconds kTurn{25}; // between two looks at the plan
    static constexpr std::size_t kNoElement = static_cast<std::size_t>(-1);

    TimePoint now() const;
    TimePoint on_run_clock(TimePoint time) const; // of a moment on the steady clock

    void watch();
    void handle(const LibraryProcess::Event &event);
    void start_next(const LibraryProcess::Event &event);
    void end_item(const LibraryProcess::Event &event);
    void move_on(const LibraryProcess::Event &event);
    void drain_events();
    void lose_library(const LibraryProcess::Event &event);
    void require_all_started();
    void require_plan();
    void poll_gatherers();
    void poll_gatherer(RunningItem &active);
    void read_signals();
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
    std::vector<Leftover> processes_of(const RunningItem &active) const;
    std::vector<Leftover> note_left_running(std::size_t element);
    void end_left_running();
    void end_gatherer();
    template <typename Find> void end_all(const Find &find);
    void finish(RunningItem &active, TimePoint end);
    void judge(const RunningItem &active);
    void judge_report(const RunningItem &active);
    std::string why_silent(const RunningItem &active);
    std::string why_stopped(const RunningItem &active);
    void notify_ended();
    void tick();

    LibraryProcess &library_;
    Signals &signals_;
    Run &run_;
    const std::vector<Reporter *> &reporters_;
    Limits limits_;
    RunningJob running_;
    ReportReader reader_;
    std::vector<Leftover> left_;             // by items of this round
    std::vector<std::size_t> left_elements_; // the items' elements
    SteadyClock::duration suspended_{};
    TimePoint last_suspension_;
    SteadyClock::duration last_suspended_{};
    TimePoint began_ = now();
    TimePoint heard_of_at_ = began_; // the library
    int vendor_ = run_.vendor;       // which the library read for the item that it came to last
    int signal_ = 0;
    TimePoint signal_taken_at_;
    bool stop_asked_ = false;               // and not yet answered
    bool gatherer_runs_ = false;            // before the job's next item
    bool gatherer_may_report_late_ = false; // it may still report what it was told in vain
    std::string library_gone_;              // why, in the job in which its process ended
    bool broken_ = false;
};

} // namespace fptest
