// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What is measured.
#pragma once

#include "contest.h"

#include <memory>

namespace bench
{

std::unique_ptr<Contest> ping();
std::unique_ptr<Contest> unknown_head();
std::unique_ptr<Contest> store();

// A group run of so many items; the figures are for one item.
std::unique_ptr<Contest> group_run(int items);
// How much of an item's two calls the first is, the query for a running gatherer.
double presence_query_share(int turns);

// One report into a plan of so many items, each in turn.
std::unique_ptr<Contest> report(int items);

std::unique_ptr<Contest> read_back(int kilobytes);
// Opened, loaded by Mini-XML and closed is the floor; of the second, the loading
// alone.
std::unique_ptr<Contest> first_load(int items);
std::unique_ptr<Contest> first_load_to_parser(int items);

std::unique_ptr<Contest> trigger();

// For the growth: the library's two lookups, and the search by Mini-XML that they
// are made of. No floors.
std::unique_ptr<Contest> lookup_by_name(int items);
std::unique_ptr<Contest> lookup_by_position(int items);
std::unique_ptr<Contest> search(int items);

} // namespace bench
