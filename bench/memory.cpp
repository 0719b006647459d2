// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "memory.h"

#include "figures.h"

#include <array>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <stdexcept>
#include <utility>

namespace bench
{
namespace
{

// The C library counts the rounding of its blocks, which differs with their history.
constexpr double kRounding = 1.01;

std::string row(const std::string &name, double is, double other, double limit, Verdict &verdict)
{
    const double ratio = is / other;
    const bool missed = limit > 0 && ratio > limit;
    verdict.missed |= missed;
    return table_line({name, bytes_text(is), bytes_text(other), decimal(ratio, 3), "",
                       limit > 0 ? decimal(limit, 2) : "-",
                       limit <= 0 ? ""
                       : missed   ? "MISSED"
                                  : "ok"});
}

std::string said_by(const std::string &command)
{
    std::array<char, 256> line{};
    FILE *pipe = popen(command.c_str(), "r");
    const bool said = pipe != nullptr && fgets(line.data(), line.size(), pipe) != nullptr;
    if (pipe == nullptr || pclose(pipe) != 0 || !said) {
        throw std::runtime_error("'" + command + "' fails");
    }
    return line.data();
}

} // namespace

Verdict size_table()
{
    constexpr double kLimit = 24 * 1024;
    const std::pair<const char *, const char *> all[] = {
        {"x86-64", BENCH_SMALL_X86_64}, {"armhf", BENCH_SMALL_ARMHF}, {"arm64", BENCH_SMALL_ARM64}};
    Verdict verdict;

    verdict.table = table_line({"on disk, stripped, -Os", "module", "", "ratio", "", "limit", ""});
    for (const auto &[name, file] : all) {
        if (*file == '\0') {
            verdict.table += table_line({name, "-", "", "", "", "", "no g++"});
            continue;
        }
        const auto bytes = static_cast<double>(std::filesystem::file_size(file));
        const bool missed = bytes > kLimit;
        verdict.missed |= missed;
        verdict.table += table_line({name, bytes_text(bytes), "", decimal(bytes / kLimit, 3), "",
                                     decimal(kLimit / 1024, 0) + " KB", missed ? "MISSED" : "ok"});
    }
    return verdict;
}

Verdict memory_table()
{
    // blocks in a thread's own cache count as in use, and how many there are is chance
    const std::string agent = "GLIBC_TUNABLES=glibc.malloc.tcache_count=0 "
                              "VR_LOG_FILE=/dev/null " BENCH_IDLE_AGENT;
    const double bare = std::strtod(said_by(agent).c_str(), nullptr) * 1024;
    double resident = 0;
    double before = 0;
    double after = 0;
    const std::string said = said_by(agent + " " BENCH_LIBRARY);
    if (std::sscanf(said.c_str(), "%lf %lf %lf", &resident, &before, &after) != 3) {
        throw std::runtime_error("idle_agent says '" + said + "'");
    }
    Verdict verdict;
    verdict.table = table_line({"resident", "agent", "without", "ratio", "", "limit", ""});
    verdict.table += row("an idle agent", resident * 1024, bare, 0, verdict);
    verdict.table += table_line({"heap in use after", "1,000", "20", "ratio", "", "limit", ""});
    verdict.table += row("commands", after, before, kRounding, verdict);
    return verdict;
}

} // namespace bench
