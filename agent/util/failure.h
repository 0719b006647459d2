// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Errors that are shown to the user. They end the program unless a caller handles them.
#pragma once

#include <fmt/core.h>
#include <stdexcept>
#include <utility>

namespace fptest
{

enum class Cause {
    input,  // the command line, or an error in the plan
    device, // which is not ready
    busy,   // another fptest uses it
};

// A message of one line: what is wrong, where, and what to do.
class Failure : public std::runtime_error
{
  public:
    template <typename... Values>
    Failure(Cause cause, fmt::format_string<Values...> text, Values &&...values)
        : std::runtime_error(fmt::format(text, std::forward<Values>(values)...)), cause_(cause)
    {
    }
    Cause cause() const
    {
        return cause_;
    }

  private:
    Cause cause_;
};

} // namespace fptest
