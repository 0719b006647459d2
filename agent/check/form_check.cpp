// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/document_checks.h"
#include "check/wellformed.h"
#include "plan/markup.h"
#include "util/text.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <expat.h>
#include <string_view>
#include <strings.h>
#include <vector>

namespace fptest
{

namespace
{

constexpr std::size_t kShownWhy = 160; // columns

bool is_name(std::string_view name)
{
    const auto first = static_cast<unsigned char>(name.front());
    return (std::isalpha(first) != 0 || first == '_' || first >= 0x80) &&
           std::ranges::all_of(name, [](unsigned char c) {
               return std::isalnum(c) != 0 || c == '_' || c == '-' || c == '.' || c >= 0x80;
           });
}

// The name of the innermost element that is open there; empty if none is.
std::string open_at(const std::vector<Tag> &tags, std::size_t offset)
{
    std::vector<const std::string *> open;
    for (const Tag &tag : tags) {
        if (tag.end > offset || !tag.complete) {
            break;
        }
        if (tag.kind == Tag::Kind::open) {
            open.push_back(&tag.name);
        } else if (tag.kind == Tag::Kind::close && !open.empty()) {
            open.pop_back();
        }
    }
    return open.empty() ? "" : ellipsize(one_line(*open.back()), kShownName);
}

class FormChecker
{
  public:
    FormChecker(const CheckedPlan &checked, Findings &findings)
        : checked_(checked), text_(checked.text), tags_(checked.tags), findings_(findings)
    {
    }

    void check()
    {
        give_values();
        if (const std::optional<Flaw> flaw = find_flaw(repaired_)) {
            report_values(original(flaw->offset));
            report(*flaw);
            return;
        }
        report_values(text_.size());
        report_encoding();
        report_look_alikes();
        report_cut_declaration();
        const bool endless = report_endless_comments();
        std::optional<Loaded> repaired;
        if (!given_.empty()) {
            repaired.emplace(repaired_);
        }
        const Loaded &loaded = repaired ? *repaired : checked_.whole();
        if (loaded.plan) {
            check_plan(checked_, *loaded.plan, findings_);
        } else if (!endless) {
            report_refusal(loaded.why);
        }
    }

  private:
    // The other checks need a value for every attribute.
    void give_values()
    {
        std::size_t done = 0;
        for (const Tag &tag : tags_) {
            for (const Attribute &attribute : tag.attributes) {
                if (!attribute.has_value && is_name(attribute.name)) {
                    repaired_.append(text_, done, attribute.end - done);
                    done = attribute.end;
                    repaired_ += kValue;
                    given_.push_back(&attribute);
                }
            }
        }
        repaired_.append(text_, done);
    }

    // The offset in the original text.
    [[nodiscard]] std::size_t original(std::size_t offset) const
    {
        for (const Attribute *attribute : given_) {
            if (offset <= attribute->end) {
                break;
            }
            offset -= std::min(kValue.size(), offset - attribute->end);
        }
        return offset;
    }

    void report_values(std::size_t up_to)
    {
        for (const Attribute *attribute : given_) {
            if (attribute->begin < up_to) {
                findings_.error(attribute->begin,
                                "attribute {} has no value: the library would not load the plan; "
                                "write {}=\"\" or leave it out",
                                quoted_name(attribute->name),
                                ellipsize(one_line(attribute->name), kShownName));
            }
        }
    }

    void report(const Flaw &flaw)
    {
        const std::size_t offset = place_of(flaw);
        if (flaw.error == XML_ERROR_ABORTED) {
            findings_.error(offset,
                            "an entity is declared here: the library would not {}; write its text "
                            "where it is used",
                            checked_.loaded.plan ? "know it" : "load the plan");
            return;
        }
        findings_.error(offset, "not well-formed, {}: the library would {}; {}",
                        reason(flaw.error, offset),
                        checked_.loaded.plan ? "load it all the same, and run what it took from it"
                                             : "not load it",
                        advice(flaw.error, offset));
    }

    // Where a person would look: for an entity the parser names its tag, and for a missing
    // end the end of the text.
    [[nodiscard]] std::size_t place_of(const Flaw &flaw) const
    {
        const std::size_t last = text_.find_last_not_of(" \t\r\n");
        const std::size_t offset = std::min(original(flaw.offset), last == kNone ? 0 : last + 1);
        if (flaw.error == XML_ERROR_UNDEFINED_ENTITY) {
            return undefined_entity(offset);
        }
        if (flaw.error == XML_ERROR_UNCLOSED_CDATA_SECTION && !tags_.empty()) {
            return tags_.back().begin;
        }
        return offset;
    }

    [[nodiscard]] std::size_t undefined_entity(std::size_t begin) const
    {
        constexpr std::array<std::string_view, 6> kKnown = {"&lt;",   "&gt;",   "&amp;",
                                                            "&quot;", "&apos;", "&#"};
        for (std::size_t at = text_.find('&', begin); at != kNone; at = text_.find('&', at + 1)) {
            const std::string_view entity = std::string_view(text_).substr(at);
            if (std::ranges::none_of(kKnown, [entity](std::string_view known) {
                    return entity.starts_with(known);
                })) {
                return at;
            }
        }
        return begin;
    }

    [[nodiscard]] std::string reason(XML_Error error, std::size_t offset) const
    {
        if (error == XML_ERROR_INVALID_TOKEN) {
            return "invalid token";
        }
        if (error == XML_ERROR_NO_ELEMENTS && !open_at(tags_, offset).empty()) {
            return "the text ends too early";
        }
        return XML_ErrorString(error);
    }

    [[nodiscard]] std::string advice(XML_Error error, std::size_t offset) const
    {
        const std::string open = open_at(tags_, offset);
        switch (error) {
        case XML_ERROR_TAG_MISMATCH:
            return fmt::format("close <{}> before", open);
        case XML_ERROR_NO_ELEMENTS:
            return open.empty() ? "write a plan" : fmt::format("close <{}>", open);
        case XML_ERROR_INVALID_TOKEN:
            return token_advice(offset);
        case XML_ERROR_UNCLOSED_TOKEN:
        case XML_ERROR_UNCLOSED_CDATA_SECTION:
            return "end what begins here";
        case XML_ERROR_PARTIAL_CHAR:
            return "complete the character";
        case XML_ERROR_DUPLICATE_ATTRIBUTE:
            return "keep one of the two";
        case XML_ERROR_JUNK_AFTER_DOC_ELEMENT:
            return "put everything into one element";
        case XML_ERROR_UNDEFINED_ENTITY:
            return "write &amp; for a '&'";
        case XML_ERROR_MISPLACED_XML_PI:
            return "begin the text with it";
        case XML_ERROR_BAD_CHAR_REF:
            return "leave it out";
        case XML_ERROR_UNKNOWN_ENCODING:
        case XML_ERROR_INCORRECT_ENCODING:
            return "declare UTF-8, or leave the declaration out";
        default:
            return "fix it here";
        }
    }

    [[nodiscard]] std::string token_advice(std::size_t offset) const
    {
        const auto byte = static_cast<unsigned char>(offset < text_.size() ? text_[offset] : ' ');
        if (offset > 0 && text_[offset - 1] == '&') {
            return "write &amp; for a '&'";
        }
        if (byte == '<') {
            return "write &lt; for a '<', or end the value that begins before it";
        }
        if (byte >= 0x80) {
            return first_not_utf8(text_) == kNone ? "write a plain character for this one"
                                                  : "save it as UTF-8";
        }
        if (std::iscntrl(byte) != 0 && std::isspace(byte) == 0) {
            return "leave the control character out";
        }
        return "fix it here";
    }

    // Mini-XML ignores the declaration and takes every text for UTF-8.
    void report_encoding()
    {
        const std::size_t offset = first_not_utf8(text_);
        // zero bytes are a finding of their own
        if (offset != kNone && text_.find('\0') == kNone) {
            findings_.error(offset, "not UTF-8: the library looks at no encoding declaration, and "
                                    "would read something else here; save it as UTF-8");
        }
        const std::string_view declared = declared_encoding(text_);
        if (offset == kNone && !declared.empty() &&
            strcasecmp(std::string(declared).c_str(), "UTF-8") != 0) {
            findings_.warning(static_cast<std::size_t>(declared.data() - text_.data()),
                              "the library looks at no encoding declaration, and saves reports in "
                              "UTF-8: other readers would misread them; declare UTF-8");
        }
    }

    // What web pages and word processors put in place of what a shell reads; each once.
    void report_look_alikes()
    {
        constexpr auto quote = "a typographic quote, is a letter to the shell; write ' or &quot;";
        constexpr auto dash = "a dash, begins no option; write -";
        constexpr std::array<std::array<const char *, 3>, 11> look_alikes{{
            {"\u2018", "2018", quote},
            {"\u2019", "2019", quote},
            {"\u201C", "201C", quote},
            {"\u201D", "201D", quote},
            {"\u201E", "201E", quote},
            {"\u2013", "2013", dash},
            {"\u2014", "2014", dash},
            {"\u00A0", "00A0", "a no-break space, separates no words; write a space"},
            {"\u202F", "202F", "a no-break space, separates no words; write a space"},
            {"\u200B", "200B", "which nobody sees, is a letter here; leave it out"},
            // Mini-XML takes it for a byte order mark anywhere
            {"\uFEFF", "FEFF",
             "a byte order mark, would be dropped; leave it out, or write &#xFEFF;"},
        }};
        for (const auto &[character, number, text] : look_alikes) {
            const std::size_t at = first_in_a_value(character);
            if (at != kNone) {
                findings_.warning(at, "U+{}, {}", number, text);
            }
        }
    }

    [[nodiscard]] std::size_t first_in_a_value(std::string_view character) const
    {
        for (const Tag &tag : tags_) {
            for (const Attribute &attribute : tag.attributes) {
                if (!attribute.has_value ||
                    (attribute.name != "name" && attribute.name != "args")) {
                    continue;
                }
                const std::size_t at =
                    std::string_view(text_)
                        .substr(attribute.value_begin, attribute.value_end - attribute.value_begin)
                        .find(character);
                if (at != std::string_view::npos) {
                    return attribute.value_begin + at;
                }
            }
        }
        return kNone;
    }

    // Mini-XML ends a declaration at its first '>', and takes the rest for text.
    void report_cut_declaration()
    {
        const Tag *declaration = nullptr;
        std::size_t depth = 0;
        for (const Tag &tag : tags_) {
            if (tag.kind == Tag::Kind::declaration && declaration == nullptr) {
                declaration = &tag;
            }
            if (declaration != nullptr && depth == 0 && tag.kind == Tag::Kind::text) {
                findings_.error(declaration->begin,
                                "the library would end this declaration at its first '>', and the "
                                "first report would leave a plan that is no XML; leave it out");
                return;
            }
            depth += tag.kind == Tag::Kind::open ? 1 : 0;
            depth -= tag.kind == Tag::Kind::close && depth > 0 ? 1 : 0;
        }
    }

    // Mini-XML looks for the end of a comment only after its first character.
    bool report_endless_comments()
    {
        constexpr std::string_view kEmpty = "<!---->";
        bool found = false;
        for (const Tag &tag : tags_) {
            if (tag.kind == Tag::Kind::comment &&
                text_.compare(tag.begin, kEmpty.size(), kEmpty) == 0) {
                findings_.error(tag.begin,
                                "an empty comment has no end for the library, which would take "
                                "what follows for a comment as well; write something into it");
                found = true;
            }
        }
        return found;
    }

    void report_refusal(std::string why)
    {
        while (why.ends_with('.')) {
            why.pop_back();
        }
        if (text_.find_first_of(" \t\r\n") == 0) {
            findings_.error(0, "the library would not load a text that begins with white space; "
                               "begin it with a '<'");
            return;
        }
        if (const std::size_t beside = beside_root(); beside != kNone) {
            findings_.error(beside,
                            "the library would not load a plan without a declaration that has "
                            "something beside its root element; begin it with {}",
                            kDeclaration);
            return;
        }
        findings_.error(undefined_entity(0),
                        "well-formed, but the library would not load it: {}; fix that",
                        ellipsize(one_line(why), kShownWhy));
    }

    // Something beside the root element that Mini-XML takes for a second root.
    [[nodiscard]] std::size_t beside_root() const
    {
        std::size_t depth = 0;
        for (const Tag &tag : tags_) {
            const bool element = tag.kind == Tag::Kind::open || tag.kind == Tag::Kind::empty;
            if (&tag == &tags_.front() && !element && tag.kind != Tag::Kind::comment) {
                return kNone; // all else is below it
            }
            if (depth == 0 && !element && tag.kind != Tag::Kind::text) {
                return tag.begin;
            }
            depth += tag.kind == Tag::Kind::open ? 1 : 0;
            depth -= tag.kind == Tag::Kind::close && depth > 0 ? 1 : 0;
        }
        return kNone;
    }

    static constexpr std::string_view kValue = "=\"\"";

    const CheckedPlan &checked_;
    const std::string &text_;
    const std::vector<Tag> &tags_;
    std::string repaired_;
    std::vector<const Attribute *> given_;
    Findings &findings_;
};

} // namespace

void check_form(const CheckedPlan &checked, Findings &findings)
{
    FormChecker(checked, findings).check();
}

} // namespace fptest
