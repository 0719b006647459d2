// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <chrono>
#include <functional>
#include <thread>

namespace support
{

// Whether the condition holds, now or within that time.
inline bool eventually(const std::function<bool()> &condition, double seconds = 10)
{
    using namespace std::chrono;
    const auto end = steady_clock::now() + duration<double>(seconds);
    while (!condition()) {
        if (steady_clock::now() >= end) {
            return false;
        }
        std::this_thread::sleep_for(milliseconds(5));
    }
    return true;
}

} // namespace support
