// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The processes that the library has started, as /proc shows them: items, and the gatherer,
// which goes on when its item has ended.
#pragma once

#include "module/leftover.h"

#include <optional>
#include <string>
#include <sys/types.h>
#include <utility>
#include <vector>

namespace fptest
{

// Whether the library takes this process for a running gatherer.
bool is_found_as_gatherer(pid_t process);
// Any such process, started by its whole path.
std::optional<std::pair<std::string, pid_t>> found_as_gatherer();
// Whether such a process still runs a program in whose place another file is now.
bool is_gatherer_outdated();

// Whether a stop would find a process by one of these names, of which it gives ps the first
// characters.
bool runs_below(pid_t ancestor, const std::vector<std::string> &items);

// The process that a stop of this item hits: the first that ps lists by that name.
std::optional<pid_t> met_by_stop(const std::string &item);

// A process that was started as one of these programs, by its whole path.
std::optional<std::pair<std::string, pid_t>>
process_of_any(const std::vector<std::string> &programs);

// What a library's process has started, directly or not.
class ChildProcesses
{
  public:
    // The ancestor inherits what the library's process leaves behind; it may be the same.
    ChildProcesses(pid_t library, pid_t ancestor, int vendor)
        : library_(library), ancestor_(ancestor), vendor_(vendor)
    {
    }

    // Everything but the gatherer and what it has started. Those left out are so with their
    // process groups and descendants.
    std::vector<Leftover> of_items(const std::vector<Leftover> &left_out = {}) const;

    // Signals items and the gatherer, even an earlier run's.
    void signal_all(int signal) const;

    // The gatherer, also while it is being started, or an earlier run's, and its descendants.
    std::vector<Leftover> of_gatherer() const;

  private:
    pid_t library_;
    pid_t ancestor_;
    int vendor_; // decides the gatherer's name
};

// Sends them a signal. False if all of them have gone.
bool signal_each(const std::vector<Leftover> &processes, int signal);

// As signal_each() with SIGTERM, which reaches suspended ones as well.
bool ask_to_end(const std::vector<Leftover> &processes);

// Whether it has not ended, nor moved to another process group, as a new item does.
bool lives(const Leftover &process);

// "D", "S", ...: the state of a process as ps shows it; '?' if it is gone.
char state_of(pid_t process);

} // namespace fptest
