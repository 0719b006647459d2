// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "util/text.h"

#include <algorithm>
#include <clocale>
#include <cwchar>
#include <fmt/core.h>
#include <numeric>
#include <utf8.h>

namespace fptest
{

namespace
{

constexpr char32_t kReplacement = 0xFFFD;

// --- UTF-8 -------------------------------------------------------------------

// Calls use() with each character and its number of bytes, and with U+FFFD for an invalid
// byte.
template <typename Use> void for_each_character(std::string_view text, const Use &use)
{
    const char *at = text.data();
    const char *const end = at + text.size();
    while (at != end) {
        const char *const flaw = utf8::find_invalid(at, end);
        while (at != flaw) {
            const char *const begin = at;
            const char32_t code = utf8::unchecked::next(at);
            use(code, static_cast<std::size_t>(at - begin));
        }
        if (at != end) {
            use(kReplacement, 1);
            ++at;
        }
    }
}

// What stands for a control character.
char32_t visible(char32_t code)
{
    if (code < 0x20) {
        return 0x2400 + code;
    }
    if (code == 0x7F) {
        return 0x2421;
    }
    return code >= 0x80 && code < 0xA0 ? kReplacement : code;
}

// A change of direction would turn the rest of a terminal's line as well.
char32_t visible_on_line(char32_t code)
{
    const bool turns = (code >= 0x202A && code <= 0x202E) || (code >= 0x2066 && code <= 0x2069);
    return turns ? kReplacement : visible(code);
}

template <typename Shown> std::string cleaned(std::string_view bytes, const Shown &shown)
{
    std::string text;
    text.reserve(bytes.size());
    for_each_character(
        bytes, [&](char32_t code, std::size_t /* size */) { utf8::append(shown(code), text); });
    return text;
}

// --- columns -----------------------------------------------------------------

// While it lives, the thread has a locale that knows the widths of all characters, or its own
// if the C library has none.
class Widths
{
  public:
    Widths()
    {
        static const locale_t utf8 = newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr);
        before_ = uselocale(utf8);
    }
    Widths(const Widths &) = delete;
    Widths &operator=(const Widths &) = delete;
    ~Widths()
    {
        uselocale(before_);
    }

    // Most screens show one box for a character that the C library does not know.
    [[nodiscard]] std::size_t of(char32_t code) const
    {
        const int width = wcwidth(static_cast<wchar_t>(code));
        return width < 0 ? 1 : static_cast<std::size_t>(width);
    }

  private:
    locale_t before_ = nullptr;
};

// The longest start of a text that fits, its combining characters included.
std::string_view start_of(std::string_view text, std::size_t width)
{
    const Widths widths;
    std::size_t taken = 0;
    std::size_t end = 0;
    for_each_character(text, [&](char32_t code, std::size_t size) {
        taken += widths.of(code);
        end += taken <= width ? size : 0;
    });
    return text.substr(0, end);
}

} // namespace

std::u32string characters(std::string_view text)
{
    std::u32string result;
    for_each_character(text, [&](char32_t code, std::size_t /* size */) { result += code; });
    return result;
}

std::string sanitize_utf8(std::string_view bytes)
{
    const auto is_plain = [](char byte) {
        return (byte >= ' ' && byte <= '~') || byte == '\t' || byte == '\n' || byte == '\r';
    };
    if (std::ranges::all_of(bytes, is_plain)) { // as most are, and this is fast
        return std::string(bytes);
    }
    return cleaned(bytes, [](char32_t code) {
        return code == '\t' || code == '\n' || code == '\r' ? code : visible(code);
    });
}

std::string sanitize_xml(std::string_view bytes)
{
    return cleaned(sanitize_utf8(bytes), [](char32_t code) {
        return code == 0xFFFE || code == 0xFFFF ? kReplacement : code;
    });
}

std::string xml_escaped(std::string_view text)
{
    static constexpr Replacement kEscapes[] = {
        {"&", "&amp;"}, {"<", "&lt;"}, {">", "&gt;"}, {"\"", "&quot;"}, {"\r", "&#13;"},
    };
    return replaced(sanitize_xml(text), kEscapes);
}

std::string one_line(std::string_view bytes)
{
    return cleaned(bytes, visible_on_line);
}

std::string in_quotes(std::string_view text, std::size_t width)
{
    return fmt::format("'{}'", ellipsize(one_line(text), width));
}

std::string replaced(std::string_view text, std::span<const Replacement> list)
{
    std::string result;
    result.reserve(text.size());
    while (!text.empty()) {
        const auto found = std::find_if(list.begin(), list.end(), [text](const Replacement &one) {
            return text.starts_with(one.from);
        });
        result += found != list.end() ? found->to : text.substr(0, 1);
        text.remove_prefix(found != list.end() ? found->from.size() : 1);
    }
    return result;
}

std::size_t first_not_utf8(std::string_view bytes)
{
    const auto is_ascii = [](char byte) { return static_cast<unsigned char>(byte) < 0x80; };
    return std::ranges::all_of(bytes, is_ascii) ? bytes.npos : utf8::find_invalid(bytes);
}

std::size_t display_width(std::string_view text)
{
    const Widths widths;
    std::size_t result = 0;
    for_each_character(text,
                       [&](char32_t code, std::size_t /* size */) { result += widths.of(code); });
    return result;
}

std::string pad_or_ellipsize(std::string_view text, std::size_t width)
{
    std::string result = ellipsize(text, width);
    result.append(width - display_width(result), ' ');
    return result;
}

std::string ellipsize(std::string_view text, std::size_t width)
{
    constexpr std::size_t kDots = 3;
    if (display_width(text) <= width) {
        return std::string(text);
    }
    if (width <= kDots) {
        return std::string(width, '.');
    }
    return std::string(start_of(text, width - kDots)).append(kDots, '.');
}

std::string plural(std::size_t count, std::string_view thing)
{
    return fmt::format("{} {}{}", count, thing, count == 1 ? "" : "s");
}

std::string join_and(const std::vector<std::string> &words)
{
    std::string text;
    for (std::size_t at = 0; at < words.size(); ++at) {
        if (at > 0) {
            text += at + 1 == words.size() ? " and " : ", ";
        }
        text += words[at];
    }
    return text;
}

std::vector<std::string> aligned(const std::vector<std::vector<std::string>> &rows,
                                 const std::vector<bool> &is_number, std::size_t width)
{
    std::vector<std::size_t> widths(is_number.size());
    for (const auto &row : rows) {
        for (std::size_t column = 0; column < row.size(); ++column) {
            widths[column] = std::max(widths[column], display_width(row[column]));
        }
    }
    const std::size_t others =
        std::accumulate(widths.begin() + 1, widths.end(), 2 * (widths.size() - 1));
    const std::size_t least = 10; // of a name that something can be seen of
    widths[0] = std::min(widths[0], width > others + least ? width - others : least);

    std::vector<std::string> lines;
    for (const auto &row : rows) {
        std::string line;
        for (std::size_t column = 0; column < row.size(); ++column) {
            const std::string text = ellipsize(row[column], widths[column]);
            const std::string blanks(widths[column] - display_width(text), ' ');
            line += (column > 0 ? "  " : "") + (is_number[column] ? blanks + text : text + blanks);
        }
        line.erase(line.find_last_not_of(' ') + 1);
        lines.push_back(line);
    }
    return lines;
}

} // namespace fptest
