// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/checks.h"
#include "check/plan_checks.h"

#include <algorithm>
#include <unordered_map>

namespace fptest
{

namespace
{

// The first element that is one in the text, too.
std::size_t root_of(const Plan &plan)
{
    const auto &elements = plan.elements();
    const auto found = std::ranges::find_if(
        elements, [](mxml_node_t *node) { return kind_of(node).starts_with("<"); });
    return found != elements.end() ? plan.number(*found) : 0;
}

void check_items(const PlanCheck &in, const Elements &elements, const Group &group,
                 ShellChecker &shell)
{
    std::unordered_map<std::string, std::size_t> firsts;
    for (const Item &item : group.items) {
        const auto [first, is_first] = firsts.try_emplace(item.name, item.number);
        check_item_name(in, group, item, is_first ? nullptr : &first->second);
        check_program(in, item, elements.item_names, shell);
    }
    for (const Item &item : group.nested) {
        check_nested(in, group, item);
        check_program(in, item, elements.item_names, shell);
    }
}

} // namespace

void check_plan(const CheckedPlan &read, const Plan &plan, Findings &findings)
{
    const SourceMap places(read.text, read.tags, plan);
    const PlanCheck in{plan, places, findings};
    Elements elements = elements_of(plan);
    ShellChecker shell(in);
    check_tags(in);
    if (elements.groups.empty()) {
        findings.error(places.of(root_of(plan)),
                       "no CmdGroup in it: the library would find nothing to run; put the items "
                       "into <CmdGroup name=\"...\">");
        return;
    }
    for (Group &group : elements.groups) {
        group.found = check_group_name(in, group);
        check_items(in, elements, group, shell);
    }
    for (const Item &item : elements.stray) {
        findings.error(places.of(item.number),
                       "{} is in no group: no node path leads to it; put it into a <CmdGroup>",
                       words_for(item));
        check_program(in, item, elements.item_names, shell);
    }
    for (const Group &group : elements.groups) {
        if (group.found) {
            check_positions(in, group);
        }
    }
    check_later_groups(in, elements.groups);
}

} // namespace fptest
