// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The completion of fptest's command line in bash.
#include "../quoted.h"
#include "support/files.h"
#include "support/process.h"
#include "support/temporary_directory.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <string>
#include <vector>

using support::read_file;
using support::write_file;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::UnorderedElementsAre;
using ::testing::UnorderedElementsAreArray;

namespace
{

using Lines = std::vector<std::string>;

Lines output_of(const std::string &command)
{
    const support::Ended ended = support::run_shell(command);
    EXPECT_EQ(ended.status, 0) << command;
    return support::lines_of(ended.out);
}

// Each test has an fptest that lists what the test says, and notes how it was
// called.
class Completion : public ::testing::Test
{
  protected:
    void SetUp() override
    {
        lists("demo/Bringup/SpiCheck   /system/bin/SpiCheck --group Bringup\n"
              "demo/Bringup/DeadPixel  /system/bin/DeadPixel\n"
              "demo/Gather/SensorProbe  /system/bin/SensorProbe x  y\n");
        std::filesystem::create_directory(directory_.path("plans"));
        write_file(directory_.path("plans/demo.xml"), "");
        write_file(directory_.path("plans/other plan.xml"), "");
    }

    void lists(const std::string &text, int status = 0)
    {
        write_file(directory_.path("list"), text);
        write_file(directory_.path("fptest"), "#!/bin/sh\nprintf '%s|' \"$@\" >>calls\n"
                                              "echo noise >&2\ncat list\nexit " +
                                                  std::to_string(status) + "\n");
        std::filesystem::permissions(directory_.path("fptest"), std::filesystem::perms::owner_all);
    }

    // What is offered for the last of the words, each of them a word of bash.
    Lines offered(const std::string &words) const
    {
        write_file(directory_.path("try"),
                   "source " + quoted(QUILLMARK_SOURCE_DIR "/agent/completion/fptest") +
                       "\n"
                       "PATH=/usr/bin:/bin\n"
                       "COMP_WORDS=(./fptest " +
                       words +
                       ")\nCOMP_CWORD=$((${#COMP_WORDS[@]} - 1))\n"
                       "_fptest ./fptest\n"
                       "for one in \"${COMPREPLY[@]}\"; do\n"
                       "printf '%s\\n' \"$one\"\ndone\n");
        return output_of("cd '" + directory_.path("") + "' && /usr/bin/bash -u try 2>&1");
    }
    std::string calls() const
    {
        return read_file(directory_.path("calls"));
    }
    bool was_called() const
    {
        return std::filesystem::exists(directory_.path("calls"));
    }

    support::TemporaryDirectory directory_;
};

TEST_F(Completion, OffersTheSubCommands)
{
    EXPECT_THAT(offered("''"), UnorderedElementsAre("check", "report", "run", "send", "show"));
    EXPECT_THAT(offered("re"), ElementsAre("report"));
    EXPECT_THAT(offered("s"), UnorderedElementsAre("send", "show"));
    EXPECT_THAT(offered("x"), IsEmpty());
    EXPECT_FALSE(was_called());
}

// The options that a help text lists.
Lines options_of(const std::string &command)
{
    Lines options;
    for (const std::string &line : output_of(quoted(FPTEST_PROGRAM) + " " + command + " --help")) {
        if (!line.starts_with("  -")) {
            continue;
        }
        const std::string names = line.substr(2, line.find(' ', 2) - 2);
        options.push_back(names.substr(names.find(',') + 1)); // of "-h,--help" the long one
    }
    return options;
}

TEST_F(Completion, OffersEveryOptionThatTheHelpTells)
{
    for (const char *command : {"run", "check", "show", "report", "send"}) {
        const Lines expected = options_of(command);
        EXPECT_FALSE(expected.empty());
        EXPECT_THAT(offered(std::string(command) + " -"), UnorderedElementsAreArray(expected))
            << command;
    }
    EXPECT_THAT(offered("-"), UnorderedElementsAreArray(options_of("")));
}

TEST_F(Completion, OffersOptionsByTheirBeginning)
{
    EXPECT_THAT(offered("run --pl"), ElementsAre("--plan"));
    EXPECT_THAT(offered("run --plan x demo/Bringup --j"), ElementsAre("--json", "--junit"));
    EXPECT_THAT(offered("send --p"), IsEmpty());
}

TEST_F(Completion, OffersFilesWhereOneIsWanted)
{
    for (const char *words :
         {"run --plan pl", "run --junit pl", "run --json pl", "run --log pl", "run --plan = pl",
          "send --log pl", "report --log pl", "check pl", "check x pl", "show pl"}) {
        EXPECT_THAT(offered(words), ElementsAre("plans")) << words;
    }
    EXPECT_THAT(offered("show plans/"),
                UnorderedElementsAre("plans/demo.xml", "plans/other plan.xml"));
    EXPECT_THAT(offered("run --plan ="), ::testing::Contains("plans"));
    EXPECT_THAT(offered("show plans/demo.xml pl"), IsEmpty());
    EXPECT_THAT(offered("show --help pl"), ElementsAre("plans"));
    EXPECT_FALSE(was_called());
}

TEST_F(Completion, OffersTheCodesThatTheModuleKnows)
{
    EXPECT_THAT(offered("run --pass-code ''"), ElementsAre("0", "1", "-2"));
    EXPECT_THAT(offered("report G I --result -"), ElementsAre("-2"));
}

TEST_F(Completion, OffersNothingWhereANumberOrAWordIsWanted)
{
    for (const char *words : {"run --timeout ''", "run --repeat ''", "report --progress ''",
                              "report --description ''", "send ''"}) {
        EXPECT_THAT(offered(words), IsEmpty()) << words;
    }
    EXPECT_FALSE(was_called());
}

TEST_F(Completion, OffersTheStoredPlansNodePaths)
{
    EXPECT_THAT(offered("run ''"), UnorderedElementsAre("demo/Bringup", "demo/Bringup/DeadPixel",
                                                        "demo/Bringup/SpiCheck", "demo/Gather",
                                                        "demo/Gather/SensorProbe"));
    EXPECT_EQ(calls(), "run|--list|");
    EXPECT_THAT(offered("run --tap demo/Bringup demo/G"),
                UnorderedElementsAre("demo/Gather", "demo/Gather/SensorProbe"));
    EXPECT_THAT(offered("run demo/Bringup/S"), ElementsAre("demo/Bringup/SpiCheck"));
    // the root is called as anyone likes
    EXPECT_THAT(offered("run other/Ga"),
                UnorderedElementsAre("other/Gather", "other/Gather/SensorProbe"));
}

TEST_F(Completion, AsksForThePlanThatIsNamed)
{
    offered("run --plan plans/demo.xml ''");
    EXPECT_EQ(calls(), "run|--plan|plans/demo.xml|--list|");
    offered("run --plan = 'plans/other\\ plan.xml' ''");
    EXPECT_EQ(calls(), "run|--plan|plans/demo.xml|--list|run|--plan|plans/other plan.xml|--list|");
    setenv("HOME", "/home/me", 1);
    offered("run --plan '~/a.xml' ''");
    EXPECT_TRUE(calls().ends_with("run|--plan|/home/me/a.xml|--list|"));
}

TEST_F(Completion, OffersNothingWhereThereIsNoPlan)
{
    lists("demo/Bringup/SpiCheck  x\n", 3);
    EXPECT_THAT(offered("run ''"), IsEmpty());
    EXPECT_THAT(offered("report ''"), IsEmpty());
    lists("");
    EXPECT_THAT(offered("run ''"), IsEmpty());
}

TEST_F(Completion, OffersGroupsAndThenTheirItems)
{
    EXPECT_THAT(offered("report ''"), UnorderedElementsAre("Bringup", "Gather"));
    EXPECT_THAT(offered("report --result -2 G"), ElementsAre("Gather"));
    EXPECT_THAT(offered("report Bringup ''"), UnorderedElementsAre("DeadPixel", "SpiCheck"));
    EXPECT_THAT(offered("report Bringup --progress 100 S"), ElementsAre("SpiCheck"));
    EXPECT_THAT(offered("report Gather ''"), ElementsAre("SensorProbe"));
    EXPECT_THAT(offered("report Nothing ''"), IsEmpty());
    EXPECT_THAT(offered("report Bringup SpiCheck ''"), IsEmpty());
}

TEST_F(Completion, QuotesWhatAPlanSays)
{
    lists("demo/$(touch bad)/`touch bad`;touch bad  x\n"
          "demo/two words/an item's  y\n");
    EXPECT_THAT(offered("run ''"),
                UnorderedElementsAre("demo/\\$\\(touch\\ bad\\)",
                                     "demo/\\$\\(touch\\ bad\\)/\\`touch\\ bad\\`\\;touch\\ bad",
                                     "demo/two\\ words", "demo/two\\ words/an\\ item\\'s"));
    EXPECT_THAT(offered("report tw"), ElementsAre("two\\ words"));
    EXPECT_THAT(offered("report 'two\\ words' an"), ElementsAre("an\\ item\\'s"));
    EXPECT_THAT(offered("run 'demo/two\\ wo'"),
                UnorderedElementsAre("demo/two\\ words", "demo/two\\ words/an\\ item\\'s"));
    EXPECT_FALSE(std::filesystem::exists(directory_.path("bad")));
    lists("demo/G/a,b  x\n");
    EXPECT_THAT(offered("run demo/G/a,"), ElementsAre("demo/G/a\\,b"));
}

TEST_F(Completion, IsBoundToTheName)
{
    EXPECT_THAT(
        output_of("/usr/bin/bash -c " +
                  quoted("source " + quoted(QUILLMARK_SOURCE_DIR "/agent/completion/fptest") +
                         "; complete -p fptest")),
        ElementsAre("complete -F _fptest fptest"));
}

} // namespace
