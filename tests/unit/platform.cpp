// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "platform.h"

#include "mxml_whitespace.h"
#include "sockwrap.h"
#include "sysparm.h"
#include "vr_log.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <csetjmp>
#include <csignal>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <deque>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <map>
#include <netinet/in.h>
#include <optional>
#include <regex>
#include <sstream>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

namespace fs = std::filesystem;

namespace platform
{
namespace
{

constexpr char kPlan[] = "/data/vorlane/src1.xml";
constexpr int kPid = 4242;
constexpr int kTid = 4343;
constexpr int kFirstFake = 1'000'000; // descriptors that stand for sockets
// What a log call may leave in errno: nothing that a later line may print.
constexpr int kErrnoAfterLog = EXDEV;

// A directory that goes when the process ends.
class Directory
{
  public:
    Directory()
    {
        std::string name = fs::temp_directory_path() / "quillmark-unit-XXXXXX";
        if (mkdtemp(name.data()) == nullptr) {
            std::perror("mkdtemp");
            std::abort();
        }
        path_ = name;
    }
    ~Directory()
    {
        std::error_code ignored;
        fs::remove_all(path_, ignored);
    }
    Directory(const Directory &) = delete;
    Directory &operator=(const Directory &) = delete;

    [[nodiscard]] const fs::path &path() const
    {
        return path_;
    }

  private:
    fs::path path_;
};

const Directory &directory()
{
    static const Directory made;
    return made;
}

struct State {
    std::vector<std::string> events;
    bool recording = true;
    std::map<std::string, std::deque<Step>> steps;
    std::deque<std::string> outputs;
    std::map<int, std::string> descriptors;
    std::map<FILE *, std::string> streams;
    std::map<std::string, int> made; // how many of each kind
    int next_fake = kFirstFake;
    std::optional<std::string> vendor;
    int wait_status = 0;
    int standard_input = -1; // kept here while descriptor 0 is free
    std::function<void(const std::string &)> system_hook;
    std::function<void(const std::string &)> log_hook;
    std::function<void(mxml_node_t *)> load_hook;
    sigset_t mask{};
    std::jmp_buf child{};
};

State &state()
{
    static State current;
    return current;
}

void host_int(int /*signal*/)
{
}
void host_quit(int /*signal*/)
{
}

std::map<int, sighandler_t> &dispositions()
{
    static std::map<int, sighandler_t> current;
    return current;
}

Step next_step(const std::string &function)
{
    auto &queue = state().steps[function];
    if (queue.empty()) {
        return pass();
    }
    const Step step = queue.front();
    queue.pop_front();
    return step;
}

void record(std::string event)
{
    if (state().recording) {
        state().events.push_back(std::move(event));
    }
}

std::string number(long value)
{
    return std::to_string(value);
}

std::string new_name(const std::string &kind)
{
    return kind + "#" + number(++state().made[kind]);
}

std::string name_of(int descriptor)
{
    const auto found = state().descriptors.find(descriptor);
    return found != state().descriptors.end() ? found->second : number(descriptor);
}

bool is_fake(int descriptor)
{
    return descriptor >= kFirstFake;
}

// The result of a scripted call, with errno set as the step says.
long scripted(const Step &step)
{
    if (step.error != 0) {
        errno = step.error;
    }
    return step.value;
}

fs::path redirected(const std::string &path)
{
    return directory().path() / fs::path(path).filename();
}

std::string flag_names(int flags)
{
    std::string names;
    switch (flags & O_ACCMODE) {
    case O_RDONLY:
        names = "O_RDONLY";
        break;
    case O_RDWR:
        names = "O_RDWR";
        break;
    default:
        names = "O_WRONLY";
        break;
    }
    int rest = flags & ~O_ACCMODE;
    const std::pair<int, const char *> known[] = {
        {O_CREAT, "|O_CREAT"}, {O_TRUNC, "|O_TRUNC"}, {O_SYNC, "|O_SYNC"}};
    for (const auto &[flag, name] : known) {
        if ((rest & flag) == flag) {
            names += name;
            rest &= ~flag;
        }
    }
    return rest != 0 ? names + "|" + number(rest) : names;
}

std::string signal_name(int signal)
{
    switch (signal) {
    case SIGCHLD:
        return "SIGCHLD";
    case SIGINT:
        return "SIGINT";
    case SIGQUIT:
        return "SIGQUIT";
    case SIGUSR1:
        return "SIGUSR1";
    default:
        return number(signal);
    }
}

std::string set_names(const sigset_t &set)
{
    std::string names;
    for (int signal = 1; signal < NSIG; ++signal) {
        if (sigismember(&set, signal) == 1) {
            names += (names.empty() ? "" : ",") + signal_name(signal);
        }
    }
    return "{" + names + "}";
}

std::string handler_name(sighandler_t handler)
{
    if (handler == SIG_IGN) {
        return "ignored";
    }
    if (handler == SIG_DFL) {
        return "default";
    }
    if (handler == host_int) {
        return "the host's for SIGINT";
    }
    return handler == host_quit ? "the host's for SIGQUIT" : "unknown";
}

std::string formatted(const char *format, va_list arguments)
{
    va_list again;
    va_copy(again, arguments);
    const int length = std::vsnprintf(nullptr, 0, format, again);
    va_end(again);
    std::string text(static_cast<std::size_t>(length) + 1, '\0');
    std::vsnprintf(text.data(), text.size(), format, arguments);
    text.pop_back();
    return text;
}

// "FUNCTION| TEXT", once the prefix has been found to be as it must.
std::string log_event(const std::string &format, const std::string &line)
{
    static const std::string prefix = "%-15s:%04d:pid=%d:ctid=%d => ";
    static const std::regex shape(R"(([^ :]+)( *):(\d{4,}):pid=(\d+):ctid=(\d+) => ([^]*))");
    EXPECT_EQ(format.substr(0, prefix.size()), prefix);
    std::smatch match;
    if (!std::regex_match(line, match, shape)) {
        ADD_FAILURE() << "a log line of another shape: " << line;
        return line;
    }
    const std::string function = match[1];
    EXPECT_EQ(std::max<std::size_t>(function.size(), 15), function.size() + match[2].str().size());
    EXPECT_EQ(match[4], number(kPid));
    EXPECT_EQ(match[5], number(kTid));
    std::string text = match[6];
    const std::string place = function + "[" + number(std::stol(match[3])) + "]";
    if (text.starts_with(place)) {
        text.replace(0, place.size(), function + "[]");
    }
    return function + "| " + text;
}

} // namespace

Step pass()
{
    return {};
}

Step gives(long value, int error)
{
    return {Step::Kind::Return, value, error};
}

Step limit(long bytes)
{
    return {Step::Kind::Limit, bytes, 0};
}

void reset()
{
    for (const auto &[descriptor, name] : state().descriptors) {
        if (!is_fake(descriptor)) {
            ::close(descriptor);
        }
    }
    for (const auto &[stream, name] : state().streams) {
        std::fclose(stream);
    }
    if (state().standard_input >= 0) {
        dup2(state().standard_input, STDIN_FILENO);
        ::close(state().standard_input);
    }
    for (const auto &entry : fs::directory_iterator(directory().path())) {
        fs::remove_all(entry.path());
    }
    state() = State();
    sigemptyset(&state().mask);
    sigaddset(&state().mask, SIGUSR1);
    dispositions() = {{SIGINT, host_int}, {SIGQUIT, host_quit}};
}

void plan_steps(const std::string &function, std::vector<Step> steps)
{
    auto &queue = state().steps[function];
    queue.insert(queue.end(), steps.begin(), steps.end());
}

bool steps_left(const std::string &function)
{
    return !state().steps[function].empty();
}

void drop_output()
{
    state().outputs.clear();
}

void stop_recording()
{
    state().recording = false;
}

void plan_output(std::vector<std::string> outputs)
{
    state().outputs.insert(state().outputs.end(), outputs.begin(), outputs.end());
}

void set_wait_status(int status)
{
    state().wait_status = status;
}

void set_vendor(const std::string &text)
{
    state().vendor = text;
}

void on_system(std::function<void(const std::string &)> hook)
{
    state().system_hook = std::move(hook);
}

void on_load(std::function<void(mxml_node_t *)> hook)
{
    state().load_hook = std::move(hook);
}

void on_log(std::function<void(const std::string &)> hook)
{
    state().log_hook = std::move(hook);
}

void free_descriptor_zero()
{
    state().standard_input = dup(STDIN_FILENO);
    ::close(STDIN_FILENO);
}

void run_child(const std::function<void()> &body)
{
    if (setjmp(state().child) == 0) {
        body();
    }
}

std::vector<std::string> events()
{
    return std::exchange(state().events, {});
}

namespace
{
bool is_log(const std::string &event)
{
    static const std::regex shape(R"(\w+\| [^]*)");
    return std::regex_match(event, shape);
}
} // namespace

std::vector<std::string> log_lines()
{
    auto taken = events();
    std::erase_if(taken, [](const auto &event) { return !is_log(event); });
    return taken;
}

std::vector<std::string> calls()
{
    auto taken = events();
    std::erase_if(taken, is_log);
    return taken;
}

std::vector<std::string> left_open()
{
    std::vector<std::string> names;
    for (const auto &[descriptor, name] : state().descriptors) {
        names.push_back(name);
    }
    for (const auto &[stream, name] : state().streams) {
        names.push_back(name);
    }
    std::sort(names.begin(), names.end());
    return names;
}

std::string plan_path()
{
    return redirected(kPlan);
}

bool plan_exists()
{
    return fs::exists(plan_path());
}

std::string plan_text()
{
    std::ifstream file(plan_path(), std::ios::binary);
    EXPECT_TRUE(file) << "no test plan file";
    std::ostringstream text;
    text << file.rdbuf();
    return text.str();
}

void write_plan(const std::string &text)
{
    std::ofstream file(plan_path(), std::ios::binary | std::ios::trunc);
    file << text;
}

} // namespace platform

using namespace platform;

extern "C" {

// --- files ---------------------------------------------------------------

int qm_open(const char *path, int flags, ...)
{
    mode_t mode = 0;
    std::string call = std::string("open(") + path + ", " + flag_names(flags);
    if ((flags & O_CREAT) != 0) {
        va_list arguments;
        va_start(arguments, flags);
        mode = va_arg(arguments, mode_t);
        va_end(arguments);
        char octal[16];
        std::snprintf(octal, sizeof octal, ", %04o", mode);
        call += octal;
    }
    const Step step = next_step("open");
    int descriptor = 0;
    if (step.kind == Step::Kind::Return) {
        descriptor = static_cast<int>(scripted(step));
    } else {
        descriptor = ::open(redirected(path).c_str(), flags, mode);
    }
    const int error = errno;
    if (step.kind != Step::Kind::Return && descriptor >= 0) {
        state().descriptors[descriptor] = new_name("plan");
    }
    record(call + ") = " + name_of(descriptor));
    errno = error;
    return descriptor;
}

ssize_t qm_read(int descriptor, void *buffer, size_t size)
{
    const Step step = next_step("read");
    long result = 0;
    if (step.kind == Step::Kind::Return) {
        result = scripted(step);
    } else {
        const size_t most =
            step.kind == Step::Kind::Limit ? std::min(size, static_cast<size_t>(step.value)) : size;
        result = ::read(descriptor, buffer, most);
    }
    const int error = errno;
    record("read(" + name_of(descriptor) + ", " + std::to_string(size) + ") = " + number(result));
    errno = error;
    return result;
}

ssize_t qm_write(int descriptor, const void *data, size_t size)
{
    const Step step = next_step("write");
    long result = static_cast<long>(size);
    if (step.kind == Step::Kind::Return) {
        result = scripted(step);
    } else if (!is_fake(descriptor) &&
               (descriptor > STDERR_FILENO || state().descriptors.contains(descriptor))) {
        const size_t most =
            step.kind == Step::Kind::Limit ? std::min(size, static_cast<size_t>(step.value)) : size;
        result = ::write(descriptor, data, most);
    }
    const int error = errno;
    record("write(" + name_of(descriptor) + ", \"" +
           std::string(static_cast<const char *>(data), size) + "\", " + std::to_string(size) +
           ") = " + number(result));
    errno = error;
    return result;
}

off_t qm_lseek(int descriptor, off_t offset, int whence)
{
    const char *const names[] = {"SEEK_SET", "SEEK_CUR", "SEEK_END"};
    const Step step = next_step("lseek");
    const off_t result =
        step.kind == Step::Kind::Return ? scripted(step) : ::lseek(descriptor, offset, whence);
    record("lseek(" + name_of(descriptor) + ", " + number(offset) + ", " + names[whence] +
           ") = " + number(result));
    return result;
}

int qm_close(int descriptor)
{
    record("close(" + name_of(descriptor) + ")");
    const Step step = next_step("close");
    if (!is_fake(descriptor)) {
        ::close(descriptor);
    }
    EXPECT_EQ(state().descriptors.erase(descriptor), 1U)
        << "descriptor " << descriptor << " was not open";
    return step.kind == Step::Kind::Return ? static_cast<int>(scripted(step)) : 0;
}

int qm_remove(const char *path)
{
    const Step step = next_step("remove");
    const int result = step.kind == Step::Kind::Return ? static_cast<int>(scripted(step))
                                                       : ::remove(redirected(path).c_str());
    record(std::string("remove(") + path + ") = " + number(result));
    return result;
}

mxml_node_t *qm_mxmlLoadFd(mxml_node_t *top, int descriptor, mxml_load_cb_t type)
{
    mxml_node_t *tree = mxmlLoadFd(top, descriptor, type);
    if (state().load_hook) {
        state().load_hook(tree);
    }
    return tree;
}

// --- sockets -------------------------------------------------------------

int qm_socket(int domain, int type, int protocol)
{
    const Step step = next_step("socket");
    int descriptor = 0;
    if (step.kind == Step::Kind::Return) {
        descriptor = static_cast<int>(scripted(step));
    } else {
        descriptor = state().next_fake++;
        state().descriptors[descriptor] = new_name("listener");
    }
    record("socket(" + std::string(domain == AF_INET ? "AF_INET" : number(domain)) + ", " +
           (type == SOCK_STREAM ? "SOCK_STREAM" : number(type)) + ", " + number(protocol) +
           ") = " + name_of(descriptor));
    return descriptor;
}

int qm_listen(int descriptor, int backlog)
{
    const Step step = next_step("listen");
    const long result = scripted(step);
    const int error = errno;
    record("listen(" + name_of(descriptor) + ", " + number(backlog) + ") = " + number(result));
    errno = error;
    return static_cast<int>(result);
}

void Setsockopt(int descriptor, const int *value)
{
    record("Setsockopt(" + name_of(descriptor) + ", " + number(*value) + ")");
}

void Bind(int descriptor, const sockaddr *address, socklen_t length)
{
    std::string bytes;
    for (socklen_t at = 0; at < length; ++at) {
        char hex[4];
        std::snprintf(hex, sizeof hex, "%02x",
                      reinterpret_cast<const unsigned char *>(address)[at]);
        bytes += hex;
    }
    record("Bind(" + name_of(descriptor) + ", " + bytes + ", " + std::to_string(length) + ")");
}

int Accept(int descriptor, sockaddr *address, socklen_t *length)
{
    const Step step = next_step("Accept");
    int connection = 0;
    std::memset(address, 0x5a, *length); // it is the callee's to write
    if (step.kind == Step::Kind::Return) {
        connection = static_cast<int>(scripted(step));
    } else {
        connection = state().next_fake++;
        state().descriptors[connection] = new_name("connection");
    }
    const int error = errno;
    record("Accept(" + name_of(descriptor) + ", " + std::to_string(*length) +
           ") = " + name_of(connection));
    errno = error;
    return connection;
}

// --- programs ------------------------------------------------------------

FILE *qm_popen(const char *command, const char *mode)
{
    const std::string call = std::string("popen(") + command + ", " + mode + ") = ";
    const Step step = next_step("popen");
    if (step.kind == Step::Kind::Return) {
        record(call + "null");
        scripted(step);
        return nullptr;
    }
    std::string output;
    if (!state().outputs.empty()) {
        output = state().outputs.front();
        state().outputs.pop_front();
    }
    const int memory = memfd_create("output", 0);
    EXPECT_EQ(::write(memory, output.data(), output.size()), static_cast<ssize_t>(output.size()));
    ::lseek(memory, 0, SEEK_SET);
    FILE *stream = fdopen(memory, "r");
    state().streams[stream] = new_name("stream");
    record(call + state().streams[stream]);
    return stream;
}

char *qm_fgets(char *buffer, int size, FILE *stream)
{
    const Step step = next_step("fgets");
    char *result = nullptr;
    if (step.kind != Step::Kind::Return) {
        result = std::fgets(buffer, size, stream);
    }
    record("fgets(" + state().streams[stream] + ", " + number(size) +
           ") = " + (result != nullptr ? "\"" + std::string(result) + "\"" : std::string("null")));
    return result;
}

int qm_pclose(FILE *stream)
{
    const Step step = next_step("pclose");
    record("pclose(" + state().streams[stream] + ")");
    state().streams.erase(stream);
    std::fclose(stream);
    return static_cast<int>(scripted(step));
}

int qm_system(const char *command)
{
    record(std::string("system(") + command + ")");
    const Step step = next_step("system");
    if (state().system_hook) {
        state().system_hook(command);
    }
    return static_cast<int>(scripted(step));
}

int qm_printf(const char *format, ...)
{
    va_list arguments;
    va_start(arguments, format);
    const std::string text = formatted(format, arguments);
    va_end(arguments);
    record("stdout: " + text);
    return static_cast<int>(text.size());
}

pid_t qm_vfork()
{
    const Step step = next_step("vfork");
    const long pid = step.kind == Step::Kind::Return ? scripted(step) : 100;
    const int error = errno;
    record("vfork() = " + number(pid));
    errno = error;
    return static_cast<pid_t>(pid);
}

int qm_execve(const char *path, char *const arguments[], char *const environment[])
{
    std::string list;
    for (int at = 0; arguments[at] != nullptr; ++at) {
        list += (at == 0 ? "" : "|") + std::string(arguments[at]);
    }
    record(std::string("execve(") + path + ", " + list + ", " +
           (environment == environ ? "environ" : "another environment") + ")");
    errno = ENOENT;
    return -1;
}

void qm_exit(int status)
{
    record("_exit(" + number(status) + ")");
    std::longjmp(state().child, 1);
}

pid_t qm_waitpid(pid_t pid, int *status, int options)
{
    const Step step = next_step("waitpid");
    const long result = scripted(step);
    if (result > 0) {
        *status = state().wait_status;
    }
    record("waitpid(" + number(pid) + ", " + (options == WNOHANG ? "WNOHANG" : number(options)) +
           ") = " + number(result));
    return static_cast<pid_t>(result);
}

// --- signals -------------------------------------------------------------

int qm_sigemptyset(sigset_t *set)
{
    record("sigemptyset()");
    return sigemptyset(set);
}

int qm_sigaddset(sigset_t *set, int signal)
{
    record("sigaddset(" + signal_name(signal) + ")");
    return sigaddset(set, signal);
}

int qm_sigprocmask(int how, const sigset_t *set, sigset_t *old)
{
    const Step step = next_step("sigprocmask");
    if (old != nullptr && step.kind != Step::Kind::Return) {
        *old = state().mask;
    }
    const std::map<int, std::string> names = {
        {SIG_BLOCK, "SIG_BLOCK"}, {SIG_UNBLOCK, "SIG_UNBLOCK"}, {SIG_SETMASK, "SIG_SETMASK"}};
    record("sigprocmask(" + names.at(how) + ", " + set_names(*set) +
           (old != nullptr ? ", old mask)" : ", null)"));
    return static_cast<int>(scripted(step));
}

sighandler_t qm_signal(int signal, sighandler_t handler)
{
    record("signal(" + signal_name(signal) + ", " + handler_name(handler) + ")");
    return std::exchange(dispositions()[signal], handler);
}

// --- the rest ------------------------------------------------------------

pid_t qm_getpid()
{
    return kPid;
}

pid_t qm_gettid()
{
    return kTid;
}

char *qm_strdup(const char *text)
{
    const Step step = next_step("strdup");
    if (step.kind == Step::Kind::Return) {
        scripted(step);
        return nullptr;
    }
    return ::strdup(text);
}

// --- the maker's interfaces ----------------------------------------------

int vr_log_printf(int priority, const char *tag, const char *format, ...)
{
    va_list arguments;
    va_start(arguments, format);
    const std::string line = formatted(format, arguments);
    va_end(arguments);
    EXPECT_EQ(priority, 4);
    EXPECT_STREQ(tag, "VRCODE");
    if (!state().recording) {
        errno = kErrnoAfterLog;
        return static_cast<int>(line.size());
    }
    const std::string event = log_event(format, line);
    record(event);
    if (state().log_hook) {
        state().log_hook(event);
    }
    errno = kErrnoAfterLog;
    return static_cast<int>(line.size());
}

int get_node_value(const char *file, const char *path, char *buffer, size_t length)
{
    record(std::string("get_node_value(") + file + ", " + path + ", " + std::to_string(length) +
           ")");
    for (size_t at = 0; at <= length; ++at) { // the buffer has one byte more
        EXPECT_EQ(buffer[at], '\0') << at;
    }
    if (!state().vendor) {
        return -1;
    }
    std::strncpy(buffer, state().vendor->c_str(), length);
    return 0;
}

void mxmlSetLoneWhitespaceOff(int off)
{
    record("mxmlSetLoneWhitespaceOff(" + number(off) + ")");
}

} // extern "C"
