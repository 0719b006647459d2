// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "util/times.h"

#include <algorithm>
#include <cmath>
#include <fmt/core.h>

namespace fptest
{

std::string duration(double seconds)
{
    // more than centuries is an error
    const double sane = seconds > 0 ? std::min(seconds, 1e10) : 0;
    const long long tenths = std::llround(sane * 10);
    if (tenths < 600) {
        return fmt::format("{}.{} s", tenths / 10, tenths % 10);
    }
    const long long whole = std::llround(sane);
    const long long minutes = whole / 60;
    return minutes < 60 ? fmt::format("{}:{:02}", minutes, whole % 60)
                        : fmt::format("{}:{:02}:{:02}", minutes / 60, minutes % 60, whole % 60);
}

std::string fine_duration(double seconds)
{
    return seconds < 9.9995 ? fmt::format("{:.3f} s", std::max(seconds, 0.0)) : duration(seconds);
}

std::string timestamp(std::chrono::system_clock::time_point time)
{
    using namespace std::chrono;
    const auto day = floor<days>(time);
    const year_month_day date(day);
    const hh_mm_ss clock(floor<milliseconds>(time - day));
    return fmt::format("{:04}-{:02}-{:02}T{:02}:{:02}:{:02}.{:03}Z", static_cast<int>(date.year()),
                       static_cast<unsigned>(date.month()), static_cast<unsigned>(date.day()),
                       clock.hours().count(), clock.minutes().count(), clock.seconds().count(),
                       clock.subseconds().count());
}

} // namespace fptest
