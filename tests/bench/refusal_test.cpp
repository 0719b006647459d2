// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The benchmarks refuse baselines that do not do the library's job.
#include "comparison.h"
#include "quiet_vorlane.h"

#include <gmock/gmock.h>

#include <cstdarg>
#include <ostream>
#include <stdexcept>
#include <string>

namespace
{

void (*listener)(const char *format, va_list arguments);

void log(const char *format, ...)
{
    if (listener != nullptr) {
        va_list arguments;
        va_start(arguments, format);
        listener(format, arguments);
        va_end(arguments);
    }
}

} // namespace

// The log of these tests, in the place of the quiet one.
extern "C" void quiet_on_log(void (*new_listener)(const char *format, va_list arguments))
{
    listener = new_listener;
}

namespace
{

using namespace testing;

struct Baseline {
    const char *name;
    const char *log;
    const char *outcome;
    const char *refusal; // empty: it is taken
};

void PrintTo(const Baseline &baseline, std::ostream *stream)
{
    *stream << baseline.name;
}

class PairedRun : public TestWithParam<Baseline>
{
};

TEST_P(PairedRun, IsOfSidesThatDoTheSame)
{
    const Baseline &baseline = GetParam();
    std::string place;
    std::string turns; // a letter for each turn
    const bench::Comparison words{.name = "words",
                                  .seconds = 0,
                                  .prepare = [&] { place.clear(); },
                                  .library =
                                      [&] {
                                          turns += 'L';
                                          log("%s => said %s\n", "library", "it");
                                          place = "word";
                                      },
                                  .baseline =
                                      [&] {
                                          turns += 'b';
                                          if (*baseline.log != '\0') {
                                              log("b => %s\n", baseline.log);
                                          }
                                          place += baseline.outcome;
                                      },
                                  .outcome = [&] { return place; }};

    if (*baseline.refusal != '\0') {
        EXPECT_THAT(
            [&] { bench::PairedRun(words, 1); },
            ThrowsMessage<std::runtime_error>(StrEq(std::string("words: ") + baseline.refusal)));
        return;
    }
    bench::PairedRun run(words, 1);
    turns.clear();
    for (int turn = 0; turn < 4; ++turn) {
        run.round(); // no longer than a turn
    }
    EXPECT_EQ(turns, "LbbLLbbL");
}

INSTANTIATE_TEST_SUITE_P(
    Bench, PairedRun,
    Values(Baseline{"Same", "said it", "word", ""},
           Baseline{"AnotherLog", "said nothing", "word",
                    "log line 1 is 'said it', its baseline's is 'said nothing'; make "
                    "the baseline log what the library logs"},
           Baseline{"LessLog", "", "word",
                    "log line 1 is 'said it', its baseline's is '(none)'; make the "
                    "baseline log what the library logs"},
           Baseline{"LessDone", "said it", "",
                    "the baseline leaves something else behind; make it do what the "
                    "library does"}),
    [](const auto &test) { return test.param.name; });

} // namespace
