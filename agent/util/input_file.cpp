// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "util/input_file.h"

#include "util/failure.h"
#include "util/files.h"
#include "util/text.h"

#include <cerrno>
#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace fptest
{
namespace
{

constexpr std::size_t kReadAtOnce = 16384;
constexpr std::size_t kMostOfALine = 4 * kFileLimit;

bool is_named_pipe(const std::string &path)
{
    struct stat status {
    };
    return path != "-" && stat(path.c_str(), &status) == 0 && S_ISFIFO(status.st_mode);
}

// Zero means that nothing has come, and says nothing of a writer.
int wait_for_data(const Descriptor &pipe, int milliseconds)
{
    pollfd data{pipe.get(), POLLIN, 0};
    return poll(&data, 1, milliseconds);
}

} // namespace

InputFile::InputFile(const std::string &path, int flags)
    : is_pipe_((flags & O_NONBLOCK) == 0 && is_named_pipe(path)),
      file_(path == "-"
                ? dup(STDIN_FILENO)
                : open(path.c_str(), O_RDONLY | O_CLOEXEC | flags | (is_pipe_ ? O_NONBLOCK : 0)))
{
}

ssize_t InputFile::read(char *buffer, std::size_t size)
{
    const bool is_silent =
        is_pipe_ && !has_begun_ && wait_for_data(file_, kPipeSeconds * 1000) == 0;
    has_begun_ = true;
    for (;;) {
        const ssize_t got = ::read(file_.get(), buffer, size);
        if (got < 0 && is_pipe_ && errno == EAGAIN) {
            wait_for_data(file_, -1);
        } else if (got == 0 && is_silent) {
            errno = EPIPE;
            return -1;
        } else if (got >= 0 || errno != EINTR) {
            return got;
        }
    }
}

LineReader::LineReader(const std::string &path, std::string name)
    : name_(std::move(name)), file_(path)
{
    if (!file_.is_open()) {
        throw Failure(Cause::input, "{}: {}", one_line(name_), why_unread());
    }
}

bool LineReader::next(std::string &line)
{
    std::size_t seen = 0;
    for (++number_;;) {
        const std::size_t end = unread_.find('\n', seen);
        if (end != std::string::npos) {
            line.assign(unread_, 0, end);
            unread_.erase(0, end + 1);
            return true;
        }
        seen = unread_.size();
        if (seen > kMostOfALine) {
            throw Failure(Cause::input,
                          "{}:{}: this line is longer than the {} MiB that fptest reads",
                          one_line(name_), number_, kMostOfALine >> 20U);
        }
        unread_.resize(seen + kReadAtOnce);
        const ssize_t got = file_.read(&unread_[seen], kReadAtOnce);
        if (got < 0) {
            throw Failure(Cause::input, "{}: {}", one_line(name_), why_unread());
        }
        unread_.resize(seen + static_cast<std::size_t>(got));
        if (got == 0) {
            line = std::exchange(unread_, {});
            return !line.empty();
        }
    }
}

} // namespace fptest
