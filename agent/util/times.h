// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Times as people and result files read them.
#pragma once

#include <chrono>
#include <string>

namespace fptest
{

// "0.3 s", "12.0 s", "3:05", "1:02:05"
std::string duration(double seconds);

// As duration(), but with milliseconds under ten seconds: "0.012 s".
std::string fine_duration(double seconds);

// In UTC: "2024-05-06T07:08:09.123Z".
std::string timestamp(std::chrono::system_clock::time_point time);

} // namespace fptest
