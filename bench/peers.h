// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Other programs that run tests, for orientation.
#pragma once

#include <string>

namespace bench
{

// Time for one trivial item: ours, with and without the query for a running
// gatherer, which is query (0 to 1) of it, and theirs, without what starting them
// takes.
std::string peer_table(double ours, double query, int items);

} // namespace bench
