// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Signals in the first moments of fptest run, and those that it was started to ignore.
#include "fptest_runner.h"
#include "support/reports.h"

#include <array>
#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <nlohmann/json.hpp>
#include <pty.h>
#include <string>
#include <sys/file.h>
#include <unistd.h>
#include <utmp.h>

namespace
{

const std::string kOneSleeps = group_of({{"Item", "note /tmp/scene/begun sleep 60"}});

class Started : public FptestTest
{
  protected:
    static Start start_of_run(const std::string &path)
    {
        const Start start{.arguments = {"run", "--json", work("json"), "--junit", work("junit"),
                                        "--plan", path, "P/G"},
                          .prepare = in_own_session};
        return start;
    }

    static void expect_whole_reports(const std::string &reason)
    {
        EXPECT_EQ(events_of(read_file(work("json")), "finish").at(0).at("reason"), reason);
        auto suite = parse_xml(read_file(work("junit"))).children.at(0);
        EXPECT_EQ(suite.properties()["reason"], reason);
    }

    // Without the pauses of eventually(), so that its process is met when it is new.
    static bool has_child(pid_t pid)
    {
        const std::string children =
            "/proc/" + std::to_string(pid) + "/task/" + std::to_string(pid) + "/children";
        const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(10);
        while (std::chrono::steady_clock::now() < end) {
            if (!read_file(children).empty()) {
                return true;
            }
        }
        return false;
    }
};

TEST_F(Started, SignalToItsGroupEndsTheRunAndNotTheLibrarysProcess)
{
    for (std::size_t turn = 0; turn < 60; ++turn) {
        const int signal = std::array{SIGINT, SIGTERM, SIGHUP}.at(turn % 3);
        FptestProcess fptest(start_of_run(plan(kOneSleeps)));
        ASSERT_TRUE(has_child(fptest.pid()));
        usleep(static_cast<useconds_t>(turn) * 5);
        ASSERT_EQ(kill(-fptest.pid(), signal), 0);
        const Ended ended = fptest.wait();
        ASSERT_EQ(ended.status, 130) << "turn " << turn << ": " << ended.err;
        expect_whole_reports(std::string("interrupted by ") + (signal == SIGINT    ? "Ctrl-C"
                                                               : signal == SIGTERM ? "SIGTERM"
                                                                                   : "SIGHUP"));
    }
}

// A long plan waits for the lock of the stored one, between its start and its view.
TEST_F(Started, TerminalThatClosesIsAnInterruption)
{
    device::write_file(kPlanFile, "<P/>");
    const Descriptor lock(open(kPlanFile, O_RDONLY | O_CLOEXEC));
    ASSERT_EQ(flock(lock.get(), LOCK_EX), 0);
    int master = -1;
    int terminal = -1;
    std::array<char, 64> name{};
    ASSERT_EQ(openpty(&master, &terminal, name.data(), nullptr, nullptr), 0);
    Start start = start_of_run(plan(kOneSleeps + std::string(3000, '\n')));
    start.output = name.data();
    FptestProcess fptest(start);
    ASSERT_NE(fptest.library(), 0);
    close(terminal);
    close(master);
    flock(lock.get(), LOCK_UN);
    const Ended ended = fptest.wait();
    EXPECT_EQ(ended.status, 130) << ended.err;
    expect_whole_reports("interrupted by SIGHUP");
}

// The terminal is its own, and closes while its item runs.
TEST_F(Started, HangupStopsTheRunOrLetsItGoOn)
{
    const std::string path =
        plan(group_of({{"Item", "note /tmp/scene/begun await /tmp/scene/go report G 100 0 fine"}}));
    for (const std::string meaning : {"stop", "go-on"}) {
        unlink(work("begun").c_str());
        int master = -1;
        int terminal = -1;
        ASSERT_EQ(openpty(&master, &terminal, nullptr, nullptr, nullptr), 0);
        fcntl(master, F_SETFD, FD_CLOEXEC);
        Start start = start_of_run(path);
        start.arguments.insert(start.arguments.end(), {"--hangup", meaning});
        start.environment["TERM"] = "xterm";
        start.shares_streams = true;
        start.prepare = [terminal] { login_tty(terminal); };
        FptestProcess fptest(start);
        close(terminal);
        ASSERT_TRUE(wait_for_file("begun"));
        close(master);
        if (meaning == "go-on") {
            usleep(200'000);
            file("go", "");
        }
        EXPECT_EQ(fptest.wait().status, meaning == "go-on" ? 0 : 130);
        EXPECT_THAT(outcomes(read_file(work("json"))),
                    ElementsAre(meaning == "go-on" ? "Item: passed" : "Item: stopped"));
    }
}

TEST_F(Started, ViewInAFileIsNotLostWithATerminal)
{
    if (is_in_place()) {
        GTEST_SKIP() << "in place, the disk is the container's own and is not to be filled";
    }
    device::write_file(kPlanFile, group_of({{"Item", "report G 100 0 fine"}}));
    fill_disk();
    const Ended ended = run_fptest(
        {.arguments = {"run", "--hangup", "go-on", "P/G"}, .output = "/data/vorlane/view"});
    EXPECT_EQ(ended.status, 3);
    EXPECT_THAT(ended.err, HasSubstr("standard output: No space left on device"));
}

// Its terminal's end comes right after the Ctrl-C, while the item still ends.
TEST_F(Started, SessionLeaderThatDiesOnCtrlCLeavesWholeReports)
{
    int master = -1;
    int terminal = -1;
    ASSERT_EQ(openpty(&master, &terminal, nullptr, nullptr, nullptr), 0);
    fcntl(master, F_SETFD, FD_CLOEXEC);
    Start start =
        start_of_run(plan(group_of({{"Stubborn", "note /tmp/scene/begun ignore-stop sleep 60"}})));
    start.arguments.insert(start.arguments.end(), {"--grace", "0.5"});
    start.shares_streams = true;
    start.prepare = [terminal] {
        login_tty(terminal);
        if (fork() != 0) {
            std::signal(SIGINT, SIG_DFL);
            for (;;) {
                pause();
            }
        }
    };
    FptestProcess leader(start);
    close(terminal);
    ASSERT_TRUE(wait_for_file("begun"));
    ASSERT_EQ(write(master, "\x03", 1), 1);
    EXPECT_EQ(leader.wait().status, -SIGINT);
    EXPECT_TRUE(eventually([] { return processes_named(FPTEST_PROGRAM).empty(); }, 20));
    expect_whole_reports("interrupted by Ctrl-C");
    close(master);
}

TEST_F(Started, SignalsThatAreIgnoredStayIgnored)
{
    const std::string path =
        plan(group_of({{"Item", "note /tmp/scene/begun await /tmp/scene/go report G 100 0 fine"}}));
    for (const int signal : {SIGHUP, SIGINT}) {
        Start start = start_of_run(path);
        start.prepare = [signal] {
            in_own_session();
            std::signal(signal, SIG_IGN);
        };
        FptestProcess fptest(start);
        ASSERT_TRUE(wait_for_file("begun"));
        fptest.signal(signal);
        usleep(200'000);
        file("go", "");
        EXPECT_EQ(fptest.wait().status, 0);
        EXPECT_THAT(outcomes(read_file(work("json"))), ElementsAre("Item: passed"));
        unlink(work("begun").c_str());
        unlink(work("go").c_str());
    }
}

TEST_F(Started, EndsOfChildrenThatAreIgnoredAreKnownAllTheSame)
{
    plan(group_of({{"Item", "report G 100 0 fine; kill -SEGV $$"}}));
    support::Start start;
    start.arguments = {FPTEST_PROGRAM, "run", "--plan", work("plan.xml"), "P/G"};
    start.prepare = [] { std::signal(SIGCHLD, SIG_IGN); };
    const support::Ended ended = support::run(start);
    EXPECT_EQ(ended.status, 1);
    EXPECT_THAT(ended.out, HasSubstr("G/Item: failed, result 0, died by SIGSEGV"));
}

} // namespace
