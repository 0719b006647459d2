// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A command, and the state of its items.
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

// One command and the items that the library reaches in it.
struct Job {
    struct Target {
        std::size_t item = 0;    // in the suite
        std::size_t element = 0; // in the plan
    };

    std::string path;
    std::size_t suite = 0;
    // nullopt for an element that the library cannot run
    std::vector<std::optional<Target>> targets;
    std::string mark = {}; // of the targets' elements in the stored plan; may be empty

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

// An item from its start until reporters hear of its end. Its states: it runs; the library
// has moved on, and only a gatherer still works; it is done, but one that started earlier
// is not, and ends are announced in the order of the starts.
struct RunningItem {
    // On the run's clock, which stands still while the run is suspended.
    using TimePoint = std::chrono::steady_clock::time_point;

    // How far its report in the stored plan can be trusted.
    struct Reporting {
        bool expected = true;     // false until a gatherer that already ran is triggered
        bool gathering = false;   // since a gatherer's trigger
        bool overwritten = false; // by an old copy of the plan, and nothing was reported since
        bool lost = false;        // the stored plan is gone
        bool undone = false;      // a result was there, and is gone
        bool in_another_plan = false;
        // The last polls at which its report, and another item's, changed; 0 for none.
        unsigned changed_at_poll = 0;
        unsigned other_changed_at_poll = 0;
        bool from_a_copy = false; // that the gatherer keeps, without the mark
        // Its newest report, if an older one has replaced it.
        std::optional<ItemReport> taken_back;
        std::vector<ItemReport> seen;

        // Whether others have saved the plan meanwhile, from their own copies.
        bool is_beside_others() const
        {
            return other_changed_at_poll != 0;
        }
        // Whether that may have undone a report of it that nobody saw.
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
    MeasureReader measuring;

    std::optional<Outcome> stop; // timed_out or stopped, once it has to stop
    bool meets_other = false;    // the library's stop hits another process
    bool was_stopped = false;    // a stop or signal has reached it
    bool killed = false;
    bool goes_on = false; // though it was killed
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
    // The last one is the library's current item; those before it are gatherers.
    std::deque<RunningItem> items;
};

} // namespace fptest
