// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/server.h"

#include "common/descriptor.h"
#include "module/item_shell.h"
#include "module/processes.h"
#include "module/protocol.h"
#include "module/stored_plan.h"
#include "quillmark.h"

#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <condition_variable>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <deque>
#include <dlfcn.h>
#include <fcntl.h>
#include <fmt/core.h>
#include <functional>
#include <mutex>
#include <sstream>
#include <string>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace fptest
{
namespace
{

constexpr std::size_t kReplyRoom = 1025;
constexpr char kItemDirectory[] = "FPTEST_ITEM_DIR";
constexpr std::chrono::seconds kGrace{2}; // for items to end when the agent has gone

std::function<void()> on_connection;

class Server
{
  public:
    explicit Server(int socket) : socket_(socket)
    {
        intercept_library_output(*this);
        set_status_handler([this](int status) { send_ended(status); });
        on_connection = [this] { send_connected(); };
    }

    // Ends when the agent is gone, for whatever reason, and stops its item, so that nothing
    // runs on unattended.
    [[noreturn]] void serve()
    {
        Message message;
        while (receive_message(socket_, message)) {
            switch (message.kind) {
            case MessageKind::command:
                start(message.text);
                break;
            case MessageKind::directories:
                take_directories(message.text);
                break;
            case MessageKind::stop:
                answer_stop(message.text);
                break;
            case MessageKind::hold:
                hold_requested_ = true;
                break;
            case MessageKind::go_on:
                release();
                break;
            case MessageKind::read_back:
                answer({MessageKind::plan, read_back()});
                break;
            default:
                break; // the agent sends none of them
            }
        }
        // never released, so that the command reaches no further item
        start_no_more_items();
        const std::lock_guard lock(mutex_);
        if (busy_) {
            stop(items_);
        }
        if (busy_ || hold_requested_) {
            end_items();
        }
        _exit(EXIT_SUCCESS);
    }

  private:
    void answer(const Message &message)
    {
        const std::lock_guard lock(mutex_);
        send_message(socket_, message);
    }

    // A stopped item ends at once, but its end must be sent after this answer.
    void answer_stop(const std::string &item)
    {
        const std::lock_guard lock(mutex_);
        send_message(socket_, {MessageKind::stopped, std::to_string(stop({item}))});
    }

    // The library's own stdout, "vendor = N" for each item that it reaches, goes to the
    // agent as a message: that is when the item begins. Items print to descriptor 1, which
    // stays.
    static void intercept_library_output(Server &server)
    {
        std::fflush(stdout);
#ifdef __BIONIC__
        std::FILE *own = funopen(
            &server, nullptr,
            [](void *user, const char *text, int size) {
                static_cast<Server *>(user)->send_item(
                    std::string(text, static_cast<size_t>(size)));
                return size;
            },
            nullptr, nullptr);
#else
        cookie_io_functions_t functions{};
        functions.write = [](void *user, const char *text, std::size_t size) {
            static_cast<Server *>(user)->send_item(std::string(text, size));
            return static_cast<ssize_t>(size);
        };
        std::FILE *own = fopencookie(&server, "w", functions);
#endif
        if (own == nullptr) {
            _exit(EXIT_FAILURE);
        }
        std::setvbuf(own, nullptr, _IOLBF, 256);
        stdout = own;
    }

    void send_item(const std::string &line)
    {
        const auto number = line.find_first_of("-0123456789");
        const std::string vendor = number == std::string::npos ? "0" : line.substr(number);
        vendor_ = std::atoi(vendor.c_str());
        const std::lock_guard lock(mutex_); // a stop starts programs as well
        if (!directories_.empty()) {
            const std::string &directory = directories_.front();
            directory.empty() ? unsetenv(kItemDirectory)
                              : setenv(kItemDirectory, directory.c_str(), 1);
            directories_.pop_front();
        }
        send_message(socket_, {MessageKind::item, moment() + vendor});
    }

    void send_ended(int status)
    {
        hold_after({MessageKind::ended,
                    moment() + std::to_string(status) + (reap_children() ? " 1" : " 0")});
    }

    void send_connected()
    {
        if (hold_requested_) {
            hold_after({MessageKind::connected, moment()});
        }
    }

    void hold_after(const Message &message)
    {
        std::unique_lock lock(mutex_);
        is_held_ = hold_requested_;
        send_message(socket_, message);
        released_.wait(lock, [this] { return !is_held_; });
    }

    void release()
    {
        const std::lock_guard lock(mutex_);
        is_held_ = false;
        released_.notify_all();
    }

    // What items and stops leave behind becomes a child of this process. True if any of it
    // still runs.
    static bool reap_children()
    {
        pid_t child = 0;
        do {
            child = waitpid(-1, nullptr, WNOHANG);
        } while (child > 0);
        return child == 0;
    }

    // "NANOSECONDS OUTPUT": the time, and how much was printed so far.
    static std::string moment()
    {
        using namespace std::chrono;
        struct stat output {
        };
        fstat(STDOUT_FILENO, &output); // a stop redirects standard error
        const auto now = steady_clock::now().time_since_epoch();
        return fmt::format("{} {} ", duration_cast<nanoseconds>(now).count(), output.st_size);
    }

    // The stop's shell complains that there is no process 9: not into the item's output.
    static int stop(const std::vector<std::string> &items)
    {
        if (!runs_below(getpid(), items)) {
            return kNothingToStop;
        }
        const Descriptor output(fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 0));
        const Descriptor null(open("/dev/null", O_WRONLY | O_CLOEXEC));
        if (!output.is_open() || !null.is_open()) {
            return FPTEST_SuspendItemExecute();
        }
        dup2(null.get(), STDERR_FILENO);
        const int stopped = FPTEST_SuspendItemExecute();
        dup2(output.get(), STDERR_FILENO);
        return stopped;
    }

    // Again and again, because a script may be just starting another program.
    void end_items() const
    {
        using namespace std::chrono_literals;
        const ChildProcesses processes(getpid(), getpid(), vendor_);
        const auto limit = std::chrono::steady_clock::now() + kGrace;
        processes.signal_all(SIGCONT); // the run may have been suspended
        while (signal_each(processes.of_items(),
                           std::chrono::steady_clock::now() < limit ? SIGTERM : SIGKILL)) {
            if (std::chrono::steady_clock::now() > limit + kGrace) {
                return; // not even that helps
            }
            std::this_thread::sleep_for(10ms);
        }
    }

    void take_directories(const std::string &message)
    {
        std::istringstream fields(message);
        directories_.clear();
        for (std::string directory; std::getline(fields, directory, '\0');) {
            directories_.push_back(directory);
        }
    }

    void start(const std::string &message)
    {
        std::istringstream fields(message);
        std::string command;
        std::getline(fields, command, '\0');
        items_.clear();
        for (std::string item; std::getline(fields, item, '\0');) {
            items_.push_back(item);
        }
        if (command_.joinable()) {
            command_.join();
        }
        // a zombie with an item's name would be taken for the item
        static_cast<void>(reap_children());
        busy_ = true;
        command_ = std::thread([this, command] { run(command); });
    }

    void run(const std::string &command)
    {
        std::array<char, kReplyRoom> reply{};
        FPTEST_RunTestCmd(command.c_str(), reply.data(), static_cast<int>(reply.size()));
        busy_ = false;
        answer({MessageKind::returned, moment() + reply.data()});
    }

    static std::string read_back()
    {
        const auto status = stored_plan_status();
        if (!status) {
            return {}; // the library would try to read it for ever
        }
        std::string text(static_cast<std::size_t>(status->st_size), '\0');
        FPTEST_ExtractResultMsg(text.data(), static_cast<int>(text.size()));
        return text;
    }

    int socket_;
    std::mutex mutex_;
    std::condition_variable released_;
    bool is_held_ = false;
    std::atomic<bool> hold_requested_ = false;
    std::thread command_;
    std::vector<std::string> items_;
    std::deque<std::string> directories_; // of items that the command has not reached
    std::atomic<bool> busy_ = false;
    std::atomic<int> vendor_ = 0; // of the library's last item
};

void move_descriptor(int from, int to)
{
    if (from != to) {
        dup2(from, to);
    } else {
        fcntl(from, F_SETFD, 0);
    }
}

// Items inherit the signals, and expect them as in a new program.
void reset_signals()
{
    for (const int signal : {SIGINT, SIGQUIT, SIGTERM, SIGHUP, SIGTSTP, SIGWINCH}) {
        std::signal(signal, SIG_IGN); // drops a pending one, which was meant for the agent
        std::signal(signal, SIG_DFL);
    }
    // not ignored, because items would inherit that; the first three come here too if
    // somebody signals all processes of the run, and stopping its item is the agent's
    for (const int signal : {SIGINT, SIGTERM, SIGHUP, SIGPIPE, SIGXFSZ}) {
        std::signal(signal, [](int) {});
    }
    sigset_t none;
    sigemptyset(&none);
    sigprocmask(SIG_SETMASK, &none, nullptr);
}

// The library leaks descriptors with each trigger and each stop.
void raise_descriptor_limit()
{
    rlimit limit{};
    if (getrlimit(RLIMIT_NOFILE, &limit) == 0) {
        limit.rlim_cur = limit.rlim_max;
        setrlimit(RLIMIT_NOFILE, &limit);
    }
}

} // namespace

void serve_library(int socket, int output)
{
    setsid(); // first, while the terminal's signals are still blocked
    reset_signals();
    raise_descriptor_limit();
    prctl(PR_SET_CHILD_SUBREAPER, 1); // what an item leaves running stays below this process
    // a suspended agent suspends this process, and if it is killed then cannot resume it
    prctl(PR_SET_PDEATHSIG, SIGCONT);
    const int null = open("/dev/null", O_RDONLY | O_CLOEXEC);
    move_descriptor(null, STDIN_FILENO);
    move_descriptor(output, STDERR_FILENO);
    move_descriptor(STDERR_FILENO, STDOUT_FILENO);
    Server(socket).serve();
}

} // namespace fptest

// The linker finds this before the platform's: it is the only sign that the gatherer is about
// to be triggered.
extern "C" int Accept(int descriptor, struct sockaddr *address, socklen_t *length)
{
    static const auto platforms = reinterpret_cast<decltype(&Accept)>(dlsym(RTLD_NEXT, "Accept"));
    const int connection = platforms(descriptor, address, length);
    const int error = errno;
    if (connection >= 0 && fptest::on_connection) {
        fptest::on_connection();
    }
    errno = error;
    return connection;
}
