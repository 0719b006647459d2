// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include "files.h"

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <stdexcept>
#include <string>
#include <system_error>

namespace support
{

// A directory that is gone with this object.
class TemporaryDirectory
{
  public:
    TemporaryDirectory()
    {
        std::string name = std::filesystem::temp_directory_path() / "quillmark-test-XXXXXX";
        if (mkdtemp(name.data()) == nullptr) {
            throw std::runtime_error("no temporary directory " + name);
        }
        path_ = name;
    }
    TemporaryDirectory(const TemporaryDirectory &) = delete;
    TemporaryDirectory &operator=(const TemporaryDirectory &) = delete;
    ~TemporaryDirectory()
    {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }

    const std::filesystem::path &path() const
    {
        return path_;
    }
    std::string path(const std::string &name) const
    {
        return path_ / name;
    }

    // The path of a file with that text, and of the directories that it is in.
    std::string write(const std::string &name, const std::string &text) const
    {
        std::filesystem::create_directories((path_ / name).parent_path());
        write_file(path_ / name, text);
        return path_ / name;
    }
    std::string program(const std::string &name, const std::string &script) const
    {
        write(name, script);
        std::filesystem::permissions(path_ / name, std::filesystem::perms::owner_all);
        return path_ / name;
    }

    // The names of what it holds, sorted.
    Lines names() const
    {
        Lines names;
        for (const auto &entry : std::filesystem::directory_iterator(path_)) {
            names.push_back(entry.path().filename());
        }
        std::sort(names.begin(), names.end());
        return names;
    }

  private:
    std::filesystem::path path_;
};

} // namespace support
