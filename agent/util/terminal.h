// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What a stream's terminal can do.
#pragma once

#include <cstddef>
#include <cstdio>

namespace fptest
{

// Whether the stream is a terminal that can move its cursor.
bool is_smart_terminal(std::FILE *stream);

// The current width in columns, or 80 if it is unknown.
std::size_t terminal_width(std::FILE *stream);

// Unless NO_COLOR is set and not empty.
bool wants_colour();

} // namespace fptest
