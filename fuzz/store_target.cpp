// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The plan store: load, look up, report, save, load again. Input:
// "DOCUMENT\0GROUP\0ITEM\0DESCRIPTION\0" and up to five bytes: what kind of
// report, and its progress. An empty group or item stands for the first one.
#include "doubles.h"
#include "input.h"
#include "internals.h"
#include "nodes.h"
#include "plan/plan.h"
#include "quillmark.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <string>
#include <utility>
#include <vector>

using doubles::require;

namespace
{

constexpr char kPath[] = "/data/vorlane/src1.xml";
constexpr std::size_t kMostNames = 6; // of each kind: enough to meet, and quick

std::vector<std::string> names_of(const Nodes &plan, std::string_view element)
{
    std::vector<std::string> names;
    for (const Content &content : plan.contents) {
        const std::string *name = content.attribute("name");
        if (content.element == element && name != nullptr && names.size() < kMostNames) {
            names.push_back(*name);
        }
    }
    return names;
}

void check_no_lone_white_space(const Nodes &plan)
{
    for (const Content &content : plan.contents) {
        require(content.type != MXML_TEXT ||
                    content.text.find_first_not_of(" \t\n\v\f\r") != std::string::npos,
                "white space alone is a node");
    }
}

void check_layout(const Nodes &plan)
{
    for (std::size_t at = 0; at < plan.nodes.size(); ++at) {
        const std::size_t depth = plan.contents[at].depth;
        const std::string tabs(std::min<std::size_t>(depth > 0 ? depth - 1 : 0, 8), '\t');
        const bool declaration = plan.contents[at].element.starts_with("?xml");
        const char *text = internals::whitespace_cb(plan.nodes[at], MXML_WS_BEFORE_OPEN);
        require(declaration ? text == nullptr : text != nullptr && text == tabs,
                "a node is indented otherwise");
    }
}

// An element's place among all, as Plan numbers it; nothing if it is not run.
std::optional<std::size_t> number_of(const Nodes &plan, const mxml_node_t *node)
{
    std::size_t number = 0;
    for (std::size_t at = 0; at < plan.nodes.size(); ++at) {
        if (plan.nodes[at] == node) {
            const std::string *name = plan.contents[at].attribute("name");
            return name != nullptr && !name->empty() ? std::optional(number) : std::nullopt;
        }
        number += plan.contents[at].type == MXML_ELEMENT ? 1 : 0;
    }
    return std::nullopt;
}

// Whether a node path can name it.
bool is_addressable(const std::string &name)
{
    return !name.empty() && name.size() <= fptest::kNameLimit &&
           name.find_first_of("/:\t\n") == std::string::npos;
}

void check_run(const Nodes &plan, const std::string &group, int index,
               const std::optional<fptest::Plan::Element> &told)
{
    mxml_node_t *node = internals::get_node_byIndex(g_TestCmdTree, group.c_str(), index);
    require(number_of(plan, node) == (told ? std::optional(told->number) : std::nullopt),
            "the item at the index is another");
}

void check_lookups(const Nodes &plan, const fptest::Plan &told, const std::string &group,
                   const std::vector<std::string> &items)
{
    const int length = internals::get_node_length(group.c_str(), 2);
    require((length >= 0) == plan.find("CmdGroup", group).has_value(),
            "a group is found, or is not");
    if (!is_addressable(group)) {
        return;
    }
    const auto runs = told.resolve(group);
    require(length <= 0 ? runs.empty() : static_cast<std::size_t>(length) == runs.size(),
            "the group's length is another");
    check_run(plan, group, -1, std::nullopt);
    for (std::size_t at = 0; at < runs.size(); ++at) {
        check_run(plan, group, static_cast<int>(at), runs[at]);
    }
    for (const std::string &item : items) {
        if (is_addressable(item)) {
            check_run(plan, group, internals::get_node_index(group.c_str(), item.c_str(), 3),
                      told.resolve(group, item));
        }
    }
}

struct Report {
    std::string group;
    std::string item;
    std::string description;
    bool without_description;
    int result;
    int progress;

    void make() const
    {
        FPTEST_SetTransation(group.c_str(), item.c_str(), progress, result,
                             without_description ? nullptr : description.c_str());
    }
    void expect_in(Content &content) const
    {
        using Value = std::optional<std::string>;
        const bool known = result == 0 || result == 1 || result == -2;
        content.set_attribute("progress", std::to_string(progress).substr(0, 9));
        content.set_attribute("result", known ? Value(std::to_string(result)) : std::nullopt);
        content.set_attribute("description",
                              without_description ? std::nullopt : Value(description));
    }
};

Report report_from(const Nodes &plan, const std::array<std::string, 5> &input)
{
    const auto first = [](const std::string &given, const std::vector<std::string> &names) {
        return given.empty() && !names.empty() ? names.front() : given;
    };
    static constexpr int kResults[] = {0, 1, -2, 2, -1};
    const std::string &numbers = input[4];
    const auto kind = numbers.empty() ? 0U : static_cast<unsigned char>(numbers[0]);
    Report report{.group = first(input[1], names_of(plan, "CmdGroup")),
                  .item = first(input[2], names_of(plan, "Cmd")),
                  .description = input[3],
                  .without_description = (kind & 0x80U) != 0,
                  .result = kResults[kind % 5],
                  .progress = static_cast<int>(kind)};
    if (numbers.size() >= 5) {
        std::memcpy(&report.progress, numbers.data() + 1, sizeof report.progress);
    }
    return report;
}

// As another process finds the file.
bool is_loaded_as(const std::vector<Content> &contents)
{
    mxml_node_t *tree = internals::load_configs_file(kPath);
    const bool same = tree != nullptr && Nodes(tree).contents == contents;
    internals::reset();
    return same;
}

// Some trees Mini-XML itself does not give back, whatever their layout: it refuses
// an attribute without a value, and it resolves references to characters that it
// then writes as they are, though they mean something else (white space in a
// word, markup in a name) or are refused (control characters, surrogates, a byte
// order mark), as they are in a description that holds them. So a tree that comes
// back changed is a finding only if Mini-XML gives it back without the library's
// layout.
void check_file(const std::vector<Content> &contents)
{
    mxml_node_t *tree = std::exchange(g_TestCmdTree, nullptr);
    if (!is_loaded_as(contents)) {
        const std::string saved = doubles::plan().value_or("");
        char *plain = mxmlSaveAllocString(tree, MXML_NO_CALLBACK);
        require(plain != nullptr, "Mini-XML cannot write the tree");
        doubles::write_plan(plain);
        std::free(plain);
        if (is_loaded_as(contents)) {
            std::fprintf(stderr, "saved as:\n%s\n", saved.c_str());
            require(false, "a saved plan is another one");
        }
    }
    mxmlDelete(tree);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size)
{
    const doubles::Run run;
    const auto input = texts<5>(data, size);
    doubles::write_plan(input[0]);

    mxml_node_t *tree = internals::load_configs_file(kPath);
    require(tree == g_TestCmdTree, "the loaded plan is not the one in use");
    require(doubles::left_open() == 0, "loading leaves a descriptor open");
    if (tree == nullptr) {
        require(internals::get_node_length("", 2) == -1, "a group of no plan has a length");
        require(internals::get_node_index("", "", 3) == -1, "an item of no plan has an index");
        return 0;
    }
    const Nodes plan(tree);
    check_no_lone_white_space(plan);
    check_layout(plan);
    auto groups = names_of(plan, "CmdGroup");
    auto items = names_of(plan, "Cmd");
    groups.push_back(input[1]);
    items.push_back(input[2]);
    const auto told = fptest::Plan::load_as_library(input[0]);
    require(told.has_value(), "the agent does not load what the library does");
    for (const std::string &group : groups) {
        check_lookups(plan, *told, group, items);
    }

    const Report report = report_from(plan, input);
    auto contents = plan.contents;
    const auto group = plan.find("CmdGroup", report.group);
    const auto item = group ? plan.find("Cmd", report.item, *group) : std::nullopt;
    report.make();
    if (item) {
        report.expect_in(contents[*item]);
    } else {
        require(doubles::plan() == input[0], "a report of no item changes the file");
        internals::save_XmlFile(tree);
    }
    require(g_TestCmdTree == tree && Nodes(tree).contents == contents, "the report is another");
    require(doubles::left_open() == 0, "saving leaves a descriptor open");
    check_file(contents);
    return 0;
}
