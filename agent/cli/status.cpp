// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/options.h"
#include "module/device_lock.h"
#include "util/files.h"
#include "util/write.h"

#include <cstdio>

namespace fptest
{
namespace
{

constexpr char kStatusExamples[] = "Examples:\n"
                                   "  fptest status && fptest run demo/Bringup\n"
                                   "\n"
                                   "Exit status: 0 nothing runs; 4 an fptest runs.";

Exit show_status()
{
    require_standard_output("fptest status");
    const OtherRun other = OtherRun::find();
    std::string text = other.described();
    if (!other.runs()) {
        print_to(stdout, "nothing runs{}\n",
                 text.empty() ? "" : "; the last run was killed: " + text);
        return Exit::success;
    }
    if (other.process() != 0 && other.note()) {
        for (const std::string &more : {other.note()->tally, other.note()->labels}) {
            text += (more.empty() ? "" : "; ") + more;
        }
    }
    print_to(stdout, "{}\n", text);
    return Exit::busy;
}

} // namespace

void add_status(CLI::App &app, Action &chosen)
{
    add_subcommand(app, "status", "Say what another fptest runs on this device", kStatusExamples,
                   chosen, show_status);
}

} // namespace fptest
