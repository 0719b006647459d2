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

void expect_success(const std::string &command)
{
    const Ended outcome = run_shell(command);
    ASSERT_EQ(outcome.status, 0) << command << "\n" << outcome.out;
}

// Builds the library with the maker's ones, and installs it in prefix.
void build_and_install(const std::string &place, const std::string &options)
{
    const std::string build = quoted(place + "/build");
    expect_success("cmake -S " + quoted(kSource) + " -B " + build +
                   " -DQUILLMARK_BUILD_TOOLS=OFF " + options + " && cmake --build " + build +
                   " && cmake --install " + build + " --prefix " + quoted(place + "/prefix"));
}

TEST(MakersLibraries, AreLinkedAndThoseForLinuxAreNotBuilt)
{
    const TemporaryDirectory directory;
    const std::string libraries = make_makers_libraries(directory);
    const std::string place = directory.path();
    const std::string build = place + "/build";
    build_and_install(place, "-DVORLANE_LIBRARIES=" + quoted(libraries));

    EXPECT_THAT(
        needs_of(build + "/libquillmark.so"),
        UnorderedElementsAre("libmxml.so.1]", "libmaker.so]", "libmakerlog.so]", "libc.so.6]"));
    EXPECT_THAT(run_shell("find " + quoted(build) + " -name '*vorlane*'").out, IsEmpty());

    EXPECT_THAT(
        run_shell("find " + quoted(place + "/prefix") + " -name 'lib*' -type f -printf '%f '").out,
        MatchesRegex("libquillmark\\.so\\.[0-9.]+ "));
    EXPECT_THAT(entries_of(place + "/prefix/lib/libquillmark.so", "RUNPATH"), IsEmpty());

    // as the README says that agents are linked with it
    const std::string prefix = place + "/prefix";
    expect_success("cc " + quoted(kSource + "/tests/install/consumer/ping.c") + " -o " +
                   quoted(place + "/ping") + " -I " + quoted(prefix + "/include") + " -L " +
                   quoted(prefix + "/lib") + " -lquillmark -Wl,-rpath-link," + quoted(place));
    EXPECT_EQ(run_shell("LD_LIBRARY_PATH=" + quoted(prefix + "/lib:" + place) + " " +
                        quoted(place + "/ping"))
                  .out,
              "Ping Success!\n");
}

TEST(MakersLibraries, OfArchivesNothingIsExported)
{
    const TemporaryDirectory directory;
    const std::string place = directory.path();
    make_makers_libraries(directory);
    for (const char *name : {"maker", "makerlog"}) {
        expect_success("cd " + quoted(place) + " && cc -c -fPIC -I " +
                       quoted(kSource + "/vorlane") + " " + name + ".c && ar rc libmaker.a " +
                       name + ".o");
    }
    build_and_install(place, "-DVORLANE_LIBRARIES=" + quoted(place + "/libmaker.a") +
                                 " -DMINIXML_LIBRARY=" + quoted(MINIXML_ARCHIVE));

    EXPECT_THAT(exports_of(place + "/prefix/lib/libquillmark.so"),
                UnorderedElementsAre("FPTEST_RunTestCmd", "FPTEST_SetTransation",
                                     "FPTEST_ExtractResultMsg", "FPTEST_SuspendItemExecute",
                                     "g_TestCmdTree"));
    EXPECT_THAT(needs_of(place + "/prefix/lib/libquillmark.so"),
                UnorderedElementsAre("libc.so.6]"));
}

TEST(MakersHeaders, AreInstalledWhereTheyAreNamed)
{
    const TemporaryDirectory directory;
    const std::string place = directory.path();
    expect_success("mkdir " + quoted(place + "/own") + " && cp " + quoted(kSource + "/vorlane") +
                   "/*.h " + quoted(place + "/own") + " && echo '/* mine */' >>" +
                   quoted(place + "/own/vr_log.h"));
    build_and_install(place, "-DVORLANE_INCLUDE_DIR=" + quoted(place + "/own"));

    EXPECT_THAT(run_shell("cat " + quoted(place + "/prefix/include/vorlane/vr_log.h")).out,
                HasSubstr("/* mine */"));
}

// What the configuration says of them, in one line.
std::string said_of(const TemporaryDirectory &directory, const std::string &options)
{
    directory.write("CMakeLists.txt", "cmake_minimum_required(VERSION 3.25)\n"
                                      "project(makers NONE)\n"
                                      "include(\"" +
                                          kSource + "/cmake/Vorlane.cmake\")\n");
    const Ended outcome = run_shell("cmake -S " + quoted(directory.path()) + " -B " +
                                    quoted(directory.path("build")) + " " + options);
    EXPECT_NE(outcome.status, 0) << options;
    return std::regex_replace(outcome.out, std::regex("\\s+"), " ");
}

TEST(MakersLibraries, WhatIsNoFileIsNamed)
{
    const TemporaryDirectory directory;
    const std::string there = directory.write("libone.so", "");
    const std::string headers = " -DVORLANE_INCLUDE_DIR=" + quoted(kSource + "/vorlane");

    for (const std::string &other : {std::string("/absent/libtwo.so"), directory.path().string()}) {
        EXPECT_THAT(
            said_of(directory, "-DVORLANE_LIBRARIES=" + quoted(there + ";" + other) + headers),
            HasSubstr("VORLANE_LIBRARIES names no file by its whole path: " + other +
                      "; several are separated by ';'"));
    }
}

TEST(MakersLibraries, DirectoryWithoutTheirHeadersIsNamed)
{
    const TemporaryDirectory directory;
    const std::string place = directory.path();
    for (const char *header : {"mxml_whitespace.h", "sockwrap.h", "sysparm.h"}) {
        directory.write(header, "");
    }

    EXPECT_THAT(said_of(directory, "-DVORLANE_INCLUDE_DIR=" + quoted(place)),
                HasSubstr("VORLANE_INCLUDE_DIR has no vr_log.h: " + place));
}

TEST(MakersLibraries, TestsAreRefusedWithThem)
{
    const TemporaryDirectory directory;
    const std::string there = directory.write("libone.so", "");

    EXPECT_THAT(
        said_of(directory, "-DQUILLMARK_BUILD_TESTS=ON -DVORLANE_LIBRARIES=" + quoted(there) +
                               " -DVORLANE_INCLUDE_DIR=" + quoted(kSource + "/vorlane")),
        HasSubstr("set QUILLMARK_BUILD_TESTS to OFF, or VORLANE_LIBRARIES to nothing"));
}

} // namespace
