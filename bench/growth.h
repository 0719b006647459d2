// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How costs grow with the number of items.
#pragma once

#include "figures.h"

#include <string>
#include <vector>

namespace bench
{

struct Point {
    double items;
    double seconds;
};

struct Curve {
    std::string name;
    std::vector<Point> points;
};

// b of the curve a * items^b that fits best: least squares of the logarithms.
double exponent(const std::vector<Point> &points);

// That of the last two points alone: what small plans cost besides flattens a fit.
double last_exponent(const std::vector<Point> &points);

// The last curve is what all others are judged by: none may grow faster.
Verdict growth_table(const std::vector<Curve> &curves, bool judge);

// The curves on logarithmic axes, as an SVG document.
std::string chart(const std::vector<Curve> &curves);

} // namespace bench
