// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "item.h"

#include "common/descriptor.h"
#include "quillmark.h"

#include <CLI/CLI.hpp>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <string_view>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <thread>

namespace
{

constexpr const char *plan_path = "/data/vorlane/src1.xml";

std::string last_part(std::string_view path)
{
    return std::string(path.substr(path.rfind('/') + 1));
}

// The name that the test plan has for a program.
std::string without_vendor_suffix(std::string_view program)
{
    for (const std::string_view suffix : {"_ca_qsee", "_ca"}) {
        if (program.ends_with(suffix)) {
            program.remove_suffix(suffix.size());
            break;
        }
    }
    return std::string(program);
}

std::string one_line(const CLI::App *app, const CLI::Error &error)
{
    return app->get_name() + ": " + error.what() + "; see " + app->get_name() + " --help\n";
}

// The library does not coordinate those that write the plan. The samples do, by a
// lock on the file. Without a plan there is nothing to lock, and the report fails.
Descriptor lock_plan()
{
    for (;;) {
        Descriptor plan(open(plan_path, O_RDONLY | O_CLOEXEC));
        while (plan.is_open() && flock(plan.get(), LOCK_EX) != 0 && errno == EINTR) {
        }
        struct stat locked {
        };
        struct stat stored {
        };
        // fptest may have put another file in its place meanwhile
        if (!plan.is_open() || fstat(plan.get(), &locked) != 0 || stat(plan_path, &stored) != 0 ||
            locked.st_ino == stored.st_ino) {
            return plan;
        }
    }
}

} // namespace

Item::Item(int argc, char **argv, const std::string &purpose, Seconds default_length)
    : program_(last_part(argv[0])), name_(without_vendor_suffix(program_)), length_(default_length)
{
    // the log may be going to someone who has left
    std::signal(SIGPIPE, SIG_IGN);

    double seconds = default_length.count();
    CLI::App app(purpose, program_);
    app.failure_message(one_line);
    app.add_option("--group", group_, "the item's group in the test plan")->required();
    app.add_option("--item", name_, "the item's name in the test plan")->capture_default_str();
    app.add_option("--seconds", seconds, "how long it takes in total")->capture_default_str();
    try {
        app.parse(argc, argv);
        if (!(seconds >= 0 && seconds <= 86400)) {
            throw CLI::ValidationError("--seconds", "wants a number from 0 to 86400");
        }
    } catch (const CLI::ParseError &error) {
        std::exit(app.exit(error) == 0 ? 0 : 1);
    }
    length_ = Seconds(seconds);
}

void Item::report(int progress, Result result, const std::string &description) const
{
    const Descriptor lock = lock_plan();

    // The library loads the plan once in a process and from then on saves that
    // copy whole: a second report would undo what other items have reported
    // since. And a stop in the middle of saving would leave half a plan. So each
    // report is made by a process of its own, which nobody stops.
    const pid_t reporter = fork();
    if (reporter == 0) {
        FPTEST_SetTransation(group_.c_str(), name_.c_str(), progress, static_cast<int>(result),
                             description.c_str());
        _exit(0);
    }
    if (reporter < 0) {
        std::fprintf(stderr, "%s: no report: %s\n", program_.c_str(), std::strerror(errno));
        return;
    }
    while (waitpid(reporter, nullptr, 0) < 0 && errno == EINTR) {
    }
}

int Item::finish(Result result, const std::string &description) const
{
    report(100, result, description);
    return result == Result::passed ? 0 : 1;
}

void Item::work(double share) const
{
    std::this_thread::sleep_for(length_ * share);
}

std::string text(Item::Seconds length)
{
    char buffer[32];
    std::snprintf(buffer, sizeof(buffer), "%.3g s", length.count());
    return buffer;
}
