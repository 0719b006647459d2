// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "util/programs.h"

#include "common/descriptor.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <iterator>
#include <poll.h>
#include <spawn.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <thread>

namespace fptest
{
namespace
{

using Moment = std::chrono::steady_clock::time_point;

// Reads both until their other ends are closed. False if that takes longer.
bool read_both(std::array<Descriptor, 2> &from, std::array<std::string *, 2> to, Moment end)
{
    while (from[0].is_open() || from[1].is_open()) {
        const auto left =
            std::chrono::ceil<std::chrono::milliseconds>(end - std::chrono::steady_clock::now());
        if (left.count() <= 0) {
            return false;
        }
        // a negative descriptor is left out
        std::array<pollfd, 2> waiting{{{from[0].get(), POLLIN, 0}, {from[1].get(), POLLIN, 0}}};
        if (poll(waiting.data(), waiting.size(), static_cast<int>(left.count())) <= 0) {
            continue;
        }
        for (std::size_t at = 0; at < from.size(); ++at) {
            std::array<char, 4096> buffer;
            const ssize_t got =
                waiting[at].revents != 0 ? read(from[at].get(), buffer.data(), buffer.size()) : -1;
            if (got == 0) {
                from[at] = Descriptor(-1);
            } else if (got > 0) {
                to[at]->append(buffer.data(), static_cast<std::size_t>(got));
            }
        }
    }
    return true;
}

// -1 if it does not start.
pid_t start(const std::vector<std::string> &words, int output, int errors, char *const *environment)
{
    std::vector<char *> arguments;
    std::ranges::transform(words, std::back_inserter(arguments), [](const std::string &word) {
        return const_cast<char *>(word.c_str());
    });
    arguments.push_back(nullptr);
    posix_spawn_file_actions_t actions{};
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_adddup2(&actions, output, STDOUT_FILENO);
    posix_spawn_file_actions_adddup2(&actions, errors, STDERR_FILENO);
    posix_spawnattr_t attributes{};
    posix_spawnattr_init(&attributes);
    posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETPGROUP);
    pid_t process = -1;
    const int error = posix_spawn(&process, words.front().c_str(), &actions, &attributes,
                                  arguments.data(), environment);
    posix_spawnattr_destroy(&attributes);
    posix_spawn_file_actions_destroy(&actions);
    return error == 0 ? process : -1;
}

// What the program has started becomes a child of this process, to be waited for: not for
// long, as one in the kernel's hands does not end.
void kill_group(pid_t group)
{
    int adopts = 0;
    prctl(PR_GET_CHILD_SUBREAPER, &adopts);
    prctl(PR_SET_CHILD_SUBREAPER, 1);
    kill(-group, SIGKILL);
    const Moment end = std::chrono::steady_clock::now() + std::chrono::milliseconds(500);
    for (pid_t ended = 0; ended >= 0 && std::chrono::steady_clock::now() < end;) {
        ended = waitpid(-group, nullptr, WNOHANG);
        if (ended == 0) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
    }
    prctl(PR_SET_CHILD_SUBREAPER, adopts);
}

} // namespace

Said ask_program(const std::vector<std::string> &words, Moment end, char *const *environment)
{
    Said said;
    std::array<int, 2> output{};
    std::array<int, 2> errors{};
    if (end <= std::chrono::steady_clock::now() || pipe2(output.data(), O_CLOEXEC) != 0) {
        return said;
    }
    std::array<Descriptor, 2> ours{Descriptor(output[0]), Descriptor(-1)};
    Descriptor their_output(output[1]);
    if (pipe2(errors.data(), O_CLOEXEC) != 0) {
        return said;
    }
    ours[1] = Descriptor(errors[0]);
    Descriptor their_errors(errors[1]);
    const pid_t process = start(words, their_output.get(), their_errors.get(), environment);
    if (process < 0) {
        return said;
    }
    their_output = Descriptor(-1);
    their_errors = Descriptor(-1);
    said.is_whole = read_both(ours, {&said.output, &said.errors}, end);
    // it may have closed its outputs and go on
    while (said.is_whole && waitpid(process, &said.status, WNOHANG) == 0) {
        said.is_whole = std::chrono::steady_clock::now() < end;
        std::this_thread::sleep_for(std::chrono::microseconds(100));
    }
    if (!said.is_whole) {
        kill_group(process);
    }
    return said;
}

} // namespace fptest
