// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "util/text.h"

#include <algorithm>
#include <array>
#include <clocale>
#include <cmath>
#include <cstdio>
#include <ctime>
#include <cwchar>
#include <numeric>
#include <utility>

namespace fptest
{

namespace
{

constexpr char32_t kReplacement = 0xFFFD;

// --- UTF-8 -------------------------------------------------------------------

struct Character {
    char32_t code = kReplacement;
    std::size_t size = 1; // in bytes
};

// What a first byte tells of its character: how many bytes follow, its own bits,
// and the least code that needs that many.
struct Lead {
    std::size_t more = 0;
    char32_t bits = 0;
    char32_t least = 0;
};

Lead lead_of(unsigned char byte)
{
    if (byte < 0x80) {
        return {0, byte, 0};
    }
    if (byte < 0xC0) {
        return {0, 0, 1}; // no first byte: the code that it gives is too small
    }
    if (byte < 0xE0) {
        return {1, byte & 0x1FU, 0x80};
    }
    if (byte < 0xF0) {
        return {2, byte & 0x0FU, 0x800};
    }
    return {3, byte & 0x0FU, 0x10000};
}

// The first character of a text that is not empty. Where there is none, that is
// one byte and the replacement character.
Character decode(std::string_view text)
{
    const Lead lead = lead_of(static_cast<unsigned char>(text.front()));
    if (lead.more >= text.size()) {
        return {};
    }
    char32_t code = lead.bits;
    for (std::size_t at = 1; at <= lead.more; ++at) {
        const auto byte = static_cast<unsigned char>(text[at]);
        if ((byte & 0xC0U) != 0x80U) {
            return {};
        }
        code = code << 6U | (byte & 0x3FU);
    }
    const bool surrogate = code >= 0xD800 && code <= 0xDFFF;
    if (code < lead.least || code > 0x10FFFF || surrogate) {
        return {};
    }
    return {code, lead.more + 1};
}

void append(std::string &text, char32_t code)
{
    const auto tail = [code](unsigned shift) {
        return static_cast<char>(0x80U | (code >> shift & 0x3FU));
    };
    if (code < 0x80) {
        text += static_cast<char>(code);
    } else if (code < 0x800) {
        text += {static_cast<char>(0xC0U | code >> 6U), tail(0)};
    } else if (code < 0x10000) {
        text += {static_cast<char>(0xE0U | code >> 12U), tail(6), tail(0)};
    } else {
        text += {static_cast<char>(0xF0U | code >> 18U), tail(12), tail(6), tail(0)};
    }
}

// What stands for a character that does something instead of being seen.
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

// On a terminal, one that turns the direction of what follows would turn the rest
// of the line as well.
char32_t visible_on_line(char32_t code)
{
    const bool turns = (code >= 0x202A && code <= 0x202E) || (code >= 0x2066 && code <= 0x2069);
    return turns ? kReplacement : visible(code);
}

std::string cleaned(std::string_view bytes, std::string_view kept, char32_t (*shown)(char32_t))
{
    std::string text;
    text.reserve(bytes.size());
    while (!bytes.empty()) {
        const Character character = decode(bytes);
        const bool keep = kept.find(bytes.front()) != std::string_view::npos;
        append(text, keep ? character.code : shown(character.code));
        bytes.remove_prefix(character.size);
    }
    return text;
}

// --- columns -----------------------------------------------------------------

// A locale that knows the widths of characters, whatever the process's is.
class Utf8Locale
{
  public:
    Utf8Locale() : locale_(newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr))
    {
    }
    Utf8Locale(const Utf8Locale &) = delete;
    Utf8Locale &operator=(const Utf8Locale &) = delete;
    ~Utf8Locale()
    {
        if (locale_ != nullptr) {
            freelocale(locale_);
        }
    }

    [[nodiscard]] locale_t get() const
    {
        return locale_;
    }

  private:
    locale_t locale_;
};

// Tells widths while it lives; the thread's own locale is back afterwards. Where
// the C library has no such locale the thread's own is asked.
class Widths
{
  public:
    Widths()
    {
        static const Utf8Locale utf8;
        before_ = uselocale(utf8.get());
    }
    Widths(const Widths &) = delete;
    Widths &operator=(const Widths &) = delete;
    ~Widths()
    {
        uselocale(before_);
    }

    // A character that the C library has no width for is one box on most screens.
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
    std::size_t end = 0;
    for (std::size_t taken = 0; end < text.size();) {
        const Character character = decode(text.substr(end));
        taken += widths.of(character.code);
        if (taken > width) {
            break;
        }
        end += character.size;
    }
    return text.substr(0, end);
}

// --- spelling ----------------------------------------------------------------

constexpr std::size_t kEdit = 100; // a character too many, too few or another one
constexpr std::size_t kCase = 1;   // the same one, but not its case

std::u32string characters(std::string_view text)
{
    std::u32string result;
    while (!text.empty()) {
        const Character character = decode(text);
        result += character.code;
        text.remove_prefix(character.size);
    }
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

// What it costs to make one word of the other; neighbours that have changed
// places are one edit.
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

// Whether a word is meant by another that is that far from it: something of it
// must have been hit.
bool near(std::size_t edits, std::size_t length)
{
    return edits <= edits_allowed(length) && edits < length;
}

} // namespace

std::string sanitize_utf8(std::string_view bytes)
{
    return cleaned(bytes, "\t\n\r", visible);
}

std::string one_line(std::string_view bytes)
{
    return cleaned(bytes, "", visible_on_line);
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
    for (std::size_t at = 0; at < bytes.size();) {
        const Character character = decode(bytes.substr(at));
        if (character.code == kReplacement && character.size == 1) {
            return at;
        }
        at += character.size;
    }
    return std::string_view::npos;
}

std::size_t display_width(std::string_view text)
{
    const Widths widths;
    std::size_t result = 0;
    while (!text.empty()) {
        const Character character = decode(text);
        result += widths.of(character.code);
        text.remove_prefix(character.size);
    }
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

std::string plural(std::size_t count, const std::string &thing)
{
    return std::to_string(count) + " " + thing + (count == 1 ? "" : "s");
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
    // what lasts longer than centuries has been measured wrong
    const double sane = seconds > 0 ? std::min(seconds, 1e10) : 0;
    const long long tenths = std::llround(sane * 10);
    std::array<char, 40> text{};
    if (tenths < 600) {
        std::snprintf(text.data(), text.size(), "%lld.%lld s", tenths / 10, tenths % 10);
        return text.data();
    }
    const long long whole = std::llround(sane);
    const long long hours = whole / 3600;
    const long long minutes = whole / 60 % 60;
    if (hours > 0) {
        std::snprintf(text.data(), text.size(), "%lld:%02lld:%02lld", hours, minutes, whole % 60);
    } else {
        std::snprintf(text.data(), text.size(), "%lld:%02lld", minutes, whole % 60);
    }
    return text.data();
}

std::string fine_duration(double seconds)
{
    if (!(seconds < 9.9995)) {
        return duration(seconds);
    }
    std::array<char, 40> text{};
    std::snprintf(text.data(), text.size(), "%.3f s", std::max(seconds, 0.0));
    return text.data();
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
    const auto whole = floor<std::chrono::seconds>(time);
    const auto fraction = floor<milliseconds>(time - whole);
    const std::time_t value = system_clock::to_time_t(whole);
    std::tm parts{};
    gmtime_r(&value, &parts);
    std::array<char, 32> text{};
    const std::size_t end = std::strftime(text.data(), text.size(), "%Y-%m-%dT%H:%M:%S", &parts);
    std::snprintf(text.data() + end, text.size() - end, ".%03dZ",
                  static_cast<int>(fraction.count()));
    return text.data();
}

} // namespace fptest
