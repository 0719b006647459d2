// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The library's process, from the inside.
#pragma once

namespace fptest
{

// Turns this process, which was just made, into the library's: it calls the library
// as the messages on the socket say, until their sender is gone. What the library
// starts prints into the output and gets no input.
[[noreturn]] void serve_library(int socket, int output);

} // namespace fptest
