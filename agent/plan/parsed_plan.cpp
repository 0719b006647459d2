// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "plan/parsed_plan.h"

#include "plan/plan_text.h"

#include <algorithm>
#include <cstddef>
#include <string_view>
#include <utility>

namespace fptest
{

ParsedPlan::ParsedPlan(std::string text) : text_(std::move(text))
{
    std::vector<Tag> tags;
    auto plan = Plan::parse_annotated(text_, &tags);
    if (!plan) {
        return;
    }
    plan_ = std::make_shared<Plan>(std::move(*plan));
    is_sound_ = !tags.empty() && is_xml(text_);
    for (const Tag &tag : tags) {
        begins_.push_back(tag.begin);
    }
}

// Nobody else may look at the tree that changes.
bool ParsedPlan::can_change() const
{
    return is_sound_ && plan_.use_count() == 1;
}

void ParsedPlan::read(const std::string &text)
{
    if (text != text_ && !(can_change() && read_change(text))) {
        *this = ParsedPlan(text);
    }
}

// False if more than the inside of one tag has changed.
bool ParsedPlan::read_change(const std::string &text)
{
    const std::size_t shorter = std::min(text.size(), text_.size());
    const auto same = [shorter](auto one, auto other) {
        return static_cast<std::size_t>(
            std::mismatch(one, one + static_cast<std::ptrdiff_t>(shorter), other).first - one);
    };
    const std::size_t before = same(text.begin(), text_.begin());
    const std::size_t after = std::min(same(text.rbegin(), text_.rbegin()), shorter - before);
    const auto next = std::ranges::upper_bound(begins_, before);
    if (next == begins_.begin()) {
        return false;
    }
    const auto number = static_cast<std::size_t>(next - begins_.begin()) - 1;
    const std::size_t begin = begins_[number];
    const std::size_t size =
        scan(std::string_view(text_).substr(begin, end_of_piece(number) - begin)).front().end;
    return text_.size() - after < begin + size &&
           put(number, size, text.substr(begin, size + text.size() - text_.size()));
}

// A few are changed in place.
std::optional<std::string> ParsedPlan::clear(const std::vector<std::size_t> &numbers,
                                             const std::string &mark)
{
    constexpr std::size_t kFew = 8;
    const std::string before = text_;
    if (!can_change() || numbers.size() > kFew ||
        !std::ranges::all_of(numbers, [&](std::size_t one) { return clear_one(one, mark); })) {
        auto cleared = without_reports(before, numbers, mark);
        if (!cleared) {
            return std::nullopt;
        }
        *this = ParsedPlan(std::move(*cleared));
    }
    return text_;
}

bool ParsedPlan::clear_one(std::size_t number, const std::string &mark)
{
    if (number >= begins_.size()) {
        return true;
    }
    const std::size_t begin = begins_[number];
    const std::string piece = text_.substr(begin, end_of_piece(number) - begin);
    const Tag tag = scan(piece).front();
    const std::string whole = piece.substr(0, tag.end);
    return put(number, whole.size(), without_reports_in(whole, {tag}, {0}, mark));
}

// Where the next element begins, or the text ends.
std::size_t ParsedPlan::end_of_piece(std::size_t number) const
{
    return number + 1 < begins_.size() ? begins_[number + 1] : text_.size();
}

// Puts a tag in the place of an element's, of this size. False, and nothing has changed, if
// that may mean more than other attributes, or Mini-XML may take it otherwise.
bool ParsedPlan::put(std::size_t number, std::size_t size, const std::string &tag)
{
    mxml_node_t *const node = plan_->elements()[number];
    const auto is_empty_tag = [](const std::vector<Tag> &tags, std::size_t of) {
        return tags.size() == 1 && tags.front().kind == Tag::Kind::empty && tags.front().end == of;
    };
    const auto old_tags = scan(std::string_view(text_).substr(begins_[number], size));
    const auto tags = scan(tag);
    const ParsedPlan alone(tag);
    if (!is_empty_tag(old_tags, size) || !is_empty_tag(tags, tag.size()) || !alone.is_sound_ ||
        alone.plan_->elements().size() != 1 || tags.front().name != mxmlGetElement(node) ||
        attribute(alone.plan_->top(), "name") != attribute(node, "name")) {
        return false;
    }
    const char *name = nullptr;
    while (mxmlElementGetAttrByIndex(node, 0, &name) != nullptr) {
        mxmlElementDeleteAttr(node, std::string(name).c_str());
    }
    for (int index = 0; index < mxmlElementGetAttrCount(alone.plan_->top()); ++index) {
        const char *value = mxmlElementGetAttrByIndex(alone.plan_->top(), index, &name);
        mxmlElementSetAttr(node, name, value);
    }
    text_.replace(begins_[number], size, tag);
    for (std::size_t later = number + 1; later < begins_.size(); ++later) {
        begins_[later] += tag.size() - size;
    }
    return true;
}

} // namespace fptest
