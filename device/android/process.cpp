// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "android/ps.h"

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <pwd.h>
#include <sstream>
#include <sys/stat.h>
#include <system_error>
#include <utility>

std::string read_text(const std::string &path)
{
    std::ostringstream text;
    text << std::ifstream(path, std::ios::binary).rdbuf(); // no exception of a failed read
    return text.str();
}

std::string Process::content_of(const std::string &file) const
{
    return read_text("/proc/" + std::to_string(pid) + '/' + file);
}

long long Process::number(std::size_t field) const
{
    return std::strtoll(fields.at(field - 3).c_str(), nullptr, 10);
}

namespace
{

// Whether it is there; a process may go meanwhile.
bool look_at(Process &process)
{
    struct stat status = {};
    const bool is_there = stat(("/proc/" + std::to_string(process.pid)).c_str(), &status) == 0;
    const std::string text = process.content_of("stat");
    const auto open = text.find('(');
    const auto close = text.rfind(')'); // a name may hold anything
    if (!is_there || close == text.npos) {
        return false;
    }
    process.owner = status.st_uid;
    process.kernel_name = text.substr(open + 1, close - open - 1);
    std::istringstream rest(text.substr(close + 1));
    process.fields.assign(std::istream_iterator<std::string>(rest), {});
    process.arguments = process.content_of("cmdline");
    return process.fields.size() > 38;
}

} // namespace

std::vector<Process> look_at_all()
{
    std::error_code error;
    std::vector<Process> processes;

    for (const auto &entry : std::filesystem::directory_iterator("/proc", error)) {
        Process process;
        process.pid = std::atoi(entry.path().filename().c_str());
        if (process.pid > 0 && look_at(process)) {
            processes.push_back(std::move(process));
        }
    }
    return processes;
}

std::string user_name(uid_t user)
{
    const passwd *entry = getpwuid(user);
    return entry != nullptr ? entry->pw_name : std::to_string(user);
}

int fail(const std::string &message)
{
    std::fprintf(stderr, "ps: %s\n", message.c_str());
    return 1;
}

int not_imitated(const std::string &option, int release, const std::string &options)
{
    return fail(option + ": device/run --android " + std::to_string(release) +
                " imitates no other option than " + options);
}
