// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How what fptest doctor has found is shown.
#pragma once

#include "module/doctor.h"

#include <cstddef>
#include <string>
#include <vector>

namespace fptest
{

// "ok  ps           answers ...": a line, or several of at most that width.
std::string shown(const DeviceAnswer &answer, std::size_t width, bool coloured);

// Whether there is no error among them.
bool is_ready(const std::vector<DeviceAnswer> &answers);

// One object, its keys as in fptest(1).
std::string json_of(const std::vector<DeviceAnswer> &answers);

} // namespace fptest
