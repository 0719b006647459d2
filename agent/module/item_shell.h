// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The library runs its items by system() and looks at no status. This program has a
// system() of its own, which the library finds ahead of the C library's: it does the
// same, and tells the status.
#pragma once

#include <functional>

namespace fptest
{

// What is called with each status, as waitpid() gives it, before system() returns. Each
// command then runs in a process group of its own, so that an item which signals
// its group does not meet the library.
void set_status_handler(std::function<void(int)> handler);

} // namespace fptest
