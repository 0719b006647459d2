// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

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
// longer than kFileLimit, errno then says why. Flags are those of open().
inline constexpr std::size_t kFileLimit = 16U << 20U;
std::optional<std::string> read_file(const std::string &path, int flags = 0);

// Why read_file() has just failed, for people.
std::string why_unread();

// As read_file(), but throws a Failure where it cannot be read.
std::string require_file(const std::string &path);

// Where a path leads through symbolic links, also to a file that is not there yet.
std::string end_of_links(const std::string &path);

} // namespace fptest
