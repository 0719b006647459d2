// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What a host does with its plan if the disk is full or read-only, a directory is in
// the plan's place, or files may not grow. After each fault the next command without one
// works.
#include "common/descriptor.h"
#include "faults.h"

#include <array>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <sys/mount.h>
#include <sys/resource.h>
#include <unistd.h>

using namespace device;
namespace fs = std::filesystem;

namespace
{

constexpr char kDataDirectory[] = "/data/vorlane";

// --- a full disk -------------------------------------------------------------

class FullDisk : public DeviceTest
{
  protected:
    void SetUp() override
    {
        if (is_in_place()) {
            GTEST_SKIP() << "in place, the disk is the container's own and is not to be filled";
        }
        DeviceTest::SetUp();
    }
};

TEST_F(FullDisk, StoredPlanIsLostAndTheNextOneWorks)
{
    store("<P/>"); // stays open, and so keeps its block when it is removed
    load_plan();
    fill_disk();
    EXPECT_EQ(log_of_store(kPlan), lines_of_store(kPlan, {kNotWritten}));
    EXPECT_EQ(g_TestCmdTree, nullptr);
    EXPECT_EQ(fs::file_size(kPlanFile), 0U);

    EXPECT_EQ(read_back(), "");
    EXPECT_EQ(log_lines(), lines_of_read_back(0));
    EXPECT_EQ(log_of_note(), lines_of_unloaded_note());
    EXPECT_EQ(log_of_report(1, "d"), lines_of_unloaded_report(1, "d"));
    EXPECT_EQ(fs::file_size(kPlanFile), 0U);

    fs::remove(kFiller);
    EXPECT_EQ(log_of_store(kPlan), lines_of_store(kPlan));
    EXPECT_EQ(read_file(kPlanFile), kPlan);
    EXPECT_EQ(log_of_note(), lines_of_note());
    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|x"));
    EXPECT_EQ(log_of_report(2, "d"), lines_of_report(2, "d"));
    EXPECT_EQ(read_back(), saved_plan(2, "d"));
}

TEST_F(FullDisk, ReportIsCutAtTheDisksEndAndTheNextOneSavesAllOfIt)
{
    const std::size_t block = 4096; // what the disk gives at a time
    const std::string description(10000, 'd');
    store(kPlan);
    load_plan();
    fill_disk();
    EXPECT_EQ(log_of_report(1, description), lines_of_report(1, description));
    // the block that the plan had before
    EXPECT_EQ(read_file(kPlanFile), saved_plan(1, description).substr(0, block));
    EXPECT_EQ(read_back(), saved_plan(1, description).substr(0, block));
    EXPECT_EQ(log_lines(), lines_of_read_back(block));
    // from the copy in memory, which is whole
    EXPECT_EQ(log_of_note(), lines_of_note());

    fs::remove(kFiller);
    EXPECT_EQ(log_of_report(2, description), lines_of_report(2, description));
    EXPECT_EQ(read_back(), saved_plan(2, description));
}

// --- a read-only disk --------------------------------------------------------

using ReadOnlyDisk = PrivateMounts;

TEST_F(ReadOnlyDisk, StoreLeavesTheOldPlanInUse)
{
    store(kPlan);
    load_plan();
    const mxml_node_t *cached = g_TestCmdTree;
    mount_over(kDataDirectory, kDataDirectory);
    remount(kDataDirectory, MS_RDONLY);
    EXPECT_EQ(log_of_store("<P/>"), lines_of_store("<P/>", {kNotOpened}));
    EXPECT_EQ(g_TestCmdTree, cached);
    EXPECT_EQ(read_file(kPlanFile), kPlan);
    EXPECT_EQ(read_back(), kPlan);
    EXPECT_EQ(log_lines(), lines_of_read_back(kPlan.size()));
    EXPECT_EQ(log_of_note(), lines_of_note());

    remount(kDataDirectory, 0);
    EXPECT_EQ(log_of_store("<P/>"), lines_of_store("<P/>"));
    EXPECT_EQ(g_TestCmdTree, nullptr);
    EXPECT_EQ(read_file(kPlanFile), "<P/>");
}

TEST_F(ReadOnlyDisk, ReportStaysInMemoryUntilOneCanBeSaved)
{
    store(kPlan);
    load_plan();
    mount_over(kDataDirectory, kDataDirectory);
    remount(kDataDirectory, MS_RDONLY);
    EXPECT_EQ(log_of_report(1, "d"),
              lines_of_report(1, "d", not_saved("-1", "(30),Read-only file system")));
    EXPECT_EQ(read_file(kPlanFile), kPlan);

    remount(kDataDirectory, 0);
    EXPECT_EQ(FPTEST_SetTransation("G", "SensorProbe", 2, 1, "e"), 0);
    EXPECT_EQ(read_file(kPlanFile),
              "<P>\n<CmdGroup name=\"G\">\n\t<Cmd name=\"Note\" args=\"x\" progress=\"1\" "
              "result=\"0\" description=\"d\" />\n\t<Cmd name=\"SensorProbe\" args=\"--help\" "
              "progress=\"2\" result=\"1\"\ndescription=\"e\" />\n</CmdGroup>\n</P>\n");
}

// --- a directory in the plan's place -----------------------------------------

class DirectoryInThePlansPlace : public DeviceTest
{
  protected:
    void SetUp() override
    {
        fs::remove_all(kPlanFile);
        DeviceTest::SetUp();
        ::testing::internal::CaptureStderr(); // Mini-XML's complaints
    }
    void TearDown() override
    {
        ::testing::internal::GetCapturedStderr();
        fs::remove_all(kPlanFile);
        DeviceTest::TearDown();
    }

    static void put_directory()
    {
        fs::remove_all(kPlanFile);
        fs::create_directory(kPlanFile);
    }
};

TEST_F(DirectoryInThePlansPlace, IsRemovedByAStoreWhileItIsEmpty)
{
    put_directory();
    EXPECT_EQ(log_of_store(kPlan), lines_of_store(kPlan));
    EXPECT_EQ(read_file(kPlanFile), kPlan);
}

TEST_F(DirectoryInThePlansPlace, WithSomethingInItKeepsAStoreOut)
{
    store(kPlan);
    load_plan();
    const mxml_node_t *cached = g_TestCmdTree;
    put_directory();
    write_file(std::string(kPlanFile) + "/kept", "text");
    const auto open = descriptors();
    EXPECT_EQ(log_of_store("<P/>"), lines_of_store("<P/>", {kNotOpened}));
    EXPECT_EQ(read_file(std::string(kPlanFile) + "/kept"), "text");
    EXPECT_EQ(descriptors(), open);
    EXPECT_EQ(g_TestCmdTree, cached);
    EXPECT_EQ(log_of_note(), lines_of_note());

    fs::remove_all(kPlanFile);
    EXPECT_EQ(log_of_store("<P/>"), lines_of_store("<P/>"));
    EXPECT_EQ(read_file(kPlanFile), "<P/>");
}

// --- a limit on the size of files --------------------------------------------

class FileSizeLimit : public DeviceTest, public ::testing::WithParamInterface<bool>
{
  protected:
    static constexpr rlim_t kLimit = 100;

    static bool is_ignored()
    {
        return GetParam();
    }

    // Runs the body in a host of its own, whose log goes into a pipe: a file of
    // it would be limited as well. Returns the host's wait status.
    template <typename Body> int run_limited(rlim_t limit, Body body)
    {
        std::array<int, 2> ends{};
        EXPECT_EQ(pipe2(ends.data(), O_CLOEXEC), 0);
        const Descriptor reading(ends[0]);
        std::optional<Descriptor> writing(ends[1]);
        OtherHost host([&] {
            dup2(writing->get(), STDERR_FILENO);
            unsetenv("VR_LOG_FILE");
            std::signal(SIGXFSZ, is_ignored() ? SIG_IGN : SIG_DFL);
            const Limit limited(RLIMIT_FSIZE, limit);
            body();
        });
        writing.reset();
        std::string log;
        std::array<char, 4096> buffer{};
        for (ssize_t got = 0; (got = read(reading.get(), buffer.data(), buffer.size())) > 0;) {
            log.append(buffer.data(), static_cast<std::size_t>(got));
        }
        write_file(kLogFile, log);
        lines_ = log_lines(host.pid());
        return host.wait().status;
    }

    [[nodiscard]] const Lines &lines() const
    {
        return lines_;
    }

    // So many of the last lines are missing if the signal ends the host.
    void expect_end(int status, const Lines &all, int missing) const
    {
        EXPECT_EQ(status, is_ignored() ? 0 : -SIGXFSZ) << "the library changes no disposition";
        EXPECT_EQ(lines_, is_ignored() ? all : Lines(all.begin(), all.end() - missing));
    }

  private:
    Lines lines_;
};

TEST_P(FileSizeLimit, CutsAStoredPlanWithoutASignal)
{
    EXPECT_EQ(run_limited(kLimit, [] { store(kPlan); }), 0);
    EXPECT_EQ(lines(), lines_of_store(kPlan, {kNotWritten}));
    ASSERT_GT(kPlan.size(), kLimit);
    EXPECT_EQ(read_file(kPlanFile), kPlan.substr(0, kLimit));
}

TEST_P(FileSizeLimit, OfNothingKeepsAStoredPlanOut)
{
    expect_end(run_limited(0, [] { store(kPlan); }), lines_of_store(kPlan, {kNotWritten}), 2);
    EXPECT_EQ(fs::file_size(kPlanFile), 0U);
}

TEST_P(FileSizeLimit, CutsASavedPlan)
{
    write_file(kPlanFile, kPlan);
    expect_end(run_limited(kLimit, [] { report(1, "d"); }), lines_of_report(1, "d"), 3);
    EXPECT_EQ(read_file(kPlanFile), saved_plan(1, "d").substr(0, kLimit));
}

INSTANTIATE_TEST_SUITE_P(Signal, FileSizeLimit, ::testing::Bool(),
                         [](const auto &test) { return test.param ? "Ignored" : "NotIgnored"; });

} // namespace
