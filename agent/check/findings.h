// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the parts of the plan checker share.
#pragma once

#include "check/check.h"
#include "util/text.h"

#include <algorithm>
#include <cstddef>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace fptest
{

class Findings
{
  public:
    void error(std::size_t offset, std::string text)
    {
        list_.push_back({Finding::Severity::error, offset, std::move(text)});
    }
    void warning(std::size_t offset, std::string text)
    {
        list_.push_back({Finding::Severity::warning, offset, std::move(text)});
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

// A name, or what stands for one, in a message.
inline std::string in_quotes(std::string_view text)
{
    constexpr std::size_t kShown = 63; // columns
    return "'" + ellipsize(one_line(text), kShown) + "'";
}

} // namespace fptest
