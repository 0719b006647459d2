// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/outputs.h"

#include "cli/log_option.h"
#include "module/log_file.h"
#include "reporters/reporters.h"
#include "run/item_files.h"
#include "util/failure.h"
#include "util/file_lock.h"
#include "util/files.h"
#include "util/text.h"

#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace fptest
{
namespace
{

std::vector<std::string> results_on_standard_output(const RunOptions &options)
{
    std::vector<std::string> results;
    if (options.tap) {
        results.emplace_back("--tap");
    }
    for (const NamedFile &file : {NamedFile{"--json", options.json}, {"--junit", options.junit}}) {
        if (is_standard_output(file.second)) {
            results.push_back(label(file));
        }
    }
    return results;
}

} // namespace

void resolve_output_conflicts(RunOptions &options)
{
    const std::vector<NamedFile> files = {
        {"--plan", options.plan == "-" ? kStandardInput : options.plan},
        {"--expect", options.expect == "-" ? kStandardInput : options.expect},
        {"--failed-of", options.failed_of},
        {"--resume", options.resume},
        {"--json", options.json},
        {"--junit", options.junit},
        {"--files", options.files},
        log_file(options.log)};
    require_different(files);
    for (const NamedFile &file : files) {
        if (is_closed_stream(file.second)) {
            throw Failure(Cause::device, "{} is closed: open it, or name a file", label(file));
        }
    }
    const auto results = results_on_standard_output(options);
    if (results.size() > 1) {
        throw Failure(Cause::input, "{} each want standard output: give all but one a file",
                      join_and(results));
    }
    if (!results.empty()) {
        require_standard_output(results.front());
    }
    require_log_of_its_own(options.log, results.empty() ? StdoutUse::view : StdoutUse::results);
    for (std::string *file : {&options.json, &options.junit}) {
        if (is_standard_output(*file)) {
            file->assign(1, '-');
        }
    }
    struct stat errors {
    };
    for (const NamedFile &file : {NamedFile{"--json", options.json}, {"--junit", options.junit}}) {
        if (fstat(STDERR_FILENO, &errors) == 0 && S_ISREG(errors.st_mode) && !file.second.empty() &&
            file.second != "-" && are_same_file(file.second, "/proc/self/fd/2")) {
            throw Failure(Cause::input,
                          "{} is standard error, and would be emptied: name another file",
                          label(file));
        }
    }
}

void require_writable_results(const RunOptions &options)
{
    for (const std::string &file : {options.json, options.junit}) {
        if (!file.empty() && file != "-" && is_locked(file)) {
            throw Failure(Cause::input, "{}", locked_text(one_line(file)));
        }
    }
    for (const std::string &obstacle :
         {options.json.empty() ? "" : json_obstacle(options.json),
          options.junit.empty() ? "" : junit_obstacle(options.junit),
          options.files.empty() ? "" : files_obstacle(options.files)}) {
        if (!obstacle.empty()) {
            throw Failure(Cause::device, "{}; nothing was run", one_line(obstacle));
        }
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
    } else if (results_on_standard_output(options).empty()) {
        reporters.push_back(options.plain ? make_plain_view(stdout, options.quiet)
                                          : make_suitable_view(stdout, options.quiet));
        reporters.back()->is_needed = options.hangup != "go-on" || is_regular_file(STDOUT_FILENO);
    }
    return reporters;
}

} // namespace fptest
