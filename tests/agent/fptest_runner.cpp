// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "fptest_runner.h"

#include "become.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <linux/capability.h>
#include <linux/close_range.h>
#include <linux/securebits.h>
#include <regex>
#include <sched.h>
#include <sstream>
#include <stdexcept>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <sys/syscall.h>
#include <sys/wait.h>
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

// All of it can be read while somebody writes, and nobody waits for a reader.
Descriptor make_file(const std::string &text = "")
{
    Descriptor file(memfd_create("fptest-test", MFD_CLOEXEC));
    if (!file.is_open() ||
        write(file.get(), text.data(), text.size()) != static_cast<ssize_t>(text.size()) ||
        lseek(file.get(), 0, SEEK_SET) != 0) {
        throw std::runtime_error("no memory for a file");
    }
    return file;
}

std::string text_of(const Descriptor &file)
{
    struct stat status {
    };
    fstat(file.get(), &status);
    std::string text(static_cast<std::size_t>(status.st_size), '\0');
    const ssize_t got = pread(file.get(), text.data(), text.size(), 0);
    text.resize(static_cast<std::size_t>(std::max<ssize_t>(got, 0)));
    return text;
}

Start start_of(const std::vector<std::string> &arguments, const std::string &input = "")
{
    Start start;
    start.arguments = arguments;
    start.input = input;
    return start;
}

// Whatever is missing here makes the test fail by what the program then does.
void drop_privileges()
{
    // fails where there are none to be dropped, as in a device of namespaces
    prctl(PR_SET_SECUREBITS, SECBIT_NOROOT | SECBIT_NOROOT_LOCKED);
    __user_cap_header_struct header{_LINUX_CAPABILITY_VERSION_3, 0};
    std::array<__user_cap_data_struct, 2> none{};
    if (syscall(SYS_capset, &header, none.data()) != 0) {
        _exit(126);
    }
}

void hide_the_device()
{
    if (unshare(CLONE_NEWUSER | CLONE_NEWNS) != 0 ||
        mount("none", "/system/bin", "tmpfs", 0, nullptr) != 0) {
        _exit(126);
    }
}

device::Lines found(const std::string &log, const std::regex &shape)
{
    device::Lines all;
    for (const std::string &line : lines_of(device::read_file(log))) {
        std::smatch match;
        if (std::regex_match(line, match, shape)) {
            all.push_back(match[1]);
        }
    }
    return all;
}

} // namespace

// --- a process ------------------------------------------------------------------

FptestProcess::FptestProcess(const std::vector<std::string> &arguments)
    : FptestProcess(start_of(arguments))
{
}

FptestProcess::FptestProcess(const Start &start)
    : input_(make_file(start.input)), output_(make_file()), errors_(make_file())
{
    pid_ = fork();
    if (pid_ < 0) {
        throw std::runtime_error("no process for fptest");
    }
    if (pid_ == 0) {
        become(start);
    }
}

void FptestProcess::become(const Start &start) const
{
    if (start.has_own_group) {
        setpgid(0, 0);
    }
    if (start.has_own_session) {
        setsid();
    }
    dup2(input_.get(), STDIN_FILENO);
    dup2(output_.get(), STDOUT_FILENO);
    dup2(errors_.get(), STDERR_FILENO);
    if (!start.output.empty()) {
        // a terminal becomes that of the session only where it can be read
        const int file = open(start.output.c_str(), O_RDWR | O_CREAT | O_TRUNC, 0644);
        dup2(file, STDOUT_FILENO);
        close(file);
    }
    // as a shell in front starts it, however the tests were started
    close_range(STDERR_FILENO + 1, ~0U, CLOSE_RANGE_CLOEXEC);
    for (const int number : {SIGINT, SIGTERM, SIGHUP, SIGQUIT, SIGPIPE}) {
        std::signal(number, SIG_DFL);
    }
    for (const int number : start.ignored) {
        std::signal(number, SIG_IGN);
    }
    unsetenv("QUILLMARK_DEVICE"); // it would say at each start what goes with the device
    for (const auto &[name, value] : start.environment) {
        if (value) {
            setenv(name.c_str(), value->c_str(), 1);
        } else {
            unsetenv(name.c_str());
        }
    }
    if (start.is_no_device) {
        hide_the_device();
    }
    if (start.is_plain_user) {
        drop_privileges();
    }
    if (start.is_interrupted) {
        sigset_t set;
        sigemptyset(&set);
        sigaddset(&set, SIGINT);
        sigprocmask(SIG_BLOCK, &set, nullptr);
        raise(SIGINT);
    }
    std::vector<char *> argv = {const_cast<char *>(FPTEST_PROGRAM)};
    for (const std::string &argument : start.arguments) {
        argv.push_back(const_cast<char *>(argument.c_str()));
    }
    argv.push_back(nullptr);
    execv(argv[0], argv.data());
    _exit(127);
}

FptestProcess::~FptestProcess()
{
    if (!ended_ && pid_ > 0) {
        kill(pid_, SIGKILL);
        waitpid(pid_, nullptr, 0);
    }
}

pid_t FptestProcess::module() const
{
    pid_t module = 0;
    EXPECT_TRUE(device::wait_for([&] {
        for (const device::Process &process : device::processes()) {
            if (process.parent == pid_ && process.state != 'Z') {
                module = process.pid;
            }
        }
        return module != 0;
    }));
    return module;
}

void FptestProcess::signal(int number) const
{
    EXPECT_EQ(kill(pid_, number), 0);
}

std::string FptestProcess::out() const
{
    return text_of(output_);
}

std::string FptestProcess::err() const
{
    return text_of(errors_);
}

bool FptestProcess::has_ended()
{
    int status = 0;
    if (!ended_ && waitpid(pid_, &status, WNOHANG) == pid_) {
        ended_ = Ended();
        ended_->status = WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
        ended_->out = out();
        ended_->err = err();
        ended_->seconds =
            std::chrono::duration<double>(std::chrono::steady_clock::now() - began_).count();
    }
    return ended_.has_value();
}

Ended FptestProcess::wait(double seconds)
{
    if (!device::wait_for([this] { return has_ended(); }, seconds)) {
        ADD_FAILURE() << "fptest has not ended within " << seconds << " s; it has printed\n"
                      << out() << err();
        kill(pid_, SIGKILL);
        EXPECT_TRUE(device::wait_for([this] { return has_ended(); }));
    }
    return ended_.value();
}

Ended run_fptest(const Start &start)
{
    return FptestProcess(start).wait();
}

Ended run_fptest(const std::vector<std::string> &arguments, const std::string &input)
{
    return run_fptest(start_of(arguments, input));
}

void expect_refusal(int status, const std::string &line, const std::vector<std::string> &arguments)
{
    const Ended ended = run_fptest(arguments);
    EXPECT_EQ(ended.status, status) << ::testing::PrintToString(arguments);
    EXPECT_EQ(ended.err, line + "\n");
    EXPECT_EQ(ended.out, "");
}

Ended run_program(const std::vector<std::string> &arguments,
                  const std::map<std::string, std::optional<std::string>> &environment)
{
    const Descriptor output = make_file();
    const pid_t pid = fork();
    if (pid == 0) {
        const int null = open("/dev/null", O_RDONLY);
        dup2(null, STDIN_FILENO);
        dup2(output.get(), STDOUT_FILENO);
        dup2(output.get(), STDERR_FILENO);
        become(arguments, environment);
    }
    int status = 0;
    if (pid < 0 || waitpid(pid, &status, 0) != pid) {
        throw std::runtime_error("no process for " + arguments.at(0));
    }
    Ended ended;
    ended.status = WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
    ended.out = text_of(output);
    return ended;
}

// --- texts ----------------------------------------------------------------------

device::Lines lines_of(const std::string &text)
{
    device::Lines lines;
    std::istringstream stream(text);
    for (std::string line; std::getline(stream, line);) {
        lines.push_back(line);
    }
    return lines;
}

std::string without_times(const std::string &text)
{
    static const std::regex time(R"(\b\d+\.\d s\b)");
    return std::regex_replace(text, time, "T s");
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
    return device::wait_for([&] { return is_there(name); }, 30);
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
    if (!device::wait_for([] { return running_items().empty(); }, 20)) {
        for (const device::Process &process : device::processes()) {
            ADD_FAILURE() << process.pid << " below " << process.parent << ", " << process.state
                          << " " << process.name << " "
                          << device::status_field(process.pid, "SigIgn") << " "
                          << device::status_field(process.pid, "SigCgt");
        }
    }
}

void FptestTest::fill_disk()
{
    struct statvfs disk {
    };
    ASSERT_EQ(statvfs(kData, &disk), 0);
    ASSERT_LE(disk.f_blocks * disk.f_frsize, 64U << 20) << "too much to be filled";
    const Descriptor filler(open("/data/vorlane/filler", O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
    const std::string block(disk.f_frsize, 'f');
    while (write(filler.get(), block.data(), block.size()) > 0) {
    }
    ASSERT_EQ(errno, ENOSPC);
}

bool FptestTest::is_in_place()
{
    return std::getenv("QUILLMARK_DEVICE") == std::string("in-place");
}
