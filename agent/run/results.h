// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A run and its results: the runner fills them in, reporters show or write them.
#pragma once

#include "module/leftover.h"
#include "plan/item_report.h"
#include "run/measurements.h"
#include "util/duration_stats.h"

#include <chrono>
#include <cstddef>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace fptest
{

enum class Outcome {
    not_run,
    passed,     // it reported the pass code
    failed,     // it reported another code
    no_result,  // it ended without reporting a result
    timed_out,  // it took too long
    stopped,    // with the run
    flaky,      // it passed when it was tried again
    expected,   // it did not pass, which was known before
    unexpected, // it passed, though it was known to fail
};

// With the time at which it was seen.
struct TimedReport : ItemReport {
    std::chrono::system_clock::time_point time;
};

// One item of a run.
struct ItemRun {
    std::string group; // as the test plan names it
    std::string name;
    Outcome outcome = Outcome::not_run;
    ItemReport report;
    std::string reason; // why it did not pass, on one line; may be empty
    std::optional<std::chrono::system_clock::time_point> start;
    std::optional<double> seconds; // how long it ran, once it has ended
    std::string output;            // what it printed, or the end of it
    double running = 0;            // seconds so far, while it runs; a paused run does not count
    bool stopping = false;         // it still runs, and is being stopped
    // How its process ended: neither is set for a gatherer, or if nothing was started.
    std::optional<int> exit_status = std::nullopt;
    int signal = 0;
    bool overruled = false; // it failed whatever it reported; see the reason
    std::vector<Leftover> left_running = {};
    Measured measured = {};
    std::string directory = {};          // for its files; empty if there is none
    std::vector<std::string> files = {}; // that it has left there, by their paths below it
    std::string warning = {};            // about its measurements or files
    std::string expected = {};           // why it is known to fail; empty if it is not
    std::vector<ItemRun> earlier = {};   // attempts, which did not pass
};

// Whether the run is none the worse for it: it passed, if not at once, or failed as expected.
bool is_success(Outcome outcome);
// It is to be tried again: what it has been becomes an earlier attempt. If the run ends before
// that, it has not been run.
void begin_attempt(ItemRun &item);

// Items of one group that run in a row.
struct Suite {
    std::string group;
    std::vector<ItemRun> items;
};

struct Counts {
    std::size_t passed = 0;
    std::size_t failed = 0; // also no result, timed out, stopped and unexpected
    std::size_t not_run = 0;
    std::size_t flaky = 0;
    std::size_t expected = 0;
    std::size_t retries = 0; // attempts beside those

    std::size_t all() const
    {
        return passed + failed + not_run + flaky + expected;
    }
    bool has_failures() const
    {
        return failed + not_run > 0;
    }
    Counts &operator+=(const Counts &more)
    {
        passed += more.passed;
        failed += more.failed;
        not_run += more.not_run;
        flaky += more.flaky;
        expected += more.expected;
        retries += more.retries;
        return *this;
    }
};

// One item over the rounds that have been run.
struct Summary {
    std::string group;
    std::string name;
    std::size_t passed = 0;
    DurationStats times; // of each attempt
};

// Whose results these are.
struct Identity {
    std::vector<std::pair<std::string, std::string>> labels; // "device" is one
    std::string library;                                     // its version
    std::string plan_digest;                                 // whatever was reported into it
};

// Holds the current round only.
struct Run {
    std::string plan; // the file that the plan came from
    Identity identity;
    int round = 1;
    std::optional<int> rounds = 1;    // at most; nullopt for no limit
    std::optional<double> time_limit; // seconds after which no round begins
    bool until_fail = false;          // end with the first item that does not pass
    std::optional<int> stop_after;    // so many that did not pass
    std::optional<double> limit;      // seconds after which the run is stopped
    std::optional<int> seed;          // of the order
    int retries = 0;                  // of an item that does not pass
    bool has_expectations = false;    // of failures
    std::string resumed;              // the results of the run that this one completes
    int pass_code = 0;
    int vendor = 0;
    std::vector<Suite> suites;    // of the round
    Counts before;                // of the rounds before it
    std::vector<Summary> summary; // of each item; empty until a round is over
    std::chrono::system_clock::time_point start;
    double seconds = 0;         // since the start, at the last tick
    double seconds_before = 0;  // of the run that it completes
    bool finished = false;      // everything that was asked for ran
    std::string why_unfinished; // otherwise, once it has ended
    std::string why_ended;      // if it finished within a round
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
// Of all rounds, those to come included.
Counts count(const Run &run);

bool has_ended(const Run &run);
// Why some of its items did not run; empty while it goes on.
const std::string &why_not_all(const Run &run);

// Whether more than one round was asked for.
bool has_rounds(const Run &run);
// Whether the number of rounds was known when it began.
bool has_fixed_rounds(const Run &run);
// The rounds that have not begun, if their number is known; none once the run has finished.
std::size_t rounds_to_come(const Run &run);

// Adds the current round to the summary.
void summarize(Run &run);

// "passed", "failed", "no result", "timed out", "stopped", "not run", "flaky",
// "expected", "unexpected"
const char *word(Outcome outcome);

// "SIGSEGV", "signal 40"
std::string name_of_signal(int signal);

// " (round 2)" if there are several.
std::string of_round(const Run &run);

// "Bringup", or "Bringup (round 2)"
std::string title(const Run &run, const Suite &suite);
// "Bringup/SpiCheck", or "Bringup/SpiCheck (round 2)"
std::string title(const Run &run, const ItemRun &item);

// Is called in this order: begin; for each item started, any number of progressed, ended, or
// retried and all of that again;
// round_over between two rounds; finish, even if items did not run. The run is up to date at
// each call. No call may wait long for the reader of what the reporter writes.
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

    // In the place of ended: the item will be started again.
    virtual void retried(const Run & /* run */, Place /* place */)
    {
    }

    // Another round follows; the run still holds the one that is over.
    virtual void round_over(const Run & /* run */)
    {
    }

    // An item reported after it was judged. Its outcome and its report in the run stay.
    virtual void late(const Run & /* run */, Place /* place */, const TimedReport & /* report */)
    {
    }

    // Ctrl-Z suspends the run, and it goes on.
    virtual void paused(const Run & /* run */)
    {
    }
    virtual void resumed(const Run & /* run */)
    {
    }

    // Several times a second during the run.
    virtual void tick(const Run & /* run */)
    {
    }

    // Writes as much as the reader takes. True once all is written, or never will be.
    virtual bool flush()
    {
        return true;
    }

    // Why it cannot write, as in "out.json: No space left on device", or empty. A reporter
    // that has failed writes no more.
    virtual std::string failure() const
    {
        return {};
    }

    bool is_needed = true; // the run has failed where it does
};

} // namespace fptest
