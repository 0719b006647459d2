// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Reports and the stored plan, between real processes.
#include "faults.h"

#include <csignal>
#include <cstdlib>
#include <unistd.h>

namespace
{

using Report = DeviceTest;

// What a process of its own, with a plan cache of its own, reports.
void report_elsewhere(const std::string &arguments)
{
    EXPECT_EQ(std::system(("/system/bin/Note --report " + arguments).c_str()), 0);
}

TEST_F(Report, ItemsOwnReportIsReadBackAndThePlanIsLaidOut)
{
    store("<?xml version=\"1.0\"?><P><CmdGroup name=\"G\">"
          "<Cmd name=\"SpiCheck\" args=\"--group G\"/>"
          "<Cmd name=\"DeadPixel\" args=\"--group G\"/></CmdGroup></P>");
    run_path("P/G");

    const std::string plan = read_back();
    EXPECT_EQ(plan, read_file(kPlanFile));
    EXPECT_THAT(plan,
                ::testing::StartsWith("<?xml version=\"1.0\"?>\n<P>\n\t<CmdGroup name=\"G\">\n"
                                      "\t\t<Cmd name=\"SpiCheck\" args=\"--group G\" "
                                      "progress=\"100\"\n"
                                      "result=\"0\" description=\""));
    EXPECT_THAT(plan, HasSubstr("progress=\"100\"\nresult=\"1\" description=\""));
    EXPECT_THAT(plan, ::testing::EndsWith("\n</CmdGroup>\n</P>\n"));
}

TEST_F(Report, ReportedPlanIsSavedByteForByte)
{
    store("<?xml version=\"1.0\"?><P><CmdGroup name=\"G\"><Cmd name=\"a\" args=\"-t\"/>"
          "</CmdGroup></P>");
    EXPECT_EQ(FPTEST_SetTransation("G", "a", 7, -2, "x<&>\"y"), 0);

    EXPECT_EQ(read_file(kPlanFile), "<?xml version=\"1.0\"?>\n"
                                    "<P>\n"
                                    "\t<CmdGroup name=\"G\">\n"
                                    "\t\t<Cmd name=\"a\" args=\"-t\" progress=\"7\" result=\"-2\""
                                    "\ndescription=\"x&lt;&amp;&gt;&quot;y\" />\n"
                                    "</CmdGroup>\n"
                                    "</P>\n");
}

TEST_F(Report, ProcessWithAStaleCopyWritesOverWhatOthersHaveSaved)
{
    store(group_of({{"a", ""}, {"b", ""}}));
    FPTEST_SetTransation("G", "a", 1, 0, "here"); // loads this process's copy
    report_elsewhere("G b 50 1 elsewhere");
    EXPECT_THAT(read_back(), HasSubstr("elsewhere"));

    FPTEST_SetTransation("G", "a", 2, 0, "here again");
    EXPECT_THAT(read_back(), HasSubstr("here again"));
    EXPECT_THAT(read_back(), ::testing::Not(HasSubstr("elsewhere")));
}

TEST_F(Report, OtherResultCodeLeavesAPlanThatIsNotLoadedAgain)
{
    store(group_of({{"a", ""}}));
    FPTEST_SetTransation("G", "a", 100, 2, "");
    EXPECT_THAT(read_back(), HasSubstr(" result "));

    ::testing::internal::CaptureStderr();
    report_elsewhere("G a 100 0 again");
    EXPECT_THAT(::testing::internal::GetCapturedStderr(), HasSubstr("Missing value for attribute"));
    EXPECT_THAT(read_back(), HasSubstr(" result "));
}

TEST_F(Report, WithoutAStoredPlanNothingIsWritten)
{
    EXPECT_EQ(FPTEST_SetTransation("G", "a", 1, 0, "x"), 0);
    EXPECT_NE(access(kPlanFile, F_OK), 0);
    EXPECT_EQ(log_lines(),
              logged(report_begun("a", failed_load(), kNoPlan) + report_told(-1, 1, 0, "x") +
                     failed_load() + not_updated(kNoPlan)));
}

TEST_F(Report, PlanChangedOnDiskIsNotSeenWhileOneIsCached)
{
    store(group_of({{"Note", "stored"}}));
    run_path("P/G");
    write_file(kPlanFile, group_of({{"Note", "changed"}}));
    run_path("P/G");
    store(group_of({{"Note", "stored again"}}));
    run_path("P/G");

    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|stored", "/system/bin/Note|stored",
                                   "/system/bin/Note|stored|again"));
}

TEST_F(Report, PlanIsCutAtItsFirstColonAndAt2048Bytes)
{
    store("<P a='x:y'/>");
    EXPECT_EQ(read_back(), "<P a='x");
    store(std::string(3000, 'p'));
    EXPECT_EQ(read_back(), std::string(2048, 'p'));
}

TEST_F(Report, ReadBackOfALongPlanIsCutAtTheBuffer)
{
    write_file(kPlanFile, std::string(100, 'a') + std::string(50, 'b'));
    std::string buffer(200, 'x');
    FPTEST_ExtractResultMsg(buffer.data(), 120);

    EXPECT_EQ(buffer, std::string(100, 'a') + std::string(20, 'b') + std::string(80, 'x'));
    EXPECT_EQ(log_lines(), logged(opened_to_read(150) + read_piece(120, 120) + read_end(0, 120)));
}

TEST_F(Report, ReadBackIntoANegativeRoomEndsTheProcess)
{
    write_file(kPlanFile, "x");
    char buffer[1] = {'-'};
    EXPECT_EXIT(FPTEST_ExtractResultMsg(buffer, -1), ::testing::KilledBySignal(SIGABRT),
                "FPTEST_ExtractResultMsg.*Assertion `0' failed");

    write_file(kPlanFile, "");
    FPTEST_ExtractResultMsg(buffer, -1);
    EXPECT_EQ(buffer[0], '-');
}

} // namespace
