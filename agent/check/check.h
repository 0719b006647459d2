// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Finds in a test plan what the library would make something else of than its
// author meant.
#pragma once

#include "plan/markup.h"
#include "plan/plan.h"

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

namespace fptest
{

struct Finding {
    enum class Severity { error, warning };

    Severity severity = Severity::error;
    std::size_t offset = 0; // in the text
    std::string text;
};

enum class PlanSource {
    to_send, // it is stored by a command: what the command cuts off matters
    as_sent, // the same, where --as-sent asks for that
    stored,  // it is in its place already
};

// A plan that was read, and what is known of it.
struct CheckedPlan {
    std::string name; // of the file, for people
    std::string text;
    PlanSource use;
    std::string stored;            // what of the text the library gets
    std::vector<Tag> tags;         // of the text
    std::optional<Plan> plan;      // what the library loads; nothing where it does not
    std::string why;               // that is so, in Mini-XML's words
    std::vector<Finding> findings; // in the order of the text
};

CheckedPlan check(std::string name, std::string text, PlanSource use);

bool has_errors(const std::vector<Finding> &findings);

} // namespace fptest
