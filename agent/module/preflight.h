// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What must hold before something runs on a device. Each require_...() throws a Failure that
// says what to do.
#pragma once

#include "util/failure.h"

#include <string>
#include <vector>

namespace fptest
{

// That the library, and the C library for it, can run commands.
void require_shell();

// That the plan's directory is there, and writable.
void require_data();

// That this is a device, and ready: both, and that the stored plan is a file.
void require_device();

// Asks, and adds to a Failure where more is said.
template <typename Question> auto refer_to_doctor(const Question &ask)
{
    try {
        return ask();
    } catch (const Failure &lack) {
        throw Failure(lack.cause(), "{}; see fptest doctor", lack.what());
    }
}

// That the library will be able to listen for the gatherer.
void require_trigger_port();

// That the items' programs are there, unless forced; that none still runs from an earlier
// run, as it would report into this one; and that a gatherer's trigger port is free.
void require_programs(const std::vector<std::string> &items, int vendor, bool force);

// The command line of a gatherer that runs already, if an item with one of these args would
// start another one; empty if not.
std::string other_gatherer(const std::vector<std::string> &args, const std::string &suffix);

} // namespace fptest
