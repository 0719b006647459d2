// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "util/files.h"

#include "util/failure.h"
#include "util/input_file.h"
#include "util/text.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <unistd.h>

namespace fptest
{
namespace
{

std::array<bool, 3> was_closed{}; // the standard streams

} // namespace

void fill_standard_descriptors()
{
    for (std::size_t stream = 0; stream < was_closed.size(); ++stream) {
        was_closed.at(stream) = fcntl(static_cast<int>(stream), F_GETFD) < 0;
    }
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
    if (was_closed[STDOUT_FILENO]) {
        throw Failure(Cause::device, "{} needs standard output, which is closed: open it", who);
    }
}

bool is_closed_stream(const std::string &path)
{
    std::error_code none;
    std::filesystem::path end = path;
    for (int links = 0; links < 40; ++links) {
        if (std::filesystem::equivalent(end.parent_path(), "/proc/self/fd", none)) {
            const std::string stream = end.filename();
            return stream.size() == 1 && stream >= "0" && stream <= "2" &&
                   was_closed.at(static_cast<std::size_t>(stream[0] - '0'));
        }
        if (!std::filesystem::is_symlink(end, none)) {
            break;
        }
        end = end.parent_path() / std::filesystem::read_symlink(end, none);
    }
    return false;
}

std::optional<std::string> read_file(const std::string &path, int flags)
{
    InputFile file(path, flags);
    if (!file.is_open()) {
        return std::nullopt;
    }
    std::string text;
    std::array<char, 16384> buffer;
    for (;;) {
        const ssize_t got = file.read(buffer.data(), buffer.size());
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

bool is_regular_file(int descriptor)
{
    struct stat status {
    };
    return fstat(descriptor, &status) == 0 && S_ISREG(status.st_mode);
}

std::string why_unread()
{
    return errno == EFBIG
               ? fmt::format("longer than the {} MiB that fptest reads", kFileLimit >> 20U)
           : errno == EPIPE ? fmt::format("nobody writes to this pipe within {} s", kPipeSeconds)
                            : std::strerror(errno);
}

std::string require_file(const std::string &path)
{
    if (auto text = read_file(path)) {
        return *text;
    }
    throw Failure(Cause::input, "{}: {}", one_line(path), why_unread());
}

std::string end_of_links(const std::string &path)
{
    std::error_code none;
    std::filesystem::path end = path;
    for (int links = 0; links < 40 && std::filesystem::is_symlink(end, none); ++links) {
        end = end.parent_path() / std::filesystem::read_symlink(end, none);
    }
    return end;
}

} // namespace fptest
