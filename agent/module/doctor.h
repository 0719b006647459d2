// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What a device must have, asked one by one.
#pragma once

#include <functional>
#include <string>
#include <vector>

namespace fptest
{

enum class Verdict {
    ok,
    warning, // a user may live with it
    error,   // the device is not ready
};

struct DeviceAnswer {
    std::string question; // a word
    Verdict verdict = Verdict::ok;
    std::string text; // what there is; where that is not ok, what to do after a semicolon
};

// Asks everything, in an order in which each answer explains those after it. The log must have
// been chosen, as the library is asked too. Nothing is left running.
void examine_device(const std::function<void(const DeviceAnswer &)> &tell);

} // namespace fptest
