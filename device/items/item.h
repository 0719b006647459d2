// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the sample items have in common: their options, their reports, their
// pace. An item is a program of its own that reports through the library.
#pragma once

#include <chrono>
#include <string>

// The samples' use of the three result codes that the library knows.
enum class Result { passed = 0, failed = 1, unfinished = -2 };

class Item
{
  public:
    using Seconds = std::chrono::duration<double>;

    // Reads the options and ignores SIGPIPE. Bad options and --help end the program.
    Item(int argc, char **argv, const std::string &purpose, Seconds default_length);

    // Writes the item's progress, result and description into the stored test
    // plan. Safe beside the reports of other items, and not cut short when this
    // process is stopped.
    void report(int progress, Result result, const std::string &description) const;

    // Reports the end, and returns the program's exit status.
    int finish(Result result, const std::string &description) const;

    // Spends that share of the item's length, a number from 0 to 1.
    void work(double share) const;

    Seconds length() const
    {
        return length_;
    }
    // The name it was started under, without the path: with the vendor suffix.
    const std::string &program() const
    {
        return program_;
    }

  private:
    std::string program_;
    std::string group_;
    std::string name_;
    Seconds length_;
};

// "2.5 s"
std::string text(Item::Seconds length);
