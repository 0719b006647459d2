// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "baseline.h"
#include "cases.h"
#include "figures.h"
#include "plan.h"

#include "quillmark.h"
#include "tests/unit/internals.h"

#include <array>
#include <cstddef>
#include <cstdio>
#include <fcntl.h>
#include <memory>
#include <utility>

namespace bench
{

// Commands that run nothing: what is left for a baseline is the log.
Comparison ping()
{
    return {.name = "ping",
            .calls = 200,
            .seconds = 0.02,
            .library =
                [reply = std::array<char, 64>{}]() mutable {
                    internals::ping_mask = 0; // the first of a process again
                    internals::RunTestCmd("pingtest", reply.data(), 64);
                },
            .baseline =
                [] {
                    BASELINE_LOG("testHead is : %s\n", "pingtest");
                    BASELINE_LOG("Get ping reply success!\n");
                }};
}

Comparison unknown_head()
{
    return {.name = "unknown head",
            .calls = 200,
            .seconds = 0.02,
            .library = [] { FPTEST_RunTestCmd("Unknown", nullptr, 0); },
            .baseline = [] { BASELINE_LOG("testHead is : %s\n", "Unknown"); }};
}

// --- store --------------------------------------------------------------------

namespace
{

void store_bare(const std::string &document)
{
    BASELINE_LOG("testHead is : %s\n", "XMLFile");
    BASELINE_LOG("testName is : %s\n", document.c_str());
    std::remove(kPlanPath);
    const int fd = open(kPlanPath, O_RDWR | O_CREAT, 0666);
    [[maybe_unused]] const ssize_t written = write(fd, document.data(), document.size());
    BASELINE_LOG("Save source xml file success!\n");
}

} // namespace

Comparison store()
{
    const std::string document = reported_plan(40).substr(0, 2048);
    return {.name = "store a plan of 2 KB",
            .calls = 16,
            .prepare = [] { write_plan(""); },
            .library = [command = "XMLFile::" +
                                  document] { FPTEST_RunTestCmd(command.c_str(), nullptr, 0); },
            .baseline = [document] { store_bare(document); },
            .clear = [left_open = LeftOpen()] { left_open.close_all(); },
            .outcome = read_plan};
}

// --- report -------------------------------------------------------------------

namespace
{

constexpr const char *kDescription = "contact 97 %";

// The library's layout, for plans of this bench.
const char *layout(mxml_node_t *node, int where)
{
    const char *name = mxmlGetElement(node);
    const bool is_declaration = name[0] == '?';

    switch (where) {
    case MXML_WS_BEFORE_OPEN:
        if (is_declaration) {
            return nullptr;
        }
        return name[0] != 'C' ? "" : name[3] == '\0' ? "\t\t" : "\t";
    case MXML_WS_AFTER_OPEN:
        return "\n";
    case MXML_WS_AFTER_CLOSE:
        return is_declaration ? nullptr : "\n";
    default:
        return nullptr;
    }
}

mxml_node_t *find(const char *item)
{
    mxml_node_t *tree = g_TestCmdTree;
    mxml_node_t *group = mxmlFindElement(tree, tree, "CmdGroup", "name", kGroup, MXML_DESCEND);
    return mxmlFindElement(group, tree, "Cmd", "name", item, MXML_DESCEND);
}

void save()
{
    BASELINE_LOG("enter...\n");
    const int fd = open(kPlanPath, O_RDWR | O_CREAT | O_TRUNC | O_SYNC, 0666);
    mxmlSaveFd(g_TestCmdTree, fd, layout);
    close(fd);
    BASELINE_LOG("leave...\n");
}

void update(const char *item, int progress)
{
    std::array<char, 10> text{};

    BASELINE_LOG("enter... !\n");
    mxml_node_t *node = find(item);
    BASELINE_LOG("curernt node name is: %s\n", mxmlElementGetAttr(node, "name"));
    BASELINE_LOG("start update progress!\n");
    std::snprintf(text.data(), text.size(), "%d", progress);
    mxmlElementSetAttr(node, "progress", text.data());
    BASELINE_LOG("start update result!\n");
    mxmlElementSetAttr(node, "result", "0");
    BASELINE_LOG("start update description!\n");
    mxmlElementSetAttr(node, "description", kDescription);
    BASELINE_LOG("start save xml!\n");
    save();
    BASELINE_LOG("update Src Xml File success . leave...\n");
}

// The library looks an item up twice, and so does this. That it also counts the
// item's position, for a line of its log, is left to the library.
void report_bare(const char *item, int index, int progress)
{
    BASELINE_LOG("enter...\n");
    BASELINE_LOG("input node name = %s\n", item);
    BASELINE_LOG("enter...\n");
    [[maybe_unused]] const mxml_node_t *volatile found = find(item);
    BASELINE_LOG("iResult = %d\n", 0);
    BASELINE_LOG("index=%d - iResult=%d - iProgress=%d - iDesc=%s\n", index, 0, progress,
                 kDescription);
    update(item, progress);
    BASELINE_LOG("leave...\n");
}

} // namespace

Comparison report(int items)
{
    return {.name = "report, " + grouped(items) + " items",
            .limit = 1.10,
            .seconds = 0.1,
            .prepare = [items] { load_into_library(reported_plan(items)); },
            .library =
                [places = Places(items)]() mutable {
                    const auto &[index, name] = places.next();
                    FPTEST_SetTransation(kGroup, name.c_str(), index % 100, 0, kDescription);
                },
            .baseline =
                [places = Places(items)]() mutable {
                    const auto &[index, name] = places.next();
                    report_bare(name.c_str(), index, index % 100);
                },
            .outcome = read_plan};
}

// --- read-back ----------------------------------------------------------------

namespace
{

// Both read until there is nothing more, as the end of a file cannot be seen
// otherwise.
void read_bare(char *buffer, int length)
{
    BASELINE_LOG("enter... !\n");
    const int fd = open(kPlanPath, O_RDONLY);
    for (const int from : {SEEK_CUR, SEEK_END, SEEK_SET}) {
        BASELINE_LOG("offset = %d", (int)lseek(fd, 0, from));
    }
    int total = 0;
    for (int got = 1; got > 0; total += got) {
        got = (int)read(fd, buffer + total, (size_t)(length - total));
        if (got > 0) {
            BASELINE_LOG("read file unfinish, continue... n = %d \n", got);
        }
    }
    BASELINE_LOG("reach the end of file\n");
    BASELINE_LOG("read byte count = %d\n", total);
    close(fd);
    BASELINE_LOG("leave...\n");
}

} // namespace

Comparison read_back(int kilobytes)
{
    const auto size = static_cast<std::size_t>(kilobytes) * 1024;
    const int length = static_cast<int>(size) + 1;
    const auto buffer = std::make_shared<std::string>(size + 1, '\0');
    return {.name = "read-back of " + (kilobytes < 1024 ? std::to_string(kilobytes) + " KB"
                                                        : std::to_string(kilobytes / 1024) + " MB"),
            .limit = 1.2,
            .calls = kilobytes < 64 ? 32 : 4,
            .prepare = // of about 45 bytes an item
            [=] { write_plan(fresh_plan(kilobytes * 32).substr(0, size)); },
            .library = [=] { FPTEST_ExtractResultMsg(buffer->data(), length); },
            .baseline = [=] { read_bare(buffer->data(), length); },
            .outcome = [=] { return std::exchange(*buffer, std::string(size + 1, '\0')); }};
}

} // namespace bench
