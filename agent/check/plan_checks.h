// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The parts of check_plan(). Each adds what it finds.
#pragma once

#include "check/elements.h"
#include "check/shell_check.h"

#include <cstddef>
#include <string>
#include <unordered_set>
#include <vector>

namespace fptest
{

// Elements named almost like groups or items.
void check_tags(const CheckContext &context);

// False if no path finds the group.
bool check_group_name(const CheckContext &context, const Group &group);

// first is an earlier element of this group with the same name; null if there is none.
void check_item_name(const CheckContext &context, const Group &group, const Item &item,
                     const std::size_t *first);

// What the library and the shell make of an item's name and args.
void check_program(const CheckContext &context, const Item &item,
                   const std::unordered_set<std::string> &item_names, ShellChecker &shell);

// An item in another element of its group.
void check_nested(const CheckContext &context, const Group &group, const Item &item);

// Other nodes in a group, which shift the positions of its items.
void check_positions(const CheckContext &context, const Group &group);

// Paths of a group that lead into a later one, if the mistake is easy.
void check_later_groups(const CheckContext &context, const std::vector<Group> &groups);

} // namespace fptest
