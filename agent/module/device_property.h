// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <string>

namespace fptest
{

// What Android's getprop says, on one line; empty if there is no such property, or no getprop.
std::string device_property(const std::string &name);

} // namespace fptest
