// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What is wrong with a command line, worded like every other error.
#pragma once

#include <CLI/CLI.hpp>

#include <string>
#include <vector>

namespace fptest
{

// "fptest: --plan is given 2 times: give it once; see fptest run --help", with a
// line feed.
std::string usage_line(const CLI::App *app, const CLI::Error &error);

// Splits "--name=" into "--name" and an empty value: the parser would take the next word
// for the value.
std::vector<std::string> split_empty_values(const CLI::App &command,
                                            std::vector<std::string> words);

// "--shuffle 7" as "--shuffle=7": CLI11 would take a PATH for the seed as well.
std::vector<std::string> join_seed(std::vector<std::string> words);

// Puts a "--" before the words of fptest measure: the parser would take "-.5" for an option.
std::vector<std::string> mark_numbers(const CLI::App &command, std::vector<std::string> words);

// Says that the program has no such option, without "fptest: " and a line feed.
std::string unknown_option(const std::string &word, const CLI::App &app);

} // namespace fptest
