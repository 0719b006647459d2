// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the parts of the plan checker share.
#pragma once

#include "check/check.h"
#include "util/text.h"

#include <algorithm>
#include <cstddef>
#include <fmt/core.h>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace fptest
{

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

inline constexpr std::size_t kShownName = 63; // columns

// A name, or what stands for one, in a message.
inline std::string quoted_name(std::string_view name)
{
    return in_quotes(name, kShownName);
}

} // namespace fptest
