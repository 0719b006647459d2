// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Test plans of any size, and how the library gets them.
#pragma once

#include <cstddef>
#include <set>
#include <string>
#include <utility>
#include <vector>

namespace bench
{

inline constexpr const char *kPlanPath = "/data/vorlane/src1.xml";
inline constexpr const char *kGroup = "Bench";

// Every item is the device's program that does nothing.
std::string trivial_plan(int items);

// Items of names of their own, as they are sent and with a report each.
std::string fresh_plan(int items);
std::string reported_plan(int items);

// Every item once, by its index and name, all over the plan: a few are as good as
// all for a mean.
class Places
{
  public:
    explicit Places(int items);
    const std::pair<int, std::string> &next();

  private:
    std::vector<std::pair<int, std::string>> all_;
    std::size_t next_ = 0;
};

// Puts a text of any length where the plan is stored.
void write_plan(const std::string &text);
std::string read_plan();

// Has the library load that plan. It takes 2,048 bytes at most in a command: it
// is sent a short plan, which drops its cached one, and that is overwritten.
void load_into_library(const std::string &text);

// Closes what the library, and a baseline after it, leave open.
class LeftOpen
{
  public:
    LeftOpen();
    // Connections end at once, without lingering in the network's tables.
    void close_all() const;

  private:
    std::set<int> before_;
};

} // namespace bench
