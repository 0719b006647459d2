// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Whether the device's ps answers what the library asks it. Androids differ in that, and
// have differed with every other release.
#pragma once

#include <string>

namespace fptest
{

struct PsAnswers {
    bool was_asked = true;         // false if no process could be had to ask it about
    bool finds_path = false;       // "ps | grep PATH" has a line of the process
    bool finds_query = false;      // and one that is not its: the query's own grep, say
    bool finds_name = false;       // "ps NAME" lists it first: 28 characters, as a stop asks
    bool finds_short_name = false; // the same for 15, which is what the kernel keeps
    std::string header;            // the line of ps that names its columns; empty for none
    std::string complaint;         // what it says, or why it was not asked; empty for nothing

    // Whether ps is as the library needs it.
    bool is_enough() const
    {
        return finds_path && !finds_query && finds_name;
    }
};

// Asks the first ps in PATH as the library does, by the C library's shell, about a process of
// its own, for two seconds at most.
PsAnswers ask_ps();

// Whose ps answers so, as a subject: "toolbox's ps, of Android up to 5.1,".
std::string dialect_of(const PsAnswers &answers);

} // namespace fptest
