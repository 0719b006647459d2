// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include "common/descriptor.h"

#include <cstddef>
#include <optional>
#include <string>
#include <sys/mman.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace fptest
{

// Opens closed standard streams, or a file opened later would take such a stream's number,
// and what is printed there.
void fill_standard_descriptors();
// Throws a Failure if standard output was closed; it names who needs it.
void require_standard_output(const std::string &who);
// Whether a path, as /dev/stdout, leads to a standard stream that was closed.
bool is_closed_stream(const std::string &path);

// The whole file, "-" for standard input; nullopt if it cannot be read or is longer than
// kFileLimit, with the reason in errno. Flags are those of open().
inline constexpr std::size_t kFileLimit = 16U << 20U;
std::optional<std::string> read_file(const std::string &path, int flags = 0);

// An empty file in memory; not open if that fails, with the reason in errno.
inline Descriptor memory_file(const char *name, unsigned flags = 0)
{
    // not by the C library's name, which old Androids lack
    return Descriptor(static_cast<int>(syscall(SYS_memfd_create, name, MFD_CLOEXEC | flags)));
}

bool is_regular_file(int descriptor);

// Why read_file() has just failed, for a message.
std::string why_unread();

// As read_file(), but throws a Failure.
std::string require_file(const std::string &path);

// Follows symbolic links, even to a file that does not exist yet.
std::string end_of_links(const std::string &path);

} // namespace fptest
