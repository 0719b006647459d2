// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A text as one word of a shell: paths have blanks and apostrophes where they like.
#pragma once

#include <string>

// Not a function, so that a std::string does not bring std::quoted into the choice.
inline constexpr auto quoted = [](const std::string &text) {
    std::string word = "'";
    for (const char c : text) {
        word += c == '\'' ? "'\\''" : std::string(1, c);
    }
    return word + "'";
};
