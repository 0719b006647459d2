// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/finding_printer.h"

#include "util/text.h"
#include "util/write.h"

#include <algorithm>
#include <cstddef>
#include <fmt/core.h>
#include <utf8.h>
#include <utility>

namespace fptest
{

namespace
{

// Whether a byte continues a character.
bool continues(char byte)
{
    return (static_cast<unsigned char>(byte) & 0xC0U) == 0x80U;
}

// The end of a clean text that takes at most that many columns.
std::string_view end_of(std::string_view text, std::size_t width)
{
    const char *begin = text.data() + text.size();
    const char *next = begin;
    while (next != text.data()) {
        utf8::unchecked::prior(next);
        const std::size_t taken = display_width({next, begin});
        if (taken > width) {
            break;
        }
        width -= taken;
        begin = next;
    }
    return {begin, text.data() + text.size()};
}

std::string shown(std::string_view source)
{
    std::string text(source);
    std::ranges::replace(text, '\t', ' ');
    return one_line(text);
}

// The line around the place: what is before it, and the rest; of a long line only what
// is near, which is more than is shown.
std::pair<std::string, std::string> source_line(std::string_view text, std::size_t offset)
{
    constexpr std::size_t kNear = 512; // bytes
    const std::size_t first = offset - std::min(offset, kNear);
    const std::size_t line_end = text.substr(first, offset - first).rfind('\n');
    std::size_t begin = line_end == text.npos ? first : first + line_end + 1;
    const std::string_view rest = text.substr(offset, kNear);
    std::size_t end = offset + std::min(rest.find('\n'), rest.size());
    if (begin == 0 && text.starts_with(kByteOrderMark)) {
        begin = std::min(kByteOrderMark.size(), end);
    }
    if (begin == first && begin > 0) { // not in the middle of a character
        while (begin < offset && continues(text[begin])) {
            ++begin;
        }
    }
    while (end < text.size() && end > offset && continues(text[end])) {
        --end;
    }
    if (end > begin && text[end - 1] == '\r') {
        --end;
    }
    offset = std::clamp(offset, begin, std::max(begin, end));
    return {shown(text.substr(begin, offset - begin)), shown(text.substr(offset, end - offset))};
}

} // namespace

FindingPrinter::FindingPrinter(const std::string &file, std::string_view text)
    : file_(one_line(file)), text_(text), positions_(text)
{
}

std::string FindingPrinter::printed(const Finding &finding)
{
    constexpr std::size_t kWidth = 80;
    constexpr std::size_t kAfter = 40; // columns kept after a place far to the right
    const Position place = positions_.of(finding.offset);
    auto [before, after] = source_line(text_, place.begin);
    if (display_width(before) + display_width(after) > kWidth &&
        display_width(before) > kWidth - kAfter) {
        after = ellipsize(after, kAfter);
        before = "..." + std::string(end_of(before, kWidth - 3 - display_width(after)));
    }
    return fmt::format("{}:{}:{}: {}: {}\n{}\n{:>{}}\n", file_, place.line, place.column,
                       finding.is_error() ? "error" : "warning", finding.text,
                       ellipsize(before + after, kWidth), '^', display_width(before) + 1);
}

void print(std::FILE *stream, const CheckedPlan &plan)
{
    constexpr std::size_t kShown = 1000;
    FindingPrinter printer(plan.name, plan.text);
    // warnings get the room that errors leave
    const auto found = std::ranges::count_if(plan.findings, &Finding::is_error);
    std::size_t errors = std::min(static_cast<std::size_t>(found), kShown);
    std::size_t warnings = kShown - errors;
    std::size_t hidden = 0;
    for (const Finding &finding : plan.findings) {
        if (std::size_t &left = finding.is_error() ? errors : warnings; left > 0) {
            --left;
            std::fputs(printer.printed(finding).c_str(), stream);
        } else {
            ++hidden;
        }
    }
    if (hidden > 0) {
        print_to(stream, "{}: {} more are not shown\n", one_line(plan.name), hidden);
    }
}

} // namespace fptest
