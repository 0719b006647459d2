// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "plan/plan.h"

#include "common/descriptor.h"
#include "util/files.h"
#include "util/text.h"
#include "util/write.h"

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <system_error>
#include <unistd.h>
#include <utility>

namespace fptest
{

namespace
{

// The components that the library sees in the path of this group or item. A name with a '/'
// is two of them, an empty one none.
std::vector<std::string> components(const std::string &names)
{
    std::string path = ("root/" + names).substr(0, kPathLimit);
    path.resize(std::min(path.find_first_of(std::string_view(":\t\n\0", 4)), path.size()));
    std::vector<std::string> parts;
    std::size_t at = path.find_first_not_of('/');
    while (at != path.npos) {
        const std::size_t end = std::min(path.find('/', at), path.size());
        parts.push_back(path.substr(at, std::min(end - at, kNameLimit)));
        at = path.find_first_not_of('/', end);
    }
    return parts;
}

// Catches Mini-XML's messages, which it would print otherwise.
class LibraryErrors
{
  public:
    LibraryErrors()
    {
        first().clear();
        mxmlSetErrorCallback([](const char *message) {
            if (first().empty()) {
                first() = message;
            }
        });
    }
    LibraryErrors(const LibraryErrors &) = delete;
    LibraryErrors &operator=(const LibraryErrors &) = delete;
    ~LibraryErrors()
    {
        mxmlSetErrorCallback(nullptr);
    }

    static std::string &first()
    {
        thread_local std::string message;
        return message;
    }
};

// Mini-XML's line number may be too high, as it counts line ends that it reads ahead.
std::string without_line(std::string message)
{
    constexpr std::string_view kLine = " on line ";
    if (const std::size_t begin = message.find(kLine); begin != message.npos) {
        const std::size_t end = message.find_first_not_of("0123456789", begin + kLine.size());
        message.erase(begin, std::min(end, message.size()) - begin);
    }
    return message;
}

// The library has Mini-XML read a file. From memory it ends some texts elsewhere, and reads
// beyond the end of those in UTF-16.
Descriptor descriptor_of(std::string_view text)
{
    Descriptor file = memory_file("fptest-plan");
    if (!file.is_open() || write_text(file.get(), text) < text.size() ||
        lseek(file.get(), 0, SEEK_SET) != 0) {
        throw std::system_error(errno, std::generic_category(), "no memory for a test plan");
    }
    return file;
}

bool is_element(mxml_node_t *node)
{
    return mxmlGetType(node) == MXML_ELEMENT;
}

bool is_lone_whitespace(mxml_node_t *node)
{
    if (mxmlGetType(node) != MXML_TEXT) {
        return false;
    }
    const char *text = mxmlGetText(node, nullptr);
    return text[std::strspn(text, kBlanks)] == '\0';
}

bool has_valueless(mxml_node_t *node, const char *name)
{
    const char *found = nullptr;
    for (int index = 0; index < mxmlElementGetAttrCount(node); ++index) {
        const char *value = mxmlElementGetAttrByIndex(node, index, &found);
        if (std::strcmp(found, name) == 0) {
            return value == nullptr;
        }
    }
    return false;
}

bool has_name(mxml_node_t *node)
{
    const char *name = mxmlElementGetAttr(node, "name");
    return name != nullptr && *name != '\0';
}

bool makes_element(const Tag &tag)
{
    return tag.kind != Tag::Kind::close && tag.kind != Tag::Kind::text;
}

// Whether the first element is closed.
bool is_whole(const std::vector<Tag> &tags)
{
    std::size_t depth = 0;
    for (const Tag &tag : tags) {
        depth += tag.kind == Tag::Kind::open ? 1 : 0;
        depth -= tag.kind == Tag::Kind::close && depth > 0 ? 1 : 0;
        if (depth == 0 && (tag.kind == Tag::Kind::close || tag.kind == Tag::Kind::empty)) {
            return tag.complete;
        }
    }
    return false;
}

bool belongs(const Tag &tag, mxml_node_t *node)
{
    const std::string_view name = mxmlGetElement(node);
    switch (tag.kind) {
    case Tag::Kind::comment:
        return name.starts_with("!--");
    case Tag::Kind::cdata:
        return name.starts_with("![CDATA[");
    case Tag::Kind::instruction:
        return name.starts_with('?');
    case Tag::Kind::declaration:
        return name.starts_with('!');
    default:
        return name == tag.name;
    }
}

} // namespace

std::optional<Plan> Plan::load_as_library(const std::string &text, std::string *why)
{
    const Descriptor file = descriptor_of(text);
    const LibraryErrors errors;
    Tree tree(mxmlLoadFd(nullptr, file.get(), nullptr), &mxmlDelete);
    if (!tree) {
        if (why != nullptr) {
            *why = !errors.first().empty() ? without_line(errors.first())
                   : text.empty()          ? "it is empty"
                                           : "a tag in it is broken off or malformed";
        }
        return std::nullopt;
    }
    return Plan(std::move(tree));
}

Plan::Plan(Tree tree) : tree_(std::move(tree))
{
    mxml_node_t *node = tree_.get();
    while (node != nullptr) {
        mxml_node_t *next = mxmlWalkNext(node, top(), MXML_DESCEND);
        if (is_lone_whitespace(node)) {
            mxmlDelete(node);
        } else if (is_element(node)) {
            elements_.push_back(node);
        }
        node = next;
    }
    note_names();
    note_positions();
}

// Mini-XML's own searches walk the tree: too slow for every item of a long plan.
void Plan::note_names()
{
    for (mxml_node_t *&place : elements_) {
        mxmlSetUserData(place, &place);
        const std::string_view tag = mxmlGetElement(place);
        const char *name = mxmlElementGetAttr(place, "name");
        if (place == top()) {
            continue; // every search begins below it
        }
        if (tag == "CmdGroup" && name != nullptr) {
            groups_.try_emplace(name, place);
        }
        if (tag == "Cmd") {
            items_.push_back(number(place));
            if (name != nullptr) {
                items_named_[name].push_back(items_.back());
            }
        }
    }
}

void Plan::note_positions()
{
    children_.resize(elements_.size());
    positions_.resize(elements_.size());
    for (std::size_t parent = 0; parent < elements_.size(); ++parent) {
        for (mxml_node_t *child = mxmlGetFirstChild(elements_[parent]); child != nullptr;
             child = mxmlGetNextSibling(child)) {
            if (is_element(child)) {
                positions_[number(child)] = children_[parent].size();
            }
            children_[parent].push_back(child);
        }
    }
}

std::optional<std::string> attribute(mxml_node_t *node, const char *name)
{
    const char *value = mxmlElementGetAttr(node, name);
    return value != nullptr ? std::optional<std::string>(value) : std::nullopt;
}

std::string as_loaded(const std::string &value)
{
    const std::unique_ptr<mxml_node_t, decltype(&mxmlDelete)> node(
        mxmlNewElement(MXML_NO_PARENT, "Cmd"), &mxmlDelete);
    mxmlElementSetAttr(node.get(), "name", value.c_str());
    const std::unique_ptr<char, decltype(&std::free)> saved(
        mxmlSaveAllocString(node.get(), MXML_NO_CALLBACK), &std::free);
    const auto plan = saved ? Plan::load_as_library(saved.get()) : std::nullopt;
    return plan ? attribute(plan->top(), "name").value_or("") : value;
}

std::optional<Plan> Plan::parse_annotated(std::string_view text, std::vector<Tag> *places)
{
    const std::string cleaned = sanitize_utf8(text);
    std::vector<Tag> tags = scan(cleaned);
    if (!is_whole(tags)) {
        return std::nullopt;
    }
    const std::string loaded = with_empty_values(cleaned, tags);
    std::optional<Plan> plan = load_as_library(loaded);
    if (!plan) {
        return std::nullopt;
    }
    tags = element_tags(*plan, std::move(tags));
    if (loaded == text) {
        if (places != nullptr) {
            *places = std::move(tags);
        }
        return plan;
    }
    // the library leaves these two without a value in its tree
    for (std::size_t number = 0; number < tags.size(); ++number) {
        for (const Attribute &place : tags[number].attributes) {
            if (!place.has_value && (place.name == "result" || place.name == "description")) {
                mxmlElementSetAttr(plan->elements_[number], place.name.c_str(), nullptr);
            }
        }
    }
    return plan;
}

std::size_t Plan::number(mxml_node_t *node) const
{
    const auto *place = static_cast<mxml_node_t **>(mxmlGetUserData(node));
    return static_cast<std::size_t>(place - elements_.data());
}

ItemReport Plan::report(std::size_t number) const
{
    ItemReport report;
    if (number < elements_.size()) {
        mxml_node_t *const node = elements_[number];
        report.progress = attribute(node, "progress");
        report.result = attribute(node, "result");
        report.result_without_value = has_valueless(node, "result");
        report.description = attribute(node, "description");
    }
    return report;
}

Plan::Element Plan::element(mxml_node_t *node) const
{
    Element element;
    element.tag = mxmlGetElement(node);
    element.name = attribute(node, "name");
    element.args = attribute(node, "args");
    element.number = number(node);
    element.report = report(element.number);
    return element;
}

std::vector<Plan::Group> Plan::groups() const
{
    std::vector<Group> groups;
    for (mxml_node_t *node = top(); node != nullptr;) {
        node = mxmlFindElement(node, top(), "CmdGroup", "name", nullptr, MXML_DESCEND);
        if (node == nullptr || !has_name(node)) {
            continue;
        }
        Group group;
        group.name = mxmlElementGetAttr(node, "name");
        group.number = number(node);
        for (mxml_node_t *child = mxmlGetFirstChild(node); child != nullptr;
             child = mxmlGetNextSibling(child)) {
            if (is_element(child) && has_name(child) &&
                std::strcmp(mxmlGetElement(child), "Cmd") == 0) {
                group.items.push_back(element(child));
            }
        }
        groups.push_back(std::move(group));
    }
    return groups;
}

mxml_node_t *Plan::find_group(const std::string &group) const
{
    const auto found = groups_.find(group);
    return found != groups_.end() ? found->second : nullptr;
}

mxml_node_t *Plan::after(mxml_node_t *group, const Numbers &items) const
{
    const auto found = std::upper_bound(items.begin(), items.end(), number(group));
    return found != items.end() ? elements_[*found] : nullptr;
}

std::vector<std::optional<Plan::Element>> Plan::resolve(const std::string &group) const
{
    const std::vector<std::string> path = components(group);
    if (path.size() > 2) {
        return {resolve_item(path[1], path[2])};
    }
    return path.size() == 2 ? resolve_group(path[1]) : std::vector<std::optional<Element>>();
}

std::optional<Plan::Element> Plan::resolve(const std::string &group, const std::string &item) const
{
    const std::vector<std::string> path = components(group + "/" + item);
    return path.size() > 2 ? resolve_item(path[1], path[2]) : std::nullopt;
}

std::vector<std::optional<Plan::Element>> Plan::resolve_group(const std::string &name) const
{
    std::vector<std::optional<Element>> run;
    mxml_node_t *const group = find_group(name);
    if (group == nullptr) {
        return run;
    }
    mxml_node_t *item = after(group, items_); // which may belong to a later group
    for (mxml_node_t *child = mxmlGetFirstChild(group); child != nullptr;
         child = mxmlGetNextSibling(child)) {
        run.push_back(item != nullptr && has_name(item) ? std::optional(element(item))
                                                        : std::nullopt);
        item = mxmlGetNextSibling(item);
    }
    return run;
}

std::optional<Plan::Element> Plan::resolve_item(const std::string &group,
                                                const std::string &name) const
{
    mxml_node_t *const start = find_group(group);
    const auto places = items_named_.find(name);
    if (start == nullptr || places == items_named_.end()) {
        return std::nullopt;
    }
    mxml_node_t *const named = after(start, places->second);
    if (named == nullptr) {
        return std::nullopt;
    }
    // the library's rule: from the first item, as many siblings on as the named item has
    // siblings before it
    mxml_node_t *const first = after(start, items_);
    const auto &siblings = children_[number(mxmlGetParent(first))];
    const std::size_t position = positions_[number(first)] + positions_[number(named)];
    return position < siblings.size() && has_name(siblings[position])
               ? std::optional(element(siblings[position]))
               : std::nullopt;
}

mxml_node_t *Plan::root() const
{
    const auto found = std::ranges::find_if(elements_, [](mxml_node_t *node) {
        const std::string_view tag = mxmlGetElement(node);
        return !tag.starts_with('?') && !tag.starts_with('!');
    });
    return found != elements_.end() ? *found : nullptr;
}

std::vector<std::string> group_names(const Plan &plan)
{
    std::vector<std::string> names;
    for (const Plan::Group &group : plan.groups()) {
        if (std::ranges::find(names, group.name) == names.end()) {
            names.push_back(group.name);
        }
    }
    return names;
}

std::vector<std::string> item_names(const Plan &plan, const std::string &group)
{
    std::vector<std::string> names;
    const auto groups = plan.groups();
    const auto found = std::ranges::find(groups, group, &Plan::Group::name);
    if (found != groups.end()) {
        for (const Plan::Element &item : found->items) {
            names.push_back(item.name.value_or(""));
        }
    }
    return names;
}

std::vector<Tag> element_tags(const Plan &plan, std::vector<Tag> tags)
{
    std::erase_if(tags, [](const Tag &tag) { return !makes_element(tag); });
    const auto &elements = plan.elements();
    return std::equal(tags.begin(), tags.end(), elements.begin(), elements.end(), belongs)
               ? tags
               : std::vector<Tag>();
}

} // namespace fptest
