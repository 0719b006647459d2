// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Test plans of any size, and how the library gets them.
#pragma once

#include <set>
#include <string>

namespace bench
{

inline constexpr const char *kPlanPath = "/data/vorlane/src1.xml";
inline constexpr const char *kGroup = "Bench";

// Every item is the device's program that does nothing.
std::string trivial_plan(int items);

// Items of names of their own, as they are sent and with a report each.
std::string fresh_plan(int items);
std::string reported_plan(int items);
std::string item_name(int index);

// Every item once, all over the plan: a few are as good as all for a mean.
class Places
{
  public:
    explicit Places(int items);
    int next();

  private:
    int items_;
    int step_;
    int at_ = 0;
};

// Puts a text of any length where the plan is stored.
void write_plan(const std::string &text);
std::string read_plan();

// Has the library load that plan. It takes 2,048 bytes at most in a command: it
// is sent a short plan, which drops its cached one, and that is overwritten.
void load_into_module(const std::string &text);

// Closes what the library, and a floor after it, leave open.
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
