// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// fptest report: how a shell script reports.
#include "fptest_runner.h"

#include <chrono>
#include <filesystem>
#include <fstream>
#include <regex>
#include <sys/stat.h>
#include <thread>

namespace fs = std::filesystem;

namespace
{

const std::string kReportedPlan =
    plan_of({{"Bringup", {{"SpiCheck", "a"}, {"DeadPixel", ""}}}, {"Endurance", {{"BurnIn", ""}}}});

class ReportCommand : public FptestTest
{
  protected:
    void SetUp() override
    {
        FptestTest::SetUp();
        write_file(kPlanFile, kReportedPlan);
    }

    static Ended report(std::vector<std::string> arguments)
    {
        arguments.insert(arguments.begin(), "report");
        return run_fptest(arguments);
    }

    // Of an item that "fptest show" names.
    static std::string row(const std::string &item)
    {
        for (const std::string &line : lines_of(run_fptest({"show"}).out)) {
            if (line.find(" " + item + " ") != std::string::npos) {
                return std::regex_replace(line, std::regex("  +"), " ");
            }
        }
        return "none";
    }

    // Refused with that line, and the plan as it was.
    static void expect_refusal(int status, const std::string &line,
                               const std::vector<std::string> &arguments)
    {
        std::vector<std::string> all = {"report"};
        all.insert(all.end(), arguments.begin(), arguments.end());
        fptest_runner::expect_refusal(status, line, all);
        EXPECT_EQ(read_file(kPlanFile), kReportedPlan);
    }
};

TEST_F(ReportCommand, WritesProgressResultAndDescription)
{
    const Ended ended = report({"Bringup", "SpiCheck", "--progress", "50", "--result", "-2",
                                "--description", "half of it"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "");
    EXPECT_EQ(ended.err, "");
    EXPECT_THAT(read_file(kPlanFile),
                HasSubstr("<Cmd name=\"SpiCheck\" args=\"a\" progress=\"50\" result=\"-2\"\n"
                          "description=\"half of it\" />"));
    EXPECT_EQ(row("SpiCheck"), "Bringup SpiCheck 50 -2 half of it");
    EXPECT_EQ(row("DeadPixel"), "Bringup DeadPixel - - -");
}

// Mini-XML writes a byte order mark and does not read it again.
TEST_F(ReportCommand, TakesADescriptionWithAByteOrderMark)
{
    for (const auto &[description, shown] :
         std::vector<std::pair<std::string, std::string>>{{"a\uFEFF"
                                                           "b",
                                                           " ab"},
                                                          {"\uFEFFx", " x"},
                                                          {"\uFEFF", ""}}) {
        const Ended ended = report({"Bringup", "SpiCheck", "--progress", "100", "--result", "0",
                                    "--description", description});
        EXPECT_EQ(ended.status, 0);
        EXPECT_EQ(ended.err, "");
        EXPECT_EQ(row("SpiCheck"), "Bringup SpiCheck 100 0" + shown);
    }
}

TEST_F(ReportCommand, TakesItsOptionsInAnyPlace)
{
    EXPECT_EQ(report({"--result=1", "Endurance", "--progress=100", "BurnIn"}).status, 0);
    EXPECT_EQ(row("BurnIn"), "Endurance BurnIn 100 1");
    EXPECT_EQ(
        report({"--progress", "0", "--result", "0", "--description", "-x", "Endurance", "BurnIn"})
            .status,
        0);
    EXPECT_EQ(row("BurnIn"), "Endurance BurnIn 0 0 -x");
}

TEST_F(ReportCommand, ReplacesTheReportBefore)
{
    EXPECT_EQ(report({"Bringup", "SpiCheck", "--progress", "10", "--result", "-2", "--description",
                      "first"})
                  .status,
              0);
    EXPECT_EQ(report({"Bringup", "SpiCheck", "--progress", "100", "--result", "0"}).status, 0);
    const std::string text = read_file(kPlanFile);
    EXPECT_EQ(text.find("first"), std::string::npos) << text;
    EXPECT_EQ(row("SpiCheck"), "Bringup SpiCheck 100 0");
}

TEST_F(ReportCommand, TakesAnyNumberThatThePlanCanHold)
{
    const std::pair<std::string, std::string> numbers[] = {
        {"-99999999", "-99999999"},
        {"999999999", "999999999"},
        {"0", "0"},
        {"010", "10"},
        {"08", "8"},
    };
    for (const auto &[progress, stored] : numbers) {
        EXPECT_EQ(report({"Bringup", "SpiCheck", "--progress", progress, "--result", "0"}).status,
                  0);
        EXPECT_EQ(row("SpiCheck"), "Bringup SpiCheck " + stored + " 0");
    }
}

struct Text {
    std::string name;
    std::string given;
    std::string shown;
    bool is_replaced = false;
};

class ReportDescription : public ReportCommand, public WithParamInterface<Text>
{
};

TEST_P(ReportDescription, IsReadBackAsItWasGiven)
{
    const auto &[name, given, shown, is_replaced] = GetParam();
    const Ended ended =
        report({"Bringup", "SpiCheck", "--progress", "1", "--result", "0", "--description", given});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err,
              is_replaced ? "fptest: bytes of the description that no plan can hold are replaced\n"
                          : "");
    EXPECT_THAT(run_fptest({"show"}).out, HasSubstr("  " + shown + "\n"));
    // later reports find a plan that loads
    EXPECT_EQ(report({"Bringup", "DeadPixel", "--progress", "1", "--result", "0"}).status, 0);
    EXPECT_THAT(run_fptest({"show"}).out, HasSubstr("  " + shown + "\n"));
}

INSTANTIATE_TEST_SUITE_P(
    , ReportDescription,
    Values(Text{"Markup", "&<>\"' &amp; ]]> <!--", "&<>\"' &amp; ]]> <!--"},
           Text{"Blanks", "one\ntwo\tthree", "one␊two␉three"},
           Text{"Colon", "at 12:30", "at 12:30"}, Text{"Utf8", "指紋 µ", "指紋 µ"},
           Text{"NoXml", "a\xEF\xBF\xBF\xEF\xBF\xBE", "a\uFFFD\uFFFD", true},
           Text{"ControlBytes", "a\x01\x1b[0m\x7f", "a␁␛[0m␡", true},
           Text{"NoUtf8", "a\xff\xfez", "a��z", true},
           Text{"TenThousandCharacters", std::string(10000, 'd'), std::string(10000, 'd')}),
    [](const auto &text) { return text.param.name; });

TEST_F(ReportCommand, NamesTheNearestGroupAndAllThereAre)
{
    expect_refusal(2,
                   "fptest: the stored plan has no group 'Brngup'; did you mean 'Bringup'? It has "
                   "Bringup and Endurance",
                   {"Brngup", "SpiCheck", "--progress", "1", "--result", "0"});
    expect_refusal(2, "fptest: the stored plan has no group 'x'; it has Bringup and Endurance",
                   {"x", "SpiCheck", "--progress", "1", "--result", "0"});
}

TEST_F(ReportCommand, NamesTheNearestItemAndAllOfTheGroup)
{
    expect_refusal(2,
                   "fptest: group 'Bringup' of the stored plan has no item 'SpiChek'; did you mean "
                   "'SpiCheck'? It has SpiCheck and DeadPixel",
                   {"Bringup", "SpiChek", "--progress", "1", "--result", "0"});
    // the library would annotate the item of the next group
    expect_refusal(2,
                   "fptest: group 'Bringup' of the stored plan has no item 'BurnIn'; it has "
                   "SpiCheck and DeadPixel",
                   {"Bringup", "BurnIn", "--progress", "1", "--result", "0"});
}

TEST_F(ReportCommand, WantsAPlan)
{
    fs::remove(kPlanFile);
    const Ended ended = report({"Bringup", "SpiCheck", "--progress", "1", "--result", "0"});
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err, "fptest: no plan is stored in /data/vorlane/src1.xml, so nothing can be "
                         "reported: store one with fptest run --plan FILE\n");
    EXPECT_FALSE(fs::exists(kPlanFile));
}

TEST_F(ReportCommand, WantsAPlanThatLoads)
{
    const std::string broken = "<P><CmdGroup name=\"G\"><Cmd name=\"I\" result=";
    write_file(kPlanFile, broken);
    const Ended ended = report({"G", "I", "--progress", "1", "--result", "0"});
    EXPECT_EQ(ended.status, 3);
    EXPECT_THAT(ended.err, StartsWith("fptest: /data/vorlane/src1.xml does not load ("));
    EXPECT_THAT(ended.err, EndsWith("): store the plan again\n"));
    EXPECT_EQ(read_file(kPlanFile), broken);
}

TEST_F(ReportCommand, WaitsForAPlanThatIsJustBeingSaved)
{
    write_file(kPlanFile, "");
    const std::jthread saves([] {
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
        write_file(kPlanFile, kReportedPlan);
    });
    const Ended ended = report({"Bringup", "SpiCheck", "--progress", "1", "--result", "0"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_THAT(read_file(kPlanFile), HasSubstr("progress=\"1\""));
}

TEST_F(ReportCommand, SaysThatThePlanIsNotWritable)
{
    fs::permissions(kPlanFile, fs::perms::owner_read);
    const Start start{
        .arguments = {"report", "Bringup", "SpiCheck", "--progress", "1", "--result", "0"},
        .prepare = as_plain_user};
    const Ended ended = run_fptest(start);
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err, "fptest: the report is not in /data/vorlane/src1.xml: is it writable? "
                         "--log FILE says why\n");
    EXPECT_EQ(read_file(kPlanFile), kReportedPlan);
}

TEST_F(ReportCommand, SaysThatTheDiskIsFull)
{
    if (is_in_place()) {
        GTEST_SKIP() << "in place, the disk is the container's own and is not to be filled";
    }
    fill_disk();
    const std::string description(10000, 'd');
    const Ended ended = report(
        {"Bringup", "SpiCheck", "--progress", "1", "--result", "0", "--description", description});
    EXPECT_EQ(ended.status, 3);
    EXPECT_TRUE(std::regex_match(
        ended.err, std::regex("fptest: the disk of /data/vorlane is full: make room for \\d+ "
                              "bytes; the stored plan is as it was\n")))
        << ended.err;
    EXPECT_EQ(read_file(kPlanFile), kReportedPlan);
    // it has room where the old text was, for no more than it takes
    EXPECT_EQ(report({"Bringup", "SpiCheck", "--progress", "1", "--result", "0", "--description",
                      std::string(2000, 'd')})
                  .status,
              0);
    // that the run's log has no room is not the item's concern
    EXPECT_EQ(run_program({"/system/bin/sh", "-c",
                           "VR_LOG_FILE=/data/vorlane/log exec fptest report Bringup SpiCheck "
                           "--progress 1 --result 0"})
                  .status,
              0);
}

TEST_F(ReportCommand, WritesTheLibrarysLogWhereItIsTold)
{
    EXPECT_EQ(
        report({"Bringup", "SpiCheck", "--progress", "1", "--result", "0", "--log", work("log")})
            .status,
        0);
    EXPECT_THAT(read_file(work("log")), HasSubstr("input node name = SpiCheck"));
    EXPECT_EQ(read_file(device::kLogFile), "");
}

TEST_F(ReportCommand, IsStoredWhereTheLogOfItsRunCannotBeWritten)
{
    Start start{.arguments = {"report", "Bringup", "SpiCheck", "--progress", "1", "--result", "0"}};
    start.environment["VR_LOG_FILE"] = "/nowhere/log";
    const Ended ended = run_fptest(start);
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "fptest: VR_LOG_FILE=/nowhere/log cannot be written: No such file or "
                         "directory; name another file; this report has no log\n");
    EXPECT_EQ(row("SpiCheck"), "Bringup SpiCheck 1 0");
    fptest_runner::expect_refusal(3,
                                  "fptest: --log /nowhere/log cannot be written: No such file or "
                                  "directory; name another file",
                                  {"report", "Bringup", "SpiCheck", "--progress", "2", "--result",
                                   "0", "--log", "/nowhere/log"});
    EXPECT_EQ(row("SpiCheck"), "Bringup SpiCheck 1 0");
}

TEST_F(ReportCommand, LosesNothingOfManyAtTheSameTime)
{
    std::string plan = "<P><CmdGroup name=\"G\">";
    std::string commands;
    for (int item = 0; item < 20; ++item) {
        const std::string name = "item" + std::to_string(item);
        plan += "<Cmd name=\"" + name + "\" args=\"\"/>";
        commands += "fptest report G " + name + " --progress " + std::to_string(item) +
                    " --result 0 --description d" + std::to_string(item) + " &\n";
    }
    write_file(kPlanFile, plan + "</CmdGroup></P>");
    const Ended ended = run_program({"/system/bin/sh", "-c", commands + "wait"});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "");
    for (int item = 0; item < 20; ++item) {
        const std::string number = std::to_string(item);
        EXPECT_EQ(row("item" + number), "G item" + number + " " + number + " 0 d" + number);
    }
}

TEST_F(ReportCommand, LosesNothingBesideASampleItem)
{
    write_file(kPlanFile, group_of({{"BurnIn", "--group G --seconds 1"}, {"mine", ""}}));
    FptestProcess item({"send", "XMLNodePath::P/G/BurnIn"});
    int reports = 0;
    while (!item.has_ended()) {
        EXPECT_EQ(
            report({"G", "mine", "--progress", std::to_string(++reports), "--result", "0"}).status,
            0);
    }
    EXPECT_GE(reports, 1);
    EXPECT_EQ(row("mine"), "G mine " + std::to_string(reports) + " 0");
    EXPECT_EQ(row("BurnIn"), "G BurnIn 100 0 stable for 1 s");
}

TEST_F(ReportCommand, NeedsNoDeviceButThePlan)
{
    // it does not wait for a run that it is part of
    write_file(kPlanFile, group_of({{"Script", "'fptest report G Script --progress 100 --result 0 "
                                               "--log /dev/null'"}}));
    EXPECT_EQ(run_fptest({"run", "P/G"}).status, 0);
    EXPECT_EQ(row("Script"), "G Script 100 0");
}

} // namespace
