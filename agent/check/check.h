// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Finds in a test plan what the library would make something else of than its
// author meant.
#pragma once

#include <cstddef>
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
    stored,  // it stands in its place already
};

// The findings in a plan's text, in its order.
std::vector<Finding> check(const std::string &text, PlanSource use);

bool has_errors(const std::vector<Finding> &findings);

} // namespace fptest
