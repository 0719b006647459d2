// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A process of which nothing is wanted but its memory.
//
//   idle_agent [LIBRARY]
//
// Prints on standard error, where the library prints nothing, in bytes: what is
// resident once a plan is stored, loaded and saved; its heap in use after 20 commands,
// and after 1,000. Without the library nothing is done in between.
#include "quillmark.h"

#include <array>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <dlfcn.h>
#include <fcntl.h>
#include <malloc.h>
#include <string>
#include <unistd.h>

namespace
{

struct Library {
    decltype(&FPTEST_RunTestCmd) run;
    decltype(&FPTEST_SetTransation) report;
    decltype(&FPTEST_ExtractResultMsg) read_back;
};

template <typename Function> bool look_up(void *library, const char *name, Function &function)
{
    void *symbol = dlsym(library, name);
    static_assert(sizeof symbol == sizeof function);
    std::memcpy(&function, &symbol, sizeof symbol);
    return symbol != nullptr;
}

// Without streams, which are memory too.
long resident_bytes()
{
    std::array<char, 4096> text{};
    const int fd = open("/proc/self/status", O_RDONLY);
    [[maybe_unused]] const ssize_t got = read(fd, text.data(), text.size() - 1);
    close(fd);
    const char *line = std::strstr(text.data(), "VmRSS:");
    return line != nullptr ? std::strtol(line + std::strlen("VmRSS:"), nullptr, 10) * 1024 : -1;
}

std::string plan_command()
{
    std::string command = "XMLFile::<Plan>\n\t<CmdGroup name=\"Bench\">\n";
    for (int item = 0; item < 40; ++item) {
        command += "\t\t<Cmd name=\"true\" args=\"" + std::to_string(item) + "\"/>\n";
    }
    return command + "</CmdGroup>\n</Plan>\n";
}

void send(const Library &library, const char *command)
{
    std::array<char, 64> reply{};
    library.run(command, reply.data(), 64);
}

// Twenty commands of every kind. The last ones have the plan loaded and saved.
void send_twenty(const Library &library, const std::string &plan)
{
    static std::array<char, 65536> text;

    send(library, "pingtest");
    send(library, "Unknown::name::arguments");
    send(library, plan.c_str());
    send(library, "XMLNodePath::Plan/Bench/true");
    send(library, "XMLNodePath::Plan/Missing");
    for (int progress = 0; progress < 14; ++progress) {
        library.report("Bench", "true", progress, 0, "contact 97 %");
    }
    library.read_back(text.data(), static_cast<int>(text.size()));
}

} // namespace

int main(int argc, char **argv)
{
    if (argc < 2) {
        std::fprintf(stderr, "%ld 0 0\n", resident_bytes());
        return 0;
    }
    void *file = dlopen(argv[1], RTLD_NOW);
    Library library{};
    if (file == nullptr || !look_up(file, "FPTEST_RunTestCmd", library.run) ||
        !look_up(file, "FPTEST_SetTransation", library.report) ||
        !look_up(file, "FPTEST_ExtractResultMsg", library.read_back)) {
        std::fprintf(stderr, "idle_agent: %s\n", dlerror());
        return 1;
    }
    const std::string plan = plan_command();
    send(library, "pingtest");
    send(library, plan.c_str());
    library.report("Bench", "true", 100, 0, "contact 97 %");
    const long resident = resident_bytes();
    send_twenty(library, plan);
    const std::size_t before = mallinfo2().uordblks;
    for (int commands = 20; commands < 1000; commands += 20) {
        send_twenty(library, plan);
    }
    std::fprintf(stderr, "%ld %zu %zu\n", resident, before, mallinfo2().uordblks);
    return 0;
}
