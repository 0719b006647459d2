// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Which cases are wanted.
#pragma once

#include <regex>
#include <string>

namespace bench
{

class Filter
{
  public:
    // An extended regular expression; empty: everything. Throws
    // std::runtime_error where it is none.
    explicit Filter(const std::string &text);

    // Whether any part of the name matches.
    [[nodiscard]] bool takes(const std::string &name) const;
    [[nodiscard]] const std::string &text() const
    {
        return text_;
    }

  private:
    std::string text_;
    std::regex wanted_;
};

} // namespace bench
