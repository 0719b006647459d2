// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "process.h"

#include "wait.h"

#include <gtest/gtest.h>

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <linux/close_range.h>
#include <stdexcept>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

namespace support
{
namespace
{

// All of it can be read while somebody writes, and nobody waits for a reader.
Descriptor make_file(const std::string &text = "")
{
    Descriptor file(memfd_create("test-stream", MFD_CLOEXEC));
    if (!file.is_open() ||
        write(file.get(), text.data(), text.size()) != static_cast<ssize_t>(text.size()) ||
        lseek(file.get(), 0, SEEK_SET) != 0) {
        throw std::runtime_error("no memory for a file");
    }
    return file;
}

std::string text_of(const Descriptor &file)
{
    struct stat status {
    };
    if (fstat(file.get(), &status) != 0) {
        return "";
    }
    std::string text(static_cast<std::size_t>(status.st_size), '\0');
    const ssize_t got = pread(file.get(), text.data(), text.size(), 0);
    text.resize(got < 0 ? 0 : static_cast<std::size_t>(got));
    return text;
}

pid_t make_process()
{
    std::fflush(nullptr); // or both processes would write what is waiting
    const pid_t pid = fork();
    if (pid < 0) {
        throw std::runtime_error("no process to be had");
    }
    return pid;
}

} // namespace

Process::Process(const Start &start)
    : input_(make_file(start.input)), output_(make_file()), errors_(make_file())
{
    pid_ = make_process();
    if (pid_ == 0) {
        become(start);
    }
}

Process::Process(const std::function<void()> &body)
    : input_(-1), output_(-1), errors_(-1), pid_(make_process())
{
    if (pid_ == 0) {
        [&body]() noexcept { body(); }(); // or the child would go on with the tests
        std::fflush(nullptr);
        _exit(::testing::Test::HasFailure() ? EXIT_FAILURE : EXIT_SUCCESS);
    }
}

// Whatever fails here makes the test fail by what the program then does.
void Process::become(const Start &start) const
{
    // as a shell in front starts it, however the tests were started
    for (const int number : {SIGINT, SIGTERM, SIGHUP, SIGQUIT, SIGPIPE}) {
        std::signal(number, SIG_DFL);
    }
    if (start.prepare) {
        start.prepare();
    }
    if (!start.shares_streams) {
        dup2(input_.get(), STDIN_FILENO);
        dup2(output_.get(), STDOUT_FILENO);
        dup2(start.is_one_stream ? output_.get() : errors_.get(), STDERR_FILENO);
    }
    if (!start.output.empty()) {
        // a terminal becomes that of the session only if it can be read
        const int file = open(start.output.c_str(), O_RDWR | O_CREAT | O_TRUNC, 0644);
        dup2(file, STDOUT_FILENO);
        close(file);
    }
    close_range(STDERR_FILENO + 1, ~0U, CLOSE_RANGE_CLOEXEC);
    for (const auto &[name, value] : start.environment) {
        if (value) {
            setenv(name.c_str(), value->c_str(), 1);
        } else {
            unsetenv(name.c_str());
        }
    }
    if (!start.directory.empty() && chdir(start.directory.c_str()) != 0) {
        _exit(126);
    }
    std::vector<char *> argv;
    for (const std::string &argument : start.arguments) {
        argv.push_back(const_cast<char *>(argument.c_str()));
    }
    argv.push_back(nullptr);
    execvp(start.program.empty() ? argv[0] : start.program.c_str(), argv.data());
    _exit(127);
}

Process::~Process()
{
    if (!ended_) {
        kill(pid_, SIGKILL);
        waitpid(pid_, nullptr, 0);
    }
}

void Process::signal(int number) const
{
    if (ended_ || kill(pid_, number) != 0) {
        throw std::runtime_error("the process to be signalled is gone");
    }
}

void Process::signal_group(int number) const
{
    if (ended_ || killpg(pid_, number) != 0) {
        throw std::runtime_error("the process group to be signalled is gone");
    }
}

std::string Process::out() const
{
    return text_of(output_);
}

std::string Process::err() const
{
    return text_of(errors_);
}

bool Process::has_ended()
{
    int status = 0;
    if (!ended_ && waitpid(pid_, &status, WNOHANG) == pid_) {
        using Seconds = std::chrono::duration<double>;
        ended_ = {WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status), out(), err(),
                  Seconds(std::chrono::steady_clock::now() - began_).count()};
    }
    return ended_.has_value();
}

Ended Process::wait(double seconds)
{
    if (!eventually([this] { return has_ended(); }, seconds)) {
        throw std::runtime_error("a process has not ended within " + std::to_string(seconds) +
                                 " s; it has printed\n" + out() + err());
    }
    return *ended_;
}

Ended run(const Start &start)
{
    return Process(start).wait();
}

} // namespace support
