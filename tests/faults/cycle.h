// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// One cycle of commands that uses every exported function of the library.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace faults
{

constexpr std::size_t kBuffer = 4096;
constexpr char kUntouched = 'Z'; // fills the buffer before each step

struct Step {
    enum class Kind { Ping, Nothing, Store, Group, Item, Report, ReadBack, Stop };

    Kind kind;
    std::string name;
    std::string text;   // the plan to store, or the description to record
    std::string output; // of the program that it asks for what runs
    std::function<int(char *buffer)> call;
};

const std::vector<Step> &cycle();

// A step that sends a command to the library.
Step command(Step::Kind kind, const std::string &name, const std::string &text);

// The whole buffer after a reply, or as it was if there is none.
std::string replied(const std::optional<std::string> &reply);
// The whole buffer after a read-back of so much text.
std::string read_back(const std::string &text);

} // namespace faults
