// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What cmake --install puts where, and whether others can build on it: each test
// installs into a prefix of its own and moves it before it looks.
#include "outside.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <regex>
#include <string>
#include <vector>

namespace fs = std::filesystem;

namespace
{

using support::read_file;
using ::testing::AllOf;
using ::testing::ElementsAreArray;
using ::testing::HasSubstr;
using ::testing::Not;

const std::string kBuild = QUILLMARK_BINARY_DIR;
const std::string kCMake = quoted(CMAKE_PROGRAM);
const std::string kConsumers = kSource + "/tests/install/consumer";

// What it prints; a failure of the test where its exit status is not 0.
std::string output_of(const std::string &command)
{
    const Ended outcome = run_shell(command);
    EXPECT_EQ(outcome.status, 0) << command << "\n" << outcome.out;
    return outcome.out;
}

std::string in_one_line(const std::string &text)
{
    return std::regex_replace(text, std::regex("\\s+"), " ");
}

class Install : public ::testing::Test
{
  protected:
    Install()
    {
        unsetenv("LD_LIBRARY_PATH");
        unsetenv("PKG_CONFIG_PATH");
    }

    [[nodiscard]] std::string work(const std::string &name) const
    {
        return work_.path(name);
    }

    // Installs a build and moves what it has put there. Gives the new place.
    [[nodiscard]] std::string install(const std::string &build = kBuild) const
    {
        output_of(kCMake + " --install " + quoted(build) + " --prefix " + quoted(work("first")));
        fs::rename(work("first"), work("moved"));
        return work("moved");
    }

    // Configures and builds a consumer. Gives its build.
    [[nodiscard]] std::string consumer(const std::string &kind, const std::string &options) const
    {
        std::string build = work(kind);
        output_of(configure(kind, options));
        output_of(kCMake + " --build " + quoted(build));
        return build;
    }

    [[nodiscard]] std::string configure(const std::string &kind, const std::string &options) const
    {
        return kCMake + " -S " + quoted(kConsumers + "/" + kind) + " -B " + quoted(work(kind)) +
               " " + options;
    }

  private:
    const TemporaryDirectory work_{WORK_DIRECTORY}; // in the build, which the device shows
};

std::vector<std::string> files_below(const fs::path &directory)
{
    std::vector<std::string> files;
    for (const auto &entry : fs::recursive_directory_iterator(directory)) {
        // the path itself, without following it
        const std::string name = entry.path().lexically_relative(directory);
        if (entry.is_symlink()) {
            files.push_back(name + " -> " + fs::read_symlink(entry).string());
        } else if (!entry.is_directory()) {
            files.push_back(name);
        }
    }
    std::sort(files.begin(), files.end());
    return files;
}

// Mini-XML is the machine's; the libraries are the prefix's.
std::string flags(const std::string &prefix)
{
    const std::string libraries = prefix + "/" + INSTALL_LIBDIR;
    return "-I" + quoted(prefix + "/include") + " -L" + quoted(libraries) +
           " -lquillmark -Wl,-rpath," + quoted(libraries);
}

const std::string kCompile =
    "cc -std=c11 -Wall -Wextra -Wpedantic -Werror " + quoted(kConsumers + "/agent.c") + " -o ";

// On the device, where what it starts does no harm.
std::string output_on_device(const std::string &program)
{
    return output_of(quoted(kSource + "/device/run") + " --build " + quoted(kBuild) +
                     " -- /usr/bin/env VR_LOG_FILE=/tmp/log " + quoted(program));
}

void expect_agent_works(const std::string &program)
{
    const std::string said = output_on_device(program);
    EXPECT_THAT(in_one_line(said),
                HasSubstr(R"(<Cmd name="SpiCheck" args="--group Bringup" progress="100" )"
                          R"(result="0" description="chip 0x1a2b answers at 8 MHz")"));
}

void expect_reader_works(const std::string &program)
{
    const std::string said = output_on_device(program);
    EXPECT_THAT(said, HasSubstr("I: from C++\n"));
}

// --- what is there ------------------------------------------------------------

TEST_F(Install, PutsEachFileInItsPlace)
{
    const std::string libraries = INSTALL_LIBDIR;
    const std::string major = std::string(PROJECT_VERSION).substr(0, 1);
    std::vector<std::string> expected = {
        "bin/fptest",
        "include/quillmark.h",
        "include/vorlane/mxml_whitespace.h",
        "include/vorlane/sockwrap.h",
        "include/vorlane/sysparm.h",
        "include/vorlane/vr_log.h",
        libraries + "/cmake/quillmark/MiniXml.cmake",
        libraries + "/cmake/quillmark/quillmarkConfig.cmake",
        libraries + "/cmake/quillmark/quillmarkConfigVersion.cmake",
        libraries + "/cmake/quillmark/quillmarkTargets-" BUILD_TYPE ".cmake",
        libraries + "/cmake/quillmark/quillmarkTargets.cmake",
        libraries + "/libquillmark.so -> libquillmark.so." + major,
        libraries + "/libquillmark.so." + major + " -> libquillmark.so." PROJECT_VERSION,
        libraries + "/libquillmark.so." PROJECT_VERSION,
        libraries + "/pkgconfig/quillmark.pc",
        libraries + "/quillmark/libvorlane.so",
        "share/bash-completion/completions/fptest",
        "share/doc/quillmark/LICENSE",
        "share/man/man1/fptest.1",
        "share/man/man5/quillmark-plan.5",
    };
    std::sort(expected.begin(), expected.end());

    EXPECT_THAT(files_below(install()), ElementsAreArray(expected));
}

TEST_F(Install, NamesNoPathOfTheTreeOrTheBuildOrTheFirstPrefix)
{
    const fs::path prefix = install();
    int looked_at = 0;
    for (const auto &entry : fs::recursive_directory_iterator(prefix)) {
        if (entry.is_regular_file()) {
            ++looked_at;
            EXPECT_THAT(read_file(entry), AllOf(Not(HasSubstr(kSource)), Not(HasSubstr(kBuild)),
                                                Not(HasSubstr(work("first")))))
                << entry.path();
        }
    }
    EXPECT_GT(looked_at, 15);
}

TEST_F(Install, WithoutTheToolsHasNoFptest)
{
    output_of(kCMake + " -S " + quoted(kSource) + " -B " + quoted(work("plain")) +
              " -DQUILLMARK_BUILD_TOOLS=OFF -DCMAKE_DISABLE_FIND_PACKAGE_CLI11=ON");
    output_of(kCMake + " --build " + quoted(work("plain")));
    const fs::path prefix = install(work("plain"));

    EXPECT_TRUE(fs::exists(prefix / INSTALL_LIBDIR / "libquillmark.so"));
    EXPECT_TRUE(fs::exists(prefix / "share/man/man5/quillmark-plan.5"));
    for (const std::string &file : files_below(prefix)) {
        EXPECT_THAT(file, Not(HasSubstr("fptest")));
    }
}

TEST_F(Install, FptestRunsFromAnyPlace)
{
    const std::string fptest = quoted(install() + "/bin/fptest");

    EXPECT_EQ(output_of(fptest + " --version"), "fptest " PROJECT_VERSION "\n");
    EXPECT_THAT(output_of(fptest + " check " + quoted(kSource + "/plans/demo.xml")),
                HasSubstr("0 errors, 0 warnings"));
    EXPECT_THAT(output_of("ldd " + fptest), Not(HasSubstr(kBuild + "/lib")));
}

// The loader's own listing of where it finds libvorlane.so for a program.
std::string vorlane_of(const std::string &environment, const std::string &program)
{
    const std::string listing = output_of(environment + " ldd " + quoted(program));
    std::smatch found;
    std::regex_search(listing, found, std::regex("libvorlane\\.so => (.+) \\(0x"));
    return found[1].matched ? fs::weakly_canonical(found[1].str()).string() : listing;
}

TEST_F(Install, AMakersLibraryTakesThePlaceOfTheInstalledOne)
{
    const std::string prefix = install();
    const std::string own = prefix + "/" INSTALL_LIBDIR "/quillmark/libvorlane.so";
    fs::create_directory(work("maker"));
    fs::copy(own, work("maker"));

    EXPECT_EQ(vorlane_of("", prefix + "/bin/fptest"), own);
    EXPECT_EQ(vorlane_of("LD_LIBRARY_PATH=" + quoted(work("maker")), prefix + "/bin/fptest"),
              work("maker") + "/libvorlane.so");
}

// --- who builds on it ---------------------------------------------------------

TEST_F(Install, PlainCompilerBuildsTheAgentThatTheReadmeShows)
{
    const std::string source = read_file(kConsumers + "/agent.c");
    EXPECT_THAT(read_file(kSource + "/README.md"),
                HasSubstr("```c\n" + source.substr(source.find("#include")) + "```"));

    output_of(kCompile + quoted(work("agent")) + " " + flags(install()));
    expect_agent_works(work("agent"));
}

TEST_F(Install, PkgConfigTellsACompilerItsFlags)
{
    const std::string prefix = install();
    const std::string libraries = prefix + "/" INSTALL_LIBDIR;
    // by another name: pkg-config prints nothing where a path has an apostrophe
    const TemporaryDirectory directory;
    const std::string link = directory.path("prefix");
    fs::create_directory_symlink(prefix, link);
    const std::string ask =
        "PKG_CONFIG_PATH=" + quoted(link + "/" INSTALL_LIBDIR "/pkgconfig") + " pkg-config ";
    output_of(kCompile + quoted(work("agent")) + " $(" + ask + "--cflags --libs quillmark) " +
              "-Wl,-rpath," + quoted(libraries));
    expect_agent_works(work("agent"));

    std::string said = output_of(ask + "--variable=libdir quillmark");
    said.erase(said.find_last_not_of('\n') + 1);
    EXPECT_EQ(fs::weakly_canonical(said), libraries);
    EXPECT_EQ(output_of(ask + "--modversion quillmark"), PROJECT_VERSION "\n");
    EXPECT_THAT(output_of(ask + "--libs quillmark"), Not(HasSubstr("mxml")));
    EXPECT_THAT(output_of(ask + "--libs --static quillmark"), HasSubstr("-lmxml"));
}

TEST_F(Install, FindPackageGivesATargetForCAndCpp)
{
    const std::string build = consumer("find_package", "-DCMAKE_PREFIX_PATH=" + quoted(install()));
    expect_agent_works(build + "/agent");
    expect_reader_works(build + "/reader");
    EXPECT_THAT(read_file(build + "/CMakeCache.txt"),
                HasSubstr("quillmark_DIR:PATH=" + work("moved") + "/"));
}

TEST_F(Install, FindPackageRefusesAnotherMajorVersion)
{
    const std::string options = "-DCMAKE_PREFIX_PATH=" + quoted(install());
    EXPECT_EQ(run_shell(configure("find_package", options + " -DWANTED=1.0.0")).status, 0);
    for (const char *version : {"0.9", "1.999", "2.0"}) {
        const Ended outcome =
            run_shell(configure("find_package", options + " -DWANTED=" + std::string(version)));
        EXPECT_NE(outcome.status, 0) << version;
        EXPECT_THAT(in_one_line(outcome.out),
                    HasSubstr("quillmarkConfig.cmake, version: " PROJECT_VERSION));
    }
}

TEST_F(Install, FindPackageSaysThatMiniXmlIsMissing)
{
    // nothing but what is named is looked for in a root that does not exist
    const Ended outcome = run_shell(
        configure("find_package",
                  "-Dquillmark_DIR=" + quoted(install() + "/" INSTALL_LIBDIR "/cmake/quillmark") +
                      " -DCMAKE_FIND_ROOT_PATH=/nowhere"
                      " -DCMAKE_FIND_ROOT_PATH_MODE_INCLUDE=ONLY"
                      " -DCMAKE_FIND_ROOT_PATH_MODE_LIBRARY=ONLY"));
    EXPECT_NE(outcome.status, 0);
    EXPECT_THAT(in_one_line(outcome.out),
                HasSubstr("Reason given by package: Mini-XML is missing: install libmxml-dev, or "
                          "set MINIXML_INCLUDE_DIR "
                          "and MINIXML_LIBRARY"));
}

TEST_F(Install, AddSubdirectoryBuildsTheLibraryAloneAndInstallsNothingOfIt)
{
    // a warning that it has, of which the other project makes no error
    const std::string build = consumer("subdirectory", "-DQUILLMARK_TREE=" + quoted(kSource) +
                                                           " -DCMAKE_DISABLE_FIND_PACKAGE_CLI11=ON"
                                                           " -DCMAKE_CXX_FLAGS=-Wold-style-cast");
    expect_agent_works(build + "/agent");
    expect_reader_works(build + "/reader");

    EXPECT_THAT(files_below(install(build)), ElementsAreArray({"bin/agent"}));
}

TEST_F(Install, AddSubdirectoryMayInstallItForOthers)
{
    const std::string build =
        consumer("subdirectory", "-DQUILLMARK_TREE=" + quoted(kSource) + " -DQUILLMARK_INSTALL=ON");
    EXPECT_FALSE(fs::exists(build + "/compile_commands.json"));
    const std::string prefix = install(build);
    expect_agent_works(consumer("find_package", "-DCMAKE_PREFIX_PATH=" + quoted(prefix)) +
                       "/agent");
}

TEST_F(Install, PkgConfigNamesTheMiniXmlThatWasNamed)
{
    fs::create_directory(work("mini"));
    fs::copy(MINIXML_HEADER, work("mini"));
    fs::create_symlink(MINIXML_LIBRARY, work("mini/libmine.so"));
    output_of(kCMake + " -S " + quoted(kSource) + " -B " + quoted(work("plain")) +
              " -DQUILLMARK_BUILD_TOOLS=OFF -DMINIXML_INCLUDE_DIR=" + quoted(work("mini")) +
              " -DMINIXML_LIBRARY=" + quoted(work("mini/libmine.so")));
    output_of(kCMake + " --build " + quoted(work("plain")));
    const std::string prefix = install(work("plain"));

    // which knows no Mini-XML of the machine's
    const std::string said =
        output_of("PKG_CONFIG_LIBDIR=" + quoted(prefix + "/" INSTALL_LIBDIR "/pkgconfig") +
                  " pkg-config --cflags --libs --static quillmark");
    EXPECT_THAT(said, HasSubstr("/mini"));
    EXPECT_THAT(said, HasSubstr("libmine.so"));
}

TEST_F(Install, AddSubdirectoryFindsTheTestsToo)
{
    output_of(configure("subdirectory", "-DQUILLMARK_TREE=" + quoted(kSource) +
                                            " -DQUILLMARK_BUILD_TOOLS=ON"
                                            " -DQUILLMARK_BUILD_TESTS=ON"));
}

} // namespace
