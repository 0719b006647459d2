// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the tests on the virtual device share. They link the libraries as they
// are shipped; each runs in a process and a device of its own.
#pragma once

#include "quillmark.h"
#include "support/files.h"
#include "support/wait.h"

#include <gmock/gmock.h>

#include <cstddef>
#include <string>
#include <sys/types.h>
#include <utility>
#include <vector>

namespace device
{

inline constexpr char kPlanFile[] = "/data/vorlane/src1.xml";
inline constexpr char kParameterFile[] = "/etc/vorlane/sysparms/vr_common_cfg.xml";
inline constexpr char kLogFile[] = "/tmp/vr.log";
inline constexpr unsigned short kTriggerPort = 34952;
inline constexpr char kProbe[] = "/system/bin/SensorProbe";
// Its name holds the gatherer's, so that it counts as one; it connects nowhere.
inline constexpr char kHolder[] = "/system/bin/SensorProbeHolder";

using support::eventually;
using support::Lines;
using support::lines_of;
using support::read_file;
using support::write_file;

// --- plans and commands ----------------------------------------------------

struct PlanItem {
    std::string name;
    std::string args;
};

// A plan of one group after another, without a declaration and without white
// space, so that many items fit into what a command can carry.
std::string plan_of(const std::vector<std::pair<std::string, std::vector<PlanItem>>> &groups);

// A plan of the group G alone, with these items.
std::string group_of(const std::vector<PlanItem> &items);

void store(const std::string &plan);

// Sends "XMLNodePath::PATH" and expects the empty reply.
void run_path(const std::string &path);

std::string read_back(int room = 64 * 1024);

// --- files -----------------------------------------------------------------

// The parameter file, with this text for the vendor selector.
void set_vendor(const std::string &text);

bool is_in_place();

// Leaves no room in /data/vorlane, until the filler is removed.
inline constexpr char kFiller[] = "/data/vorlane/filler";
void fill_disk();

// What the test items have noted of themselves: "PROGRAM|ARG|ARG" a line.
Lines ran();

// --- log -------------------------------------------------------------------

// The log lines since the last call, of this process or of the one named, as
// "FUNCTION| TEXT"; a place "FUNCTION[line]" is written "FUNCTION[]". Other tags
// are "TAG: TEXT".
Lines log_lines();
Lines log_lines(pid_t process);

// --- processes and descriptors ---------------------------------------------

struct Process {
    pid_t pid = 0;
    pid_t parent = 0;
    char state = '?';
    std::string name; // argv[0], or the kernel's name
};

std::vector<Process> processes();

// Those of them with exactly that name.
std::vector<Process> processes_named(const std::string &name);

// How many of this process's children have ended and not been waited for.
std::size_t zombies();

// Whether all children end but for one that goes on running.
bool children_end(pid_t running = -1);

// The number of the signal that ends that child, waited for.
int signal_that_ends(pid_t child);

// A field of /proc/PID/status, as it is there.
std::string status_field(pid_t pid, const std::string &field);

// Descriptors of this process with what they refer to; the log's is left out.
std::vector<std::pair<int, std::string>> descriptors();

// How many of them refer to that kind, as "socket:".
std::size_t count_open(const std::string &kind);

// Starts an item's program without the library, by its whole path, and expects that it
// is there.
pid_t start_item_program(const std::vector<std::string> &arguments);

} // namespace device

// The log goes to a file, SIGPIPE is ignored as hosts should, and what a test
// has left running is ended with it.
class DeviceTest : public ::testing::Test
{
  protected:
    void SetUp() override;
    void TearDown() override;
};

using namespace device;
using namespace testing;
