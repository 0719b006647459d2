// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/processes.h"

#include "plan/library_rules.h"
#include "util/files.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <charconv>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <fmt/core.h>
#include <map>
#include <optional>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>

namespace fptest
{
namespace
{

struct Process {
    pid_t parent = 0;
    pid_t group = 0;
    unsigned long long threads = 0;
    unsigned long long born = 0; // in ticks since the system's start
    char state = '?';
    std::string program;   // argv[0], or the kernel's name for it
    std::string name;      // without the path
    std::string script;    // what an interpreter runs
    std::string listed_as; // by quillmark-ps: its program, or the script
    std::string arguments; // each with its NUL
    bool gathers = false;
};

using Processes = std::map<pid_t, Process>;

constexpr int kMostLists = 4;
constexpr std::size_t kKernelsName = 15; // characters; of a script it is the script's

std::string last_part(const std::string &path)
{
    return path.substr(path.rfind('/') + 1);
}

std::optional<Process> read_process(const std::filesystem::path &directory)
{
    const std::string stat = read_file(directory / "stat").value_or("");
    const auto open = stat.find('(');
    const auto close = stat.rfind(')');
    if (open == std::string::npos || close == std::string::npos || close + 4 > stat.size()) {
        return std::nullopt;
    }
    Process process;
    process.state = stat[close + 2];
    char *end = nullptr;
    process.parent = static_cast<pid_t>(std::strtol(stat.c_str() + close + 3, &end, 10));
    process.group = static_cast<pid_t>(std::strtol(end, &end, 10));
    for (int field = 5; field < 22; ++field) {
        process.threads = field == 20 ? process.born : process.threads;
        process.born = std::strtoull(end, &end, 10);
    }
    process.arguments = read_file(directory / "cmdline").value_or("");
    const std::string &arguments = process.arguments;
    const std::string command = arguments.c_str();
    process.program = command.empty() ? stat.substr(open + 1, close - open - 1) : command;
    process.name = last_part(process.program);
    std::size_t at = command.size() + 1;
    while (at < arguments.size() && arguments[at] == '-') { // options
        at += std::strlen(&arguments[at]) + 1;
    }
    const std::string script = at < arguments.size() ? &arguments[at] : "";
    constexpr std::array kShells{"sh", "mksh", "ksh", "ash", "dash", "bash"};
    const std::string kernels_name = stat.substr(open + 1, close - open - 1);
    const bool is_script =
        !script.empty() && last_part(script).substr(0, kKernelsName) == kernels_name;
    if (is_script || std::ranges::find(kShells, process.name) != kShells.end()) {
        process.script = script;
    }
    process.listed_as = is_script ? script : process.program;
    return process;
}

// False if all that are listed were read before.
bool add_unread(Processes &processes)
{
    const std::size_t before = processes.size();
    std::error_code gone;
    for (const auto &entry : std::filesystem::directory_iterator("/proc", gone)) {
        const std::string name = entry.path().filename();
        pid_t pid = 0;
        const auto [end, error] = std::from_chars(name.data(), name.data() + name.size(), pid);
        if (error != std::errc{} || end != name.data() + name.size() || processes.contains(pid)) {
            continue;
        }
        if (auto process = read_process(entry.path())) {
            processes.emplace(pid, std::move(*process));
        }
    }
    return processes.size() > before;
}

Processes read_processes()
{
    Processes processes;
    // One that forks and ends after it was listed, as a daemon does, has a child that was not.
    for (int lists = 0; lists < kMostLists && add_unread(processes); ++lists) {
    }
    return processes;
}

// One whose first thread has ended lives on in the others.
bool lives(const Process &process)
{
    return process.threads > 1 || (process.state != 'Z' && process.state != 'X');
}

double seconds_of(const timespec &time)
{
    return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) / 1e9;
}

double seconds_by(clockid_t clock)
{
    timespec now{};
    clock_gettime(clock, &now);
    return seconds_of(now);
}

double started_at(const Process &process)
{
    const auto ticks = static_cast<double>(sysconf(_SC_CLK_TCK));
    const double age = seconds_by(CLOCK_BOOTTIME) - static_cast<double>(process.born) / ticks;
    return seconds_by(CLOCK_REALTIME) - age;
}

// Whether the file, or a link on the way to it, is newer than that.
bool has_changed_since(double start, const std::filesystem::path &file, int links = 0)
{
    constexpr double kCoarse = 0.02; // the kernel's times are
    constexpr int kMostLinks = 40;
    std::filesystem::path way;
    struct stat status {
    };
    for (const std::filesystem::path &part : file) {
        way /= part;
        if (lstat(way.c_str(), &status) != 0 || links > kMostLinks) {
            return false;
        }
        const double changed = seconds_of(status.st_ctim);
        if (!S_ISDIR(status.st_mode) && changed > start + kCoarse &&
            changed <= seconds_by(CLOCK_REALTIME)) {
            return true;
        }
        std::error_code unknown;
        if (S_ISLNK(status.st_mode) &&
            has_changed_since(
                start, way.parent_path() / std::filesystem::read_symlink(way, unknown), ++links)) {
            return true;
        }
    }
    return false;
}

// Whether the predicate holds for the process or one of its ancestors.
template <typename Predicate>
bool comes_of(const Processes &processes, pid_t pid, const Predicate &predicate)
{
    for (std::size_t steps = 0; steps < processes.size(); ++steps) {
        const auto found = processes.find(pid);
        if (found == processes.end()) {
            return false;
        }
        if (predicate(*found)) {
            return true;
        }
        pid = found->second.parent;
    }
    return false;
}

bool is_below(const Processes &processes, pid_t pid, pid_t ancestor)
{
    return comes_of(processes, pid,
                    [ancestor](const auto &entry) { return entry.second.parent == ancestor; });
}

// All processes except the ancestor and its own ancestors: fptest's caller may have any
// name.
Processes read_others(pid_t ancestor)
{
    Processes processes = read_processes();
    for (auto found = processes.find(ancestor); found != processes.end();) {
        const pid_t parent = found->second.parent;
        processes.erase(found);
        found = processes.find(parent);
    }
    return processes;
}

// A program that has run another one, or has changed its arguments, is the gatherer
// still: "/system/bin/SensorProbe.real", "/system/bin/SensorProbe: idle".
bool continues(const std::string &program, const std::string &gatherer)
{
    return program.starts_with(gatherer) && program.size() > gatherer.size() &&
           std::isalnum(static_cast<unsigned char>(program[gatherer.size()])) == 0 &&
           program[gatherer.size()] != '_';
}

// Marks the gatherers. An earlier run may have left one of another vendor; among the
// processes of this run an item may have a name that begins as the gatherer's.
Processes read_family(pid_t ancestor, int vendor)
{
    Processes processes = read_others(ancestor);
    for (const int one : {0, 1}) {
        const std::string program = program_of(kGatherer, *vendor_suffix(one));
        for (auto &[pid, process] : processes) {
            const bool is_exact = process.program == program || process.script == program;
            if ((is_exact && one == vendor) || ((is_exact || continues(process.program, program) ||
                                                 continues(process.script, program)) &&
                                                !is_below(processes, pid, ancestor))) {
                process.gathers = true;
            }
        }
    }
    return processes;
}

bool comes_of_any(const Processes &processes, pid_t pid, const std::vector<Leftover> &others)
{
    return comes_of(processes, pid, [&](const auto &entry) {
        return std::ranges::any_of(others, [&](const Leftover &other) {
            return entry.first == other.process || entry.second.group == other.group;
        });
    });
}

bool comes_of_gatherer(const Processes &processes, pid_t pid)
{
    return comes_of(processes, pid, [](const auto &entry) { return entry.second.gathers; });
}

// As ps lists it and grep finds it.
bool is_found_as_gatherer(const Process &process)
{
    return lives(process) && process.listed_as.starts_with(program_of(kGatherer, ""));
}

template <typename Predicate>
std::vector<Leftover> leftovers(const Processes &processes, pid_t left_out,
                                const Predicate &predicate)
{
    std::vector<Leftover> all;
    for (const auto &[pid, process] : processes) {
        if (lives(process) && pid != left_out && predicate(pid, process)) {
            all.push_back({process.name, pid, process.group, process.born});
        }
    }
    return all;
}

} // namespace

bool runs_below(pid_t ancestor, const std::vector<std::string> &items)
{
    const auto processes = read_processes();
    for (const auto &[pid, process] : processes) {
        if (!lives(process) || !is_below(processes, pid, ancestor)) {
            continue;
        }
        for (const std::string &item : items) {
            if (!item.empty() && process.name.starts_with(item.substr(0, kStopLimit))) {
                return true;
            }
        }
    }
    return false;
}

std::optional<pid_t> met_by_stop(const std::string &item)
{
    for (const auto &[pid, process] : read_processes()) {
        if (last_part(process.listed_as).starts_with(item.substr(0, kStopLimit))) {
            return pid;
        }
    }
    return std::nullopt;
}

std::optional<std::pair<std::string, pid_t>>
process_of_any(const std::vector<std::string> &programs)
{
    for (const auto &[pid, process] : read_others(getpid())) {
        for (const std::string &program : {process.program, process.script}) {
            if (lives(process) && std::ranges::find(programs, program) != programs.end()) {
                return std::pair(program, pid);
            }
        }
    }
    return std::nullopt;
}

bool is_found_as_gatherer(pid_t process)
{
    const auto found = read_process(fmt::format("/proc/{}", process));
    return found && is_found_as_gatherer(*found);
}

std::optional<std::pair<std::string, pid_t>> found_as_gatherer()
{
    for (const auto &[pid, process] : read_processes()) {
        if (is_found_as_gatherer(process)) {
            return std::pair(process.listed_as, pid);
        }
    }
    return std::nullopt;
}

bool is_gatherer_outdated()
{
    const auto found = found_as_gatherer();
    const std::string process = found ? fmt::format("/proc/{}", found->second) : "";
    const auto read = found ? read_process(process) : std::nullopt;
    if (!read) {
        return false;
    }
    if (has_changed_since(started_at(*read), found->first)) {
        return true;
    }
    // Or another one is mounted there. What runs under another name, as a script's shell does,
    // cannot be compared.
    const std::string file = process + "/exe";
    std::error_code unknown;
    const std::string program = std::filesystem::read_symlink(file, unknown).filename();
    const std::string name = last_part(found->first);
    return (program == name || program == name + " (deleted)") &&
           !std::filesystem::equivalent(found->first, file, unknown) && !unknown;
}

std::vector<Leftover> ChildProcesses::of_items(const std::vector<Leftover> &left_out) const
{
    const Processes processes = read_family(ancestor_, vendor_);
    return leftovers(processes, library_, [&](pid_t pid, const Process &process) {
        return process.group != library_ && is_below(processes, pid, ancestor_) &&
               !comes_of_gatherer(processes, pid) && !comes_of_any(processes, pid, left_out);
    });
}

std::vector<Leftover> ChildProcesses::of_gatherer() const
{
    const Processes processes = read_family(ancestor_, vendor_);
    const auto library = processes.find(library_);
    return leftovers(processes, library_, [&](pid_t pid, const Process &process) {
        // or an item's, just before its own group and program
        const bool is_copy = library != processes.end() && process.parent == library_ &&
                             process.arguments == library->second.arguments;
        return comes_of_gatherer(processes, pid) ||
               (process.group == library_ && is_below(processes, pid, ancestor_) && !is_copy);
    });
}

void ChildProcesses::signal_all(int signal) const
{
    const Processes processes = read_family(ancestor_, vendor_);
    const auto all = leftovers(processes, library_, [&](pid_t pid, const Process & /* process */) {
        return is_below(processes, pid, ancestor_) || comes_of_gatherer(processes, pid);
    });
    signal_each(all, signal);
}

bool signal_each(const std::vector<Leftover> &processes, int signal)
{
    bool found = false;
    for (const Leftover &one : processes) {
        found = kill(one.process, signal) == 0 || found;
    }
    return found;
}

bool ask_to_end(const std::vector<Leftover> &processes)
{
    const bool found = signal_each(processes, SIGTERM);
    signal_each(processes, SIGCONT);
    return found;
}

bool lives(const Leftover &process)
{
    const auto found = read_process(fmt::format("/proc/{}", process.process));
    return found && lives(*found) && found->born == process.born && found->group == process.group;
}

char state_of(pid_t process)
{
    const auto found = read_process(fmt::format("/proc/{}", process));
    return found ? found->state : '?';
}

} // namespace fptest
