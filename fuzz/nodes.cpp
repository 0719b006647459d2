// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "nodes.h"

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

Nodes::Nodes(mxml_node_t *tree)
{
    for (mxml_node_t *node = tree; node != nullptr; node = mxmlWalkNext(node, tree, MXML_DESCEND)) {
        std::size_t depth = 0;
        for (mxml_node_t *up = node; up != tree; up = mxmlGetParent(up)) {
            ++depth;
        }
        nodes.push_back(node);
        contents.push_back(content_of(node, depth));
    }
}

Nodes::Place Nodes::find(std::string_view element, std::string_view name, std::size_t after) const
{
    for (std::size_t at = after + 1; at < nodes.size(); ++at) {
        const std::string *own = contents[at].attribute("name");
        if (contents[at].element == element && own != nullptr && *own == name) {
            return at;
        }
    }
    return std::nullopt;
}
