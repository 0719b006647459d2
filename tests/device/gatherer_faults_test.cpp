// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Gatherers that fail. The next one without a fault is triggered.
#include "faults.h"
#include "network.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <sys/resource.h>
#include <sys/socket.h>
#include <thread>
#include <unistd.h>

using namespace device;

namespace
{

class FailingGatherer : public DeviceTest
{
  protected:
    void SetUp() override
    {
        DeviceTest::SetUp();
        start_item_program({kHolder, "--sleep", "60"}); // so that none is started
        write_file(kPlanFile, kPlan);
    }

    static void await_listener()
    {
        EXPECT_TRUE(eventually([] { return !listeners().empty(); }));
        EXPECT_THAT(listeners(), ElementsAre("00000000:8888"));
    }

    // Is the gatherer that the host tells to gather before it ends.
    static void gather_for(OtherHost &host)
    {
        await_listener();
        const Socket client = connect_to(kTriggerPort);
        EXPECT_EQ(receive(client).substr(0, 13), "gather again!");
        EXPECT_EQ(host.wait().status, 0);
    }

    // Connects and leaves with a reset while the host is suspended, so that it
    // finds the connection already reset.
    static void connect_and_reset(const OtherHost &host, bool says_goodbye)
    {
        await_listener();
        kill(host.pid(), SIGSTOP);
        EXPECT_TRUE(eventually([&] { return status_field(host.pid(), "State")[0] == 'T'; }));
        {
            const Socket client = connect_to(kTriggerPort);
            if (says_goodbye) {
                shutdown(client.get(), SHUT_WR);
            }
            const linger reset{1, 0};
            setsockopt(client.get(), SOL_SOCKET, SO_LINGER, &reset, sizeof reset);
        }
        kill(host.pid(), SIGCONT);
    }

    // The lines since the last call after the presence check's.
    static Lines trigger_lines()
    {
        const Lines lines = log_lines();
        const auto row = std::ranges::find_if(lines, [](const std::string &line) {
            return line.starts_with("SingleItemExecute| \nrow=");
        });
        EXPECT_NE(row, lines.end());
        return row == lines.end() ? lines : Lines(row + 1, lines.end());
    }
    static Lines trigger()
    {
        run_path("P/G/SensorProbe");
        return trigger_lines();
    }
};

TEST_F(FailingGatherer, ThatResetsItsConnectionIsLoggedAndTheNextIsTriggered)
{
    for (const bool says_goodbye : {false, true}) {
        SCOPED_TRACE(says_goodbye);
        OtherHost host([=] {
            EXPECT_THAT(trigger(),
                        ElementsAre("Sock_Init1| retWri=-1", "Sock_Init1| retWri error",
                                    "Sock_Init1| errno=" +
                                        std::to_string(says_goodbye ? EPIPE : ECONNRESET),
                                    "Sock_Init1| retWri success"));
            EXPECT_EQ(count_open("socket:"), 1U);
            EXPECT_THAT(listeners(), IsEmpty());
            write_file("/tmp/triggered", "");
            EXPECT_EQ(trigger(), kTriggered);
            EXPECT_EQ(count_open("socket:"), 2U);
        });
        connect_and_reset(host, says_goodbye);
        EXPECT_TRUE(eventually([] { return unlink("/tmp/triggered") == 0; }));
        gather_for(host);
    }
}

TEST_F(FailingGatherer, LeavesUnnoticedBeforeItReads)
{
    OtherHost host([] {
        EXPECT_EQ(trigger(), kTriggered);
        EXPECT_TRUE(eventually([] { return unlink("/tmp/left") == 0; }));
        EXPECT_EQ(trigger(), kTriggered);
        EXPECT_EQ(count_open("socket:"), 2U);
    });
    await_listener();
    {
        const Socket client = connect_to(kTriggerPort);
        EXPECT_TRUE(eventually([] { return listeners().empty(); })); // it has been told
    } // unread, so that this resets the connection
    write_file("/tmp/left", "");
    gather_for(host);
}

TEST_F(FailingGatherer, EndsAHostThatDoesNotIgnoreSigpipe)
{
    OtherHost host([] {
        std::signal(SIGPIPE, SIG_DFL);
        run_path("P/G/SensorProbe");
        ADD_FAILURE() << "the command has returned";
    });
    connect_and_reset(host, true);
    EXPECT_EQ(host.wait().status, -SIGPIPE) << "the library changes no disposition";
    EXPECT_EQ(log_lines(host.pid()).back(), "SingleItemExecute| \nrow=1");
}

TEST_F(FailingGatherer, ThatNeverConnectsHoldsTheHostUntilItIsEnded)
{
    OtherHost host([] { run_path("P/G/SensorProbe"); });
    await_listener();
    std::this_thread::sleep_for(std::chrono::milliseconds(500));
    EXPECT_FALSE(host.has_ended());
    EXPECT_THAT(listeners(), ElementsAre("00000000:8888"));
    kill(host.pid(), SIGKILL);
    EXPECT_EQ(host.wait().status, -SIGKILL);
    EXPECT_THAT(listeners(), IsEmpty());
    EXPECT_EQ(read_file(kPlanFile), kPlan);

    OtherHost next([] { EXPECT_EQ(trigger(), kTriggered); });
    gather_for(next);
}

TEST_F(FailingGatherer, FindsThePortHeldByAListenerWhoseAcceptHasFailed)
{
    load_plan();
    {
        const Socket next(dup(STDIN_FILENO));
        const Limit limited(RLIMIT_NOFILE, static_cast<rlim_t>(next.get()) + 2);
        run_path("P/G/SensorProbe");
    }
    EXPECT_THAT(trigger_lines(), ElementsAre("Sock_Init1| accept error!", "Sock_Init1| errno=24",
                                             "SingleItemExecute| leave... !"));
    EXPECT_THAT(listeners(), ElementsAre("00000000:8888"));

    std::thread command([] {
        EXPECT_EQ(trigger(),
                  Lines({"VRSOCK: bind failed(98),Address already in use"}) + kTriggered);
    });
    EXPECT_TRUE(eventually([] { return listeners().size() == 2; }));
    EXPECT_EQ(receive(connect_to(kTriggerPort)), "") << "nobody accepts on the old one";
    Lines found = listeners();
    std::erase(found, "00000000:8888");
    ASSERT_EQ(found.size(), 1U);
    const auto port = static_cast<unsigned short>(std::stoul(found[0].substr(9), nullptr, 16));
    EXPECT_EQ(receive(connect_to(port)), "gather again!");
    command.join();
    EXPECT_THAT(listeners(), ElementsAre("00000000:8888"));
    EXPECT_EQ(count_open("socket:"), 2U) << "the old listener, the connection";
}

} // namespace
