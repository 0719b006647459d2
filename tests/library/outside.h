// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Programs run, their output, and what they say of a library.
#pragma once

#include "../quoted.h"

#include <gtest/gtest.h>

#include <array>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <regex>
#include <sstream>
#include <string>
#include <sys/wait.h>
#include <vector>

using Words = std::vector<std::string>;

inline const std::string kSource = QUILLMARK_SOURCE_DIR;

struct Outcome {
    int status = -1;
    std::string output; // both streams
};

inline Outcome run(const std::string &command)
{
    Outcome outcome;
    FILE *pipe = popen(("( " + command + " ) 2>&1").c_str(), "r");
    std::array<char, 4096> buffer{};
    while (fgets(buffer.data(), buffer.size(), pipe) != nullptr) {
        outcome.output += buffer.data();
    }
    const int status = pclose(pipe);
    outcome.status = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    return outcome;
}

// The last words of the lines that match.
inline Words last_words(const std::string &text, const std::string &pattern)
{
    Words words;
    std::istringstream lines(text);
    const std::regex wanted(pattern);
    for (std::string line; std::getline(lines, line);) {
        if (std::regex_search(line, wanted)) {
            words.push_back(line.substr(line.find_last_of(" [") + 1));
        }
    }
    return words;
}

inline Words exports_of(const std::string &library)
{
    const Outcome listing = run("nm --dynamic --defined-only " + quoted(library));
    EXPECT_EQ(listing.status, 0) << listing.output;
    return last_words(listing.output, ".");
}

// The entries of that kind of a library's dynamic section.
inline Words entries_of(const std::string &library, const std::string &kind)
{
    const Outcome listing = run("readelf --dynamic --wide " + quoted(library));
    EXPECT_EQ(listing.status, 0) << listing.output;
    return last_words(listing.output, "\\(" + kind + "\\)");
}

inline Words needs_of(const std::string &library)
{
    return entries_of(library, "NEEDED");
}

class Directory
{
  public:
    Directory()
    {
        char name[] = "/tmp/quillmark-library-XXXXXX";
        path_ = mkdtemp(name);
    }
    ~Directory()
    {
        std::filesystem::remove_all(path_);
    }
    Directory(const Directory &) = delete;
    Directory &operator=(const Directory &) = delete;

    std::string write(const std::string &name, const std::string &text) const
    {
        const std::filesystem::path file = path_ / name;
        std::filesystem::create_directories(file.parent_path());
        std::ofstream(file) << text;
        return file;
    }
    [[nodiscard]] std::string path() const
    {
        return path_;
    }

  private:
    std::filesystem::path path_;
};
