// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/document_checks.h"
#include "check/plan_checks.h"
#include "util/text.h"

#include <algorithm>
#include <string>
#include <vector>

namespace fptest
{

namespace
{

constexpr std::size_t kShownEffects = 3;
constexpr std::size_t kShownKinds = 5;

bool is_other_of(const CheckContext &context, const Group &group, const Plan::Element &element)
{
    return element.tag != "Cmd" &&
           mxmlGetParent(context.plan.elements()[element.number]) == group.node;
}

// Reports elements that a group command takes for items; false if there are none.
bool report_run_others(const CheckContext &context, const Group &group, const Resolution &run)
{
    bool found = false;
    for (const auto &element : run) {
        if (element && is_other_of(context, group, *element)) {
            context.findings.error(context.places.of(element->number),
                                   "{} in group {} has a name, by which {} would run it like an "
                                   "item; put it outside of the group",
                                   kind_of(context.plan.elements()[element->number]),
                                   quoted_name(group.name), path_of(group.name));
            found = true;
        }
    }
    return found;
}

std::string some_of(std::vector<std::string> effects)
{
    if (const std::size_t count = effects.size(); count > kShownEffects) {
        effects.resize(kShownEffects);
        effects.push_back(fmt::format("so on for {} more", count - kShownEffects));
    }
    return join_and(effects);
}

std::string kinds_of(const std::vector<mxml_node_t *> &others)
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

std::size_t place_of_others(const CheckContext &context, const Group &group)
{
    std::size_t place = context.places.of_text(group.number);
    for (mxml_node_t *other : group.others) {
        if (mxmlGetType(other) == MXML_ELEMENT) {
            place = std::min(place, context.places.of(context.plan.number(other)));
        }
    }
    return place != kNone ? place : context.places.of(group.number);
}

// All of them in order, and nothing else but other elements of the group.
bool runs_its_items(const CheckContext &context, const Group &group, const Resolution &run)
{
    std::vector<std::size_t> meant;
    for (const Item &item : group.items) {
        if (!item.name.empty()) {
            meant.push_back(item.number);
        }
    }
    std::vector<std::size_t> found;
    for (const auto &element : run) {
        if (element && !is_other_of(context, group, *element)) {
            found.push_back(element->number);
        }
    }
    return found == meant;
}

// Which paths run something else than they name.
std::vector<std::string> shifts_of(const CheckContext &context, const Group &group,
                                   const Resolution &run)
{
    std::vector<std::string> effects;
    if (!runs_its_items(context, group, run)) {
        effects.push_back(fmt::format("{} would run {}", path_of(group.name), names_of(run)));
    }
    for (const Item *item : addressable_items(group)) {
        const auto found = context.plan.resolve(group.name, item->name);
        if (!found || found->number != item->number) {
            effects.push_back(
                fmt::format("{} would run {}", path_of(group.name, item->name), names_of({found})));
        }
    }
    return effects;
}

} // namespace

void check_nested(const CheckContext &context, const Group &group, const Item &item)
{
    std::string effect = "no node path leads to it";
    if (group.found && is_addressable(item.name)) {
        const auto run = context.plan.resolve(group.name, item.name);
        const std::string path = path_of(group.name, item.name);
        effect = run && run->number == item.number
                     ? fmt::format("{} finds it by chance", path)
                     : fmt::format("{} would run {}", path, names_of({run}));
    }
    context.findings.error(
        context.places.of(item.number),
        "{} is not directly in its group, but in {}: {}; put it directly into a group",
        words_for(item), kind_of(mxmlGetParent(item.node)), effect);
}

void check_positions(const CheckContext &context, const Group &group)
{
    if (group.items.empty() && group.nested.empty() && group.others.empty()) {
        context.findings.warning(context.places.of(group.number),
                                 "group {} is empty: {} would run nothing, and an item of it is "
                                 "looked for in the groups after it; put items into it",
                                 quoted_name(group.name), path_of(group.name));
    }
    if (group.others.empty()) {
        return;
    }
    const Resolution run = context.plan.resolve(group.name);
    const bool said = report_run_others(context, group, run) || !group.nested.empty();
    const std::vector<std::string> effects = shifts_of(context, group, run);
    const std::string kinds = kinds_of(group.others);
    const std::size_t place = place_of_others(context, group);
    if (!effects.empty()) {
        context.findings.error(
            place,
            "{} in group {}, which shifts the positions: {}; keep all but items out of the group",
            kinds, quoted_name(group.name), some_of(effects));
    } else if (!said && group.items.empty() &&
               std::ranges::any_of(group.others, [](mxml_node_t *other) {
                   return kind_of(other).starts_with('<');
               })) {
        context.findings.error(
            place,
            "{} in group {}, which has no item: {} would run nothing; write <Cmd> "
            "for each item",
            kinds, quoted_name(group.name), path_of(group.name));
    } else if (!said) {
        context.findings.warning(place,
                                 "{} in group {}: {} would look for more items than there are, and "
                                 "go on; keep all but items out of the group",
                                 kinds, quoted_name(group.name), path_of(group.name));
    }
}

} // namespace fptest
