// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What items measure, as lines of their output say:
//   #measure NAME VALUE [UNIT [LOW HIGH]]
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace fptest
{

struct Measurement {
    std::string name;
    double value = 0;
    std::string unit = {}; // may be empty
    std::optional<double> low = {};
    std::optional<double> high = {};
};

// Follows "#measure" where fptest measure has printed why it refuses one.
inline constexpr char kRefused[] = "refused:";

// The measurement that the words after "#measure" say; nullopt, and why, if they say none.
std::optional<Measurement> measurement_of(const std::vector<std::string> &words, std::string &why);

// Whether it is out of its limits.
bool is_out(const Measurement &one);

// "1.2 V 1.1 1.3", as the line has it
std::string words_of(const Measurement &one);
// "vcore 1.4 V (1.1 to 1.3)"
std::string text_of(const Measurement &one);

// Those of one item. Values of the same name are all kept.
struct Measured {
    static constexpr std::size_t kMost = 256;

    std::vector<Measurement> kept = {};
    std::size_t left_out = 0;   // beyond kMost
    std::size_t not_judged = 0; // beyond a million
    std::size_t out = 0;        // of their limits, also of those left out
    std::string first_out = {};
    std::size_t malformed = 0; // lines
    std::string first_malformed = {};
    bool is_read = true; // all of the output
    bool is_cut = false; // the item has truncated its output
};

// "2 measurements out of limits: vcore 1.4 V (1.1 to 1.3) ..."
std::string what_is_out(const Measured &measured);
// Why limits cannot be judged of all that it measured; empty if they can.
std::string what_is_lost(const Measured &measured);
// What is wrong with its lines; may be empty.
std::string warning_of(const Measured &measured);

// Whether a line of output, without its line feed, says a measurement.
bool is_measurement(std::string_view line);

// Reads an item's output as it comes.
class MeasureReader
{
  public:
    void read(std::string_view text, Measured &measured);
    // Some of the output is left out: what follows may be in the middle of a line.
    void skip();
    // The last line may have no line feed.
    void end(Measured &measured);

  private:
    std::string line_; // from what may be its mark on, as far as it was read
    bool is_at_start_ = true;
    bool is_skipping_ = false; // the rest of a line
};

} // namespace fptest
