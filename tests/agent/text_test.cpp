// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Text for people and for files.
#include "util/text.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

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

TEST(Clean, LeavesPlainTextAlone)
{
    EXPECT_EQ(clean("3 dead pixels, limit 2 ~"), "3 dead pixels, limit 2 ~");
    EXPECT_EQ(clean(""), "");
}

TEST(Clean, LeavesTheFirstAndTheLastCharacterOfEverySizeAlone)
{
    for (const char *text : {"\u00A0", "\u07FF", "\u0800", "\uD7FF", "\uE000", "\uFFFD", "\uFFFE",
                             "\uFFFF", "\U00010000", "\U0010FFFF"}) {
        EXPECT_EQ(clean(text), text);
        EXPECT_EQ(one_line(text), text);
    }
}

TEST(Clean, KeepsTabsAndLineEnds)
{
    EXPECT_EQ(clean("a\tb\nc\r\n"), "a\tb\nc\r\n");
}

TEST(Clean, ShowsEveryOtherControlCharacterByItsPicture)
{
    for (int code = 0; code < 0x20; ++code) {
        const std::string picture = {'\xE2', '\x90', static_cast<char>(0x80 + code)};
        const std::string byte(1, static_cast<char>(code));
        const bool kept = code == '\t' || code == '\n' || code == '\r';
        EXPECT_EQ(clean(byte), kept ? byte : picture) << code;
        EXPECT_EQ(one_line(byte), picture) << code;
    }
    EXPECT_EQ(clean("\x7F"), "\u2421");
    EXPECT_EQ(clean("\x1B[31mred"), "\u241B[31mred");
}

TEST(Clean, ReplacesTheControlCharactersAboveAscii)
{
    for (int code = 0x80; code < 0xA0; ++code) {
        const std::string text = {'a', '\xC2', static_cast<char>(code), 'b'};
        EXPECT_EQ(clean(text), "a\uFFFDb") << code;
        EXPECT_EQ(one_line(text), "a\uFFFDb") << code;
    }
}

struct Invalid {
    const char *what;
    std::string bytes;
};

TEST(Clean, ReplacesEveryByteThatIsNoUtf8)
{
    const std::vector<Invalid> all = {
        {"a byte that only continues", "\x80"},
        {"another one", "\xBF"},
        {"two bytes for one of ASCII", "\xC0\x80"},
        {"the last of those", "\xC1\xBF"},
        {"three bytes where two do", "\xE0\x9F\xBF"},
        {"four bytes where three do", "\xF0\x8F\xBF\xBF"},
        {"the first surrogate", "\xED\xA0\x80"},
        {"the last surrogate", "\xED\xBF\xBF"},
        {"beyond the last character", "\xF4\x90\x80\x80"},
        {"a first byte of five", "\xF8\x88\x80\x80\x80"},
        {"another one", "\xF9\x80\x80\x80\x80"},
        {"a first byte of six", "\xFD\x80\x80\x80\x80\x80"},
        {"the last byte there is", "\xFF"},
    };
    for (const Invalid &one : all) {
        std::string expected = "<";
        for (std::size_t at = 0; at < one.bytes.size(); ++at) {
            expected += "\uFFFD";
        }
        EXPECT_EQ(clean("<" + one.bytes + ">"), expected + ">") << one.what;
    }
}

TEST(Clean, ReplacesACharacterThatBreaksOffAndGoesOnAfterIt)
{
    EXPECT_EQ(clean("a\xC3"), "a\uFFFD");
    EXPECT_EQ(clean("a\xE6\x97"), "a\uFFFD\uFFFD");
    EXPECT_EQ(clean("a\xF0\x9F\x98"), "a\uFFFD\uFFFD\uFFFD");
    EXPECT_EQ(clean(std::string_view("a\u00E9").substr(0, 2)), "a\uFFFD");
    EXPECT_EQ(clean("\xE6x\xC3\xC3\xA9"), "\uFFFDx\uFFFD\u00E9");
}

TEST(Clean, TakesAZeroByteForACharacterLikeOthers)
{
    EXPECT_EQ(clean("a\0b"s), "a\u2400b");
}

TEST(OneLine, ShowsTabsAndLineEndsByTheirPictures)
{
    EXPECT_EQ(one_line("a\tb\nc\r"), "a\u2409b\u240Ac\u240D");
}

TEST(OneLine, TurnsNoText)
{
    for (const std::string turn : {"\u202A", "\u202E", "\u2066", "\u2069"}) {
        EXPECT_EQ(one_line("a" + turn + "b"), "a\uFFFDb");
        EXPECT_EQ(clean("a" + turn + "b"), "a" + turn + "b"); // files keep it
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
    EXPECT_EQ(columns(""), 0U);
    EXPECT_EQ(columns("SpiCheck"), 8U);
    EXPECT_EQ(columns("\u00E9\u2588\u2026"), 3U);
    EXPECT_EQ(columns(kWide), 2U);
    EXPECT_EQ(columns(kSmile), 2U);
    EXPECT_EQ(columns("e"s + kAccent), 1U);
    EXPECT_EQ(columns("\uFFFD\u241B"), 2U);
}

TEST(Columns, TakesOneForACharacterThatTheLibraryDoesNotKnow)
{
    EXPECT_EQ(columns("\uFFFF"), 1U);
    EXPECT_EQ(columns("\U0010FFFF"), 1U);
}

TEST(Columns, DoesNotDependOnTheLocaleAndLeavesItAlone)
{
    ASSERT_STREQ(std::setlocale(LC_ALL, "C"), "C");
    const locale_t before = uselocale(nullptr);
    EXPECT_EQ(columns(kWide), 2U);
    EXPECT_EQ(fit(kWide, 5), kWide + "   "s);
    EXPECT_EQ(uselocale(nullptr), before);
    EXPECT_STREQ(std::setlocale(LC_ALL, nullptr), "C");

    const locale_t own = newlocale(LC_ALL_MASK, "C.UTF-8", nullptr);
    ASSERT_NE(own, nullptr);
    uselocale(own);
    EXPECT_EQ(columns(kWide), 2U);
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
            const bool right = columns("\u65E5e\u0301") == 3 && fit(kWide, 3) == "\u65E5  " &&
                               cut("\u65E5\u65E5\u65E5\u65E5\u65E5", 4) == "\u65E5...";
            std::_Exit(right ? 0 : 1);
        },
        ::testing::ExitedWithCode(0), "");
}

TEST(Fit, PadsAShorterText)
{
    EXPECT_EQ(fit("abc", 5), "abc  ");
    EXPECT_EQ(fit("", 2), "  ");
    EXPECT_EQ(fit("abc", 3), "abc");
    EXPECT_EQ(fit("", 0), "");
}

TEST(Fit, CutsALongerText)
{
    EXPECT_EQ(fit("SensorProbe", 8), "Senso...");
    EXPECT_EQ(fit("SensorProbe", 10), "SensorP...");
    EXPECT_EQ(fit("SensorProbe", 11), "SensorProbe");
}

TEST(Fit, GivesDotsAloneWhereThereIsNoRoomForMore)
{
    EXPECT_EQ(fit("abcdef", 4), "a...");
    EXPECT_EQ(fit("abcdef", 3), "...");
    EXPECT_EQ(fit("abcdef", 2), "..");
    EXPECT_EQ(fit("abcdef", 1), ".");
    EXPECT_EQ(fit("abcdef", 0), "");
}

TEST(Fit, CutsNoWideCharacterInHalves)
{
    const std::string three = "\u65E5\u672C\u8A9E";
    EXPECT_EQ(fit(three, 6), three);
    EXPECT_EQ(fit(three, 5), "\u65E5...");
    EXPECT_EQ(fit(three + "x", 6), "\u65E5... ");
    EXPECT_EQ(fit(three, 4), "... ");
    EXPECT_EQ(cut(three, 4), "...");
    EXPECT_EQ(fit("\U0001F600\U0001F600\U0001F600", 5), "\U0001F600...");
}

TEST(Fit, LeavesAccentsWithTheirLetter)
{
    EXPECT_EQ(fit("abe\u0301\u0323def", 6), "abe\u0301\u0323def");
    EXPECT_EQ(fit("abe\u0301\u0323defg", 6), "abe\u0301\u0323...");
    EXPECT_EQ(fit("abe\u0301\u0323defg", 5), "ab...");
    EXPECT_EQ(fit("e\u0301", 3), "e\u0301  ");
}

TEST(Fit, AlwaysTakesExactlyThatManyColumns)
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
        EXPECT_EQ(columns(fit(text, width)), width) << text;
        EXPECT_EQ(clean(fit(text, width)), fit(text, width)) << text;
        EXPECT_LE(columns(cut(text, width)), width) << text;
    }
}

TEST(Cut, PadsNothing)
{
    EXPECT_EQ(cut("abc", 5), "abc");
    EXPECT_EQ(cut("abc", 3), "abc");
    EXPECT_EQ(cut("abcd", 3), "...");
    EXPECT_EQ(cut("abcdefg", 6), "abc...");
}

// --- words -------------------------------------------------------------------

const std::vector<std::string> kItems = {"SpiCheck", "DeadPixel", "FingerWait", "QuietRun"};

TEST(Nearest, FindsAWordWithAnErrorOrTwo)
{
    EXPECT_EQ(nearest("SpiChek", kItems), "SpiCheck");    // one missing
    EXPECT_EQ(nearest("SpiCheeck", kItems), "SpiCheck");  // one too many
    EXPECT_EQ(nearest("SpyCheck", kItems), "SpiCheck");   // another one
    EXPECT_EQ(nearest("DaedPixle", kItems), "DeadPixel"); // twice two exchanged
    EXPECT_EQ(nearest("QuietRun", kItems), "QuietRun");
    EXPECT_EQ(nearest("abc", {"abcd"}), "abcd");
    EXPECT_EQ(nearest("abc", {"ab"}), "ab");
    EXPECT_EQ(nearest("abc", {"acb"}), "acb");
}

TEST(Nearest, TakesADifferenceInCaseLightly)
{
    EXPECT_EQ(nearest("fingerwait", kItems), "FingerWait");
    EXPECT_EQ(nearest("SPICHECKS", kItems), "SpiCheck");
    EXPECT_EQ(nearest("psicheck", kItems), "SpiCheck");
    EXPECT_EQ(nearest("a", {"b", "A"}), "A");
    EXPECT_EQ(nearest("ZZ", {"zz"}), "zz");
    EXPECT_EQ(nearest("aa", {"AA"}), "AA");
}

TEST(Nearest, PrefersTheSameCase)
{
    EXPECT_EQ(nearest("Scan", {"scan", "Scam", "Scan"}), "Scan");
    EXPECT_EQ(nearest("sCan", {"Scan", "scan"}), "scan");
}

TEST(Nearest, TakesTheFirstOfEquallyNearOnes)
{
    EXPECT_EQ(nearest("Scan3", {"Scan1", "Scan2"}), "Scan1");
    EXPECT_EQ(nearest("Scan3", {"Scan2", "Scan1"}), "Scan2");
}

TEST(Nearest, IsEmptyWhereNothingIsMeant)
{
    EXPECT_EQ(nearest("Bringup", kItems), "");
    EXPECT_EQ(nearest("", kItems), "");
    EXPECT_EQ(nearest("SpiCheck", {}), "");
    EXPECT_EQ(nearest("a", {"b"}), "");
    EXPECT_EQ(nearest("ab", {"cd"}), "");
    EXPECT_EQ(nearest("wxyabcd", {"abcd"}), "");
    EXPECT_EQ(nearest("abcdwxy", {"abcd"}), "");
    EXPECT_EQ(nearest("abcd", {"wxyabcd", "abcdwxy"}), "");
}

TEST(Nearest, AllowsAboutAThirdOfTheWord)
{
    EXPECT_EQ(nearest("abc", {"abX"}), "abX");
    EXPECT_EQ(nearest("abc", {"aXX"}), "");
    EXPECT_EQ(nearest("abcd", {"abXX"}), "abXX");
    EXPECT_EQ(nearest("abcdefgh", {"abcdefXX"}), "abcdefXX");
    EXPECT_EQ(nearest("abcdefgh", {"abcdeXXX"}), "");
    EXPECT_EQ(nearest("abcdefghi", {"abcdefXXX"}), "abcdefXXX");
    EXPECT_EQ(nearest("abcdefghi", {"abcdeXXXX"}), "");
}

TEST(Nearest, CountsCharactersAndNotBytes)
{
    EXPECT_EQ(nearest("ab\u65E5", {"ab\u672C"}), "ab\u672C");
    EXPECT_EQ(nearest("abcd", {"ab\U0001F600\U0001F600"}), "ab\U0001F600\U0001F600");
}

TEST(Listing, ReadsLikeASentence)
{
    EXPECT_EQ(listing({}), "");
    EXPECT_EQ(listing({"a"}), "a");
    EXPECT_EQ(listing({"a", "b"}), "a and b");
    EXPECT_EQ(listing({"a", "b", "c"}), "a, b and c");
}

// --- times -------------------------------------------------------------------

TEST(Duration, IsInTenthsBelowAMinute)
{
    EXPECT_EQ(duration(0), "0.0 s");
    EXPECT_EQ(duration(0.3), "0.3 s");
    EXPECT_EQ(duration(0.25), "0.3 s");
    EXPECT_EQ(duration(12), "12.0 s");
    EXPECT_EQ(duration(59.94), "59.9 s");
}

TEST(Duration, IsAClockFromAMinuteOn)
{
    EXPECT_EQ(duration(59.96), "1:00");
    EXPECT_EQ(duration(60), "1:00");
    EXPECT_EQ(duration(185), "3:05");
    EXPECT_EQ(duration(3599.4), "59:59");
    EXPECT_EQ(duration(3599.6), "1:00:00");
    EXPECT_EQ(duration(3725), "1:02:05");
    EXPECT_EQ(duration(360000), "100:00:00");
}

TEST(Duration, TakesWhatIsNoTimeForNone)
{
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
