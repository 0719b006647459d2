// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/doctor.h"
#include "cli/options.h"
#include "module/log_file.h"
#include "reporters/answers.h"
#include "util/files.h"
#include "util/terminal.h"
#include "util/write.h"

#include <cstdio>
#include <memory>
#include <string>
#include <unistd.h>
#include <vector>

namespace fptest
{
namespace
{

constexpr char kDoctorExamples[] =
    "Each line begins with \"ok\", with \"!\" for something to know, or with \"!!\" for what\n"
    "keeps the device from being ready, and then says what to do.\n"
    "\n"
    "Examples:\n"
    "  fptest doctor\n"
    "  fptest doctor --json | jq -r '.answers[] | select(.verdict != \"ok\") | .text'\n"
    "\n"
    "Exit status: 0 the device is ready; 3 it is not.";

Exit examine(bool as_json)
{
    require_standard_output("fptest doctor");
    choose_log("");
    const bool is_terminal = isatty(STDOUT_FILENO) != 0;
    const std::size_t width = is_terminal ? terminal_width(stdout) - 1 : std::string::npos;
    const bool coloured = is_smart_terminal(stdout) && wants_colour();
    std::vector<DeviceAnswer> answers;
    examine_device([&](const DeviceAnswer &answer) {
        answers.push_back(answer);
        if (!as_json) {
            print_to(stdout, "{}", shown(answer, width, coloured));
            std::fflush(stdout); // some answers take a second
        }
    });
    if (as_json) {
        print_to(stdout, "{}", json_of(answers));
    }
    return is_ready(answers) ? Exit::success : Exit::environment;
}

} // namespace

void add_doctor(CLI::App &app, Action &chosen)
{
    const auto as_json = std::make_shared<bool>(false);
    CLI::App &command =
        add_subcommand(app, "doctor", "Ask whether the device has what is needed", kDoctorExamples,
                       chosen, [as_json] { return examine(*as_json); });
    command.add_flag("--json", *as_json, "print the answers as one JSON object");
}

} // namespace fptest
