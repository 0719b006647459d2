// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cases.h"
#include "figures.h"
#include "floor.h"
#include "plan.h"
#include "quiet_vorlane.h"

#include "quillmark.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
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

    FLOOR_LOG("\ncbuf=%s\n", kQuery);
    FILE *query = popen(kQuery, "r");
    if (fgets(line.data(), line.size(), query) == nullptr) {
        FLOOR_LOG("target process not exist!\n");
    }
    pclose(query);
}

// The library's job besides, which is not in here: the parameter file is read and
// the "vendor" line printed for each item, the command line is made of the plan.
void run_item()
{
    FLOOR_LOG("enter... !\n");
    FLOOR_LOG("enter...\n");
    FLOOR_LOG("curernt leaf node name = %s\n", "true");
    FLOOR_LOG("leave...\n");
    FLOOR_LOG("mxmlElementGetAttr name=%s- args=%s\n", "true", "");
    query_presence();
    FLOOR_LOG("tpCmd:%s\n", kCommand);
    [[maybe_unused]] const int ended = std::system(kCommand);
    FLOOR_LOG("leave... !\n");
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

// One call is one item: a turn is the command for the group. What counts is the
// median item of it, as no process is started at the same pace twice.
class GroupRun : public Contest
{
  public:
    explicit GroupRun(int items)
        : Contest("group run, " + grouped(items) + " items", 1.02, items, items < 100 ? 2.0 : kLong)
    {
    }
    void prepare() override
    {
        load_into_module(trivial_plan(calls()));
        next_process_ = next_process();
    }
    void start() override
    {
        beginnings.clear();
        quiet_on_log(note_beginning);
    }
    void clear() override
    {
        quiet_on_log(nullptr);
    }
    double for_one(double /* turn */) override
    {
        std::vector<double> items;
        for (std::size_t item = 1; item < beginnings.size(); ++item) {
            const std::chrono::duration<double> took = beginnings[item] - beginnings[item - 1];
            items.push_back(took.count());
        }
        return median(items);
    }
    void module(int /* items */) override
    {
        FPTEST_RunTestCmd(("XMLNodePath::" + path_).c_str(), reply_.data(), 64);
    }
    void floor(int items) override
    {
        FLOOR_LOG("testHead is : %s\n", "XMLNodePath");
        FLOOR_LOG("testName is : %s\n", path_.c_str());
        FLOOR_LOG("Input cmdline : %s\n", path_.c_str());
        FLOOR_LOG("level = %d\n", 2);
        FLOOR_LOG("node name = %s\n", kGroup);
        FLOOR_LOG("enter...\n");
        FLOOR_LOG("root node:%s\n", "Plan");
        FLOOR_LOG("mid node:%s\n", kGroup);
        FLOOR_LOG("Enter node length calculate!\n");
        FLOOR_LOG("input level = %d\n", 2);
        FLOOR_LOG("node length = %d!\n", items);
        for (int item = 0; item < items; ++item) {
            run_item();
        }
    }

    // How many processes were started.
    std::string outcome() override
    {
        return is_alone() ? std::to_string(next_process() - next_process_) : "";
    }

  private:
    const std::string path_ = std::string("Plan/") + kGroup;
    std::array<char, 64> reply_{};
    pid_t next_process_ = 0;
};

} // namespace

std::unique_ptr<Contest> group_run(int items)
{
    return std::make_unique<GroupRun>(items);
}

double presence_query_share(int turns)
{
    std::vector<double> query;
    std::vector<double> both;
    for (int turn = 0; turn < turns; ++turn) {
        const auto start = std::chrono::steady_clock::now();
        query_presence();
        const auto asked = std::chrono::steady_clock::now();
        [[maybe_unused]] const int ended = std::system(kCommand);
        const auto end = std::chrono::steady_clock::now();
        query.push_back(std::chrono::duration<double>(asked - start).count());
        both.push_back(std::chrono::duration<double>(end - start).count());
    }
    return median(query) / median(both);
}

} // namespace bench
