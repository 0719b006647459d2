// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The pieces of a JUnit XML document. A finished round's piece can be kept unchanged
// while the run goes on.
#pragma once

#include "run/results.h"

#include <cstddef>
#include <string>
#include <vector>

namespace fptest
{

struct TestCounts {
    std::size_t all = 0;
    std::size_t failures = 0;
    std::size_t errors = 0;
    std::size_t skipped = 0;

    TestCounts &operator+=(const TestCounts &more);
};

// A late report, in words.
struct LateReport {
    std::size_t suite = 0;
    std::string text;
};

TestCounts tests_of_round(const Run &run);

// Up to the first suite.
std::string junit_head(const Run &run, const TestCounts &before);

// The suites of the round. In each, this character stands for what junit_state() gives
// when the document is written.
std::string junit_round(const Run &run, const std::vector<LateReport> &late);
constexpr char kStateGoesHere = '\0';
std::string junit_state(const Run &run);

// From after the round's last suite: an error for the rounds to come.
std::string junit_tail(const Run &run);

} // namespace fptest
