// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Text for terminals and files: valid UTF-8 in which nothing moves the cursor, whatever
// bytes an item reports.
#pragma once

#include <cstddef>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace fptest
{

// Replaces control characters but tab, line feed and carriage return by their pictures
// (U+2400 and on, U+2421 for DEL), C1 controls and invalid UTF-8 by U+FFFD.
std::string sanitize_utf8(std::string_view bytes);

// As sanitize_utf8(), and without the two valid characters that XML does not have, U+FFFE
// and U+FFFF.
std::string sanitize_xml(std::string_view bytes);

// As sanitize_xml(), and as text of XML or HTML, also between double quotes.
std::string xml_escaped(std::string_view text);

// As sanitize_utf8(), and on one line: replaces tabs and line ends by pictures as well, and
// what changes the direction of text (overrides, embeddings, isolates) by U+FFFD.
std::string one_line(std::string_view bytes);

// In quotes and on one line, cut to that many columns.
std::string in_quotes(std::string_view text, std::size_t width = std::string::npos);

struct Replacement {
    std::string_view from;
    std::string_view to;
};

std::string replaced(std::string_view text, std::span<const Replacement> list);

// U+FFFD for each invalid byte.
std::u32string characters(std::string_view text);

// The offset of the first invalid byte, or npos.
std::size_t first_not_utf8(std::string_view bytes);

// Terminal columns that a clean text takes.
std::size_t display_width(std::string_view text);

// The text in exactly that many columns: padded with blanks, or cut and ended by "...".
std::string pad_or_ellipsize(std::string_view text, std::size_t width);

// As pad_or_ellipsize(), but a shorter text is not padded.
std::string ellipsize(std::string_view text, std::size_t width);

// "1 item", "2 items"
std::string plural(std::size_t count, std::string_view thing);

// "a", "a and b", "a, b and c"
std::string join_and(const std::vector<std::string> &words);

// The rows as lines of aligned columns, numbers to the right. The first column is cut if a
// line would be wider than that.
std::vector<std::string> aligned(const std::vector<std::vector<std::string>> &rows,
                                 const std::vector<bool> &is_number,
                                 std::size_t width = std::string::npos);

} // namespace fptest
