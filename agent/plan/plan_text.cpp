// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "plan/plan_text.h"

#include "util/sha256.h"
#include "util/text.h"

#include <algorithm>
#include <string_view>

namespace fptest
{
namespace
{

// Copies a text. An attribute that is erased goes with the blanks in front of it.
class AttributeEditor
{
  public:
    explicit AttributeEditor(const std::string &text) : text_(text)
    {
    }
    void erase(const Attribute &place)
    {
        const std::size_t end = text_.find_last_not_of(kBlanks, place.begin - 1) + 1;
        left_.append(text_, done_, end - done_);
        done_ = place.end;
    }
    void insert(std::size_t place, const std::string &text)
    {
        left_.append(text_, done_, place - done_);
        left_ += text;
        done_ = place;
    }
    std::string rest()
    {
        return left_.append(text_, done_);
    }

  private:
    const std::string &text_;
    std::string left_;
    std::size_t done_ = 0;
};

// The tags of the text's elements; nullopt if it is not whole.
std::optional<std::vector<Tag>> whole_tags(const std::string &text)
{
    const std::optional<Plan> plan = Plan::parse_annotated(text);
    return plan ? std::optional(element_tags(*plan, scan(text))) : std::nullopt;
}

} // namespace

std::string without_reports_in(const std::string &text, const std::vector<Tag> &tags,
                               const std::vector<std::size_t> &numbers, const std::string &mark)
{
    AttributeEditor editor(text);
    for (std::size_t number = 0; number < tags.size(); ++number) {
        const Tag &tag = tags[number];
        if (tag.kind > Tag::Kind::empty || std::ranges::find(numbers, number) == numbers.end()) {
            continue;
        }
        editor.insert(tag.begin + 1 + tag.name.size(),
                      std::string(" ") + kMark + "=\"" + mark + "\"");
        for (const Attribute &place : tag.attributes) {
            if (place.name == "progress" || place.name == "result" || place.name == "description" ||
                place.name == kMark) {
                editor.erase(place);
            }
        }
    }
    return editor.rest();
}

std::optional<std::string> without_reports(const std::string &text,
                                           const std::vector<std::size_t> &numbers,
                                           const std::string &mark)
{
    const auto tags = whole_tags(text);
    return tags ? std::optional(without_reports_in(text, *tags, numbers, mark)) : std::nullopt;
}

bool is_xml(const std::string &text)
{
    return first_not_utf8(text) == text.npos && text.find("\xEF\xBF\xBE") == text.npos &&
           text.find("\xEF\xBF\xBF") == text.npos;
}

std::optional<std::string> made_loadable(const std::string &text)
{
    if ((is_xml(text) && Plan::load_as_library(text)) || !Plan::parse_annotated(text)) {
        return std::nullopt;
    }
    const std::string cleaned = sanitize_xml(text);
    return with_empty_values(cleaned, scan(cleaned));
}

bool has_marks(const std::string &text)
{
    return without_marks(text).value_or(text) != text;
}

bool is_same_plan(const std::string &one, const std::string &other)
{
    const auto parsed = Plan::parse_annotated(one);
    const auto parsed_other = Plan::parse_annotated(other);
    const auto is_same_element = [](mxml_node_t *node, mxml_node_t *other_node) {
        return std::string_view(mxmlGetElement(node)) == mxmlGetElement(other_node) &&
               attribute(node, "name") == attribute(other_node, "name") &&
               attribute(node, "args") == attribute(other_node, "args");
    };
    return parsed && parsed_other &&
           std::ranges::equal(parsed->elements(), parsed_other->elements(), is_same_element);
}

std::string digest_of(const Plan &plan)
{
    // Mini-XML has elements for these as well
    const auto is_comment_or_declaration = [](mxml_node_t *node) {
        const char first = *mxmlGetElement(node);
        return first == '!' || first == '?';
    };
    std::string text; // a zero byte ends each part, as no name or value has one
    for (mxml_node_t *node : plan.elements()) {
        if (is_comment_or_declaration(node)) {
            continue;
        }
        for (mxml_node_t *above = mxmlGetParent(node); above != nullptr;
             above = mxmlGetParent(above)) {
            text += is_comment_or_declaration(above) ? "" : "/";
        }
        text.append(mxmlGetElement(node)) += '\0';
        for (const char *name : {"name", "args"}) {
            if (const auto value = attribute(node, name)) {
                text.append(name).append("=").append(*value);
            }
            text += '\0';
        }
    }
    return sha256(text);
}

std::optional<std::string> without_marks(const std::string &text)
{
    const auto tags = whole_tags(text);
    if (!tags) {
        return std::nullopt;
    }
    AttributeEditor editor(text);
    for (const Tag &tag : *tags) {
        for (const Attribute &place : tag.attributes) {
            if (place.name == kMark) {
                editor.erase(place);
            }
        }
    }
    return editor.rest();
}

} // namespace fptest
