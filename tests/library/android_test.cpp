// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What can be said of the builds for Android without an NDK: what they ask of
// it, and what becomes of the library where clang, lld, musl and the linker's
// options of the preset stand in its place.
#include "maker.h"
#include "outside.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <filesystem>
#include <regex>
#include <set>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

namespace
{

using ::testing::Contains;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::ElementsAreArray;
using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::UnorderedElementsAreArray;

constexpr char kToolchain[] = "build/cmake/android.toolchain.cmake";

// Configures a preset with the NDK there; the text with single blanks.
Ended configure(const std::string &preset, const std::string &ndk, const std::string &more)
{
    Ended outcome = run_shell("cd " + quoted(kSource) + " && ANDROID_NDK_ROOT=" + quoted(ndk) +
                              " cmake --preset " + preset + " " + more);
    outcome.out = std::regex_replace(outcome.out, std::regex("\\s+"), " ");
    return outcome;
}

TEST(AndroidPresets, AskTheNdkForAnArchitectureAndNoCppRuntime)
{
    const std::pair<const char *, const char *> presets[] = {{"android-arm64", "arm64-v8a"},
                                                             {"android-armv7", "armeabi-v7a"},
                                                             {"android-x86_64", "x86_64"}};
    for (const auto &[preset, abi] : presets) {
        const TemporaryDirectory ndk;
        ndk.write(kToolchain, "message(FATAL_ERROR \"asked: ${ANDROID_ABI} ${ANDROID_PLATFORM} "
                              "${ANDROID_STL} ${CMAKE_BUILD_TYPE}\")\n");

        EXPECT_THAT(configure(preset, ndk.path(), "-B " + quoted(ndk.path("build"))).out,
                    HasSubstr("asked: " + std::string(abi) + " android-28 none MinSizeRel"));
    }
}

TEST(AndroidPresets, NdkThatIsMissingIsAskedFor)
{
    const TemporaryDirectory directory;
    // it leads there from the tree's root, where CMake is started
    const std::string relative =
        std::filesystem::path(directory.path()).lexically_relative(kSource);
    directory.write(kToolchain, "message(FATAL_ERROR \"read\")\n");

    const std::string none = directory.path("none");
    const std::pair<std::string, std::string> complaints[] = {
        {"", "names no NDK: ''"},
        {none, "names no NDK: '" + none + "'"},
        {relative, "is not an absolute path: '" + relative + "'"}};
    for (const auto &[ndk, complaint] : complaints) {
        const Ended outcome =
            configure("android-arm64", ndk, "-B " + quoted(directory.path("build")));

        EXPECT_NE(outcome.status, 0);
        EXPECT_THAT(outcome.out, HasSubstr("ANDROID_NDK_ROOT " + complaint +
                                           "; set it to the directory that holds "
                                           "build/cmake/android.toolchain.cmake"));
    }
}

// The alignments of the segments that are loaded.
Words alignments_of(const std::string &library)
{
    const Ended listing = run_shell("readelf --program-headers --wide " + quoted(library));
    EXPECT_EQ(listing.status, 0) << listing.out;
    return last_words(listing.out, "^ *LOAD");
}

TEST(AndroidPresets, MakeASmallLibraryFor16KilobytePagesWithTheMakersOwn)
{
    const std::string musl = "x86_64-linux-musl";
    if (run_shell("uname -m").out != "x86_64\n") {
        GTEST_SKIP() << "the emulator's preset, but another machine";
    }
    const TemporaryDirectory ndk;
    const std::string place = ndk.path();
    ndk.write(kToolchain, "set(CMAKE_SYSTEM_NAME Android)\n"
                          "set(CMAKE_SYSTEM_VERSION 1)\n"
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

    const Ended configured =
        configure("android-x86_64", place,
                  "-B " + quoted(place + "/built") + " -DMINIXML_INCLUDE_DIR=" + quoted(place) +
                      " -DMINIXML_LIBRARY=" + quoted(MINIXML_LIBRARY) +
                      " -DVORLANE_LIBRARIES=" + quoted(make_makers_libraries(ndk)));
    ASSERT_EQ(configured.status, 0) << configured.out;
    const Ended built = run_shell("cmake --build " + quoted(place + "/built"));
    ASSERT_EQ(built.status, 0) << built.out;

    const std::string library = place + "/built/libquillmark.so";
    EXPECT_FALSE(std::filesystem::is_symlink(library)) << "Android knows no versions of libraries";
    EXPECT_THAT(entries_of(library, "SONAME"), ElementsAre("libquillmark.so]"));
    const Words needs = needs_of(library);
    EXPECT_THAT(needs, Contains("libmaker.so]"));
    EXPECT_THAT(needs, Not(Contains(HasSubstr("c++"))));
    EXPECT_THAT(needs, SizeIs(4)) << "Mini-XML, two of the maker's, the C library";
    EXPECT_THAT(exports_of(library), SizeIs(5));
    EXPECT_THAT(alignments_of(library), Not(SizeIs(0)));
    EXPECT_THAT(alignments_of(library), Each("0x4000"));
    EXPECT_LE(std::filesystem::file_size(library), 24 * 1024U);
    EXPECT_THAT(run_shell("readelf --sections --wide " + quoted(library)).out,
                Not(HasSubstr(".symtab")));
}

// --- Android.bp -------------------------------------------------------------------

const std::string kBlueprint = kSource + "/Android.bp";

std::vector<std::string> all_matches(const std::string &text, const std::string &pattern)
{
    std::vector<std::string> found;
    const std::regex wanted(pattern);
    for (std::sregex_iterator at(text.begin(), text.end(), wanted), end; at != end; ++at) {
        found.push_back((*at)[1]);
    }
    return found;
}

// The strings of a property of the library.
std::vector<std::string> property(const std::string &name)
{
    const std::string text = support::read_file(kBlueprint);
    const std::string library = text.substr(text.find("\ncc_library_shared {"));
    std::smatch value;
    const std::regex wanted("\n    " + name + ": (\\[[^\\]]*\\]|[^\n]*)");
    if (!std::regex_search(library, value, wanted)) {
        ADD_FAILURE() << "no property " << name;
    }
    return all_matches(value[1], "\"([^\"]*)\"");
}

// A command's words, as the shell takes them.
Words words_of(const std::string &command)
{
    const Ended listing = run_shell("printf '%s\\n' " + command);
    EXPECT_EQ(listing.status, 0) << listing.out;
    Words words;
    std::istringstream lines(listing.out);
    for (std::string word; std::getline(lines, word);) {
        words.push_back(word);
    }
    return words;
}

// How CMake compiles the library: for each unit, the words of its command.
std::vector<Words> compile_commands()
{
    std::vector<Words> commands;
    const auto all =
        nlohmann::json::parse(support::read_file(QUILLMARK_BINARY_DIR "/compile_commands.json"));
    for (const auto &unit : all) {
        const std::string command = unit.at("command");
        if (command.find(" -o CMakeFiles/quillmark.dir/") != std::string::npos) {
            commands.push_back(words_of(command));
        }
    }
    return commands;
}

// The ends of the words that begin so.
Words words_after(const std::string &beginning, const Words &words)
{
    Words ends;
    for (const std::string &word : words) {
        if (word.starts_with(beginning)) {
            ends.push_back(word.substr(beginning.size()));
        }
    }
    return ends;
}

TEST(AndroidBlueprint, IsFormattedAsAndroidsOwn)
{
    const Ended formatted = run_shell("bpfmt -d " + quoted(kBlueprint));
    EXPECT_EQ(formatted.status, 0);
    EXPECT_EQ(formatted.out, "");
}

TEST(AndroidBlueprint, CompilesWhatCMakeDoes)
{
    Words sources;
    for (const Words &command : compile_commands()) {
        sources.push_back(words_after(kSource + "/", command).at(0));
    }
    EXPECT_THAT(sources, Not(SizeIs(0)));
    EXPECT_THAT(property("srcs"), UnorderedElementsAreArray(sources));
}

TEST(AndroidBlueprint, CompilesAsCMakeDoes)
{
    // Android's build says these itself, or they are GCC's alone
    const std::set<std::string> others = {"-fPIC",
                                          "-ffile-prefix-map=" + kSource + "/=", "-Wno-restrict"};
    const std::vector<Words> commands = compile_commands();
    ASSERT_THAT(commands, Not(SizeIs(0)));
    Words flags = commands[0];
    std::erase_if(flags, [&others](const auto &word) {
        const bool flag = word.starts_with("-f") || word.starts_with("-W");
        return !flag || others.contains(word);
    });
    flags.emplace_back("-Os");
    EXPECT_THAT(property("cflags"), UnorderedElementsAreArray(flags));

    EXPECT_THAT(property("cpp_std"), ElementsAreArray(words_after("-std=", commands[0])));
    EXPECT_THAT(property("stl"), ElementsAreArray({"none"}));
    EXPECT_THAT(property("export_include_dirs"), ElementsAreArray({"src"}));
    std::vector<std::string> directories = property("local_include_dirs");
    for (const std::string &exported : property("export_include_dirs")) {
        directories.push_back(exported);
    }
    EXPECT_THAT(directories,
                UnorderedElementsAreArray(words_after("-I" + kSource + "/", commands[0])));
}

TEST(AndroidBlueprint, LinksWhatTheLibraryNeeds)
{
    std::vector<std::string> needed;
    for (const std::string &need : needs_of(QUILLMARK_LIBRARY)) {
        const std::string name = need.substr(0, need.find(".so"));
        if (name != "libc") { // linked to everything there
            needed.push_back(name);
        }
    }
    EXPECT_THAT(property("shared_libs"), UnorderedElementsAreArray(needed));
    EXPECT_THAT(property("export_shared_lib_headers"), ElementsAreArray({"libmxml"}));
}

} // namespace
