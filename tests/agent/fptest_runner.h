// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// fptest as it is started from a shell: with arguments, an environment and an
// input, and what comes of it. Waited for, or left running to be signalled.
#pragma once

#include "device_test.h"
#include "support/process.h"

#include <string>
#include <sys/types.h>
#include <vector>

namespace fptest_runner
{

using support::Ended;
using support::lines_of;
using support::Start;

// Its arguments are those after the program's name.
class FptestProcess : public support::Process
{
  public:
    explicit FptestProcess(Start start);
    explicit FptestProcess(const std::vector<std::string> &arguments);

    // Its process that runs the library, waited for.
    pid_t library() const;
};

// How it may be started: each is a Start's prepare.
void as_plain_user();      // modes of files hold for it, as they do not for root
void without_device();     // it finds an empty /system/bin
void interrupted_before(); // SIGINT has come before it does anything
void in_own_group();       // of processes, as a shell with job control starts it
void in_own_session();

// Runs it to its end.
Ended run_fptest(const Start &start);
Ended run_fptest(const std::vector<std::string> &arguments, const std::string &input = "");

// It ends with that status and says why in that line, and nothing else.
void expect_refusal(int status, const std::string &line, const std::vector<std::string> &arguments,
                    const std::string &input = "");

// Another program of this system, with everything it prints in out.
Ended run_program(const std::vector<std::string> &arguments);

// The text with its times, like "0.3 s", made the same.
std::string without_times(const std::string &text);
device::Lines without_times(device::Lines lines);

// --- what the library says in its log -------------------------------------------

// The paths that it was told to run; what the agent asks it for itself is left out.
device::Lines paths_run(const std::string &log = device::kLogFile);
// The command lines of the items that it came to.
device::Lines programs_run(const std::string &log = device::kLogFile);
// The processes that it was told to stop.
std::vector<pid_t> processes_stopped(const std::string &log = device::kLogFile);

inline const std::string kOnePasses = device::group_of({{"Item", "report G 100 0 fine"}});

} // namespace fptest_runner

// A device with a directory of the test's own and no items left running in it.
class FptestTest : public DeviceTest
{
  protected:
    void SetUp() override;
    void TearDown() override;

    static constexpr char kWork[] = "/tmp/scene";

    static std::string work(const std::string &name);
    // The path of a file with that text.
    static std::string file(const std::string &name, const std::string &text);
    static std::string plan(const std::string &text);
    static bool is_there(const std::string &name);
    static bool wait_for_file(const std::string &name);
    // Items that are running, under any of their names.
    static device::Lines running_items();
    // A test failure if some go on.
    static void expect_items_to_end();
};

using namespace fptest_runner;
using namespace support;
