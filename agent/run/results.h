// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What a run is to do and what has become of it: filled in by the runner, read
// by everything that shows or writes results.
#pragma once

#include "module/processes.h"
#include "plan/item_report.h"
#include "util/times.h"

#include <chrono>
#include <cstddef>
#include <optional>
#include <string>
#include <vector>

namespace fptest
{

enum class Outcome {
    not_run,   // and nothing was started of it
    passed,    // it reported the code that means so
    failed,    // it reported another one
    no_result, // it ended and has reported no result
    timed_out, // it took too long, however it ended
    stopped,   // it was stopped because the run was
};

// One item of a run.
struct ItemRun {
    std::string group; // as the test plan names it
    std::string name;
    Outcome outcome = Outcome::not_run;
    ItemReport report;
    std::string reason; // in words, where it has been run and has not passed; may be empty
    std::optional<std::chrono::system_clock::time_point> start;
    std::optional<double> seconds; // how long it ran, once it has ended
    std::string output;            // what it printed: the end of it, where that is long
    double running = 0;            // seconds so far, while it runs; a paused run does not count
    bool stopping = false;         // it runs, and is being stopped
    // How its process ended: at most one of both, none of the gatherer's and of what
    // was not started.
    std::optional<int> exit_status = std::nullopt;
    int signal = 0;
    bool overruled = false; // it failed whatever it reported, as the reason says
    std::vector<Leftover> left_running = {};
};

// Items that are run in a row and belong to one group.
struct Suite {
    std::string group;
    std::vector<ItemRun> items;
};

struct Counts {
    std::size_t passed = 0;
    std::size_t failed = 0; // also no result, timed out and stopped
    std::size_t not_run = 0;

    std::size_t all() const
    {
        return passed + failed + not_run;
    }
    Counts &operator+=(const Counts &more)
    {
        passed += more.passed;
        failed += more.failed;
        not_run += more.not_run;
        return *this;
    }
};

// One item over the rounds that have been run.
struct Summary {
    std::string group;
    std::string name;
    std::size_t passed = 0;
    Times times; // of each time that it was run
};

// Holds one round, whatever their number.
struct Run {
    std::string plan; // the file that the plan came from
    int round = 1;
    std::optional<int> rounds = 1;    // at most; nothing where their number ends no run
    std::optional<double> time_limit; // in seconds: no round begins after that
    bool until_fail = false;          // it ends with the first item that does not pass
    int pass_code = 0;
    int vendor = 0;
    std::vector<Suite> suites;    // of the round
    Counts before;                // of the rounds before it
    std::vector<Summary> summary; // in the order of the items, once a round is over
    std::chrono::system_clock::time_point start;
    double seconds = 0;         // since the start, when last looked at
    bool finished = false;      // all that was asked for has been done
    std::string why_unfinished; // once it has ended without that
    std::string why_ended;      // once it has ended within a round, as was asked for
};

// Where in a run something happened.
struct Place {
    std::size_t suite = 0;
    std::size_t item = 0;

    bool operator==(const Place &) const = default;
};

ItemRun &item_at(Run &run, Place place);
const ItemRun &item_at(const Run &run, Place place);

Counts count(const std::vector<ItemRun> &items);
// Of all rounds. What is left of this round, and those to come, are not run.
Counts count(const Run &run);

bool has_ended(const Run &run);
// Why some of its items have not been run: nothing while it goes on.
const std::string &why_not_all(const Run &run);

// Whether it is, or was to be, of more than one round.
bool has_rounds(const Run &run);
// Whether the number of rounds was known when it began.
bool has_fixed_rounds(const Run &run);
// The rounds that have not begun, as far as their number is known; those of a run
// that has finished have not been asked for.
std::size_t rounds_to_come(const Run &run);

// Counts the round that is over in the summary.
void summarize(Run &run);

// "passed", "failed", "no result", "timed out", "stopped", "not run"
const char *word(Outcome outcome);

// "SIGSEGV", "signal 40"
std::string name_of_signal(int signal);

// " (round 2)" if there is more than one.
std::string of_round(const Run &run);

// "Bringup", or "Bringup (round 2)"
std::string title(const Run &run, const Suite &suite);
// "Bringup/SpiCheck", or "Bringup/SpiCheck (round 2)"
std::string title(const Run &run, const ItemRun &item);

// Gets told what happens, in this order: begin, then for each item started, any
// number of progressed, ended; round_over between one round and the next; then
// finish, also where items were not run. What is told is already in the run. None
// may wait for its reader.
class Reporter
{
  public:
    Reporter() = default;
    Reporter(const Reporter &) = delete;
    Reporter &operator=(const Reporter &) = delete;
    virtual ~Reporter() = default;

    virtual void begin(const Run &run) = 0;
    virtual void started(const Run &run, Place place) = 0;
    virtual void ended(const Run &run, Place place) = 0;
    virtual void finish(const Run &run) = 0;

    virtual void progressed(const Run & /* run */, Place /* place */)
    {
    }

    // All of a round has ended, and another one follows: the run still holds what is
    // over.
    virtual void round_over(const Run & /* run */)
    {
    }

    // An item that had ended already has reported: that changes no outcome, and the
    // item keeps the report that it was judged by.
    virtual void late(const Run & /* run */, Place /* place */, const ItemReport & /* report */)
    {
    }

    // The run is suspended (Ctrl-Z), and goes on.
    virtual void paused(const Run & /* run */)
    {
    }
    virtual void resumed(const Run & /* run */)
    {
    }

    // Several times a second while the run lasts.
    virtual void tick(const Run & /* run */)
    {
    }

    // Goes on with what waits for its reader, and does not wait for that. Whether
    // all of it is written, or never will be.
    virtual bool flush()
    {
        return true;
    }

    // What keeps it from writing, in words: "out.json: No space left on device";
    // empty while nothing does. A reporter that has failed stays quiet.
    virtual std::string failure() const
    {
        return {};
    }
};

} // namespace fptest
