// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What device/run leaves in its place: it runs the device, hands on to COMMAND the
// signals that are sent to device/run alone, and ends what does not end itself.
//
//   supervise box SIGNALS BWRAP ARG...      COMMAND is what bwrap's init runs
//   supervise here SIGNALS PROGRAM ARG...   PROGRAM becomes COMMAND itself
//   supervise become SIGNALS COMMAND ARG... the last step on the device
//
// SIGNALS are the numbers, comma-separated, of those that the caller does not ignore.
// They are ignored by all that stands in between, until COMMAND is begun.
//
// A terminal, and timeout(1), signal the whole process group, COMMAND with it, and it
// is not to get that twice: a second SIGTERM may mean "at once". So a witness is kept
// in the group, which blocks every signal: what is pending there was sent to all.

#include "common/descriptor.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <fstream>
#include <iterator>
#include <linux/close_range.h>
#include <map>
#include <memory>
#include <optional>
#include <poll.h>
#include <sstream>
#include <string>
#include <string_view>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <sys/wait.h>
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

[[noreturn]] void become(const std::vector<int> &signals, char **command)
{
    if (const char *descriptor = std::getenv(kBeginVariable)) {
        fcntl(std::atoi(descriptor), F_SETFD, FD_CLOEXEC);
        unsetenv(kBeginVariable);
    }
    for (const int number : signals) {
        std::signal(number, SIG_DFL);
    }
    execvp(command[0], command);
    fail(command[0]);
}

// ---- other processes ---------------------------------------------------------

std::string proc(pid_t pid, const std::string &file)
{
    return "/proc/" + std::to_string(pid) + "/" + file;
}

// 0 where there is none.
pid_t first_child(pid_t pid)
{
    pid_t child = 0;
    std::ifstream(proc(pid, "task/" + std::to_string(pid) + "/children")) >> child;
    return child;
}

// A process of this group that does nothing; signals stay pending on it.
class Witness
{
  public:
    Witness() : pid_(fork())
    {
        if (pid_ == 0) {
            sigset_t all;
            sigfillset(&all);
            sigprocmask(SIG_BLOCK, &all, nullptr);
            prctl(PR_SET_PDEATHSIG, SIGKILL);
            syscall(SYS_close_range, 0U, ~0U, 0);
            for (;;) {
                pause();
            }
        }
    }
    Witness(const Witness &) = delete;
    Witness &operator=(const Witness &) = delete;
    ~Witness()
    {
        if (pid_ > 0) {
            kill(pid_, SIGKILL);
            waitpid(pid_, nullptr, 0);
        }
    }
    bool has_got(int number) const
    {
        std::ifstream status(proc(pid_, "status"));
        for (std::string line; std::getline(status, line);) {
            if (line.starts_with("ShdPnd:")) {
                return (std::stoull(line.substr(7), nullptr, 16) >> (number - 1) & 1U) != 0;
            }
        }
        return false;
    }

  private:
    pid_t pid_;
};

// ---- the supervision ---------------------------------------------------------

class Supervisor
{
  public:
    Supervisor(bool is_box, std::vector<int> signals, char **program)
        : is_box_(is_box), signals_(std::move(signals))
    {
        sigset_t before;
        sigemptyset(&awaited_);
        sigaddset(&awaited_, SIGCHLD);
        sigaddset(&awaited_, SIGRTMIN);
        for (const int number : signals_) {
            sigaddset(&awaited_, number);
            std::signal(number, SIG_DFL); // a shell ignores some for what it has in the background
        }
        sigprocmask(SIG_BLOCK, &awaited_, &before);
        end_with_the_caller();
        start(program, before);
        witness_ = std::make_unique<Witness>();
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
            } else if (number > 0 && !has_begun()) {
                end_by(number == SIGRTMIN ? SIGHUP : number);
            } else if (number == SIGRTMIN) {
                if (given_up_ == 0 && requests_.empty()) {
                    hand_on(SIGHUP);
                }
            } else if (number > 0) {
                requests_.try_emplace(number, Clock::now() + kOneRequest);
            }
            look_at_the_clock();
        }
    }

  private:
    // With its caller's end a device in namespaces is left by its terminal, unless that
    // is nothing to it. In place the caller is the script that puts the container back.
    void end_with_the_caller() const
    {
        if (!is_box_) {
            prctl(PR_SET_PDEATHSIG, SIGKILL);
        } else if (std::ranges::find(signals_, SIGHUP) != signals_.end()) {
            prctl(PR_SET_PDEATHSIG, SIGRTMIN);
        }
    }

    void start(char **program, const sigset_t &mask)
    {
        std::array<int, 2> ends{};
        if (pipe(ends.data()) != 0) {
            fail("pipe");
        }
        begin_ = Descriptor(ends[0]);
        const Descriptor writing(ends[1]);
        fcntl(begin_.get(), F_SETFD, FD_CLOEXEC);
        setenv(kBeginVariable, std::to_string(writing.get()).c_str(), 1);
        pid_ = fork();
        if (pid_ < 0) {
            fail("fork");
        }
        if (pid_ == 0) {
            prctl(PR_SET_PDEATHSIG, SIGKILL);
            for (const int number : signals_) {
                std::signal(number, SIG_IGN);
            }
            sigprocmask(SIG_SETMASK, &mask, nullptr);
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
        if (ended_by_ != 0) {
            return 128 + ended_by_;
        }
        return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    }

    bool has_begun() const
    {
        pollfd end{begin_.get(), POLLIN, 0};
        return poll(&end, 1, 0) > 0;
    }

    // 0 where it has just ended.
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
        auto next = std::make_unique<Witness>();
        const bool has_it = witness_->has_got(number) && getpgid(command()) == getpgrp();
        witness_ = std::move(next);
        if (!has_it) {
            hand_on(number);
        } else if (number != SIGINT && number != SIGQUIT) {
            give_up_soon(number);
        }
    }

    void hand_on(int number)
    {
        if (const pid_t pid = command(); pid > 0) {
            kill(pid, number);
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

    // bwrap's child ends with it only once it has said so: early on it would go on.
    void end_by(int number)
    {
        ended_by_ = number;
        siginfo_t stopped{};
        if (is_box_ && kill(pid_, SIGSTOP) == 0 &&
            waitid(P_PID, static_cast<id_t>(pid_), &stopped, WSTOPPED | WEXITED | WNOWAIT) == 0) {
            if (const pid_t init = first_child(pid_); init > 0) {
                kill(init, SIGKILL);
            }
        }
        kill(pid_, SIGKILL);
    }

    bool is_box_;
    std::vector<int> signals_;
    sigset_t awaited_{};
    pid_t pid_ = -1;
    Descriptor begin_{-1};
    std::unique_ptr<Witness> witness_;
    std::map<int, Clock::time_point> requests_; // and when they are judged
    std::optional<Clock::time_point> deadline_;
    int given_up_ = 0; // the signal whose deadline runs
    int ended_by_ = 0;
};

} // namespace

int main(int argc, char **argv)
{
    const std::string_view way = argc > 3 ? argv[1] : "";
    if (way != "box" && way != "here" && way != "become") {
        std::fputs("device/run: supervise: it is for device/run and device/start\n", stderr);
        return kFailed;
    }
    std::vector<int> signals = parse_signals(argv[2]);
    if (way == "become") {
        become(signals, argv + 3);
    }
    return Supervisor(way == "box", std::move(signals), argv + 3).run();
}
