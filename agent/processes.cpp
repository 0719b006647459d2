// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "processes.h"

#include "plan.h"

#include <algorithm>
#include <charconv>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <map>
#include <optional>
#include <sstream>
#include <system_error>

namespace fptest
{
namespace
{

struct Process {
    pid_t parent = 0;
    char state = '?';
    std::string program; // as it was started, or the kernel's name for it
    std::string name;    // without the path
};

std::string file_text(const std::filesystem::path &path)
{
    const std::ifstream file(path, std::ios::binary);
    std::ostringstream text; // makes nothing of a process that has ended
    text << file.rdbuf();
    return text.str();
}

std::optional<Process> read_process(const std::filesystem::path &directory)
{
    const std::string stat = file_text(directory / "stat");
    const auto open = stat.find('(');
    const auto close = stat.rfind(')');
    if (open == std::string::npos || close == std::string::npos || close + 4 > stat.size()) {
        return std::nullopt;
    }
    Process process;
    process.state = stat[close + 2];
    process.parent = std::atoi(stat.c_str() + close + 3);
    const std::string command = file_text(directory / "cmdline").c_str();
    process.program = command.empty() ? stat.substr(open + 1, close - open - 1) : command;
    process.name = process.program.substr(process.program.rfind('/') + 1);
    return process;
}

std::map<pid_t, Process> read_processes()
{
    std::map<pid_t, Process> processes;
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

bool is_below(const std::map<pid_t, Process> &processes, pid_t pid, pid_t ancestor)
{
    for (std::size_t steps = 0; steps < processes.size(); ++steps) {
        const auto found = processes.find(pid);
        if (found == processes.end()) {
            return false;
        }
        pid = found->second.parent;
        if (pid == ancestor) {
            return true;
        }
    }
    return false;
}

} // namespace

bool runs_below(pid_t ancestor, const std::vector<std::string> &items)
{
    const auto processes = read_processes();
    for (const auto &[pid, process] : processes) {
        if (process.state == 'Z' || !is_below(processes, pid, ancestor)) {
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

std::optional<std::pair<std::string, pid_t>>
process_of_any(const std::vector<std::string> &programs)
{
    for (const auto &[pid, process] : read_processes()) {
        if (process.state != 'Z' &&
            std::ranges::find(programs, process.program) != programs.end()) {
            return std::pair(process.program, pid);
        }
    }
    return std::nullopt;
}

bool end_below(pid_t ancestor)
{
    bool found = false;
    const auto processes = read_processes();
    for (const auto &[pid, process] : processes) {
        if (process.state != 'Z' && is_below(processes, pid, ancestor) &&
            !process.name.starts_with(kGatherer)) {
            found = kill(pid, SIGTERM) == 0 || found;
        }
    }
    return found;
}

} // namespace fptest
