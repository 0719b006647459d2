// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The library against its floor: the same job done by the bare calls that it
// needs. Both do it turn by turn in one process.
#pragma once

#include <memory>
#include <string>
#include <vector>

namespace bench
{

// Seconds for a round that one turn of each side fills. There are seven such
// rounds, the fewest that are judged.
inline constexpr double kLong = 10;

class Contest
{
  public:
    // limit  what the ratio may be at most; 0: it is only shown
    // calls  in one turn: as many as can be timed
    // round  how long a round is to last, in seconds
    Contest(std::string name, double limit, int calls, double round)
        : name_(std::move(name)), limit_(limit), calls_(calls), round_(round)
    {
    }
    virtual ~Contest() = default;
    Contest(const Contest &) = delete;
    Contest &operator=(const Contest &) = delete;

    [[nodiscard]] const std::string &name() const
    {
        return name_;
    }
    [[nodiscard]] double limit() const
    {
        return limit_;
    }
    [[nodiscard]] int calls() const
    {
        return calls_;
    }
    [[nodiscard]] double round() const
    {
        return round_;
    }

    // Once for each side: both are to find the same.
    virtual void prepare()
    {
    }
    // Before each turn that is timed.
    virtual void start()
    {
    }
    virtual void module(int calls) = 0;
    virtual void floor(int calls) = 0;
    // After each turn, not timed.
    virtual void clear()
    {
    }
    // What one call took, of a turn that took so many seconds.
    virtual double for_one(double turn)
    {
        return turn / calls_;
    }
    // What a turn has left behind: the same, whoever's it was.
    virtual std::string outcome()
    {
        return {};
    }

  private:
    std::string name_;
    double limit_;
    int calls_;
    double round_;
};

using Contests = std::vector<std::unique_ptr<Contest>>;

enum class Side { module, floor };

// Seconds for one call: the median turn of each side.
struct Round {
    double module;
    double floor;
};

class Match
{
  public:
    // Prepares, and has each side take a turn. Throws std::runtime_error when
    // they differ in what they log or leave behind.
    Match(Contest &contest, double pace);

    Round round();

  private:
    Contest &contest_;
    int turns_ = 1;
    Side first_ = Side::module;
};

// Seconds for one call of the library alone: the median turn of so many seconds.
double alone(Contest &contest, double seconds);

} // namespace bench
