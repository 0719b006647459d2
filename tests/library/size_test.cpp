// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How small the library is: on devices, storage is dear.
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <dlfcn.h>
#include <filesystem>
#include <ostream>
#include <string>

namespace
{

constexpr std::uintmax_t kLimit = 24 * 1024; // bytes on disk

struct Architecture {
    const char *name;
    const char *compiler;
    const char *library; // made by it; empty where it is not installed
};

void PrintTo(const Architecture &architecture, std::ostream *stream)
{
    *stream << architecture.compiler;
}

class Size : public ::testing::TestWithParam<Architecture>
{
};

TEST_P(Size, StrippedAtOsIsAtMost24Kilobytes)
{
    const auto &[name, compiler, library] = GetParam();
    if (*library == '\0') {
        GTEST_SKIP() << compiler << " is not installed";
    }
    EXPECT_LE(std::filesystem::file_size(library), kLimit) << library;
}

INSTANTIATE_TEST_SUITE_P(
    Library, Size,
    ::testing::Values(Architecture{"X86_64", "x86_64-linux-gnu-g++", SMALL_X86_64},
                      Architecture{"Armhf", "arm-linux-gnueabihf-g++", SMALL_ARMHF},
                      Architecture{"Arm64", "aarch64-linux-gnu-g++", SMALL_ARM64}),
    [](const auto &architecture) { return architecture.param.name; });

// What is measured is the library, and not something smaller.
TEST(SmallLibrary, AnswersAPing)
{
    // it asks for this one by its name only
    ASSERT_NE(dlopen(VORLANE_LIBRARY, RTLD_NOW), nullptr) << dlerror();
    void *library = dlopen(SMALL_HERE, RTLD_NOW);
    ASSERT_NE(library, nullptr) << dlerror();
    for (const char *name : {"g_TestCmdTree", "FPTEST_RunTestCmd", "FPTEST_SetTransation",
                             "FPTEST_ExtractResultMsg", "FPTEST_SuspendItemExecute"}) {
        EXPECT_NE(dlsym(library, name), nullptr) << name;
    }
    using Command = int (*)(const char *, char *, int);
    const auto run = reinterpret_cast<Command>(dlsym(library, "FPTEST_RunTestCmd"));
    std::array<char, 64> reply{};

    EXPECT_EQ(run("pingtest", reply.data(), static_cast<int>(reply.size())), 0);
    EXPECT_STREQ(reply.data(), "Ping Success!");
}

} // namespace
