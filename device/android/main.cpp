// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// ps as a release of Android has it. The name of this program's file ends with the
// release, as a link to it cannot pass an argument:
//
//   ps5   toolbox of Android 5.1: NAME is the start of the kernel's name
//   ps7   toolbox of Android 7.1, on 64 bits: a process id, no name
//   ps9   toybox 0.7.6: a process id; the NAME column has no path; without -A only the
//         processes of the caller's terminal, or of none
//   ps14  toybox 0.8.9 with the wider VSZ of 2023: also exits with 1 if it found none
//
// Header, lines, messages and exit status are the release's. Other options of that
// release are refused by a line that says so. Not imitated are the colours that toybox
// on a terminal puts around control characters: they are '?' there as elsewhere.

#include "android/ps.h"

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <system_error>

int main(int argc, char **argv)
{
    std::error_code error;
    const std::string self = std::filesystem::read_symlink("/proc/self/exe", error);
    const int release = std::atoi(self.c_str() + self.find_last_not_of("0123456789") + 1);
    const std::span<char *const> arguments(argv, static_cast<std::size_t>(argc));
    const int status =
        release < 9 ? run_toolbox(release, arguments.subspan(1)) : run_toybox(release, arguments);

    return std::fflush(stdout) == 0 ? status : 1;
}
