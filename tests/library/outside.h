// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Programs run, their output, and what they say of a library.
#pragma once

#include "quoted.h"
#include "support/process.h"
#include "support/temporary_directory.h"

#include <gtest/gtest.h>

#include <regex>
#include <string>
#include <vector>

using Words = std::vector<std::string>;

inline const std::string kSource = QUILLMARK_SOURCE_DIR;

using support::Ended;
using support::run_shell;
using support::TemporaryDirectory;

// The last words of the lines that match.
inline Words last_words(const std::string &text, const std::string &pattern)
{
    Words words;
    const std::regex wanted(pattern);
    for (const std::string &line : support::lines_of(text)) {
        if (std::regex_search(line, wanted)) {
            words.push_back(line.substr(line.find_last_of(" [") + 1));
        }
    }
    return words;
}

inline Words exports_of(const std::string &library)
{
    const Ended listing = run_shell("nm --dynamic --defined-only " + quoted(library));
    EXPECT_EQ(listing.status, 0) << listing.out;
    return last_words(listing.out, ".");
}

// The entries of that kind of a library's dynamic section.
inline Words entries_of(const std::string &library, const std::string &kind)
{
    const Ended listing = run_shell("readelf --dynamic --wide " + quoted(library));
    EXPECT_EQ(listing.status, 0) << listing.out;
    return last_words(listing.out, "\\(" + kind + "\\)");
}

inline Words needs_of(const std::string &library)
{
    return entries_of(library, "NEEDED");
}
