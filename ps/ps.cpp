// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// quillmark-ps: ps as the library asks it, on devices whose own ps answers otherwise.
//
//     ps [NAME]
//
// One header line, then one line for each process whose name starts with NAME, by
// process id, in the columns of Android's old toolbox. The last column is the path
// that a process was started by, without its arguments: a query piped into grep
// never finds its own grep. A script has its own path there, not its interpreter's,
// and a kernel thread or a zombie the kernel's name for it. NAME is compared with
// the last part of that path.
//
// With an option it is the next ps in PATH that answers, so that items which look
// for more find what they know.
//
// It needs nothing but a C library.

#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <pwd.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <sys/types.h>
#include <unistd.h>

namespace
{

constexpr size_t kKernelsName = 15; // characters that the kernel keeps of a program's name
// Arguments: an interpreter and its option; where the processor is emulated, the emulator and
// the interpreter's path come first.
constexpr int kMostBeforeScript = 4;

// proc(5) numbers the fields of "stat" from 1.
enum Field { parent = 4, virtual_bytes = 23, resident_pages = 24, counter = 30, channel = 35 };

struct Process {
    const char *pid = nullptr; // in digits, as /proc names it
    char arguments[4096];      // each with a zero after it, and two at the end
    char stat[1024];
    char *kernels_name = nullptr; // in stat
    char state = '?';
    unsigned long long fields[channel + 1];
    uid_t user = 0;
};

int g_proc = -1; // the directory

// Zero-terminates what it has read. False if the process has gone.
bool read_file(const char *pid, const char *name, char *buffer, size_t size)
{
    char path[NAME_MAX + sizeof "/cmdline"];
    snprintf(path, sizeof path, "%s/%s", pid, name);
    const int file = openat(g_proc, path, O_RDONLY | O_CLOEXEC);
    if (file < 0) {
        return false;
    }
    const ssize_t length = read(file, buffer, size - 1);
    close(file);
    buffer[length > 0 ? length : 0] = '\0';
    return length >= 0;
}

bool read_arguments(Process &process)
{
    // an empty file leaves it empty, and a cut one ended
    memset(process.arguments, 0, sizeof process.arguments);
    return read_file(process.pid, "cmdline", process.arguments, sizeof process.arguments - 1);
}

// "PID (NAME) STATE PARENT ...": a name may hold anything, so it ends at the last ')'.
bool read_stat(Process &process)
{
    if (!read_file(process.pid, "stat", process.stat, sizeof process.stat)) {
        return false;
    }
    char *open = strchr(process.stat, '(');
    char *close = strrchr(process.stat, ')');
    if (open == nullptr || close == nullptr || close < open || strlen(close) < 4) {
        return false;
    }
    process.kernels_name = open + 1;
    *close = '\0';
    process.state = close[2];
    char *at = close + 3;
    for (int field = parent; field <= channel; ++field) {
        process.fields[field] = strtoull(at, &at, 10);
    }
    return true;
}

// The owner of /proc/PID will not do: it is root for a process that may not be dumped.
bool read_user(Process &process)
{
    char status[512];
    if (!read_file(process.pid, "status", status, sizeof status)) {
        return false;
    }
    const char *line = strstr(status, "\nUid:");
    process.user = line != nullptr ? static_cast<uid_t>(strtoul(line + 5, nullptr, 10)) : 0;
    return line != nullptr;
}

const char *last_part(const char *path)
{
    const char *slash = strrchr(path, '/');
    return slash != nullptr ? slash + 1 : path;
}

bool is_named(const char *path, const char *wanted)
{
    return strncmp(last_part(path), wanted, strlen(wanted)) == 0;
}

const char *next_argument(const char *argument)
{
    return argument + strlen(argument) + 1;
}

// The kernel names a script by its own file, and puts its interpreter, which may have one
// option, before it.
const char *path_of(const Process &process)
{
    const char *argument = process.arguments;
    if (*argument == '\0') {
        return process.kernels_name;
    }
    for (int i = 0; i <= kMostBeforeScript && *argument != '\0'; ++i) {
        if (strncmp(last_part(argument), process.kernels_name, kKernelsName) == 0) {
            return argument;
        }
        argument = next_argument(argument);
    }
    return process.arguments;
}

// Spares most processes the reading of more.
bool may_be_named(const Process &process, const char *wanted)
{
    const char *argument = process.arguments;
    bool may_be = *argument == '\0';
    for (int i = 0; i <= kMostBeforeScript && *argument != '\0' && !may_be; ++i) {
        may_be = is_named(argument, wanted);
        argument = next_argument(argument);
    }
    return may_be;
}

const char *name_of_user(uid_t user)
{
    static uid_t last;
    static char name[64];
    if (name[0] == '\0' || user != last) {
        const passwd *entry = getpwuid(user);
        if (entry != nullptr) {
            snprintf(name, sizeof name, "%s", entry->pw_name);
        } else {
            snprintf(name, sizeof name, "%u", static_cast<unsigned>(user));
        }
        last = user;
    }
    return name;
}

void print(const Process &process, const char *path)
{
    const unsigned long long *fields = process.fields;
    const auto low_word = [](unsigned long long value) { // the columns are of a 32-bit system
        return static_cast<unsigned>(value & 0xffffffff);
    };
    printf("%-8s %-5s %-5llu %-6llu %-7llu %08x %08x %c ", name_of_user(process.user), process.pid,
           fields[parent], fields[virtual_bytes] / 1024,
           fields[resident_pages] * static_cast<unsigned long long>(sysconf(_SC_PAGESIZE) / 1024),
           low_word(fields[channel]), low_word(fields[counter]), process.state);
    // a line feed in a name would make two lines of one process
    for (; *path != '\0'; ++path) {
        putchar(static_cast<unsigned char>(*path) < ' ' || *path == 0x7f ? '?' : *path);
    }
    putchar('\n');
}

bool list_if_named(const char *pid, const char *wanted)
{
    static Process process;
    process.pid = pid;
    if (!read_arguments(process) || !may_be_named(process, wanted) || !read_stat(process)) {
        return false;
    }
    const char *path = path_of(process);
    if (!is_named(path, wanted) || !read_user(process)) {
        return false;
    }
    print(process, path);
    return true;
}

bool is_number(const char *text)
{
    return *text >= '1' && *text <= '9' && text[strspn(text, "0123456789")] == '\0';
}

int list(const char *wanted)
{
    // which gives processes by their ids
    DIR *proc = opendir("/proc");
    if (proc == nullptr) {
        fprintf(stderr, "ps: /proc cannot be read: %s\n", strerror(errno));
        return 1;
    }
    g_proc = dirfd(proc);
    if (faccessat(g_proc, "1/stat", R_OK, 0) != 0) {
        fputs("ps: /proc hides other users' processes (hidepid): they are not listed; run as root, "
              "or with the group that /proc is mounted with\n",
              stderr);
    }
    puts("USER     PID   PPID  VSIZE  RSS     WCHAN    PC         NAME");
    bool found = false;
    while (const dirent *entry = readdir(proc)) {
        if (is_number(entry->d_name) && list_if_named(entry->d_name, wanted)) {
            found = true;
        }
    }
    if (!found && is_number(wanted)) {
        list_if_named(wanted, "");
    }
    closedir(proc);
    if (fflush(stdout) != 0) {
        fprintf(stderr, "ps: the list cannot be written: %s\n", strerror(errno));
        return 1;
    }
    return 0;
}

// Returns if there is no other ps.
void become_next_ps(char **arguments)
{
    constexpr const char *asked = "QUILLMARK_PS_ASKED"; // lest two of these ask each other
    struct stat own {
    };
    char program[PATH_MAX] = ""; // an emulator answers for its own file otherwise
    const char *directory = getenv("PATH");
    if (getenv(asked) != nullptr || readlink("/proc/self/exe", program, sizeof program - 1) < 0 ||
        stat(program, &own) != 0) {
        return;
    }
    setenv(asked, "", 1);
    while (directory != nullptr) {
        const size_t length = strcspn(directory, ":");
        char path[PATH_MAX];
        struct stat other {
        };
        snprintf(path, sizeof path, "%.*s/ps", static_cast<int>(length), directory);
        if (stat(path, &other) == 0 && (other.st_ino != own.st_ino || other.st_dev != own.st_dev)) {
            execv(path, arguments);
        }
        directory = directory[length] == ':' ? directory + length + 1 : nullptr;
    }
}

} // namespace

int main(int argc, char **argv)
{
    if (argc > 2 || (argc == 2 && argv[1][0] == '-')) {
        become_next_ps(argv);
        fprintf(stderr, "ps: it takes one name at most, and no options: ps [NAME]; no other ps in "
                        "PATH could be asked\n");
        return 1;
    }
    return list(argc == 2 ? argv[1] : "");
}
