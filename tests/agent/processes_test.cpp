// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/processes.h"

#include "support/wait.h"

#include <csignal>
#include <cstdlib>
#include <gmock/gmock.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

namespace fptest
{
namespace
{

using support::eventually;
using testing::ElementsAre;
using testing::Field;
using testing::IsEmpty;

// A library's process and its child, which runs a program once it is told to.
class ForkedByLibrary : public testing::Test
{
  protected:
    void SetUp() override
    {
        int ready[2];
        ASSERT_EQ(pipe(ready), 0);
        library_ = fork();
        if (library_ == 0) {
            setpgid(0, 0);
            sigset_t signals;
            sigemptyset(&signals);
            sigaddset(&signals, SIGUSR1);
            sigprocmask(SIG_BLOCK, &signals, nullptr);
            const pid_t child = fork();
            if (child == 0) {
                int signal = 0;
                sigwait(&signals, &signal);
                execlp("sleep", "sleep", "60", nullptr);
                _exit(EXIT_FAILURE);
            }
            _exit(write(ready[1], &child, sizeof child) < 0 || waitpid(child, nullptr, 0) != child);
        }
        close(ready[1]);
        ASSERT_EQ(read(ready[0], &child_, sizeof child_), static_cast<ssize_t>(sizeof child_));
        close(ready[0]);
    }

    void TearDown() override
    {
        kill(child_, SIGKILL);
        waitpid(library_, nullptr, 0);
    }

    std::vector<Leftover> of_gatherer() const
    {
        return ChildProcesses(library_, getpid(), 0).of_gatherer();
    }

    pid_t library_ = -1;
    pid_t child_ = -1;
};

// The next item's, while a gatherer is stopped, would be stopped with it.
TEST_F(ForkedByLibrary, IsNotTheGatherersBeforeItRunsAProgram)
{
    EXPECT_THAT(of_gatherer(), IsEmpty());
    kill(child_, SIGUSR1);
    EXPECT_TRUE(eventually([this] { return !of_gatherer().empty(); }));
    EXPECT_THAT(of_gatherer(), ElementsAre(Field(&Leftover::process, child_)));
}

} // namespace
} // namespace fptest
