// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What Mini-XML's nodes of a test plan hold, and where a report goes.
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
    // As a report does it: in its place if it is there already, else after the others.
    void set_attribute(const std::string &name, std::optional<std::string> value);
};

// The nodes in document order, the top node first.
struct Nodes {
    std::vector<mxml_node_t *> nodes;
    std::vector<Content> contents;
    explicit Nodes(mxml_node_t *tree);

    // Places in the vectors; nothing if there is none.
    using Place = std::optional<std::size_t>;
    [[nodiscard]] Place find(std::string_view element, std::string_view name,
                             std::size_t after = 0) const;
};
