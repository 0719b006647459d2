// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "launcher_runner.h"

#include <array>
#include <chrono>
#include <cstdlib>
#include <fcntl.h>
#include <fstream>
#include <iterator>
#include <poll.h>
#include <sstream>
#include <stdexcept>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

using namespace std::chrono_literals;

namespace launcher
{

// ---- processes --------------------------------------------------------------

int shell_status(int wait_status)
{
    return WIFEXITED(wait_status) ? WEXITSTATUS(wait_status) : 128 + WTERMSIG(wait_status);
}

void become(const Words &words, const Surroundings &surroundings)
{
    std::vector<char *> arguments;
    for (const std::string &word : words) {
        arguments.push_back(const_cast<char *>(word.c_str()));
    }
    arguments.push_back(nullptr);
    unsetenv("container");
    setenv("LC_ALL", "C", 1);
    setenv("QUILLMARK_BUILD", build.c_str(), 1);
    for (const auto &[name, value] : surroundings.variables) {
        setenv(name.c_str(), value.c_str(), 1);
    }
    fs::current_path(surroundings.directory);
    execvp(arguments[0], arguments.data());
    _exit(126);
}

namespace
{

class Pipe
{
  public:
    Pipe()
    {
        if (pipe2(ends_.data(), O_CLOEXEC) != 0) {
            throw std::runtime_error("pipe2");
        }
    }
    Pipe(const Pipe &) = delete;
    Pipe &operator=(const Pipe &) = delete;
    ~Pipe()
    {
        close_end(0);
        close_end(1);
    }
    int reading() const
    {
        return ends_[0];
    }
    int writing() const
    {
        return ends_[1];
    }
    void close_end(std::size_t end)
    {
        if (ends_[end] >= 0) {
            close(ends_[end]);
            ends_[end] = -1;
        }
    }

  private:
    std::array<int, 2> ends_{-1, -1};
};

void read_both(const Pipe &out, const Pipe &err, Outcome &outcome)
{
    std::array<pollfd, 2> ends{{{out.reading(), POLLIN, 0}, {err.reading(), POLLIN, 0}}};
    std::array<std::string *, 2> texts{&outcome.out, &outcome.err};

    while (ends[0].fd >= 0 || ends[1].fd >= 0) {
        poll(ends.data(), ends.size(), -1);
        for (std::size_t i = 0; i < ends.size(); ++i) {
            std::array<char, 4096> buffer{};
            if (ends[i].fd < 0 || ends[i].revents == 0) {
                continue;
            }
            const ssize_t got = read(ends[i].fd, buffer.data(), buffer.size());
            if (got <= 0) {
                ends[i].fd = -1;
            } else {
                texts[i]->append(buffer.data(), static_cast<std::size_t>(got));
            }
        }
    }
}

} // namespace

Outcome run(const Words &words, const Surroundings &surroundings)
{
    Pipe in;
    Pipe out;
    Pipe err;
    Outcome outcome;

    const pid_t child = fork();
    if (child == 0) {
        dup2(in.reading(), 0);
        dup2(out.writing(), 1);
        dup2(err.writing(), 2);
        become(words, surroundings);
    }
    in.close_end(0);
    out.close_end(1);
    err.close_end(1);
    const std::string &input = surroundings.input; // less than a pipe holds
    if (!input.empty()) {
        EXPECT_EQ(write(in.writing(), input.data(), input.size()),
                  static_cast<ssize_t>(input.size()));
    }
    in.close_end(1);
    read_both(out, err, outcome);
    int status = 0;
    waitpid(child, &status, 0);
    outcome.status = shell_status(status);
    return outcome;
}

Outcome on_device(const Words &command, const Words &options, const Surroundings &surroundings)
{
    return run(Words{device_run} + options + Words{"--"} + command, surroundings);
}

Outcome shell(const std::string &script, const Words &options, const Surroundings &surroundings)
{
    return on_device({"sh", "-c", script}, options, surroundings);
}

Outcome refused(const Words &arguments, const Surroundings &surroundings)
{
    return run(Words{device_run} + arguments, surroundings);
}

bool eventually(const std::function<bool()> &condition)
{
    for (const auto end = std::chrono::steady_clock::now() + 10s;
         std::chrono::steady_clock::now() < end; std::this_thread::sleep_for(5ms)) {
        if (condition()) {
            return true;
        }
    }
    return false;
}

// ---- texts ------------------------------------------------------------------

Words operator+(Words left, const Words &right)
{
    left.insert(left.end(), right.begin(), right.end());
    return left;
}

Words split(const std::string &text)
{
    std::istringstream stream(text);
    return {std::istream_iterator<std::string>(stream), {}};
}

Words lines(const std::string &text)
{
    Words result;
    std::istringstream stream(text);
    for (std::string line; std::getline(stream, line);) {
        result.push_back(line);
    }
    return result;
}

std::string last_line(const std::string &text)
{
    const Words all = lines(text);
    return all.empty() ? "" : all.back();
}

// ---- files ------------------------------------------------------------------

TemporaryDirectory::TemporaryDirectory(const fs::path &parent)
{
    std::string name = parent / "quillmark-launcher-XXXXXX";
    if (mkdtemp(name.data()) == nullptr) {
        throw std::runtime_error(name);
    }
    path_ = name;
}

TemporaryDirectory::~TemporaryDirectory()
{
    std::error_code ignored;
    fs::remove_all(path_, ignored);
}

fs::path TemporaryDirectory::program(const std::string &name, const std::string &script) const
{
    std::ofstream(path_ / name) << script;
    fs::permissions(path_ / name, fs::perms::owner_all);
    return path_ / name;
}

std::string content(const fs::path &path)
{
    std::ostringstream text;
    text << std::ifstream(path, std::ios::binary).rdbuf(); // a failing read ends it quietly
    return text.str();
}

// ---- what the machine allows ------------------------------------------------

Way way()
{
    static const std::string asked = [] {
        const char *known = std::getenv("QUILLMARK_TEST_WAY");
        return known != nullptr ? known + std::string("\n")
                                : on_device({"printenv", "QUILLMARK_DEVICE"}).out;
    }();
    return asked == "namespace\n"  ? Way::namespaces
           : asked == "in-place\n" ? Way::in_place
                                   : Way::none;
}

namespace
{

bool is_ci()
{
    const char *ci = std::getenv("CI");
    return ci != nullptr && std::string(ci) == "true";
}

} // namespace

void Device::SetUp()
{
    if (way() == Way::none) {
        const std::string why = on_device({"true"}).err;
        if (is_ci()) {
            FAIL() << "the device does not start: " << why;
        }
        GTEST_SKIP() << "the device does not start: " << why;
    }
}

void NamespaceDevice::SetUp()
{
    Device::SetUp();
    if (way() == Way::in_place) {
        GTEST_SKIP() << "namespaces are refused here, and the device is in place";
    }
}

} // namespace launcher
