// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/outputs.h"

#include "plan/plan.h"
#include "reporters/reporters.h"
#include "reporters/views.h"
#include "util/files.h"
#include "util/text.h"

#include <filesystem>
#include <sys/stat.h>
#include <utility>

namespace fptest
{
namespace
{

// Whether both are one file, by whatever name, of which one would overwrite the
// other: into a pipe or a terminal both may write.
bool are_same_file(const std::string &one, const std::string &other)
{
    struct stat first {
    };
    struct stat second {
    };
    if (stat(one.c_str(), &first) == 0 && stat(other.c_str(), &second) == 0) {
        return S_ISREG(first.st_mode) && first.st_dev == second.st_dev &&
               first.st_ino == second.st_ino;
    }
    std::error_code none;
    const auto path = std::filesystem::weakly_canonical(one, none);
    return !path.empty() && path == std::filesystem::weakly_canonical(other, none);
}

std::vector<std::string> reports_on_standard_output(const RunOptions &options)
{
    std::vector<std::string> reports;
    if (options.tap) {
        reports.emplace_back("--tap");
    }
    if (options.json == "-") {
        reports.emplace_back("--json -");
    }
    if (options.junit == "-") {
        reports.emplace_back("--junit -");
    }
    return reports;
}

} // namespace

void require_different_outputs(const RunOptions &options)
{
    const std::vector<std::pair<std::string, std::string>> files = {{"--plan", options.plan},
                                                                    {"--json", options.json},
                                                                    {"--junit", options.junit},
                                                                    {"--log", options.log},
                                                                    {"the module", kStoredPlan}};
    for (std::size_t one = 0; one < files.size(); ++one) {
        for (std::size_t other = one + 1; other < files.size(); ++other) {
            const auto &[option, file] = files[one];
            const auto &[other_option, other_file] = files[other];
            if (!file.empty() && !other_file.empty() && file != "-" && other_file != "-" &&
                are_same_file(file, other_file) &&
                !(option == "--plan" && other_option == "the module")) {
                throw Failure(Exit::usage, option + " and " + other_option +
                                               " both want the file " + one_line(file) +
                                               ": give them files of their own");
            }
        }
    }
    const auto reports = reports_on_standard_output(options);
    if (reports.size() > 1) {
        throw Failure(Exit::usage,
                      listing(reports) + " each want standard output: give all but one a file");
    }
    if (!reports.empty()) {
        require_standard_output(reports.front());
    }
}

std::vector<std::unique_ptr<Listener>> make_listeners(const RunOptions &options)
{
    std::vector<std::unique_ptr<Listener>> listeners;
    if (!options.json.empty()) {
        listeners.push_back(json_report(options.json));
    }
    if (!options.junit.empty()) {
        listeners.push_back(junit_report(options.junit));
    }
    if (options.tap) {
        listeners.push_back(tap_report(stdout));
    } else if (reports_on_standard_output(options).empty()) {
        listeners.push_back(suitable_view(stdout, options.quiet));
    }
    return listeners;
}

} // namespace fptest
