// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/processes.h"

#include "plan/library_rules.h"
#include "util/files.h"

#include <algorithm>
#include <charconv>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fmt/core.h>
#include <map>
#include <optional>
#include <system_error>

namespace fptest
{
namespace
{

struct Process {
    pid_t parent = 0;
    pid_t group = 0;
    char state = '?';
    std::string program; // argv[0], or the kernel's name for it
    std::string name;    // without the path
    std::string script;  // the shell's first argument that is no option
    bool gathers = false;
};

using Processes = std::map<pid_t, Process>;

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
    process.group = static_cast<pid_t>(std::strtol(end, nullptr, 10));
    const std::string arguments = read_file(directory / "cmdline").value_or("");
    const std::string command = arguments.c_str();
    process.program = command.empty() ? stat.substr(open + 1, close - open - 1) : command;
    process.name = last_part(process.program);
    if (process.name.ends_with("sh")) {
        std::size_t at = command.size() + 1;
        while (at < arguments.size() && arguments[at] == '-') { // its options
            at += std::strlen(&arguments[at]) + 1;
        }
        process.script = at < arguments.size() ? &arguments[at] : "";
    }
    return process;
}

Processes read_processes()
{
    Processes processes;
    std::error_code gone;
    for (const auto &entry : std::filesystem::directory_iterator("/proc", gone)) {
        const std::string name = entry.path().filename();
        pid_t pid = 0;
        const auto [end, error] = std::from_chars(name.data(), name.data() + name.size(), pid);
        if (error != std::errc{} || end != name.data() + name.size()) {
            continue;
        }
        if (auto process = read_process(entry.path())) {
            processes.emplace(pid, std::move(*process));
        }
    }
    return processes;
}

bool lives(const Process &process)
{
    return process.state != 'Z' && process.state != 'X';
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

// All processes except the ancestor and its own ancestors: fptest's caller may be named like
// a gatherer. The other vendor's gatherer counts only if an earlier run left it.
Processes read_processes(pid_t ancestor, int vendor)
{
    Processes processes = read_processes();
    for (auto found = processes.find(ancestor); found != processes.end();) {
        const pid_t parent = found->second.parent;
        processes.erase(found);
        found = processes.find(parent);
    }
    for (const int one : {0, 1}) {
        const std::string program = program_of(kGatherer, *vendor_suffix(one));
        for (auto &[pid, process] : processes) {
            if ((process.program == program || process.script == program) &&
                (one == vendor || !is_below(processes, pid, ancestor))) {
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

template <typename Predicate>
std::vector<Leftover> leftovers(const Processes &processes, pid_t left_out,
                                const Predicate &predicate)
{
    std::vector<Leftover> all;
    for (const auto &[pid, process] : processes) {
        if (lives(process) && pid != left_out && predicate(pid, process)) {
            all.push_back({process.name, pid, process.group});
        }
    }
    return all;
}

template <typename Predicate>
std::optional<std::pair<std::string, pid_t>> find_program(const Predicate &predicate)
{
    for (const auto &[pid, process] : read_processes()) {
        if (lives(process) && predicate(process.program)) {
            return std::pair(process.program, pid);
        }
    }
    return std::nullopt;
}

} // namespace

bool is_taken_for_gatherer(const Leftover &process)
{
    return process.name.starts_with(kGatherer);
}

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
        if (process.name.starts_with(item.substr(0, kStopLimit))) {
            return pid;
        }
    }
    return std::nullopt;
}

std::optional<std::pair<std::string, pid_t>>
process_of_any(const std::vector<std::string> &programs)
{
    return find_program([&](const std::string &program) {
        return std::ranges::find(programs, program) != programs.end();
    });
}

std::optional<std::pair<std::string, pid_t>> taken_for_gatherer()
{
    return find_program([gatherer = program_of(kGatherer, "")](const std::string &program) {
        return program.starts_with(gatherer);
    });
}

std::vector<Leftover> ChildProcesses::of_items(const std::vector<Leftover> &left_out) const
{
    const Processes processes = read_processes(ancestor_, vendor_);
    return leftovers(processes, library_, [&](pid_t pid, const Process &process) {
        return process.group != library_ && is_below(processes, pid, ancestor_) &&
               !comes_of_gatherer(processes, pid) && !comes_of_any(processes, pid, left_out);
    });
}

std::vector<Leftover> ChildProcesses::of_gatherer() const
{
    const Processes processes = read_processes(ancestor_, vendor_);
    return leftovers(processes, library_, [&](pid_t pid, const Process &process) {
        return comes_of_gatherer(processes, pid) ||
               (process.group == library_ && is_below(processes, pid, ancestor_));
    });
}

void ChildProcesses::signal_all(int signal) const
{
    const Processes processes = read_processes(ancestor_, vendor_);
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

char state_of(pid_t process)
{
    const auto found = read_process(fmt::format("/proc/{}", process));
    return found ? found->state : '?';
}

} // namespace fptest
