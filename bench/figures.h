// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Figures as people read them, at 80 columns.
#pragma once

#include <array>
#include <string>
#include <vector>

namespace bench
{

// The outcome of a contest: seconds for one call, medians over the rounds.
struct Result {
    double module = 0;
    double floor = 0;
    double ratio = 0;  // the median round's
    double spread = 0; // half of what the middle half of the rounds spans
    double limit = 0;  // of the ratio; 0: none

    [[nodiscard]] bool missed() const
    {
        return limit > 0 && ratio > limit;
    }
    // No more than the rounds differ among themselves.
    [[nodiscard]] bool barely() const
    {
        return missed() && ratio - spread <= limit;
    }
};

// A table, and whether a limit is missed in it.
struct Verdict {
    std::string table;
    bool missed = false;
};

double median(std::vector<double> values);
// Half of what the middle half of the values spans.
double spread(std::vector<double> values);

// 1000 as 1,000
std::string grouped(long number);
std::string time_text(double seconds);
std::string bytes_text(double bytes);
std::string decimal(double value, int places);

// A printed line. A column's width is negative where its text stands left.
using Widths = std::array<int, 8>;
inline constexpr Widths kCaseWidths{-27, 9, 9, 8, 8, 7, 8};
std::string table_line(const std::vector<std::string> &columns, const Widths &widths = kCaseWidths);

std::string heading();
std::string result_line(const std::string &name, const Result &result);

} // namespace bench
