// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The launcher: a shell command that nobody waits for.
#include "unit_test.h"

#include <cerrno>

namespace
{

// Status words as the kernel gives them.
constexpr int kExited127 = 127 << 8;
constexpr int kKilledBy9 = 9;

class Launcher : public LibraryTest
{
  protected:
    // What the child does with a command when the shell cannot be started.
    static Lines child(const std::string &command)
    {
        plan_steps("vfork", {gives(0)});
        platform::run_child([&command] { internals::mysystem(command.c_str()); });
        return events();
    }
};

TEST_F(Launcher, NullCommandYieldsOneAndTouchesNothing)
{
    EXPECT_EQ(internals::mysystem(nullptr), 1);
    EXPECT_THAT(events(), IsEmpty());
}

TEST_F(Launcher, ParentLooksOnceWithoutWaitingAndRestoresSignals)
{
    struct Case {
        platform::Step look;
        int waited, status, result;
    };
    for (const auto &[look, waited, status, result] : std::initializer_list<Case>{
             {gives(0), 0, kExited127, 0}, // of a child that has not ended: not stored
             {gives(100), 100, 0, 0},
             {gives(100), 100, kExited127, kExited127},
             {gives(100), 100, kKilledBy9, kKilledBy9},
             {gives(100), 100, 1 << 8, 1 << 8},
             {gives(-1, ECHILD), -1, 0, -1},
             {gives(-1, EINTR), -1, 0, -1},
         }) {
        platform::reset();
        plan_steps("waitpid", {look});
        platform::state().wait_status = status;
        EXPECT_EQ(internals::mysystem("sleep 1000"), result);
        EXPECT_EQ(events(), launch(waited));
        EXPECT_THAT(platform::left_open(), IsEmpty());
    }
}

TEST_F(Launcher, FailedForkRestoresTheMaskAloneAndYieldsMinusOne)
{
    plan_steps("vfork", {gives(-1, EAGAIN)});

    EXPECT_EQ(internals::mysystem("true"), -1);
    EXPECT_EQ(events(), failed_launch());
}

TEST_F(Launcher, BlockThatFailsStartsNothingAndYieldsMinusOne)
{
    plan_steps("sigprocmask", {gives(-1, EINVAL)});

    EXPECT_EQ(internals::mysystem("true"), -1);
    EXPECT_EQ(events(), sequences::blocked_signals());
}

TEST_F(Launcher, ChildRestoresTheMaskRunsTheShellUnchangedAndExitsWhenThatFails)
{
    for (const std::string &command :
         {std::string("/system/bin/SensorProbe -t 5"), std::string(20000, 'c'), std::string(),
          std::string("  a 'b c' \"$d\" | e > f; g\n\th % %s \\ ")}) {
        platform::reset();
        EXPECT_EQ(child(command), launched(command));
    }
}

TEST_F(Launcher, ChildRunsTheShellThoughItsMaskCannotBePutBack)
{
    plan_steps("sigprocmask", {platform::pass(), gives(-1, EINVAL)});

    EXPECT_EQ(child("true"), launched("true"));
}

TEST_F(Launcher, NextLaunchStartsAnew)
{
    plan_steps("waitpid", {gives(100), gives(0)});
    platform::state().wait_status = kExited127;
    EXPECT_EQ(internals::mysystem("first"), kExited127);
    EXPECT_EQ(internals::mysystem("second"), 0);

    EXPECT_EQ(events(), launch(100) + launch());
    EXPECT_EQ(child("third"), launched("third"));
}

TEST_F(Launcher, LooksAtTheChildThatItStarted)
{
    plan_steps("vfork", {gives(77)});
    internals::mysystem("true");
    EXPECT_THAT(events(), ::testing::Contains("waitpid(77, WNOHANG) = 0").Times(1));
}

} // namespace
