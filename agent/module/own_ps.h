// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// quillmark-ps in the place of a device's ps that does not answer the library.
#pragma once

#include <optional>
#include <string>

namespace fptest
{

// The directory of the quillmark-ps that belongs to this fptest, and holds nothing else:
// where it is installed, or quillmark/bin beside the program; nullopt if there is none.
std::optional<std::string> directory_of_own_ps();

// For every process that is started from then on; after it, the places where the C library
// looks without a PATH.
void put_first_in_path(const std::string &directory);

// Asks the device's ps whether it answers the library. If not, quillmark-ps goes first in
// PATH, for every process that is started from then on. Returns what to tell the user, empty
// for nothing.
std::string choose_ps();

} // namespace fptest
