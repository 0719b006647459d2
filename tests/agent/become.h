// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The last step of a child process.
#pragma once

#include <cstdlib>
#include <map>
#include <optional>
#include <string>
#include <unistd.h>
#include <vector>

// Runs a program in the place of this one, with those variables set, or unset
// where they have no value. Ends with 127 where it cannot be run.
[[noreturn]] inline void
become(const std::vector<std::string> &arguments,
       const std::map<std::string, std::optional<std::string>> &environment)
{
    for (const auto &[name, value] : environment) {
        if (value) {
            setenv(name.c_str(), value->c_str(), 1);
        } else {
            unsetenv(name.c_str());
        }
    }
    std::vector<char *> argv;
    for (const std::string &argument : arguments) {
        argv.push_back(const_cast<char *>(argument.c_str()));
    }
    argv.push_back(nullptr);
    execv(argv[0], argv.data());
    _exit(127);
}
