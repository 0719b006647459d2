// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Text for people and for files.
#include "util/spelling.h"
#include "util/text.h"
#include "util/times.h"

#include <gmock/gmock.h>

#include <array>
#include <chrono>
#include <clocale>
#include <cstdlib>
#include <dlfcn.h>
#include <locale.h>
#include <string>
#include <vector>

using namespace fptest;
using namespace std::chrono_literals;
using namespace std::string_literals;

namespace
{

bool no_utf8_locale = false;

} // namespace

// In the place of the C library's own, to take the locale away.
extern "C" locale_t newlocale(int mask, const char *name, locale_t base) noexcept
{
    using Function = locale_t (*)(int, const char *, locale_t);
    static const auto real = reinterpret_cast<Function>(dlsym(RTLD_NEXT, "newlocale"));
    return no_utf8_locale ? nullptr : real(mask, name, base);
}

namespace
{

// A letter, a character of two columns, one that joins the one before it, and one
// beyond the first 65536.
constexpr char kWide[] = "\u65E5";      // 3 bytes, 2 columns
constexpr char kAccent[] = "\u0301";    // 2 bytes, none
constexpr char kSmile[] = "\U0001F600"; // 4 bytes, 2 columns

// --- what is valid -----------------------------------------------------------

TEST(VisibleText, LeavesPlainTextAndTheFirstAndTheLastCharacterOfEverySizeAlone)
{
    for (const char *text : {"", "3 dead pixels, limit 2 ~", "\u00A0", "\u07FF", "\u0800", "\uD7FF",
                             "\uE000", "\uFDD0", "\uFEFF", "\uFFFD", "\uFFFE", "\uFFFF",
                             "\U00010000", "\U0001FFFE", "\U0010FFFF"}) {
        EXPECT_EQ(sanitize_utf8(text), text);
        EXPECT_EQ(one_line(text), text);
        EXPECT_EQ(first_not_utf8(text), std::string::npos);
    }
}

TEST(VisibleText, ShowsEveryControlCharacterButTabsAndLineEndsByItsPicture)
{
    for (int code = 0; code < 0x20; ++code) {
        const std::string picture = {'\xE2', '\x90', static_cast<char>(0x80 + code)};
        const std::string byte(1, static_cast<char>(code));
        const bool kept = code == '\t' || code == '\n' || code == '\r';
        EXPECT_EQ(sanitize_utf8(byte), kept ? byte : picture) << code;
        EXPECT_EQ(one_line(byte), picture) << code;
    }
    EXPECT_EQ(sanitize_utf8("\x7F"), "\u2421");
    EXPECT_EQ(sanitize_utf8("\x1B[31m\0red"s), "\u241B[31m\u2400red");
}

TEST(VisibleText, LeavesCharactersThatXmlLacksOutForXmlAlone)
{
    const std::string text = "\t\xEF\xBF\xBD\xEF\xBF\xBE\xEF\xBF\xBF\x1B\xFF";
    EXPECT_EQ(fptest::sanitize_xml(text), "\t\uFFFD\uFFFD\uFFFD\u241B\uFFFD");
    EXPECT_EQ(sanitize_utf8("\xEF\xBF\xBE"), "\xEF\xBF\xBE");
}

TEST(VisibleText, ReplacesTheControlCharactersAboveAscii)
{
    for (int code = 0x80; code < 0xA0; ++code) {
        const std::string text = {'a', '\xC2', static_cast<char>(code), 'b'};
        EXPECT_EQ(sanitize_utf8(text), "a\uFFFDb") << code;
        EXPECT_EQ(one_line(text), "a\uFFFDb") << code;
    }
}

TEST(VisibleText, ReplacesEachByteThatIsNoUtf8)
{
    // goes on with nothing, an overlong form, half a pair, beyond the last, broken off
    for (const std::string bytes :
         {"\x80", "\xE0\x9F\xBF", "\xED\xA0\x80", "\xF4\x90\x80\x80", "\xE6\x97", "\xFF"}) {
        std::string expected;
        for (std::size_t left = bytes.size(); left > 0; --left) {
            expected += "\uFFFD";
        }
        EXPECT_EQ(sanitize_utf8("<" + bytes + ">"), "<" + expected + ">");
        EXPECT_EQ(first_not_utf8("\u00E9" + bytes + "\u00E9"), 2U);
    }
    EXPECT_EQ(sanitize_utf8("\xF0\x9F\xE6\x97\xA5\xC3"), "\uFFFD\uFFFD\u65E5\uFFFD");
}

TEST(Columns, AreOneForEachByteThatIsNoUtf8)
{
    EXPECT_EQ(display_width("a\xE6\x97"), 3U);
    EXPECT_EQ(ellipsize("ab\xFF\xFFgoes on", 5), "ab...");
    EXPECT_EQ(ellipsize("\xE6\x97goes on", 4), "\xE6...");
}

TEST(InQuotes, IsOnOneLineAndCutWhereThatIsWanted)
{
    EXPECT_EQ(in_quotes(""), "''");
    EXPECT_EQ(in_quotes("a\nb"), "'a\u240Ab'");
    EXPECT_EQ(in_quotes("SensorProbe", 8), "'Senso...'");
}

TEST(OneLine, ReplacesDirectionControls)
{
    for (const std::string turn : {"\u202A", "\u202E", "\u2066", "\u2069"}) {
        EXPECT_EQ(one_line("a" + turn + "b"), "a\uFFFDb");
        EXPECT_EQ(sanitize_utf8("a" + turn + "b"), "a" + turn + "b"); // files keep it
    }
    // their neighbours, a mark that belongs to a text among them
    for (const std::string other : {"\u200F", "\u2029", "\u202F", "\u2065", "\u206A"}) {
        EXPECT_EQ(one_line("a" + other + "b"), "a" + other + "b");
    }
}

TEST(Replaced, TakesTheFirstOfTheListAtEveryPlace)
{
    const std::array<Replacement, 3> list = {{{"ab", "1"}, {"a", "22"}, {"b", ""}}};
    EXPECT_EQ(replaced("abacab b", list), "122c1 ");
    EXPECT_EQ(replaced("", list), "");
}

// --- columns -----------------------------------------------------------------

TEST(Columns, CountsWhatATerminalShows)
{
    EXPECT_EQ(display_width(""), 0U);
    EXPECT_EQ(display_width("SpiCheck"), 8U);
    EXPECT_EQ(display_width("\u00E9\u2588\u2026"), 3U);
    EXPECT_EQ(display_width(kWide), 2U);
    EXPECT_EQ(display_width(kSmile), 2U);
    EXPECT_EQ(display_width("e"s + kAccent), 1U);
    EXPECT_EQ(display_width("\uFFFD\u241B"), 2U);
    // which the C library does not know
    EXPECT_EQ(display_width("\uFFFF"), 1U);
    EXPECT_EQ(display_width("\U0010FFFF"), 1U);
}

TEST(Columns, DoesNotDependOnTheLocaleAndLeavesItAlone)
{
    ASSERT_STREQ(std::setlocale(LC_ALL, "C"), "C");
    const locale_t before = uselocale(nullptr);
    EXPECT_EQ(display_width(kWide), 2U);
    EXPECT_EQ(pad_or_ellipsize(kWide, 5), kWide + "   "s);
    EXPECT_EQ(uselocale(nullptr), before);
    EXPECT_STREQ(std::setlocale(LC_ALL, nullptr), "C");

    const locale_t own = newlocale(LC_ALL_MASK, "C.UTF-8", nullptr);
    ASSERT_NE(own, nullptr);
    uselocale(own);
    EXPECT_EQ(display_width(kWide), 2U);
    EXPECT_EQ(uselocale(nullptr), own);
    uselocale(before);
    freelocale(own);
}

TEST(ColumnsDeathTest, AreOneForEachCharacterWhereNoLocaleTells)
{
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(
        {
            no_utf8_locale = true;
            const bool right = display_width("\u65E5e\u0301") == 3 &&
                               pad_or_ellipsize(kWide, 3) == "\u65E5  " &&
                               ellipsize("\u65E5\u65E5\u65E5\u65E5\u65E5", 4) == "\u65E5...";
            std::_Exit(right ? 0 : 1);
        },
        ::testing::ExitedWithCode(0), "");
}

TEST(PadOrEllipsize, FillsTheWidth)
{
    const std::string three = "\u65E5\u672C\u8A9E";
    struct Fitted {
        std::string text;
        std::size_t width;
        std::string fitted;
    };
    for (const auto &[text, width, fitted] : std::vector<Fitted>{
             {"", 2, ""},
             {"", 0, ""},
             {"abc", 5, "abc"},
             {"abc", 3, "abc"},
             {"SensorProbe", 8, "Senso..."},
             {"SensorProbe", 10, "SensorP..."},
             {"SensorProbe", 11, "SensorProbe"},
             // dots alone if there is no room for more
             {"abcdef", 4, "a..."},
             {"abcdef", 3, "..."},
             {"abcdef", 2, ".."},
             {"abcdef", 1, "."},
             {"abcdef", 0, ""},
             // no half of a wide character
             {three, 6, three},
             {three, 5, "\u65E5..."},
             {three + "x", 6, "\u65E5..."},
             {three, 4, "..."},
             {"\U0001F600\U0001F600\U0001F600", 5, "\U0001F600..."},
             // accents with their letter
             {"abe\u0301\u0323def", 6, "abe\u0301\u0323def"},
             {"abe\u0301\u0323defg", 6, "abe\u0301\u0323..."},
             {"abe\u0301\u0323defg", 5, "ab..."},
             {"e\u0301", 3, "e\u0301"},
         }) {
        EXPECT_EQ(ellipsize(text, width), fitted) << width;
        EXPECT_EQ(pad_or_ellipsize(text, width),
                  fitted + std::string(width - display_width(fitted), ' '))
            << width;
    }
}

TEST(PadOrEllipsize, FillsTheWidthWhateverTheText)
{
    const std::vector<std::string> parts = {"a", kWide, kAccent, kSmile, "\u00E9", "\uFFFD"};
    unsigned state = 1;
    for (int round = 0; round < 2000; ++round) {
        std::string text;
        for (unsigned length = state % 12; length > 0; --length) {
            state = state * 1103515245U + 12345U;
            text += parts[state / 65536 % parts.size()];
        }
        state = state * 1103515245U + 12345U;
        const std::size_t width = state / 65536 % 15;
        EXPECT_EQ(display_width(pad_or_ellipsize(text, width)), width) << text;
        EXPECT_EQ(sanitize_utf8(pad_or_ellipsize(text, width)), pad_or_ellipsize(text, width))
            << text;
        EXPECT_LE(display_width(ellipsize(text, width)), width) << text;
    }
}

// --- words -------------------------------------------------------------------

const std::vector<std::string> kItems = {"SpiCheck", "DeadPixel", "FingerWait", "QuietRun"};

TEST(Nearest, IsSpelledMostLikeTheWord)
{
    EXPECT_EQ(nearest("SpiChek", kItems), "SpiCheck");    // one missing
    EXPECT_EQ(nearest("SpiCheeck", kItems), "SpiCheck");  // one too many
    EXPECT_EQ(nearest("SpyCheck", kItems), "SpiCheck");   // another one
    EXPECT_EQ(nearest("DaedPixle", kItems), "DeadPixel"); // twice two exchanged
    // characters count, not bytes
    EXPECT_EQ(nearest("abcd", {"ab\U0001F600\U0001F600"}), "ab\U0001F600\U0001F600");
    // a difference in case is small
    EXPECT_EQ(nearest("SPICHECKS", kItems), "SpiCheck");
    EXPECT_EQ(nearest("psicheck", kItems), "SpiCheck");
    EXPECT_EQ(nearest("aa", {"AA"}), "AA");
    EXPECT_EQ(nearest("a", {"b", "A"}), "A");
    // the same case first, then the first
    EXPECT_EQ(nearest("Scan", {"scan", "Scam", "Scan"}), "Scan");
    EXPECT_EQ(nearest("sCan", {"Scan", "scan"}), "scan");
    EXPECT_EQ(nearest("Scan3", {"Scan2", "Scan1"}), "Scan2");
}

TEST(Nearest, DiffersInAThirdOfTheWordAtMost)
{
    EXPECT_EQ(nearest("abc", {"abX"}), "abX");
    EXPECT_EQ(nearest("abc", {"aXX"}), "");
    EXPECT_EQ(nearest("abcd", {"abXX"}), "abXX");
    EXPECT_EQ(nearest("abcdefgh", {"abcdeXXX"}), "");
    EXPECT_EQ(nearest("abcdefghi", {"abcdefXXX"}), "abcdefXXX");
    EXPECT_EQ(nearest("abcdefghi", {"abcdeXXXX"}), "");
    EXPECT_EQ(nearest("", kItems), "");
    EXPECT_EQ(nearest("SpiCheck", {}), "");
    EXPECT_EQ(nearest("abcd", {"wxyabcd", "abcdwxy"}), "");
}

TEST(DidYouMean, IsAskedOfANearWord)
{
    EXPECT_EQ(did_you_mean("Scan"), "; did you mean 'Scan'?");
    EXPECT_EQ(did_you_mean(""), "");
}

TEST(Advice, IsASentenceOfItsOwnAfterAQuestion)
{
    EXPECT_EQ(with_advice("no Scan", "leave it out"), "no Scan; leave it out");
    EXPECT_EQ(with_advice("no Scan; did you mean 'Scam'?", "it has Scam"),
              "no Scan; did you mean 'Scam'? It has Scam");
}

TEST(JoinAnd, ReadsLikeASentence)
{
    EXPECT_EQ(join_and({}), "");
    EXPECT_EQ(join_and({"a"}), "a");
    EXPECT_EQ(join_and({"a", "b"}), "a and b");
    EXPECT_EQ(join_and({"a", "b", "c"}), "a, b and c");
}

// --- times -------------------------------------------------------------------

TEST(Duration, IsInTenthsBelowAMinuteAndThenAClock)
{
    EXPECT_EQ(duration(0), "0.0 s");
    EXPECT_EQ(duration(0.3), "0.3 s");
    EXPECT_EQ(duration(0.25), "0.3 s");
    EXPECT_EQ(duration(12), "12.0 s");
    EXPECT_EQ(duration(59.94), "59.9 s");
    EXPECT_EQ(duration(59.96), "1:00");
    EXPECT_EQ(duration(60), "1:00");
    EXPECT_EQ(duration(185), "3:05");
    EXPECT_EQ(duration(3599.4), "59:59");
    EXPECT_EQ(duration(3599.6), "1:00:00");
    EXPECT_EQ(duration(3725), "1:02:05");
    EXPECT_EQ(duration(360000), "100:00:00");
    // none
    EXPECT_EQ(duration(-1), "0.0 s");
    EXPECT_EQ(duration(std::strtod("nan", nullptr)), "0.0 s");
    EXPECT_EQ(duration(1e300), duration(1e10));
}

TEST(Timestamp, IsInUtcWithMilliseconds)
{
    using Time = std::chrono::system_clock::time_point;
    ::setenv("TZ", "America/St_Johns", 1);
    ::tzset();
    EXPECT_EQ(timestamp(Time()), "1970-01-01T00:00:00.000Z");
    EXPECT_EQ(timestamp(Time(1714979289123ms)), "2024-05-06T07:08:09.123Z");
    EXPECT_EQ(timestamp(Time(1714979289009ms + 900us)), "2024-05-06T07:08:09.009Z");
    EXPECT_EQ(timestamp(Time(-1ms)), "1969-12-31T23:59:59.999Z");
}

} // namespace
