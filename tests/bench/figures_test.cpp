// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the benchmarks make of the times they have taken.
#include "../quoted.h"
#include "figures.h"
#include "filter.h"
#include "growth.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstddef>
#include <cstdio>
#include <expat.h>
#include <sstream>
#include <stdexcept>
#include <string>
#include <string_view>
#include <sys/wait.h>
#include <utility>
#include <vector>

namespace
{

using bench::Curve;
using bench::Point;
using bench::Result;
using ::testing::EndsWith;
using ::testing::HasSubstr;

TEST(Median, IsTheMiddleOfAnOddNumber)
{
    EXPECT_DOUBLE_EQ(bench::median({9, 1, 5}), 5);
    EXPECT_DOUBLE_EQ(bench::median({4}), 4);
}

TEST(Median, IsBetweenTheTwoInTheMiddleOfAnEvenNumber)
{
    EXPECT_DOUBLE_EQ(bench::median({100, 1, 5, 2}), 3.5);
}

TEST(Spread, LeavesOutTheOuterQuarters)
{
    EXPECT_DOUBLE_EQ(bench::spread({1000, 3, 2, 4, 5, 6, 8, 0}), 1.5);
    EXPECT_DOUBLE_EQ(bench::spread({9, 1, 7, 2, 90, 3, 5, 4, 6, 8, -50}), 3); // 2 to 8
    EXPECT_DOUBLE_EQ(bench::spread({7, 7, 7}), 0);
}

std::vector<Point> power(double factor, double exponent)
{
    std::vector<Point> points;
    for (const double items : {10., 100., 1000., 10000.}) {
        points.push_back({items, factor * std::pow(items, exponent)});
    }
    return points;
}

TEST(Exponent, OfAPowerIsTheOne)
{
    EXPECT_NEAR(bench::exponent(power(3e-9, 1)), 1, 1e-9);
    EXPECT_NEAR(bench::exponent(power(5e-3, 0)), 0, 1e-9);
    EXPECT_NEAR(bench::exponent(power(2e-8, 1.5)), 1.5, 1e-9);
}

TEST(Exponent, IsFittedToAllPoints)
{
    // by hand: x = 1, 2, 3 and y = 0, 0, 3 have the slope 3 / 2
    EXPECT_NEAR(bench::exponent({{10, 1}, {100, 1}, {1000, 1000}}), 1.5, 1e-9);
}

TEST(LastExponent, IsThatOfTheLastTwoPoints)
{
    EXPECT_NEAR(bench::last_exponent({{10, 1}, {100, 1}, {1000, 1000}}), 3, 1e-9);
}

TEST(Growth, IsMissedWhereACurveGrowsFasterThanTheLast)
{
    const Curve search{"search", power(1e-9, 1)};
    const Curve alike{"alike", power(1e-6, 1.04)};
    const Curve faster{"faster", power(1e-6, 1.06)};
    Curve late{"late", power(1e-6, 0)};
    late.points.back().seconds *= 20; // 0.39 where all points count
    const Curve lucky{"search", power(1e-9, 0.8)};

    EXPECT_FALSE(bench::growth_table({alike, search}, true).missed);
    EXPECT_TRUE(bench::growth_table({faster, search}, true).missed);
    EXPECT_TRUE(bench::growth_table({late, search}, true).missed);
    EXPECT_FALSE(bench::growth_table({faster, search}, false).missed);
    EXPECT_FALSE(bench::growth_table({alike, lucky}, true).missed);
    EXPECT_TRUE(bench::growth_table({faster, lucky}, true).missed);
}

TEST(Growth, LinesFitATerminal)
{
    const Curve curve{"group run, for each item", power(5e-3, 0.004)};
    std::istringstream lines(bench::growth_table({curve, curve}, true).table);
    for (std::string line; std::getline(lines, line);) {
        EXPECT_LE(line.size(), 80U) << line;
    }
}

TEST(Judgement, IsOfTheRatioAboveItsLimit)
{
    EXPECT_FALSE((Result{.ratio = 1.10, .limit = 1.10}.missed()));
    EXPECT_TRUE((Result{.ratio = 1.11, .limit = 1.10}.missed()));
    EXPECT_FALSE((Result{.ratio = 99, .limit = 0}.missed())); // only shown
}

TEST(Judgement, IsUnclearWhereTheRoundsDifferByMore)
{
    EXPECT_TRUE((Result{.ratio = 1.12, .spread = 0.02, .limit = 1.10}.barely()));
    EXPECT_FALSE((Result{.ratio = 1.13, .spread = 0.02, .limit = 1.10}.barely()));
    EXPECT_FALSE((Result{.ratio = 1.09, .spread = 0.02, .limit = 1.10}.barely()));
    EXPECT_TRUE((Result{.ratio = 1.12, .spread = 0.02, .limit = 1.10}.missed())); // all the same
}

TEST(Line, SaysWhatCameOfIt)
{
    const Result kept{25.5e-6, 25.1e-6, 1.016, 0.002, 1.10};
    Result missed = kept;
    missed.ratio = 1.2;
    Result shown = kept;
    shown.limit = 0;

    EXPECT_EQ(bench::result_line("report", kept),
              "report                       25.5 us  25.1 us   1.016   0.002   1.10      ok\n");
    EXPECT_THAT(bench::result_line("report", missed), EndsWith(" 1.200   0.002   1.10  MISSED\n"));
    EXPECT_THAT(bench::result_line("report", shown), EndsWith(" 1.016   0.002      -\n"));
}

TEST(Text, OfATimeHasThreeDigitsThatCount)
{
    EXPECT_EQ(bench::time_text(4.2e-10), "0.42 ns");
    EXPECT_EQ(bench::time_text(9.996e-9), "10.0 ns");
    EXPECT_EQ(bench::time_text(9.994e-7), "999 ns");
    EXPECT_EQ(bench::time_text(9.996e-7), "1.00 us");
    EXPECT_EQ(bench::time_text(0.0345), "34.5 ms");
    EXPECT_EQ(bench::time_text(1234), "1234 s");
}

TEST(Text, OfASizeIsInKilobytes)
{
    EXPECT_EQ(bench::bytes_text(22872), "22.3 KB");
    EXPECT_EQ(bench::bytes_text(1023.4 * 1024), "1023 KB");
}

TEST(Text, OfANumberIsGrouped)
{
    EXPECT_EQ(bench::grouped(40), "40");
    EXPECT_EQ(bench::grouped(1000), "1,000");
    EXPECT_EQ(bench::grouped(1234567), "1,234,567");
}

// The texts of an SVG document; nothing where it is not well-formed.
std::vector<std::string> texts_of(const std::string &document)
{
    std::vector<std::string> texts;
    XML_Parser parser = XML_ParserCreate(nullptr);
    XML_SetUserData(parser, &texts);
    XML_SetStartElementHandler(parser, [](void *data, const char *name, const char ** /* all */) {
        if (std::string(name) == "text") {
            static_cast<std::vector<std::string> *>(data)->emplace_back();
        }
    });
    XML_SetCharacterDataHandler(parser, [](void *data, const char *text, int length) {
        auto &all = *static_cast<std::vector<std::string> *>(data);
        if (!all.empty()) {
            all.back().append(text, static_cast<std::size_t>(length));
        }
    });
    if (XML_Parse(parser, document.data(), static_cast<int>(document.size()), 1) ==
        XML_STATUS_ERROR) {
        texts.clear();
    }
    XML_ParserFree(parser);
    return texts;
}

TEST(Chart, NamesEachCurveWithItsExponent)
{
    const std::vector<Curve> curves{{"report", power(1e-6, 0.8)}, {"search", power(1e-9, 1.25)}};

    const std::vector<std::string> texts = texts_of(bench::chart(curves));

    EXPECT_THAT(texts, ::testing::Contains(HasSubstr("report (0.80)")));
    EXPECT_THAT(texts, ::testing::Contains(HasSubstr("search (1.25)")));
    EXPECT_THAT(texts, ::testing::Contains(HasSubstr("10,000")));
}

// The points of the first curve.
std::vector<std::pair<double, double>> drawn(const std::string &svg)
{
    std::vector<std::pair<double, double>> points;
    const std::string_view begin = "<polyline points=\"";
    std::istringstream text(svg.substr(svg.find(begin) + begin.size()));
    double x = 0;
    double y = 0;
    for (char comma = 0; text >> x >> comma >> y;) {
        points.emplace_back(x, y);
    }
    return points;
}

// Where the label of an axis stands: beside the first text of these words.
std::pair<double, double> label(const std::string &svg, const std::string &words)
{
    std::pair<double, double> place;
    const std::size_t end = svg.find(">" + words + "</text>");
    const std::size_t begin = svg.rfind("<text", end);
    std::sscanf(svg.c_str() + begin, "<text x=\"%lf\" y=\"%lf\"", &place.first, &place.second);
    return place;
}

TEST(Chart, HasLogarithmicAxes)
{
    // 1 us, 10 us, 100 us and 1 ms at 10 to 10,000 items
    const std::string svg = bench::chart({{"report", power(1e-7, 1)}});
    const auto points = drawn(svg);

    ASSERT_EQ(points.size(), 4U);
    for (std::size_t at = 1; at < 4; ++at) {
        EXPECT_NEAR(points[at].first - points[at - 1].first, points[1].first - points[0].first,
                    0.2);
        EXPECT_NEAR(points[at].second - points[at - 1].second, points[1].second - points[0].second,
                    0.2);
    }
    EXPECT_GT(points[1].first, points[0].first + 20);
    EXPECT_LT(points[1].second, points[0].second - 20); // up is less
    // each beside its labels; letters stand on their line, centred below theirs
    EXPECT_NEAR(label(svg, "100").first, points[1].first, 0.2);
    EXPECT_NEAR(label(svg, "10,000").first, points[3].first, 0.2);
    EXPECT_NEAR(label(svg, "1 &#181;s").second, points[0].second, 6);
    EXPECT_NEAR(label(svg, "1 ms").second, points[3].second, 6);
    const std::string fast = bench::chart({{"search", power(1e-8, 1)}});
    EXPECT_NEAR(label(fast, "100 ns").second, drawn(fast)[0].second, 6);
}

TEST(Chart, PutsNoNameOnAnother)
{
    const Curve curve{"report", power(1e-6, 1)};
    const std::string svg = bench::chart({curve, curve, curve});

    std::vector<double> heights;
    std::istringstream lines(svg);
    for (std::string line; std::getline(lines, line);) {
        double x = 0;
        double y = 0;
        if (line.find("report (") != std::string::npos &&
            std::sscanf(line.c_str(), "<text x=\"%lf\" y=\"%lf\"", &x, &y) == 2) {
            heights.push_back(y);
        }
    }
    std::ranges::sort(heights);
    ASSERT_EQ(heights.size(), 3U);
    EXPECT_GE(heights[1] - heights[0], 13); // the letters' size
    EXPECT_GE(heights[2] - heights[1], 13);
}

TEST(Filter, TakesWhatMatchesAnywhere)
{
    EXPECT_TRUE(bench::Filter("items$").takes("report, 40 items"));
    EXPECT_FALSE(bench::Filter("^40").takes("report, 40 items"));
    EXPECT_TRUE(bench::Filter("ping|report").takes("report, 40 items"));
    EXPECT_TRUE(bench::Filter("").takes("anything"));
}

TEST(Filter, RefusesWhatIsNoExpression)
{
    EXPECT_THROW(bench::Filter("("), std::runtime_error);
}

struct Refusal {
    const char *name;
    const char *arguments;
    const char *line;
};

void PrintTo(const Refusal &refusal, std::ostream *stream)
{
    *stream << refusal.arguments;
}

class BadCommandLine : public ::testing::TestWithParam<Refusal>
{
};

TEST_P(BadCommandLine, GetsOneLineAndStatus2)
{
    const auto &[name, arguments, line] = GetParam();
    const std::string command =
        quoted(QUILLMARK_SOURCE_DIR "/scripts/bench") + " " + arguments + " 2>&1";
    std::array<char, 4096> buffer{};
    std::string output;

    FILE *pipe = popen(command.c_str(), "r");
    while (fgets(buffer.data(), buffer.size(), pipe) != nullptr) {
        output += buffer.data();
    }
    const int status = pclose(pipe);

    EXPECT_EQ(output, std::string("scripts/bench: ") + line + "\n");
    EXPECT_EQ(WEXITSTATUS(status), 2);
}

INSTANTIATE_TEST_SUITE_P(
    Bench, BadCommandLine,
    ::testing::Values(
        Refusal{"Unknown", "--fast", "unknown argument '--fast'; see scripts/bench --help"},
        Refusal{"FilterWithoutOne", "--filter",
                "--filter wants an argument; see scripts/bench --help"},
        Refusal{"EmptyFilter", "--filter ''",
                "--filter wants an argument; see scripts/bench --help"},
        Refusal{"NoFilter", "--filter '('", "--filter '(' is not a regular expression"},
        Refusal{"JsonIntoADirectory", "--json /tmp",
                "--json /tmp: this is a directory; name a file in it"},
        Refusal{"JsonThatCannotBe", "--json /proc/figures",
                "--json /proc/figures: this cannot be written"},
        Refusal{"JsonWithoutDirectory", "--json /nowhere/figures.json",
                "--json /nowhere/figures.json: there is no such directory"},
        Refusal{"WriteOfSome", "--write --filter ping",
                "--write keeps figures, and wants all of them: leave out the options that spare "
                "some"}),
    [](const auto &refusal) { return refusal.param.name; });

} // namespace
