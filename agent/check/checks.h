// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The checks that make up check(). Each adds what it finds.
#pragma once

#include "check/findings.h"
#include "plan/plan.h"

#include <cstddef>
#include <optional>
#include <string>

namespace fptest
{

inline constexpr std::size_t kNone = std::string::npos;
inline constexpr char kDeclaration[] = "<?xml version=\"1.0\"?>";

// What a command would cut off the text.
void check_size(const std::string &text, PlanSource use, Findings &findings);

// Loads the text, after saying what is wrong with its form. Stored is what of it the
// library would get. Nothing where there is no use in looking at what the plan says.
std::optional<Plan> check_form(const std::string &text, const std::string &stored,
                               Findings &findings);

// What the library would make of the plan.
void check_plan(const std::string &text, const Plan &plan, Findings &findings);

} // namespace fptest
