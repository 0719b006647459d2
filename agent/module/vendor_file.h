// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The parameter file, from which the library reads the vendor selector.
#pragma once

#include <string>

namespace fptest
{

// Why the library takes 0 for the selector, on one line; empty if it has read one. Throws a
// Failure if it would wait in the file's place without end.
std::string why_no_vendor();

// Whether that is for no more than that there is no file, as on many devices.
bool is_vendor_file_there();

} // namespace fptest
