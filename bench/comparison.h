// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The library against its baseline: the same job done by the bare calls that it
// needs. Both do it turn by turn in one process.
#pragma once

#include <functional>
#include <string>

namespace bench
{

// Seconds for a round that one turn of each side fills. There are seven such
// rounds, the fewest that are judged.
inline constexpr double kLong = 10;

struct Comparison {
    std::string name;
    double limit = 0;      // what the ratio may be at most; 0: it is only shown
    int calls = 1;         // in one turn: as many as can be timed
    double seconds = 0.05; // that a round is to last

    // Once for each side: both are to find the same.
    std::function<void()> prepare = [] {};
    std::function<void()> library;
    std::function<void()> baseline = [] {};
    // Before and after each turn, not timed.
    std::function<void()> start = [] {};
    std::function<void()> clear = [] {};
    // What one call took, if that is not its share of the turn.
    std::function<double()> seconds_for_one = nullptr;
    // What a turn has left behind: the same, whoever's it was.
    std::function<std::string()> outcome = [] { return std::string(); };
};

// Seconds for one call: the median turn of each side.
struct Round {
    double library;
    double baseline;
};

class PairedRun
{
  public:
    // Prepares, and has each side take a turn. Throws std::runtime_error when
    // they differ in what they log or leave behind. pace shortens the rounds.
    PairedRun(Comparison comparison, double pace);

    Round round();

  private:
    Comparison comparison_;
    int turns_ = 1;
    bool baseline_first_ = false;
};

// Prepares, and gives the seconds for one call of the library alone: its median
// turn of so many seconds.
double measure(const Comparison &comparison, double seconds);

} // namespace bench
