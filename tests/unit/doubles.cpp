// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the library calls instead of the platform: see platform.h.
#include "platform.h"

#include "mxml_whitespace.h"
#include "sockwrap.h"
#include "sysparm.h"
#include "vr_log.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <sstream>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>

using namespace platform;

namespace
{

constexpr int kPid = 4242;
constexpr int kTid = 4343;
// What a log call may leave in errno: nothing that a later line may print.
constexpr int kErrnoAfterLog = EXDEV;

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

// The result of a scripted call, with errno set as the step says.
long scripted(const Step &step)
{
    if (step.error != 0) {
        errno = step.error;
    }
    return step.value;
}

// What the next step says, or what the real thing gives, done as the step says.
template <typename Real> long outcome(const char *function, const Real &real)
{
    const Step step = next_step(function);
    return step.kind == Step::Kind::Return ? scripted(step) : static_cast<long>(real(step));
}

size_t at_most(const Step &step, size_t size)
{
    return step.kind == Step::Kind::Limit ? std::min(size, static_cast<size_t>(step.value)) : size;
}

// Leaves errno as it is: to the library, nothing happens between two calls.
void record(std::string event)
{
    const int error = errno;
    if (state().recording) {
        state().events.push_back(std::move(event));
    }
    errno = error;
}

// "name(argument, argument)"
template <typename... Arguments> std::string call(const char *name, const Arguments &...arguments)
{
    std::ostringstream text;
    [[maybe_unused]] const char *before = "(";
    text << name;
    ((text << std::exchange(before, ", ") << arguments), ...);
    text << (sizeof...(arguments) == 0 ? "()" : ")");
    return text.str();
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

int new_fake(const char *kind)
{
    const int descriptor = state().next_fake++;
    state().descriptors[descriptor] = new_name(kind);
    return descriptor;
}

bool is_fake(int descriptor)
{
    return descriptor >= kFirstFake;
}

std::string flag_names(int flags)
{
    const std::map<int, std::string> modes = {
        {O_RDONLY, "O_RDONLY"}, {O_WRONLY, "O_WRONLY"}, {O_RDWR, "O_RDWR"}};
    std::string names = modes.at(flags & O_ACCMODE);
    flags &= ~O_ACCMODE;
    for (const auto &[flag, name] :
         {std::pair{O_CREAT, "|O_CREAT"}, {O_TRUNC, "|O_TRUNC"}, {O_SYNC, "|O_SYNC"}}) {
        if ((flags & flag) == flag) {
            names += name;
            flags &= ~flag;
        }
    }
    return flags != 0 ? names + "|" + number(flags) : names;
}

std::string signal_name(int signal)
{
    const std::map<int, std::string> names = {
        {SIGCHLD, "SIGCHLD"}, {SIGINT, "SIGINT"}, {SIGQUIT, "SIGQUIT"}, {SIGUSR1, "SIGUSR1"}};
    return names.contains(signal) ? names.at(signal) : number(signal);
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
    return handler == SIG_IGN     ? "ignored"
           : handler == SIG_DFL   ? "default"
           : handler == host_int  ? "the host's for SIGINT"
           : handler == host_quit ? "the host's for SIGQUIT"
                                  : "unknown";
}

std::string formatted(const char *format, va_list arguments)
{
    char *text = nullptr;
    const int length = vasprintf(&text, format, arguments);
    std::string whole(text, static_cast<std::size_t>(length));
    std::free(text);
    return whole;
}

// "FUNCTION| TEXT", once the prefix has been found to be as it must.
std::string log_event(const std::string &format, const std::string &line)
{
    constexpr char kPrefix[] = "%-15s:%04d:pid=%d:ctid=%d => ";
    EXPECT_TRUE(format.starts_with(kPrefix)) << format;
    const std::string function = line.substr(0, line.find_first_of(" :"));
    const int place = std::atoi(line.c_str() + line.find(':') + 1);
    char prefix[100];
    std::snprintf(prefix, sizeof prefix, kPrefix, function.c_str(), place, kPid, kTid);
    EXPECT_TRUE(line.starts_with(prefix)) << line;

    std::string text = line.substr(std::min(std::strlen(prefix), line.size()));
    const std::string named = function + "[" + number(place) + "]";
    if (text.starts_with(named)) {
        text.replace(0, named.size(), function + "[]");
    }
    return function + "| " + text;
}

} // namespace

extern "C" {

// --- files ---------------------------------------------------------------

int qm_open(const char *path, int flags, ...)
{
    mode_t mode = 0;
    std::string shown = std::string(path) + ", " + flag_names(flags);
    if ((flags & O_CREAT) != 0) {
        va_list arguments;
        va_start(arguments, flags);
        mode = static_cast<mode_t>(va_arg(arguments, int));
        va_end(arguments);
        char octal[16];
        std::snprintf(octal, sizeof octal, ", %04o", mode);
        shown += octal;
    }
    const auto descriptor = static_cast<int>(outcome("open", [&](const Step &) {
        const int opened = ::open(redirected(path).c_str(), flags, mode);
        if (opened >= 0) {
            state().descriptors[opened] = new_name("plan");
        }
        return opened;
    }));
    record(call("open", shown) + " = " + name_of(descriptor));
    return descriptor;
}

ssize_t qm_read(int descriptor, void *buffer, size_t size)
{
    const long result = outcome(
        "read", [&](const Step &step) { return ::read(descriptor, buffer, at_most(step, size)); });
    record(call("read", name_of(descriptor), size) + " = " + number(result));
    return result;
}

ssize_t qm_write(int descriptor, const void *data, size_t size)
{
    const long result = outcome("write", [&](const Step &step) {
        const bool real = !is_fake(descriptor) &&
                          (descriptor > STDERR_FILENO || state().descriptors.contains(descriptor));
        return real ? ::write(descriptor, data, at_most(step, size)) : static_cast<ssize_t>(size);
    });
    const std::string text(static_cast<const char *>(data), size);
    record(call("write", name_of(descriptor), "\"" + text + "\"", size) + " = " + number(result));
    return result;
}

off_t qm_lseek(int descriptor, off_t offset, int whence)
{
    const char *const names[] = {"SEEK_SET", "SEEK_CUR", "SEEK_END"};
    const off_t result =
        outcome("lseek", [&](const Step &) { return ::lseek(descriptor, offset, whence); });
    record(call("lseek", name_of(descriptor), offset, names[whence]) + " = " + number(result));
    return result;
}

// The library checks no sizes itself: what _FORTIFY_SOURCE adds is not looked at.
int qm_open_2(const char *path, int flags)
{
    return qm_open(path, flags);
}

ssize_t qm_read_chk(int descriptor, void *buffer, size_t size, size_t)
{
    return qm_read(descriptor, buffer, size);
}

ssize_t qm_write_chk(int descriptor, const void *data, size_t size, size_t)
{
    return qm_write(descriptor, data, size);
}

int qm_close(int descriptor)
{
    record(call("close", name_of(descriptor)));
    const Step step = next_step("close");
    if (!is_fake(descriptor)) {
        ::close(descriptor);
    }
    EXPECT_EQ(state().descriptors.erase(descriptor), 1U)
        << "descriptor " << descriptor << " was not open";
    return static_cast<int>(scripted(step));
}

int qm_remove(const char *path)
{
    const long result =
        outcome("remove", [&](const Step &) { return ::remove(redirected(path).c_str()); });
    record(call("remove", path) + " = " + number(result));
    return static_cast<int>(result);
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
    const auto descriptor =
        static_cast<int>(outcome("socket", [](const Step &) { return new_fake("listener"); }));
    record(call("socket", domain == AF_INET ? "AF_INET" : number(domain),
                type == SOCK_STREAM ? "SOCK_STREAM" : number(type), protocol) +
           " = " + name_of(descriptor));
    return descriptor;
}

int qm_listen(int descriptor, int backlog)
{
    const long result = scripted(next_step("listen"));
    record(call("listen", name_of(descriptor), backlog) + " = " + number(result));
    return static_cast<int>(result);
}

void Setsockopt(int descriptor, const int *value)
{
    record(call("Setsockopt", name_of(descriptor), *value));
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
    record(call("Bind", name_of(descriptor), bytes, length));
}

int Accept(int descriptor, sockaddr *address, socklen_t *length)
{
    std::memset(address, 0x5a, static_cast<std::size_t>(*length)); // it is the callee's to write
    const auto connection =
        static_cast<int>(outcome("Accept", [](const Step &) { return new_fake("connection"); }));
    record(call("Accept", name_of(descriptor), *length) + " = " + name_of(connection));
    return connection;
}

// --- programs ------------------------------------------------------------

FILE *qm_popen(const char *command, const char *mode)
{
    const std::string shown = call("popen", command, mode) + " = ";
    const Step step = next_step("popen");
    if (step.kind == Step::Kind::Return) {
        record(shown + "null");
        scripted(step);
        return nullptr;
    }
    std::string output;
    if (!state().outputs.empty()) {
        output = state().outputs.front();
        state().outputs.pop_front();
    }
    const int memory = static_cast<int>(syscall(SYS_memfd_create, "output", 0));
    EXPECT_EQ(::write(memory, output.data(), output.size()), static_cast<ssize_t>(output.size()));
    ::lseek(memory, 0, SEEK_SET);
    FILE *stream = fdopen(memory, "r");
    state().streams[stream] = new_name("stream");
    record(shown + state().streams[stream]);
    return stream;
}

char *qm_fgets(char *buffer, int size, FILE *stream)
{
    const Step step = next_step("fgets");
    char *result = step.kind != Step::Kind::Return ? std::fgets(buffer, size, stream) : nullptr;
    record(call("fgets", state().streams[stream], size) + " = " +
           (result != nullptr ? "\"" + std::string(result) + "\"" : "null"));
    return result;
}

#ifdef __GLIBC__
char *qm_fgets_chk(char *text, size_t, int capacity, FILE *stream)
#else
char *qm_fgets_chk(char *text, int capacity, FILE *stream, size_t)
#endif
{
    return qm_fgets(text, capacity, stream);
}

int qm_pclose(FILE *stream)
{
    const Step step = next_step("pclose");
    record(call("pclose", state().streams[stream]));
    state().streams.erase(stream);
    std::fclose(stream);
    return static_cast<int>(scripted(step));
}

int qm_system(const char *command)
{
    record(call("system", command));
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
    const long pid = outcome("vfork", [](const Step &) { return 100; });
    record(call("vfork") + " = " + number(pid));
    return static_cast<pid_t>(pid);
}

int qm_execve(const char *path, char *const arguments[], char *const environment[])
{
    std::string list;
    for (int at = 0; arguments[at] != nullptr; ++at) {
        list += (at == 0 ? "" : "|") + std::string(arguments[at]);
    }
    record(call("execve", path, list, environment == environ ? "environ" : "another environment"));
    errno = ENOENT;
    return -1;
}

void qm_exit(int status)
{
    record(call("_exit", status));
    std::longjmp(state().child, 1);
}

pid_t qm_waitpid(pid_t pid, int *status, int options)
{
    const long result = scripted(next_step("waitpid"));
    if (result > 0) {
        *status = state().wait_status;
    }
    record(call("waitpid", pid, options == WNOHANG ? "WNOHANG" : number(options)) + " = " +
           number(result));
    return static_cast<pid_t>(result);
}

// --- signals -------------------------------------------------------------

int qm_sigemptyset(sigset_t *set)
{
    record(call("sigemptyset"));
    return sigemptyset(set);
}

int qm_sigaddset(sigset_t *set, int signal)
{
    record(call("sigaddset", signal_name(signal)));
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
    record(
        call("sigprocmask", names.at(how), set_names(*set), old != nullptr ? "old mask" : "null"));
    return static_cast<int>(scripted(step));
}

sighandler_t qm_signal(int signal, sighandler_t handler)
{
    record(call("signal", signal_name(signal), handler_name(handler)));
    return std::exchange(state().handlers[signal], handler);
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

// --- the platform's interfaces ----------------------------------------------

int vr_log_printf(int priority, const char *tag, const char *format, ...)
{
    va_list arguments;
    va_start(arguments, format);
    const std::string line = formatted(format, arguments);
    va_end(arguments);
    EXPECT_EQ(priority, 4);
    EXPECT_STREQ(tag, "VRCODE");
    if (state().recording) {
        const std::string event = log_event(format, line);
        record(event);
        if (state().log_hook) {
            state().log_hook(event);
        }
    }
    errno = kErrnoAfterLog;
    return static_cast<int>(line.size());
}

int get_node_value(const char *file, const char *path, char *buffer, size_t length)
{
    record(call("get_node_value", file, path, length));
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
    record(call("mxmlSetLoneWhitespaceOff", off));
}

} // extern "C"
