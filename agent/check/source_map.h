// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include "plan/markup.h"
#include "plan/plan.h"

#include <algorithm>
#include <cstddef>
#include <fmt/core.h>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace fptest
{

// A place for every element, in the text that the plan was loaded from.
class SourceMap
{
  public:
    SourceMap(const std::string &text, const std::vector<Tag> &tags, const Plan &plan)
        : text_(text), tags_(element_tags(plan, tags))
    {
        if (!tags_.empty()) {
            note_texts(tags);
        }
        for (std::size_t at = text.find('\n'); at != std::string::npos;
             at = text.find('\n', at + 1)) {
            line_ends_.push_back(at);
        }
    }

    [[nodiscard]] std::size_t of(std::size_t element) const
    {
        return tags_.empty() ? 0 : tags_[element].begin;
    }

    // Of the value, or of the element if it has no such attribute.
    [[nodiscard]] std::size_t of(std::size_t element, std::string_view name) const
    {
        const Attribute *place = find(element, name);
        return place != nullptr && place->has_value ? place->value_begin : of(element);
    }

    // Of a byte of the value, as the library reads it.
    [[nodiscard]] std::size_t inside(std::size_t element, std::string_view name,
                                     std::size_t byte) const
    {
        const Attribute *place = find(element, name);
        return place != nullptr && place->has_value ? place_in_value(text_, *place, byte)
                                                    : of(element);
    }

    // Of the first text directly in the element.
    [[nodiscard]] std::size_t of_text(std::size_t element) const
    {
        const auto found = texts_.find(element);
        return found != texts_.end() ? found->second : std::string::npos;
    }

    // Whether it has that attribute, but no value for it, which is reported elsewhere.
    [[nodiscard]] bool is_valueless(std::size_t element, std::string_view name) const
    {
        const Attribute *place = find(element, name);
        return place != nullptr && !place->has_value;
    }

    [[nodiscard]] std::string line_of(std::size_t element) const
    {
        const auto end = std::ranges::lower_bound(line_ends_, of(element));
        return fmt::format("line {}", end - line_ends_.begin() + 1);
    }

  private:
    void note_texts(const std::vector<Tag> &tags)
    {
        std::vector<std::size_t> open;
        std::size_t element = 0;
        for (const Tag &tag : tags) {
            if (tag.kind == Tag::Kind::text) {
                texts_.try_emplace(open.empty() ? 0 : open.back(), tag.begin);
            } else if (tag.kind == Tag::Kind::close) {
                open.resize(open.empty() ? 0 : open.size() - 1);
            } else {
                if (tag.kind == Tag::Kind::open) {
                    open.push_back(element);
                }
                ++element;
            }
        }
    }

    [[nodiscard]] const Attribute *find(std::size_t element, std::string_view name) const
    {
        if (tags_.empty()) {
            return nullptr;
        }
        const auto &attributes = tags_[element].attributes;
        const auto found = std::ranges::find(attributes, name, &Attribute::name);
        return found != attributes.end() ? &*found : nullptr;
    }

    const std::string &text_;
    std::vector<Tag> tags_;
    std::unordered_map<std::size_t, std::size_t> texts_;
    std::vector<std::size_t> line_ends_;
};

} // namespace fptest
