// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/check.h"

#include "check/findings.h"
#include "check/shell_check.h"
#include "plan/markup.h"
#include "plan/plan.h"
#include "util/text.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <cstring>
#include <expat.h>
#include <memory>
#include <new>
#include <optional>
#include <string_view>
#include <strings.h>
#include <type_traits>
#include <unordered_map>
#include <unordered_set>
#include <utility>

namespace fptest
{

namespace
{

constexpr std::size_t kNone = std::string::npos;
constexpr std::size_t kShownName = 63; // columns
constexpr std::size_t kShownPath = 80;
constexpr std::size_t kShownEffects = 3;
constexpr std::size_t kShownKinds = 5;
constexpr std::array kVendors = {0, 1, 2};
constexpr char kDeclaration[] = "<?xml version=\"1.0\"?>";

// --- words ------------------------------------------------------------------------

std::string path_of(const std::string &group)
{
    return "'" + cut(one_line("root/" + group), kShownPath) + "'";
}

std::string path_of(const std::string &group, const std::string &item)
{
    return path_of(group + "/" + item);
}

using Run = std::vector<std::optional<Plan::Element>>;

// What was run, by name.
std::string names_of(const Run &run)
{
    std::string first;
    std::size_t count = 0;
    for (const auto &element : run) {
        if (element && ++count == 1) {
            first = in_quotes(element->name.value());
        }
    }
    return count == 0   ? "nothing"
           : count == 1 ? first
                        : first + " and " + std::to_string(count - 1) + " more";
}

// --- well-formedness ----------------------------------------------------------------

// Where a text ceases to be XML, and why.
struct Flaw {
    std::size_t offset = 0;
    XML_Error error = XML_ERROR_NONE;
};

// Entities in entities can go deeper than a stack, and the library knows none: the
// declaration of one ends the parse.
void XMLCALL stop_at_entity(void *parser, const XML_Char *, int, const XML_Char *, int,
                            const XML_Char *, const XML_Char *, const XML_Char *, const XML_Char *)
{
    XML_StopParser(static_cast<XML_Parser>(parser), XML_FALSE);
}

std::optional<Flaw> find_flaw(std::string_view text)
{
    constexpr std::size_t kPiece = 1U << 30U; // the parser counts in int
    const std::unique_ptr<std::remove_pointer_t<XML_Parser>, decltype(&XML_ParserFree)> parser(
        XML_ParserCreate(nullptr), &XML_ParserFree);
    if (!parser) {
        throw std::bad_alloc();
    }
    XML_UseParserAsHandlerArg(parser.get());
    XML_SetEntityDeclHandler(parser.get(), stop_at_entity);
    const std::size_t size = text.size();
    bool last = false;
    while (!last) {
        const std::string_view piece = text.substr(0, kPiece);
        text.remove_prefix(piece.size());
        last = text.empty();
        if (XML_Parse(parser.get(), piece.data(), static_cast<int>(piece.size()), last ? 1 : 0) !=
            XML_STATUS_OK) {
            const XML_Index index = XML_GetCurrentByteIndex(parser.get());
            return Flaw{index < 0 ? 0 : std::min(static_cast<std::size_t>(index), size),
                        XML_GetErrorCode(parser.get())};
        }
    }
    return std::nullopt;
}

// --- what a command stores --------------------------------------------------------

class SizeChecker
{
  public:
    SizeChecker(const std::string &text, Findings &findings)
        : stored_(stored_part(text)), command_(text.substr(0, text.find('\0'))), findings_(findings)
    {
        const std::size_t begin = std::min(command_.find_first_not_of(':'), command_.size());
        colon_ = command_.find(':', begin);
        // in UTF-8 it is no XML either, which is said elsewhere
        zero_ = command_.size() < text.size() && !find_flaw(text);
    }

    void check()
    {
        if (colon_ != kNone) {
            check_colons();
        }
        // blanks may be cut
        if (command_.find_first_not_of(" \t\r\n", kPlanLimit) != command_.npos) {
            check_length();
        }
        if (zero_ && colon_ == kNone && command_.size() <= kPlanLimit) {
            findings_.error(command_.size(),
                            "a command takes a plan up to its first zero byte, so " +
                                amount(stored_.size(), "byte") + " would be stored" + fate("them") +
                                "; save it as UTF-8");
        }
    }

  private:
    [[nodiscard]] std::string fate(const std::string &what) const
    {
        return std::string(", and the library would ") +
               (Plan::load(stored_) ? "load " + what + " without the rest" : "not load " + what);
    }

    // Whether a character reference may stand there: not in comments and the like.
    [[nodiscard]] bool takes_references(std::size_t offset) const
    {
        const auto holds = [offset](const Attribute &attribute) {
            return offset >= attribute.value_begin && offset < attribute.value_end;
        };
        const std::vector<Tag> tags = scan(command_);
        const auto tag =
            std::ranges::find_if(tags, [offset](const Tag &one) { return offset < one.end; });
        return tag != tags.end() &&
               (tag->kind == Tag::Kind::text || std::ranges::any_of(tag->attributes, holds));
    }

    void check_colons()
    {
        const auto more = std::count(command_.begin() + static_cast<std::ptrdiff_t>(colon_),
                                     command_.end(), ':') -
                          1;
        std::string text = "a command takes a plan up to its first ':', ";
        if (colon_ < kPlanLimit) {
            text += "so " + std::to_string(stored_.size()) + " of " +
                    amount(command_.size(), "byte") + " would be stored" + fate("them");
        } else {
            text +=
                "which is after the " + std::to_string(kPlanLimit) + " bytes that it takes anyway";
        }
        text += takes_references(colon_) ? "; write &#58; in its place" : "; leave it out";
        if (more > 0) {
            text += ", and the " + std::to_string(more) + " after it";
        }
        findings_.error(colon_, text);
    }

    void check_length()
    {
        findings_.error(
            kPlanLimit,
            std::to_string(command_.size()) + " bytes are " +
                std::to_string(command_.size() - kPlanLimit) + " more than the " +
                std::to_string(kPlanLimit) + " that a command stores: the plan would be cut here" +
                (colon_ < kPlanLimit ? ", were it not cut at a ':' before" : fate("it")) +
                "; shorten it, or have fptest run --plan place it as a file");
    }

    std::string stored_;
    std::string command_;
    Findings &findings_;
    std::size_t colon_;
    bool zero_;
};

// --- form ---------------------------------------------------------------------------

bool is_name(std::string_view name)
{
    const auto first = static_cast<unsigned char>(name.front());
    return (std::isalpha(first) != 0 || first == '_' || first >= 0x80) &&
           std::ranges::all_of(name, [](unsigned char c) {
               return std::isalnum(c) != 0 || c == '_' || c == '-' || c == '.' || c >= 0x80;
           });
}

// The name of the innermost element that is open there; empty where none is.
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
    return open.empty() ? "" : cut(one_line(*open.back()), kShownName);
}

// Loads the text, after saying what of its form is wrong.
class FormChecker
{
  public:
    // stored: what of the text the library would get.
    FormChecker(const std::string &text, const std::string &stored, Findings &findings)
        : text_(text), stored_(stored), tags_(scan(text)), findings_(findings)
    {
    }

    // Nothing where there is no use in looking at what the plan says.
    std::optional<Plan> check()
    {
        give_values();
        if (const std::optional<Flaw> flaw = find_flaw(repaired_)) {
            report_values(original(flaw->offset));
            report(*flaw);
            return std::nullopt;
        }
        report_values(text_.size());
        report_encoding();
        const bool endless = report_endless_comments();
        std::string why;
        std::optional<Plan> plan = Plan::load(repaired_, &why);
        if (!plan && !endless) {
            report_refusal(why);
        }
        return plan;
    }

  private:
    // The rest can be looked at only once every attribute has a value.
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

    // The place in the text itself.
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
                                "attribute " + in_quotes(attribute->name) +
                                    " has no value: the library would not load the plan; write " +
                                    cut(one_line(attribute->name), kShownName) +
                                    "=\"\" or leave it out");
            }
        }
    }

    void report(const Flaw &flaw)
    {
        const std::size_t offset = place_of(flaw);
        if (flaw.error == XML_ERROR_ABORTED) {
            findings_.error(offset,
                            std::string("an entity is declared here: the library would not ") +
                                (Plan::load(stored_) ? "know it" : "load the plan") +
                                "; write its text where it is used");
            return;
        }
        findings_.error(offset, "not well-formed, " + reason(flaw.error, offset) +
                                    ": the library would " +
                                    (Plan::load(stored_) ? "load it all the same, and run what it "
                                                           "took from it"
                                                         : "not load it") +
                                    advice(flaw.error, offset));
    }

    // Where a person looks for it: the parser names the tag for an entity in it,
    // and the end of the text for what lacks its own.
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
            return "; close <" + open + "> before";
        case XML_ERROR_NO_ELEMENTS:
            return open.empty() ? "; write a plan" : "; close <" + open + ">";
        case XML_ERROR_INVALID_TOKEN:
            return token_advice(offset);
        case XML_ERROR_UNCLOSED_TOKEN:
        case XML_ERROR_UNCLOSED_CDATA_SECTION:
            return "; end what begins here";
        case XML_ERROR_PARTIAL_CHAR:
            return "; complete the character";
        case XML_ERROR_DUPLICATE_ATTRIBUTE:
            return "; keep one of the two";
        case XML_ERROR_JUNK_AFTER_DOC_ELEMENT:
            return "; put everything into one element";
        case XML_ERROR_UNDEFINED_ENTITY:
            return "; write &amp; for a '&'";
        case XML_ERROR_MISPLACED_XML_PI:
            return "; begin the text with it";
        case XML_ERROR_BAD_CHAR_REF:
            return "; leave it out";
        case XML_ERROR_UNKNOWN_ENCODING:
        case XML_ERROR_INCORRECT_ENCODING:
            return "; declare UTF-8, or leave the declaration out";
        default:
            return "; fix it here";
        }
    }

    [[nodiscard]] std::string token_advice(std::size_t offset) const
    {
        const auto byte = static_cast<unsigned char>(offset < text_.size() ? text_[offset] : ' ');
        if (offset > 0 && text_[offset - 1] == '&') {
            return "; write &amp; for a '&'";
        }
        if (byte == '<') {
            return "; write &lt; for a '<'";
        }
        if (byte >= 0x80) {
            return "; save it as UTF-8";
        }
        if (std::iscntrl(byte) != 0 && std::isspace(byte) == 0) {
            return "; leave the control character out";
        }
        return "; fix it here";
    }

    // Mini-XML ignores the declaration: it takes every text for UTF-8.
    void report_encoding()
    {
        const std::size_t offset = first_not_utf8(text_);
        // zero bytes are another finding
        if (offset != kNone && text_.find('\0') == kNone) {
            findings_.error(offset, "not UTF-8: the library looks at no encoding declaration, and "
                                    "would read something else here; save it as UTF-8");
        }
    }

    // Mini-XML sees the end of a comment only after something in it.
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
            findings_.error(beside, std::string("the library would not load a plan without a "
                                                "declaration that has something beside its root "
                                                "element; begin it with ") +
                                        kDeclaration);
            return;
        }
        findings_.error(undefined_entity(0), "well-formed, but the library would not load it: " +
                                                 cut(one_line(why), 2 * kShownPath) + "; fix that");
    }

    // What stands beside the root element, where Mini-XML takes that for a
    // second root.
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

    const std::string &text_;
    const std::string &stored_;
    std::vector<Tag> tags_;
    std::string repaired_;
    std::vector<const Attribute *> given_;
    Findings &findings_;
};

// --- names --------------------------------------------------------------------------

// What a node path does to a name with these characters: "is split at '/'";
// empty for a name without.
std::string path_damage(std::string_view name)
{
    constexpr std::array<std::pair<char, const char *>, 4> kDamages = {
        std::pair{'/', "is split at '/'"}, std::pair{':', "is cut at ':'"},
        std::pair{'\t', "is cut at a tab"}, std::pair{'\n', "is cut at a line feed"}};
    std::vector<std::string> damages;
    for (const auto &[character, damage] : kDamages) {
        if (name.find(character) != name.npos) {
            damages.emplace_back(damage);
        }
    }
    return listing(damages);
}

bool is_addressable(std::string_view name)
{
    return !name.empty() && name.size() <= kNameLimit && path_damage(name).empty();
}

struct VendorName {
    std::string name; // without the suffix
    std::string suffix;
    int vendor = 0;
};

// An item's name that has a vendor's suffix in it.
std::optional<VendorName> vendor_name(std::string_view name)
{
    for (const int vendor : {2, 1}) {
        const std::string suffix = vendor_suffix(vendor).value();
        if (name.size() > suffix.size() && name.ends_with(suffix)) {
            return VendorName{std::string(name.substr(0, name.size() - suffix.size())), suffix,
                              vendor};
        }
    }
    return std::nullopt;
}

// Spelled alike but for case, numbers and signs: one for another in a path is an
// easy mistake.
std::string likeness(std::string_view name)
{
    std::string letters;
    for (const char c : name) {
        const auto byte = static_cast<unsigned char>(c);
        if (std::isalpha(byte) != 0 || byte >= 0x80) {
            letters += static_cast<char>(std::tolower(byte));
        }
    }
    return letters;
}

// --- what the plan says ---------------------------------------------------------------

std::optional<std::string> attribute(mxml_node_t *node, const char *name)
{
    const char *value = mxmlElementGetAttr(node, name);
    return value != nullptr ? std::optional<std::string>(value) : std::nullopt;
}

bool is_element(mxml_node_t *node, std::string_view tag)
{
    return mxmlGetType(node) == MXML_ELEMENT && mxmlGetElement(node) == tag;
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
                                         : "<" + cut(one_line(tag), kShownName) + ">";
}

// A place for every element, in the text that the plan was loaded from.
class Places
{
  public:
    Places(const std::string &text, const Plan &plan) : text_(text), tags_(element_tags(plan, text))
    {
        if (!tags_.empty()) {
            note_texts(scan(text));
        }
        for (std::size_t at = text.find('\n'); at != kNone; at = text.find('\n', at + 1)) {
            line_ends_.push_back(at);
        }
    }

    [[nodiscard]] std::size_t of(std::size_t element) const
    {
        return tags_.empty() ? 0 : tags_[element].begin;
    }

    // Of the value, or of the element where it has no such attribute.
    [[nodiscard]] std::size_t of(std::size_t element, std::string_view name) const
    {
        const Attribute *place = find(element, name);
        return place != nullptr && place->has_value ? place->value_begin : of(element);
    }

    // Of a byte of the value, as the library reads it.
    [[nodiscard]] std::size_t inside(std::size_t element, std::string_view name,
                                     std::size_t byte) const
    {
        const Attribute *place = find(element, name);
        return place != nullptr && place->has_value ? place_in_value(text_, *place, byte)
                                                    : of(element);
    }

    // Where the first text stands that is directly in the element.
    [[nodiscard]] std::size_t of_text(std::size_t element) const
    {
        const auto found = texts_.find(element);
        return found != texts_.end() ? found->second : kNone;
    }

    // Whether it has that attribute, but no value for it, which has been said.
    [[nodiscard]] bool is_valueless(std::size_t element, std::string_view name) const
    {
        const Attribute *place = find(element, name);
        return place != nullptr && !place->has_value;
    }

    [[nodiscard]] std::string line_of(std::size_t element) const
    {
        const auto end = std::ranges::lower_bound(line_ends_, of(element));
        return "line " + std::to_string(end - line_ends_.begin() + 1);
    }

  private:
    void note_texts(const std::vector<Tag> &tags)
    {
        std::vector<std::size_t> open;
        std::size_t element = 0;
        for (const Tag &tag : tags) {
            if (tag.kind == Tag::Kind::text) {
                texts_.try_emplace(open.empty() ? 0 : open.back(), tag.begin);
            } else if (tag.kind == Tag::Kind::close) {
                open.resize(open.empty() ? 0 : open.size() - 1);
            } else {
                if (tag.kind == Tag::Kind::open) {
                    open.push_back(element);
                }
                ++element;
            }
        }
    }

    [[nodiscard]] const Attribute *find(std::size_t element, std::string_view name) const
    {
        if (tags_.empty()) {
            return nullptr;
        }
        const auto &attributes = tags_[element].attributes;
        const auto found = std::ranges::find(attributes, name, &Attribute::name);
        return found != attributes.end() ? &*found : nullptr;
    }

    const std::string &text_;
    std::vector<Tag> tags_;
    std::unordered_map<std::size_t, std::size_t> texts_;
    std::vector<std::size_t> line_ends_;
};

struct Item {
    mxml_node_t *node = nullptr;
    std::size_t number = 0;
    std::optional<std::string> name;
    std::optional<std::string> args;
};

struct Group {
    mxml_node_t *node = nullptr;
    std::size_t number = 0;
    std::optional<std::string> name;
    bool found = false; // by its name
    std::vector<Item> items;
    std::vector<Item> nested; // in other elements of it
    std::vector<mxml_node_t *> others;
};

// An item that its group lacks is looked for in the groups after it, and its
// position there is run here. That is so with every item of every later group:
// said is where the wrong path comes easily, because another group has an item of
// that name, or the earlier group one like it.
class LaterGroupsCheck
{
  public:
    LaterGroupsCheck(const Plan &plan, const Places &places, const std::vector<Group> &groups,
                     Findings &findings)
        : plan_(plan), places_(places), findings_(findings)
    {
        for (const Group &group : groups) {
            if (group.found) {
                groups_.push_back({&group, addressable_items(group)});
            }
        }
    }

    void check()
    {
        for (const Entry &entry : groups_) {
            for (const Item *item : entry.items) {
                ++uses_[*item->name];
            }
        }
        for (at_ = 0; at_ < groups_.size(); ++at_) {
            check_group(groups_[at_]);
            for (const Item *item : groups_[at_].items) {
                after_last_[*item->name] = at_ + 1;
                alike_[likeness(*item->name)] = at_;
            }
        }
    }

  private:
    struct Entry {
        const Group *group = nullptr;
        std::vector<const Item *> items;
    };

    // The first of each name.
    static std::vector<const Item *> addressable_items(const Group &group)
    {
        std::vector<const Item *> items;
        std::unordered_set<std::string_view> names;
        for (const Item &item : group.items) {
            if (item.name && is_addressable(*item.name) && names.insert(*item.name).second) {
                items.push_back(&item);
            }
        }
        return items;
    }

    void check_group(const Entry &entry)
    {
        const Item *first = nullptr;
        std::string text;
        std::size_t more = 0;
        for (const Item *item : entry.items) {
            const Group *earlier = earlier_group(*item->name);
            const auto run =
                earlier != nullptr ? plan_.run_by(*earlier->name, *item->name) : std::nullopt;
            if (!run || run->number == item->number) {
                continue;
            }
            if (first != nullptr) {
                ++more;
                continue;
            }
            first = item;
            text = "group " + in_quotes(*earlier->name) + " has no item " + in_quotes(*item->name) +
                   ", and finds this one after it: " + path_of(*earlier->name, *item->name) +
                   " would run " + names_of({run}) + "; check the group in paths to it";
        }
        if (first != nullptr) {
            findings_.warning(places_.of(first->number, "name"),
                              more > 0 ? text + ", and to " + std::to_string(more) + " more here"
                                       : text);
        }
    }

    // One before this group whose path with that name leads here.
    [[nodiscard]] const Group *earlier_group(const std::string &name) const
    {
        const auto last = after_last_.find(name);
        const std::size_t begin = last != after_last_.end() ? last->second : 0;
        if (uses_.at(name) > 1 && begin < at_) {
            return groups_[at_ - 1].group;
        }
        const auto alike = alike_.find(likeness(name));
        return alike != alike_.end() && alike->second >= begin ? groups_[alike->second].group
                                                               : nullptr;
    }

    const Plan &plan_;
    const Places &places_;
    Findings &findings_;
    std::vector<Entry> groups_;
    std::size_t at_ = 0;
    std::unordered_map<std::string, std::size_t> uses_;
    std::unordered_map<std::string, std::size_t> after_last_; // group that has the name
    std::unordered_map<std::string, std::size_t> alike_;      // the last group with such a name
};

class PlanChecker
{
  public:
    PlanChecker(const std::string &text, const Plan &plan, Findings &findings)
        : plan_(plan), places_(text, plan), findings_(findings), shell_checker_(findings)
    {
    }

    void check()
    {
        collect();
        check_tags();
        if (groups_.empty()) {
            findings_.error(places_.of(root()),
                            "no CmdGroup in it: the library would find nothing "
                            "to run; put the items into <CmdGroup name=\"...\">");
            return;
        }
        for (Group &group : groups_) {
            check_group_name(group);
            check_items(group);
        }
        for (const Item &item : stray_) {
            findings_.error(places_.of(item.number), item_words(item) + " is in no group: no node "
                                                                        "path leads to it; put it "
                                                                        "into a <CmdGroup>");
            check_program(item);
        }
        for (const Group &group : groups_) {
            if (group.found) {
                check_positions(group);
            }
        }
        LaterGroupsCheck(plan_, places_, groups_, findings_).check();
    }

  private:
    // --- what is there ---

    void collect()
    {
        const auto &elements = plan_.elements();
        std::vector<std::size_t> owners(elements.size(), kNone); // indexes of groups
        for (std::size_t number = 0; number < elements.size(); ++number) {
            mxml_node_t *const node = elements[number];
            mxml_node_t *const parent = mxmlGetParent(node);
            owners[number] = parent != nullptr ? owners[plan_.number(parent)] : kNone;
            if (is_element(node, "CmdGroup")) {
                groups_.push_back(group_of(node, number));
                owners[number] = groups_.size() - 1;
            } else if (is_element(node, "Cmd")) {
                add({node, number, attribute(node, "name"), attribute(node, "args")},
                    owners[number]);
            }
        }
    }

    static Group group_of(mxml_node_t *node, std::size_t number)
    {
        Group group;
        group.node = node;
        group.number = number;
        group.name = attribute(node, "name");
        for (mxml_node_t *child = mxmlGetFirstChild(node); child != nullptr;
             child = mxmlGetNextSibling(child)) {
            if (!is_element(child, "Cmd")) {
                group.others.push_back(child);
            }
        }
        return group;
    }

    void add(Item item, std::size_t owner)
    {
        if (item.name && !item.name->empty()) {
            names_.insert(*item.name);
        }
        if (owner == kNone) {
            stray_.push_back(std::move(item));
        } else if (mxmlGetParent(item.node) == groups_[owner].node) {
            groups_[owner].items.push_back(std::move(item));
        } else {
            groups_[owner].nested.push_back(std::move(item));
        }
    }

    // The first element that is one in the text, too.
    [[nodiscard]] std::size_t root() const
    {
        const auto &elements = plan_.elements();
        const auto found = std::ranges::find_if(
            elements, [](mxml_node_t *node) { return kind_of(node).starts_with("<"); });
        return found != elements.end() ? plan_.number(*found) : 0;
    }

    [[nodiscard]] static std::string item_words(const Item &item)
    {
        return item.name.value_or("").empty() ? "an item without a name"
                                              : "item " + in_quotes(*item.name);
    }

    // --- names ---

    void check_tags()
    {
        for (mxml_node_t *node : plan_.elements()) {
            for (const char *meant : {"CmdGroup", "Cmd"}) {
                const char *tag = mxmlGetElement(node);
                if (strcasecmp(tag, meant) == 0 && std::strcmp(tag, meant) != 0) {
                    findings_.warning(places_.of(plan_.number(node)),
                                      kind_of(node) +
                                          " is ignored: element names are case-sensitive; write <" +
                                          meant + ">");
                }
            }
        }
    }

    void check_group_name(Group &group)
    {
        const std::string name = group.name.value_or("");
        const std::size_t place = places_.of(group.number, "name");
        if (group.node == plan_.top()) {
            findings_.error(places_.of(group.number),
                            "the library looks for groups below the top of the document, and would "
                            "not find this one; begin it with " +
                                std::string(kDeclaration));
        } else if (name.empty()) {
            if (!places_.is_valueless(group.number, "name")) {
                findings_.error(place, group.name ? "the name of a group is empty: no node path "
                                                    "leads to it; write one"
                                                  : "a group has no name: no node path leads to "
                                                    "it; add name=\"...\"");
            }
        } else if (const std::string damage = path_damage(name); !damage.empty()) {
            findings_.error(place, "group " + in_quotes(name) +
                                       " cannot be addressed: a node path " + damage + ", and " +
                                       path_of(name) + " would run " +
                                       names_of(plan_.run_by(name)) + "; rename it");
        } else if (name.size() > kNameLimit) {
            findings_.error(place, "group " + in_quotes(name) + too_long(name) +
                                       names_of(plan_.run_by(name)) + "; shorten it");
        } else if (mxml_node_t *const first = plan_.find_group(name); first != group.node) {
            findings_.error(place, "a second group " + in_quotes(name) + ": " + path_of(name) +
                                       " finds the one in " + places_.line_of(plan_.number(first)) +
                                       ", and never this one; rename it");
        } else {
            group.found = true;
        }
    }

    static std::string too_long(const std::string &name)
    {
        return " cannot be addressed: its name has " + std::to_string(name.size()) +
               " bytes, a node path holds " + std::to_string(kNameLimit) + " of it and would run ";
    }

    void check_items(const Group &group)
    {
        std::unordered_map<std::string, std::size_t> firsts;
        for (const Item &item : group.items) {
            const std::string name = item.name.value_or("");
            if (name.empty()) {
                check_unnamed(item);
                continue;
            }
            const auto [first, is_first] = firsts.try_emplace(name, item.number);
            if (group.found) {
                check_item_name(group, item, is_first ? nullptr : &first->second);
            }
            check_program(item);
        }
        for (const Item &item : group.nested) {
            check_nested(group, item);
            check_program(item);
        }
    }

    void check_unnamed(const Item &item)
    {
        if (!places_.is_valueless(item.number, "name")) {
            findings_.error(places_.of(item.number, "name"),
                            item.name ? "the name of an item is empty: the library would not run "
                                        "it; write the name of its program"
                                      : "an item has no name: the library would not run it; add "
                                        "name=\"...\" with the name of its program");
        }
    }

    void check_item_name(const Group &group, const Item &item, const std::size_t *first)
    {
        const std::string &name = *item.name;
        const std::size_t place = places_.of(item.number, "name");
        if (const std::string damage = path_damage(name); !damage.empty()) {
            const bool cuts_program = name.find_first_of("\t\n") != name.npos;
            findings_.error(place, "item " + in_quotes(name) +
                                       " cannot be addressed: a node path " + damage +
                                       (cuts_program ? ", as is the name of its program" : "") +
                                       ", and " + path_of(*group.name, name) + " would run " +
                                       run_of(group, name) + "; rename it");
        } else if (name.size() > kNameLimit) {
            findings_.error(place, "item " + in_quotes(name) + too_long(name) +
                                       run_of(group, name) + "; shorten it");
        } else if (first != nullptr) {
            findings_.error(place, "a second item " + in_quotes(name) + " in group " +
                                       in_quotes(*group.name) + ": " + path_of(*group.name, name) +
                                       " finds the one in " + places_.line_of(*first) +
                                       ", and so do reports; rename it");
        }
    }

    [[nodiscard]] std::string run_of(const Group &group, const std::string &name) const
    {
        return names_of({plan_.run_by(*group.name, name)});
    }

    // --- programs ---

    void check_program(const Item &item)
    {
        const std::string name = item.name.value_or("");
        if (name.empty()) {
            return;
        }
        const std::size_t place = places_.of(item.number, "name");
        if (name.size() > kStopLimit && name.size() <= kNameLimit) {
            findings_.warning(place, "item " + in_quotes(name) +
                                         " may not be found to be stopped: ps is asked for the "
                                         "first " +
                                         std::to_string(kStopLimit) + " of the " +
                                         std::to_string(name.size()) +
                                         " bytes of its name, and finds another or none; shorten "
                                         "it");
        }
        shell_checker_.check({name, item.args.value_or(""), place, [&](std::size_t at) {
                                  return places_.inside(item.number, "args", at);
                              }});
        check_vendors(item);
        check_command_line(item);
    }

    void check_vendors(const Item &item)
    {
        const std::string &name = *item.name;
        const std::size_t place = places_.of(item.number, "name");
        const auto vendor = vendor_name(name);
        const std::string gatherer = kGatherer;
        if (name == gatherer + "_qsee" || (vendor && vendor->name == gatherer)) {
            findings_.warning(place, "item " + in_quotes(name) + " is not the gatherer: that is " +
                                         in_quotes(gatherer) +
                                         ", to which the library adds the vendor's suffix; leave "
                                         "it out");
        } else if (vendor) {
            const std::string under = " under vendor " + std::to_string(vendor->vendor);
            const std::string twice = in_quotes(name + vendor->suffix) + under;
            findings_.warning(place, names_.contains(vendor->name)
                                         ? "item " + in_quotes(name) + " would be run as " + twice +
                                               ", and item " + in_quotes(vendor->name) + " as " +
                                               in_quotes(name) + "; rename one"
                                         : "item " + in_quotes(name) + " would be run as " + twice +
                                               ": the library adds the suffix; leave it out");
        }
    }

    void check_command_line(const Item &item)
    {
        if (!item.args) {
            const std::string line = command_line(*item.name, std::nullopt, "");
            findings_.error(places_.of(item.number),
                            "item " + in_quotes(*item.name) +
                                " has no args: its command line would "
                                "be " +
                                in_quotes(line) + ", which the shell refuses; add args=\"\"");
            return;
        }
        std::vector<std::string> excesses;
        for (const int vendor : kVendors) {
            const std::size_t size =
                command_line(*item.name, item.args, vendor_suffix(vendor).value()).size();
            if (size > kCommandLimit) {
                excesses.push_back(std::to_string(size - kCommandLimit) + " under vendor " +
                                   std::to_string(vendor));
            }
        }
        if (!excesses.empty()) {
            findings_.error(places_.of(item.number, "args"),
                            "the command line of item " + in_quotes(*item.name) + " is cut to " +
                                std::to_string(kCommandLimit) + " bytes, by " + listing(excesses) +
                                "; shorten its " + (item.args->empty() ? "name" : "args"));
        }
    }

    // --- positions ---

    void check_nested(const Group &group, const Item &item)
    {
        std::string text = item_words(item) + " is not directly in its group, but in " +
                           kind_of(mxmlGetParent(item.node)) + ": ";
        const std::string name = item.name.value_or("");
        if (group.found && is_addressable(name)) {
            const auto run = plan_.run_by(*group.name, name);
            text += run && run->number == item.number
                        ? path_of(*group.name, name) + " finds it by chance"
                        : path_of(*group.name, name) + " would run " + names_of({run});
        } else {
            text += "no node path leads to it";
        }
        findings_.error(places_.of(item.number), text + "; put it directly into a group");
    }

    void check_positions(const Group &group)
    {
        if (group.items.empty() && group.nested.empty() && group.others.empty()) {
            findings_.warning(places_.of(group.number),
                              "group " + in_quotes(*group.name) + " is empty: " +
                                  path_of(*group.name) + " would run nothing, and an item of it " +
                                  "is looked for in the groups after it; put items into it");
        }
        if (group.others.empty()) {
            return;
        }
        const Run run = plan_.run_by(*group.name);
        const bool said = report_run_others(group, run) || !group.nested.empty();
        const std::vector<std::string> effects = shifts_of(group, run);
        const std::string cause = kinds_of(group.others) + " in group " + in_quotes(*group.name);
        const std::size_t place = place_of_others(group);
        if (!effects.empty()) {
            findings_.error(place, cause + ", which shifts the positions: " + some_of(effects) +
                                       "; keep all but items out of the group");
        } else if (!said) {
            findings_.warning(place, cause + ": " + path_of(*group.name) +
                                         " would look for more items than there are, and go on; "
                                         "keep all but items out of the group");
        }
    }

    // Those that a group command takes for items; false where there are none.
    bool report_run_others(const Group &group, const Run &run)
    {
        bool found = false;
        for (const auto &element : run) {
            if (!element || !is_other_of(group, *element)) {
                continue;
            }
            findings_.error(places_.of(element->number),
                            kind_of(plan_.elements()[element->number]) + " in group " +
                                in_quotes(*group.name) + " has a name, by which " +
                                path_of(*group.name) +
                                " would run it like an item; put it outside of the group");
            found = true;
        }
        return found;
    }

    [[nodiscard]] bool is_other_of(const Group &group, const Plan::Element &element) const
    {
        return element.tag != "Cmd" &&
               mxmlGetParent(plan_.elements()[element.number]) == group.node;
    }

    static std::string some_of(std::vector<std::string> effects)
    {
        if (const std::size_t count = effects.size(); count > kShownEffects) {
            effects.resize(kShownEffects);
            effects.push_back("so on for " + std::to_string(count - kShownEffects) + " more");
        }
        return listing(effects);
    }

    static std::string kinds_of(const std::vector<mxml_node_t *> &others)
    {
        std::vector<std::string> kinds;
        for (mxml_node_t *other : others) {
            const std::string kind = kind_of(other);
            if (std::ranges::find(kinds, kind) != kinds.end()) {
                continue;
            }
            if (kinds.size() == kShownKinds) {
                kinds.emplace_back("others");
                break;
            }
            kinds.push_back(kind);
        }
        return listing(kinds);
    }

    [[nodiscard]] std::size_t place_of_others(const Group &group) const
    {
        std::size_t place = places_.of_text(group.number);
        for (mxml_node_t *other : group.others) {
            if (mxmlGetType(other) == MXML_ELEMENT) {
                place = std::min(place, places_.of(plan_.number(other)));
            }
        }
        return place != kNone ? place : places_.of(group.number);
    }

    // What paths run that is not what they name.
    [[nodiscard]] std::vector<std::string> shifts_of(const Group &group, const Run &run) const
    {
        std::vector<std::string> effects;
        if (!runs_its_items(group, run)) {
            effects.push_back(path_of(*group.name) + " would run " + names_of(run));
        }
        std::unordered_set<std::string> seen;
        for (const Item &item : group.items) {
            const std::string name = item.name.value_or("");
            if (!is_addressable(name) || !seen.insert(name).second) {
                continue;
            }
            const auto found = plan_.run_by(*group.name, name);
            if (!found || found->number != item.number) {
                effects.push_back(path_of(*group.name, name) + " would run " + names_of({found}));
            }
        }
        return effects;
    }

    // All in their order, and at most elements of the group beside them.
    [[nodiscard]] bool runs_its_items(const Group &group, const Run &run) const
    {
        std::size_t done = 0;
        for (const auto &element : run) {
            if (!element || is_other_of(group, *element)) {
                continue;
            }
            while (done < group.items.size() && group.items[done].name.value_or("").empty()) {
                ++done;
            }
            if (done == group.items.size() || group.items[done].number != element->number) {
                return false;
            }
            ++done;
        }
        return std::all_of(group.items.begin() + static_cast<std::ptrdiff_t>(done),
                           group.items.end(),
                           [](const Item &item) { return item.name.value_or("").empty(); });
    }

    const Plan &plan_;
    Places places_;
    Findings &findings_;
    ShellChecker shell_checker_;
    std::vector<Group> groups_;
    std::vector<Item> stray_;
    std::unordered_set<std::string> names_; // of items
};

} // namespace

std::vector<Finding> check(const std::string &text, PlanUse use)
{
    Findings findings;
    if (text.starts_with("\xFF\xFE") || text.starts_with("\xFE\xFF")) {
        findings.error(0, "the plan is UTF-16: save it as UTF-8");
        return findings.take();
    }
    if (use == PlanUse::to_send) {
        SizeChecker(text, findings).check();
    }
    const std::string stored = use == PlanUse::to_send ? stored_part(text) : text;
    if (const std::optional<Plan> plan = FormChecker(text, stored, findings).check()) {
        PlanChecker(text, *plan, findings).check();
    }
    return findings.take();
}

bool has_errors(const std::vector<Finding> &findings)
{
    return std::ranges::any_of(findings, [](const Finding &finding) {
        return finding.severity == Finding::Severity::error;
    });
}

} // namespace fptest
