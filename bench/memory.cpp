// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cases.h"
#include "figures.h"

#include <cstdio>
#include <filesystem>
#include <stdexcept>
#include <utility>

namespace bench
{
namespace
{

constexpr double kSize = 24 * 1024;
// The C library counts the rounding of its blocks, which differs with their history.
constexpr double kRounding = 1.01;

struct Memory {
    double resident = 0;
    double heap_after_20 = 0;
    double heap_after_1000 = 0;
};

Memory memory_of_agent(const char *library)
{
    // blocks in a thread's own cache count as in use, and how many there are is chance
    const std::string command = "GLIBC_TUNABLES=glibc.malloc.tcache_count=0 VR_LOG_FILE=/dev/null "
                                "exec " BENCH_IDLE_AGENT " " +
                                std::string(library) + " 2>&1 >/dev/null";
    Memory memory;
    FILE *pipe = popen(command.c_str(), "r");
    const int read = std::fscanf(pipe, "%lf %lf %lf", &memory.resident, &memory.heap_after_20,
                                 &memory.heap_after_1000);
    if (pclose(pipe) != 0 || read != 3) {
        throw std::runtime_error("'" + command + "' fails");
    }
    return memory;
}

void print_row(const std::string &name, double is, double other, double limit)
{
    const double ratio = is / other;
    print({name, bytes_text(is), bytes_text(other), decimal(ratio, 3), "",
           limit > 0 ? decimal(limit, 2) : "-", verdict(ratio, limit)});
}

} // namespace

void print_sizes()
{
    const std::pair<const char *, const char *> all[] = {
        {"x86-64", BENCH_SMALL_X86_64}, {"armhf", BENCH_SMALL_ARMHF}, {"arm64", BENCH_SMALL_ARM64}};

    print({"on disk, stripped, -Os", "library", "", "ratio", "", "limit"});
    for (const auto &[name, file] : all) {
        if (*file == '\0') {
            print({name, "-", "", "", "", "", "no g++"});
            continue;
        }
        const auto bytes = static_cast<double>(std::filesystem::file_size(file));
        print({name, bytes_text(bytes), "", decimal(bytes / kSize, 3), "",
               decimal(kSize / 1024, 0) + " KB", verdict(bytes, kSize)});
    }
}

void print_memory()
{
    const Memory bare = memory_of_agent("");
    const Memory agent = memory_of_agent(BENCH_LIBRARY);
    print({"resident", "agent", "without", "ratio", "", "limit"});
    print_row("an idle agent", agent.resident, bare.resident, 0);
    print({"heap in use after", "1,000", "20", "ratio", "", "limit"});
    print_row("commands", agent.heap_after_1000, agent.heap_after_20, kRounding);
}

} // namespace bench
