// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "util/text.h"

#include <algorithm>
#include <cctype>
#include <clocale>
#include <cmath>
#include <cwchar>
#include <fmt/core.h>
#include <numeric>
#include <utf8.h>
#include <utility>

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

// --- spelling ----------------------------------------------------------------

constexpr std::size_t kEdit = 100; // a character too many, too few or another one
constexpr std::size_t kCase = 1;   // the same one, but not its case

std::u32string characters(std::string_view text)
{
    std::u32string result;
    for_each_character(text, [&](char32_t code, std::size_t /* size */) { result += code; });
    return result;
}

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

std::string sanitize_utf8(std::string_view bytes)
{
    return cleaned(bytes, [](char32_t code) {
        return code == '\t' || code == '\n' || code == '\r' ? code : visible(code);
    });
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
    return utf8::find_invalid(bytes);
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

std::string duration(double seconds)
{
    // more than centuries is an error
    const double sane = seconds > 0 ? std::min(seconds, 1e10) : 0;
    const long long tenths = std::llround(sane * 10);
    if (tenths < 600) {
        return fmt::format("{}.{} s", tenths / 10, tenths % 10);
    }
    const long long whole = std::llround(sane);
    const long long minutes = whole / 60;
    return minutes < 60 ? fmt::format("{}:{:02}", minutes, whole % 60)
                        : fmt::format("{}:{:02}:{:02}", minutes / 60, minutes % 60, whole % 60);
}

std::string fine_duration(double seconds)
{
    return seconds < 9.9995 ? fmt::format("{:.3f} s", std::max(seconds, 0.0)) : duration(seconds);
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

std::string timestamp(std::chrono::system_clock::time_point time)
{
    using namespace std::chrono;
    const auto day = floor<days>(time);
    const year_month_day date(day);
    const hh_mm_ss clock(floor<milliseconds>(time - day));
    return fmt::format("{:04}-{:02}-{:02}T{:02}:{:02}:{:02}.{:03}Z", static_cast<int>(date.year()),
                       static_cast<unsigned>(date.month()), static_cast<unsigned>(date.day()),
                       clock.hours().count(), clock.minutes().count(), clock.seconds().count(),
                       clock.subseconds().count());
}

} // namespace fptest
