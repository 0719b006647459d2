// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A plan's text and what it says. A report changes one tag of it, and only that is parsed.
#pragma once

#include "plan/plan.h"

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace fptest
{

class ParsedPlan
{
  public:
    explicit ParsedPlan(std::string text);

    const std::string &text() const
    {
        return text_;
    }
    // As Plan::parse_annotated() gives it; null if the text is not whole.
    std::shared_ptr<const Plan> annotated() const
    {
        return plan_;
    }
    // Whether it is whole and loads as it is, and made_loadable() has nothing to do.
    bool is_sound() const
    {
        return is_sound_;
    }

    // Becomes that text.
    void read(const std::string &text);

    // Becomes what without_reports() makes of it, and returns that text; nullopt if it is not
    // whole, and it stays as it is.
    std::optional<std::string> clear(const std::vector<std::size_t> &numbers,
                                     const std::string &mark);

  private:
    bool can_change() const;
    bool read_change(const std::string &text);
    bool clear_one(std::size_t number, const std::string &mark);
    std::size_t end_of_piece(std::size_t number) const;
    bool put(std::size_t number, std::size_t size, const std::string &tag);

    std::string text_;
    std::shared_ptr<Plan> plan_;
    bool is_sound_ = false;
    std::vector<std::size_t> begins_; // of the elements' tags, if it is sound
};

} // namespace fptest
