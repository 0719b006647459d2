// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include "check/elements.h"
#include "check/findings.h"
#include "check/source_map.h"

#include <vector>

namespace fptest
{

// Says where a path of a group leads into a later one that is easily meant.
void check_later_groups(const Plan &plan, const SourceMap &places, const std::vector<Group> &groups,
                        Findings &findings);

} // namespace fptest
