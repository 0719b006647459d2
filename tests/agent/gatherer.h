// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A gatherer that does what a test has it do.
#pragma once

#include "run_test.h"

#include <gtest/gtest.h>

#include <string>

// One of the test's own that is running already, until it goes out of scope.
struct Gatherer : support::Process {
    explicit Gatherer(const std::string &words)
        : Process({.arguments = {"sh", "-c",
                                 "exec -a " + std::string(device::kProbe) + " /system/bin/Item " +
                                     words}})
    {
        EXPECT_TRUE(
            support::eventually([] { return !device::processes_named(device::kProbe).empty(); }));
    }
};
