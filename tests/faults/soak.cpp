// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A long life of one process: the cycle of commands again and again, with real
// files and stubbed program starts.
//
// - After each cycle, the plan's file holds the same bytes.
// - After every 50, what is open is what the library leaves open on purpose, and
//   no memory has been added once that is released.
#include "cycle.h"
#include "memory.h"

#include "../unit/platform.h"
#include "quillmark.h"

#include <gtest/gtest.h>

#include <charconv>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <map>
#include <stdexcept>
#include <string>
#include <string_view>

namespace
{

using Kind = faults::Step::Kind;
using Counts = std::map<std::string, long>;

constexpr long kCycles = 50; // that leave 150 descriptors open

constexpr std::string_view kUsage = R"(usage: soak [COMMANDS]

Sends at least COMMANDS commands of every kind (default 200000, at least 5000) to
the library in one process, and counts what they leave open and in memory.
)";

// What a check has found: it ends the run.
struct Finding : std::runtime_error {
    using std::runtime_error::runtime_error;
};

void check(bool right, const std::string &what)
{
    if (!right) {
        throw Finding(what);
    }
}

void check_equal(long is, long wanted, const std::string &what)
{
    check(is == wanted, what + ": " + std::to_string(is) + ", not " + std::to_string(wanted));
}

const std::vector<faults::Step> &steps()
{
    static const auto all = [] {
        auto more = faults::cycle();
        more.push_back(faults::command(Kind::Item, "missing", "XMLNodePath::plan/Missing/Item"));
        more.push_back(faults::command(Kind::Nothing, "unknown", "Unknown::name::arguments"));
        return more;
    }();
    return all;
}

void play(const faults::Step &step)
{
    platform::plan_output({step.output});
    std::string buffer = faults::replied({});
    check_equal(step.call(buffer.data()), 0, step.name);
    platform::state().outputs.clear();
    const bool replies = step.kind == Kind::Group || step.kind == Kind::Item;
    check(buffer == (step.kind == Kind::ReadBack ? faults::read_back(platform::plan_text())
                     : replies                   ? faults::replied("")
                                                 : faults::replied({})),
          step.name + ": another reply");
    if (step.kind == Kind::Store) {
        check(platform::plan_text() == step.text, "another plan stored");
    }
}

long descriptors_open()
{
    const std::filesystem::directory_iterator all("/proc/self/fd");
    return std::distance(begin(all), end(all)) - 1; // without its own
}

// What is left open on purpose, by kind, as the doubles name it.
Counts left_open()
{
    Counts counts;
    for (const auto &name : platform::left_open()) {
        ++counts[name.substr(0, name.find('#'))];
    }
    return counts;
}

// Some cycles, and the release of what they leave open.
void live()
{
    platform::reset();
    platform::state().recording = false;
    long started = 0;
    platform::state().system_hook = [&](const std::string &) { ++started; };
    const long descriptors = descriptors_open();
    std::string plan;
    for (long cycle = 1; cycle <= kCycles; ++cycle) {
        for (const auto &step : steps()) {
            play(step);
        }
        const std::string text = platform::plan_text();
        check(cycle == 1 || text == plan, "another plan than after the first cycle");
        plan = text;
    }
    check(left_open() ==
              Counts{{"plan", 2 * kCycles}, {"stream", kCycles}, {"connection", 2 * kCycles}},
          "left open are other things than a plan file for each store, a connection for each "
          "trigger and a listing for each stop");
    // connections are of the doubles, and no descriptors of this process
    check_equal(descriptors_open(), descriptors + 3 * kCycles, "descriptors open");
    check_equal(started, 4 * kCycles, "items started");
    platform::reset();
}

void run(long commands)
{
    FPTEST_RunTestCmd("pingtest", nullptr, 0); // the one that is answered
    live();                                    // warms up
    const long memory = memory_in_use();
    const long each = kCycles * static_cast<long>(steps().size());
    const long lives = (commands + each - 1) / each;
    for (long life = 0; life < lives; ++life) {
        live();
        const long more = memory_in_use() - memory; // before a text is made for the check
        check_equal(more, 0, "bytes of memory that nothing left open accounts for");
    }
    check(testing::UnitTest::GetInstance()->Passed(), "a double has found something; see above");
    std::printf("%ld commands: only what must be was left open, and no memory.\n", lives * each);
}

long commands_of(int argc, char **argv)
{
    long commands = 200000;
    if (argc == 2) {
        const char *text = argv[1];
        const auto [end, error] = std::from_chars(text, text + std::strlen(text), commands);
        check(error == std::errc{} && *end == '\0' && commands >= 5000,
              std::string("COMMANDS wants a number of at least 5000, not '") + text + "'");
    }
    check(argc <= 2, "one argument at most; see soak --help");
    return commands;
}

} // namespace

int main(int argc, char **argv)
{
    if (argc == 2 && std::string_view(argv[1]) == "--help") {
        std::fputs(kUsage.data(), stdout);
        return 0;
    }
    int count = 1;
    testing::InitGoogleTest(&count, argv);
    try {
        run(commands_of(argc, argv));
    } catch (const std::exception &finding) {
        std::fprintf(stderr, "soak: %s\n", finding.what());
        return 1;
    }
    return 0;
}
