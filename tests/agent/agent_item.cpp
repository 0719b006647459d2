// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A test item that does what its arguments say, one after another:
//   report GROUP PROGRESS RESULT DESCRIPTION   through the library
//   report-file GROUP PROGRESS RESULT FILE     the description is that file
//   report-null GROUP PROGRESS RESULT          without a description, by no text at all
//   report-here GROUP ITEM PROGRESS RESULT DESCRIPTION  by this process, which
//                   keeps its copy of the plan
//   say TEXT        on standard output
//   complain TEXT   on standard error
//   complain-file FILE  the text of that file
//   sleep SECONDS
//   sleep-on SECONDS  in another thread, while the first one ends
//   ignore-stop     from here on SIGTERM does nothing
//   tell-signal FILE  from here on SIGTERM and SIGINT write their name there and
//                   end the program
//   await FILE      until that file is there
//   note FILE       appends the program's name to that file
//   once FILE       ends here if that file is there, and makes it otherwise
//   flood BYTES     on standard output, in numbered lines
//   count-input     says how many bytes it gets on standard input
//   crash           by a signal
//   gather          waits for the library's word, as the gatherer does
#include "quillmark.h"
#include "support/files.h"

#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <netinet/in.h>
#include <pthread.h>
#include <string>
#include <string_view>
#include <sys/socket.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace
{

std::string own_name(const char *path)
{
    std::string name = std::filesystem::path(path).filename();
    for (const std::string_view suffix : {"_ca_qsee", "_ca"}) {
        if (name.ends_with(suffix)) {
            name.resize(name.size() - suffix.size());
            break;
        }
    }
    return name;
}

const char *signal_file = nullptr;

void tell_signal(int signal)
{
    const int fd = open(signal_file, O_WRONLY | O_CREAT | O_APPEND, 0644);
    const std::string_view name = signal == SIGTERM ? "SIGTERM\n" : "SIGINT\n";
    _exit(write(fd, name.data(), name.size()) > 0 ? 0 : 1);
}

// In a process of its own: one that has reported keeps its copy of the plan.
void report(const std::string &group, const std::string &item, const std::string &progress,
            const std::string &result, const char *description)
{
    const pid_t reporter = fork();
    if (reporter == 0) {
        FPTEST_SetTransation(group.c_str(), item.c_str(), std::atoi(progress.c_str()),
                             std::atoi(result.c_str()), description);
        _exit(0);
    }
    waitpid(reporter, nullptr, 0);
}

void flood(std::size_t bytes)
{
    std::size_t line = 0;
    for (std::size_t printed = 0; printed < bytes;) {
        printed += static_cast<std::size_t>(std::printf("line %zu\n", ++line));
    }
    std::fflush(stdout);
}

std::size_t count_input()
{
    std::size_t count = 0;
    while (std::getchar() != EOF) {
        ++count;
    }
    return count;
}

void wait_for_word_to_gather()
{
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(34952);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    for (std::size_t got = 0; got == 0;) {
        const int connection = socket(AF_INET, SOCK_STREAM, 0);
        char byte = 0;
        sockaddr_in own{};
        socklen_t size = sizeof own;
        if (connect(connection, reinterpret_cast<sockaddr *>(&address), sizeof address) == 0 &&
            getsockname(connection, reinterpret_cast<sockaddr *>(&own), &size) == 0) {
            if (own.sin_port != address.sin_port) {
                got = read(connection, &byte, 1) == 1 ? 1 : 0;
            } else { // it got that port as nobody listens, met itself, and would hold the port
                const linger reset{1, 0};
                setsockopt(connection, SOL_SOCKET, SO_LINGER, &reset, sizeof reset);
            }
        }
        close(connection);
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
}

} // namespace

int main(int argc, char **argv)
{
    using Seconds = std::chrono::duration<double>;
    const std::string name = own_name(argv[0]);
    const std::vector<std::string> words(argv + 1, argv + argc);

    for (std::size_t at = 0; at < words.size();) {
        const std::string &word = words[at];
        const auto next = [&](std::size_t by) { return words.at(at + by); };
        if (word == "report") {
            report(next(1), name, next(2), next(3), next(4).c_str());
            at += 5;
        } else if (word == "report-file") {
            report(next(1), name, next(2), next(3), support::read_file(next(4)).c_str());
            at += 5;
        } else if (word == "report-null") {
            report(next(1), name, next(2), next(3), nullptr);
            at += 4;
        } else if (word == "report-here") {
            FPTEST_SetTransation(next(1).c_str(), next(2).c_str(), std::atoi(next(3).c_str()),
                                 std::atoi(next(4).c_str()), next(5).c_str());
            at += 6;
        } else if (word == "say" || word == "complain") {
            std::fprintf(word == "say" ? stdout : stderr, "%s\n", next(1).c_str());
            std::fflush(nullptr);
            at += 2;
        } else if (word == "complain-file") {
            std::fprintf(stderr, "%s\n", support::read_file(next(1)).c_str());
            at += 2;
        } else if (word == "sleep") {
            std::this_thread::sleep_for(Seconds(std::stod(next(1))));
            at += 2;
        } else if (word == "sleep-on") {
            const Seconds time(std::stod(next(1)));
            std::thread([time] { std::this_thread::sleep_for(time); }).detach();
            pthread_exit(nullptr);
        } else if (word == "ignore-stop") {
            std::signal(SIGTERM, SIG_IGN);
            at += 1;
        } else if (word == "tell-signal") {
            signal_file = argv[at + 2];
            std::signal(SIGTERM, tell_signal);
            std::signal(SIGINT, tell_signal);
            at += 2;
        } else if (word == "await") {
            while (!std::filesystem::exists(next(1))) {
                std::this_thread::sleep_for(Seconds(0.01));
            }
            at += 2;
        } else if (word == "note") {
            std::ofstream(next(1), std::ios::app) << name << std::endl;
            at += 2;
        } else if (word == "once") {
            if (std::filesystem::exists(next(1))) {
                return EXIT_SUCCESS;
            }
            std::ofstream file(next(1));
            at += 2;
        } else if (word == "flood") {
            flood(std::stoul(next(1)));
            at += 2;
        } else if (word == "count-input") {
            std::printf("%zu bytes of input\n", count_input());
            at += 1;
        } else if (word == "gather") {
            wait_for_word_to_gather();
            at += 1;
        } else if (word == "crash") {
            std::abort();
        } else {
            std::fprintf(stderr, "%s: what is '%s'?\n", name.c_str(), word.c_str());
            return EXIT_FAILURE;
        }
    }
}
