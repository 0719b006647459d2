// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What is measured.
#pragma once

#include "comparison.h"

namespace bench
{

Comparison ping();
Comparison unknown_head();
Comparison store();

// A group run of so many items; the figures are for one item.
Comparison group_run(int items);
// How much of an item's two calls the first is, the query for a running gatherer.
double presence_query_share(int turns);

// One report into a plan of so many items, each in turn.
Comparison report(int items);

Comparison read_back(int kilobytes);
// Opened, loaded by Mini-XML and closed is the baseline; of the second, the loading
// alone.
Comparison first_load(int items);
Comparison first_load_to_parser(int items);

Comparison trigger();

// quillmark-ps among 1,000 processes: all of them, and one that is not there; the
// baseline is the bare reading, or Android's own program.
Comparison ps_of_all();
Comparison ps_of_one();
Comparison ps_beside_toybox();

// fptest run of so many items beside fptest send of the same commands; the figures are for
// one item.
Comparison agent_run_of_silent(int items);
Comparison agent_run_of_reporting(int items);

// For the growth: the library's two lookups, and the search by Mini-XML that they
// are made of. No baselines.
Comparison lookup_by_name(int items);
Comparison lookup_by_position(int items);
Comparison search(int items);

// --- outside of this process --------------------------------------------------

// Whether the library is small enough on disk, and what an idle agent and commands
// leave in memory.
void print_sizes();
void print_memory();

// Other programs that run tests, for orientation: time for one trivial item, without
// what starting them takes; and ours, with and without the query for a running
// gatherer, which is query (0 to 1) of it.
void print_peers(double ours, double query, int items);

} // namespace bench
