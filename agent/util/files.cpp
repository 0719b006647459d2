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
        throw Failure(Cause::device, "{} needs standard output, which is closed: open it", who);
    }
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
