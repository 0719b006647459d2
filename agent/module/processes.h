// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The processes below the one that holds the library: an item's own, and those of
// the gatherer, which stays when its item has ended.
#pragma once

#include <optional>
#include <string>
#include <sys/types.h>
#include <utility>
#include <vector>

namespace fptest
{

// A process that an item has left running at its end.
struct Leftover {
    std::string name; // of its program, without the path
    pid_t process = 0;
    pid_t group = 0;             // of processes
    unsigned long long born = 0; // on the kernel's clock: its number may be another's later
};

// Whether the library takes it for a running gatherer; and the first that it takes for
// one, with its whole path.
bool is_found_as_gatherer(pid_t process);
std::optional<std::pair<std::string, pid_t>> found_as_gatherer();

// Whether one is running that a stop finds by one of the items' names: ps is
// asked for the first characters of it.
bool runs_below(pid_t ancestor, const std::vector<std::string> &items);

// The one that a stop of this item meets: the first that ps lists by that name.
std::optional<pid_t> met_by_stop(const std::string &item);

// One that was started as one of these programs, by its whole path. All processes
// are read once, however many programs there are.
std::optional<std::pair<std::string, pid_t>>
process_of_any(const std::vector<std::string> &programs);

// What a library's process has started and what came of that.
class ChildProcesses
{
  public:
    // The library's process, which leads its own process group, and the one that
    // inherits what it leaves behind when it dies; they may be the same.
    ChildProcesses(pid_t library, pid_t ancestor, int vendor)
        : library_(library), ancestor_(ancestor), vendor_(vendor)
    {
    }

    // Those of items: everything but the gatherer, which the library starts in its
    // own process group, and what the gatherer has started. Some are left out, with
    // all of their process groups and what they have started.
    std::vector<Leftover> of_items(const std::vector<Leftover> &left_out = {}) const;

    // Sends a signal to everything that a suspended run suspends: the items' processes
    // and the gatherer, an earlier run's as well.
    void signal_all(int signal) const;

    // Those of the gatherer, also while it is being started, or of an earlier run.
    std::vector<Leftover> of_gatherer() const;

  private:
    pid_t library_;
    pid_t ancestor_;
    int vendor_; // by which the gatherer has its name
};

// Sends them a signal. False where none of them is there.
bool signal_each(const std::vector<Leftover> &processes, int signal);

// Whether it has not ended.
bool lives(const Leftover &process);

// "D", "S", ...: the state of a process as ps shows it; '?' where it has gone.
char state_of(pid_t process);

} // namespace fptest
