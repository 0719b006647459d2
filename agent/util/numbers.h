// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Numbers in the C locale's spelling, whatever the C++ library can read.
#pragma once

#include <charconv>

namespace fptest
{

std::from_chars_result read_number(const char *first, const char *last, int &number);

// As std::from_chars, which Android's C++ library has not for a double. "nan" and "inf" are
// numbers to it. The text ends with a zero.
std::from_chars_result read_number(const char *first, const char *last, double &number);

} // namespace fptest
