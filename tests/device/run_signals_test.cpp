// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How a device ends: by COMMAND and by signals.
#include "common/descriptor.h"
#include "launcher_runner.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <chrono>
#include <csignal>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <fcntl.h>
#include <filesystem>
#include <map>
#include <optional>
#include <stdexcept>
#include <string>
#include <sys/types.h>
#include <thread>
#include <unistd.h>
#include <utility>
#include <vector>

using namespace launcher;
using namespace std::chrono_literals;

namespace
{

const std::map<std::string, int> ending_signals = {
    {"HUP", SIGHUP}, {"INT", SIGINT}, {"QUIT", SIGQUIT}, {"TERM", SIGTERM}};

} // namespace

int launcher::say_signals()
{
    sigset_t set;
    sigemptyset(&set);
    for (const auto &[name, number] : ending_signals) {
        sigaddset(&set, number);
    }
    sigprocmask(SIG_BLOCK, &set, nullptr);
    std::puts("ready");
    std::fflush(stdout);
    timespec patience{30, 0};
    for (int number = 0; (number = sigtimedwait(&set, nullptr, &patience)) > 0;) {
        std::puts(sigabbrev_np(number));
        std::fflush(stdout);
        patience = {0, 500'000'000};
    }
    return 7;
}

namespace
{

// ---- what is left running ---------------------------------------------------

// The processes of this machine with that word among their arguments.
std::vector<pid_t> processes_with(const std::string &word)
{
    std::vector<pid_t> found;
    for (const auto &entry : fs::directory_iterator("/proc")) {
        const std::string id = entry.path().filename();
        if (std::ranges::all_of(id, [](unsigned char c) { return std::isdigit(c); }) &&
            ('\0' + read_file(entry.path() / "cmdline")).find('\0' + word + '\0') !=
                std::string::npos) {
            found.push_back(std::stoi(id));
        }
    }
    return found;
}

// A length to sleep that nobody else on this machine has.
std::string unique_length()
{
    static int count = 0;
    return "9" + std::to_string(getpid()) + "." + std::to_string(++count);
}

// A device that has a program in front and one in the background.
class RunningDevice
{
  public:
    bool has_started() const
    {
        return eventually([this] { return count() == 2; });
    }
    bool is_gone() const
    {
        return eventually([this] { return count() == 0; });
    }
    int end_by(int signal)
    {
        process_.signal(signal);
        return outcome_of(process_).status;
    }

  private:
    std::size_t count() const
    {
        return processes_with(front_).size() + processes_with(behind_).size();
    }
    std::string front_ = unique_length();
    std::string behind_ = unique_length();
    support::Process process_{
        start_of({device_run, "sh", "-c", "sleep " + behind_ + " & exec sleep " + front_})};
};

TEST_F(Device, SigtermEndsItAndEverythingOnIt)
{
    RunningDevice device;
    ASSERT_TRUE(device.has_started());

    EXPECT_EQ(device.end_by(SIGTERM), 143);
    EXPECT_TRUE(device.is_gone());
}

TEST_F(NamespaceDevice, SigkillOfTheLauncherEndsItAndEverythingOnIt)
{
    RunningDevice device;
    ASSERT_TRUE(device.has_started());

    EXPECT_EQ(device.end_by(SIGKILL), 137);
    EXPECT_TRUE(device.is_gone());
}

TEST_F(Device, WhatCommandLeavesRunningEndsWithIt)
{
    const std::string length = unique_length();

    shell("sleep " + length + " >/dev/null 2>&1 &");

    EXPECT_TRUE(eventually([&] { return processes_with(length).empty(); }));
}

// ---- signals ----------------------------------------------------------------

// A device in a process group of its own, started by a process that starts nothing
// else. What it says goes to a file, its errors elsewhere where that is wanted.
class SignalledDevice
{
  public:
    explicit SignalledDevice(const Words &command, const Words &options = {}, int errors = -1)
    {
        support::Start start = start_of(Words{device_run} + options + Words{"--"} + command,
                                        {.directory = directory_.path()});
        start.shares_streams = true;
        start.prepare = [this, errors] {
            setpgid(0, 0);
            const int file = open(said().c_str(), O_WRONLY | O_CREAT | O_APPEND, 0600);
            dup2(file, STDOUT_FILENO);
            dup2(errors < 0 ? file : errors, STDERR_FILENO);
        };
        process_.emplace(start);
        setpgid(process_->pid(), process_->pid());
    }
    const fs::path &directory() const
    {
        return directory_.path();
    }
    bool says(const std::string &text) const
    {
        return eventually([&] { return out().find(text) != std::string::npos; });
    }
    // But for what device/run says of being in place.
    std::string out() const
    {
        std::string text;
        for (const std::string &line : lines_of(read_file(said()))) {
            text += line.starts_with("device/run: in place: ") ? "" : line + "\n";
        }
        return text;
    }
    void signal(int number) const
    {
        process_->signal(number);
    }
    void signal_group(int number) const
    {
        process_->signal_group(number);
    }
    int wait()
    {
        return outcome_of(*process_).status;
    }

  private:
    fs::path said() const
    {
        return directory_.path() / "said";
    }
    TemporaryDirectory directory_;
    std::optional<support::Process> process_;
};

const Words signal_sayer = {this_program, say_signals_option};

TEST_F(Device, ASignalThatTheCallerIgnoresStaysIgnored)
{
    const Outcome outcome =
        run({"sh", "-c", "trap '' INT; exec \"$0\" sh -c 'kill -INT $$; echo on'", device_run});

    EXPECT_EQ(outcome.out, "on\n");
    EXPECT_EQ(outcome.status, 0);
}

TEST_F(Device, SignalsToItAloneOrToItsGroupComeToCommandOnce)
{
    for (const auto send : {&SignalledDevice::signal, &SignalledDevice::signal_group}) {
        for (const auto &[name, number] : ending_signals) {
            SCOPED_TRACE(name);
            SignalledDevice device(signal_sayer);
            ASSERT_TRUE(device.says("ready"));

            (device.*send)(number);

            EXPECT_EQ(device.wait(), 7);
            EXPECT_EQ(device.out(), "ready\n" + name + "\n");
        }
    }
}

TEST_F(Device, SignalsToItAndThenToItsGroupComeToCommandOnce)
{
    // as timeout(1) sends them
    SignalledDevice device(signal_sayer);
    ASSERT_TRUE(device.says("ready"));

    device.signal(SIGTERM);
    device.signal_group(SIGTERM);

    EXPECT_EQ(device.wait(), 7);
    EXPECT_EQ(device.out(), "ready\nTERM\n");
}

TEST_F(Device, ASecondSignalIsHandedOnAsWell)
{
    SignalledDevice device(signal_sayer);
    ASSERT_TRUE(device.says("ready"));

    device.signal(SIGTERM);
    ASSERT_TRUE(device.says("TERM\n"));
    device.signal(SIGTERM);
    ASSERT_TRUE(device.says("TERM\nTERM\n"));
    device.signal(SIGHUP);

    EXPECT_EQ(device.wait(), 7);
    EXPECT_EQ(device.out(), "ready\nTERM\nTERM\nHUP\n");
}

TEST_F(Device, SignalsReachACommandThatHasLeftTheGroup)
{
    SignalledDevice device(Words{"/usr/bin/setsid", "-w"} + signal_sayer);
    ASSERT_TRUE(device.says("ready"));

    device.signal_group(SIGTERM);

    EXPECT_EQ(device.wait(), 7);
    EXPECT_EQ(device.out(), "ready\nTERM\n");
}

TEST_F(Device, ACommandThatGoesOnIsEndedWithItTenSecondsLater)
{
    for (const bool is_to_all : {false, true}) {
        if (is_to_all && way() == Way::in_place) {
            break; // it is the same there, and the others wait
        }
        SignalledDevice device(
            {"sh", "-c", "trap '' TERM; echo ready; while :; do sleep 0.1; done"});
        ASSERT_TRUE(device.says("ready"));
        const auto begin = std::chrono::steady_clock::now();

        is_to_all ? device.signal_group(SIGTERM) : device.signal(SIGTERM);

        EXPECT_EQ(device.wait(), 143);
        EXPECT_GE(std::chrono::steady_clock::now() - begin, 10s);
        EXPECT_EQ(device.out(), "ready\ndevice/run: COMMAND goes on 10 s after SIGTERM, and is "
                                "ended with its device\n");
    }
}

TEST_F(Device, ASignalAtItsStartEndsItAtOnceAndLeavesNothingRunning)
{
    for (const int number : {SIGTERM, SIGHUP}) {
        for (auto delay = 0ms; delay <= 200ms; delay += 20ms) {
            SCOPED_TRACE(sigabbrev_np(number) + std::to_string(delay.count()));
            const std::string length = unique_length();
            SignalledDevice device({"timeout", "20", "sleep", length});
            std::this_thread::sleep_for(delay);
            const auto begin = std::chrono::steady_clock::now();

            device.signal(number);

            EXPECT_EQ(device.wait(), 128 + number) << device.out();
            EXPECT_LT(std::chrono::steady_clock::now() - begin, 9s);
            EXPECT_TRUE(eventually([&] { return processes_with(length).empty(); }));
        }
    }
}

// What device/run finds for bwrap: a script that is told which start it is, and leaves a
// process that does not end with it, as bwrap does early on.
class SlowBwrap
{
  public:
    explicit SlowBwrap(const std::string &on_probe, const std::string &on_device = "")
    {
        directory_.program("bwrap", "#!/bin/bash\nleave() { setsid timeout 20 sleep " + left_ +
                                        " & }\ncase $* in *' -- /usr/bin/true') " + on_probe +
                                        "\n;; *) " + on_device + "\nesac\nexec " + real_ +
                                        " \"$@\"\n");
        setenv("PATH", (directory_.path().string() + ":" + path_).c_str(), 1);
    }
    SlowBwrap(const SlowBwrap &) = delete;
    SlowBwrap &operator=(const SlowBwrap &) = delete;
    ~SlowBwrap()
    {
        setenv("PATH", path_.c_str(), 1);
    }
    bool has_started() const
    {
        return eventually([this] { return fs::exists(directory_.path() / "bwrap-started"); });
    }
    bool has_left_nothing() const
    {
        return eventually([this] { return processes_with(left_).empty(); });
    }

  private:
    TemporaryDirectory directory_;
    std::string left_ = unique_length();
    std::string path_ = std::getenv("PATH");
    std::string real_ = lines_of(run({"sh", "-c", "command -v bwrap"}).out).at(0);
};

TEST_F(NamespaceDevice, SignalsToItsGroupDoNotMeetWhatTriesTheBox)
{
    for (const auto &[name, number] : ending_signals) {
        SCOPED_TRACE(name);
        const SlowBwrap slow("leave; touch $0-started; sleep 0.4; kill $!");
        SignalledDevice device({"sh", "-c", "echo begun; sleep 9"});
        ASSERT_TRUE(slow.has_started());

        device.signal_group(number);

        EXPECT_EQ(device.wait(), 128 + number);
        EXPECT_TRUE(slow.has_left_nothing());
        EXPECT_EQ(device.out(), "");
    }
}

TEST_F(NamespaceDevice, SigkillOfItAsTheBoxIsLaidOutEndsWhatBwrapLeaves)
{
    const SlowBwrap slow(":", "leave; touch $0-started; wait");
    SignalledDevice device({"echo", "begun"});
    ASSERT_TRUE(slow.has_started());

    device.signal(SIGKILL);

    EXPECT_EQ(device.wait(), 137);
    EXPECT_TRUE(slow.has_left_nothing());
    EXPECT_EQ(device.out(), "");
}

TEST_F(NamespaceDevice, ABwrapThatIsKilledHasRefusedNothing)
{
    const SlowBwrap killed("kill -KILL $$");

    const Outcome outcome = on_device({"true"});

    EXPECT_EQ(outcome.status, 125);
    EXPECT_EQ(outcome.err, "device/run: bwrap was ended by signal 9 as it tried the device\n");
}

// What is read, by nobody, and what is written.
std::pair<Descriptor, Descriptor> full_pipe()
{
    std::array<int, 2> ends{};
    if (pipe2(ends.data(), O_CLOEXEC | O_NONBLOCK) != 0) {
        throw std::runtime_error("pipe2");
    }
    const std::array<char, 4096> page{};
    while (write(ends[1], page.data(), page.size()) > 0) {
    }
    fcntl(ends[1], F_SETFL, 0);
    return {Descriptor(ends[0]), Descriptor(ends[1])};
}

TEST_F(NamespaceDevice, SignalsAreHandedOnWhileNobodyReadsItsErrors)
{
    const auto [unread, errors] = full_pipe();
    SignalledDevice device(signal_sayer, {}, errors.get());
    ASSERT_TRUE(device.says("ready"));

    device.signal(SIGTERM);

    EXPECT_EQ(device.wait(), 7);
    EXPECT_EQ(device.out(), "ready\nTERM\n");
}

TEST_F(NamespaceDevice, ACommandThatGoesOnIsEndedWhileNobodyReadsItsErrors)
{
    const auto [unread, errors] = full_pipe();
    const std::string mark = unique_length();
    SignalledDevice device({"sh", "-c", "trap '' TERM; echo ready; echo errors >&2", mark}, {},
                           errors.get());
    ASSERT_TRUE(device.says("ready"));

    device.signal(SIGTERM);

    EXPECT_EQ(device.wait(), 143);
    EXPECT_TRUE(eventually([&] { return processes_with(mark).empty(); }));
}

TEST_F(Device, ATimeLimitLeavesWholeReports)
{
    SignalledDevice device({"fptest", "run", "--plan", tree / "plans/demo.xml", "--json", "results",
                            "--junit", "results.xml", "demo/Endurance"},
                           {"--out", "."});
    ASSERT_TRUE(eventually([&] {
        return read_file(device.directory() / "results").find("\"start\"") != std::string::npos;
    }));

    device.signal(SIGTERM);
    device.signal_group(SIGTERM);

    EXPECT_EQ(device.wait(), 130) << device.out();
    EXPECT_NE(read_file(device.directory() / "results").find("\"finish\""), std::string::npos);
    EXPECT_NE(read_file(device.directory() / "results.xml").find("</testsuites>"),
              std::string::npos);
}

TEST_F(NamespaceDevice, ItsCallersEndIsAHangUp)
{
    const TemporaryDirectory host;
    const fs::path said = host.path() / "said";
    support::Process caller(start_of({"sh", "-c", "\"$0\" \"$1\" \"$2\" >\"$3\" 2>&1; :",
                                      device_run, this_program, say_signals_option, said}));
    ASSERT_TRUE(eventually([&] { return read_file(said) == "ready\n"; }));

    caller.signal(SIGKILL);
    caller.wait();

    EXPECT_TRUE(eventually([&] { return read_file(said) == "ready\nHUP\n"; })) << read_file(said);
}

TEST_F(NamespaceDevice, TheEndOfItsCallersThreadIsNoHangUp)
{
    std::optional<SignalledDevice> device;
    std::thread([&] {
        device.emplace(signal_sayer);
        EXPECT_TRUE(device->says("ready"));
    }).join();
    std::this_thread::sleep_for(300ms);

    device->signal(SIGTERM);

    EXPECT_EQ(device->wait(), 7);
    EXPECT_EQ(device->out(), "ready\nTERM\n");
}

} // namespace
