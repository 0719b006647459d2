// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Reads "/system/bin/NAME ARGS" as the device's shell would, to find what would run besides
// the item.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace fptest
{

struct ShellReading {
    // What keeps the shell from running anything.
    struct Fault {
        enum class Kind { no_end, unexpected, nothing_after };
        Kind kind = Kind::no_end;
        std::size_t at = 0;
        std::string mark; // the characters that are there
    };
    // What the shell does besides starting the line's first command.
    struct Effect {
        // "${...}" and "$((...))" are expansions, at which the shell may give up.
        enum class Kind {
            command,
            substitution,
            expansion,
            redirection,
            no_descriptor, // a redirection to a word in place of one, as in ">&log"
            comment,
            function,
            continuation
        };
        Kind kind = Kind::command;
        std::size_t at = 0;
        std::string mark;
        std::string text; // what is run, and may be nothing; else all of it
    };

    std::optional<Fault> fault; // the first
    // In order, up to what ends the first command, or the first line feed that does.
    std::vector<Effect> effects;
};

// Reads a line as the device's shell does, except for reserved words: it misses faults that
// are only grammatical.
ShellReading read_shell_line(std::string_view line);

} // namespace fptest
