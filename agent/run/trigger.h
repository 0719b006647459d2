// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The port at which the library waits for the gatherer.
#pragma once

namespace fptest
{

// Takes the place of a gatherer that will not come: the library waits for one
// without end, and sends what it has to whoever connects.
void release_trigger();

} // namespace fptest
