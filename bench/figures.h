// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Figures as people read them, at 80 columns.
#pragma once

#include <array>
#include <chrono>
#include <string>
#include <vector>

namespace bench
{

double median(std::vector<double> values);
// Half of what the middle half of the values spans.
double spread(std::vector<double> values);

template <typename Job> double seconds_of(Job job)
{
    const auto start = std::chrono::steady_clock::now();
    job();
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

// 1000 as 1,000
std::string grouped(long number);
std::string time_text(double seconds);
std::string bytes_text(double bytes);
std::string decimal(double value, int places);

// The library prints a line for each item. So that it is not among the figures,
// standard output goes nowhere from now on, and the figures go where that went.
void set_library_output_aside();

// Prints a line. A column's width is negative if its text is aligned left.
using Widths = std::array<int, 8>;
inline constexpr Widths kCaseWidths{-27, 9, 9, 8, 8, 7, 8};
void print(const std::vector<std::string> &columns, const Widths &widths = kCaseWidths);

// What a limit makes of a figure: "ok", "MISSED", or "unclear" if the figure varies by
// more than it is too high; nothing if there is no limit (0).
std::string verdict(double figure, double limit, double spread = 0);
// Whether any verdict was that a limit is missed.
bool is_a_limit_missed();

} // namespace bench
