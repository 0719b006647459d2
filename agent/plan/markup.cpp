// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "plan/markup.h"

#include <algorithm>
#include <charconv>
#include <utf8.h>

namespace fptest
{

namespace
{

constexpr std::string_view kXmlBlanks = " \t\r\n";

bool is_blank(char c)
{
    return kXmlBlanks.find(c) != std::string_view::npos;
}

// Tags end where Mini-XML ends them, so that they match its elements: a declaration at its
// first '>', an empty comment not at its own end.
class Scanner
{
  public:
    explicit Scanner(std::string_view text) : text_(text)
    {
    }

    std::vector<Tag> scan()
    {
        skip_blanks();
        while (!at_end()) {
            tag_ = Tag{};
            tag_.begin = at_;
            if (text_[at_] == '<') {
                read_markup();
                tag_.end = at_;
            } else {
                read_text();
            }
            tags_.push_back(std::move(tag_));
            skip_blanks();
        }
        return std::move(tags_);
    }

  private:
    [[nodiscard]] bool at_end() const
    {
        return at_ >= text_.size();
    }
    [[nodiscard]] bool looking_at(std::string_view what) const
    {
        return text_.compare(at_, what.size(), what) == 0;
    }
    [[nodiscard]] bool looking_at_any(std::string_view characters) const
    {
        return !at_end() && characters.find(text_[at_]) != std::string_view::npos;
    }

    void skip_blanks()
    {
        at_ = std::min(text_.find_first_not_of(kXmlBlanks, at_), text_.size());
    }

    // Skips to the first of these characters, and returns what was skipped.
    std::string read_until_any(std::string_view characters)
    {
        const std::size_t begin = at_;
        at_ = std::min(text_.find_first_of(characters, at_), text_.size());
        return std::string(text_.substr(begin, at_ - begin));
    }

    void end_after(std::string_view mark, std::size_t from)
    {
        const std::size_t place = text_.find(mark, from);
        tag_.complete = place != text_.npos;
        at_ = tag_.complete ? place + mark.size() : text_.size();
    }

    void read_text()
    {
        tag_.kind = Tag::Kind::text;
        at_ = std::min(text_.find('<', at_), text_.size());
        tag_.end = at_;
        while (is_blank(text_[tag_.end - 1])) {
            --tag_.end;
        }
    }

    void read_markup()
    {
        if (looking_at("<!--")) {
            tag_.kind = Tag::Kind::comment;
            read_comment();
        } else if (looking_at("<![CDATA[")) {
            tag_.kind = Tag::Kind::cdata;
            end_after("]]>", at_ + 9);
        } else if (looking_at("<!")) {
            tag_.kind = Tag::Kind::declaration;
            end_after(">", at_ + 2);
        } else if (looking_at("<?")) {
            read_instruction();
        } else if (looking_at("</")) {
            tag_.kind = Tag::Kind::close;
            at_ += 2;
            tag_.name = read_until_any(" \t\r\n/><");
            end_after(">", at_);
        } else {
            read_element();
        }
    }

    void read_comment()
    {
        std::size_t end = text_.find("-->", at_ + 4);
        while (end != text_.npos && text_[end - 1] == '-') {
            end = text_.find("-->", end + 1);
        }
        tag_.complete = end != text_.npos;
        at_ = tag_.complete ? end + 3 : text_.size();
    }

    void read_instruction()
    {
        tag_.kind = Tag::Kind::instruction;
        const std::size_t begin = at_;
        at_ += 2;
        tag_.name = read_until_any(" \t\r\n?>");
        end_after("?>", begin + 1);
    }

    void read_element()
    {
        tag_.kind = Tag::Kind::open;
        ++at_;
        tag_.name = read_until_any(" \t\r\n/><");
        for (;;) {
            skip_blanks();
            if (at_end() || looking_at("<")) {
                tag_.complete = false;
                return;
            }
            if (looking_at(">")) {
                ++at_;
                return;
            }
            if (looking_at("/>") || looking_at("?>")) {
                tag_.kind = Tag::Kind::empty;
                at_ += 2;
                return;
            }
            if (looking_at_any("/?")) {
                ++at_;
            } else {
                read_attribute();
            }
        }
    }

    void read_attribute()
    {
        Attribute attribute;
        attribute.begin = at_;
        if (looking_at_any("\"'")) {
            const std::size_t close = text_.find(text_[at_], at_ + 1);
            at_ = close != text_.npos ? close + 1 : text_.size();
        } else {
            // at least one character, or the scanner would stand still
            at_ = std::min(text_.find_first_of(" \t\r\n=/>?", at_ + 1), text_.size());
        }
        attribute.name = text_.substr(attribute.begin, at_ - attribute.begin);
        attribute.end = at_;
        skip_blanks();
        if (looking_at("=")) {
            ++at_;
            skip_blanks();
            read_value(attribute);
        }
        tag_.attributes.push_back(std::move(attribute));
    }

    void read_value(Attribute &attribute)
    {
        attribute.has_value = true;
        if (looking_at_any("\"'")) {
            attribute.value_begin = at_ + 1;
            const std::size_t close = text_.find(text_[at_], at_ + 1);
            attribute.value_end = std::min(close, text_.size());
            at_ = close != text_.npos ? close + 1 : text_.size();
        } else {
            attribute.value_begin = at_;
            at_ = std::min(text_.find_first_of(" \t\r\n=/>", at_ + 1), text_.size());
            attribute.value_end = at_;
        }
        attribute.end = at_;
    }

    std::string_view text_;
    std::size_t at_ = 0;
    Tag tag_;
    std::vector<Tag> tags_;
};

// Bytes of the text's first character; 1 if it is not UTF-8.
std::size_t character_length(std::string_view text)
{
    text = text.substr(0, 4);
    const char *next = text.data();
    if (utf8::find_invalid(text.begin(), text.end()) == text.begin()) {
        return 1;
    }
    utf8::unchecked::next(next);
    return static_cast<std::size_t>(next - text.data());
}

// Bytes of UTF-8 that an entity ("&...;") stands for.
std::size_t entity_length(std::string_view entity)
{
    if (!entity.starts_with("&#")) {
        return 1;
    }
    const bool is_hexadecimal = entity.starts_with("&#x");
    unsigned long code = 0;
    std::from_chars(entity.data() + (is_hexadecimal ? 3 : 2), entity.data() + entity.size() - 1,
                    code, is_hexadecimal ? 16 : 10);
    return code < 0x80 ? 1 : code < 0x800 ? 2 : code < 0x10000 ? 3 : 4;
}

} // namespace

std::vector<Tag> scan(std::string_view text)
{
    return Scanner(text).scan();
}

std::size_t place_in_value(std::string_view text, const Attribute &attribute, std::size_t byte)
{
    std::size_t at = attribute.value_begin;
    while (at < attribute.value_end) {
        const std::string_view left = text.substr(at, attribute.value_end - at);
        std::size_t taken = 1;
        std::size_t read = 1;
        if (left.starts_with(kByteOrderMark)) { // Mini-XML drops it anywhere
            taken = kByteOrderMark.size();
            read = 0;
        } else if (left.starts_with('&') && left.find(';') != left.npos) {
            taken = left.find(';') + 1;
            read = entity_length(left.substr(0, taken));
        }
        if (byte < read) {
            break;
        }
        byte -= read;
        at += taken;
    }
    return at;
}

Positions::Positions(std::string_view text) : text_(text)
{
    last_.begin = text.starts_with(kByteOrderMark) ? kByteOrderMark.size() : 0;
}

Position Positions::of(std::size_t offset)
{
    offset = std::min(offset, text_.size());
    if (offset < last_.begin) {
        *this = Positions(text_);
    }
    while (last_.begin < offset) {
        const std::size_t end = last_.begin + character_length(text_.substr(last_.begin));
        if (end > offset) {
            break;
        }
        const bool is_line_end = text_[last_.begin] == '\n';
        last_.line += is_line_end ? 1 : 0;
        last_.column = is_line_end ? 1 : last_.column + 1;
        last_.begin = end;
    }
    return last_;
}

std::string with_empty_values(std::string_view text, const std::vector<Tag> &tags)
{
    std::string repaired;
    std::size_t done = 0;
    for (const Tag &tag : tags) {
        for (const Attribute &place : tag.attributes) {
            if (!place.has_value) {
                repaired += text.substr(done, place.end - done);
                repaired += "=\"\"";
                done = place.end;
            }
        }
    }
    return repaired += text.substr(done);
}

} // namespace fptest
