// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "android/ps.h"

#include <cstdio>
#include <cstdlib>
#include <string_view>

namespace
{

struct ToolboxOptions {
    std::string shown; // letters of what is shown besides
    std::string_view name;
    int pid = 0;
    int parent = 0;

    bool has(char letter) const
    {
        return shown.find(letter) != shown.npos;
    }
};

void print_toolbox_header(int release, const ToolboxOptions &options)
{
    std::printf(release == 5
                    ? "USER     PID   PPID  VSIZE  RSS   %s%s  WCHAN    PC        NAME\n"
                    : "USER      PID   PPID  VSIZE  RSS  %s%s WCHAN              PC  NAME\n",
                options.has('c') ? "CPU " : "", options.has('p') ? "PRIO  NICE  RTPRI SCHED " : "");
}

void print_toolbox_line(int release, const ToolboxOptions &options, const Process &process)
{
    const auto word = [&process](std::size_t field) {
        return static_cast<unsigned>(process.number(field)); // 32 bits are kept
    };
    const auto number = [&process](std::size_t field) {
        return static_cast<int>(process.number(field));
    };
    const std::string user =
        options.has('n') ? std::to_string(process.owner) : user_name(process.owner);

    std::printf("%-9s %-5d %-5d %-6u %-5u", user.c_str(), process.pid, number(4), word(23) / 1024,
                word(24) * 4);
    if (options.has('c')) {
        std::printf(" %-2d", number(39));
    }
    if (options.has('p')) {
        std::printf(" %-5d %-5d %-5d %-5d", number(18), number(19), number(40), number(41));
    }
    if (release == 5) {
        std::printf(" %08x %08x", word(35), word(30));
    } else {
        std::printf(" %10.10s %010llX", process.content_of("wchan").c_str(),
                    static_cast<unsigned long long>(process.number(30)));
    }
    const char *command = process.arguments.c_str(); // the first of them
    std::printf(" %s %s", process.fields.front().c_str(),
                *command != '\0' ? command : process.kernel_name.c_str());
    if (options.has('x')) {
        std::printf(" (u:%d, s:%d)", number(14), number(15));
    }
    std::puts("");
}

// An id that a word gives, as 7.1 wants it: that complains on standard output.
bool read_id(const char *word, const char *what, int release, int &id)
{
    id = std::atoi(word);
    if (id == 0 && release == 7) {
        std::printf("bad %s '%s'\n", what, word);
        return false;
    }
    return true;
}

// Whether all is well; if not, that has been said.
bool read_options(int release, std::span<char *const> arguments, ToolboxOptions &options)
{
    for (std::size_t i = 0; i < arguments.size(); i++) {
        const std::string word = arguments[i];
        if (word == "-n" || word == "-x" || word == "-p" || word == "-c") {
            options.shown += word[1];
        } else if (word == "-t" || word == "-Z" || word == "-P" || word == "--abi") {
            not_imitated(word, release, release == 5 ? "-c, -n, -p, -x" : "-c, -n, -p, -x, --ppid");
            return false;
        } else if (release == 5 && (word.empty() || word[0] < '0' || word[0] > '9')) {
            options.name = arguments[i];
        } else if (release == 7 && word == "--ppid") {
            if (++i == arguments.size()) {
                fail("--ppid wants a process id"); // the real one crashes
                return false;
            }
            if (!read_id(arguments[i], "ppid", release, options.parent)) {
                return false;
            }
        } else if (!read_id(arguments[i], "pid", release, options.pid)) {
            return false;
        }
    }
    return true;
}

} // namespace

int run_toolbox(int release, std::span<char *const> arguments)
{
    ToolboxOptions options;
    if (!read_options(release, arguments, options)) {
        return 1;
    }
    print_toolbox_header(release, options);
    for (const Process &process : look_at_all()) {
        if ((options.pid == 0 || options.pid == process.pid) &&
            (options.parent == 0 || options.parent == process.number(4)) &&
            process.kernel_name.starts_with(options.name)) {
            print_toolbox_line(release, options, process);
        }
    }
    return 0;
}
