// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Reads from the stored plan what items report: while they run, and after they have
// been judged.
#pragma once

#include "common/descriptor.h"
#include "plan/item_report.h"
#include "plan/plan.h"
#include "run/job.h"
#include "run/results.h"

#include <chrono>
#include <cstddef>
#include <optional>
#include <string>
#include <sys/stat.h>
#include <vector>

namespace fptest
{

class ReportReader
{
  public:
    // All of them outlive it.
    ReportReader(Run &run, const std::vector<Reporter *> &reporters, RunningJob &running);

    // What a stored plan says of gatherers before it goes: they may have kept a copy.
    void note_gathered(const std::string &text);

    // Can be read once somebody has saved the plan. What two processes save between two
    // looks seems to be one change, so none is to be missed; where the system does not
    // tell of them, -1.
    int descriptor() const;

    // Reads the plan where it has changed; one that is being written is left for the
    // next time.
    void poll();

    // Reads it, where it is whole.
    void read(const std::optional<Plan> &plan);

    // How long ago the plan changed that poll() read last.
    std::chrono::nanoseconds since_change() const;

    // The gatherer is about to be told: what is there is of an earlier gathering, or how
    // a gatherer that has just been started gets on.
    void begin_gathering();

    // The item has been judged.
    void watch_for_late_reports(RunningItem &active);

    // Watches for late reports of these items no longer. A gatherer is watched across
    // rounds.
    void forget(const Job &job);
    void forget_round();

  private:
    // An item that has been judged, and may be reported still.
    struct Judged {
        Place place;
        std::size_t element = 0;
        bool gathers = false;
        std::string mark;
        int round = 0;
        std::vector<ItemReport> seen; // an old copy of the plan may bring one of them back
    };

    void read_report(RunningItem &active, const Plan &plan);
    void read_late_report(Judged &judged, const Plan &plan);
    bool is_stale(RunningItem &active, const Plan &plan, const ItemReport &report);
    std::vector<std::size_t> elements_to_come() const;
    void mark_again(const std::vector<std::size_t> &numbers);
    void tell_late(const Place &place, bool gathers, int round, const ItemReport &report);
    void note_gathered(const ItemReport &report);
    bool was_gathered(const ItemReport &report) const;

    Run &run_;
    const std::vector<Reporter *> &reporters_;
    RunningJob &running_;
    Descriptor saves_;
    std::vector<Judged> judged_;       // of this round, and gatherers
    std::vector<ItemReport> gathered_; // what an old copy may say of the gatherer
    int gathered_in_ = 0;              // the round of the last gathering
    bool marks_are_gone_ = false;      // from items' elements
    unsigned look_ = 1;
    struct stat plan_status_ {
    };
    std::chrono::nanoseconds changed_{}; // the plan that poll() read, on the clock of files
};

} // namespace fptest
