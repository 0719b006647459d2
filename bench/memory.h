// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Memory: the library's on disk, an idle agent's, and what commands leave.
#pragma once

#include "figures.h"

namespace bench
{

// Whether what a device has to hold is small enough.
Verdict size_table();
Verdict memory_table();

} // namespace bench
