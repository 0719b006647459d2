// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The library's process, from the inside.
#pragma once

namespace fptest
{

// Turns this new process into the library's: it calls the library as the messages on the
// socket say, until their sender is gone. Items print into the output and get no input.
[[noreturn]] void serve_library(int socket, int output);

} // namespace fptest
