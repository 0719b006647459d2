// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How two sides are set against each other.
#include "contest.h"
#include "quiet_vorlane.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <cstdarg>
#include <stdexcept>
#include <string>
#include <vector>

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

using ::testing::ElementsAre;
using ::testing::StrEq;
using ::testing::ThrowsMessage;

void pass(std::chrono::microseconds time)
{
    const auto end = std::chrono::steady_clock::now() + time;
    while (std::chrono::steady_clock::now() < end) {
    }
}

// Both sides write a word to a place that is empty at first.
class Words : public bench::Contest
{
  public:
    explicit Words(double round = 0) : Contest("words", 1.1, 1, round)
    {
    }
    void prepare() override
    {
        place_.clear();
    }
    void module(int /* calls */) override
    {
        calls.emplace_back("module");
        log("%s => said %s\n", "module", "it");
        place_ = "word";
        pass(std::chrono::microseconds(200));
    }
    void floor(int /* calls */) override
    {
        calls.emplace_back("floor");
        if (!floor_line.empty()) {
            log("%s => %s\n", "floor", floor_line.c_str());
        }
        if (floor_writes) {
            place_ = "word";
        }
        pass(std::chrono::microseconds(100));
    }
    std::string outcome() override
    {
        return place_;
    }

    std::string floor_line = "said it";
    bool floor_writes = true;
    std::vector<std::string> calls;

  private:
    std::string place_;
};

TEST(Match, IsOfSidesThatDoTheSame)
{
    Words words;
    EXPECT_NO_THROW((bench::Match{words, 1}));
}

TEST(Match, IsRefusedWhereTheFloorLogsSomethingElse)
{
    Words words;
    words.floor_line = "said nothing";
    EXPECT_THAT([&] { bench::Match(words, 1); },
                ThrowsMessage<std::runtime_error>(
                    StrEq("words: log line 1 is 'said it', its floor's is 'said nothing'; make the "
                          "floor log what the library logs")));
}

TEST(Match, IsRefusedWhereTheFloorLogsLess)
{
    Words words;
    words.floor_line = "";
    EXPECT_THAT([&] { bench::Match(words, 1); },
                ThrowsMessage<std::runtime_error>(
                    StrEq("words: log line 1 is 'said it', its floor's is '(none)'; make the floor "
                          "log what the library logs")));
}

TEST(Match, IsRefusedWhereTheFloorLeavesOutWhatTheModuleHasDone)
{
    Words words;
    words.floor_writes = false;
    EXPECT_THAT([&] { bench::Match(words, 1); },
                ThrowsMessage<std::runtime_error>(
                    StrEq("words: the floor leaves something else behind; make it do what the "
                          "library does")));
}

TEST(Round, HasTheSidesBeginByTurns)
{
    Words words;
    bench::Match match(words, 1);
    words.calls.clear();
    for (int turn = 0; turn < 4; ++turn) {
        match.round(); // no longer than a turn
    }
    EXPECT_THAT(words.calls, ElementsAre("module", "floor", "floor", "module", "module", "floor",
                                         "floor", "module"));
}

TEST(Round, TellsTheTimeOfACallOnEitherSide)
{
    Words words(0.003);
    bench::Match match(words, 1);
    const bench::Round round = match.round();

    // what they wait, and more where the machine is busy
    EXPECT_GE(round.module, 200e-6);
    EXPECT_GE(round.floor, 100e-6);
}

} // namespace
