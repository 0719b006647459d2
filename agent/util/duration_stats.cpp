// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "util/duration_stats.h"

#include <algorithm>
#include <cmath>

namespace fptest
{
namespace
{

constexpr std::size_t kFew = 1000;
constexpr double kStep = 1.01; // from one bucket to the next
constexpr double kFinest = 0.001;
constexpr double kCoarsest = 1e9;

int bucket_of(double seconds)
{
    const double sane = std::clamp(seconds, kFinest, kCoarsest);
    return static_cast<int>(std::lround(std::log(sane) / std::log(kStep)));
}

} // namespace

void DurationStats::add(double seconds)
{
    least_ = count_ == 0 ? seconds : std::min(least_, seconds);
    longest_ = count_ == 0 ? seconds : std::max(longest_, seconds);
    ++count_;
    if (count_ <= kFew) {
        few_.insert(std::ranges::upper_bound(few_, seconds), seconds);
        return;
    }
    for (const double one : few_) {
        ++buckets_[bucket_of(one)];
    }
    few_ = {};
    ++buckets_[bucket_of(seconds)];
}

double DurationStats::median() const
{
    if (!few_.empty()) {
        return (few_[(count_ - 1) / 2] + few_[count_ / 2]) / 2;
    }
    std::size_t below = 0;
    for (const auto &[bucket, times] : buckets_) {
        below += times;
        if (below * 2 >= count_) {
            return std::clamp(std::pow(kStep, bucket), least_, longest_);
        }
    }
    return 0;
}

} // namespace fptest
