// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The one overlap that is allowed: the suspension while a command is blocked in
// an item, again and again.
#include "device_test.h"

#include <atomic>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <set>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

namespace
{

constexpr int kRounds = 100; // in each of the tests below, which run side by side

class Overlap : public DeviceTest, public ::testing::WithParamInterface<int>
{
  protected:
    void SetUp() override
    {
        DeviceTest::SetUp();
        store(group_of({{"Note", "--sleep 60"}}));
        // the shell's word on process 9, at every stop
        const int words = open("/tmp/words", O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
        ASSERT_GE(dup2(words, STDERR_FILENO), 0);
        close(words);
    }
};

TEST_P(Overlap, SuspensionEndsTheItemAndTheCommandReturns)
{
    for (int round = 1; round <= kRounds; ++round) {
        SCOPED_TRACE(round);
        const auto open_before = descriptors();
        log_lines();
        std::atomic<bool> returned = false;
        std::thread command([&] {
            run_path("P/G/Note");
            returned = true;
        });
        pid_t pid = 0;
        EXPECT_TRUE(eventually([&] {
            const auto running = processes_named("/system/bin/Note");
            pid = running.empty() ? 0 : running[0].pid;
            return pid != 0;
        }));
        EXPECT_FALSE(returned);
        EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
        EXPECT_TRUE(eventually([&] { return returned.load(); })) << "the item is still running";
        if (!returned) {
            kill(pid, SIGKILL);
        }
        command.join();
        EXPECT_THAT(processes_named("/system/bin/Note"), IsEmpty());

        const Lines lines = log_lines();
        EXPECT_THAT(lines, ::testing::IsSupersetOf(
                               {std::string("FPTEST_SuspendItemExecute| enter... !"),
                                "FPTEST_SuspendItemExecute| pid = " + std::to_string(pid)}));
        EXPECT_EQ(lines.back(), "SingleItemExecute| leave... !");

        auto opened = descriptors();
        for (const auto &descriptor : open_before) {
            EXPECT_EQ(std::erase(opened, descriptor), 1U) << descriptor.first << " was closed";
        }
        EXPECT_THAT(opened,
                    ElementsAre(::testing::Pair(::testing::_, ::testing::StartsWith("pipe:"))))
            << "the listing's stream";
        if (HasFailure()) {
            return;
        }
        // left to the host: the listing's shell, which has ended well; and the
        // kill's, unless the launcher has seen its end, which has found no process 9
        std::multiset<int> codes;
        for (int status = 0; waitpid(-1, &status, 0) > 0;) {
            codes.insert(WIFEXITED(status) ? WEXITSTATUS(status) : -1);
        }
        EXPECT_EQ(errno, ECHILD);
        EXPECT_THAT(codes, ::testing::AnyOf(ElementsAre(0), ElementsAre(0, 1)));
    }
}

INSTANTIATE_TEST_SUITE_P(Batch, Overlap, ::testing::Range(1, 6));

} // namespace
