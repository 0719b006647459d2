// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/ps_query.h"

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <gmock/gmock.h>
#include <iterator>
#include <string_view>
#include <sys/wait.h>

namespace fptest
{
namespace
{

using testing::HasSubstr;
using testing::IsEmpty;

TEST(PsQuery, IsAnsweredAndLeavesNoChild)
{
    if (std::getenv("QUILLMARK_DEVICE") == std::string_view("in-place")) {
        GTEST_SKIP() << "the shell that is asked about cannot have another name there";
    }
    const PsAnswers answers = ask_ps();

    EXPECT_TRUE(answers.is_enough());
    EXPECT_TRUE(answers.finds_short_name);
    EXPECT_THAT(answers.header, HasSubstr(" PID "));
    EXPECT_THAT(answers.complaint, IsEmpty());
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
    EXPECT_EQ(errno, ECHILD);
}

TEST(PsQuery, LeavesNoDescriptor)
{
    const auto open_ones = [] {
        return std::distance(std::filesystem::directory_iterator("/proc/self/fd"),
                             std::filesystem::directory_iterator());
    };
    const auto before = open_ones();
    ask_ps();

    EXPECT_EQ(open_ones(), before);
}

} // namespace
} // namespace fptest
