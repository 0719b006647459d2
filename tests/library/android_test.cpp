// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What can be said of the builds for Android without an NDK: what they ask of
// it, and what becomes of the library where clang, lld, musl and the linker's
// options of the preset stand in its place.
#include "maker.h"
#include "outside.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <regex>
#include <string>

namespace
{

using ::testing::Contains;
using ::testing::Each;
using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::SizeIs;

constexpr char kToolchain[] = "build/cmake/android.toolchain.cmake";

// Configures a preset with the NDK there; the text with single blanks.
Outcome configure(const std::string &preset, const std::string &ndk, const std::string &more)
{
    Outcome outcome = run("cd " + kSource + " && ANDROID_NDK_ROOT=" + ndk + " cmake --preset " +
                          preset + " " + more);
    outcome.output = std::regex_replace(outcome.output, std::regex("\\s+"), " ");
    return outcome;
}

TEST(AndroidPresets, AskTheNdkForAnArchitectureAndNoCppRuntime)
{
    const std::pair<const char *, const char *> presets[] = {{"android-arm64", "arm64-v8a"},
                                                             {"android-armv7", "armeabi-v7a"},
                                                             {"android-x86_64", "x86_64"}};
    for (const auto &[preset, abi] : presets) {
        const Directory ndk;
        ndk.write(kToolchain, "message(FATAL_ERROR \"asked: ${ANDROID_ABI} ${ANDROID_PLATFORM} "
                              "${ANDROID_STL} ${CMAKE_BUILD_TYPE}\")\n");

        EXPECT_THAT(configure(preset, ndk.path(), "-B " + ndk.path() + "/build").output,
                    HasSubstr("asked: " + std::string(abi) + " android-28 none MinSizeRel"));
    }
}

TEST(AndroidPresets, NdkThatIsMissingIsAskedFor)
{
    const Directory directory;
    for (const std::string &ndk : {std::string(), directory.path() + "/none"}) {
        const Outcome outcome =
            configure("android-arm64", ndk, "-B " + directory.path() + "/build");

        EXPECT_NE(outcome.status, 0);
        EXPECT_THAT(outcome.output, HasSubstr("ANDROID_NDK_ROOT names no NDK: '" + ndk +
                                              "'; set it to the directory that holds "
                                              "build/cmake/android.toolchain.cmake"));
    }
}

// The alignments of the segments that are loaded.
Words alignments_of(const std::string &library)
{
    const Outcome listing = run("readelf --program-headers --wide " + library);
    EXPECT_EQ(listing.status, 0) << listing.output;
    return last_words(listing.output, "^ *LOAD");
}

TEST(AndroidPresets, MakeASmallLibraryFor16KilobytePagesWithTheMakersOwn)
{
    const std::string musl = "x86_64-linux-musl";
    if (run("uname -m").output != "x86_64\n") {
        GTEST_SKIP() << "the emulator's preset, but another machine";
    }
    const Directory ndk;
    const std::string place = ndk.path();
    ndk.write(kToolchain, "set(CMAKE_SYSTEM_NAME Linux)\n"
                          "set(ANDROID TRUE)\n"
                          "set(CMAKE_C_COMPILER clang)\n"
                          "set(CMAKE_CXX_COMPILER clang++)\n"
                          "set(CMAKE_C_COMPILER_TARGET x86_64-linux-android28)\n"
                          "set(CMAKE_CXX_COMPILER_TARGET x86_64-linux-android28)\n"
                          "set(CMAKE_TRY_COMPILE_TARGET_TYPE STATIC_LIBRARY)\n"
                          "set(CMAKE_CXX_FLAGS_INIT\n"
                          "  \"-nostdlibinc -nostdinc++ -isystem /usr/include/" +
                              musl +
                              "\")\n"
                              "set(CMAKE_SHARED_LINKER_FLAGS_INIT\n"
                              "  \"-nostdlib -fuse-ld=lld -L/usr/lib/" +
                              musl + " -lc\")\n");
    const std::filesystem::path header = MINIXML_HEADER;
    std::filesystem::copy_file(header, place + "/mxml.h"); // alone, without its neighbours

    const Outcome configured =
        configure("android-x86_64", place,
                  "-B " + place + "/built -DMINIXML_INCLUDE_DIR=" + place +
                      " -DMINIXML_LIBRARY=" MINIXML_LIBRARY " '-DVORLANE_LIBRARIES=" +
                      make_makers_libraries(ndk) + "'");
    ASSERT_EQ(configured.status, 0) << configured.output;
    const Outcome built = run("cmake --build " + place + "/built");
    ASSERT_EQ(built.status, 0) << built.output;

    const std::string library = place + "/built/libquillmark.so";
    const Words needs = needs_of(library);
    EXPECT_THAT(needs, Contains("libmaker.so]"));
    EXPECT_THAT(needs, Not(Contains(HasSubstr("c++"))));
    EXPECT_THAT(needs, SizeIs(4)) << "Mini-XML, two of the maker's, the C library";
    EXPECT_THAT(exports_of(library), SizeIs(5));
    EXPECT_THAT(alignments_of(library), Not(SizeIs(0)));
    EXPECT_THAT(alignments_of(library), Each("0x4000"));
    EXPECT_LE(std::filesystem::file_size(library), 24 * 1024U);
    EXPECT_THAT(run("readelf --sections --wide " + library).output, Not(HasSubstr(".symtab")));
}

} // namespace
