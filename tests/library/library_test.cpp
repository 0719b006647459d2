// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the product is from outside: its symbols, what it needs, how it compiles.
#include "outside.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <fstream>
#include <regex>
#include <string>
#include <utility>

namespace
{

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::UnorderedElementsAre;

TEST(Library, ExportsTheFourFunctionsAndTheVariableAndNothingElse)
{
    EXPECT_THAT(exports_of(QUILLMARK_LIBRARY),
                UnorderedElementsAre("FPTEST_RunTestCmd", "FPTEST_SetTransation",
                                     "FPTEST_ExtractResultMsg", "FPTEST_SuspendItemExecute",
                                     "g_TestCmdTree"));
}

TEST(Library, NeedsTheCLibraryMiniXmlAndTheMakersLibraryAlone)
{
    EXPECT_THAT(needs_of(QUILLMARK_LIBRARY),
                UnorderedElementsAre("libmxml.so.1]", "libvorlane.so]", "libc.so.6]"));
}

TEST(Library, IsAskedForByItsMajorVersionAndTheMakersByItsPlainName)
{
    for (const std::string library : {QUILLMARK_LIBRARY, SMALL_HERE}) {
        EXPECT_THAT(entries_of(library, "SONAME"), ElementsAre("libquillmark.so.1]"));
    }
    EXPECT_THAT(entries_of(VORLANE_LIBRARY, "SONAME"), ElementsAre("libvorlane.so]"));
}

TEST(Library, OfTheMakerExportsItsInterfacesAndNothingElse)
{
    EXPECT_THAT(exports_of(VORLANE_LIBRARY),
                UnorderedElementsAre("Accept", "Bind", "Setsockopt", "get_node_value",
                                     "mxmlSetLoneWhitespaceOff", "vr_log_printf"));
    EXPECT_THAT(needs_of(VORLANE_LIBRARY), UnorderedElementsAre("libmxml.so.1]", "libc.so.6]"));
}

// --- the source -----------------------------------------------------------

class ModuleSource : public ::testing::TestWithParam<const char *>
{
};

TEST_P(ModuleSource, CompilesWithoutAWarning)
{
    const std::string compiler = GetParam();
    for (const char *options : {"-O0", "-Os -DNDEBUG", "-O2", "-O3 -DNDEBUG"}) {
        const Ended compiled = run_shell(
            compiler + " -std=c++20 " + options +
            " -Wall -Wextra -Wpedantic -Wconversion -Wshadow -Werror -fPIC -fno-exceptions"
            " -fno-rtti -I" +
            quoted(kSource + "/vorlane") + " -c -o /dev/null " +
            quoted(kSource + "/src/quillmark.cpp"));
        EXPECT_EQ(compiled.status, 0) << compiler << " " << options << "\n" << compiled.out;
    }
}

INSTANTIATE_TEST_SUITE_P(Compilers, ModuleSource, ::testing::Values("g++", "clang++"),
                         [](const auto &compiler) {
                             return std::string(compiler.param) == "g++" ? "Gcc" : "Clang";
                         });

TEST(ModuleSource, IncludesHeadersOfTheCLibraryAlone)
{
    const std::regex include(R"re(\s*#\s*include\b.*)re");
    const std::regex wanted(
        "#include (<(assert|errno|fcntl|mxml|netinet/in|signal|stdarg|stdint|stdio|stdlib|string"
        "|sys/socket|sys/types|sys/wait|unistd)\\.h>"
        "|\"(quillmark|mxml_whitespace|sockwrap|sysparm|vr_log)\\.h\")( .*)?");
    int includes = 0;
    for (const char *file : {"/src/quillmark.cpp", "/src/quillmark.h"}) {
        std::ifstream source(kSource + file);
        for (std::string line; std::getline(source, line);) {
            if (std::regex_match(line, include)) {
                ++includes;
                EXPECT_TRUE(std::regex_match(line, wanted)) << file << ": " << line;
            }
        }
    }
    EXPECT_GT(includes, 10);
}

TEST(PublicHeader, IsUsableByItselfFromC11AndCpp)
{
    const TemporaryDirectory directory;
    const std::string text = "#include \"quillmark.h\"\n"
                             "int use(void);\n"
                             "int use(void)\n"
                             "{\n"
                             "    char reply[64];\n"
                             "    fpTest_TestMsg_t message;\n"
                             "    mxml_node_t *tree = g_TestCmdTree;\n"
                             "    FPTEST_ExtractResultMsg(reply, (int)sizeof reply);\n"
                             "    message.testMsgHead[0] = reply[0];\n"
                             "    return FPTEST_RunTestCmd(\"pingtest\", reply, 64)\n"
                             "        + FPTEST_SetTransation(\"g\", \"i\", 1, 0, 0)\n"
                             "        + FPTEST_SuspendItemExecute() + message.testMsgHead[0]\n"
                             "        + (tree != 0);\n"
                             "}\n";
    const std::pair<const char *, const char *> ways[] = {{"gcc -std=c11", "use.c"},
                                                          {"clang -std=c11", "use.c"},
                                                          {"g++ -std=c++11", "use.cpp"},
                                                          {"clang++ -std=c++20", "use.cpp"}};
    for (const auto &[compiler, name] : ways) {
        const Ended compiled = run_shell(
            std::string(compiler) + " -Wall -Wextra -Wpedantic -Werror -I" +
            quoted(kSource + "/src") + " -c -o /dev/null " + quoted(directory.write(name, text)));
        EXPECT_EQ(compiled.status, 0) << compiler << "\n" << compiled.out;
    }
}

// --- the tests themselves ---------------------------------------------------

TEST(Quoted, IsOneWordOfTheShell)
{
    const std::string text = "a  b'c''\"$HOME;*\\";
    EXPECT_EQ(run_shell("printf '<%s>' " + quoted(text) + " " + quoted("")).out,
              "<" + text + "><>");
}

// --- a Mini-XML that is named ---------------------------------------------

// What comes of it, with single blanks.
Ended configure_with(const TemporaryDirectory &directory, const std::string &header_directory,
                     const std::string &library)
{
    directory.write("CMakeLists.txt", "cmake_minimum_required(VERSION 3.25)\n"
                                      "project(version NONE)\n"
                                      "include(\"" +
                                          kSource +
                                          "/cmake/MiniXml.cmake\")\n"
                                          "message(\"is ${MINIXML_LIBRARY}\")\n");
    Ended outcome =
        run_shell("cd " + quoted(directory.path()) + " && rm -rf build && cmake -B build" +
                  " -DMINIXML_INCLUDE_DIR=" + quoted(header_directory) +
                  " -DMINIXML_LIBRARY=" + quoted(library));
    outcome.out = std::regex_replace(outcome.out, std::regex("\\s+"), " ");
    return outcome;
}

Ended configure_with_version(const TemporaryDirectory &directory, const std::string &major,
                             const std::string &minor)
{
    directory.write("mxml.h", "#  define MXML_MAJOR_VERSION " + major +
                                  "\n#  define MXML_MINOR_VERSION " + minor + "\n");
    return configure_with(directory, directory.path(), directory.write("libmxml.so", ""));
}

TEST(NamedMiniXml, MayStandInARelativePath)
{
    const TemporaryDirectory directory;
    directory.write("here/mxml.h", "#define MXML_MAJOR_VERSION 3\n#define MXML_MINOR_VERSION 2\n");
    directory.write("here/libmxml.so", "");

    const Ended outcome = configure_with(directory, "here", "here/libmxml.so");
    EXPECT_EQ(outcome.status, 0) << outcome.out;
    EXPECT_THAT(outcome.out, HasSubstr("is " + directory.path("here/libmxml.so") + " "));
}

TEST(NamedMiniXml, IsRefusedWhereItIsNotThere)
{
    const TemporaryDirectory directory;
    const std::string place = directory.path();
    directory.write("mxml.h", "#define MXML_MAJOR_VERSION 3\n#define MXML_MINOR_VERSION 2\n");

    for (const std::string &library : {place + "/absent.so", place}) {
        const Ended outcome = configure_with(directory, place, library);
        EXPECT_NE(outcome.status, 0);
        EXPECT_THAT(outcome.out, HasSubstr("MINIXML_LIBRARY names no file: " + library + " "));
    }
    const Ended outcome = configure_with(directory, place + "/absent", place + "/mxml.h");
    EXPECT_NE(outcome.status, 0);
    EXPECT_THAT(outcome.out, HasSubstr("MINIXML_INCLUDE_DIR has no mxml.h: " + place + "/absent "));
}

TEST(MiniXmlVersion, From2Point7To3IsTaken)
{
    const TemporaryDirectory directory;
    for (const auto &[major, minor] : {std::pair("2", "7"), {"2", "12"}, {"3", "0"}, {"3", "3"}}) {
        EXPECT_EQ(configure_with_version(directory, major, minor).status, 0)
            << major << "." << minor;
    }
}

TEST(MiniXmlVersion, AnyOtherIsRefusedWithTheReason)
{
    const TemporaryDirectory directory;
    for (const auto &[major, minor] : {std::pair("2", "6"), {"4", "0"}}) {
        const Ended outcome = configure_with_version(directory, major, minor);
        EXPECT_NE(outcome.status, 0);
        EXPECT_THAT(outcome.out,
                    HasSubstr(std::string("is Mini-XML ") + major + "." + minor +
                              ", but Quillmark uses the interface of 2.7 to 3.x: install "
                              "libmxml-dev, or set MINIXML_INCLUDE_DIR and MINIXML_LIBRARY"));
    }
}

} // namespace
