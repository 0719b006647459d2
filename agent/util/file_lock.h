// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Locks of files that only one fptest may write at a time, be it on another device that
// shares their directory.
#pragma once

#include <fmt/core.h>
#include <string>

namespace fptest
{

// Locks the file until the process closes any descriptor of it. False if another process
// has; files that are not regular and file systems without locks have none to wait for.
bool lock_file(int descriptor);

// Whether another process has locked it.
bool is_locked(const std::string &path);

inline std::string locked_text(const std::string &file)
{
    return fmt::format("{}: another fptest is writing it; name another file", file);
}

} // namespace fptest
