// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Finds tags and attributes in a plan's text, even if it is malformed or half written.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace fptest
{

struct Attribute {
    std::string name;
    std::size_t begin = 0; // offset of the name's first byte
    std::size_t end = 0;   // after the closing quote, or after the name
    bool has_value = false;
    std::size_t value_begin = 0; // inside the quotes
    std::size_t value_end = 0;
};

struct Tag {
    enum class Kind { open, empty, close, comment, cdata, instruction, declaration, text };

    Kind kind = Kind::text;
    std::string name;      // of an element or an instruction
    std::size_t begin = 0; // offset of its '<', or of a text's first word
    std::size_t end = 0;   // after its '>', or after a text's last word
    bool complete = true;  // false if the document breaks off in it
    std::vector<Attribute> attributes;
};

// The tags in order; white space alone is no text.
std::vector<Tag> scan(std::string_view text);

// The offset in the text of a byte of the attribute's value, counted as Mini-XML decodes it.
std::size_t place_in_value(std::string_view text, const Attribute &attribute, std::size_t byte);

inline constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";

// Line and column, both from 1; a column is a character of UTF-8.
struct Position {
    std::size_t line = 1;
    std::size_t column = 1;
    std::size_t begin = 0; // of its character
};

// Fast if places are asked for in the text's order.
class Positions
{
  public:
    explicit Positions(std::string_view text);

    Position of(std::size_t offset);

  private:
    std::string_view text_;
    Position last_;
};

// The text with an empty value for each attribute that has none.
std::string with_empty_values(std::string_view text, const std::vector<Tag> &tags);

} // namespace fptest
