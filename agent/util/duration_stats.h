// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Least, median and longest of any number of durations, in bounded memory.
#pragma once

#include <cstddef>
#include <map>
#include <vector>

namespace fptest
{

class DurationStats
{
  public:
    void add(double seconds);

    std::size_t count() const
    {
        return count_;
    }
    // Only if there are any. The median is exact for few; then within 1 %, or a millisecond.
    double least() const
    {
        return least_;
    }
    double median() const;
    double longest() const
    {
        return longest_;
    }

  private:
    std::size_t count_ = 0;
    double least_ = 0;
    double longest_ = 0;
    std::vector<double> few_;            // sorted; empty once there are many
    std::map<int, std::size_t> buckets_; // then their numbers, by the logarithm
};

} // namespace fptest
