// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// SHA-256, as FIPS 180-4 has it and sha256sum prints it. Of our own, as it is short, and every
// library that has it would be one more for fptest to need on a device.
#pragma once

#include <string>
#include <string_view>

namespace fptest
{

// 64 hexadecimal digits, in small letters.
std::string sha256(std::string_view bytes);

} // namespace fptest
