// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/log_option.h"

#include "cli/options.h"
#include "module/device_lock.h"
#include "plan/plan.h"
#include "util/failure.h"
#include "util/files.h"
#include "util/text.h"

#include <filesystem>
#include <sys/stat.h>
#include <unistd.h>

namespace fptest
{

void add_log(CLI::App &command, std::string &log)
{
    command
        .add_option("--log", log,
                    "append the library's log to FILE; without, it\n"
                    "goes where VR_LOG_FILE says, or nowhere")
        ->type_name("FILE")
        ->check(not_empty());
}

bool are_same_file(const std::string &one, const std::string &other)
{
    struct stat first {
    };
    struct stat second {
    };
    if (stat(one.c_str(), &first) == 0 && stat(other.c_str(), &second) == 0) {
        return (S_ISREG(first.st_mode) || S_ISFIFO(first.st_mode)) &&
               first.st_dev == second.st_dev && first.st_ino == second.st_ino;
    }
    std::error_code none;
    const auto whole = [&none](const std::string &path) {
        return std::filesystem::weakly_canonical(
            std::filesystem::absolute(end_of_links(path), none), none);
    };
    return whole(one) == whole(other);
}

bool is_standard_output(const std::string &file)
{
    struct stat named {
    };
    struct stat output {
    };
    return file == "-" || (stat(file.c_str(), &named) == 0 && fstat(STDOUT_FILENO, &output) == 0 &&
                           named.st_dev == output.st_dev && named.st_ino == output.st_ino &&
                           (!S_ISCHR(output.st_mode) || isatty(STDOUT_FILENO) != 0));
}

void require_different(std::vector<NamedFile> files)
{
    files.emplace_back("the library", kStoredPlan);
    files.emplace_back("fptest itself", kRunNote);
    for (std::size_t one = 0; one < files.size(); ++one) {
        for (std::size_t other = one + 1; other < files.size(); ++other) {
            const auto &[option, file] = files[one];
            const auto &[other_option, other_file] = files[other];
            if (!file.empty() && !other_file.empty() && file != "-" && other_file != "-" &&
                are_same_file(file, other_file) &&
                !(option == "--plan" && other_option == "the library")) {
                throw Failure(
                    Cause::input, "{} and {} both want the file {}: give them files of their own",
                    option, other_option, one_line(file == kStandardInput ? other_file : file));
            }
        }
    }
}

void require_log_of_its_own(const std::string &log, StdoutUse use)
{
    const NamedFile file = log_file(log);
    require_different({{"standard input", kStandardInput}, file});
    struct stat output {
    };
    const bool is_regular = fstat(STDOUT_FILENO, &output) == 0 && S_ISREG(output.st_mode);
    const bool is_apart = use == StdoutUse::nothing ||
                          (!is_regular && (use == StdoutUse::view || isatty(STDOUT_FILENO) != 0));
    if (file.second == "-" || (!is_apart && is_standard_output(file.second))) {
        throw Failure(
            Cause::input,
            "{} is standard output, which is not for the library's log: name a file for that",
            label(file));
    }
}

} // namespace fptest
