// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The items that are known to fail, by a file of the user's.
#pragma once

#include "plan/plan.h"
#include "run/planner.h"

#include <string>

namespace fptest
{

// Gives the items that the file names its reasons; a line is a pattern of paths, blanks and a
// reason, or a comment after '#'. Throws a Failure for a line that is neither. A pattern of
// nothing in the plan is only said: one file may serve many plans.
void expect_failures(const std::string &file, const Plan &plan, const std::string &plan_name,
                     RoundPlan &round);

} // namespace fptest
