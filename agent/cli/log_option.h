// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The option --log, and files that must not be one and the same.
#pragma once

#include "module/log_file.h"

#include <CLI/CLI.hpp>

#include <string>
#include <vector>

namespace fptest
{

constexpr char kStandardInput[] = "/proc/self/fd/0";

void add_log(CLI::App &command, std::string &log);

// Whether two names mean one file, in which the writers would overwrite or break up each
// other's text. A terminal is not: both may write to it.
bool are_same_file(const std::string &one, const std::string &other);

// False for a device that swallows everything: any number of outputs may name it.
bool is_standard_output(const std::string &file);

// Refuses two names of one file, or a name of the library's own, the stored plan.
void require_different(std::vector<NamedFile> files);

// Refuses a log (--log, else VR_LOG_FILE) that would go into the stored plan or into what
// this program writes to standard output. It may share a terminal or pipe with a view, but
// not a file, and never mixes with results.
enum class StdoutUse { nothing, view, results };
void require_log_of_its_own(const std::string &log, StdoutUse use);

} // namespace fptest
