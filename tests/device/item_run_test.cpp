// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Items run through the real shell: what is started, in which order, under
// which name, and what the library says of it.
#include "device_test.h"

#include <chrono>
#include <unistd.h>

namespace
{

using ItemRun = DeviceTest;

TEST_F(ItemRun, OrdinaryItemHasEndedWhenTheCommandReturns)
{
    store(plan_of({{"G", {{"Note", "--sleep 0.4 a"}}}}));
    const auto start = std::chrono::steady_clock::now();
    run_path("P/G/Note");
    const std::chrono::duration<double> took = std::chrono::steady_clock::now() - start;

    EXPECT_GE(took.count(), 0.4);
    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|--sleep|0.4|a"));
    EXPECT_THAT(processes_named("/system/bin/Note"), IsEmpty());
}

TEST_F(ItemRun, OrdinaryItemLogsEveryStepInOrder)
{
    store(plan_of({{"G", {{"Note", "-t 5"}}}}));
    log_lines();
    run_path("P/G/Note");

    EXPECT_THAT(
        log_lines(),
        ElementsAre("fptest_ParseCmdLine| testHead is : XMLNodePath",
                    "fptest_ParseCmdLine| testName is : P/G/Note",
                    "fptest_ItemsTest| Input cmdline : P/G/Note", "get_node_level| level = 3",
                    "get_node_level| node name = Note", "get_node_name| enter...",
                    "get_node_name| root node:P", "get_node_name| mid node:G",
                    "get_node_name| leaf node:Note", "get_node_index| enter...",
                    "SingleItemExecute| enter... !", "get_node_byIndex| enter...",
                    "get_node_byIndex| curernt leaf node name = Note", "get_node_byIndex| leave...",
                    "SingleItemExecute| mxmlElementGetAttr name=Note- args=-t 5",
                    "ResourceReduce| \ncbuf=ps | grep /system/bin/SensorProbe",
                    "ResourceReduce| target process not exist!",
                    "SingleItemExecute| tpCmd:/system/bin/Note -t 5",
                    "SingleItemExecute| leave... !"));
}

TEST_F(ItemRun, GroupRunsEveryItemInDocumentOrder)
{
    store(plan_of({{"Other", {{"Note", "other"}}},
                   {"G", {{"Note", "1"}, {"ab", "2"}, {"Note", "3"}}},
                   {"Last", {{"Note", "last"}}}}));
    run_path("P/G");

    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|1", "/system/bin/ab|2", "/system/bin/Note|3"));
}

TEST_F(ItemRun, GroupOfFortyItemsRunsThemAll)
{
    std::vector<PlanItem> items;
    Lines expected;
    for (int item = 0; item < 40; ++item) {
        items.push_back({"ab", std::to_string(item)});
        expected.push_back("/system/bin/ab|" + std::to_string(item));
    }
    const std::string plan = plan_of({{"G", items}});
    ASSERT_LE(plan.size(), 2048U);
    store(plan);
    run_path("P/G");

    EXPECT_EQ(ran(), expected);
}

TEST_F(ItemRun, ProgramThatIsMissingIsNoReasonToStop)
{
    store(plan_of({{"G", {{"NoSuchProgram", ""}, {"Note", "after"}}}}));
    log_lines();
    run_path("P/G");

    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|after"));
    EXPECT_THAT(log_lines(),
                IsSupersetOf({"SingleItemExecute| tpCmd:/system/bin/NoSuchProgram ",
                              "SingleItemExecute| leave... !", "SingleItemExecute| leave... !"}));
}

TEST_F(ItemRun, ShellRefusesAnItemWithoutArguments)
{
    store("<P><CmdGroup name=\"G\"><Cmd name=\"Note\"/><Cmd name=\"Note\" args=\"\"/>"
          "</CmdGroup></P>");
    log_lines();
    testing::internal::CaptureStderr();
    run_path("P/G");

    EXPECT_THAT(testing::internal::GetCapturedStderr(), HasSubstr("syntax error"));
    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note"));
    EXPECT_THAT(log_lines(),
                IsSupersetOf({"SingleItemExecute| mxmlElementGetAttr name=Note- args=(null)",
                              "SingleItemExecute| tpCmd:/system/bin/Note (null)"}));
}

TEST_F(ItemRun, NameThatTheCutLeavesEmptyStillRuns)
{
    store("<P><CmdGroup name=\"G\"><Cmd name=\"&#9;cd\" args=\"x\"/></CmdGroup></P>");
    log_lines();
    testing::internal::CaptureStderr();
    run_path("P/G");

    EXPECT_NE(testing::internal::GetCapturedStderr(), "") << "the shell cannot run a directory";
    EXPECT_THAT(log_lines(), IsSupersetOf({"SingleItemExecute| tpCmd:/system/bin/ x",
                                           "SingleItemExecute| leave... !"}));
    EXPECT_THAT(ran(), IsEmpty());
}

TEST_F(ItemRun, NameOfAHundredCharactersIsRunWhole)
{
    const std::string name(100, 'n');
    store(plan_of({{"G", {{name, "x"}}}}));
    run_path("P/G");

    EXPECT_THAT(ran(), ElementsAre("/system/bin/" + name + "|x"));
}

TEST_F(ItemRun, CommandLineIsCutTo1024Characters)
{
    store(plan_of({{"G", {{"Note", std::string(1500, 'x')}}}}));
    run_path("P/G");

    const std::string start = "/system/bin/Note ";
    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|" + std::string(1024 - start.size(), 'x')));
}

TEST_F(ItemRun, VendorOneAppendsItsSuffix)
{
    set_vendor("1");
    store(plan_of({{"G", {{"Note", "x"}, {"SensorProbe_ca", "y"}}}}));
    log_lines();
    run_path("P/G");

    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note_ca|x", "/system/bin/SensorProbe_ca_ca|y"));
    EXPECT_THAT(log_lines(), IsSupersetOf({"SingleItemExecute| tLine:Note_ca",
                                           "SingleItemExecute| tpCmd:/system/bin/Note_ca x"}));
}

TEST_F(ItemRun, VendorTwoAppendsItsSuffix)
{
    set_vendor("2");
    store(plan_of({{"G", {{"Note", "x"}}}}));
    log_lines();
    run_path("P/G");

    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note_ca_qsee|x"));
    EXPECT_THAT(log_lines(), Contains("SingleItemExecute| tLine:Note_ca_qsee"));
}

TEST_F(ItemRun, VendorMayHaveABlankBeforeAndLettersAfter)
{
    store(plan_of({{"G", {{"Note", "x"}}}}));
    for (const char *text : {" 1", "1abc"}) {
        set_vendor(text);
        run_path("P/G");
    }
    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note_ca|x", "/system/bin/Note_ca|x"));
}

TEST_F(ItemRun, OtherVendorsRunNothing)
{
    store(plan_of({{"G", {{"Note", "x"}}}}));
    for (const char *text : {"3", "-1"}) {
        set_vendor(text);
        log_lines();
        run_path("P/G");
        EXPECT_EQ(log_lines().back(), "SingleItemExecute| More than one vendor, Setting error!");
    }
    EXPECT_THAT(ran(), IsEmpty());
}

TEST_F(ItemRun, VendorIsReadAfreshForEveryItemOfAGroup)
{
    set_vendor("0");
    store(plan_of({{"G", {{"Note", "--vendor 2"}, {"Note", "--vendor 1"}, {"Note", "x"}}}}));
    run_path("P/G");

    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|--vendor|2",
                                   "/system/bin/Note_ca_qsee|--vendor|1", "/system/bin/Note_ca|x"));
}

TEST_F(ItemRun, StandardOutputCarriesTheVendorLineAndNothingElse)
{
    store(plan_of({{"G", {{"Note", "x"}, {"Note", "--vendor 1"}, {"ab", "y"}}}}));
    testing::internal::CaptureStdout();
    FPTEST_RunTestCmd("XMLNodePath::P/G", nullptr, 0);
    FPTEST_RunTestCmd("XMLNodePath::P/G/NoSuchItem", nullptr, 0);
    FPTEST_RunTestCmd("XMLNodePath::P", nullptr, 0);

    EXPECT_EQ(testing::internal::GetCapturedStdout(),
              "vendor = 0\nvendor = 0\nvendor = 1\nvendor = 1\n");
}

} // namespace
