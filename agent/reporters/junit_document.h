// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The pieces of a JUnit XML document. That of a round that is over can be kept as it
// is while the run goes on.
#pragma once

#include "run/results.h"

#include <cstddef>
#include <string>
#include <vector>

namespace fptest
{

struct Tests {
    std::size_t all = 0;
    std::size_t failures = 0;
    std::size_t errors = 0;
    std::size_t skipped = 0;

    Tests &operator+=(const Tests &more);
};

// A late report, in words.
struct Late {
    std::size_t suite = 0;
    std::string text;
};

Tests tests_of_round(const Run &run);

// Up to the first suite.
std::string junit_head(const Run &run, const Tests &before);

// The suites of the round. In each, this character is in the place of what
// junit_state() gives when the document is written.
std::string junit_round(const Run &run, const std::vector<Late> &late);
constexpr char kStateGoesHere = '\0';
std::string junit_state(const Run &run);

// From after the last suite of the round: an error for the rounds that are to come.
std::string junit_tail(const Run &run);

} // namespace fptest
