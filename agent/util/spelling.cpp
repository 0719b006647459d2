// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "util/spelling.h"

#include "util/text.h"

#include <algorithm>
#include <cctype>
#include <fmt/core.h>
#include <utility>

namespace fptest
{
namespace
{

constexpr std::size_t kEdit = 100; // a character too many, too few or another one
constexpr std::size_t kCase = 1;   // the same one, but not its case

char32_t lower(char32_t code)
{
    return code >= U'A' && code <= U'Z' ? code - U'A' + U'a' : code;
}

std::size_t exchange(char32_t one, char32_t other)
{
    if (one == other) {
        return 0;
    }
    return lower(one) == lower(other) ? kCase : kEdit;
}

// The cost of turning one word into the other; swapped neighbours are one edit.
std::size_t distance(const std::u32string &one, const std::u32string &other)
{
    using Row = std::vector<std::size_t>;
    Row before_last;
    Row last;
    Row row(other.size() + 1);
    for (std::size_t x = 0; x <= other.size(); ++x) {
        row[x] = x * kEdit;
    }
    for (std::size_t y = 1; y <= one.size(); ++y) {
        before_last = std::exchange(last, row);
        row[0] = y * kEdit;
        for (std::size_t x = 1; x <= other.size(); ++x) {
            row[x] = std::min({last[x] + kEdit, row[x - 1] + kEdit,
                               last[x - 1] + exchange(one[y - 1], other[x - 1])});
            if (y > 1 && x > 1 && lower(one[y - 1]) == lower(other[x - 2]) &&
                lower(one[y - 2]) == lower(other[x - 1])) {
                row[x] = std::min(row[x], before_last[x - 2] + kEdit);
            }
        }
    }
    return row.back();
}

std::size_t edits_allowed(std::size_t length)
{
    return length < 4 ? 1 : std::max<std::size_t>(2, length / 3);
}

// Whether a word of that length may be meant: part of it must be right.
bool near(std::size_t edits, std::size_t length)
{
    return edits <= edits_allowed(length) && edits < length;
}

} // namespace

std::string nearest(std::string_view word, const std::vector<std::string> &candidates)
{
    const std::u32string wanted = characters(word);
    const std::string *best = nullptr;
    std::size_t least = 0;
    for (const std::string &candidate : candidates) {
        const std::size_t cost = distance(wanted, characters(candidate));
        if (near(cost / kEdit, wanted.size()) && (best == nullptr || cost < least)) {
            best = &candidate;
            least = cost;
        }
    }
    return best != nullptr ? *best : "";
}

std::string did_you_mean(const std::string &near)
{
    return near.empty() ? "" : fmt::format("; did you mean {}?", in_quotes(near));
}

std::string known_names(const std::string &word, const std::vector<std::string> &names,
                        const std::string &introduction)
{
    return with_advice(did_you_mean(nearest(word, names)),
                       fmt::format("{} {}", introduction, one_line(join_and(names))));
}

std::string with_advice(const std::string &text, std::string advice)
{
    if (!text.ends_with('?')) {
        return fmt::format("{}; {}", text, advice);
    }
    advice.front() = static_cast<char>(std::toupper(static_cast<unsigned char>(advice.front())));
    return fmt::format("{} {}", text, advice);
}

} // namespace fptest
