// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the checks report.
#pragma once

#include <algorithm>
#include <cstddef>
#include <fmt/core.h>
#include <string>
#include <utility>
#include <vector>

namespace fptest
{

struct Finding {
    enum class Severity { error, warning };

    Severity severity = Severity::error;
    std::size_t offset = 0; // in the text
    std::string text;

    [[nodiscard]] bool is_error() const
    {
        return severity == Severity::error;
    }
};

inline bool has_errors(const std::vector<Finding> &findings)
{
    return std::ranges::any_of(findings, &Finding::is_error);
}

class Findings
{
  public:
    template <typename... Values>
    void add(Finding::Severity severity, std::size_t offset, fmt::format_string<Values...> text,
             Values &&...values)
    {
        list_.push_back({severity, offset, fmt::format(text, std::forward<Values>(values)...)});
    }
    template <typename... Values>
    void error(std::size_t offset, fmt::format_string<Values...> text, Values &&...values)
    {
        add(Finding::Severity::error, offset, text, std::forward<Values>(values)...);
    }
    template <typename... Values>
    void warning(std::size_t offset, fmt::format_string<Values...> text, Values &&...values)
    {
        add(Finding::Severity::warning, offset, text, std::forward<Values>(values)...);
    }

    // In the order of the text.
    std::vector<Finding> take()
    {
        std::ranges::stable_sort(list_, {}, &Finding::offset);
        return std::move(list_);
    }

  private:
    std::vector<Finding> list_;
};

} // namespace fptest
