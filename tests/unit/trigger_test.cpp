// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The trigger: one gatherer connects and is told to gather again.
#include "sequences.h"
#include "unit_test.h"

#include <cerrno>

using platform::events;
using platform::gives;
using platform::left_open;
using platform::plan_steps;
using sequences::accepted;
using sequences::failed_accept;
using sequences::listener;
using sequences::told;
using sequences::trigger;

namespace
{

class Trigger : public LibraryTest
{
  protected:
    static Lines run()
    {
        internals::Sock_Init1();
        return events();
    }
    // What follows the accept when the write fails.
    static Lines untold(int error)
    {
        return {"write(connection#1, \"gather again!\", 13) = -1",
                "Sock_Init1| retWri=-1",
                "Sock_Init1| retWri error",
                "Sock_Init1| errno=" + std::to_string(error),
                "Sock_Init1| retWri success\n",
                "close(listener#1)"};
    }
};

TEST_F(Trigger, OneClientIsToldAndOnlyTheListenerIsClosed)
{
    EXPECT_THAT(run(), ElementsAreArray(trigger()));
    EXPECT_THAT(left_open(), ElementsAre("connection#1"));
}

TEST_F(Trigger, EachTriggerHasItsOwnListenerAndLeavesItsConnection)
{
    EXPECT_THAT(run(), ElementsAreArray(trigger(1)));
    EXPECT_THAT(run(), ElementsAreArray(trigger(2)));
    EXPECT_THAT(left_open(), ElementsAre("connection#1", "connection#2"));
}

TEST_F(Trigger, FailedListenIsLoggedAndTheAcceptStillMade)
{
    for (const int result : {-1, -2}) {
        SCOPED_TRACE(result);
        platform::reset();
        plan_steps("listen", {gives(result, EADDRINUSE)});

        EXPECT_THAT(run(),
                    ElementsAreArray(joined({listener(1, std::to_string(result)),
                                             {"Sock_Init1| listen error",
                                              "Sock_Init1| errno=" + std::to_string(EADDRINUSE)},
                                             accepted(),
                                             told()})));
        EXPECT_THAT(left_open(), ElementsAre("connection#1"));
    }
}

TEST_F(Trigger, ListenResultAboveZeroIsNoFailure)
{
    plan_steps("listen", {gives(1)});
    EXPECT_THAT(run(), ElementsAreArray(joined({listener(1, "1"), accepted(), told()})));
}

TEST_F(Trigger, FailedAcceptEndsTheCallWithTheListenerOpen)
{
    plan_steps("Accept", {gives(-1, ECONNABORTED)});

    EXPECT_THAT(run(), ElementsAreArray(failed_accept(std::to_string(ECONNABORTED))));
    EXPECT_THAT(left_open(), ElementsAre("listener#1"));
}

TEST_F(Trigger, AnyNegativeAcceptResultIsAFailure)
{
    plan_steps("Accept", {gives(-2, EPROTO)});

    EXPECT_THAT(run(), ElementsAreArray(
                           joined({listener(),
                                   {"Accept(listener#1, 16) = -2", "Sock_Init1| accept error!\n",
                                    "Sock_Init1| errno=" + std::to_string(EPROTO)}})));
}

TEST_F(Trigger, TriggerAfterAFailedAcceptOpensANewListener)
{
    plan_steps("Accept", {gives(-1, ECONNABORTED)});
    run();
    plan_steps("Accept", {platform::pass()});

    EXPECT_THAT(run(),
                ElementsAreArray(joined(
                    {listener(2),
                     {"Accept(listener#2, 16) = connection#1",
                      "write(connection#1, \"gather again!\", 13) = 13", "Sock_Init1| retWri=13",
                      "Sock_Init1| retWri success\n", "close(listener#2)"}})));
    EXPECT_THAT(left_open(), ElementsAre("connection#1", "listener#1"));
}

TEST_F(Trigger, FailedListenAndAcceptEachTellTheirOwnError)
{
    plan_steps("listen", {gives(-1, EADDRINUSE)});
    plan_steps("Accept", {gives(-1, EINVAL)});

    EXPECT_THAT(run(),
                ElementsAreArray(joined(
                    {listener(1, "-1"),
                     {"Sock_Init1| listen error", "Sock_Init1| errno=" + std::to_string(EADDRINUSE),
                      "Accept(listener#1, 16) = -1", "Sock_Init1| accept error!\n",
                      "Sock_Init1| errno=" + std::to_string(EINVAL)}})));
    EXPECT_THAT(left_open(), ElementsAre("listener#1"));
}

TEST_F(Trigger, StepsAfterAFailedSocketRunOnWhatItGave)
{
    plan_steps("socket", {gives(-1, EMFILE)});
    plan_steps("listen", {gives(-1, EBADF)});
    plan_steps("Accept", {gives(-1, EBADF)});
    const std::string error = "Sock_Init1| errno=" + std::to_string(EBADF);
    const std::string bind = listener()[2];

    EXPECT_THAT(run(), ElementsAre("socket(AF_INET, SOCK_STREAM, 0) = -1", "Setsockopt(-1, 1)",
                                   "Bind(-1" + bind.substr(bind.find(',')), "listen(-1, 5) = -1",
                                   "Sock_Init1| listen error", error, "Accept(-1, 16) = -1",
                                   "Sock_Init1| accept error!\n", error));
}

TEST_F(Trigger, DescriptorZeroIsAConnection)
{
    plan_steps("Accept", {gives(0)});

    EXPECT_THAT(run(), ElementsAreArray(
                           joined({listener(),
                                   {"Accept(listener#1, 16) = 0",
                                    "write(0, \"gather again!\", 13) = 13", "Sock_Init1| retWri=13",
                                    "Sock_Init1| retWri success\n", "close(listener#1)"}})));
}

TEST_F(Trigger, FailedWriteIsLoggedAndFollowedByTheSuccessLine)
{
    plan_steps("write", {gives(-1, EPIPE)});

    EXPECT_THAT(run(), ElementsAreArray(joined({listener(), accepted(), untold(EPIPE)})));
    EXPECT_THAT(left_open(), ElementsAre("connection#1"));
}

TEST_F(Trigger, ShortWriteIsNeitherAnErrorNorRepeated)
{
    for (const int written : {0, 1, 12}) {
        SCOPED_TRACE(written);
        platform::reset();
        plan_steps("write", {gives(written)});
        const std::string result = std::to_string(written);

        EXPECT_THAT(run(), ElementsAreArray(
                               joined({listener(),
                                       accepted(),
                                       {"write(connection#1, \"gather again!\", 13) = " + result,
                                        "Sock_Init1| retWri=" + result,
                                        "Sock_Init1| retWri success\n", "close(listener#1)"}})));
    }
}

} // namespace
