// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// device/run as a person or a test runner starts it, and what comes of it.
#pragma once

#include "support/process.h"
#include "support/temporary_directory.h"
#include "support/wait.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <map>
#include <string>
#include <vector>

namespace launcher
{

namespace fs = std::filesystem;

using Words = std::vector<std::string>;

inline const fs::path tree = QUILLMARK_SOURCE_DIR;
inline const fs::path build = QUILLMARK_BINARY_DIR;
inline const std::string device_run = tree / "device/run";
inline const std::string this_program = fs::read_symlink("/proc/self/exe");

// ---- processes --------------------------------------------------------------

struct Outcome {
    int status = -1; // as a shell has it: 128 + N for signal N
    std::string out;
    std::string err;
};

struct Surroundings {
    fs::path directory = tree;
    support::Environment variables{};
    std::string input{};
};

support::Start start_of(const Words &words, const Surroundings &surroundings = {});
Outcome outcome_of(support::Process &process);
Outcome run(const Words &words, const Surroundings &surroundings = {});

Outcome on_device(const Words &command, const Words &options = {},
                  const Surroundings &surroundings = {});

Outcome shell(const std::string &script, const Words &options = {},
              const Surroundings &surroundings = {});

// What device/run has against the command line; it starts nothing then.
Outcome refused(const Words &arguments, const Surroundings &surroundings = {});

using support::eventually;

// ---- texts ------------------------------------------------------------------

// What ps prints first.
inline const std::string header = "USER     PID   PPID  VSIZE  RSS     WCHAN    PC         NAME";

Words operator+(Words left, const Words &right);
Words split(const std::string &text);
std::string last_line(const std::string &text);

using support::lines_of;

// ---- files ------------------------------------------------------------------

using support::read_file;
using support::TemporaryDirectory;

// ---- what the machine allows ------------------------------------------------

enum class Way { namespaces, in_place, none };

Way way();

// Tests of what holds on any device.
class Device : public testing::Test
{
  protected:
    void SetUp() override;
};

// Tests of the device that has namespaces of its own.
class NamespaceDevice : public Device
{
  protected:
    void SetUp() override;
};

} // namespace launcher
