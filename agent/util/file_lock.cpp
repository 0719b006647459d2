// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "util/file_lock.h"

#include "common/descriptor.h"
#include "util/files.h"

#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <system_error>

namespace fptest
{
namespace
{

// Unlike flock()'s, such a lock is not passed on by fork() to the library's process, which
// outlives a run that is killed, and does not meet those of scripts.
struct flock whole_file()
{
    struct flock lock {
    };
    lock.l_type = F_WRLCK;
    lock.l_whence = SEEK_SET;
    return lock;
}

} // namespace

bool lock_file(int descriptor)
{
    struct flock lock = whole_file();
    return !is_regular_file(descriptor) || fcntl(descriptor, F_SETLK, &lock) == 0 ||
           (errno != EAGAIN && errno != EACCES);
}

bool is_locked(const std::string &path)
{
    std::error_code none;
    if (!std::filesystem::is_regular_file(path, none)) {
        return false;
    }
    struct flock lock = whole_file();
    const Descriptor file(open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
    return file.is_open() && fcntl(file.get(), F_GETLK, &lock) == 0 && lock.l_type != F_UNLCK;
}

} // namespace fptest
