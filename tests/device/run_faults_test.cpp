// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What a host does with its commands if a shell is missing, descriptors run out, or
// signals are handled in its own way. After each fault the next command without one works.
#include "faults.h"
#include "network.h"
#include "support/temporary_directory.h"

#include <cerrno>
#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <set>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

using namespace device;
namespace fs = std::filesystem;

namespace
{

// --- a missing shell ---------------------------------------------------------

class MissingShell : public PrivateMounts
{
  protected:
    void SetUp() override
    {
        PrivateMounts::SetUp();
        if (IsSkipped() || HasFatalFailure()) {
            return;
        }
        for (const auto &entry : fs::directory_iterator("/system/bin")) {
            if (entry.path().filename() != "sh") {
                fs::create_symlink(fs::read_symlink(entry.path()),
                                   without_sh_.path(entry.path().filename()));
            }
        }
    }

    void hide_the_libcs()
    {
        mount_over("/bin", empty_.path());
        ASSERT_NE(access("/bin/sh", F_OK), 0);
    }
    void hide_the_launchers()
    {
        mount_over("/system/bin", without_sh_.path());
        ASSERT_NE(access("/system/bin/sh", F_OK), 0);
        ASSERT_EQ(access("/system/bin/ps", X_OK), 0);
    }

    // The exit codes of the children, but for one that goes on running. The
    // launcher's own look may have taken one that has ended at once.
    static std::multiset<int> exit_codes(pid_t running = -1)
    {
        EXPECT_TRUE(children_end(running));
        std::multiset<int> codes;
        for (int status = 0; waitpid(-1, &status, WNOHANG) > 0;) {
            codes.insert(WIFEXITED(status) ? WEXITSTATUS(status) : -1);
        }
        return codes;
    }

  private:
    support::TemporaryDirectory empty_;
    support::TemporaryDirectory without_sh_;
};

using Codes = std::multiset<int>;

TEST_F(MissingShell, InBinLetsNoItemRun)
{
    hide_the_libcs();
    store(kPlan);
    load_plan();
    EXPECT_EQ(log_of_note(), lines_of_note(kNotAsked));
    EXPECT_THAT(ran(), IsEmpty());

    EXPECT_EQ(FPTEST_SuspendItemExecute(), -1);
    EXPECT_THAT(log_lines(), ElementsAre("FPTEST_SuspendItemExecute| enter... !",
                                         "FPTEST_SuspendItemExecute| popen error!"));
    EXPECT_EQ(exit_codes(), Codes());
}

TEST_F(MissingShell, InBinLetsTheGathererRun)
{
    hide_the_libcs();
    store(group_of({{"SensorProbe", "--group G"}}));
    load_plan();
    run_path("P/G/SensorProbe");
    EXPECT_EQ(log_lines(), lines_of_gatherer("--group G", kNotAsked, kTriggered));
    EXPECT_EQ(processes_named(kProbe).size(), 1U);
}

TEST_F(MissingShell, OfTheLauncherStartsNoGatherer)
{
    hide_the_launchers();
    store(kPlan);
    load_plan();
    // has the libc's
    EXPECT_EQ(log_of_note(), lines_of_note());
    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|x"));

    std::thread command([] { run_path("P/G/SensorProbe"); });
    EXPECT_TRUE(eventually([] { return !listeners().empty(); }));
    EXPECT_EQ(receive(connect_to(kTriggerPort)), "gather again!");
    command.join();
    EXPECT_EQ(log_lines(), lines_of_gatherer("--help", queried(), kTriggered));
    EXPECT_THAT(exit_codes(), ::testing::AnyOf(Codes(), Codes({127})));
}

TEST_F(MissingShell, OfTheLauncherStopsNoItem)
{
    store(kPlan);
    load_plan();
    run_path("P/G/Note");
    const pid_t running = start_item_program({"/system/bin/Note", "--sleep", "60"});
    hide_the_launchers();
    log_lines();

    EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
    EXPECT_THAT(log_lines(),
                ElementsAre("FPTEST_SuspendItemExecute| enter... !",
                            "FPTEST_SuspendItemExecute| pid = " + std::to_string(running)));
    EXPECT_THAT(exit_codes(running), ::testing::AnyOf(Codes({0}), Codes({0, 127})))
        << "of the listing, of the kill";
    EXPECT_EQ(waitpid(running, nullptr, WNOHANG), 0) << "still running";
}

// --- a limit on descriptors --------------------------------------------------

constexpr char kTooManyFiles[] = "(24),Too many open files";

class DescriptorLimit : public DeviceTest, public ::testing::WithParamInterface<rlim_t>
{
  protected:
    // So many more can be opened under the limit.
    static std::size_t room()
    {
        std::size_t free = 0;
        for (rlim_t descriptor = 0; descriptor < GetParam(); ++descriptor) {
            free += fcntl(static_cast<int>(descriptor), F_GETFD) < 0 ? 1 : 0;
        }
        return free;
    }

    // What is logged, under the limit, of a call that leaves so many descriptors open.
    template <typename Body> static Lines lines_under_limit(std::size_t left_open, Body body)
    {
        const std::size_t room_before = room();
        log_lines();
        {
            const Limit limited(RLIMIT_NOFILE, GetParam());
            body();
        }
        EXPECT_EQ(room(), room_before - left_open);
        return log_lines();
    }

    static void expect_item(bool loaded)
    {
        const Lines expected = loaded ? lines_of_note(room() >= 2 ? queried() : kNotAsked)
                                      : lines_of_unloaded_note(failed_load("-1", kTooManyFiles));
        EXPECT_EQ(lines_under_limit(0, [] { run_path("P/G/Note"); }), expected);
    }
    static void expect_report(bool loaded)
    {
        const bool is_saved = room() > 0;
        EXPECT_EQ(lines_under_limit(0, [] { report(1, "d"); }),
                  loaded
                      ? lines_of_report(1, "d", is_saved ? saved() : not_saved("-1", kTooManyFiles))
                      : lines_of_unloaded_report(1, "d", failed_load("-1", kTooManyFiles)));
        EXPECT_EQ(read_file(kPlanFile), is_saved ? saved_plan(1, "d") : kPlan);
    }
    static void expect_read_back()
    {
        const bool is_read = room() > 0;
        const std::string plan = read_file(kPlanFile);
        std::string text;
        EXPECT_EQ(lines_under_limit(0, [&] { text = read_back(); }),
                  is_read ? lines_of_read_back(plan.size()) : logged(not_opened_to_read("-1")));
        EXPECT_EQ(text, is_read ? plan : "");
    }
    static void expect_suspension()
    {
        const bool is_listed = room() >= 2; // and the stream stays open
        EXPECT_EQ(lines_under_limit(is_listed ? 1 : 0,
                                    [] { EXPECT_EQ(FPTEST_SuspendItemExecute(), -1); }),
                  Lines({"FPTEST_SuspendItemExecute| enter... !",
                         is_listed ? "FPTEST_SuspendItemExecute| target process not exist!"
                                   : "FPTEST_SuspendItemExecute| popen error!"}));
    }
    static void expect_gatherer()
    {
        const std::size_t room_before = room();
        const Lines no_socket = Lines{"VRSOCK: setsockopt failed(9),Bad file descriptor",
                                      "VRSOCK: bind failed(9),Bad file descriptor"} +
                                logged(listen_failed(EBADF) + accept_failed(EBADF));
        // the connection stays open, or else the listening socket
        EXPECT_EQ(lines_under_limit(room_before > 0 ? 1 : 0, [] { run_path("P/G/SensorProbe"); }),
                  lines_of_gatherer("--help", room_before >= 2 ? queried() : kNotAsked,
                                    room_before == 0   ? no_socket
                                    : room_before == 1 ? logged(accept_failed(EMFILE))
                                                       : kTriggered));
        EXPECT_TRUE(children_end()) << "the gatherer does not end";
    }
    static void expect_store()
    {
        const bool is_stored = room() > 0; // and the plan stays open
        EXPECT_EQ(lines_under_limit(is_stored ? 1 : 0, [] { store(kPlan); }),
                  lines_of_store(kPlan, is_stored ? Lines{} : Lines{kNotOpened}));
        EXPECT_EQ(fs::exists(kPlanFile), is_stored) << "removed before it is opened";
        EXPECT_EQ(g_TestCmdTree == nullptr, is_stored);
    }

    static void run_everything(bool loaded)
    {
        close_range(STDERR_FILENO + 1, ~0U, 0);
        FPTEST_RunTestCmd("unknown", nullptr, 0); // the log opens its file
        if (loaded) {
            load_plan();
        }
        const bool loads = loaded || room() > 0;
        expect_report(loads);
        expect_item(loads);
        expect_read_back();
        expect_suspension();
        if (loads) { // without its plan it is an item as any other
            expect_gatherer();
            expect_store();
        }
        log_lines();
        store(kPlan); // without the limit
        run_path("P/G/Note");
        EXPECT_EQ(log_lines(), lines_of_store(kPlan) + lines_of_note());
        EXPECT_THAT(ran(), ::testing::Contains("/system/bin/Note|x"));
    }
};

TEST_P(DescriptorLimit, IsLoggedAndEndsNothing)
{
    for (const bool loaded : {false, true}) {
        SCOPED_TRACE(loaded ? "with a plan in memory" : "with no plan in memory");
        write_file(kPlanFile, kPlan);
        OtherHost host([&] { run_everything(loaded); });
        while (!host.has_ended()) {
            if (!listeners().empty()) { // it may have gone by the time of connecting
                const Socket client(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
                const sockaddr_in address = loopback(kTriggerPort);
                static_cast<void>(connect(
                    client.get(), reinterpret_cast<const sockaddr *>(&address), sizeof address));
            }
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
        }
        EXPECT_EQ(host.wait().status, 0);
    }
}

INSTANTIATE_TEST_SUITE_P(From0, DescriptorLimit, ::testing::Range<rlim_t>(0, 13));

// --- signals -----------------------------------------------------------------

class HostsSignals : public DeviceTest
{
  protected:
    void SetUp() override
    {
        DeviceTest::SetUp();
        store(group_of({{"Note", "--sleep 0.3"}, {"SensorProbe", "--group G"}}));
        load_plan();
    }

    // Once the gatherer has gathered; its report is a child of the same name.
    static pid_t gatherer()
    {
        EXPECT_TRUE(
            eventually([] { return read_back().find("result=\"0\"") != std::string::npos; }));
        EXPECT_TRUE(eventually([] { return processes_named(kProbe).size() == 1; }));
        log_lines();
        const auto running = processes_named(kProbe);
        return running.empty() ? -1 : running[0].pid;
    }

    static void run_item()
    {
        const auto start = std::chrono::steady_clock::now();
        run_path("P/G/Note");
        EXPECT_GE(std::chrono::steady_clock::now() - start, std::chrono::milliseconds(300));
        EXPECT_EQ(log_lines(), lines_of_note(queried(), "--sleep 0.3"));
        EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|--sleep|0.3"));
    }
    static void run_gatherer()
    {
        run_path("P/G/SensorProbe");
        EXPECT_EQ(log_lines(), lines_of_gatherer("--group G", queried(), kTriggered));
    }
    static void stop_gatherer()
    {
        const pid_t pid = gatherer();
        EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
        EXPECT_THAT(log_lines(),
                    ElementsAre("FPTEST_SuspendItemExecute| enter... !",
                                "FPTEST_SuspendItemExecute| pid = " + std::to_string(pid)));
        EXPECT_TRUE(eventually([] { return processes_named(kProbe).empty(); }));
    }
};

TEST_F(HostsSignals, IgnoredSigchldLeavesNothingToWaitForAndChangesNothingElse)
{
    std::signal(SIGCHLD, SIG_IGN);
    run_item();
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
    run_gatherer();
    stop_gatherer();
    EXPECT_TRUE(eventually([] { return waitpid(-1, nullptr, WNOHANG) == -1 && errno == ECHILD; }));
    EXPECT_EQ(std::signal(SIGCHLD, SIG_DFL), SIG_IGN);
}

volatile std::sig_atomic_t interrupts = 0;
volatile std::sig_atomic_t quits = 0;

void count_signal(int signal)
{
    if (signal == SIGINT) {
        interrupts = interrupts + 1;
    } else {
        quits = quits + 1;
    }
}

// The host's own handler is there again after every call.
class HostsInterrupts : public HostsSignals
{
  protected:
    static void expect_kept(sighandler_t handler)
    {
        std::signal(SIGINT, handler);
        std::signal(SIGQUIT, handler);
        int handled = 0;
        for (void (*call)() : {run_item, run_gatherer, stop_gatherer}) {
            call();
            handled += handler == SIG_IGN ? 0 : 1;
            std::raise(SIGINT);
            std::raise(SIGQUIT);
            EXPECT_EQ(interrupts, handled);
            EXPECT_EQ(quits, handled);
        }
        EXPECT_EQ(std::signal(SIGINT, SIG_DFL), handler);
        EXPECT_EQ(std::signal(SIGQUIT, SIG_DFL), handler);
    }
};

TEST_F(HostsInterrupts, AreHandledByItsOwnHandlersAfterEveryCall)
{
    expect_kept(count_signal);
}

TEST_F(HostsInterrupts, StayIgnoredAfterEveryCall)
{
    expect_kept(SIG_IGN);
}

} // namespace
