// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "platform.h"

#include "support/sequences.h"
#include "support/temporary_directory.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <unistd.h>

namespace fs = std::filesystem;

namespace platform
{
namespace
{

constexpr char kPlan[] = "/data/vorlane/src1.xml";

const support::TemporaryDirectory &directory()
{
    static const support::TemporaryDirectory made;
    return made;
}

} // namespace

Answers &state()
{
    static Answers current;
    return current;
}

void host_int(int /*signal*/)
{
}
void host_quit(int /*signal*/)
{
}

std::string redirected(const std::string &path)
{
    return directory().path(fs::path(path).filename());
}

Step pass()
{
    return {};
}

Step gives(long value, int error)
{
    return {Step::Kind::Return, value, error};
}

Step limit(long bytes)
{
    return {Step::Kind::Limit, bytes, 0};
}

void reset()
{
    for (const auto &[descriptor, name] : state().descriptors) {
        if (descriptor < kFirstFake) {
            ::close(descriptor);
        }
    }
    for (const auto &[stream, name] : state().streams) {
        std::fclose(stream);
    }
    for (const auto &entry : fs::directory_iterator(directory().path())) {
        fs::remove_all(entry.path());
    }
    state() = Answers();
    sigemptyset(&state().mask);
    sigaddset(&state().mask, SIGUSR1);
    state().handlers = {{SIGINT, host_int}, {SIGQUIT, host_quit}};
}

void plan_steps(const std::string &function, std::vector<Step> steps)
{
    auto &queue = state().steps[function];
    queue.insert(queue.end(), steps.begin(), steps.end());
}

bool steps_left(const std::string &function)
{
    return !state().steps[function].empty();
}

void plan_output(std::vector<std::string> outputs)
{
    state().outputs.insert(state().outputs.end(), outputs.begin(), outputs.end());
}

void free_descriptor_zero()
{
    state().freed = std::make_unique<support::FreedDescriptor>(STDIN_FILENO);
}

void run_child(const std::function<void()> &body)
{
    if (setjmp(state().child) == 0) {
        body();
    }
}

std::vector<std::string> events()
{
    return std::exchange(state().events, {});
}

std::vector<std::string> log_lines()
{
    auto taken = events();
    std::erase_if(taken, [](const auto &event) { return !sequences::is_log(event); });
    return taken;
}

std::vector<std::string> calls()
{
    auto taken = events();
    std::erase_if(taken, sequences::is_log);
    return taken;
}

std::vector<std::string> left_open()
{
    std::vector<std::string> names;
    for (const auto &[descriptor, name] : state().descriptors) {
        names.push_back(name);
    }
    for (const auto &[stream, name] : state().streams) {
        names.push_back(name);
    }
    std::sort(names.begin(), names.end());
    return names;
}

bool plan_exists()
{
    return fs::exists(redirected(kPlan));
}

std::string plan_text()
{
    EXPECT_TRUE(plan_exists());
    return support::read_file(redirected(kPlan));
}

void write_plan(const std::string &text)
{
    support::write_file(redirected(kPlan), text);
}

} // namespace platform
