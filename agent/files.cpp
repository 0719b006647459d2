// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "files.h"

#include "failure.h"
#include "plan.h"
#include "write.h"

#include <array>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <thread>

namespace fptest
{
namespace
{

bool standard_output_was_open = true;

} // namespace

void fill_standard_descriptors()
{
    standard_output_was_open = fcntl(STDOUT_FILENO, F_GETFD) >= 0;
    int descriptor = 0;
    do {
        descriptor = open("/dev/null", O_RDWR | O_CLOEXEC);
    } while (descriptor >= 0 && descriptor <= STDERR_FILENO);
    if (descriptor >= 0) {
        close(descriptor);
    }
}

void require_standard_output(const std::string &who)
{
    if (!standard_output_was_open) {
        throw Failure(Exit::environment, who + " wants standard output, which is closed: open it");
    }
}

std::optional<std::string> read_file(const std::string &path)
{
    // an item may have put a FIFO in the stored plan's place
    const int flags = O_RDONLY | O_CLOEXEC | (path == kStoredPlan ? O_NONBLOCK : 0);
    const Descriptor file(path == "-" ? dup(STDIN_FILENO) : open(path.c_str(), flags));
    if (!file.is_open()) {
        return std::nullopt;
    }
    std::string text;
    std::array<char, 16384> buffer;
    for (;;) {
        const ssize_t got = read(file.get(), buffer.data(), buffer.size());
        if (got < 0 && errno == EINTR) {
            continue;
        }
        if (got < 0) {
            return std::nullopt;
        }
        if (got == 0) {
            return text;
        }
        text.append(buffer.data(), static_cast<std::size_t>(got));
        if (text.size() > kFileLimit) {
            errno = EFBIG;
            return std::nullopt;
        }
    }
}

std::string why_unread()
{
    return errno != EFBIG ? std::strerror(errno)
                          : "longer than the " + std::to_string(kFileLimit >> 20U) +
                                " MiB that are read of a test plan";
}

Descriptor lock_stored_plan()
{
    for (;;) {
        Descriptor plan(open(kStoredPlan, O_RDONLY | O_NONBLOCK | O_CLOEXEC));
        if (!plan.is_open()) {
            return plan;
        }
        // one that hangs while it has it is not waited for without end
        for (int tries = 0; flock(plan.get(), LOCK_EX | LOCK_NB) != 0 && tries < 5000; ++tries) {
            std::this_thread::sleep_for(std::chrono::milliseconds(2));
        }
        // it may have been replaced while this waited
        struct stat held {
        };
        struct stat named {
        };
        if (fstat(plan.get(), &held) != 0 || stat(kStoredPlan, &named) != 0 ||
            (held.st_ino == named.st_ino && held.st_dev == named.st_dev)) {
            return plan;
        }
    }
}

void replace_stored_plan(const std::string &text)
{
    const std::string aside = std::string(kStoredPlan) + ".new";
    const Descriptor file(open(aside.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0666));
    if (!file.is_open() || write_text(file.get(), text) < text.size() || fsync(file.get()) != 0 ||
        std::rename(aside.c_str(), kStoredPlan) != 0) {
        const int error = errno;
        unlink(aside.c_str());
        throw Failure(Exit::environment, std::string(kStoredPlan) +
                                             " cannot be written: " + std::strerror(error) +
                                             "; the old plan is still there");
    }
}

} // namespace fptest
