// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/options.h"
#include "module/device_lock.h"
#include "module/processes.h"
#include "util/failure.h"
#include "util/files.h"
#include "util/write.h"

#include <chrono>
#include <csignal>
#include <cstdio>
#include <fmt/core.h>
#include <memory>
#include <thread>

namespace fptest
{
namespace
{

constexpr char kStopExamples[] =
    "The run stops as by Ctrl-C: its item is stopped, its result files are completed.\n"
    "\n"
    "Examples:\n"
    "  fptest stop && fptest run demo/Bringup\n"
    "\n"
    "Exit status: 0 nothing runs any more; 4 it still does.";

constexpr double kStopWait = 30; // seconds

std::string advice_on(const OtherRun &other)
{
    return other.process() == 0
               ? "wait, or see what runs with ps"
               : fmt::format("wait longer, or end it with kill -KILL {}", other.process());
}

Exit stop_other(double limit)
{
    using Clock = std::chrono::steady_clock;
    require_standard_output("fptest stop");
    const auto begin = Clock::now();
    const OtherRun other = OtherRun::find();
    if (!other.runs()) {
        print_to(stdout, "nothing runs\n");
        return Exit::success;
    }
    const std::string text = other.described();
    other.ask_to_stop();
    while (!other.has_ended()) {
        if (Clock::now() - begin > std::chrono::duration<double>(limit)) {
            throw Failure(Cause::busy, "{},{} goes on after {:g} s; {}", text,
                          other.process() == 0 ? "" : " has been asked to stop and", limit,
                          advice_on(other));
        }
        if (other.process() != 0 && state_of(other.process()) == 'T') {
            kill(other.process(), SIGCONT); // suspended, it would not see that it is asked
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
    print_to(stdout, "stopped: {}\n", text);
    return Exit::success;
}

} // namespace

void add_stop(CLI::App &app, Action &chosen)
{
    const auto limit = std::make_shared<double>(kStopWait);
    CLI::App &command =
        add_subcommand(app, "stop", "Stop what another fptest runs on this device", kStopExamples,
                       chosen, [limit] { return stop_other(*limit); });
    command.add_option("--wait", *limit, "wait that long for its end")
        ->type_name("SECONDS")
        ->capture_default_str()
        ->transform(range(0.0, 1000000.0));
}

} // namespace fptest
