// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Reads what items report from the stored plan, also after they were judged.
#pragma once

#include "common/descriptor.h"
#include "plan/item_report.h"
#include "plan/plan.h"
#include "run/job.h"
#include "run/results.h"

#include <chrono>
#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <sys/stat.h>
#include <vector>

namespace fptest
{

// As mend_stored_plan() leaves it, but with a result that has no value told from none.
ItemReport report_of(const Plan &plan, std::size_t number);

// mend_stored_plan() leaves an empty description for one without a value.
bool is_same(const ItemReport &one, const ItemReport &other);

class ReportReader
{
  public:
    // All of them outlive it.
    ReportReader(Run &run, const std::vector<Reporter *> &reporters, RunningJob &running);

    // What the plan says before a gatherer's job, or before it is replaced: a gatherer may
    // have a copy.
    void note_gathered(const std::string &text, int vendor);

    // Readable once somebody has saved the plan, so that two changes are not taken for one;
    // -1 if the system does not report them.
    int descriptor() const
    {
        return saves_.get();
    }

    // Reads the plan if it has changed; skips one that is just being written. A plan that is
    // saved all the time leaves time for other things, unless something is decided now.
    enum class When { as_time_allows, at_once };
    void poll(When when = When::as_time_allows);

    // Null if it is not whole.
    void read(const std::shared_ptr<const Plan> &plan);

    // The age of the change that poll() read last.
    std::chrono::nanoseconds since_change() const;

    // The gatherer is about to be triggered: any report so far is of an earlier gathering,
    // or progress of its start.
    void begin_gathering();

    void watch_for_late_reports(RunningItem &active);

    // Stop watching for late reports; forget_round() keeps watching gatherers.
    void forget(const Job &job);
    void forget_round();

  private:
    // An item that may still report after it was judged.
    struct Judged {
        Place place;
        std::size_t element = 0;
        bool gathers = false;
        std::string mark;
        int round = 0;
        std::vector<ItemReport> seen; // an old copy of the plan may bring one of them back
    };

    bool take_saves();
    void read_report(RunningItem &active, const Plan &plan);
    void read_late_report(Judged &judged, const Plan &plan);
    bool is_stale(RunningItem &active, const Plan &plan, const ItemReport &report);
    void report_late(const Place &place, bool gathers, int round, const ItemReport &report);
    void note_gathered(const ItemReport &report);
    bool has_news_of_others(const Plan &plan, std::size_t element) const;
    bool is_saved_as_before(const Plan &plan, std::size_t element) const;

    Run &run_;
    const std::vector<Reporter *> &reporters_;
    RunningJob &running_;
    Descriptor saves_;
    std::vector<Judged> judged_;                 // of this round, and gatherers
    std::vector<ItemReport> gathered_;           // what an old copy may say of gatherers
    bool reports_for_others_ = false;            // the gatherer does
    std::vector<std::vector<ItemReport>> known_; // of each element, when a gatherer's job began
    int gathered_in_ = 0;                        // the round of the last gathering
    bool marks_are_gone_ = false;                // from items' elements
    unsigned poll_count_ = 1;
    bool is_saved_ = false; // and not read since
    std::chrono::steady_clock::time_point next_look_;
    struct stat plan_status_ {
    };
    std::chrono::nanoseconds changed_{}; // of the plan that poll() read, by the file's clock
};

} // namespace fptest
