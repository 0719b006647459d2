// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Groups and items as the checks see them, and the words for them.
#pragma once

#include "check/findings.h"
#include "check/source_map.h"
#include "plan/plan.h"

#include <cstddef>
#include <mxml.h>
#include <optional>
#include <string>
#include <unordered_set>
#include <vector>

namespace fptest
{

// What the checks of one plan share.
struct CheckContext {
    const Plan &plan;
    const SourceMap &places;
    Findings &findings;
};

struct Item {
    mxml_node_t *node = nullptr;
    std::size_t number = 0;
    std::string name; // empty if it has none
    std::optional<std::string> args;
};

struct Group {
    mxml_node_t *node = nullptr;
    std::size_t number = 0;
    std::string name;   // empty if it has none
    bool found = false; // by its name
    std::vector<Item> items;
    std::vector<Item> nested; // in other elements of it
    std::vector<mxml_node_t *> others;
};

struct Elements {
    std::vector<Group> groups;
    std::vector<Item> stray; // in no group
    std::unordered_set<std::string> item_names;
};

Elements elements_of(const Plan &plan);

// Items that a path can reach: the first of each name.
std::vector<const Item *> addressable_items(const Group &group);

// "a comment", "<TAG>"
std::string kind_of(mxml_node_t *node);

// "item 'NAME'"
std::string words_for(const Item &item);

// What a path leads to, an entry for each of the library's calls.
using Resolution = std::vector<std::optional<Plan::Element>>;

// 'root/GROUP' and 'root/GROUP/ITEM'
std::string path_of(const std::string &group);
std::string path_of(const std::string &group, const std::string &item);

// What would be run, by name.
std::string names_of(const Resolution &resolution);

} // namespace fptest
