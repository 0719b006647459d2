// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Test plans as the library sees them: Mini-XML loads them, and the same lookups tell
// which item a command really runs.
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
        std::optional<std::string> name; // nothing where it has no such attribute
        std::optional<std::string> args;
        ItemReport report;
        std::size_t number = 0; // among all elements of the document, comments included
    };

    // Nothing where Mini-XML does not load it; why then says what it has
    // against it, in Mini-XML's words.
    static std::optional<Plan> load_as_library(const std::string &text, std::string *why = nullptr);

    // As load_as_library(), but for reading results: control characters and bytes that are
    // no UTF-8 are made visible first, and attributes may lack their value.
    // Nothing where the text is not whole, as while it is being written.
    static std::optional<Plan> parse_annotated(std::string_view text);

    struct Group {
        std::string name;
        std::vector<Element> items; // its direct children named Cmd
        std::size_t number = 0;
    };
    // In document order; groups and items without a name are left out.
    std::vector<Group> groups() const;

    // The first group of that name; null where there is none.
    mxml_node_t *find_group(const std::string &group) const;

    // What the library runs for root/group: an entry for each of its calls,
    // nothing where a call would find nothing to run. The path is taken as the
    // library takes it: a '/' in the name makes one of an item.
    std::vector<std::optional<Element>> resolve(const std::string &group) const;

    // What the library runs for root/group/item, nothing where that is nothing.
    std::optional<Element> resolve(const std::string &group, const std::string &item) const;

    // Every element of the document in order, comments and the like included.
    const std::vector<mxml_node_t *> &elements() const;

    // What an element has reported.
    ItemReport report(std::size_t number) const;

    // The place of an element of this plan in that order.
    std::size_t number(mxml_node_t *node) const;

    mxml_node_t *top() const;

    // The first element that is no comment or the like; null if there is none.
    mxml_node_t *root() const;

  private:
    using Tree = std::unique_ptr<mxml_node_t, void (*)(mxml_node_t *)>;
    using Numbers = std::vector<std::size_t>;

    explicit Plan(Tree tree);

    void note_names();
    void note_positions();
    Element element(mxml_node_t *node) const;
    // The first of these after the start of that group.
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

// An attribute of an element; nothing where it has none.
std::optional<std::string> attribute(mxml_node_t *node, const char *name);

// An attribute's value as Mini-XML gives it back once it is saved: it drops
// characters that it writes.
std::string as_loaded(const std::string &value);

// Those of a text's tags that a plan's elements were read from, in the same order; none
// where the text has others than Mini-XML has seen.
std::vector<Tag> element_tags(const Plan &plan, std::vector<Tag> tags);

} // namespace fptest
