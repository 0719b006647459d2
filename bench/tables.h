// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What is measured outside of this process.
#pragma once

namespace bench
{

// Whether the library is small enough on disk, and what an idle agent and commands
// leave in memory.
void print_sizes();
void print_memory();

// Other programs that run tests, for orientation: time for one trivial item, without
// what starting them takes; and ours, with and without the query for a running
// gatherer, which is query (0 to 1) of it.
void print_peers(double ours, double query, int items);

} // namespace bench
