// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The words that all reporters use for a run. Each text is one clean line, unless
// stated otherwise.
#pragma once

#include "run/results.h"

#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace fptest
{

// "plans/demo.xml: 4 items, vendor 0, 3 rounds"
std::string heading(const Run &run);

// The labels, and below them versions and the plan's digest; each with its name.
std::vector<std::pair<std::string, std::string>> named_identity(const Run &run);

// "shuffled with seed 42"
std::string by_seed(const Run &run);

// "3 passed, 1 failed, 2 to go, 12.0 s"
std::string total(const Run &run);
// Its parts: "3 passed" and "1 failed"; ", 2 to go, 12.0 s".
std::pair<std::string, std::string> tally(const Counts &counts);
std::string rest_of_total(const Run &run);
// ", 1 flaky, 2 retries, 1 failed as expected", as far as the run has such.
std::string tally_of_others(const Run &run);

// "not finished: interrupted", "ended: G/X did not pass"; empty if that is not so.
std::string not_finished(const Run &run);
std::string ended_early(const Run &run);

// "exit status 5", "died by SIGSEGV"; empty if it ended with 0, or by the signal that
// stopped it.
std::string how_it_ended(const ItemRun &item);

// "sh (pid 812), logcat (pid 815)", with the names as they are; empty if nothing is left.
std::string left_running(const ItemRun &item);
// What a view says below an ended item's line: what it left running, measured and left in
// files, and warnings.
struct Note {
    std::string text;
    bool is_bad = false;
};
std::vector<Note> notes(const ItemRun &item);

// "?" for a result without a value, "-" for none.
std::string result_of(const ItemReport &report);

// ", result 0"; empty if none was reported.
std::string reported_result(const ItemReport &report);

// "attempt 2 of 3"; empty without retries.
std::string attempt_of(const Run &run, const ItemRun &item);

// The item's description, the reason for its outcome, or both.
std::string remark(const ItemRun &item);

// "G/X: late report, result 0: TEXT; it changes nothing"
std::string late_report(const Run &run, Place place, const ItemReport &report);

// The last lines that an item printed, long ones cut.
std::vector<std::string> last_lines(std::string_view output);
// Without its measurements, which are notes.
std::vector<std::string> last_lines(const ItemRun &item);

// Each item over its rounds, in lines of at most 80 columns, under a line of
// headings. Empty after a single round.
std::vector<std::string> summary_table(const Run &run);

} // namespace fptest
