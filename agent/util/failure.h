// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How the program ends, and what makes it end early.
#pragma once

#include <fmt/core.h>
#include <stdexcept>
#include <utility>

namespace fptest
{

enum class Exit {
    success = 0,
    items_failed = 1,  // or, of a checked plan, errors
    usage = 2,         // or an error in the plan
    environment = 3,   // the device is not ready for it
    interrupted = 130, // by a signal
};

// One line for people: what is wrong, where, and what to do.
class Failure : public std::runtime_error
{
  public:
    template <typename... Values>
    Failure(Exit status, fmt::format_string<Values...> text, Values &&...values)
        : std::runtime_error(fmt::format(text, std::forward<Values>(values)...)), status_(status)
    {
    }
    Exit status() const
    {
        return status_;
    }

  private:
    Exit status_;
};

} // namespace fptest
