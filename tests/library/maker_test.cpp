// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A device's own libraries in the place of those for Linux.
#include "maker.h"
#include "outside.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <regex>
#include <string>

namespace
{

using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::MatchesRegex;
using ::testing::UnorderedElementsAre;

TEST(MakersLibraries, AreLinkedAndThoseForLinuxAreNotBuilt)
{
    const Directory directory;
    const std::string libraries = make_makers_libraries(directory);
    const std::string place = directory.path();
    const std::string build = place + "/build";

    const Outcome configured =
        run("cmake -S " + quoted(kSource) + " -B " + quoted(build) +
            " -DQUILLMARK_BUILD_TOOLS=OFF -DVORLANE_LIBRARIES=" + quoted(libraries));
    ASSERT_EQ(configured.status, 0) << configured.output;
    const Outcome built = run("cmake --build " + quoted(build));
    ASSERT_EQ(built.status, 0) << built.output;

    EXPECT_THAT(
        needs_of(build + "/libquillmark.so"),
        UnorderedElementsAre("libmxml.so.1]", "libmaker.so]", "libmakerlog.so]", "libc.so.6]"));
    EXPECT_THAT(run("find " + quoted(build) + " -name '*vorlane*'").output, IsEmpty());

    const Outcome installed =
        run("cmake --install " + quoted(build) + " --prefix " + quoted(place + "/prefix"));
    ASSERT_EQ(installed.status, 0) << installed.output;
    EXPECT_THAT(
        run("find " + quoted(place + "/prefix") + " -name 'lib*' -type f -printf '%f '").output,
        MatchesRegex("libquillmark\\.so\\.[0-9.]+ "));
    EXPECT_THAT(entries_of(place + "/prefix/lib/libquillmark.so", "RUNPATH"), IsEmpty());
}

// What the configuration says of them, in one line.
std::string said_of(const Directory &directory, const std::string &options)
{
    directory.write("CMakeLists.txt", "cmake_minimum_required(VERSION 3.25)\n"
                                      "project(makers NONE)\n"
                                      "include(\"" +
                                          kSource + "/cmake/Vorlane.cmake\")\n");
    const Outcome outcome = run("cmake -S " + quoted(directory.path()) + " -B " +
                                quoted(directory.path() + "/build") + " " + options);
    EXPECT_NE(outcome.status, 0) << options;
    return std::regex_replace(outcome.output, std::regex("\\s+"), " ");
}

TEST(MakersLibraries, FileThatIsMissingIsNamed)
{
    const Directory directory;
    const std::string there = directory.write("libone.so", "");
    const std::string headers = " -DVORLANE_INCLUDE_DIR=" + quoted(kSource + "/vorlane");

    EXPECT_THAT(
        said_of(directory, "-DVORLANE_LIBRARIES=" + quoted(there + ";/absent/libtwo.so") + headers),
        HasSubstr("VORLANE_LIBRARIES names a file that is not there: /absent/libtwo.so"));
}

TEST(MakersLibraries, DirectoryWithoutTheirHeadersIsNamed)
{
    const Directory directory;
    const std::string place = directory.path();
    for (const char *header : {"mxml_whitespace.h", "sockwrap.h", "sysparm.h"}) {
        directory.write(header, "");
    }

    EXPECT_THAT(said_of(directory, "-DVORLANE_INCLUDE_DIR=" + quoted(place)),
                HasSubstr("VORLANE_INCLUDE_DIR has no vr_log.h: " + place));
}

TEST(MakersLibraries, TestsAreRefusedWithThem)
{
    const Directory directory;
    const std::string there = directory.write("libone.so", "");

    EXPECT_THAT(
        said_of(directory, "-DQUILLMARK_BUILD_TESTS=ON -DVORLANE_LIBRARIES=" + quoted(there) +
                               " -DVORLANE_INCLUDE_DIR=" + quoted(kSource + "/vorlane")),
        HasSubstr("set QUILLMARK_BUILD_TESTS to OFF, or VORLANE_LIBRARIES to nothing"));
}

} // namespace
