// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Whole files, and their lines.
#pragma once

#include <filesystem>
#include <fstream>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

namespace support
{

using Lines = std::vector<std::string>;

// Nothing of a file that is not there, as that of a process that has ended.
inline std::string read_file(const std::filesystem::path &path)
{
    std::ostringstream text;
    text << std::ifstream(path, std::ios::binary).rdbuf(); // a failing read ends it quietly
    return text.str();
}

inline void write_file(const std::filesystem::path &path, const std::string &text)
{
    std::ofstream file(path, std::ios::binary | std::ios::trunc);
    if (!(file << text << std::flush)) {
        throw std::runtime_error("cannot be written: " + path.string());
    }
}

// Without their line feeds.
inline Lines lines_of(const std::string &text)
{
    Lines lines;
    std::istringstream stream(text);
    for (std::string line; std::getline(stream, line);) {
        lines.push_back(line);
    }
    return lines;
}

} // namespace support
