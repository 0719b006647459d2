// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "figures.h"

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <cstdio>
#include <cstring>
#include <stdexcept>
#include <unistd.h>

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

namespace
{

std::FILE *out = stdout;
bool is_missed = false;

} // namespace

void set_library_output_aside()
{
    out = fdopen(dup(STDOUT_FILENO), "w");
    if (out == nullptr || std::freopen("/dev/null", "w", stdout) == nullptr) {
        throw std::runtime_error("standard output cannot be set aside");
    }
}

void print(const std::vector<std::string> &columns, const Widths &widths)
{
    std::string line;

    for (std::size_t at = 0; at < columns.size(); ++at) {
        std::array<char, 128> text{};
        std::snprintf(text.data(), text.size(), "%*s", widths.at(at), columns.at(at).c_str());
        line += text.data();
    }
    line.erase(line.find_last_not_of(' ') + 1);
    if (std::fprintf(out, "%s\n", line.c_str()) < 0 || std::fflush(out) != 0) {
        throw std::runtime_error(std::string("standard output cannot be written: ") +
                                 std::strerror(errno));
    }
}

std::string verdict(double figure, double limit, double spread)
{
    if (limit <= 0) {
        return "";
    }
    if (figure <= limit) {
        return "ok";
    }
    is_missed = true;
    return figure - spread <= limit ? "unclear" : "MISSED";
}

bool is_a_limit_missed()
{
    return is_missed;
}

} // namespace bench
