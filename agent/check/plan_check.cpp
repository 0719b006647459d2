// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/checks.h"
#include "check/elements.h"
#include "check/later_groups_check.h"
#include "check/shell_check.h"
#include "check/source_map.h"
#include "util/text.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <string_view>
#include <strings.h>
#include <unordered_set>
#include <utility>

namespace fptest
{

namespace
{

constexpr std::size_t kShownEffects = 3;
constexpr std::size_t kShownKinds = 5;
constexpr std::array kVendors = {0, 1, 2};

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
                                  : fmt::format("<{}>", ellipsize(one_line(tag), kShownName));
}

class PlanChecker
{
  public:
    PlanChecker(const CheckedPlan &read, const Plan &plan, Findings &findings)
        : plan_(plan), places_(read.text, read.tags, plan), findings_(findings),
          shell_checker_(findings)
    {
    }

    void check()
    {
        collect();
        check_tags();
        if (groups_.empty()) {
            findings_.error(places_.of(root()),
                            "no CmdGroup in it: the library would find nothing to run; put the "
                            "items into <CmdGroup name=\"...\">");
            return;
        }
        for (Group &group : groups_) {
            check_group_name(group);
            check_items(group);
        }
        for (const Item &item : stray_) {
            findings_.error(places_.of(item.number),
                            "{} is in no group: no node path leads to it; put it into a <CmdGroup>",
                            item_words(item));
            check_program(item);
        }
        for (const Group &group : groups_) {
            if (group.found) {
                check_positions(group);
            }
        }
        check_later_groups(plan_, places_, groups_, findings_);
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
                                              : fmt::format("item {}", quoted_name(*item.name));
    }

    // --- names ---

    void check_tags()
    {
        for (mxml_node_t *node : plan_.elements()) {
            for (const char *meant : {"CmdGroup", "Cmd"}) {
                const char *tag = mxmlGetElement(node);
                if (strcasecmp(tag, meant) == 0 && std::strcmp(tag, meant) != 0) {
                    findings_.warning(places_.of(plan_.number(node)),
                                      "{} is ignored: element names are case-sensitive; write <{}>",
                                      kind_of(node), meant);
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
                            "not find this one; begin it with {}",
                            kDeclaration);
        } else if (name.empty()) {
            check_unnamed(group.number,
                          group.name
                              ? "the name of a group is empty: no node path leads to it; write one"
                              : "a group has no name: no node path leads to it; add name=\"...\"");
        } else if (const std::string damage = path_damage(name); !damage.empty()) {
            findings_.error(place,
                            "group {} cannot be addressed: a node path {}, and {} would run {}; "
                            "rename it",
                            quoted_name(name), damage, path_of(name),
                            names_of(plan_.resolve(name)));
        } else if (name.size() > kNameLimit) {
            report_length(place, "group", name, names_of(plan_.resolve(name)));
        } else if (mxml_node_t *const first = plan_.find_group(name); first != group.node) {
            findings_.error(place,
                            "a second group {}: {} finds the one in {}, and never this one; rename "
                            "it",
                            quoted_name(name), path_of(name), places_.line_of(plan_.number(first)));
        } else {
            group.found = true;
        }
    }

    void report_length(std::size_t place, const char *what, const std::string &name,
                       const std::string &run)
    {
        findings_.error(place,
                        "{} {} cannot be addressed: its name has {} bytes, a node path holds {} of "
                        "it and would run {}; shorten it",
                        what, quoted_name(name), name.size(), kNameLimit, run);
    }

    void check_items(const Group &group)
    {
        std::unordered_map<std::string, std::size_t> firsts;
        for (const Item &item : group.items) {
            const std::string name = item.name.value_or("");
            if (name.empty()) {
                check_unnamed(item.number,
                              item.name ? "the name of an item is empty: the library would not run "
                                          "it; write the name of its program"
                                        : "an item has no name: the library would not run it; add "
                                          "name=\"...\" with the name of its program");
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

    void check_unnamed(std::size_t element, const char *text)
    {
        if (!places_.is_valueless(element, "name")) {
            findings_.error(places_.of(element, "name"), "{}", text);
        }
    }

    void check_item_name(const Group &group, const Item &item, const std::size_t *first)
    {
        const std::string &name = *item.name;
        const std::size_t place = places_.of(item.number, "name");
        if (const std::string damage = path_damage(name); !damage.empty()) {
            const bool cuts_program = name.find_first_of("\t\n") != name.npos;
            findings_.error(place,
                            "item {} cannot be addressed: a node path {}{}, and {} would run {}; "
                            "rename it",
                            quoted_name(name), damage,
                            cuts_program ? ", as is the name of its program" : "",
                            path_of(*group.name, name), run_of(group, name));
        } else if (name.size() > kNameLimit) {
            report_length(place, "item", name, run_of(group, name));
        } else if (first != nullptr) {
            findings_.error(place,
                            "a second item {} in group {}: {} finds the one in {}, and so do "
                            "reports; rename it",
                            quoted_name(name), quoted_name(*group.name), path_of(*group.name, name),
                            places_.line_of(*first));
        }
    }

    [[nodiscard]] std::string run_of(const Group &group, const std::string &name) const
    {
        return names_of({plan_.resolve(*group.name, name)});
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
            findings_.warning(place,
                              "item {} may not be found to be stopped: ps is asked for the first "
                              "{} of the {} bytes of its name, and finds another or none; shorten "
                              "it",
                              quoted_name(name), kStopLimit, name.size());
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
        if (name == std::string(kGatherer) + "_qsee" || (vendor && vendor->name == kGatherer)) {
            findings_.warning(place,
                              "item {} is not the gatherer: that is '{}', to which the library "
                              "adds the vendor's suffix; leave it out",
                              quoted_name(name), kGatherer);
        } else if (vendor && names_.contains(vendor->name)) {
            findings_.warning(place,
                              "item {0} would be run as {1} under vendor {2}, and item {3} as {0}; "
                              "rename one",
                              quoted_name(name), quoted_name(name + vendor->suffix), vendor->vendor,
                              quoted_name(vendor->name));
        } else if (vendor) {
            findings_.warning(place,
                              "item {} would be run as {} under vendor {}: the library adds the "
                              "suffix; leave it out",
                              quoted_name(name), quoted_name(name + vendor->suffix),
                              vendor->vendor);
        }
    }

    void check_command_line(const Item &item)
    {
        if (!item.args) {
            const std::string line = command_line(*item.name, std::nullopt, "");
            findings_.error(places_.of(item.number),
                            "item {} has no args: its command line would be {}, which the shell "
                            "refuses; add args=\"\"",
                            quoted_name(*item.name), quoted_name(line));
            return;
        }
        std::vector<std::string> excesses;
        for (const int vendor : kVendors) {
            const std::size_t size =
                command_line(*item.name, item.args, vendor_suffix(vendor).value()).size();
            if (size > kCommandLimit) {
                excesses.push_back(fmt::format("{} under vendor {}", size - kCommandLimit, vendor));
            }
        }
        if (!excesses.empty()) {
            findings_.error(places_.of(item.number, "args"),
                            "the command line of item {} is cut to {} bytes, by {}; shorten its {}",
                            quoted_name(*item.name), kCommandLimit, join_and(excesses),
                            item.args->empty() ? "name" : "args");
        }
    }

    // --- positions ---

    void check_nested(const Group &group, const Item &item)
    {
        const std::string name = item.name.value_or("");
        std::string effect = "no node path leads to it";
        if (group.found && is_addressable(name)) {
            const auto run = plan_.resolve(*group.name, name);
            const std::string path = path_of(*group.name, name);
            effect = run && run->number == item.number
                         ? fmt::format("{} finds it by chance", path)
                         : fmt::format("{} would run {}", path, names_of({run}));
        }
        findings_.error(places_.of(item.number),
                        "{} is not directly in its group, but in {}: {}; put it directly into a "
                        "group",
                        item_words(item), kind_of(mxmlGetParent(item.node)), effect);
    }

    void check_positions(const Group &group)
    {
        if (group.items.empty() && group.nested.empty() && group.others.empty()) {
            findings_.warning(places_.of(group.number),
                              "group {} is empty: {} would run nothing, and an item of it is "
                              "looked for in the groups after it; put items into it",
                              quoted_name(*group.name), path_of(*group.name));
        }
        if (group.others.empty()) {
            return;
        }
        const Resolution run = plan_.resolve(*group.name);
        const bool said = report_run_others(group, run) || !group.nested.empty();
        const std::vector<std::string> effects = shifts_of(group, run);
        const std::string kinds = kinds_of(group.others);
        const std::size_t place = place_of_others(group);
        if (!effects.empty()) {
            findings_.error(place,
                            "{} in group {}, which shifts the positions: {}; keep all but items "
                            "out of the group",
                            kinds, quoted_name(*group.name), some_of(effects));
        } else if (!said) {
            findings_.warning(place,
                              "{} in group {}: {} would look for more items than there are, and go "
                              "on; keep all but items out of the group",
                              kinds, quoted_name(*group.name), path_of(*group.name));
        }
    }

    // Those that a group command takes for items; false where there are none.
    bool report_run_others(const Group &group, const Resolution &run)
    {
        bool found = false;
        for (const auto &element : run) {
            if (!element || !is_other_of(group, *element)) {
                continue;
            }
            findings_.error(places_.of(element->number),
                            "{} in group {} has a name, by which {} would run it like an item; put "
                            "it outside of the group",
                            kind_of(plan_.elements()[element->number]), quoted_name(*group.name),
                            path_of(*group.name));
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
            effects.push_back(fmt::format("so on for {} more", count - kShownEffects));
        }
        return join_and(effects);
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
        return join_and(kinds);
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
    [[nodiscard]] std::vector<std::string> shifts_of(const Group &group,
                                                     const Resolution &run) const
    {
        std::vector<std::string> effects;
        if (!runs_its_items(group, run)) {
            effects.push_back(fmt::format("{} would run {}", path_of(*group.name), names_of(run)));
        }
        std::unordered_set<std::string> seen;
        for (const Item &item : group.items) {
            const std::string name = item.name.value_or("");
            if (!is_addressable(name) || !seen.insert(name).second) {
                continue;
            }
            const auto found = plan_.resolve(*group.name, name);
            if (!found || found->number != item.number) {
                effects.push_back(
                    fmt::format("{} would run {}", path_of(*group.name, name), names_of({found})));
            }
        }
        return effects;
    }

    // All in their order, and at most elements of the group beside them.
    [[nodiscard]] bool runs_its_items(const Group &group, const Resolution &run) const
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
    SourceMap places_;
    Findings &findings_;
    ShellChecker shell_checker_;
    std::vector<Group> groups_;
    std::vector<Item> stray_;
    std::unordered_set<std::string> names_; // of items
};

} // namespace

void check_plan(const CheckedPlan &read, const Plan &plan, Findings &findings)
{
    PlanChecker(read, plan, findings).check();
}

} // namespace fptest
