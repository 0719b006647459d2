// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/own_ps.h"

#include "module/ps_query.h"

#include <cstdlib>
#include <filesystem>
#include <fmt/core.h>
#include <paths.h>
#include <sstream>
#include <system_error>
#include <unistd.h>

namespace fptest
{
namespace
{

namespace fs = std::filesystem;

// The ps that a shell finds.
fs::path first_ps()
{
    const char *path = std::getenv("PATH");
    std::istringstream directories(path != nullptr ? path : "");
    for (std::string directory; std::getline(directories, directory, ':');) {
        fs::path ps = fs::path(directory) / "ps";
        if (access(ps.c_str(), X_OK) == 0) {
            return ps;
        }
    }
    return {};
}

} // namespace

std::optional<std::string> directory_of_own_ps()
{
    std::error_code error;
    const fs::path program = fs::read_symlink("/proc/self/exe", error).parent_path();
    for (const char *place : {FPTEST_PS_DIRECTORY, "quillmark/bin"}) {
        const fs::path directory = fs::canonical(program / place, error);
        if (!error && access((directory / "ps").c_str(), X_OK) == 0) {
            return directory;
        }
    }
    return std::nullopt;
}

void put_first_in_path(const std::string &directory)
{
    const char *path = std::getenv("PATH");
    setenv("PATH",
           fmt::format("{}:{}", directory,
                       path != nullptr ? path : "/system/bin:/vendor/bin:" _PATH_DEFPATH)
               .c_str(),
           1);
}

std::string choose_ps()
{
    const auto own = directory_of_own_ps();
    std::error_code error;
    if ((own && fs::equivalent(fs::path(*own) / "ps", first_ps(), error)) || ask_ps().is_enough()) {
        return {};
    }
    if (!own) {
        return "this device's ps does not answer the library, and there is no quillmark-ps beside "
               "fptest: fptest doctor says what that leads to";
    }
    put_first_in_path(*own);
    return ask_ps().is_enough()
               ? fmt::format("this device's ps does not answer the library: {}/ps is used instead",
                             *own)
               : fmt::format("neither this device's ps nor {}/ps answers the library: fptest "
                             "doctor says what that leads to",
                             *own);
}

} // namespace fptest
