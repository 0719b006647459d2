// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Groups and items as the checks look at them, and the words for them.
#pragma once

#include "plan/plan.h"

#include <cstddef>
#include <mxml.h>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace fptest
{

struct Item {
    mxml_node_t *node = nullptr;
    std::size_t number = 0;
    std::optional<std::string> name;
    std::optional<std::string> args;
};

struct Group {
    mxml_node_t *node = nullptr;
    std::size_t number = 0;
    std::optional<std::string> name;
    bool found = false; // by its name
    std::vector<Item> items;
    std::vector<Item> nested; // in other elements of it
    std::vector<mxml_node_t *> others;
};

// What a path leads to, one for each of the library's calls.
using Resolution = std::vector<std::optional<Plan::Element>>;

// 'root/GROUP' and 'root/GROUP/ITEM'
std::string path_of(const std::string &group);
std::string path_of(const std::string &group, const std::string &item);

// What would be run, by name.
std::string names_of(const Resolution &resolution);

} // namespace fptest
