// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What is wrong with a command line, said as every other error.
#pragma once

#include <CLI/CLI.hpp>

#include <string>

namespace fptest
{

// "fptest: --plan is given 2 times: give it once; see fptest run --help", with a
// line feed.
std::string usage_line(const CLI::App *app, const CLI::Error &error);

// That the program has no such option, without "fptest: " and a line feed.
std::string unknown_option(const std::string &word, const CLI::App &app);

} // namespace fptest
