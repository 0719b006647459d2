// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What makes the program end early.
#pragma once

#include <fmt/core.h>
#include <stdexcept>
#include <utility>

namespace fptest
{

enum class Cause {
    input,  // the command line, or an error in the plan
    device, // it is not ready for it
};

// One line for people: what is wrong, where, and what to do.
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
