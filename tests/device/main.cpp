// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// These tests run on the virtual device. Started anywhere else, the program
// starts itself again there, so that it never touches the machine it is on.
#include "support/process.h"

#include <gtest/gtest.h>

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <string_view>
#include <sys/prctl.h>
#include <vector>

namespace
{

constexpr int kDeviceFailed = 125; // device/run's own failure
constexpr int kSkipped = 77;       // known to CTest
constexpr double kPatience = 24 * 60 * 60;

int run_on_device(const std::vector<std::string> &arguments)
{
    support::Start start{.arguments = arguments, .shares_streams = true};
    // nobody is to wait for what a time limit has ended
    start.prepare = [] { prctl(PR_SET_PDEATHSIG, SIGTERM); };
    const int status = support::Process(start).wait(kPatience).status;
    if (status < 0) {
        std::fprintf(stderr, "the tests were ended by signal %d\n", -status);
        return EXIT_FAILURE;
    }
    if (status != kDeviceFailed) {
        return status;
    }
    const char *ci = std::getenv("CI");
    const bool must_run = ci != nullptr && std::string_view(ci) == "true";
    std::fprintf(stderr, "the virtual device did not start: %s\n", must_run ? "failed" : "not run");
    return must_run ? EXIT_FAILURE : kSkipped;
}

} // namespace

int main(int argc, char **argv)
{
    std::vector<std::string> arguments = {QUILLMARK_SOURCE_DIR "/device/run",
                                          "--build",
                                          QUILLMARK_BINARY_DIR,
                                          "--bin",
                                          QUILLMARK_TEST_ITEMS,
                                          "--",
                                          std::filesystem::read_symlink("/proc/self/exe")};
    arguments.insert(arguments.end(), argv + 1, argv + argc);
    testing::InitGoogleTest(&argc, argv);
    if (GTEST_FLAG_GET(list_tests) || std::getenv("QUILLMARK_DEVICE") != nullptr) {
        return RUN_ALL_TESTS();
    }
    return run_on_device(arguments);
}
