// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/log_file.h"

#include "common/descriptor.h"
#include "util/failure.h"
#include "util/file_lock.h"
#include "util/text.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <fmt/core.h>
#include <string_view>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>

namespace fptest
{
namespace
{

constexpr char kLogVariable[] = "VR_LOG_FILE";

// The library's process has descriptors of its own, and items have directories of their own.
std::string for_all_processes(const std::string &file)
{
    static constexpr std::pair<std::string_view, std::string_view> kOwn[] = {
        {"/dev/stdout", "1"}, {"/dev/stderr", "2"}, {"/dev/fd/", ""}, {"/proc/self/fd/", ""}};
    for (const auto &[name, number] : kOwn) {
        if (number.empty() ? file.starts_with(name) : file == name) {
            return fmt::format("/proc/{}/fd/{}{}", getpid(), number, file.substr(name.size()));
        }
    }
    std::error_code unknown;
    const std::string whole = std::filesystem::absolute(file, unknown);
    return unknown ? file : whole;
}

// Kept open, or a FIFO's reader would see its end before the library writes.
struct OpenedLog {
    Descriptor descriptor{-1};
    std::string label; // empty if its loss is not reported
};

OpenedLog &opened()
{
    static OpenedLog log;
    return log;
}

// A limit of its size, or a disk that was full for a moment, may have cut it.
bool ends_within_line(const Descriptor &log, off_t size)
{
    const Descriptor reader(
        open(fmt::format("/proc/self/fd/{}", log.get()).c_str(), O_RDONLY | O_CLOEXEC));
    char last = '\n';
    return size > 0 && pread(reader.get(), &last, 1, size - 1) == 1 && last != '\n';
}

} // namespace

std::string label(const NamedFile &file)
{
    return file.first + (file.first.starts_with('-') ? " " : "=") + one_line(file.second);
}

NamedFile log_file(const std::string &option)
{
    const char *inherited = std::getenv(kLogVariable);
    if (!option.empty() || inherited == nullptr) {
        return {"--log", option};
    }
    return {kLogVariable, inherited};
}

void choose_log(const std::string &option, bool reports_loss)
{
    const NamedFile file = log_file(option);
    if (file.second.empty()) {
        setenv(kLogVariable, "/dev/null", 0);
        return;
    }
    const std::string path = for_all_processes(file.second);
    Descriptor log(
        open(path.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_NONBLOCK | O_CLOEXEC, 0644));
    // the library does not report what it cannot write
    if (!log.is_open() || write(log.get(), "", 0) < 0) {
        throw Failure(Cause::device, "{} cannot be written: {}; name another file", label(file),
                      std::strerror(errno));
    }
    opened() = {std::move(log), reports_loss ? label(file) : ""};
    setenv(kLogVariable, path.c_str(), 1);
}

bool lock_log()
{
    if (lock_file(opened().descriptor.get())) {
        return true;
    }
    opened() = {}; // its loss is the other's
    return false;
}

std::string log_loss()
{
    struct stat status {
    };
    const auto &[log, name] = opened();
    if (name.empty() || fstat(log.get(), &status) != 0 || !S_ISREG(status.st_mode)) {
        return {};
    }
    std::string why;
    // is there room for one more byte?
    if (fallocate(log.get(), FALLOC_FL_KEEP_SIZE, status.st_size, 1) != 0 &&
        (errno == ENOSPC || errno == EDQUOT)) {
        why = std::strerror(errno);
    } else if (ends_within_line(log, status.st_size)) {
        why = "its last line is cut";
    }
    return why.empty()
               ? why
               : fmt::format("{} is incomplete: {}; make room, or name another file", name, why);
}

} // namespace fptest
