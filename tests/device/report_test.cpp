// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Reports and the stored plan, between real processes.
#include "faults.h"

#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <sys/stat.h>

namespace
{

using ReportOnDevice = DeviceTest;

// It has a copy of the plan of its own.
void another_process_reports(const std::string &arguments)
{
    EXPECT_EQ(std::system(("/system/bin/Note --report " + arguments).c_str()), 0);
}

TEST_F(ReportOnDevice, ItemsOwnReportIsReadBackAndThePlanIsLaidOut)
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

TEST_F(ReportOnDevice, ReportedPlanIsSavedByteForByte)
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

TEST_F(ReportOnDevice, ProcessWithAStaleCopyWritesOverWhatOthersHaveSaved)
{
    store(group_of({{"a", ""}, {"b", ""}}));
    FPTEST_SetTransation("G", "a", 1, 0, "here"); // loads this process's copy
    another_process_reports("G b 50 1 elsewhere");
    EXPECT_THAT(read_back(), HasSubstr("elsewhere"));

    FPTEST_SetTransation("G", "a", 2, 0, "here again");
    EXPECT_THAT(read_back(), HasSubstr("here again"));
    EXPECT_THAT(read_back(), ::testing::Not(HasSubstr("elsewhere")));
}

TEST_F(ReportOnDevice, OtherResultCodeLeavesAPlanThatIsNotLoadedAgain)
{
    store(group_of({{"a", ""}}));
    FPTEST_SetTransation("G", "a", 100, 2, "");
    EXPECT_THAT(read_back(), HasSubstr(" result "));

    ::testing::internal::CaptureStderr();
    another_process_reports("G a 100 0 again");
    EXPECT_THAT(::testing::internal::GetCapturedStderr(), HasSubstr("Missing value for attribute"));
    EXPECT_THAT(read_back(), HasSubstr(" result "));
}

TEST_F(ReportOnDevice, PlanFileIsCreatedForEveryoneToReadAndWriteLessTheUmask)
{
    umask(0027);
    store("<P/>");
    EXPECT_EQ(std::filesystem::status(kPlanFile).permissions(), std::filesystem::perms{0640});
}

TEST_F(ReportOnDevice, ReadBackIntoANegativeRoomEndsTheProcess)
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
