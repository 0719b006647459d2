// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "figures.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstddef>
#include <cstdio>

namespace bench
{

double median(std::vector<double> values)
{
    std::ranges::sort(values);
    const std::size_t half = values.size() / 2;
    return values.size() % 2 == 1 ? values.at(half) : (values.at(half - 1) + values.at(half)) / 2;
}

double spread(std::vector<double> values)
{
    std::ranges::sort(values);
    const std::size_t quarter = values.size() / 4;
    return (values.at(values.size() - 1 - quarter) - values.at(quarter)) / 2;
}

std::string grouped(long number)
{
    std::string text = std::to_string(number);
    for (std::size_t at = text.size(); at > 3; at -= 3) {
        text.insert(at - 3, ",");
    }
    return text;
}

std::string decimal(double value, int places)
{
    std::array<char, 64> text{};
    std::snprintf(text.data(), text.size(), "%.*f", places, value);
    return text.data();
}

// Three digits that count.
std::string time_text(double seconds)
{
    static constexpr std::array kUnits{"ns", "us", "ms", "s"};
    double value = seconds * 1e9;
    std::size_t unit = 0;

    while (value >= 999.5 && unit + 1 < kUnits.size()) {
        value /= 1000;
        ++unit;
    }
    return decimal(value, value < 9.995 ? 2 : value < 99.95 ? 1 : 0) + " " + kUnits.at(unit);
}

std::string bytes_text(double bytes)
{
    const double kilobytes = bytes / 1024;
    return decimal(kilobytes, kilobytes < 999.5 ? 1 : 0) + " KB";
}

std::string table_line(const std::vector<std::string> &columns, const Widths &widths)
{
    std::string line;

    for (std::size_t at = 0; at < columns.size(); ++at) {
        std::array<char, 128> text{};
        std::snprintf(text.data(), text.size(), "%*s", widths.at(at), columns.at(at).c_str());
        line += text.data();
    }
    return line.substr(0, line.find_last_not_of(' ') + 1) + "\n";
}

std::string heading()
{
    return table_line({"", "module", "floor", "ratio", "+-", "limit", ""});
}

std::string result_line(const std::string &name, const Result &result)
{
    const bool judged = result.limit > 0;
    return table_line({name, time_text(result.module), time_text(result.floor),
                       decimal(result.ratio, 3), decimal(result.spread, 3),
                       judged ? decimal(result.limit, 2) : "-",
                       !judged           ? ""
                       : result.barely() ? "unclear"
                       : result.missed() ? "MISSED"
                                         : "ok"});
}

} // namespace bench
