// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the two dialects of ps share. Their run functions give the exit status.

#pragma once

#include <cstddef>
#include <span>
#include <string>
#include <sys/types.h>
#include <vector>

struct Process {
    int pid = 0;
    uid_t owner = 0; // of its directory: root's if the process may not be dumped
    std::string kernel_name;
    std::vector<std::string> fields; // of its stat file, from its state on
    std::string arguments;           // each ends with a zero

    std::string content_of(const std::string &file) const;
    // proc(5) counts the fields from 1.
    long long number(std::size_t field) const;
};

// Empty if it cannot be read.
std::string read_text(const std::string &path);

// In the order in which /proc lists them: by process id.
std::vector<Process> look_at_all();

std::string user_name(uid_t user);

// Says why on standard error.
int fail(const std::string &message);

int not_imitated(const std::string &option, int release, const std::string &options);

int run_toolbox(int release, std::span<char *const> arguments);
int run_toybox(int release, std::span<char *const> arguments);
