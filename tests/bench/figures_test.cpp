// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the benchmarks make of the times they have taken.
#include "../quoted.h"
#include "figures.h"
#include "growth.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstddef>
#include <cstdio>
#include <string>
#include <sys/wait.h>
#include <vector>

namespace
{

using bench::Curve;
using bench::Point;
using bench::Result;

std::vector<Point> power(double factor, double exponent)
{
    std::vector<Point> points;
    for (const double items : {10., 100., 1000., 10000.}) {
        points.push_back({items, factor * std::pow(items, exponent)});
    }
    return points;
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
