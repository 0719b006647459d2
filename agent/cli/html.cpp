// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/html.h"
#include "cli/desk_paths.h"
#include "cli/options.h"
#include "run/earlier_run.h"
#include "util/files.h"
#include "util/text.h"
#include "util/write.h"

#include <algorithm>
#include <cerrno>
#include <memory>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

namespace fptest
{
namespace
{

constexpr char kHtmlExamples[] = "Examples:\n"
                                 "  fptest html results.jsonl > report.html\n"
                                 "  fptest html results/*.jsonl > report.html";

// A page that is cut would look like a whole one of fewer devices.
void write_whole(const std::string &page)
{
    struct stat before {
    };
    const bool is_file = fstat(STDOUT_FILENO, &before) == 0 && S_ISREG(before.st_mode);
    if (write_text(STDOUT_FILENO, page) < page.size()) {
        const int error = errno;
        const bool is_gone = is_file && ftruncate(STDOUT_FILENO, before.st_size) == 0;
        throw Failure(Cause::device, "{}{}", failure_of("standard output", error),
                      is_gone ? ": no page is written" : ": the page is not whole");
    }
}

Exit write_html(const std::vector<std::string> &files)
{
    require_standard_output("fptest html");
    if (std::ranges::count(files, "-") > 1) {
        throw Failure(Cause::input, "'-' is given twice: standard input can be read only once");
    }
    std::vector<EarlierRun> runs;
    std::vector<std::string> unknown;
    for (const std::string &file : files) {
        try {
            runs.push_back(read_earlier_run(file, name_of_plan(file)));
        } catch (const NothingKnown &failure) {
            if (files.size() == 1) {
                throw;
            }
            unknown.emplace_back(failure.what());
            say("{}", failure.what());
            continue;
        }
        if (runs.back().is_cut) {
            say("{}: its last line is cut, and left out", runs.back().file);
        }
    }
    if (runs.empty()) {
        throw Failure(Cause::input, "no file has a run: no page is written");
    }
    write_whole(html_page(runs, unknown));
    return Exit::success;
}

} // namespace

void add_html(CLI::App &app, Action &chosen)
{
    const auto files = std::make_shared<std::vector<std::string>>();
    CLI::App &command =
        add_subcommand(app, "html", "Write a page of the results of runs, to look at",
                       kHtmlExamples, chosen, [files] { return write_html(*files); });
    command.add_option("FILE", *files, "what run --json wrote ('-': standard input)")
        ->type_name("")
        ->transform(desk_file())
        ->check(not_empty())
        ->required();
}

} // namespace fptest
