// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A long life of one process: many commands of every kind, with real files and
// stubbed program starts. Descriptors and memory must grow by what the module
// leaves open on purpose, and by nothing else.
#include "memory.h"
#include "plan.h"

#include "../unit/module.h"
#include "../unit/platform.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <charconv>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <map>
#include <stdexcept>
#include <string>
#include <string_view>
#include <sys/resource.h>
#include <unistd.h>

namespace
{

constexpr long kRounds = 100;
constexpr long kStores = 4; // in each round, so that even long runs fit 4096 descriptors
constexpr long kDescriptorsNeeded = 3 * kRounds * kStores;

constexpr std::string_view kUsage = R"(usage: soak [COMMANDS]

Sends COMMANDS commands of every kind (default 200000; a multiple of 100, at
least 5000) to the module in one process, and counts what they leave behind.
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

long descriptors_open()
{
    const std::filesystem::directory_iterator all("/proc/self/fd");
    return std::distance(begin(all), end(all)) - 1; // without its own
}

// What is left open on purpose, by kind, as the doubles name it.
using Counts = std::map<std::string, long>;

Counts left_open()
{
    Counts counts;
    for (const auto &name : platform::left_open()) {
        ++counts[name.substr(0, name.find('#'))];
    }
    return counts;
}

class Soak
{
  public:
    // On a platform of its own, that is gone behind it.
    Soak()
        : store_("XMLFile::" + faults::source(faults::first_plan())),
          plan_(faults::source(faults::first_plan()))
    {
        platform::stop_recording();
        platform::on_system([this](const std::string &) { ++started_; });
        store();
    }
    ~Soak()
    {
        platform::reset();
    }
    Soak(const Soak &) = delete;
    Soak &operator=(const Soak &) = delete;

    // The same commands in every round; the last one drops the cached plan.
    void round(long commands)
    {
        const long part = commands / kStores;
        for (long at = 1; at <= commands; ++at) {
            const long in_part = at % part;
            if (in_part == 0) {
                store();
            } else if (in_part == 1) {
                suspend();
            } else {
                send_some(in_part % 8);
            }
        }
    }

    void check_left_open() const
    {
        check(left_open() == expected_, "left open are other things than a plan file for each "
                                        "store, a connection for each trigger and a listing for "
                                        "each stop");
        check_equal(started_, expected_started_, "items started");
        check_equal(descriptors_open(), descriptors_ + descriptors_left(), "descriptors open");
    }

    // Connections are of the doubles, and no descriptors of this process.
    [[nodiscard]] long descriptors_left() const
    {
        return expected_.at("plan") + expected_.at("stream");
    }

    void tell() const
    {
        std::printf("Left open, as they must be: %ld plan files, %ld listings, %ld connections.\n",
                    expected_.at("plan"), expected_.at("stream"), expected_.at("connection"));
    }

  private:
    void command(const std::string &text, bool replies)
    {
        std::string reply(64, 'Z');
        const std::string wanted(64, replies ? '\0' : 'Z');
        check_equal(FPTEST_RunTestCmd(text.c_str(), reply.data(), 64), 0, text);
        check(reply == wanted, text + ": another reply");
    }

    void store()
    {
        command(store_, false);
        ++expected_["plan"];
        check(platform::plan_text() == plan_, "another plan stored");
    }

    void suspend()
    {
        platform::plan_output({"USER PID NAME\nroot 77 PatternTest\n"});
        check_equal(FPTEST_SuspendItemExecute(), 0, "stop");
        ++expected_["stream"];
    }

    void trigger()
    {
        platform::plan_output({"root 77 /system/bin/SensorProbe\n"});
        command("XMLNodePath::plan/Bringup/SensorProbe", true);
        ++expected_["connection"];
    }

    void run_group()
    {
        command("XMLNodePath::plan/Bringup", true);
        expected_started_ += 2;
        ++expected_["connection"];
    }

    void run_item()
    {
        command("XMLNodePath::plan/Image/DeadPixels", true);
        ++expected_started_;
    }

    static void report()
    {
        check_equal(FPTEST_SetTransation("Bringup", "PatternTest", 50, 0, "half way"), 0, "report");
    }

    static void read_back()
    {
        const std::string plan = platform::plan_text();
        std::string buffer(plan.size() + 1, 'Z');
        FPTEST_ExtractResultMsg(buffer.data(), static_cast<int>(buffer.size()));
        check(buffer == plan + "Z", "another plan read back");
    }

    void send_some(long kind)
    {
        switch (kind) {
        case 0:
            return command("pingtest", false);
        case 1:
            return run_group();
        case 2:
            return run_item();
        case 3:
            return report();
        case 4:
            return read_back();
        case 5:
            return command("Unknown::name::arguments", false);
        case 6:
            return trigger();
        default:
            return command("XMLNodePath::plan/Missing/Item", true);
        }
    }

    std::string store_;
    std::string plan_;
    const long descriptors_ = descriptors_open();
    Counts expected_;
    long started_ = 0;
    long expected_started_ = 0;
};

// A life of so many rounds, told in so many parts.
void live(long rounds, long per_round, long parts)
{
    Soak soak;
    for (long round = 1; round <= rounds; ++round) {
        soak.round(per_round);
        if (round % (rounds / parts) == 0) {
            soak.check_left_open();
            std::printf("%8ld  %21ld\n", round * per_round, soak.descriptors_left());
            std::fflush(stdout);
        }
    }
    soak.tell();
}

void run(long commands)
{
    platform::reset();
    FPTEST_RunTestCmd("pingtest", nullptr, 0); // the one that is answered
    std::puts("commands  descriptors left open");
    live(1, commands / kRounds, 1); // warms up
    const long memory = memory_in_use();
    live(kRounds, commands / kRounds, 10);
    const long more = memory_in_use() - memory; // before a text is made for the check
    check_equal(more, 0, "bytes of memory that nothing left open accounts for");
    check(testing::UnitTest::GetInstance()->Passed(), "a double has found something; see above");
    std::puts("Memory: not a byte more, once those are released.");
}

long commands_of(int argc, char **argv)
{
    long commands = 200000;
    if (argc == 2) {
        const char *text = argv[1];
        const auto [end, error] = std::from_chars(text, text + std::strlen(text), commands);
        check(error == std::errc{} && *end == '\0' && commands >= 5000 && commands % kRounds == 0,
              std::string("COMMANDS wants a multiple of 100, at least 5000, not '") + text + "'");
    }
    check(argc <= 2, "one argument at most; see soak --help");
    return commands;
}

void allow_descriptors()
{
    rlimit limit{};
    getrlimit(RLIMIT_NOFILE, &limit);
    limit.rlim_cur = limit.rlim_max;
    setrlimit(RLIMIT_NOFILE, &limit);
    check(limit.rlim_cur > kDescriptorsNeeded,
          "the hard limit of open files is too low; raise it: ulimit -H -n 4096");
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
        const long commands = commands_of(argc, argv);
        allow_descriptors();
        run(commands);
    } catch (const std::exception &finding) {
        std::fprintf(stderr, "soak: %s\n", finding.what());
        return 1;
    }
    return 0;
}
