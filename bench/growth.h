// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How costs grow with the number of items.
#pragma once

#include <string>
#include <utility>
#include <vector>

namespace bench
{

// Seconds by the number of items.
struct Curve {
    std::string name;
    std::vector<std::pair<double, double>> points;
};

// b of the curve a * items^b that fits best.
double exponent(const Curve &curve);
// That of the last two points alone: what small plans cost besides flattens a fit.
double last_exponent(const Curve &curve);

// No curve may grow faster than the search.
void print_growth(const std::vector<Curve> &curves, const Curve &search, bool judge);

} // namespace bench
