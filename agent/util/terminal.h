// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The terminal that a stream may be.
#pragma once

#include <cstddef>
#include <cstdio>

namespace fptest
{

// Whether the stream is a terminal that can move its cursor.
bool is_smart_terminal(std::FILE *stream);

// In columns, as it is at this moment; 80 where nothing tells.
std::size_t terminal_width(std::FILE *stream);

// Unless NO_COLOR is set to anything.
bool wants_colour();

} // namespace fptest
