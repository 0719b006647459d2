// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// fptest's run of items beside the bare commands for them, by fptest send.
#include "cases.h"
#include "figures.h"
#include "plan.h"

#include <algorithm>
#include <cstdlib>
#include <fstream>
#include <memory>
#include <stdexcept>
#include <string>
#include <sys/wait.h>

namespace bench
{
namespace
{

constexpr const char *kPlanFile = "/data/vorlane/bench.xml";
constexpr const char *kCommands = "/data/vorlane/bench.commands";

// A group for each, so that each has a path of its own.
std::string group_of(int index)
{
    return kGroup + std::to_string(index);
}

std::string plan_of_groups(int items, const std::string &name, const std::string &options)
{
    std::string plan = "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n<Plan>\n";
    for (int index = 0; index < items; ++index) {
        const std::string args =
            options.empty() ? "" : "--group " + group_of(index) + " " + options;
        plan += "\t<CmdGroup name=\"" + group_of(index) + "\">\n\t\t<Cmd name=\"" + name +
                "\" args=\"" + args + "\" />\n</CmdGroup>\n";
    }
    return plan + "</Plan>\n";
}

void write_commands(int items, const std::string &name)
{
    std::ofstream file(kCommands, std::ios::binary);
    for (int index = 0; index < items; ++index) {
        file << "XMLNodePath::Plan/" << group_of(index) << '/' << name << '\0';
    }
}

void expect_status(const std::string &command, int wanted)
{
    const int status = std::system((command + " >/dev/null 2>&1").c_str());
    if (!WIFEXITED(status) || WEXITSTATUS(status) != wanted) {
        throw std::runtime_error(command + ": its exit status is not " + std::to_string(wanted));
    }
}

// Mini-XML has broken its lines where the marks of a run moved them.
std::string stored_plan_on_one_line()
{
    std::string text = read_plan();
    std::ranges::replace(text, '\n', ' ');
    return text;
}

Comparison agent_run(const std::string &title, double limit, int items, const std::string &name,
                     const std::string &options)
{
    const std::string plan = plan_of_groups(items, name, options);
    const auto took = std::make_shared<double>();
    const auto side = [=](const std::string &command, int status) {
        return [=] { *took = seconds_of([&] { expect_status(command, status); }) / items; };
    };
    return {.name = title + ", " + grouped(items) + " items",
            .limit = items < 1000 ? 0 : limit, // or its start counts
            .seconds = items < 1000 ? 2.0 : kLong,
            .prepare =
                [=] {
                    write_plan(plan);
                    std::ofstream(kPlanFile, std::ios::binary) << plan;
                    write_commands(items, name);
                },
            // status 1: no item passes
            .library = side(std::string("fptest run --plan ") + kPlanFile, 1),
            .baseline = side(std::string("fptest send -0 <") + kCommands, 0),
            .start = [=] { write_plan(plan); },
            .seconds_for_one = [=] { return *took; },
            .outcome = stored_plan_on_one_line};
}

} // namespace

Comparison agent_run_of_silent(int items)
{
    return agent_run("fptest run", 1.10, items, "true", "");
}

Comparison agent_run_of_reporting(int items)
{
    // only shown: most of it is Mini-XML's, which the items have load and save longer plans
    return agent_run("  reporting twice", 0, items, "DeadPixel", "--seconds 0");
}

} // namespace bench
