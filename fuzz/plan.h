// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A test plan as the fuzz targets see it: read from Mini-XML's nodes, but looked
// up by code that shares nothing with the library's.
#pragma once

#include <mxml.h>

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

// What one node holds. Where white space stood before a word is layout.
struct Content {
    std::size_t depth = 0;
    mxml_type_t type = MXML_IGNORE;
    std::string element;
    std::vector<std::pair<std::string, std::optional<std::string>>> attributes;
    std::string text;

    bool operator==(const Content &) const = default;
    [[nodiscard]] const std::string *attribute(std::string_view name) const;
    // As a report does it: in its place if it is there already, else behind.
    void set_attribute(const std::string &name, std::optional<std::string> value);
};

// The nodes in document order, the top node first.
struct Plan {
    std::vector<mxml_node_t *> nodes;
    std::vector<Content> contents;
    std::vector<std::size_t> parents;   // of the top node: itself
    std::vector<std::size_t> positions; // among the parent's children

    explicit Plan(mxml_node_t *tree);

    // Places in the vectors; nothing is where there is none.
    using Place = std::optional<std::size_t>;
    [[nodiscard]] Place group(std::string_view name) const;
    [[nodiscard]] Place item(std::size_t group, std::string_view name) const;
    [[nodiscard]] Place item_by_index(std::size_t group, int index) const;
    [[nodiscard]] std::vector<std::size_t> children(std::size_t place) const;
    // Whether the group holds nothing but items, each with a name of its own that
    // stands nowhere between the group's start and the item.
    [[nodiscard]] bool is_plain(std::size_t group) const;
};
