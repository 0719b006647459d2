// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "fptest_runner.h"

#include <algorithm>
#include <array>
#include <csignal>
#include <filesystem>
#include <linux/capability.h>
#include <linux/securebits.h>
#include <regex>
#include <sched.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace fs = std::filesystem;

namespace
{

constexpr char kData[] = "/data/vorlane";

} // namespace

namespace fptest_runner
{
namespace
{

device::Lines found(const std::string &log, const std::regex &shape)
{
    device::Lines all;
    for (const std::string &line : device::lines_of(device::read_file(log))) {
        std::smatch match;
        if (std::regex_match(line, match, shape)) {
            all.push_back(match[1]);
        }
    }
    return all;
}

} // namespace

// --- a process ------------------------------------------------------------------

FptestProcess::FptestProcess(Start start)
    : Process([&start] {
          start.arguments.insert(start.arguments.begin(), FPTEST_PROGRAM);
          // it would say at each start what goes with the device
          start.environment.try_emplace("QUILLMARK_DEVICE", std::nullopt);
          return start;
      }())
{
}

FptestProcess::FptestProcess(const std::vector<std::string> &arguments)
    : FptestProcess(Start{.arguments = arguments})
{
}

pid_t FptestProcess::library() const
{
    pid_t library = 0;
    EXPECT_TRUE(device::eventually([&] {
        for (const device::Process &process : device::processes()) {
            if (process.parent == pid() && process.state != 'Z') {
                library = process.pid;
            }
        }
        return library != 0;
    }));
    return library;
}

// Whatever is missing here makes the test fail by what the program then does.
void as_plain_user()
{
    // fails if there are none to be dropped, as in a device of namespaces
    prctl(PR_SET_SECUREBITS, SECBIT_NOROOT | SECBIT_NOROOT_LOCKED);
    __user_cap_header_struct header{_LINUX_CAPABILITY_VERSION_3, 0};
    std::array<__user_cap_data_struct, 2> none{};
    if (syscall(SYS_capset, &header, none.data()) != 0) {
        _exit(126);
    }
}

void without_device()
{
    if (unshare(CLONE_NEWUSER | CLONE_NEWNS) != 0 ||
        mount("none", "/system/bin", "tmpfs", 0, nullptr) != 0) {
        _exit(126);
    }
}

void interrupted_before()
{
    sigset_t set;
    sigemptyset(&set);
    sigaddset(&set, SIGINT);
    sigprocmask(SIG_BLOCK, &set, nullptr);
    raise(SIGINT);
}

void in_own_group()
{
    setpgid(0, 0);
}

void in_own_session()
{
    setsid();
}

Ended run_fptest(const Start &start)
{
    return FptestProcess(start).wait();
}

Ended run_fptest(const std::vector<std::string> &arguments, const std::string &input)
{
    return run_fptest({.arguments = arguments, .input = input});
}

void expect_refusal(int status, const std::string &line, const std::vector<std::string> &arguments,
                    const std::string &input)
{
    const Ended ended = run_fptest(arguments, input);
    EXPECT_EQ(ended.status, status) << ::testing::PrintToString(arguments);
    EXPECT_EQ(ended.err, line + "\n");
    EXPECT_EQ(ended.out, "");
}

Ended run_program(const std::vector<std::string> &arguments)
{
    return support::run({.arguments = arguments, .is_one_stream = true});
}

// --- texts ----------------------------------------------------------------------

std::string without_times(const std::string &text)
{
    static const std::regex time(R"(\b\d+\.\d s\b)");
    return std::regex_replace(text, time, "T s");
}

device::Lines without_times(device::Lines lines)
{
    for (std::string &line : lines) {
        line = without_times(line);
    }
    return lines;
}

device::Lines paths_run(const std::string &log)
{
    static const std::regex shape(R"(4/VRCODE: fptest_ItemsTest *:.*=> Input cmdline : (.*))");
    device::Lines paths = found(log, shape);
    std::erase_if(paths, [](const std::string &path) { return path.starts_with("-/"); });
    return paths;
}

device::Lines programs_run(const std::string &log)
{
    static const std::regex shape(R"(4/VRCODE: SingleItemExecute *:.*=> tpCmd:(.*))");
    return found(log, shape);
}

std::vector<pid_t> processes_stopped(const std::string &log)
{
    static const std::regex shape(R"(4/VRCODE: FPTEST_SuspendItemExecute *:.*=> pid = (\d+))");
    std::vector<pid_t> pids;
    for (const std::string &number : found(log, shape)) {
        pids.push_back(std::stoi(number));
    }
    return pids;
}

} // namespace fptest_runner

// --- the fixture ------------------------------------------------------------------

void FptestTest::SetUp()
{
    DeviceTest::SetUp();
    fs::remove_all(kWork);
    fs::create_directory(kWork);
    for (const auto &entry : fs::directory_iterator(kData)) {
        fs::remove_all(entry.path());
    }
}

void FptestTest::TearDown()
{
    // the next test's would be refused beside it
    EXPECT_TRUE(
        device::eventually([] { return device::processes_named(FPTEST_PROGRAM).empty(); }, 20));
    fs::permissions(kData, fs::perms::owner_all);
    fs::remove_all(kWork);
    DeviceTest::TearDown();
}

std::string FptestTest::work(const std::string &name)
{
    return std::string(kWork) + "/" + name;
}

std::string FptestTest::file(const std::string &name, const std::string &text)
{
    device::write_file(work(name), text);
    return work(name);
}

std::string FptestTest::plan(const std::string &text)
{
    return file("plan.xml", text);
}

bool FptestTest::is_there(const std::string &name)
{
    return fs::exists(work(name));
}

bool FptestTest::wait_for_file(const std::string &name)
{
    return device::eventually([&] { return is_there(name); }, 30);
}

device::Lines FptestTest::running_items()
{
    device::Lines names;
    for (const device::Process &process : device::processes()) {
        const std::string name = process.name.substr(process.name.rfind('/') + 1);
        const bool is_of_device = process.name.starts_with("/system/bin/");
        if (process.state != 'Z' && is_of_device) {
            names.push_back(name);
        }
    }
    return names;
}

void FptestTest::expect_items_to_end()
{
    if (!device::eventually([] { return running_items().empty(); }, 20)) {
        for (const device::Process &process : device::processes()) {
            ADD_FAILURE() << process.pid << " below " << process.parent << ", " << process.state
                          << " " << process.name << " "
                          << device::status_field(process.pid, "SigIgn") << " "
                          << device::status_field(process.pid, "SigCgt");
        }
    }
}
