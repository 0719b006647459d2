// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/elements.h"

#include "check/document_checks.h"
#include "util/text.h"

#include <string_view>

namespace fptest
{

namespace
{

constexpr std::size_t kShownPath = 80; // columns

bool has_tag(mxml_node_t *node, std::string_view tag)
{
    return mxmlGetType(node) == MXML_ELEMENT && mxmlGetElement(node) == tag;
}

Group group_of(mxml_node_t *node, std::size_t number)
{
    Group group;
    group.node = node;
    group.number = number;
    group.name = attribute(node, "name").value_or("");
    for (mxml_node_t *child = mxmlGetFirstChild(node); child != nullptr;
         child = mxmlGetNextSibling(child)) {
        if (!has_tag(child, "Cmd")) {
            group.others.push_back(child);
        }
    }
    return group;
}

} // namespace

Elements elements_of(const Plan &plan)
{
    Elements found;
    auto &groups = found.groups;
    const auto &elements = plan.elements();
    std::vector<std::size_t> owners(elements.size(), kNone); // indexes of groups
    for (std::size_t number = 0; number < elements.size(); ++number) {
        mxml_node_t *const node = elements[number];
        mxml_node_t *const parent = mxmlGetParent(node);
        const std::size_t owner = parent != nullptr ? owners[plan.number(parent)] : kNone;
        owners[number] = owner;
        if (has_tag(node, "CmdGroup")) {
            owners[number] = groups.size();
            groups.push_back(group_of(node, number));
        } else if (has_tag(node, "Cmd")) {
            const Item item{node, number, attribute(node, "name").value_or(""),
                            attribute(node, "args")};
            auto &list = owner == kNone                 ? found.stray
                         : parent == groups[owner].node ? groups[owner].items
                                                        : groups[owner].nested;
            list.push_back(item);
            found.item_names.insert(item.name);
        }
    }
    return found;
}

std::vector<const Item *> addressable_items(const Group &group)
{
    std::vector<const Item *> items;
    std::unordered_set<std::string_view> names;
    for (const Item &item : group.items) {
        if (is_addressable(item.name) && names.insert(item.name).second) {
            items.push_back(&item);
        }
    }
    return items;
}

std::string kind_of(mxml_node_t *node)
{
    if (mxmlGetType(node) != MXML_ELEMENT) {
        return "text";
    }
    const std::string_view tag = mxmlGetElement(node);
    return tag.starts_with("!--")        ? "a comment"
           : tag.starts_with("![CDATA[") ? "CDATA"
           : tag.starts_with("!")        ? "a declaration"
           : tag.starts_with("?")        ? "an instruction"
                                  : fmt::format("<{}>", ellipsize(one_line(tag), kShownName));
}

std::string words_for(const Item &item)
{
    return item.name.empty() ? "an item without a name"
                             : fmt::format("item {}", quoted_name(item.name));
}

std::string path_of(const std::string &group)
{
    return in_quotes("root/" + group, kShownPath);
}

std::string path_of(const std::string &group, const std::string &item)
{
    return path_of(group + "/" + item);
}

std::string names_of(const Resolution &resolution)
{
    std::string first;
    std::size_t count = 0;
    for (const auto &element : resolution) {
        if (element && ++count == 1) {
            first = quoted_name(element->name.value());
        }
    }
    return count == 0   ? "nothing"
           : count == 1 ? first
                        : fmt::format("{} and {} more", first, count - 1);
}

} // namespace fptest
