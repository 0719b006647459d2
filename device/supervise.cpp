// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What device/run leaves in its place: it runs the device, hands on to COMMAND the
// signals that are sent to device/run alone, and ends what does not end itself.
//
//   supervise box CALLER SIGNALS BWRAP ARG...      COMMAND is what bwrap's init runs
//   supervise here CALLER SIGNALS PROGRAM ARG...   PROGRAM becomes COMMAND itself
//   supervise become 0 SIGNALS MKSH START VENDOR SCRIPTS COMMAND ARG...
//                                                  runs START on the device, then becomes COMMAND
//
// CALLER is the process to which this one belongs, and 0 if it need not be there.
// SIGNALS are the numbers, comma-separated, of those that the caller does not ignore.
// They are blocked in all that is in between, so that one that comes before COMMAND
// is begun meets what was to become COMMAND.
//
// These are two processes. The front one has device/run's id: it hands on the signals
// that come there, and can be killed. The other, the supervisor, then still ends the
// device. It is of the same process group, which a terminal and timeout(1) signal whole,
// COMMAND with it; and COMMAND is not to get that twice, as a second SIGTERM may mean "at
// once". What comes to the supervisor itself was sent to all.
//
// With QUILLMARK_ADB=PORT in the environment the device inherits a socket that listens
// there, on the caller's loopback, and the variable is its descriptor; START has it too,
// COMMAND has neither.

#include "common/descriptor.h"

#include <algorithm>
#include <arpa/inet.h>
#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <netinet/in.h>
#include <optional>
#include <poll.h>
#include <set>
#include <sstream>
#include <string>
#include <string_view>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <system_error>
#include <unistd.h>
#include <vector>

namespace
{

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

constexpr int kFailed = 125;
// timeout(1) signals the process, then its group: so long both are taken for one.
constexpr auto kOneRequest = 200ms;
constexpr auto kPatience = 10s;
// The descriptor that is closed when COMMAND is begun.
constexpr char kBeginVariable[] = "QUILLMARK_BEGIN";
constexpr char kAdbVariable[] = "QUILLMARK_ADB";

std::vector<int> parse_signals(const char *text)
{
    std::vector<int> signals;
    std::istringstream stream(text);
    for (std::string number; std::getline(stream, number, ',');) {
        signals.push_back(std::atoi(number.c_str()));
    }
    return signals;
}

[[noreturn]] void fail(const char *what)
{
    std::fprintf(stderr, "device/run: %s: %s\n", what, std::strerror(errno));
    std::exit(kFailed);
}

sigset_t set_of(const std::vector<int> &signals)
{
    sigset_t set;
    sigemptyset(&set);
    for (const int number : signals) {
        sigaddset(&set, number);
    }
    return set;
}

int shell_status(int status)
{
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

// How many words START is begun with, before COMMAND.
constexpr int kStartWords = 4;

// The descriptor that the variable names is not for the next program.
void keep_to_oneself(const char *variable)
{
    if (const char *descriptor = std::getenv(variable)) {
        fcntl(std::atoi(descriptor), F_SETFD, FD_CLOEXEC);
        unsetenv(variable);
    }
}

[[noreturn]] void become(const std::vector<int> &signals, char **words)
{
    keep_to_oneself(kBeginVariable);
    const pid_t start = fork();
    if (start == 0) {
        for (const int number : signals) {
            std::signal(number, SIG_IGN); // mksh unblocks them
        }
        execv(words[0], words);
        fail(words[0]);
    }
    keep_to_oneself(kAdbVariable);
    int status = -1;
    waitpid(start, &status, 0);
    const sigset_t unblocked = set_of(signals);
    sigprocmask(SIG_UNBLOCK, &unblocked, nullptr);
    if (status != 0) {
        std::exit(status < 0 ? kFailed : shell_status(status));
    }
    execvp(words[kStartWords], words + kStartWords);
    fail(words[kStartWords]);
}

// ---- other processes ---------------------------------------------------------

std::string proc(pid_t pid, const std::string &file)
{
    return "/proc/" + std::to_string(pid) + "/" + file;
}

std::vector<pid_t> children(pid_t pid)
{
    std::ifstream file(proc(pid, "task/" + std::to_string(pid) + "/children"));
    return {std::istream_iterator<pid_t>(file), {}};
}

// 0 if there is none.
pid_t first_child(pid_t pid)
{
    const std::vector<pid_t> all = children(pid);
    return all.empty() ? 0 : all.front();
}

// By its file, as a script has another name; by its name under an emulator.
bool is_shell(pid_t pid)
{
    std::error_code gone;
    std::string name;
    std::getline(std::ifstream(proc(pid, "comm")), name);
    const std::string file = std::filesystem::read_symlink(proc(pid, "exe"), gone).filename();
    return file == "sh" || file == "mksh" || name == "sh" || name == "mksh";
}

// A shell acts on a signal when the program that it waits for has ended: so that gets the
// signal too, after the shell, which then starts no other.
void signal_all(pid_t pid, int number)
{
    kill(pid, number);
    if (is_shell(pid)) {
        for (const pid_t child : children(pid)) {
            signal_all(child, number);
        }
    }
}

// What bwrap has left to this process when it died: its child, which ends with it only
// once it has said so, and may wait for it.
void end_children()
{
    for (pid_t child = 0; (child = first_child(getpid())) > 0;) {
        if (kill(child, SIGKILL) != 0) {
            return;
        }
        waitpid(child, nullptr, 0);
    }
}

// Ends with that process, or is told so; it may have ended before.
void follow(pid_t parent, int by)
{
    prctl(PR_SET_PDEATHSIG, by);
    if (getppid() != parent) {
        std::exit(kFailed);
    }
}

// ---- the front process ---------------------------------------------------------

// What it sends to the supervisor: the number of a signal that it got, SIGRTMIN when its
// caller has ended.
const int kHandedOn = SIGRTMIN;
// What the supervisor gets when the front process has ended.
const int kLeftAlone = SIGRTMIN + 1;

int stand_in_front(pid_t caller, pid_t supervisor, const sigset_t &awaited)
{
    for (;;) {
        int status = 0;
        const int number = sigwaitinfo(&awaited, nullptr);
        if (number == SIGCHLD && waitpid(supervisor, &status, WNOHANG) == supervisor) {
            return shell_status(status);
        }
        if (number == SIGRTMIN && getppid() == caller) {
            continue; // it was a thread of the caller's that has ended
        }
        if (number > 0 && number != SIGCHLD) {
            sigqueue(supervisor, kHandedOn, {.sival_int = number});
        }
    }
}

// ---- the supervision ---------------------------------------------------------

Descriptor listen_for_adb()
{
    const char *port = std::getenv(kAdbVariable);
    if (port == nullptr) {
        return Descriptor(-1);
    }
    Descriptor listening(socket(AF_INET, SOCK_STREAM, 0));
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<std::uint16_t>(std::atoi(port)));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    const int on = 1;
    setsockopt(listening.get(), SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
    if (bind(listening.get(), reinterpret_cast<sockaddr *>(&address), sizeof address) != 0 ||
        listen(listening.get(), SOMAXCONN) != 0) {
        const std::string what = "--adb " + std::string(port);
        if (errno == EADDRINUSE) {
            std::fprintf(stderr, "device/run: %s: the port is taken; name another\n", what.c_str());
            std::exit(kFailed);
        }
        fail(what.c_str());
    }
    setenv(kAdbVariable, std::to_string(listening.get()).c_str(), 1);
    return listening;
}

class Supervisor
{
  public:
    // The signals are blocked; mask is the caller's.
    Supervisor(bool is_box, std::vector<int> signals, char **program, const sigset_t &mask)
        : is_box_(is_box), signals_(std::move(signals)), awaited_(set_of(signals_))
    {
        for (const int number : {SIGCHLD, kHandedOn, kLeftAlone}) {
            sigaddset(&awaited_, number);
        }
        start(program, mask);
    }

    // COMMAND's status, as a shell has it.
    int run()
    {
        for (;;) {
            siginfo_t info{};
            const int number = wait(info);
            if (number == SIGCHLD) {
                if (const auto status = ended()) {
                    return *status;
                }
            } else if (number == kLeftAlone) {
                end_by(SIGKILL);
            } else if (number == kHandedOn) {
                take(info.si_value.sival_int);
            } else if (number > 0) {
                sent_to_all_.insert(number);
            }
            look_at_the_clock();
        }
    }

  private:
    // A signal that has come to the front process.
    void take(int number)
    {
        if (!has_begun()) {
            end_by(number == SIGRTMIN ? SIGHUP : number);
        } else if (number != SIGRTMIN) {
            requests_.try_emplace(number, Clock::now() + kOneRequest);
        } else if (given_up_ == 0 && requests_.empty()) {
            hand_on(SIGHUP);
        }
    }

    void start(char **program, const sigset_t &mask)
    {
        const Descriptor adb = listen_for_adb();
        std::array<int, 2> ends{};
        if (pipe(ends.data()) != 0) {
            fail("pipe");
        }
        begin_ = Descriptor(ends[0]);
        const Descriptor writing(ends[1]);
        fcntl(begin_.get(), F_SETFD, FD_CLOEXEC);
        setenv(kBeginVariable, std::to_string(writing.get()).c_str(), 1);
        const pid_t supervisor = getpid();
        pid_ = fork();
        if (pid_ < 0) {
            fail("fork");
        }
        if (pid_ == 0) {
            follow(supervisor, SIGKILL);
            const sigset_t blocked = set_of(signals_);
            sigprocmask(SIG_SETMASK, &mask, nullptr);
            sigprocmask(SIG_BLOCK, &blocked, nullptr);
            execvp(program[0], program);
            fail(program[0]);
        }
    }

    // The signal that has come, or 0 when it is time to look at the clock.
    int wait(siginfo_t &info) const
    {
        std::optional<Clock::time_point> next = deadline_;
        for (const auto &[number, time] : requests_) {
            next = std::min(next.value_or(time), time);
        }
        if (!next) {
            return sigwaitinfo(&awaited_, &info);
        }
        const auto left = std::max<Clock::duration>(*next - Clock::now(), 0ms);
        const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(left);
        const timespec limit{seconds.count(), std::chrono::nanoseconds(left - seconds).count()};
        return std::max(sigtimedwait(&awaited_, &info, &limit), 0);
    }

    std::optional<int> ended() const
    {
        int status = 0;
        if (waitpid(pid_, &status, WNOHANG) != pid_) {
            return std::nullopt;
        }
        if (is_box_) {
            end_children();
        }
        return ended_by_ != 0 ? 128 + ended_by_ : shell_status(status);
    }

    bool has_begun() const
    {
        pollfd end{begin_.get(), POLLIN, 0};
        return poll(&end, 1, 0) > 0;
    }

    // 0 if it has just ended.
    pid_t command() const
    {
        const pid_t init = is_box_ ? first_child(pid_) : 0;
        return is_box_ ? (init > 0 ? first_child(init) : 0) : pid_;
    }

    void look_at_the_clock()
    {
        const auto now = Clock::now();
        for (auto request = requests_.begin(); request != requests_.end();) {
            if (request->second <= now) {
                judge(request->first);
                request = requests_.erase(request);
            } else {
                ++request;
            }
        }
        if (deadline_ && *deadline_ <= now) {
            deadline_.reset();
            end_by(given_up_);
            pollfd errors{STDERR_FILENO, POLLOUT, 0};
            if (poll(&errors, 1, 0) > 0) { // nobody may read them
                std::fprintf(stderr,
                             "device/run: COMMAND goes on 10 s after SIG%s, and is ended with "
                             "its device\n",
                             sigabbrev_np(given_up_));
            }
        }
    }

    // Ctrl-C and Ctrl-\ are COMMAND's to handle, for as long as it likes.
    void judge(int number)
    {
        const bool has_it = sent_to_all_.erase(number) > 0 && getpgid(command()) == getpgrp();
        if (!has_it) {
            hand_on(number);
        } else if (number != SIGINT && number != SIGQUIT) {
            give_up_soon(number);
        }
    }

    void hand_on(int number)
    {
        if (const pid_t pid = command(); pid > 0) {
            signal_all(pid, number);
        }
        give_up_soon(number);
    }

    void give_up_soon(int number)
    {
        if (given_up_ == 0) {
            given_up_ = number;
            deadline_ = Clock::now() + kPatience;
        }
    }

    void end_by(int number)
    {
        ended_by_ = number;
        kill(pid_, SIGKILL);
    }

    bool is_box_;
    std::vector<int> signals_;
    sigset_t awaited_{};
    pid_t pid_ = -1;
    Descriptor begin_{-1};
    std::set<int> sent_to_all_;
    std::map<int, Clock::time_point> requests_; // and when they are judged
    std::optional<Clock::time_point> deadline_;
    int given_up_ = 0; // the signal whose deadline runs
    int ended_by_ = 0;
};

// With its caller's end a device in namespaces is left by its terminal, unless that is
// nothing to it. In place the caller is the script that puts the container back.
void end_with_the_caller(bool is_box, pid_t caller, const std::vector<int> &signals)
{
    if (!is_box) {
        follow(caller, SIGKILL);
    } else if (std::ranges::find(signals, SIGHUP) != signals.end()) {
        prctl(PR_SET_PDEATHSIG, SIGRTMIN);
    }
}

int supervise(bool is_box, pid_t caller, const std::vector<int> &signals, char **program)
{
    for (const int number : signals) {
        std::signal(number, SIG_DFL); // a shell ignores some for what it has in the background
    }
    sigset_t awaited = set_of(signals);
    sigaddset(&awaited, SIGCHLD);
    sigaddset(&awaited, SIGRTMIN);
    sigset_t before;
    sigprocmask(SIG_BLOCK, &awaited, &before);
    const pid_t parent = getppid();
    end_with_the_caller(is_box, caller, signals);
    const pid_t front = getpid();
    const pid_t supervisor = fork();
    if (supervisor < 0) {
        fail("fork");
    }
    if (supervisor > 0) {
        return stand_in_front(parent, supervisor, awaited);
    }
    sigset_t all;
    sigfillset(&all);
    sigprocmask(SIG_BLOCK, &all, nullptr);
    follow(front, kLeftAlone);
    if (is_box) {
        prctl(PR_SET_CHILD_SUBREAPER, 1);
    }
    return Supervisor(is_box, signals, program, before).run();
}

} // namespace

int main(int argc, char **argv)
{
    const std::string_view way = argc > 4 ? argv[1] : "";
    if (way != "box" && way != "here" && way != "become") {
        std::fputs("device/run: supervise: it is for device/run and device/start\n", stderr);
        return kFailed;
    }
    const std::vector<int> signals = parse_signals(argv[3]);
    if (way == "become") {
        become(signals, argv + 4);
    }
    return supervise(way == "box", std::atoi(argv[2]), signals, argv + 4);
}
