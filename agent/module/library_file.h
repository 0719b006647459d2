// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Which library is loaded.
#pragma once

#include <string>

namespace fptest
{

// The file that has this name's function or variable; empty if none has.
std::string provider_of(const char *name);

// The same of what is there.
std::string provider_at(const void *place);

// The library's version, as the file's name ends ("1.0.0"). Android's files have none there:
// "sha256:" and the file's digest then. Empty if the file cannot be read.
std::string library_version();

} // namespace fptest
