// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The trigger: one gatherer connects and is told to gather again.
#include "unit_test.h"

#include <cerrno>

namespace
{

class Trigger : public LibraryTest
{
  protected:
    static Lines run()
    {
        internals::Sock_Init1();
        return platform::events();
    }
    static constexpr char kConnection[] = "connection#1";
};

TEST_F(Trigger, EachTriggerHasItsOwnListenerAndLeavesItsConnection)
{
    EXPECT_EQ(run(), trigger(1));
    EXPECT_THAT(left_open(), ElementsAre("connection#1"));
    EXPECT_EQ(run(), trigger(2));
    EXPECT_THAT(left_open(), ElementsAre("connection#1", "connection#2"));
}

TEST_F(Trigger, FailedListenIsLoggedAndTheAcceptStillMade)
{
    for (const int result : {-1, -2}) {
        platform::reset();
        plan_steps("listen", {gives(result, EADDRINUSE)});

        EXPECT_EQ(run(), listener(1, std::to_string(result)) + listen_failed(EADDRINUSE) +
                             accepted() + told());
        EXPECT_THAT(left_open(), ElementsAre(kConnection));
    }
}

TEST_F(Trigger, ListenResultAboveZeroIsNoFailure)
{
    plan_steps("listen", {gives(1)});
    EXPECT_EQ(run(), listener(1, "1") + accepted() + told());
}

TEST_F(Trigger, FailedAcceptEndsTheCallWithTheListenerOpenAndTheNextOpensItsOwn)
{
    for (const int result : {-1, -2}) {
        platform::reset();
        plan_steps("Accept", {gives(result, EPROTO)});
        EXPECT_EQ(run(), listener() + accept_failed(EPROTO, result));
        EXPECT_THAT(left_open(), ElementsAre("listener#1"));
    }
    EXPECT_EQ(run(),
              listener(2) + "Accept(listener#2, 16) = connection#1" + told(kConnection, 13, 0, 2));
    EXPECT_THAT(left_open(), ElementsAre(kConnection, "listener#1"));
}

TEST_F(Trigger, FailedListenAndAcceptEachTellTheirOwnError)
{
    plan_steps("listen", {gives(-1, EADDRINUSE)});
    plan_steps("Accept", {gives(-1, EINVAL)});

    EXPECT_EQ(run(), listener(1, "-1") + listen_failed(EADDRINUSE) + accept_failed(EINVAL));
    EXPECT_THAT(left_open(), ElementsAre("listener#1"));
}

TEST_F(Trigger, StepsAfterAFailedSocketRunOnWhatItGave)
{
    plan_steps("socket", {gives(-1, EMFILE)});
    plan_steps("listen", {gives(-1, EBADF)});
    plan_steps("Accept", {gives(-1, EBADF)});
    Lines expected = listener(1, "-1") + listen_failed(EBADF) + accept_failed(EBADF);
    const std::string name = "listener#1";
    for (std::string &line : expected) {
        if (const std::size_t at = line.find(name); at != line.npos) {
            line.replace(at, name.size(), "-1");
        }
    }
    EXPECT_EQ(run(), expected);
}

TEST_F(Trigger, DescriptorZeroIsAConnection)
{
    plan_steps("Accept", {gives(0)});
    EXPECT_EQ(run(), listener() + "Accept(listener#1, 16) = 0" + told("0"));
}

TEST_F(Trigger, FailedWriteIsLoggedAndFollowedByTheSuccessLine)
{
    plan_steps("write", {gives(-1, EPIPE)});
    EXPECT_EQ(run(), listener() + accepted() + told(kConnection, -1, EPIPE));
    EXPECT_THAT(left_open(), ElementsAre(kConnection));
}

TEST_F(Trigger, ShortWriteIsNeitherAnErrorNorRepeated)
{
    for (const int written : {0, 1, 12}) {
        platform::reset();
        plan_steps("write", {gives(written)});
        EXPECT_EQ(run(), listener() + accepted() + told(kConnection, written));
    }
}

} // namespace
