// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "baseline.h"
#include "cases.h"
#include "figures.h"
#include "plan.h"
#include "quiet_vorlane.h"

#include "quillmark.h"

#include <array>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <sys/wait.h>
#include <unistd.h>

namespace bench
{
namespace
{

constexpr const char *kCommand = "/system/bin/true ";
constexpr const char *kQuery = "ps | grep /system/bin/SensorProbe";

void query_presence()
{
    std::array<char, 129> line{};

    BASELINE_LOG("\ncbuf=%s\n", kQuery);
    FILE *query = popen(kQuery, "r");
    if (fgets(line.data(), line.size(), query) == nullptr) {
        BASELINE_LOG("target process not exist!\n");
    }
    pclose(query);
}

// The library's job besides, which is not in here: the parameter file is read and
// the "vendor" line printed for each item, the command line is made of the plan.
void run_item()
{
    BASELINE_LOG("enter... !\n");
    BASELINE_LOG("enter...\n");
    BASELINE_LOG("curernt leaf node name = %s\n", "true");
    BASELINE_LOG("leave...\n");
    BASELINE_LOG("mxmlElementGetAttr name=%s- args=%s\n", "true", "");
    query_presence();
    BASELINE_LOG("tpCmd:%s\n", kCommand);
    [[maybe_unused]] const int ended = std::system(kCommand);
    BASELINE_LOG("leave... !\n");
}

// When items began, as the log tells.
std::vector<std::chrono::steady_clock::time_point> beginnings;

void note_beginning(const char *format, va_list /* arguments */)
{
    if (std::strcmp(format, "%-15s:%04d:pid=%d:ctid=%d => enter... !\n") == 0) {
        beginnings.push_back(std::chrono::steady_clock::now());
    }
}

// Whether ids are given to this program's processes only, and so in turn.
bool is_alone()
{
    const char *device = std::getenv("QUILLMARK_DEVICE");
    return device != nullptr && std::strcmp(device, "namespace") == 0;
}

pid_t next_process()
{
    const pid_t child = fork();
    if (child == 0) {
        _exit(0);
    }
    waitpid(child, nullptr, 0);
    return child;
}

// How long items took, up to the next one's beginning. The median, as no process is
// started at the same pace twice.
double seconds_for_one()
{
    std::vector<double> items;
    for (std::size_t item = 1; item < beginnings.size(); ++item) {
        const std::chrono::duration<double> took = beginnings[item] - beginnings[item - 1];
        items.push_back(took.count());
    }
    return median(items);
}

const std::string kPath = std::string("Plan/") + kGroup;

void run_bare(int items)
{
    BASELINE_LOG("testHead is : %s\n", "XMLNodePath");
    BASELINE_LOG("testName is : %s\n", kPath.c_str());
    BASELINE_LOG("Input cmdline : %s\n", kPath.c_str());
    BASELINE_LOG("level = %d\n", 2);
    BASELINE_LOG("node name = %s\n", kGroup);
    BASELINE_LOG("enter...\n");
    BASELINE_LOG("root node:%s\n", "Plan");
    BASELINE_LOG("mid node:%s\n", kGroup);
    BASELINE_LOG("Enter node length calculate!\n");
    BASELINE_LOG("input level = %d\n", 2);
    BASELINE_LOG("node length = %d!\n", items);
    for (int item = 0; item < items; ++item) {
        run_item();
    }
}

} // namespace

Comparison group_run(int items)
{
    const auto before = std::make_shared<pid_t>();
    return {.name = "group run, " + grouped(items) + " items",
            .limit = 1.02,
            .seconds = items < 100 ? 2.0 : kLong,
            .prepare =
                [=] {
                    load_into_library(trivial_plan(items));
                    *before = next_process();
                },
            .library =
                [] {
                    std::array<char, 64> reply{};
                    FPTEST_RunTestCmd(("XMLNodePath::" + kPath).c_str(), reply.data(), 64);
                },
            .baseline = [=] { run_bare(items); },
            .start =
                [] {
                    beginnings.clear();
                    quiet_on_log(note_beginning);
                },
            .clear = [] { quiet_on_log(nullptr); },
            .seconds_for_one = seconds_for_one,
            // how many processes were started
            .outcome = [=] { return is_alone() ? std::to_string(next_process() - *before) : ""; }};
}

double presence_query_share(int turns)
{
    std::vector<double> query;
    std::vector<double> both;
    for (int turn = 0; turn < turns; ++turn) {
        query.push_back(seconds_of(query_presence));
        both.push_back(query.back() + seconds_of([] {
                           [[maybe_unused]] const int ended = std::system(kCommand);
                       }));
    }
    return median(query) / median(both);
}

} // namespace bench
