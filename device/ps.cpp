// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// ps as Android's old toolbox prints it: ps [NAME]
//
// One header line, then one line for each process whose name starts with NAME,
// by process id. A process's name is the last part of its argv[0], or the
// kernel's name for it if it has no arguments (a zombie, for one). The NAME
// column shows argv[0] alone: a query piped into grep never finds its own grep.

#include "common/descriptor.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cstdio>
#include <fcntl.h>
#include <filesystem>
#include <iterator>
#include <optional>
#include <pwd.h>
#include <sstream>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <system_error>
#include <unistd.h>
#include <vector>

namespace
{

struct Process {
    pid_t pid = 0;
    pid_t parent = 0;
    uid_t user = 0;
    char state = '?';
    unsigned long long virtual_bytes = 0;
    long resident_pages = 0;
    unsigned long long wait_channel = 0;
    unsigned long long program_counter = 0;
    std::string kernel_name;
    std::string command; // argv[0]; empty if there is none

    std::string_view shown_name() const
    {
        return command.empty() ? kernel_name : command;
    }
    std::string_view name() const
    {
        const std::string_view shown = shown_name();
        return command.empty() ? shown : shown.substr(shown.rfind('/') + 1);
    }
};

// Nothing if the process has gone, before its file was opened or after.
std::optional<std::string> read_file(const std::filesystem::path &path)
{
    const Descriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
    std::string content;
    std::array<char, 4096> buffer{};
    ssize_t got = file.is_open() ? 1 : -1;

    while (got > 0) {
        got = read(file.get(), buffer.data(), buffer.size());
        content.append(buffer.data(), static_cast<std::size_t>(std::max<ssize_t>(got, 0)));
    }
    return got == 0 ? std::optional(content) : std::nullopt;
}

// "PID (NAME) STATE PPID ...": a name may hold anything, so it ends at the last ')'.
bool parse_stat(const std::string &text, Process &process)
{
    const auto open = text.find('(');
    const auto close = text.rfind(')');
    if (open == std::string::npos || close == std::string::npos || close < open) {
        return false;
    }
    process.kernel_name = text.substr(open + 1, close - open - 1);

    std::istringstream after(text.substr(close + 1));
    const std::vector<std::string> fields(std::istream_iterator<std::string>{after}, {});
    const auto number = [&fields](std::size_t manual_field, auto &value) {
        const std::string &field = fields.at(manual_field - 3); // proc(5) counts from 1
        std::from_chars(field.data(), field.data() + field.size(), value);
    };
    if (fields.size() < 33) {
        return false;
    }
    process.state = fields[0][0];
    number(4, process.parent);
    number(23, process.virtual_bytes);
    number(24, process.resident_pages);
    number(30, process.program_counter);
    number(35, process.wait_channel);
    return true;
}

// The owner of /proc/PID will not do: it is root for a process that may not be dumped.
bool parse_user(const std::string &status, Process &process)
{
    constexpr std::string_view key = "\nUid:\t";
    const auto start = status.find(key);
    if (start == std::string::npos) {
        return false;
    }
    const char *digits = status.data() + start + key.size();
    return std::from_chars(digits, status.data() + status.size(), process.user).ec == std::errc{};
}

// Nothing for a process that has gone meanwhile.
std::optional<Process> read_process(const std::filesystem::path &directory, pid_t pid)
{
    const auto stat = read_file(directory / "stat");
    const auto status = read_file(directory / "status");
    const auto arguments = read_file(directory / "cmdline");
    Process process;
    process.pid = pid;
    if (!stat || !status || !arguments || !parse_stat(*stat, process) ||
        !parse_user(*status, process)) {
        return std::nullopt;
    }
    process.command = arguments->substr(0, arguments->find('\0'));
    return process;
}

std::optional<pid_t> parse_pid(const std::string &name)
{
    pid_t pid = 0;
    const auto [end, error] = std::from_chars(name.data(), name.data() + name.size(), pid);
    const bool whole = error == std::errc{} && end == name.data() + name.size();
    return whole ? std::optional(pid) : std::nullopt;
}

std::vector<Process> read_processes()
{
    std::vector<Process> processes;
    for (const auto &entry : std::filesystem::directory_iterator("/proc")) {
        const auto pid = parse_pid(entry.path().filename());
        if (!pid) {
            continue;
        }
        if (auto process = read_process(entry.path(), *pid)) {
            processes.push_back(std::move(*process));
        }
    }
    std::ranges::sort(processes, {}, &Process::pid);
    return processes;
}

std::string user_name(uid_t user)
{
    const passwd *entry = getpwuid(user);
    return entry != nullptr ? entry->pw_name : std::to_string(user);
}

// A line feed in a name would make two lines of one process.
std::string printable(std::string_view text)
{
    std::string result(text);
    std::ranges::replace_if(
        result, [](unsigned char c) { return c < ' ' || c == 0x7f; }, '?');
    return result;
}

void print(const Process &process)
{
    const unsigned long long low_word = 0xffffffff; // the columns are of a 32-bit system
    std::printf(
        "%-8s %-5d %-5d %-6llu %-7ld %08llx %08llx %c %s\n", user_name(process.user).c_str(),
        process.pid, process.parent, process.virtual_bytes / 1024,
        process.resident_pages * (sysconf(_SC_PAGESIZE) / 1024), process.wait_channel & low_word,
        process.program_counter & low_word, process.state, printable(process.shown_name()).c_str());
}

} // namespace

int main(int argc, char **argv)
{
    if (argc > 2 || (argc == 2 && argv[1][0] == '-')) {
        std::fprintf(stderr, "ps: it takes no options and one name at most: ps [NAME]\n");
        return 1;
    }
    const std::string_view wanted = argc == 2 ? argv[1] : "";
    try {
        const auto processes = read_processes();
        std::puts("USER     PID   PPID  VSIZE  RSS     WCHAN    PC         NAME");
        for (const Process &process : processes) {
            if (process.name().starts_with(wanted)) {
                print(process);
            }
        }
    } catch (const std::filesystem::filesystem_error &error) {
        std::fprintf(stderr, "ps: /proc cannot be read: %s\n", error.code().message().c_str());
        return 1;
    }
    return std::fflush(stdout) == 0 ? 0 : 1;
}
