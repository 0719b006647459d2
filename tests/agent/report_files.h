// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include "support/files.h"
#include "support/temporary_directory.h"

namespace report_files
{

using Directory = support::TemporaryDirectory;
using support::read_file;
using support::write_file;

// With their line feeds.
inline support::Lines lines_of(const std::string &text)
{
    support::Lines lines = support::lines_of(text);
    for (std::string &line : lines) {
        line += '\n';
    }
    return lines;
}

} // namespace report_files
