// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "device_test.h"

#include "common/descriptor.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <regex>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

namespace fs = std::filesystem;

namespace device
{
namespace
{

// How far log_lines has read.
std::size_t &log_position()
{
    static std::size_t position = 0;
    return position;
}

std::string log_event(const std::string &tag, const std::string &text)
{
    static const std::regex shape(R"(([^ :]+) *:(\d{4,}):pid=(\d+):ctid=(\d+) => ([^]*))");
    std::smatch match;
    if (tag != "VRCODE" || !std::regex_match(text, match, shape)) {
        return tag + ": " + text;
    }
    std::string rest = match[5];
    const std::string place =
        match[1].str() + "[" + std::to_string(std::stol(match[2].str())) + "]";
    if (rest.starts_with(place)) {
        rest.replace(0, place.size(), match[1].str() + "[]");
    }
    return match[1].str() + "| " + rest;
}

bool is_of(pid_t process, const std::string &text)
{
    const std::string pid = ":pid=" + std::to_string(process) + ":";
    return text.find(pid) != std::string::npos || text.find(":pid=") == std::string::npos;
}

} // namespace

std::string plan_of(const std::vector<std::pair<std::string, std::vector<PlanItem>>> &groups)
{
    std::string plan = "<P>";
    for (const auto &[group, items] : groups) {
        plan += "<CmdGroup name=\"" + group + "\">";
        for (const PlanItem &item : items) {
            plan += "<Cmd name=\"" + item.name + "\" args=\"" + item.args + "\"/>";
        }
        plan += "</CmdGroup>";
    }
    return plan + "</P>";
}

std::string group_of(const std::vector<PlanItem> &items)
{
    return plan_of({{"G", items}});
}

void store(const std::string &plan)
{
    EXPECT_EQ(FPTEST_RunTestCmd(("XMLFile::" + plan).c_str(), nullptr, 0), 0);
}

void run_path(const std::string &path)
{
    std::array<char, 100> reply;
    reply.fill('x');
    EXPECT_EQ(FPTEST_RunTestCmd(("XMLNodePath::" + path).c_str(), reply.data(), reply.size()), 0);
    EXPECT_TRUE(std::all_of(reply.begin(), reply.end(), [](char c) { return c == '\0'; }));
}

std::string read_back(int room)
{
    std::string buffer(static_cast<std::size_t>(room) + 1, '\0');
    FPTEST_ExtractResultMsg(buffer.data(), room);
    return buffer.c_str();
}

void set_vendor(const std::string &text)
{
    write_file(kParameterFile, "<?xml version=\"1.0\"?>\n<device><SysParam><Quillmark><vendor>" +
                                   text + "</vendor></Quillmark></SysParam></device>\n");
}

bool is_in_place()
{
    return std::getenv("QUILLMARK_DEVICE") == std::string("in-place");
}

void fill_disk()
{
    const fs::space_info disk = fs::space("/data/vorlane");
    ASSERT_LE(disk.capacity, 64U << 20) << "too much to be filled";
    const Descriptor filler(open(kFiller, O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
    const std::string block(4096, 'f');
    while (write(filler.get(), block.data(), block.size()) > 0) {
    }
    ASSERT_EQ(errno, ENOSPC);
}

Lines ran()
{
    return lines_of(read_file("/data/vorlane/ran.txt"));
}

Lines log_lines()
{
    return log_lines(getpid());
}

Lines log_lines(pid_t process)
{
    static const std::regex start(R"(^4/(\w+): )");
    std::string text = read_file(kLogFile).substr(log_position());
    log_position() += text.size();

    Lines events;
    std::string tag;
    std::string entry;
    const auto finish = [&] {
        if (!tag.empty() && is_of(process, entry)) {
            events.push_back(log_event(tag, entry));
        }
    };
    for (const std::string &line : lines_of(text)) {
        std::smatch match;
        if (std::regex_search(line, match, start)) {
            finish();
            tag = match[1];
            entry = match.suffix();
        } else {
            entry += "\n" + line;
        }
    }
    finish();
    return events;
}

std::vector<Process> processes()
{
    std::vector<Process> found;
    for (const auto &entry : fs::directory_iterator("/proc")) {
        const std::string number = entry.path().filename();
        if (!std::all_of(number.begin(), number.end(),
                         [](unsigned char c) { return std::isdigit(c) != 0; })) {
            continue;
        }
        const std::string stat = read_file(entry.path() / "stat");
        const auto open = stat.find('(');
        const auto close = stat.rfind(')');
        if (open == std::string::npos || close == std::string::npos) {
            continue; // it has ended meanwhile
        }
        Process process;
        process.pid = std::stoi(number);
        process.state = stat[close + 2];
        process.parent = std::stoi(stat.substr(close + 4));
        if (process.state == 'Z' && process.parent == 1) {
            continue; // it has ended; init collects it when it gets to it
        }
        process.name = read_file(entry.path() / "cmdline").c_str();
        if (process.name.empty()) {
            process.name = stat.substr(open + 1, close - open - 1);
        }
        found.push_back(process);
    }
    std::sort(found.begin(), found.end(),
              [](const Process &a, const Process &b) { return a.pid < b.pid; });
    return found;
}

std::vector<Process> processes_named(const std::string &name)
{
    auto found = processes();
    std::erase_if(found, [&](const Process &process) { return process.name != name; });
    return found;
}

std::size_t zombies()
{
    return static_cast<std::size_t>(std::ranges::count_if(processes(), [](const Process &process) {
        return process.parent == getpid() && process.state == 'Z';
    }));
}

bool children_end(pid_t running)
{
    return eventually([=] {
        return std::ranges::none_of(processes(), [=](const Process &process) {
            return process.parent == getpid() && process.pid != running && process.state != 'Z';
        });
    });
}

int signal_that_ends(pid_t child)
{
    int status = 0;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_TRUE(WIFSIGNALED(status));
    return WTERMSIG(status);
}

std::string status_field(pid_t pid, const std::string &field)
{
    for (const std::string &line :
         lines_of(read_file("/proc/" + std::to_string(pid) + "/status"))) {
        if (line.starts_with(field + ":\t")) {
            return line.substr(field.size() + 2);
        }
    }
    return {};
}

std::vector<std::pair<int, std::string>> descriptors()
{
    std::vector<std::pair<int, std::string>> open;
    for (const auto &entry : fs::directory_iterator("/proc/self/fd")) {
        std::error_code gone; // as the iterator's own is by the time of asking
        const std::string target = fs::read_symlink(entry.path(), gone);
        if (!gone && target != kLogFile && !target.starts_with("/proc/")) {
            open.emplace_back(std::stoi(entry.path().filename()), target);
        }
    }
    std::sort(open.begin(), open.end());
    return open;
}

std::size_t count_open(const std::string &kind)
{
    const auto open = descriptors();
    return static_cast<std::size_t>(std::ranges::count_if(
        open, [&](const auto &descriptor) { return descriptor.second.starts_with(kind); }));
}

pid_t start_item_program(const std::vector<std::string> &arguments)
{
    std::vector<char *> argv;
    for (const std::string &argument : arguments) {
        argv.push_back(const_cast<char *>(argument.c_str()));
    }
    argv.push_back(nullptr);
    pid_t pid = 0;
    EXPECT_EQ(posix_spawn(&pid, argv[0], nullptr, nullptr, argv.data(), environ), 0) << argv[0];
    // it has its own name only once it has been executed
    EXPECT_TRUE(eventually([&] { return !processes_named(arguments[0]).empty(); }));
    return pid;
}

} // namespace device

void DeviceTest::SetUp()
{
    std::signal(SIGPIPE, SIG_IGN);
    unlink(device::kLogFile);
    unlink(device::kPlanFile);
    unlink(device::kParameterFile);
    unlink("/data/vorlane/ran.txt");
    setenv("VR_LOG_FILE", device::kLogFile, 1);
    device::write_file(device::kLogFile, "");
}

void DeviceTest::TearDown()
{
    for (const device::Process &process : device::processes()) {
        if (process.name.starts_with("/system/bin/")) {
            kill(process.pid, SIGKILL);
        }
    }
}
