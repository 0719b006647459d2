// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What every unit test starts from.
#pragma once

#include "internals.h"
#include "platform.h"
#include "quillmark.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <initializer_list>
#include <string>
#include <vector>

using Lines = std::vector<std::string>;

inline Lines joined(std::initializer_list<Lines> parts)
{
    Lines all;
    for (const Lines &part : parts) {
        all.insert(all.end(), part.begin(), part.end());
    }
    return all;
}

// Every character that a string can hold, except those.
inline std::string every_character_but(const std::string &these)
{
    std::string text;
    for (int code = 1; code < 256; ++code) {
        const char character = static_cast<char>(code);
        if (these.find(character) == std::string::npos) {
            text += character;
        }
    }
    return text;
}

// The library as at load time, on a platform without a test plan.
class LibraryTest : public ::testing::Test
{
  protected:
    void SetUp() override
    {
        internals::reset();
        platform::reset();
    }
    void TearDown() override
    {
        internals::reset();
        platform::reset();
    }

    // Runs a command for its effects alone, and forgets its events.
    static void run_quietly(const std::string &command)
    {
        FPTEST_RunTestCmd(command.c_str(), nullptr, 0);
        platform::events();
    }

    static constexpr char kDeclaration[] = "<?xml version=\"1.0\"?>\n";
};

// For lists of lines: reads as the list itself does.
using ::testing::ElementsAre;
using ::testing::ElementsAreArray;
using ::testing::IsEmpty;
