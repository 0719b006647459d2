// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The gatherer: started in the background only if none runs, and told to gather
// over one real connection for each command.
#include "network.h"

#include <chrono>
#include <csignal>
#include <thread>
#include <unistd.h>

namespace
{

class Gatherer : public DeviceTest
{
  protected:
    static void store_plan(const std::string &args = "--group G")
    {
        store(group_of({{"SensorProbe", args}, {"Note", "x"}}));
    }

    // Runs the command in its own thread while a client of ours is triggered.
    static std::string trigger_own_client(unsigned short port = kTriggerPort)
    {
        std::thread command([] { run_path("P/G/SensorProbe"); });
        const Socket client = connect_to(port);
        command.join();
        return receive(client);
    }
};

TEST_F(Gatherer, FirstCommandStartsItAndTriggersIt)
{
    store_plan();
    run_path("P/G/SensorProbe");

    EXPECT_EQ(processes_named(kProbe).size(), 1U);
    EXPECT_TRUE(eventually([] { return read_back().find("result=\"0\"") != std::string::npos; }));
    EXPECT_THAT(log_lines(), ::testing::IsSupersetOf(
                                 {"ResourceReduce| target process not exist!",
                                  "SingleItemExecute| tpCmd:/system/bin/SensorProbe --group G",
                                  "SingleItemExecute| \nrow=0", "Sock_Init1| retWri=13",
                                  "Sock_Init1| retWri success", "SingleItemExecute| leave... !"}));
}

TEST_F(Gatherer, SecondCommandStartsNoOtherAndLogsNoLeaveLine)
{
    store_plan();
    run_path("P/G/SensorProbe");
    const auto first = processes_named(kProbe);
    log_lines();
    run_path("P/G/SensorProbe");

    const auto second = processes_named(kProbe);
    ASSERT_EQ(first.size(), 1U);
    // a report may be made by a child of the same name at this moment
    EXPECT_THAT(second, ::testing::Contains(::testing::Field(&Process::pid, first[0].pid)));
    for (const Process &process : second) {
        EXPECT_TRUE(process.pid == first[0].pid || process.parent == first[0].pid);
    }
    const Lines lines = log_lines();
    ASSERT_GE(lines.size(), 3U);
    EXPECT_EQ(lines.end()[-3], "SingleItemExecute| \nrow=1");
    EXPECT_EQ(lines.end()[-2], "Sock_Init1| retWri=13");
    EXPECT_EQ(lines.end()[-1], "Sock_Init1| retWri success");
}

TEST_F(Gatherer, RunsAsItsVariantUnderVendorOneAndThenCountsAsRunningUnderEveryVendor)
{
    set_vendor("1");
    store_plan();
    run_path("P/G/SensorProbe");
    EXPECT_EQ(processes_named("/system/bin/SensorProbe_ca").size(), 1U);

    set_vendor("0");
    log_lines();
    run_path("P/G/SensorProbe");

    EXPECT_THAT(processes_named(kProbe), IsEmpty());
    EXPECT_THAT(log_lines(), ::testing::IsSupersetOf(
                                 {"SingleItemExecute| tpCmd:/system/bin/SensorProbe --group G",
                                  "SingleItemExecute| \nrow=1"}));
}

TEST_F(Gatherer, IsAnOrdinaryItemUnderVendorTwo)
{
    set_vendor("2");
    store_plan();
    run_path("P/G/SensorProbe");

    // it has run and ended, untriggered
    EXPECT_THAT(processes_named("/system/bin/SensorProbe_ca_qsee"), IsEmpty());
    EXPECT_THAT(read_back(), HasSubstr("result=\"0\""));
    const Lines lines = log_lines();
    EXPECT_THAT(lines, ::testing::Contains(
                           "SingleItemExecute| tpCmd:/system/bin/SensorProbe_ca_qsee --group G"));
    EXPECT_THAT(lines, ::testing::Each(::testing::Not(::testing::StartsWith("Sock_Init1"))));
}

TEST_F(Gatherer, ClientOfEachCommandGetsThirteenBytesAndKeepsItsConnection)
{
    start_item_program({kHolder, "--sleep", "60"});
    store_plan();
    const std::size_t before = count_open("socket:");
    for (std::size_t round = 1; round <= 3; ++round) {
        EXPECT_EQ(trigger_own_client(), "gather again!");
        EXPECT_EQ(count_open("socket:"), before + round);
        EXPECT_THAT(listeners(), IsEmpty());
    }
    EXPECT_THAT(processes_named(kProbe), IsEmpty());
}

TEST_F(Gatherer, IsAwaitedOnEveryLocalAddressForAsLongAsItTakes)
{
    start_item_program({kHolder, "--sleep", "60"});
    store_plan();
    bool returned = false;
    std::thread command([&] {
        run_path("P/G/SensorProbe");
        returned = true;
    });
    EXPECT_TRUE(eventually([] { return !listeners().empty(); }));
    EXPECT_THAT(listeners(), ElementsAre("00000000:8888"));
    std::this_thread::sleep_for(std::chrono::milliseconds(500));
    EXPECT_FALSE(returned);

    connect_to(kTriggerPort);
    command.join();
    EXPECT_TRUE(returned);
}

TEST_F(Gatherer, ItemsAfterItInAGroupRunOnceItIsTriggered)
{
    store_plan();
    run_path("P/G");
    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|x"));
}

TEST_F(Gatherer, TakenPortGoesUnnoticedAndTheCommandWaitsElsewhere)
{
    start_item_program({kHolder, "--sleep", "60"});
    store_plan();
    const Socket other = listen_on(kTriggerPort);
    log_lines();

    std::thread command([] { run_path("P/G/SensorProbe"); });
    Lines found;
    EXPECT_TRUE(eventually([&] {
        found = listeners();
        std::erase(found, "0100007F:8888");
        return !found.empty();
    }));
    ASSERT_EQ(found.size(), 1U);
    ASSERT_TRUE(found[0].starts_with("00000000:")) << found[0];
    const auto port = static_cast<unsigned short>(std::stoul(found[0].substr(9), nullptr, 16));
    const Socket client = connect_to(port);
    command.join();

    EXPECT_EQ(receive(client), "gather again!");
    EXPECT_THAT(log_lines(),
                ::testing::IsSupersetOf({"VRSOCK: bind failed(98),Address already in use",
                                         "Sock_Init1| retWri=13", "Sock_Init1| retWri success"}));
}

TEST_F(Gatherer, StartedInTheBackgroundItStaysUnreapedWhenItEnds)
{
    store_plan();
    run_path("P/G/SensorProbe");
    const auto running = processes_named(kProbe);
    ASSERT_EQ(running.size(), 1U);

    kill(running[0].pid, SIGKILL);
    EXPECT_TRUE(eventually([] { return zombies() > 0; }));
    run_path("P"); // nothing later reaps it
    EXPECT_EQ(zombies(), 1U);
}

TEST_F(Gatherer, LauncherPutsTheHostsSignalMaskBackAndTheChildIgnoresNone)
{
    sigset_t mask;
    sigset_t before;
    sigset_t after;
    sigemptyset(&mask);
    sigaddset(&mask, SIGUSR2);
    sigprocmask(SIG_BLOCK, &mask, &before);
    store_plan();
    run_path("P/G/SensorProbe");

    sigprocmask(SIG_SETMASK, &before, &after);
    EXPECT_EQ(sigismember(&after, SIGUSR2), 1);
    EXPECT_EQ(sigismember(&after, SIGCHLD), 0);

    const auto running = processes_named(kProbe);
    ASSERT_EQ(running.size(), 1U);
    const auto ignored = std::stoull(status_field(running[0].pid, "SigIgn"), nullptr, 16);
    const auto bit = [](int signal) { return 1ULL << (signal - 1); };
    EXPECT_EQ(ignored & (bit(SIGINT) | bit(SIGQUIT)), 0U);
}

} // namespace
