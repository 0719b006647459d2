// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The checks that check() runs on a document. Each adds what it finds.
#pragma once

#include "check/check.h"
#include "plan/plan.h"
#include "util/text.h"

#include <cstddef>
#include <string>
#include <string_view>

namespace fptest
{

inline constexpr std::size_t kShownName = 63; // columns

// A name in a message.
inline std::string quoted_name(std::string_view name)
{
    return in_quotes(name, kShownName);
}

inline constexpr std::size_t kNone = std::string::npos;
inline constexpr char kDeclaration[] = "<?xml version=\"1.0\"?>";

// What a command would cut off.
void check_size(const CheckedPlan &checked, Findings &findings);

// What is wrong with its form, and, if the form allows, with its content.
void check_form(const CheckedPlan &checked, Findings &findings);

// What the library would make of this plan, loaded from the whole text.
void check_plan(const CheckedPlan &checked, const Plan &plan, Findings &findings);

} // namespace fptest
