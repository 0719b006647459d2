// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The checks that make up check(). Each adds what it finds.
#pragma once

#include "check/findings.h"
#include "plan/plan.h"

#include <cstddef>
#include <string>

namespace fptest
{

inline constexpr std::size_t kNone = std::string::npos;
inline constexpr char kDeclaration[] = "<?xml version=\"1.0\"?>";

// What a command would cut off the text.
void check_size(const CheckedPlan &read, Findings &findings);

// What is wrong with its form, and with what it says where there is any use in looking.
void check_form(const CheckedPlan &read, Findings &findings);

// What the library would make of this plan, which is that of the whole text.
void check_plan(const CheckedPlan &read, const Plan &plan, Findings &findings);

} // namespace fptest
