// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Files, and the stored plan among them.
#pragma once

#include "descriptor.h"

#include <cstddef>
#include <optional>
#include <string>

namespace fptest
{

// What is opened later would get the number of a standard stream that is closed, and
// what is meant for that: they are all opened.
void fill_standard_descriptors();
// Throws a Failure where standard output was closed before; who wants it is named.
void require_standard_output(const std::string &who);

// The whole file, "-" for standard input; nothing where it cannot be read, or is
// longer than kFileLimit, errno then says why.
inline constexpr std::size_t kFileLimit = 16U << 20U;
std::optional<std::string> read_file(const std::string &path);

// Why read_file() has just failed, for people.
std::string why_unread();

// The lock that those who report take on the stored plan, so that none writes
// what another has just overwritten. Waits for it, 10 seconds at most. A plan that
// is not there needs none.
Descriptor lock_stored_plan();

// Puts another text in the stored plan's place, whole or not at all. Throws a
// Failure where it cannot.
void replace_stored_plan(const std::string &text);

} // namespace fptest
