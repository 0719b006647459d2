// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "launcher_runner.h"

#include <cstdlib>
#include <iterator>
#include <optional>
#include <sstream>

namespace launcher
{

// ---- processes --------------------------------------------------------------

support::Start start_of(const Words &words, const Surroundings &surroundings)
{
    support::Start start{.arguments = words, .input = surroundings.input};
    start.directory = surroundings.directory;
    start.environment = surroundings.variables;
    start.environment.insert(
        {{"container", std::nullopt}, {"LC_ALL", "C"}, {"QUILLMARK_BUILD", build}});
    return start;
}

Outcome outcome_of(support::Process &process)
{
    const support::Ended ended = process.wait();
    return {ended.status < 0 ? 128 - ended.status : ended.status, ended.out, ended.err};
}

Outcome run(const Words &words, const Surroundings &surroundings)
{
    support::Process process(start_of(words, surroundings));
    return outcome_of(process);
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

std::string last_line(const std::string &text)
{
    const Words all = lines_of(text);
    return all.empty() ? "" : all.back();
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

int main(int argc, char **argv)
{
    if (argc > 1 && std::string(argv[1]) == launcher::say_signals_option) {
        return launcher::say_signals();
    }
    testing::InitGoogleTest(&argc, argv);
    return RUN_ALL_TESTS();
}
