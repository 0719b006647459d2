// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// fptest as it is started from a shell: with arguments, an environment and an
// input, and what comes of it. Waited for, or left running to be signalled.
#pragma once

#include "common/descriptor.h"
#include "device_test.h"

#include <chrono>
#include <map>
#include <optional>
#include <string>
#include <sys/types.h>
#include <vector>

namespace fptest_runner
{

struct Start {
    std::vector<std::string> arguments;
    std::string input;
    // A value, or nothing to take the variable away.
    std::map<std::string, std::optional<std::string>> environment;
    std::string output;          // a file for standard output, in place of keeping it
    bool is_plain_user = false;  // modes of files hold for it, as they do not for root
    bool is_no_device = false;   // it finds an empty /system/bin
    bool is_interrupted = false; // SIGINT has come before it does anything
    bool has_own_group = false;  // of processes, as a shell with job control starts it
    bool has_own_session = false;
    std::vector<int> ignored; // signals, as by nohup
};

struct Ended {
    int status = 0; // minus the number of the signal that ended it
    std::string out;
    std::string err;
    double seconds = 0;
};

class FptestProcess
{
  public:
    explicit FptestProcess(const Start &start);
    explicit FptestProcess(const std::vector<std::string> &arguments);
    ~FptestProcess(); // kills it if it is still there
    FptestProcess(const FptestProcess &) = delete;
    FptestProcess &operator=(const FptestProcess &) = delete;

    pid_t pid() const
    {
        return pid_;
    }
    // Its process that runs the library, waited for.
    pid_t module() const;
    void signal(int number) const;

    // What it has printed so far.
    std::string out() const;
    std::string err() const;

    bool has_ended();
    // A test failure where it does not end in that time; it is killed then.
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
Ended run_fptest(const Start &start);
Ended run_fptest(const std::vector<std::string> &arguments, const std::string &input = "");

// It ends with that status and says why in that line, and nothing else.
void expect_refusal(int status, const std::string &line, const std::vector<std::string> &arguments);

// Another program of this system, by its path and with everything it prints in out.
Ended run_program(const std::vector<std::string> &arguments,
                  const std::map<std::string, std::optional<std::string>> &environment = {});

// Without their line feeds.
device::Lines lines_of(const std::string &text);

// The text with its times, like "0.3 s", made the same.
std::string without_times(const std::string &text);

// --- what the library says in its log -------------------------------------------

// The paths that it was told to run; what the agent asks it for itself is left out.
device::Lines paths_run(const std::string &log = device::kLogFile);
// The command lines of the items that it came to.
device::Lines programs_run(const std::string &log = device::kLogFile);
// The processes that it was told to stop.
std::vector<pid_t> processes_stopped(const std::string &log = device::kLogFile);

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
    // A test failure where some go on.
    static void expect_items_to_end();

    // Leaves no room in /data/vorlane.
    static void fill_disk();
    static bool is_in_place();
};
