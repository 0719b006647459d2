// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Reads reports back as other programs do: XML by a parser that accepts nothing
// that is not well-formed, TAP line by line, and TAP by prove.
#pragma once

#include "files.h"
#include "process.h"

#include <cstddef>
#include <iosfwd>
#include <map>
#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <string>
#include <vector>

namespace support
{

// How many items a report tells of. Each of the functions expects that the numbers
// which the report itself has are those of its items.
struct Tally {
    std::size_t passed = 0;
    std::size_t failed = 0;
    std::size_t not_run = 0;

    bool operator==(const Tally &) const = default;
};

void PrintTo(const Tally &tally, std::ostream *stream);

Tally tally_of_json(const std::string &text);
Tally tally_of_junit(const std::string &text);
Tally tally_of_tap(const std::string &text);

// --- XML ---------------------------------------------------------------------

struct Element {
    std::string name;
    std::map<std::string, std::string> attributes;
    std::string text; // right inside
    std::vector<Element> children;

    std::vector<Element> all(const std::string &child) const;
    // The values of a <properties> inside by their names.
    std::map<std::string, std::string> properties() const;
};

// Of a test case: "passed", "skipped", "failure", or what type of error it is.
std::string verdict_of(const Element &test);

// The top element; a test failure and an empty one if it is not well-formed.
Element parse_xml(const std::string &text);

// --- JSON lines --------------------------------------------------------------

// The events; a test failure for a line that is none.
std::vector<nlohmann::json> events_of(const std::string &text);
std::vector<nlohmann::json> events_of(const std::string &text, const std::string &kind);

// "Item: passed" for each end, in their order.
Lines outcomes(const std::string &text);
// Of each end, in their order; empty if it has none.
Lines reasons(const std::string &text);

// --- TAP ---------------------------------------------------------------------

struct Point {
    bool ok = false;
    std::string name;                             // as it was before it was escaped
    std::optional<std::string> skipped;           // the reason
    std::map<std::string, std::string> diagnosis; // keys and values, unquoted
    std::vector<Point> inside;                    // of its subtest
    std::size_t planned = 0;                      // in its subtest
};

struct Tap {
    std::string version;
    std::size_t planned = 0; // by a plan in front or at the end
    std::vector<Point> points;
    std::vector<Point> open;           // those of a subtest that is not closed
    std::vector<std::string> comments; // those of subtests as well
    std::optional<std::string> bail_out;
};

// A test failure for every line that should not be where it is.
Tap parse_tap(const std::string &text);

// What the system's prove makes of a file of TAP.
Ended prove(const std::string &path);

} // namespace support
