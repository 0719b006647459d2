// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the library calls outside itself, for the fuzz targets: the same calls as
// the unit tests' doubles take over, but nothing is scripted and little is
// recorded, so that a run costs microseconds. The test plan file is in memory;
// nothing is started, signalled or listened on.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace doubles
{

// One run: the library as at load time, on a platform without a test plan. Its end
// frees the plan and closes what the library leaves open on purpose.
class Run
{
  public:
    Run();
    ~Run();
    Run(const Run &) = delete;
    Run &operator=(const Run &) = delete;
};

void write_plan(std::string_view text);
std::optional<std::string> plan();

// What the parameter file holds, and what each popen's program prints.
void set_vendor(std::string_view text);
void set_listing(std::string_view text);

// What has been started since the last call of this function, in order:
// "popen COMMAND", "system COMMAND", "launch" for a vfork, "shell COMMAND" for an
// execve, "trigger" for an accepted connection; and "print TEXT" for what went to
// standard output.
std::vector<std::string> started();

// How many descriptors and streams the library has open.
std::size_t left_open();

// Runs the body with vfork returning as in the child, up to the child's end.
void run_as_child(void (*body)());

// Ends the process with the text if the condition does not hold: a finding.
void require(bool condition, const char *text);

} // namespace doubles
