// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "doubles.h"

#include "internals.h"
#include "mxml_whitespace.h"
#include "sockwrap.h"
#include "sysparm.h"
#include "vr_log.h"

#include <cerrno>
#include <csetjmp>
#include <csignal>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <map>
#include <sanitizer/allocator_interface.h>
#include <sanitizer/asan_interface.h>
#include <set>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>

namespace doubles
{
namespace
{

constexpr int kSocket = 700; // no descriptor of ours comes near
constexpr pid_t kChild = 100;

struct State {
    bool plan_there = false;
    bool as_child = false;
    std::string vendor;
    std::string listing;
    std::vector<std::string> started;
    std::set<int> descriptors;
    std::set<FILE *> streams;
    std::jmp_buf child_end{};
};

State &state()
{
    static State current;
    return current;
}

// The plan file's bytes: one file for all runs, emptied between them.
int plan_memory()
{
    static const int memory = memfd_create("plan", MFD_CLOEXEC);
    require(memory > 0, "no memory for the plan file");
    return memory;
}

void ignore_message(const char * /*message*/)
{
}

// What a load has allocated and not freed: each block's number in it.
std::map<const volatile void *, int> blocks;
int next_block = 0;
thread_local bool watching = false; // libFuzzer's own thread allocates too

void note_block(const volatile void *block, std::size_t /*size*/)
{
    if (std::exchange(watching, false)) { // not what the map itself allocates
        blocks[block] = next_block++;
        watching = true;
    }
}

void forget_block(const volatile void *block)
{
    if (std::exchange(watching, false)) {
        blocks.erase(block);
        watching = true;
    }
}

mxml_node_t *watched_load(mxml_node_t *top, int descriptor, mxml_load_cb_t type)
{
    blocks.clear();
    next_block = 0;
    watching = true;
    mxml_node_t *tree = mxmlLoadFd(top, descriptor, type);
    watching = false;
    return tree;
}

// The buffer is the library's: all of what it says it holds must be there.
void require_room(const void *buffer, std::size_t size)
{
    require(__asan_region_is_poisoned(const_cast<void *>(buffer), size) == nullptr,
            "a call is told of more room than the buffer has");
}

} // namespace

void require(bool condition, const char *text)
{
    if (!condition) {
        std::fprintf(stderr, "FINDING: %s\n", text);
        std::abort();
    }
}

Run::Run()
{
    mxmlSetErrorCallback(ignore_message); // a plan that does not parse is no news here
    [[maybe_unused]] static const bool hooked =
        __sanitizer_install_malloc_and_free_hooks(note_block, forget_block) != 0;
}

Run::~Run()
{
    internals::reset();
    for (const int descriptor : state().descriptors) {
        ::close(descriptor);
    }
    for (FILE *stream : state().streams) {
        std::fclose(stream);
    }
    state() = State();
}

void write_plan(std::string_view text)
{
    require(ftruncate(plan_memory(), 0) == 0, "the plan file cannot be emptied");
    require(pwrite(plan_memory(), text.data(), text.size(), 0) == static_cast<ssize_t>(text.size()),
            "the plan file cannot be written");
    state().plan_there = true;
}

std::optional<std::string> plan()
{
    if (!state().plan_there) {
        return std::nullopt;
    }
    struct stat status {
    };
    require(fstat(plan_memory(), &status) == 0, "the plan file has no size");
    std::string text(static_cast<std::size_t>(status.st_size), '\0');
    require(pread(plan_memory(), text.data(), text.size(), 0) == status.st_size,
            "the plan file cannot be read");
    return text;
}

void set_vendor(std::string_view text)
{
    state().vendor = text;
}

void set_listing(std::string_view text)
{
    state().listing = text;
}

std::vector<std::string> started()
{
    return std::exchange(state().started, {});
}

std::size_t left_open()
{
    return state().descriptors.size() + state().streams.size();
}

void run_as_child(void (*body)())
{
    state().as_child = true;
    if (setjmp(state().child_end) == 0) {
        body();
    }
    state().as_child = false;
}

} // namespace doubles

using namespace doubles;

extern "C" {

int qm_open(const char *path, int flags, ...)
{
    require(std::strcmp(path, "/data/vorlane/src1.xml") == 0, "another file is opened");
    if (!state().plan_there) {
        if ((flags & O_CREAT) == 0) {
            errno = ENOENT;
            return -1;
        }
        write_plan("");
    }
    char name[32];
    std::snprintf(name, sizeof name, "/proc/self/fd/%d", plan_memory());
    const int descriptor = ::open(name, flags & ~O_CREAT);
    require(descriptor > 0, "the plan file cannot be opened");
    state().descriptors.insert(descriptor);
    return descriptor;
}

ssize_t qm_read(int descriptor, void *buffer, size_t size)
{
    require_room(buffer, size);
    return ::read(descriptor, buffer, size);
}

ssize_t qm_write(int descriptor, const void *data, size_t size)
{
    require_room(data, size);
    return descriptor >= kSocket ? static_cast<ssize_t>(size) : ::write(descriptor, data, size);
}

int qm_close(int descriptor)
{
    if (descriptor >= kSocket) {
        return 0;
    }
    require(state().descriptors.erase(descriptor) == 1, "a descriptor that is not open is closed");
    return ::close(descriptor);
}

int qm_remove(const char *path)
{
    require(std::strcmp(path, "/data/vorlane/src1.xml") == 0, "another file is removed");
    return std::exchange(state().plan_there, false) ? 0 : -1;
}

int qm_socket(int /*domain*/, int /*type*/, int /*protocol*/)
{
    return kSocket;
}

int qm_listen(int /*descriptor*/, int /*backlog*/)
{
    return 0;
}

void Setsockopt(int /*descriptor*/, const int * /*value*/)
{
}

void Bind(int /*descriptor*/, const sockaddr *address, socklen_t length)
{
    require_room(address, length);
}

int Accept(int /*descriptor*/, sockaddr *address, socklen_t *length)
{
    require_room(address, *length);
    state().started.emplace_back("trigger");
    return kSocket + 1;
}

FILE *qm_popen(const char *command, const char *mode)
{
    state().started.push_back(std::string("popen ") + command);
    std::string &listing = state().listing;
    FILE *stream = fmemopen(listing.data(), listing.size(), mode);
    state().streams.insert(stream);
    return stream;
}

char *qm_fgets(char *buffer, int size, FILE *stream)
{
    require_room(buffer, static_cast<size_t>(size));
    return std::fgets(buffer, size, stream);
}

int qm_pclose(FILE *stream)
{
    require(state().streams.erase(stream) == 1, "a stream that is not open is closed");
    return std::fclose(stream);
}

int qm_system(const char *command)
{
    state().started.push_back(std::string("system ") + command);
    return 0;
}

int qm_printf(const char *format, ...)
{
    char text[64];
    va_list arguments;
    va_start(arguments, format);
    const int length = std::vsnprintf(text, sizeof text, format, arguments);
    va_end(arguments);
    state().started.push_back(std::string("print ") + text);
    return length;
}

pid_t qm_vfork()
{
    if (state().as_child) {
        return 0;
    }
    state().started.emplace_back("launch");
    return kChild;
}

int qm_execve(const char * /*path*/, char *const arguments[], char *const /*environment*/[])
{
    state().started.push_back(std::string("shell ") + arguments[2]);
    return -1;
}

void qm_exit(int /*status*/)
{
    std::longjmp(state().child_end, 1);
}

pid_t qm_waitpid(pid_t /*pid*/, int * /*status*/, int /*options*/)
{
    return 0;
}

int qm_sigprocmask(int /*how*/, const sigset_t * /*set*/, sigset_t *old)
{
    return old != nullptr ? sigemptyset(old) : 0;
}

sighandler_t qm_signal(int /*signal*/, sighandler_t /*handler*/)
{
    return SIG_DFL;
}

// Formats, so that every argument is read.
int vr_log_printf(int /*priority*/, const char * /*tag*/, const char *format, ...)
{
    char text[128];
    va_list arguments;
    va_start(arguments, format);
    const int length = std::vsnprintf(text, sizeof text, format, arguments);
    va_end(arguments);
    return length;
}

int get_node_value(const char * /*file*/, const char * /*path*/, char *buffer, size_t length)
{
    require_room(buffer, length);
    buffer[state().vendor.copy(buffer, length - 1)] = '\0';
    return 0;
}

void mxmlSetLoneWhitespaceOff(int /*off*/)
{
}

// The agent's plan would note the reasons, in blocks that are not Mini-XML's.
void qm_mxmlSetErrorCallback(mxml_error_cb_t /*callback*/)
{
}

// Mini-XML 3.3 forgets nodes of some documents: of some that it refuses, and text
// after the root element. A first load shows which; those, and only those, are
// freed here, for the rest of a plan is the library's to free.
mxml_node_t *qm_mxmlLoadFd(mxml_node_t *top, int descriptor, mxml_load_cb_t type)
{
    mxml_node_t *tree = watched_load(top, descriptor, type);
    watching = true;
    mxmlDelete(tree);
    watching = false;
    std::set<int> forgotten;
    for (const auto &[block, number] : std::exchange(blocks, {})) {
        forgotten.insert(number);
        std::free(const_cast<void *>(block));
    }
    if (tree == nullptr) {
        return nullptr;
    }
    require(::lseek(descriptor, 0, SEEK_SET) == 0, "the plan file cannot be read again");
    tree = watched_load(top, descriptor, type);
    for (const auto &[block, number] : blocks) {
        if (forgotten.contains(number)) {
            std::free(const_cast<void *>(block));
        }
    }
    return tree;
}

} // extern "C"
