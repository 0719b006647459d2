// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A command, and how far its items are.
#pragma once

#include "plan/item_report.h"
#include "run/results.h"

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <deque>
#include <optional>
#include <string>
#include <vector>

namespace fptest
{

// One command and the items that the library comes to in it.
struct Job {
    struct Target {
        std::size_t item = 0;    // in the suite
        std::size_t element = 0; // in the plan
    };

    std::string path;
    std::size_t suite = 0;
    // nothing where the library comes to what it cannot run
    std::vector<std::optional<Target>> targets;
    std::string mark = {}; // that their elements bear; empty for none

    // The elements of its targets, from this one on.
    std::vector<std::size_t> elements(std::size_t from = 0) const
    {
        std::vector<std::size_t> all;
        for (std::size_t at = from; at < targets.size(); ++at) {
            if (targets[at]) {
                all.push_back(targets[at]->element);
            }
        }
        return all;
    }
    bool has(std::size_t element) const
    {
        return std::ranges::count(elements(), element) != 0;
    }
};

// An item from its start until its end has been told. It runs; the library moves on, so
// that only a gatherer is still at work; it is done; its end is told, in the order of
// the starts.
struct RunningItem {
    // The time of the run: it stands still while the run is suspended.
    using TimePoint = std::chrono::steady_clock::time_point;

    // How far the stored plan's report of it can be relied on.
    struct Reporting {
        bool expected = true;     // false until a gatherer that already ran is told
        bool overwritten = false; // an old copy of the plan has erased it; none has come since
        bool lost = false;        // the stored plan is gone
        bool undone = false;      // a result was there, and has gone
        bool in_another_plan = false;
        // At which look it has changed last, and another's report; 0 for none.
        unsigned changed_at_poll = 0;
        unsigned other_changed_at_poll = 0;
        bool from_a_copy = false; // the gatherer's own, which has no mark
        // The newest report, where one seen before it has come back since.
        std::optional<ItemReport> taken_back;
        std::vector<ItemReport> seen;

        // Whether others have reported meanwhile, and so saved the plan as they know it.
        bool is_beside_others() const
        {
            return other_changed_at_poll != 0;
        }
        // Whether they may have done so after it, before anybody saw more of it.
        bool is_uncertain() const
        {
            return is_beside_others() && other_changed_at_poll >= changed_at_poll;
        }
        bool is_written_over() const
        {
            return overwritten || undone || (taken_back && is_beside_others());
        }
    };

    Place place;
    std::size_t element = 0;
    bool gathers = false;
    bool starts_gatherer = false; // none was running
    TimePoint start;
    bool moved_on = false; // the library has
    TimePoint moved_on_at;
    bool done = false;
    Reporting reporting;

    std::optional<Outcome> stop; // timed_out or stopped, once that is wanted
    bool meets_other = false;    // the library's stop, not the item
    bool was_stopped = false;    // a stop has met it
    bool killed = false;
    TimePoint stop_wanted_at;
    TimePoint stop_tried_at;

    TimePoint gatherer_looked_for;
    int gatherer_missed = 0; // how many times in a row
    std::string gatherer_end;
};

struct RunningJob {
    Job job;
    bool command_runs = false; // the library has not returned from it
    std::size_t next = 0;      // of its targets
    // The last one is the library's current item, those before it are gatherers.
    std::deque<RunningItem> items;
};

} // namespace fptest
