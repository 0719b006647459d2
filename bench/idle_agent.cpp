// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A process of which nothing is wanted but its memory.
//
//   idle_agent            prints its resident kilobytes
//   idle_agent LIBRARY    is an agent with a plan loaded: prints its resident
//                         kilobytes, then the bytes of its heap in use after 20
//                         commands and after 1,000
#include <array>
#include <cstdio>
#include <cstring>
#include <dlfcn.h>
#include <fcntl.h>
#include <malloc.h>
#include <string>
#include <unistd.h>

namespace
{

struct Module {
    int (*run)(const char *, char *, int);
    int (*report)(const char *, const char *, int, int, const char *);
    void (*read_back)(char *, int);
};

template <typename Function> void look_up(void *library, const char *name, Function &function)
{
    void *symbol = dlsym(library, name);
    static_assert(sizeof symbol == sizeof function);
    std::memcpy(&function, &symbol, sizeof symbol);
}

Module open_module(const char *path)
{
    Module module{};
    void *library = dlopen(path, RTLD_NOW);
    if (library == nullptr) {
        std::fprintf(stderr, "idle_agent: %s\n", dlerror());
        return module;
    }
    look_up(library, "FPTEST_RunTestCmd", module.run);
    look_up(library, "FPTEST_SetTransation", module.report);
    look_up(library, "FPTEST_ExtractResultMsg", module.read_back);
    return module;
}

long resident_kilobytes()
{
    std::array<char, 4096> text{};
    const int fd = open("/proc/self/status", O_RDONLY);
    [[maybe_unused]] const ssize_t got = read(fd, text.data(), text.size() - 1);
    close(fd);
    long kilobytes = -1;
    const char *line = std::strstr(text.data(), "VmRSS:");
    if (line != nullptr) {
        kilobytes = std::strtol(line + std::strlen("VmRSS:"), nullptr, 10);
    }
    return kilobytes;
}

const char *plan_command()
{
    static std::string command;
    if (command.empty()) {
        command = "XMLFile::<Plan>\n\t<CmdGroup name=\"Bench\">\n";
        for (int item = 0; item < 40; ++item) {
            command += "\t\t<Cmd name=\"true\" args=\"" + std::to_string(item) + "\"/>\n";
        }
        command += "</CmdGroup>\n</Plan>\n";
    }
    return command.c_str();
}

void send(const Module &module, const char *command)
{
    std::array<char, 64> reply{};
    module.run(command, reply.data(), 64);
}

// Twenty commands of every kind. The last ones have the plan loaded and saved.
void send_twenty(const Module &module)
{
    static std::array<char, 65536> plan;

    send(module, "pingtest");
    send(module, "Unknown::name::arguments");
    send(module, plan_command());
    send(module, "XMLNodePath::Plan/Bench/true");
    send(module, "XMLNodePath::Plan/Missing");
    for (int progress = 0; progress < 14; ++progress) {
        module.report("Bench", "true", progress, 0, "contact 97 %");
    }
    module.read_back(plan.data(), static_cast<int>(plan.size()));
}

// What the library prints is not to be mixed with what this does.
int set_output_aside()
{
    const int output = dup(STDOUT_FILENO);
    const int nowhere = open("/dev/null", O_WRONLY);
    dup2(nowhere, STDOUT_FILENO);
    close(nowhere);
    return output;
}

} // namespace

int main(int argc, char **argv)
{
    if (argc < 2) {
        std::printf("%ld\n", resident_kilobytes());
        return 0;
    }
    const Module module = open_module(argv[1]);
    if (module.run == nullptr || module.report == nullptr || module.read_back == nullptr) {
        return 1;
    }
    const int output = set_output_aside();
    send(module, "pingtest");
    send(module, plan_command());
    module.report("Bench", "true", 100, 0, "contact 97 %");
    const long resident = resident_kilobytes();
    send_twenty(module);
    const std::size_t before = mallinfo2().uordblks;
    for (int commands = 20; commands < 1000; commands += 20) {
        send_twenty(module);
    }
    dprintf(output, "%ld %zu %zu\n", resident, before, mallinfo2().uordblks);
    return 0;
}
