// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The read-back: the plan's file, byte by byte, in the caller's buffer.
#include "unit_test.h"

#include <algorithm>
#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdio>
#include <ostream>
#include <unistd.h>

namespace
{

constexpr char kGuard = '\x7e';
constexpr std::size_t kAfter = 64;

class ReadBack : public LibraryTest
{
  protected:
    // Bytes of every kind, none like its neighbour or the guard.
    static std::string bytes(std::size_t count)
    {
        std::string text;
        for (std::size_t at = 0; at < count; ++at) {
            text += static_cast<char>(at % 100);
        }
        return text;
    }

    // The buffer after a read-back, with what is after its capacity.
    static std::string read_back(int capacity)
    {
        std::string buffer(static_cast<std::size_t>(capacity) + kAfter, kGuard);
        FPTEST_ExtractResultMsg(buffer.data(), capacity);
        return buffer;
    }
    // The same, if only so many bytes came.
    static std::string received(int capacity, const std::string &text)
    {
        return text +
               std::string(static_cast<std::size_t>(capacity) + kAfter - text.size(), kGuard);
    }
};

// In a process of its own: the assertion's report, with the log before it.
class ReadBackAssertion : public ReadBack
{
  protected:
    static void read_back_aloud(int capacity)
    {
        platform::state().log_hook = [](const std::string &event) {
            std::fputs(event.c_str(), stderr);
        };
        char buffer[16];
        FPTEST_ExtractResultMsg(buffer, capacity);
    }
    static auto asserted()
    {
        return AllOf(
            HasSubstr("FPTEST_ExtractResultMsg| offset = "),
            // each C library has its own quotes and capitals
            ContainsRegex("quillmark.cpp:[0-9]+: .*FPTEST_ExtractResultMsg.*ssertion .0. failed"),
            Not(HasSubstr("unfinish")), Not(HasSubstr("reach the end")));
    }
};

struct Reading {
    const char *what;
    std::size_t size; // of the file
    int capacity;
    std::vector<platform::Step> steps; // of read
    std::vector<int> results;          // before the end; -1 is a failure
};

void PrintTo(const Reading &reading, std::ostream *out)
{
    *out << reading.what;
}

class ReadBackOf : public ReadBack, public WithParamInterface<Reading>
{
};

TEST_P(ReadBackOf, FillsTheBufferPieceByPiece)
{
    const auto &[what, size, capacity, steps, results] = GetParam();
    write_plan(bytes(size));
    plan_steps("read", steps);
    const std::size_t kept = std::min(size, static_cast<std::size_t>(capacity));
    EXPECT_EQ(read_back(capacity), received(capacity, bytes(kept)));

    Lines expected = opened_to_read(static_cast<int>(size));
    int room = capacity;
    for (const int result : results) {
        for (const std::string &line : result < 0 ? read_failure(room) : read_piece(room, result)) {
            expected.push_back(line);
        }
        room -= std::max(result, 0);
    }
    EXPECT_EQ(events(), expected + read_end(room, static_cast<int>(kept)));
    EXPECT_THAT(left_open(), IsEmpty());
}

std::vector<Reading> readings()
{
    const auto error = gives(-1, EIO);
    std::vector<int> lasting(20000, -1);
    lasting.push_back(1);
    return {
        {"FileShorterThanTheBuffer", 300, 1000, {}, {300}},
        {"EmptyFile", 0, 100, {}, {}},
        {"NoCapacity", 300, 0, {}, {}},
        {"FileOfTheBuffersSize", 300, 300, {}, {300}},
        {"FileOneByteShorter", 300, 301, {}, {300}},
        {"FileOneByteLonger", 300, 299, {}, {299}},
        {"LongerFileIsCut", 600, 500, {}, {500}},
        {"LargeFile", 200000, 300000, {}, {200000}},
        {"Pieces", 300, 400, {limit(1), limit(150), limit(100)}, {1, 150, 100, 49}},
        {"PiecesUpToTheBuffersSize", 300, 100, {limit(60), limit(39)}, {60, 39, 1}},
        {"FailuresOfEveryKindAreTriedAgain",
         300,
         400,
         {gives(-1, EINTR), error, gives(-1, EBADF)},
         {-1, -1, -1, 300}},
        {"FailuresBetweenPieces",
         300,
         400,
         {limit(100), error, error, pass(), error},
         {100, -1, -1, 200, -1}},
        {"LastingFailure", 1, 10, std::vector(20000, error), lasting},
    };
}

INSTANTIATE_TEST_SUITE_P(Every, ReadBackOf, ValuesIn(readings()),
                         [](const auto &one) { return std::string(one.param.what); });

TEST_F(ReadBack, OffsetsAreOnlyLogged)
{
    write_plan(bytes(300));
    plan_steps("lseek", {gives(-1, ESPIPE), gives(7), gives(12)});
    EXPECT_EQ(read_back(400), received(400, bytes(300)));

    EXPECT_EQ(events(), opened_to_read(7, -1, 12) + read_piece(400, 300) + read_end(100, 300));
}

TEST_F(ReadBack, OffsetIsLoggedAsAnInt)
{
    for (const long offset : {static_cast<long>(INT_MAX), static_cast<long>(3'000'000'000LL)}) {
        SCOPED_TRACE(offset);
        platform::reset();
        write_plan("<P/>");
        plan_steps("lseek", {gives(0), gives(offset)});
        read_back(64);

        const Lines lines = platform::log_lines();
        EXPECT_THAT(lines, Contains("FPTEST_ExtractResultMsg| offset = " +
                                    std::to_string(static_cast<int>(offset))));
    }
}

TEST_F(ReadBack, FileIsReadNotThePlanInMemory)
{
    write_plan("<P><CmdGroup name=\"g\"><Cmd name=\"a\"/></CmdGroup></P>");
    ASSERT_NE(internals::load_configs_file(kPath), nullptr);
    const mxml_node_t *tree = g_TestCmdTree;
    write_plan("not a plan: \t\r\n <");

    EXPECT_EQ(read_back(100), received(100, "not a plan: \t\r\n <"));
    EXPECT_EQ(g_TestCmdTree, tree);
}

TEST_F(ReadBack, FileThatDoesNotParseIsReadAndNotLoaded)
{
    write_plan("<P><");
    EXPECT_EQ(read_back(100), received(100, "<P><"));
    EXPECT_EQ(g_TestCmdTree, nullptr);
}

TEST_F(ReadBack, MissingFileLeavesTheBufferUntouchedWithNoLeaveLine)
{
    EXPECT_EQ(read_back(100), received(100, ""));
    EXPECT_EQ(events(), not_opened_to_read("-1"));
    EXPECT_FALSE(platform::plan_exists());
}

TEST_F(ReadBack, DescriptorZeroIsAFailureAndStaysOpen)
{
    write_plan(bytes(300));
    platform::free_descriptor_zero();
    EXPECT_EQ(read_back(100), received(100, ""));
    EXPECT_EQ(events(), not_opened_to_read("plan#1"));
    EXPECT_THAT(left_open(), ElementsAre("plan#1"));
}

TEST_F(ReadBack, DescriptorOneIsASuccess)
{
    write_plan(bytes(300));
    std::string got;
    {
        const support::FreedDescriptor freed(STDOUT_FILENO);
        got = read_back(400);
    }
    EXPECT_EQ(got, received(400, bytes(300)));
    EXPECT_EQ(events(), opened_to_read(300) + read_piece(400, 300) + read_end(100, 300));
    EXPECT_THAT(left_open(), IsEmpty());
}

TEST_F(ReadBack, PieceIsComparedWithTheWholeCapacity)
{
    // no kernel gives more than it was asked for; only the comparison is looked at
    write_plan(bytes(300));
    plan_steps("read", {limit(60), gives(80), gives(0)});
    read_back(100);
    EXPECT_THAT(platform::log_lines(),
                IsSupersetOf({"FPTEST_ExtractResultMsg| read file unfinish, continue... n = 80 \n",
                              "FPTEST_ExtractResultMsg| read byte count = 140\n"}));
}

TEST_F(ReadBack, NegativeCapacityReadsAnEmptyFileAsAnyOther)
{
    for (const int capacity : {-1, -4096, INT_MIN}) {
        SCOPED_TRACE(capacity);
        platform::reset();
        write_plan("");
        std::string buffer(kAfter, kGuard);
        FPTEST_ExtractResultMsg(buffer.data(), capacity);

        EXPECT_EQ(buffer, std::string(kAfter, kGuard));
        auto lines = opened_to_read(0) + read_end(0, 0);
        std::erase_if(lines, [](const auto &event) { return event.starts_with("read("); });
        auto seen = events();
        EXPECT_EQ(std::erase_if(seen, [](const auto &event) { return event.starts_with("read("); }),
                  1U);
        EXPECT_EQ(seen, lines);
    }
}

TEST_F(ReadBackAssertion, NegativeCapacityEndsTheProcessAtTheFirstByte)
{
    for (const std::size_t size : {1U, 300U}) {
        for (const int capacity : {-1, -4096, INT_MIN}) {
            SCOPED_TRACE(capacity);
            write_plan(bytes(size));
            EXPECT_EXIT(read_back_aloud(capacity), KilledBySignal(SIGABRT), asserted());
        }
    }
}

TEST_F(ReadBackAssertion, NegativeCapacityRetriesAFailedReadFirst)
{
    write_plan("x");
    plan_steps("read", {gives(-1, EIO)});
    EXPECT_EXIT(read_back_aloud(-1), KilledBySignal(SIGABRT),
                AllOf(asserted(), HasSubstr("FPTEST_ExtractResultMsg[]:read file failed\n")));
}

TEST_F(ReadBackAssertion, OnlyMoreThanTheCapacityEndsTheProcess)
{
    write_plan("x");
    plan_steps("read", {gives(11)});
    EXPECT_EXIT(read_back_aloud(10), KilledBySignal(SIGABRT), asserted());

    platform::reset();
    write_plan("x");
    EXPECT_EXIT(
        {
            platform::plan_steps("read", {gives(10), gives(0)});
            read_back_aloud(10);
            ::_exit(0); // the directory stays
        },
        ExitedWithCode(0), HasSubstr("read byte count = 10\n"));
}

} // namespace
