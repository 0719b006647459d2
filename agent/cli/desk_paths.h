// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Files of the desk, as a program on the virtual device sees them.
#pragma once

#include <string>
#include <utility>
#include <vector>

namespace fptest
{

// Warns about output files, given with their options, that will be lost with the virtual
// device, and refuses those in a host directory, which is read-only there. Does nothing
// on a real device.
void warn_of_lost_outputs(const std::vector<std::pair<std::string, std::string>> &files);

// The name of a file to read. If device/run has changed the directory, a file that is not
// there may be in the caller's.
std::string found_on_desk(const std::string &file);

// What to call a plan from this file; the stored plan if no file is named.
std::string name_of_plan(const std::string &file);

} // namespace fptest
