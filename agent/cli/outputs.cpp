// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/outputs.h"

#include "module/log_file.h"
#include "plan/plan.h"
#include "reporters/reporters.h"
#include "reporters/views.h"
#include "util/failure.h"
#include "util/files.h"
#include "util/text.h"

#include <filesystem>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace fptest
{
namespace
{

constexpr char kStandardInput[] = "/proc/self/fd/0";

NamedFile librarys_file()
{
    return {"the library", kStoredPlan};
}

// Whether both are one file, by whatever name, in which the two would overwrite or break
// up each other: to a terminal both may write.
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

// Not of a device that swallows everything: that may be named as often as one likes.
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

std::vector<std::string> reports_on_standard_output(const RunOptions &options)
{
    std::vector<std::string> reports;
    if (options.tap) {
        reports.emplace_back("--tap");
    }
    for (const NamedFile &report :
         {NamedFile{"--json", options.json}, {"--junit", options.junit}}) {
        if (is_standard_output(report.second)) {
            reports.push_back(label(report));
        }
    }
    return reports;
}

void require_different(const std::vector<NamedFile> &files)
{
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

} // namespace

void settle_outputs(RunOptions &options)
{
    require_different({{"--plan", options.plan == "-" ? kStandardInput : options.plan},
                       {"--json", options.json},
                       {"--junit", options.junit},
                       log_file(options.log),
                       librarys_file()});
    const auto reports = reports_on_standard_output(options);
    if (reports.size() > 1) {
        throw Failure(Cause::input, "{} each want standard output: give all but one a file",
                      join_and(reports));
    }
    if (!reports.empty()) {
        require_standard_output(reports.front());
    }
    require_log_of_its_own(options.log, reports.empty() ? Beside::view : Beside::results);
    for (std::string *report : {&options.json, &options.junit}) {
        if (is_standard_output(*report)) {
            report->assign(1, '-');
        }
    }
    struct stat errors {
    };
    for (const NamedFile &report :
         {NamedFile{"--json", options.json}, {"--junit", options.junit}}) {
        if (fstat(STDERR_FILENO, &errors) == 0 && S_ISREG(errors.st_mode) &&
            !report.second.empty() && report.second != "-" &&
            are_same_file(report.second, "/proc/self/fd/2")) {
            throw Failure(Cause::input,
                          "{} is standard error, and would be emptied: name another file",
                          label(report));
        }
    }
}

void require_writable_reports(const RunOptions &options)
{
    for (const std::string &obstacle :
         {options.json.empty() ? "" : json_obstacle(options.json),
          options.junit.empty() ? "" : junit_obstacle(options.junit)}) {
        if (!obstacle.empty()) {
            throw Failure(Cause::device, "{}; nothing was run", one_line(obstacle));
        }
    }
}

void require_log_of_its_own(const std::string &log, Beside beside)
{
    const NamedFile file = log_file(log);
    require_different({{"standard input", kStandardInput}, file, librarys_file()});
    struct stat output {
    };
    const bool is_regular = fstat(STDOUT_FILENO, &output) == 0 && S_ISREG(output.st_mode);
    const bool is_apart = beside == Beside::nothing ||
                          (!is_regular && (beside == Beside::view || isatty(STDOUT_FILENO) != 0));
    if (file.second == "-" || (!is_apart && is_standard_output(file.second))) {
        throw Failure(
            Cause::input,
            "{} is standard output, which is not for the library's log: name a file for that",
            label(file));
    }
}

std::vector<std::unique_ptr<Reporter>> make_reporters(const RunOptions &options)
{
    std::vector<std::unique_ptr<Reporter>> reporters;
    if (!options.json.empty()) {
        reporters.push_back(make_json_reporter(options.json));
    }
    if (!options.junit.empty()) {
        reporters.push_back(make_junit_reporter(options.junit));
    }
    if (options.tap) {
        reporters.push_back(make_tap_reporter(stdout));
    } else if (reports_on_standard_output(options).empty()) {
        reporters.push_back(suitable_view(stdout, options.quiet));
    }
    return reporters;
}

} // namespace fptest
