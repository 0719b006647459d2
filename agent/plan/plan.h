// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Test plans as the library sees them: loaded by Mini-XML, with the lookups that decide which
// item a command runs.
#pragma once

#include "plan/item_report.h"
#include "plan/library_rules.h"
#include "plan/markup.h"

#include <cstddef>
#include <memory>
#include <mxml.h>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace fptest
{

class Plan
{
  public:
    // One element, as the library reads it.
    struct Element {
        std::string tag;                 // "Cmd" for an item
        std::optional<std::string> name; // nullopt without such an attribute
        std::optional<std::string> args;
        ItemReport report;
        std::size_t number = 0; // among all elements of the document, comments included
    };

    // nullopt if Mini-XML does not load it; why then has its message.
    static std::optional<Plan> load_as_library(const std::string &text, std::string *why = nullptr);

    // For reading results: accepts attributes without a value, and makes control characters
    // and invalid UTF-8 visible first. nullopt if the text is not whole, as while it is being
    // written. The elements' tags are given of a text that was loaded as it is.
    static std::optional<Plan> parse_annotated(std::string_view text,
                                               std::vector<Tag> *places = nullptr);

    struct Group {
        std::string name;
        std::vector<Element> items; // its direct children named Cmd
        std::size_t number = 0;
    };
    // In document order, without groups and items that have no name.
    std::vector<Group> groups() const;

    // The first group of that name, or null.
    mxml_node_t *find_group(const std::string &group) const;

    // What the library runs for root/group: an entry for each of its calls, nullopt for a
    // call that runs nothing. A '/' in the name makes it the path of an item.
    std::vector<std::optional<Element>> resolve(const std::string &group) const;

    // What the library runs for root/group/item, if anything.
    std::optional<Element> resolve(const std::string &group, const std::string &item) const;

    // Every element of the document in order, comments and the like included.
    const std::vector<mxml_node_t *> &elements() const
    {
        return elements_;
    }

    ItemReport report(std::size_t number) const;

    // An element's index in elements().
    std::size_t number(mxml_node_t *node) const;

    mxml_node_t *top() const
    {
        return tree_.get();
    }

    // The first element that is no comment or the like; null if there is none.
    mxml_node_t *root() const;

  private:
    using Tree = std::unique_ptr<mxml_node_t, void (*)(mxml_node_t *)>;
    using Numbers = std::vector<std::size_t>;

    explicit Plan(Tree tree);

    void note_names();
    void note_positions();
    Element element(mxml_node_t *node) const;
    // The first of these items after the start of the group.
    mxml_node_t *after(mxml_node_t *group, const Numbers &items) const;
    std::vector<std::optional<Element>> resolve_group(const std::string &name) const;
    std::optional<Element> resolve_item(const std::string &group, const std::string &name) const;

    Tree tree_;
    std::vector<mxml_node_t *> elements_;
    std::vector<std::vector<mxml_node_t *>> children_;      // of each element
    Numbers positions_;                                     // of each element, among its siblings
    std::unordered_map<std::string, mxml_node_t *> groups_; // the first of each name
    Numbers items_;
    std::unordered_map<std::string, Numbers> items_named_;
};

// The names of the groups, each once, and of the items of a group.
std::vector<std::string> group_names(const Plan &plan);
std::vector<std::string> item_names(const Plan &plan, const std::string &group);

std::optional<std::string> attribute(mxml_node_t *node, const char *name);

// An attribute's value after Mini-XML has saved and loaded it: some characters get lost.
std::string as_loaded(const std::string &value);

// Those of the text's tags from which the plan's elements were read, in the same order; empty
// if they do not match.
std::vector<Tag> element_tags(const Plan &plan, std::vector<Tag> tags);

} // namespace fptest
