// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "plan.h"

#include <algorithm>

const std::string *Content::attribute(std::string_view name) const
{
    for (const auto &[key, value] : attributes) {
        if (key == name) {
            return value ? &*value : nullptr;
        }
    }
    return nullptr;
}

void Content::set_attribute(const std::string &name, std::optional<std::string> value)
{
    for (auto &[key, old] : attributes) {
        if (key == name) {
            old = std::move(value);
            return;
        }
    }
    attributes.emplace_back(name, std::move(value));
}

namespace
{

Content content_of(mxml_node_t *node, std::size_t depth)
{
    Content content;
    content.depth = depth;
    content.type = mxmlGetType(node);
    if (content.type == MXML_ELEMENT) {
        content.element = mxmlGetElement(node);
        for (int at = 0; at < mxmlElementGetAttrCount(node); ++at) {
            const char *name = nullptr;
            const char *value = mxmlElementGetAttrByIndex(node, at, &name);
            content.attributes.emplace_back(
                name, value != nullptr ? std::optional<std::string>(value) : std::nullopt);
        }
    } else if (content.type == MXML_TEXT) {
        content.text = mxmlGetText(node, nullptr);
    }
    return content;
}

} // namespace

Plan::Plan(mxml_node_t *tree)
{
    struct Step {
        mxml_node_t *node;
        std::size_t parent, position, depth;
    };
    std::vector<Step> open{{tree, 0, 0, 0}};
    while (!open.empty()) {
        const Step step = open.back();
        open.pop_back();
        const std::size_t place = nodes.size();
        nodes.push_back(step.node);
        contents.push_back(content_of(step.node, step.depth));
        parents.push_back(step.parent);
        positions.push_back(step.position);
        const auto first = static_cast<std::ptrdiff_t>(open.size());
        std::size_t position = 0;
        for (mxml_node_t *child = mxmlGetFirstChild(step.node); child != nullptr;
             child = mxmlGetNextSibling(child)) {
            open.push_back({child, place, position++, step.depth + 1});
        }
        std::reverse(open.begin() + first, open.end());
    }
}

Plan::Place Plan::group(std::string_view name) const
{
    for (std::size_t at = 1; at < nodes.size(); ++at) {
        const std::string *own = contents[at].attribute("name");
        if (contents[at].element == "CmdGroup" && own != nullptr && *own == name) {
            return at;
        }
    }
    return std::nullopt;
}

Plan::Place Plan::item(std::size_t group, std::string_view name) const
{
    for (std::size_t at = group + 1; at < nodes.size(); ++at) {
        const std::string *own = contents[at].attribute("name");
        if (contents[at].element == "Cmd" && own != nullptr && *own == name) {
            return at;
        }
    }
    return std::nullopt;
}

Plan::Place Plan::item_by_index(std::size_t group, int index) const
{
    for (std::size_t at = group + 1; at < nodes.size(); ++at) {
        if (contents[at].element == "Cmd") {
            const auto siblings = children(parents[at]);
            const auto wanted = static_cast<long>(positions[at]) + index;
            if (index < 0 || wanted >= static_cast<long>(siblings.size())) {
                return std::nullopt;
            }
            return siblings[static_cast<std::size_t>(wanted)];
        }
    }
    return std::nullopt;
}

std::vector<std::size_t> Plan::children(std::size_t place) const
{
    std::vector<std::size_t> found;
    for (std::size_t at = place + 1;
         at < nodes.size() && contents[at].depth > contents[place].depth; ++at) {
        if (parents[at] == place) {
            found.push_back(at);
        }
    }
    return found;
}

bool Plan::is_plain(std::size_t group) const
{
    const auto items = children(group);
    return std::all_of(items.begin(), items.end(), [&](std::size_t at) {
        const std::string *name = contents[at].attribute("name");
        return contents[at].element == "Cmd" && name != nullptr && item(group, *name) == at;
    });
}
