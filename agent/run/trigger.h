// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The trigger port, on which the library waits for the gatherer.
#pragma once

namespace fptest
{

// Connects in place of a gatherer that will not: the library waits for ever, and
// triggers whoever connects.
void release_trigger();

} // namespace fptest
