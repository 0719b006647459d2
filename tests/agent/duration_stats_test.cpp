// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "util/duration_stats.h"

#include <gtest/gtest.h>

#include <cmath>

namespace
{

using fptest::DurationStats;

TEST(DurationStats, AreExactWhileTheyAreFew)
{
    DurationStats times;
    for (const double seconds : {0.5, 0.1, 0.4, 0.2}) {
        times.add(seconds);
    }
    EXPECT_EQ(times.count(), 4U);
    EXPECT_DOUBLE_EQ(times.least(), 0.1);
    EXPECT_DOUBLE_EQ(times.median(), 0.3);
    EXPECT_DOUBLE_EQ(times.longest(), 0.5);
    times.add(7);
    EXPECT_DOUBLE_EQ(times.median(), 0.4);
}

TEST(DurationStats, HaveAMedianWithinOnePercentWhereTheyAreMany)
{
    for (const double least : {0.01, 2.5, 4000.0}) {
        DurationStats times;
        for (int at = 100'000; at >= 0; --at) {
            times.add(least * (1 + at / 1000.0));
        }
        EXPECT_EQ(times.count(), 100'001U);
        EXPECT_DOUBLE_EQ(times.least(), least);
        EXPECT_DOUBLE_EQ(times.longest(), least * 101);
        EXPECT_NEAR(times.median(), least * 51, least * 51 * 0.01);
    }
}

TEST(DurationStats, StayWithinTheirOwnBounds)
{
    DurationStats times;
    for (int at = 0; at < 5000; ++at) {
        times.add(0);
    }
    EXPECT_EQ(times.median(), 0);
    DurationStats same;
    for (int at = 0; at < 5000; ++at) {
        same.add(1.2345);
    }
    EXPECT_EQ(same.median(), 1.2345);
}

} // namespace
