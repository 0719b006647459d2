// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "growth.h"

#include "figures.h"

#include <algorithm>
#include <cmath>
#include <cstddef>

namespace bench
{
namespace
{

constexpr Widths kWidths{-25, 8, 8, 8, 8, 6, 6, 7};

// By how much the exponents of linear growth may differ: where large plans leave
// the caches depends on what else is there, most of all between two points.
constexpr double kFit = 0.05;
constexpr double kLastFit = 0.15;

// Least squares of the logarithms, of the points from the given one on.
double fitted(const Curve &curve, std::size_t from)
{
    const auto count = static_cast<double>(curve.points.size() - from);
    double x = 0;
    double y = 0;
    double xx = 0;
    double xy = 0;
    for (std::size_t at = from; at < curve.points.size(); ++at) {
        const double items = std::log(curve.points[at].first);
        const double seconds = std::log(curve.points[at].second);
        x += items;
        y += seconds;
        xx += items * items;
        xy += items * seconds;
    }
    return (count * xy - x * y) / (count * xx - x * x);
}

void print_curve(const Curve &curve, const std::string &judgement)
{
    std::vector<std::string> columns{curve.name};
    for (const auto &[items, seconds] : curve.points) {
        columns.push_back(time_text(seconds));
    }
    columns.resize(5);
    columns.push_back(decimal(exponent(curve), 2));
    columns.push_back(decimal(last_exponent(curve), 2));
    columns.push_back(judgement);
    print(columns, kWidths);
}

} // namespace

double exponent(const Curve &curve)
{
    return fitted(curve, 0);
}

double last_exponent(const Curve &curve)
{
    return fitted(curve, curve.points.size() - 2);
}

void print_growth(const std::vector<Curve> &curves, const Curve &search, bool judge)
{
    // a search takes a step for each item: measured below that, it was lucky
    const double limit = std::max(exponent(search), 1.0) + kFit;
    const double last_limit = std::max(last_exponent(search), 1.0) + kLastFit;

    print({"growth, for one", "10", "100", "1,000", "10,000", "x^", "last^"}, kWidths);
    for (const Curve &curve : curves) {
        const std::string fit = verdict(exponent(curve), judge ? limit : 0);
        const std::string last_fit = verdict(last_exponent(curve), judge ? last_limit : 0);
        print_curve(curve, fit == "ok" ? last_fit : fit);
    }
    print_curve(search, "");
    if (judge) {
        print({"limits, as of a search", "", "", "", "", decimal(limit, 2), decimal(last_limit, 2)},
              kWidths);
    }
    print({"x is the number of items; x^ is fitted to all, last^ to the last two."});
}

} // namespace bench
