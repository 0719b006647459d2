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

// How a plan comes to its place.
enum class Storing {
    by_command,      // which may cut it
    by_command_only, // the same, where --as-sent asks for that
    as_file,         // whole, or it is there already
};

// What Mini-XML makes of a text.
struct Loaded {
    explicit Loaded(const std::string &text) : plan(Plan::load_as_library(text, &why))
    {
    }

    std::string why;          // it does not load, in Mini-XML's words
    std::optional<Plan> plan; // nothing then
};

// A plan that was read, and what is known of it.
struct CheckedPlan {
    std::string name; // of the file, for people
    std::string text;
    Storing storing;
    std::string stored;            // what of the text the library gets
    Loaded loaded;                 // of that
    std::optional<Loaded> uncut;   // of the text, where that is more
    std::vector<Tag> tags;         // of the text
    std::vector<Finding> findings; // in the order of the text

    [[nodiscard]] const Loaded &whole() const
    {
        return uncut ? *uncut : loaded;
    }
};

CheckedPlan check(std::string name, std::string text, Storing storing);

bool has_errors(const std::vector<Finding> &findings);

} // namespace fptest
