// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Items run through the real shell: what is started, in which order, and under which
// name.
#include "faults.h"

#include <chrono>

namespace
{

using ItemRun = DeviceTest;

TEST_F(ItemRun, OrdinaryItemHasEndedWhenTheCommandReturns)
{
    store(group_of({{"Note", "--sleep 0.4 a"}}));
    const auto start = std::chrono::steady_clock::now();
    run_path("P/G/Note");
    const std::chrono::duration<double> took = std::chrono::steady_clock::now() - start;

    EXPECT_GE(took.count(), 0.4);
    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|--sleep|0.4|a"));
    EXPECT_THAT(processes_named("/system/bin/Note"), IsEmpty());
}

TEST_F(ItemRun, GroupRunsItsFortyItemsAloneInDocumentOrder)
{
    std::vector<PlanItem> items;
    Lines expected;
    for (int item = 0; item < 40; ++item) {
        const std::string name = item % 2 == 0 ? "ab" : "Note";
        items.push_back({name, std::to_string(item)});
        expected.push_back("/system/bin/" + name + "|" + std::to_string(item));
    }
    const std::string plan =
        plan_of({{"Other", {{"Note", "other"}}}, {"G", items}, {"Last", {{"Note", "last"}}}});
    ASSERT_LE(plan.size(), 2048U);
    store(plan);
    run_path("P/G");

    EXPECT_EQ(ran(), expected);
}

TEST_F(ItemRun, ProgramThatIsMissingIsNoReasonToStop)
{
    store(group_of({{"NoSuchProgram", ""}, {"Note", "after"}}));
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

TEST_F(ItemRun, VendorIsReadAfreshForEveryItemOfAGroup)
{
    set_vendor("0");
    store(group_of({{"Note", "--vendor 2"}, {"Note", "--vendor 1"}, {"Note", "x"}}));
    run_path("P/G");

    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|--vendor|2",
                                   "/system/bin/Note_ca_qsee|--vendor|1", "/system/bin/Note_ca|x"));
}

TEST_F(ItemRun, StandardOutputCarriesTheVendorLineAndNothingElse)
{
    store(group_of({{"Note", "x"}, {"Note", "--vendor 1"}, {"ab", "y"}}));
    testing::internal::CaptureStdout();
    FPTEST_RunTestCmd("XMLNodePath::P/G", nullptr, 0);
    FPTEST_RunTestCmd("XMLNodePath::P/G/NoSuchItem", nullptr, 0);
    FPTEST_RunTestCmd("XMLNodePath::P", nullptr, 0);

    EXPECT_EQ(testing::internal::GetCapturedStdout(),
              "vendor = 0\nvendor = 0\nvendor = 1\nvendor = 1\n");
}

} // namespace
