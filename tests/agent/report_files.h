// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Reads reports back as other programs do: XML by a parser that accepts nothing
// that is not well-formed, TAP line by line, and TAP by prove.
#pragma once

#include <cstddef>
#include <map>
#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <string>
#include <vector>

namespace report_files
{

// --- files -------------------------------------------------------------------

// A directory that is gone with this object.
class Directory
{
  public:
    Directory();
    Directory(const Directory &) = delete;
    Directory &operator=(const Directory &) = delete;
    ~Directory();

    std::string path(const std::string &name) const;
    // The names of what stands in it, sorted.
    std::vector<std::string> names() const;

  private:
    std::string path_;
};

std::string read_file(const std::string &path);
void write_file(const std::string &path, const std::string &text);

// Each with its line feed; the last one may lack it.
std::vector<std::string> lines_of(const std::string &text);

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

// The top element; a test failure and an empty one where it is not well-formed.
Element parse_xml(const std::string &text);

// --- JSON lines --------------------------------------------------------------

// The events; a test failure for a line that is none.
std::vector<nlohmann::json> events_of(const std::string &text);
std::vector<nlohmann::json> events_of(const std::string &text, const std::string &kind);

// "Item: passed" for each end, in their order.
std::vector<std::string> outcomes(const std::string &text);

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

struct Finished {
    int status = 0; // 128 and more for a signal
    std::string output;
};

// What the system's prove makes of a file of TAP.
Finished prove(const std::string &path);

} // namespace report_files
