// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/library_process.h"

#include "module/processes.h"
#include "module/protocol.h"
#include "module/server.h"
#include "plan/library_rules.h"
#include "util/failure.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fmt/core.h>
#include <iterator>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <system_error>
#include <unistd.h>

namespace fptest
{
namespace
{

[[noreturn]] void fail(const char *what)
{
    throw std::system_error(errno, std::generic_category(), what);
}

// "NANOSECONDS OUTPUT TEXT"
LibraryProcess::Event with_moment(LibraryProcess::Event::Kind kind, const std::string &text)
{
    LibraryProcess::Event event{};
    event.kind = kind;
    char *end = nullptr;
    const std::chrono::nanoseconds time(std::strtoll(text.c_str(), &end, 10));
    event.time = std::chrono::steady_clock::time_point(time);
    event.output = std::strtoll(end, &end, 10);
    event.text = end + 1;
    return event;
}

} // namespace

LibraryProcess::LibraryProcess()
{
    // what outlives the library's process becomes a child of this one, and can be found
    prctl(PR_SET_CHILD_SUBREAPER, 1);
    start();
}

void LibraryProcess::start()
{
    std::array<int, 2> control{};
    if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, control.data()) != 0) {
        fail("no socket to the library's process");
    }
    control_ = Descriptor(control[0]);
    const Descriptor their_control(control[1]);
    std::fflush(nullptr);
    pid_ = fork();
    if (pid_ < 0) {
        fail("no process for the library");
    }
    leader_ = pid_;
    if (pid_ == 0) {
        close(control_.get());
        serve_library(their_control.get(), output_.descriptor());
    }
}

LibraryProcess::~LibraryProcess()
{
    output_.leave();
    quit();
}

void LibraryProcess::quit()
{
    shutdown(control_.get(), SHUT_RDWR);
    if (pid_ > 0) {
        kill(pid_, SIGCONT); // an item may have suspended it
        while (waitpid(pid_, nullptr, 0) < 0 && errno == EINTR) {
        }
        pid_ = -1;
    }
}

void LibraryProcess::command(const std::string &text, const std::vector<std::string> &items)
{
    rewind_output();
    std::string message = text.c_str(); // commands are zero-terminated
    for (const std::string &item : items) {
        message += '\0' + item;
    }
    send_message(control_.get(), {MessageKind::command, message});
}

void LibraryProcess::give_directories(const std::vector<std::string> &directories)
{
    std::string message;
    for (const std::string &directory : directories) {
        message += directory + '\0';
    }
    if (!message.empty()) {
        send_message(control_.get(), {MessageKind::directories, message});
    }
}

void LibraryProcess::stop(const std::string &item)
{
    send_message(control_.get(), {MessageKind::stop, item});
}

void LibraryProcess::hold_at_ends()
{
    hold_requested_ = true;
    send_message(control_.get(), {MessageKind::hold, ""});
}

void LibraryProcess::go_on()
{
    rewind_output();
    send_message(control_.get(), {MessageKind::go_on, ""});
}

ChildProcesses LibraryProcess::processes() const
{
    return {leader_, pid_ > 0 ? pid_ : getpid(), vendor_};
}

void LibraryProcess::restart()
{
    // what an earlier process of it had started
    siginfo_t ended{};
    while (waitid(P_ALL, 0, &ended, WEXITED | WNOHANG | WNOWAIT) == 0 && ended.si_pid != 0 &&
           ended.si_pid != pid_) {
        waitpid(ended.si_pid, nullptr, WNOHANG);
        ended = {};
    }
    if (pid_ < 0) {
        start();
        if (hold_requested_) {
            hold_at_ends();
        }
    }
}

bool LibraryProcess::has_many_descriptors() const
{
    rlimit limit{};
    getrlimit(RLIMIT_NOFILE, &limit);
    // from 128 on, Android's shell makes no pipe
    const rlim_t many = std::min<rlim_t>(64, limit.rlim_max / 2);
    std::error_code gone;
    const std::filesystem::directory_iterator all(fmt::format("/proc/{}/fd", pid_), gone);
    return static_cast<rlim_t>(std::distance(begin(all), end(all))) > many;
}

void LibraryProcess::kill_library() const
{
    if (pid_ > 0) {
        kill(pid_, SIGKILL);
    }
}

bool LibraryProcess::is_suspended() const
{
    return pid_ > 0 && state_of(pid_) == 'T';
}

// The library first, or it could start another item meanwhile.
void LibraryProcess::suspend()
{
    if (pid_ > 0) {
        kill(pid_, SIGSTOP);
    }
    processes().signal_all(SIGSTOP);
}

void LibraryProcess::resume()
{
    processes().signal_all(SIGCONT);
    if (pid_ > 0) {
        kill(pid_, SIGCONT);
    }
}

std::string LibraryProcess::read_back()
{
    has_plan_ = false;
    send_message(control_.get(), {MessageKind::read_back, ""});
    while (!has_plan_ && pid_ > 0) {
        read_control();
    }
    return std::move(plan_);
}

bool LibraryProcess::has_news(std::chrono::milliseconds longest,
                              std::initializer_list<int> others) const
{
    std::vector<pollfd> polled{{control_.get(), POLLIN, 0}};
    for (const int other : others) {
        polled.push_back({other, POLLIN, 0});
    }
    poll(polled.data(), static_cast<nfds_t>(polled.size()), static_cast<int>(longest.count()));
    return polled[0].revents != 0;
}

std::optional<LibraryProcess::Event> LibraryProcess::wait(std::chrono::milliseconds longest,
                                                          std::initializer_list<int> others)
{
    if (events_.empty() && pid_ > 0 && has_news(longest, others)) {
        read_control();
    }
    if (events_.empty()) {
        return std::nullopt;
    }
    Event event = std::move(events_.front());
    events_.pop_front();
    return event;
}

void LibraryProcess::read_control()
{
    Message message;
    if (!receive_message(control_.get(), message)) {
        lose();
        return;
    }
    Event event{};
    switch (message.kind) {
    case MessageKind::item:
        event = with_moment(Event::Kind::item, message.text);
        event.value = std::atoi(event.text.c_str());
        vendor_ = event.value;
        break;
    case MessageKind::ended: {
        event = with_moment(Event::Kind::ended, message.text);
        char *end = nullptr;
        event.value = static_cast<int>(std::strtol(event.text.c_str(), &end, 10));
        event.left_running = std::strtol(end, nullptr, 10) != 0;
        break;
    }
    case MessageKind::connected:
        event = with_moment(Event::Kind::connected, message.text);
        break;
    case MessageKind::returned:
        event = with_moment(Event::Kind::returned, message.text);
        break;
    case MessageKind::stopped:
        event.kind = Event::Kind::stopped;
        event.value = std::atoi(message.text.c_str());
        break;
    case MessageKind::plan:
        plan_ = std::move(message.text);
        has_plan_ = true;
        return;
    default:
        return; // the library's process sends none of them
    }
    events_.push_back(std::move(event));
}

void LibraryProcess::lose()
{
    int status = 0;
    while (waitpid(pid_, &status, 0) < 0 && errno == EINTR) {
    }
    pid_ = -1;
    Event event{};
    event.kind = Event::Kind::gone;
    event.text = WIFSIGNALED(status) ? fmt::format("by signal {}", WTERMSIG(status))
                                     : fmt::format("with status {}", WEXITSTATUS(status));
    event.time = std::chrono::steady_clock::now();
    event.output = output_.size();
    events_.push_back(std::move(event));
}

void LibraryProcess::rewind_output()
{
    if (!has_events()) {
        output_.rewind();
    }
}

std::optional<off_t> LibraryProcess::output_size() const
{
    const off_t size = output_.size();
    return has_events() ? std::nullopt : std::optional(size);
}

// What was printed after an event must not be taken before the event.
bool LibraryProcess::has_events() const
{
    return !events_.empty() || has_news(std::chrono::milliseconds(0));
}

std::string gone_text(const LibraryProcess::Event &event)
{
    return fmt::format("the library's process ended {}; --log FILE keeps what it says", event.text);
}

int send_and_wait(LibraryProcess &library, const std::string &command)
{
    int vendor = 0;
    library.command(command);
    for (;;) {
        const auto event = library.wait(std::chrono::seconds(1));
        if (event && event->kind == LibraryProcess::Event::Kind::item) {
            vendor = event->value;
        }
        if (event && event->kind == LibraryProcess::Event::Kind::returned) {
            return vendor;
        }
        if (event && event->kind == LibraryProcess::Event::Kind::gone) {
            throw Failure(Cause::device, "{}", gone_text(*event));
        }
    }
}

int ask_vendor(LibraryProcess &library)
{
    // the library prints the selector before it finds that the path leads nowhere
    const int vendor = send_and_wait(library, "XMLNodePath::-/fptest asks for the vendor/-");
    if (!vendor_suffix(vendor)) {
        throw Failure(Cause::device,
                      "the vendor selector is {}, and the library runs nothing then: set "
                      "device/SysParam/Quillmark/vendor to 0, 1 or 2 in "
                      "/etc/vorlane/sysparms/vr_common_cfg.xml",
                      vendor);
    }
    return vendor;
}

} // namespace fptest
