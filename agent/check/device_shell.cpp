// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/device_shell.h"
#include "common/descriptor.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <optional>
#include <poll.h>
#include <spawn.h>
#include <string_view>
#include <sys/wait.h>
#include <unistd.h>

namespace fptest
{
namespace
{

using Clock = std::chrono::steady_clock;

// What a process writes until it closes its end; nullopt if that takes longer.
std::optional<std::string> read_all(int descriptor, double seconds)
{
    const auto end = Clock::now() + std::chrono::duration<double>(seconds);
    std::string text;
    for (;;) {
        seconds = std::chrono::duration<double>(end - Clock::now()).count();
        if (seconds <= 0) {
            return std::nullopt;
        }
        pollfd waiting{descriptor, POLLIN, 0};
        if (poll(&waiting, 1, static_cast<int>(seconds * 1000) + 1) <= 0) {
            continue;
        }
        std::array<char, 4096> buffer;
        const ssize_t got = read(descriptor, buffer.data(), buffer.size());
        if (got == 0) {
            return text;
        }
        if (got > 0) {
            text.append(buffer.data(), static_cast<std::size_t>(got));
        }
    }
}

bool may_be_in_a_name(unsigned char byte)
{
    return std::isalpha(byte) != 0 || byte == '_' || byte >= 0x80;
}

// Whether it stays a mere expansion between double quotes, and runs nothing. No end, quote
// or expansion inside it is allowed, because the shell expands a subscript in arithmetic
// twice. Nor may arithmetic depend on a variable, which may be set on the device.
bool is_safe_to_expand(std::string_view expansion)
{
    const bool is_arithmetic = expansion.starts_with("$((");
    const std::size_t mark = is_arithmetic ? 3 : 2;
    const std::string_view inside = expansion.substr(mark, expansion.size() - 2 * mark + 1);
    const std::string_view marks =
        is_arithmetic ? " =!<>+-*/%^~&|,:?.[]()" : " =!+-*/%^~,:@#.;[]&|<>()";
    const auto is_taken = [&](char byte) {
        const auto character = static_cast<unsigned char>(byte);
        return may_be_in_a_name(character) || std::isdigit(character) != 0 ||
               marks.find(byte) != marks.npos;
    };
    return std::ranges::all_of(inside, is_taken) &&
           (is_arithmetic || inside.find_first_of(" |<&(") != 0) &&
           !(std::ranges::any_of(inside, may_be_in_a_name) &&
             inside.find_first_of("/%?") != inside.npos);
}

} // namespace

DeviceShell::Answer DeviceShell::ask(const std::string &line, std::string &why)
{
    return ask_timed("-n", line, why);
}

DeviceShell::Answer DeviceShell::ask_to_expand(const std::string &expansion, std::string &why)
{
    return is_safe_to_expand(expansion) ? ask_timed("-f", ": \"" + expansion + "\"", why)
                                        : Answer::unknown;
}

DeviceShell::Answer DeviceShell::ask_timed(const std::string &option, const std::string &line,
                                           std::string &why)
{
    const auto begin = Clock::now();
    const Answer answer = ask_once(option, line, why);
    left_ -= std::chrono::duration<double>(Clock::now() - begin).count();
    return answer;
}

DeviceShell::Answer DeviceShell::ask_once(const std::string &option, const std::string &line,
                                          std::string &why) const
{
    std::array<int, 2> ends{};
    if (left_ <= 0 || access("/system/bin/sh", X_OK) != 0 || pipe2(ends.data(), O_CLOEXEC) != 0) {
        return Answer::unknown;
    }
    const Descriptor output(ends[0]);
    Descriptor errors(ends[1]);
    posix_spawn_file_actions_t actions{};
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
    posix_spawn_file_actions_adddup2(&actions, errors.get(), STDERR_FILENO);
    std::string name = "sh";
    std::string how = option;
    std::string takes_text = "-c";
    std::string no_more_options = "--"; // the text may begin with a '-'
    std::string text = line;
    const std::array<char *, 6> arguments = {
        name.data(), how.data(), takes_text.data(), no_more_options.data(), text.data(), nullptr};
    const std::array<char *, 1> environment = {nullptr};
    pid_t process = -1;
    const int error = posix_spawn(&process, "/system/bin/sh", &actions, nullptr, arguments.data(),
                                  environment.data());
    posix_spawn_file_actions_destroy(&actions);
    if (error != 0) {
        return Answer::unknown;
    }
    errors = Descriptor(-1);
    const auto said = read_all(output.get(), left_);
    if (!said) {
        kill(process, SIGKILL);
    }
    int status = 0;
    while (waitpid(process, &status, 0) < 0 && errno == EINTR) {
    }
    if (!said || !WIFEXITED(status)) {
        return Answer::unknown;
    }
    if (WEXITSTATUS(status) == 0) {
        return Answer::accepted;
    }
    // "E: sh: syntax error: ...", "sh: ..."
    why = said->substr(0, said->find('\n'));
    if (const std::size_t begin = why.find("sh: "); begin != why.npos) {
        why.erase(0, begin + 4);
    }
    return Answer::refused;
}

} // namespace fptest
