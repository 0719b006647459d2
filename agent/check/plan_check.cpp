// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/document_checks.h"
#include "check/plan_checks.h"

#include <unordered_map>

namespace fptest
{

namespace
{

void check_items(const CheckContext &context, const Elements &elements, const Group &group,
                 ShellChecker &shell)
{
    std::unordered_map<std::string, std::size_t> firsts;
    for (const Item &item : group.items) {
        const auto [first, is_first] = firsts.try_emplace(item.name, item.number);
        check_item_name(context, group, item, is_first ? nullptr : &first->second);
        check_program(context, item, elements.item_names, shell);
    }
    for (const Item &item : group.nested) {
        check_nested(context, group, item);
        check_program(context, item, elements.item_names, shell);
    }
}

// A gatherer goes on running, with the args that it was started with.
void check_gatherers(const CheckContext &context, const std::vector<Group> &groups)
{
    std::optional<std::string> first;
    std::string its_group;
    for (const Group &group : groups) {
        for (const Item &item : group.items) {
            if (item.name != kGatherer || !item.args) {
                continue;
            }
            if (first.value_or(*item.args) != *item.args) {
                context.findings.warning(
                    context.places.of(item.number, "args"),
                    "this gatherer is not started while the one of group {} runs, which has "
                    "other args: run them apart, and end it in between",
                    quoted_name(its_group));
            } else if (!first) {
                first = item.args;
                its_group = group.name;
            }
        }
    }
}

} // namespace

void check_plan(const CheckedPlan &checked, const Plan &plan, Findings &findings)
{
    const SourceMap places(checked.text, checked.tags, plan);
    const CheckContext context{plan, places, findings};
    Elements elements = elements_of(plan);
    ShellChecker shell(context);
    check_tags(context);
    if (elements.groups.empty()) {
        mxml_node_t *const root = plan.root();
        findings.error(places.of(root != nullptr ? plan.number(root) : 0),
                       "no CmdGroup in it: the library would find nothing to run; put the items "
                       "into <CmdGroup name=\"...\">");
        return;
    }
    for (Group &group : elements.groups) {
        group.found = check_group_name(context, group);
        check_items(context, elements, group, shell);
    }
    for (const Item &item : elements.stray) {
        findings.error(places.of(item.number),
                       "{} is in no group: no node path leads to it; put it into a <CmdGroup>",
                       words_for(item));
        check_program(context, item, elements.item_names, shell);
    }
    for (const Group &group : elements.groups) {
        if (group.found) {
            check_positions(context, group);
        }
    }
    check_later_groups(context, elements.groups);
    check_gatherers(context, elements.groups);
}

} // namespace fptest
