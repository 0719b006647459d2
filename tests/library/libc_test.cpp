// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the library takes for granted of a C library: what Android's, musl and
// glibc share.
#include "outside.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <fstream>
#include <set>
#include <sstream>
#include <string>

namespace
{

using ::testing::Contains;

const std::string kTools = kSource + "/tests/library/";

class BareLibc : public ::testing::TestWithParam<const char *>
{
};

TEST_P(BareLibc, IsAllThatTheModuleIsCompiledAndLinkedWith)
{
    const TemporaryDirectory directory;
    const std::string machine = run_shell("uname -m | tr -d '\\n'").out + "-linux-musl";

    const Ended made = run_shell(quoted(kTools + "bare-libc") + " " + quoted(directory.path()) +
                                 " /usr/include/" + machine + " /usr/lib/" + machine + "/libc.so " +
                                 quoted(MINIXML_HEADER) + " ld " + GetParam());
    EXPECT_EQ(made.status, 0) << made.out;
}

INSTANTIATE_TEST_SUITE_P(Compilers, BareLibc,
                         ::testing::Values("g++", "clang++",
                                           "clang++ --target=$(uname -m)-linux-android28"),
                         [](const auto &compiler) {
                             const std::string command = compiler.param;
                             if (command.find("android") != std::string::npos) {
                                 return "ClangForAndroid";
                             }
                             return command == "g++" ? "Gcc" : "Clang";
                         });

std::set<std::string> libc_names()
{
    std::set<std::string> names;
    std::ifstream file(kTools + "libc_names.txt");
    for (std::string line; std::getline(file, line);) {
        if (!line.empty() && line[0] != '#') {
            names.insert(line);
        }
    }
    return names;
}

// As it is shipped; that no name ends in _chk is a part of it.
TEST(ShippedLibrary, AsksNothingElseOfItsCLibrary)
{
    const std::set<std::string> shared = libc_names();
    const Ended listing = run_shell("nm --dynamic --undefined-only " + quoted(QUILLMARK_LIBRARY));
    ASSERT_EQ(listing.status, 0) << listing.out;
    std::istringstream lines(listing.out);
    int asked = 0;
    for (std::string kind, name; lines >> kind >> name;) {
        const std::size_t version = name.find("@GLIBC");
        if (kind == "U" && version != std::string::npos) {
            EXPECT_THAT(shared, Contains(name.substr(0, version)));
            ++asked;
        }
    }
    EXPECT_GT(asked, 30);
}

} // namespace
