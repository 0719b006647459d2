// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What views and reports say of a run, in the same words. The texts are clean and
// of one line, unless it is said otherwise.
#pragma once

#include "run/results.h"

#include <string>
#include <string_view>
#include <vector>

namespace fptest
{

// "plans/demo.xml: 4 items, vendor 0, 3 rounds"
std::string heading(const Run &run);

// "3 passed, 1 failed, 2 to go, 12.0 s"
std::string total(const Run &run);
// What of it comes after the failed ones: ", 2 to go, 12.0 s".
std::string rest_of_total(const Run &run);

// "exit status 5", "died by SIGSEGV"; empty where there is nothing to be said: it
// ended with 0, or by the signal that stopped it.
std::string how_it_ended(const ItemRun &item);

// "sh (pid 812), logcat (pid 815)", as the names are; empty where nothing is left.
std::string left_running(const ItemRun &item);

// "?" for a result without a value, "-" for none.
std::string result_of(const ItemReport &report);

// ", result 0"; empty where none was reported.
std::string reported_result(const ItemReport &report);

// What an item has said of itself, or what there is to say of it.
std::string remark(const ItemRun &item);

// "G/X: late report, result 0: TEXT; it changes nothing"
std::string late_report(const Run &run, Place place, const ItemReport &report);

// The last lines that an item printed, none of them longer than is sensible.
std::vector<std::string> last_lines(std::string_view output);

// Each item over its rounds, in lines of at most 80 columns, the first one the
// heads. Empty where there has been one round alone.
std::vector<std::string> summary_table(const Run &run);

} // namespace fptest
