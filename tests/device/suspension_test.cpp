// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Stopping the item last started, with the real ps and the real kill.
#include "device_test.h"

#include <csignal>
#include <filesystem>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

namespace
{

// 31 and 34 characters that share their first 28.
constexpr char kLong[] = "ItemWithANameOfTwentyEightChars";
constexpr char kLonger[] = "ItemWithANameOfTwentyEightCharsToo";

class SuspensionOnDevice : public DeviceTest
{
  protected:
    // Runs the path in a thread of its own while the body stops it.
    template <typename Body> static void stop_while_running(const std::string &path, Body body)
    {
        std::thread command([&] { run_path(path); });
        body();
        command.join();
    }
};

TEST_F(SuspensionOnDevice, StoppedItemIsFollowedByTheNextOfItsGroup)
{
    store(group_of({{"Note", "--sleep 60"}, {"ab", "next"}}));
    stop_while_running("P/G", [] {
        EXPECT_TRUE(eventually([] { return !ran().empty(); }));
        EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
    });
    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|--sleep|60", "/system/bin/ab|next"));
}

TEST_F(SuspensionOnDevice, ItemIsFoundUnderItsVendorsName)
{
    set_vendor("1");
    store(group_of({{"Note", "--sleep 60"}}));
    stop_while_running("P/G/Note", [] {
        EXPECT_TRUE(eventually([] { return !processes_named("/system/bin/Note_ca").empty(); }));
        EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
    });
    EXPECT_THAT(processes_named("/system/bin/Note_ca"), IsEmpty());
}

TEST_F(SuspensionOnDevice, GathererIsStoppedAfterItsCommandHasReturned)
{
    store(group_of({{"SensorProbe", "--group G"}}));
    run_path("P/G/SensorProbe");
    ASSERT_THAT(processes_named("/system/bin/SensorProbe"), ::testing::SizeIs(1));
    // its report is a child of the same name: let that be over
    ASSERT_TRUE(eventually([] { return read_back().find("result=\"0\"") != std::string::npos; }));
    ASSERT_TRUE(eventually([] { return processes_named("/system/bin/SensorProbe").size() == 1; }));

    EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
    EXPECT_TRUE(eventually([] { return processes_named("/system/bin/SensorProbe").empty(); }));
}

TEST_F(SuspensionOnDevice, NameIsCutTo28CharactersForTheListing)
{
    // only the longer one runs: the cut name of the other finds it
    const std::string program = std::string("/system/bin/") + kLonger;
    const pid_t pid = start_item_program({program, "--sleep", "60"});
    store(group_of({{kLong, ""}}));
    run_path("P/G");
    log_lines();

    EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
    EXPECT_THAT(log_lines(),
                ElementsAre("FPTEST_SuspendItemExecute| enter... !",
                            "FPTEST_SuspendItemExecute| pid = " + std::to_string(pid)));
    EXPECT_EQ(signal_that_ends(pid), SIGTERM);
}

TEST_F(SuspensionOnDevice, OnlyTheFirstListedOfTwoIsStopped)
{
    const pid_t first = start_item_program({"/system/bin/ab", "--sleep", "60"});
    const pid_t second = start_item_program({"/system/bin/ab", "--sleep", "60"});
    store(group_of({{"ab", ""}}));
    run_path("P/G");

    EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
    EXPECT_EQ(signal_that_ends(first), SIGTERM);
    EXPECT_EQ(waitpid(second, nullptr, WNOHANG), 0);
}

TEST_F(SuspensionOnDevice, ItemThatHasEndedIsNotFound)
{
    store(group_of({{"Note", ""}}));
    run_path("P/G");
    log_lines();

    EXPECT_EQ(FPTEST_SuspendItemExecute(), -1);
    EXPECT_THAT(log_lines(), ElementsAre("FPTEST_SuspendItemExecute| enter... !",
                                         "FPTEST_SuspendItemExecute| target process not exist!"));
}

TEST_F(SuspensionOnDevice, ListingThatIsMissingIsNotFoundEither)
{
    setenv("PATH", "/nowhere", 1);
    ::testing::internal::CaptureStderr();
    EXPECT_EQ(FPTEST_SuspendItemExecute(), -1);
    EXPECT_THAT(log_lines(), ElementsAre("FPTEST_SuspendItemExecute| enter... !",
                                         "FPTEST_SuspendItemExecute| target process not exist!"));
    EXPECT_TRUE(eventually([] { return zombies() > 0; }));
    EXPECT_THAT(::testing::internal::GetCapturedStderr(), HasSubstr("ps"));
}

// A listing of the test's own in front of the device's: what it prints, and
// with how many arguments it was asked.
void put_listing_in_front(const std::string &output)
{
    std::filesystem::create_directory("/data/vorlane/bin");
    write_file("/data/vorlane/listing", output);
    write_file("/data/vorlane/bin/ps",
               "#!/system/bin/sh\necho $# >/data/vorlane/asked\ncat /data/vorlane/listing\n");
    std::filesystem::permissions("/data/vorlane/bin/ps", std::filesystem::perms::owner_all);
    setenv("PATH", "/data/vorlane/bin:/system/bin", 1);
}

TEST_F(SuspensionOnDevice, BeforeAnyItemEveryProcessIsListedAndTheFirstIsStopped)
{
    const pid_t victim = start_item_program({"/system/bin/ab", "--sleep", "60"});
    put_listing_in_front("USER PID\nroot     " + std::to_string(victim) +
                         "   1 x\nroot 1 1 init\n");

    EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
    EXPECT_EQ(read_file("/data/vorlane/asked"), "0\n");
    EXPECT_EQ(signal_that_ends(victim), SIGTERM);
}

TEST_F(SuspensionOnDevice, LineOfASingleWordStillRunsAKillCommand)
{
    for (const char *line : {"word\n", "      \n"}) {
        put_listing_in_front(std::string("USER PID\n") + line);
        log_lines();
        ::testing::internal::CaptureStderr();
        EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
        // the shell's complaint about "kill 9 (null)" tells that it was run
        EXPECT_TRUE(children_end());
        EXPECT_THAT(::testing::internal::GetCapturedStderr(), HasSubstr("syntax error"));
        EXPECT_THAT(log_lines(), ElementsAre("FPTEST_SuspendItemExecute| enter... !"));
    }
}

TEST_F(SuspensionOnDevice, StandardKillTakesTheNineForAProcess)
{
    // the same text that the library runs, with a process that is there in the
    // place of the nobody that process 9 is
    const pid_t victim = start_item_program({"/system/bin/ab", "--sleep", "60"});
    EXPECT_GE(
        std::system(
            ("/system/bin/sh -c 'kill 9 " + std::to_string(victim) + "' 2>/dev/null").c_str()),
        0);
    EXPECT_EQ(signal_that_ends(victim), SIGTERM) << "not 9: that would be SIGKILL";
}

} // namespace
