// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/document_checks.h"
#include "check/plan_checks.h"

#include <cstring>
#include <string_view>
#include <strings.h>

namespace fptest
{

namespace
{

// Reports a name that a path splits or cuts.
void report_unaddressable(const CheckContext &context, std::size_t place, std::string_view what,
                          const std::string &name, const std::string &path, const Resolution &run)
{
    const std::string damage = path_damage(name);
    if (damage.empty()) {
        context.findings.error(place,
                               "{} {} cannot be addressed: its name has {} bytes, a node path "
                               "holds {} of it and would run {}; shorten it",
                               what, quoted_name(name), name.size(), kNameLimit, names_of(run));
        return;
    }
    const bool cuts_program = what == "item" && name.find_first_of("\t\n") != name.npos;
    context.findings.error(
        place, "{} {} cannot be addressed: a node path {}{}, and {} would run {}; rename it", what,
        quoted_name(name), damage, cuts_program ? ", as is the name of its program" : "", path,
        names_of(run));
}

// Except for a name without a value, which is reported already.
void report_unnamed(const CheckContext &context, std::size_t element, const char *text)
{
    if (!context.places.is_valueless(element, "name")) {
        context.findings.error(context.places.of(element, "name"), "{}", text);
    }
}

} // namespace

void check_tags(const CheckContext &context)
{
    for (mxml_node_t *node : context.plan.elements()) {
        for (const char *meant : {"CmdGroup", "Cmd"}) {
            const char *tag = mxmlGetElement(node);
            if (strcasecmp(tag, meant) == 0 && std::strcmp(tag, meant) != 0) {
                context.findings.warning(
                    context.places.of(context.plan.number(node)),
                    "{} is ignored: element names are case-sensitive; write <{}>", kind_of(node),
                    meant);
            }
        }
    }
}

bool check_group_name(const CheckContext &context, const Group &group)
{
    const std::string &name = group.name;
    const std::size_t place = context.places.of(group.number, "name");
    if (group.node == context.plan.top()) {
        context.findings.error(context.places.of(group.number),
                               "the library looks for groups below the top of the document, and "
                               "would not find this one; begin it with {}",
                               kDeclaration);
    } else if (name.empty()) {
        report_unnamed(context, group.number,
                       attribute(group.node, "name")
                           ? "the name of a group is empty: no node path leads to it; write one"
                           : "a group has no name: no node path leads to it; add name=\"...\"");
    } else if (!is_addressable(name)) {
        report_unaddressable(context, place, "group", name, path_of(name),
                             context.plan.resolve(name));
    } else if (mxml_node_t *const first = context.plan.find_group(name); first != group.node) {
        context.findings.error(
            place, "a second group {}: {} finds the one in {}, and never this one; rename it",
            quoted_name(name), path_of(name), context.places.line_of(context.plan.number(first)));
    } else {
        return true;
    }
    return false;
}

void check_item_name(const CheckContext &context, const Group &group, const Item &item,
                     const std::size_t *first)
{
    const std::string &name = item.name;
    const std::size_t place = context.places.of(item.number, "name");
    if (name.empty()) {
        report_unnamed(context, item.number,
                       attribute(item.node, "name")
                           ? "the name of an item is empty: the library would not run it; write "
                             "the name of its program"
                           : "an item has no name: the library would not run it; add name=\"...\" "
                             "with the name of its program");
    } else if (group.found && !is_addressable(name)) {
        report_unaddressable(context, place, "item", name, path_of(group.name, name),
                             {context.plan.resolve(group.name, name)});
    } else if (group.found && first != nullptr) {
        context.findings.error(
            place,
            "a second item {} in group {}: {} finds the one in {}, and so do reports; rename it",
            quoted_name(name), quoted_name(group.name), path_of(group.name, name),
            context.places.line_of(*first));
    }
}

} // namespace fptest
