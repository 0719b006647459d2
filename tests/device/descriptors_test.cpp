// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the calls leave in the host's descriptor table, and descriptor 0.
#include "faults.h"
#include "support/this_process.h"

#include <fcntl.h>
#include <set>
#include <unistd.h>

namespace
{

class Descriptors : public DeviceTest
{
  protected:
    void SetUp() override
    {
        DeviceTest::SetUp();
        FPTEST_RunTestCmd("unknown", nullptr, 0); // the log opens its file
        opened();
        log_lines();
    }

    // What has been opened since the last call and is open still.
    Lines opened()
    {
        Lines targets;
        for (const auto &[descriptor, target] : descriptors()) {
            if (known_.insert(descriptor).second) {
                targets.push_back(target);
            }
        }
        return targets;
    }

  private:
    std::set<int> known_;
};

std::string target_of(int descriptor)
{
    for (const auto &[number, target] : descriptors()) {
        if (number == descriptor) {
            return target;
        }
    }
    return "closed";
}

TEST_F(Descriptors, EveryStoredPlanLeavesOneOpen)
{
    for (int plan = 0; plan < 3; ++plan) {
        store("<P/>");
    }
    // each names the file that the next one has removed
    EXPECT_THAT(opened(), ElementsAre("/data/vorlane/src1.xml (deleted)",
                                      "/data/vorlane/src1.xml (deleted)", kPlanFile));
}

TEST_F(Descriptors, RunsReportsAndReadBacksLeaveNoneOpen)
{
    store(group_of({{"Note", ""}}));
    opened();
    for (int round = 0; round < 3; ++round) {
        run_path("P/G");
        run_path("P/G/Note");
        FPTEST_SetTransation("G", "Note", 100, 0, "done");
        read_back();
    }
    EXPECT_THAT(opened(), IsEmpty());
}

TEST_F(Descriptors, ZeroIsASuccessForStoring)
{
    const support::FreedDescriptor freed(STDIN_FILENO);
    store("<P/>");

    EXPECT_EQ(target_of(0), kPlanFile);
    EXPECT_EQ(read_file(kPlanFile), "<P/>");
    EXPECT_EQ(log_lines(), lines_of_store("<P/>"));
}

TEST_F(Descriptors, ZeroIsAFailureForLoadingAndStaysOpen)
{
    write_file(kPlanFile, group_of({{"Note", ""}}));
    const support::FreedDescriptor freed(STDIN_FILENO);
    run_path("P/G");

    EXPECT_EQ(target_of(0), kPlanFile);
    EXPECT_THAT(log_lines(), ::testing::Contains(::testing::StartsWith(
                                 "load_configs_file| Open /data/vorlane/src1.xml file failed(")));
    EXPECT_THAT(ran(), IsEmpty());

    run_path("P/G"); // now that 0 is taken
    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note"));
}

TEST_F(Descriptors, ZeroIsAFailureForSavingAndHasEmptiedTheFile)
{
    store(group_of({{"Note", ""}}));
    run_path("P/G");
    log_lines();
    const support::FreedDescriptor freed(STDIN_FILENO);
    FPTEST_SetTransation("G", "Note", 1, 0, "first");

    EXPECT_EQ(target_of(0), kPlanFile);
    EXPECT_EQ(read_file(kPlanFile), "");
    const Lines lines = log_lines();
    ASSERT_GE(lines.size(), 3U);
    EXPECT_THAT(lines.end()[-3],
                ::testing::StartsWith("save_XmlFile| Open /data/vorlane/src1.xml file failed("));
    EXPECT_EQ(lines.end()[-2], "updateSrcXmlFile| update Src Xml File success . leave...");

    // the change has stayed in the cache and goes out with the next report
    write_file(kPlanFile, "");
    FPTEST_SetTransation("G", "Note", 2, 1, "second");
    EXPECT_THAT(read_file(kPlanFile), HasSubstr("description=\"second\""));
}

TEST_F(Descriptors, ZeroIsAFailureForReadingBackAndStaysOpen)
{
    write_file(kPlanFile, "text");
    const support::FreedDescriptor freed(STDIN_FILENO);
    char buffer[8] = "-------";
    FPTEST_ExtractResultMsg(buffer, 4);

    EXPECT_STREQ(buffer, "-------");
    EXPECT_EQ(target_of(0), kPlanFile);
    EXPECT_EQ(log_lines(), logged(not_opened_to_read("plan#1")));
}

TEST_F(Descriptors, PlanFileIsCreatedForEveryoneToReadAndWriteLessTheUmask)
{
    umask(0027);
    store("<P/>");
    struct stat status {
    };
    ASSERT_EQ(stat(kPlanFile, &status), 0);
    EXPECT_EQ(status.st_mode & 07777, 0640U);
}

} // namespace
