// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Writing to descriptors, and to people.
#pragma once

#include <cerrno>
#include <cstddef>
#include <cstdio>
#include <cstring>
#include <fmt/core.h>
#include <poll.h>
#include <string>
#include <string_view>
#include <unistd.h>
#include <utility>

namespace fptest
{

// Writes the whole text, waiting for the reader. Returns the bytes written: fewer if that
// fails, with the reason in errno.
inline std::size_t write_text(int descriptor, std::string_view text)
{
    std::size_t done = 0;
    while (done < text.size()) {
        const ssize_t written = write(descriptor, text.data() + done, text.size() - done);
        if (written > 0) {
            done += static_cast<std::size_t>(written);
        } else if (written < 0 && errno == EAGAIN) {
            pollfd waiting{descriptor, POLLOUT, 0};
            poll(&waiting, 1, -1);
        } else if (written == 0 || errno != EINTR) {
            break;
        }
    }
    return done;
}

// "out.json: No space left on device"
inline std::string failure_of(const std::string &file, int error)
{
    return fmt::format("{}: {}", file, std::strerror(error));
}

// As fmt::print(), which would throw if the stream cannot be written.
template <typename... Values>
void print_to(std::FILE *stream, fmt::format_string<Values...> text, Values &&...values)
{
    std::fputs(fmt::format(text, std::forward<Values>(values)...).c_str(), stream);
}

// "fptest: TEXT" as a line on standard error.
template <typename... Values> void say(fmt::format_string<Values...> text, Values &&...values)
{
    print_to(stderr, "fptest: {}\n", fmt::format(text, std::forward<Values>(values)...));
}

} // namespace fptest
