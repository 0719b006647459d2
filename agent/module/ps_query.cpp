// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/ps_query.h"

#include "common/descriptor.h"
#include "module/item_shell.h"
#include "plan/library_rules.h"
#include "util/programs.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <fmt/core.h>
#include <iterator>
#include <poll.h>
#include <spawn.h>
#include <sstream>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

namespace fptest
{
namespace
{

using Moment = std::chrono::steady_clock::time_point;

// A shell under another name, to the kernel as well, which waits for this process's end at
// the latest.
class NamedProcess
{
  public:
    NamedProcess(const std::string &directory, const std::string &name, Moment end)
    {
        std::array<int, 2> input{};
        std::array<int, 2> output{};
        if (pipe2(input.data(), O_CLOEXEC) != 0) {
            return;
        }
        const Descriptor their_input(input[0]);
        our_end_ = Descriptor(input[1]);
        if (pipe2(output.data(), O_CLOEXEC) != 0) {
            return;
        }
        const Descriptor news(output[0]);
        Descriptor their_output(output[1]);
        const std::string path = directory + name;
        const std::string script = fmt::format("echo {} >/proc/$$/comm; echo; read nothing", name);
        const std::array<const char *, 4> words{path.c_str(), "-c", script.c_str(), nullptr};
        posix_spawn_file_actions_t actions{};
        posix_spawn_file_actions_init(&actions);
        posix_spawn_file_actions_adddup2(&actions, their_input.get(), STDIN_FILENO);
        posix_spawn_file_actions_adddup2(&actions, their_output.get(), STDOUT_FILENO);
        posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
        if (posix_spawn(&pid_, "/system/bin/sh", &actions, nullptr,
                        const_cast<char *const *>(words.data()), environ) != 0) {
            pid_ = -1;
        }
        posix_spawn_file_actions_destroy(&actions);
        their_output = Descriptor(-1);
        const auto left =
            std::chrono::ceil<std::chrono::milliseconds>(end - std::chrono::steady_clock::now());
        pollfd waiting{news.get(), POLLIN, 0};
        char line_feed = 0;
        has_name_ = poll(&waiting, 1, std::max(0, static_cast<int>(left.count()))) > 0 &&
                    read(news.get(), &line_feed, 1) == 1;
    }
    ~NamedProcess()
    {
        if (pid_ > 0) {
            kill(pid_, SIGKILL);
            while (waitpid(pid_, nullptr, 0) < 0 && errno == EINTR) {
            }
        }
    }
    NamedProcess(const NamedProcess &) = delete;
    NamedProcess &operator=(const NamedProcess &) = delete;

    // Whether it has started and taken its name.
    bool is_ready() const
    {
        return has_name_;
    }
    pid_t pid() const
    {
        return pid_;
    }

  private:
    pid_t pid_ = -1;
    bool has_name_ = false;
    Descriptor our_end_{-1};
};

std::vector<std::string> lines_of(const std::string &text)
{
    std::istringstream stream(text);
    std::vector<std::string> lines;
    for (std::string line; std::getline(stream, line);) {
        lines.push_back(line);
    }
    return lines;
}

// The library takes the second word of a line for a process id.
bool is_row_of(pid_t process, const std::string &line)
{
    std::istringstream words(line);
    std::string word;
    return words >> word >> word && word == std::to_string(process);
}

bool is_header(const std::string &line)
{
    return line.find("PID") != line.npos;
}

class PsQueries
{
  public:
    PsQueries(pid_t process, Moment end) : process_(process), end_(end)
    {
    }

    void ask_for_path(const std::string &path)
    {
        for (const std::string &line : ask("ps | grep " + path)) {
            (is_row_of(process_, line) ? answers_.finds_path : answers_.finds_query) = true;
        }
    }

    // The library skips one line, and takes the next.
    bool finds(const std::string &name)
    {
        const auto lines = ask("ps " + name);
        for (const std::string &line : lines) {
            if (is_header(line) && answers_.header.empty()) {
                answers_.header = line;
            } else if (answers_.header.empty()) {
                complain(line); // toolbox 7 does so here
            }
        }
        return lines.size() > 1 && is_row_of(process_, lines[1]);
    }

    void ask_for_header()
    {
        const auto lines = ask("ps");
        const auto header = std::ranges::find_if(lines, is_header);
        if (header != lines.end()) {
            answers_.header = *header;
        }
    }

    PsAnswers &answers()
    {
        return answers_;
    }

  private:
    std::vector<std::string> ask(const std::string &command)
    {
        const Said said = ask_program({shell_of_c_library(), "-c", command}, end_);
        if (!said.is_whole) {
            complain("ps has not answered within 2 s");
        } else if (!said.errors.empty()) {
            complain(lines_of(said.errors).front());
        }
        return lines_of(said.output);
    }

    void complain(const std::string &text)
    {
        if (answers_.complaint.empty()) {
            answers_.complaint = text;
        }
    }

    pid_t process_;
    Moment end_;
    PsAnswers answers_;
};

} // namespace

PsAnswers ask_ps()
{
    const Moment end = std::chrono::steady_clock::now() + std::chrono::seconds(2);
    const std::string directory = "/system/bin/";
    // no other process has the first 15 characters of it
    const std::string name = fmt::format("Fptest{}AsksWhatPsSaysOfThisName", getpid());
    const NamedProcess process(directory, name, end);
    PsQueries queries(process.pid(), end);
    PsAnswers &answers = queries.answers();
    if (!process.is_ready()) {
        answers.was_asked = false;
        answers.complaint = "it could not be asked: /system/bin/sh does not run under another name";
        return answers;
    }
    queries.ask_for_path(directory + name);
    answers.finds_name = queries.finds(name.substr(0, kStopLimit));
    answers.finds_short_name = queries.finds(name.substr(0, kKernelLimit));
    if (answers.header.empty()) {
        queries.ask_for_header();
    }
    return answers;
}

std::string dialect_of(const PsAnswers &answers)
{
    if (answers.is_enough()) {
        return "quillmark-ps, or a ps like it,";
    }
    if (answers.header.find("VSIZE") != answers.header.npos && answers.finds_path &&
        !answers.finds_query) {
        return answers.finds_short_name ? "toolbox's ps, of Android up to 5.1,"
                                        : "toolbox's ps, of Android 6 or 7,";
    }
    if (answers.complaint.starts_with("ps: ") && !answers.header.empty()) {
        return "toybox's ps, of Android 8 and later,";
    }
    return "a ps of no known kind";
}

} // namespace fptest
