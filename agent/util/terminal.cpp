// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "util/terminal.h"

#include <cstdlib>
#include <string_view>
#include <sys/ioctl.h>
#include <unistd.h>

namespace fptest
{

bool is_smart_terminal(std::FILE *stream)
{
    const char *kind = std::getenv("TERM");
    return isatty(fileno(stream)) != 0 && kind != nullptr && kind[0] != '\0' &&
           std::string_view(kind) != "dumb";
}

std::size_t terminal_width(std::FILE *stream)
{
    winsize size{};
    if (ioctl(fileno(stream), TIOCGWINSZ, &size) != 0 || size.ws_col == 0) {
        return 80;
    }
    return size.ws_col;
}

bool wants_colour()
{
    const char *unwanted = std::getenv("NO_COLOR");
    return unwanted == nullptr || unwanted[0] == '\0';
}

} // namespace fptest
