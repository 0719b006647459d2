// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The library runs its items by system() and ignores the status. This program's own
// system(), which the linker finds before the C library's, reports it.
#pragma once

#include <functional>

namespace fptest
{

// The handler is called with each status, as waitpid() gives it, before system() returns.
// Each command then has a process group of its own, so that an item that signals its group
// does not hit the library.
void set_status_handler(std::function<void(int)> handler);

// From its return on system() fails, as if there were no shell.
void start_no_more_items();

// The shell that the C library's system() and popen() run.
const char *shell_of_c_library();

} // namespace fptest
