// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Finds what the library would take differently from what a test plan's author meant.
#pragma once

#include "check/findings.h"
#include "plan/markup.h"
#include "plan/plan.h"

#include <optional>
#include <string>
#include <vector>

namespace fptest
{

// How a plan is stored.
enum class Storing {
    by_command, // which may cut it
    as_file,    // whole, or it is there already
};

// What Mini-XML makes of a text.
struct Loaded {
    explicit Loaded(const std::string &text) : plan(Plan::load_as_library(text, &why))
    {
    }

    std::string why;          // why it does not load, in Mini-XML's words
    std::optional<Plan> plan; // nullopt then
};

// A plan and what check() has found.
struct CheckedPlan {
    std::string name; // of the file, for people
    std::string text;
    Storing storing;
    std::string stored;            // the part of the text that the library gets
    Loaded loaded;                 // from that part
    std::optional<Loaded> uncut;   // from the whole text, if that is more
    std::vector<Tag> tags;         // of the text
    std::vector<Finding> findings; // in the order of the text

    [[nodiscard]] const Loaded &whole() const
    {
        return uncut ? *uncut : loaded;
    }
};

CheckedPlan check(std::string name, std::string text, Storing storing);
} // namespace fptest
