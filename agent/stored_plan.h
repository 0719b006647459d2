// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The stored plan while items report into it.
#pragma once

#include <string>

namespace fptest
{

// Its text, read again for a while where somebody is just writing it; then as it is.
std::string whole_stored_plan();

// Makes one load again that a report has spoiled, so that the next items can
// report: a result that the module has no text for, or a null description, is left
// without a value, and control characters and bytes that are no UTF-8 are kept as
// they came. Throws a Failure where it cannot be written.
void mend_stored_plan();

} // namespace fptest
