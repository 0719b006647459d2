// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Files by the names that a person at a desk has for them, seen from a virtual device.
#pragma once

#include <string>
#include <utility>
#include <vector>

namespace fptest
{

// Says what becomes of files that are to be written, each with the option that names
// it: a Failure where the host's directory is read-only on the virtual device, a line
// on standard error where the file goes with that. Elsewhere it does nothing.
void look_after_reports(const std::vector<std::pair<std::string, std::string>> &files);

// A file that is to be read: where device/run has changed the directory, one that is not
// there may be in the caller's.
std::string found_on_desk(const std::string &file);

// What a plan is called that comes from this file: the stored one where none is named.
std::string name_of_plan(const std::string &file);

} // namespace fptest
