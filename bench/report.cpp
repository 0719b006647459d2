// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cases.h"
#include "figures.h"
#include "floor.h"
#include "plan.h"

#include "quillmark.h"

#include <array>
#include <cstdio>
#include <fcntl.h>

namespace bench
{
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
    FLOOR_LOG("enter...\n");
    const int fd = open(kPlanPath, O_RDWR | O_CREAT | O_TRUNC | O_SYNC, 0666);
    mxmlSaveFd(g_TestCmdTree, fd, layout);
    close(fd);
    FLOOR_LOG("leave...\n");
}

void update(const char *item, int progress)
{
    std::array<char, 10> text{};

    FLOOR_LOG("enter... !\n");
    mxml_node_t *node = find(item);
    FLOOR_LOG("curernt node name is: %s\n", mxmlElementGetAttr(node, "name"));
    FLOOR_LOG("start update progress!\n");
    std::snprintf(text.data(), text.size(), "%d", progress);
    mxmlElementSetAttr(node, "progress", text.data());
    FLOOR_LOG("start update result!\n");
    mxmlElementSetAttr(node, "result", "0");
    FLOOR_LOG("start update description!\n");
    mxmlElementSetAttr(node, "description", kDescription);
    FLOOR_LOG("start save xml!\n");
    save();
    FLOOR_LOG("update Src Xml File success . leave...\n");
}

// The library looks an item up twice, and so does this. That it also counts the
// item's position, for a line of its log, is left to the library.
void report_bare(const char *item, int index, int progress)
{
    FLOOR_LOG("enter...\n");
    FLOOR_LOG("input node name = %s\n", item);
    FLOOR_LOG("enter...\n");
    [[maybe_unused]] const mxml_node_t *volatile found = find(item);
    FLOOR_LOG("iResult = %d\n", 0);
    FLOOR_LOG("index=%d - iResult=%d - iProgress=%d - iDesc=%s\n", index, 0, progress,
              kDescription);
    update(item, progress);
    FLOOR_LOG("leave...\n");
}

class Report : public Contest
{
  public:
    explicit Report(int items)
        : Contest("report, " + grouped(items) + " items", 1.10, 1, 0.1), items_(items)
    {
        for (int index = 0; index < items; ++index) {
            names_.push_back(item_name(index));
        }
    }
    void prepare() override
    {
        load_into_module(reported_plan(items_));
        module_places_ = floor_places_ = Places(items_);
    }
    void module(int calls) override
    {
        for (int call = 0; call < calls; ++call) {
            const int index = module_places_.next();
            FPTEST_SetTransation(kGroup, name(index), index % 100, 0, kDescription);
        }
    }
    void floor(int calls) override
    {
        for (int call = 0; call < calls; ++call) {
            const int index = floor_places_.next();
            report_bare(name(index), index, index % 100);
        }
    }
    std::string outcome() override
    {
        return read_plan();
    }

  private:
    [[nodiscard]] const char *name(int index) const
    {
        return names_.at(static_cast<std::size_t>(index)).c_str();
    }

    int items_;
    Places module_places_{items_};
    Places floor_places_{items_};
    std::vector<std::string> names_;
};

} // namespace

std::unique_ptr<Contest> report(int items)
{
    return std::make_unique<Report>(items);
}

} // namespace bench
