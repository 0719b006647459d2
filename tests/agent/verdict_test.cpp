// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Verdicts that a run would take long to come to.
#include "run/verdict.h"

#include <gtest/gtest.h>

using namespace fptest;

namespace
{

TEST(Verdict, FailsAGathererThatIsNotDoneInTimeWhateverItHasReported)
{
    RunningItem gatherer;
    gatherer.gathers = true;
    ItemRun item;
    item.report = {"50", "0", false, "half"};

    const Verdict verdict = judge(gatherer, item, {});

    EXPECT_EQ(verdict.outcome, Outcome::failed);
    EXPECT_TRUE(verdict.overruled);
    EXPECT_EQ(verdict.reason,
              "the gatherer was at progress 50 after 10.0 s, though it reported the result 0");
}

} // namespace
