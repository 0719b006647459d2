// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A program that a test starts: with arguments, an environment and an input, and
// what comes of it. Waited for, or left running to be signalled.
#pragma once

#include "common/descriptor.h"

#include <chrono>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <sys/types.h>
#include <vector>

namespace support
{

using Environment = std::map<std::string, std::optional<std::string>>;

struct Start {
    std::vector<std::string> arguments; // with the program's name first
    std::string program{};              // its file, if not what the first argument finds
    std::string input{};
    Environment environment{};       // a value, or nothing to take the variable away
    std::string directory{};         // to start in, if not this process's own
    std::string output{};            // a file for standard output, in place of keeping it
    bool is_one_stream = false;      // errors are kept with the output, in their order
    bool shares_streams = false;     // it has this process's own streams, and nothing is kept
    std::function<void()> prepare{}; // called first in the new process
};

struct Ended {
    int status = 0; // minus the number of the signal that ended it
    std::string out;
    std::string err;
    double seconds = 0;
};

class Process
{
  public:
    explicit Process(const Start &start);
    // A copy of this process that does this; its status is 1 after a test failure.
    explicit Process(const std::function<void()> &body);
    ~Process(); // kills it if it is still there
    Process(const Process &) = delete;
    Process &operator=(const Process &) = delete;

    pid_t pid() const
    {
        return pid_;
    }
    void signal(int number) const; // throws if it is gone
    void signal_group(int number) const;

    // What it has printed so far.
    std::string out() const;
    std::string err() const;

    bool has_ended();
    // Throws if it does not end in that time.
    Ended wait(double seconds = 60);

  private:
    [[noreturn]] void become(const Start &start) const;

    Descriptor input_;
    Descriptor output_;
    Descriptor errors_;
    std::chrono::steady_clock::time_point began_ = std::chrono::steady_clock::now();
    pid_t pid_ = -1;
    std::optional<Ended> ended_;
};

// Runs it to its end.
Ended run(const Start &start);

} // namespace support
