// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/messages.h"
#include "cli/commands.h"
#include "cli/desk_paths.h"
#include "cli/outputs.h"
#include "module/module_process.h"
#include "module/preflight.h"
#include "module/stored_plan.h"
#include "plan/plan.h"
#include "run/planner.h"
#include "run/rounds.h"
#include "run/runner.h"
#include "util/files.h"
#include "util/text.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <unistd.h>
#include <utility>

namespace fptest
{
namespace
{

// What is to be run: the plan's text and what the library makes of it.
struct Source {
    std::string name; // of the file, for people
    std::string text;
    Plan plan;
    PlanUse use;
};

// --- the plan -----------------------------------------------------------------

std::string read_plan(const std::string &file)
{
    const std::string path = file.empty() ? kStoredPlan : file;
    if (auto text = read_file(path)) {
        return *text;
    }
    if (!file.empty()) {
        throw Failure(Exit::usage, one_line(path) + ": " + why_unread());
    }
    if (errno == ENOENT) {
        throw Failure(Exit::environment, std::string("no plan is stored in ") + kStoredPlan +
                                             ": give one with --plan FILE");
    }
    throw Failure(Exit::environment, std::string(kStoredPlan) + " cannot be read: " + why_unread() +
                                         "; give a plan with --plan FILE");
}

// A plan that a command cannot hold is put into its place as a file.
PlanUse use_of(const RunOptions &options, const std::string &text)
{
    const bool is_sent = !options.plan.empty() && (options.as_sent || text.size() <= kPlanLimit);
    return is_sent ? PlanUse::to_send : PlanUse::stored;
}

// --as-sent is what keeps a long plan from being placed.
void advise_to_place(std::vector<Finding> &findings)
{
    constexpr std::string_view kOther = "have fptest run --plan place it as a file";
    for (Finding &finding : findings) {
        if (finding.text.ends_with(kOther)) {
            finding.text.replace(finding.text.size() - kOther.size(), kOther.size(),
                                 "leave --as-sent out");
        }
    }
}

Source open_plan(const RunOptions &options)
{
    const std::string name = options.plan.empty()  ? std::string(kStoredPlan)
                             : options.plan == "-" ? std::string("<stdin>")
                                                   : options.plan;
    const std::string text = read_plan(options.plan);
    const PlanUse use = use_of(options, text);
    auto findings = check(text, use);
    if (options.as_sent) {
        advise_to_place(findings);
    }
    if (has_errors(findings) && !options.force) {
        print(stderr, name, text, findings);
        throw Failure(Exit::usage, "nothing was run, because the plan has errors; fix them, or "
                                   "run it as it is with --force");
    }
    if (!findings.empty() && !options.quiet) {
        std::fprintf(stderr, "fptest: the plan has %s: see fptest check %s%s\n",
                     has_errors(findings) ? "errors" : "warnings",
                     use == PlanUse::stored ? "--for file " : "", one_line(name).c_str());
    }
    std::string why;
    auto plan = Plan::load(use == PlanUse::to_send ? stored_part(text) : text, &why);
    if (!plan) {
        throw Failure(Exit::usage,
                      one_line(name) + ": the library cannot load this plan: " + one_line(why));
    }
    return {name, text, std::move(*plan), use};
}

// --- before the run -----------------------------------------------------------

void require_programs(const Work &work, int vendor, bool force)
{
    const std::string suffix = vendor_suffix(vendor).value_or("");
    std::vector<std::string> programs;
    std::vector<std::string> missing;
    bool gatherer = false;
    for (const Suite &suite : work.suites) {
        for (const ItemRun &item : suite.items) {
            const std::string program = program_of(item.name, suffix);
            if (is_gatherer(item.name, vendor)) {
                gatherer = true;
            } else {
                programs.push_back(program);
            }
            if (is_plain_name(item.name) && access(program.c_str(), X_OK) != 0 &&
                std::ranges::find(missing, program) == missing.end()) {
                missing.push_back(program);
            }
        }
    }
    if (!missing.empty() && !force) {
        throw Failure(Exit::environment, "no program " + listing(missing) +
                                             " on this device: install what is missing "
                                             "(device/run --bin DIR adds programs), or run the "
                                             "rest with --force");
    }
    require_no_leftovers(programs);
    if (gatherer) {
        require_trigger_port();
    }
}

void store(Host &host, const std::string &text)
{
    const std::string stored = stored_part(text);
    require_room(stored.size());
    send_and_wait(host, "XMLFile::" + text);
    require_stored(host.read_back(), stored);
}

// For a plan that is longer than what a command stores.
void place(const Source &source, bool quiet)
{
    require_room(source.text.size());
    const Descriptor lock = lock_stored_plan();
    replace_stored_plan(source.text);
    if (!quiet) {
        std::fprintf(stderr,
                     "fptest: %s: its %zu bytes are more than the %zu that a command stores, so "
                     "it was placed as the file %s\n",
                     one_line(source.name).c_str(), source.text.size(), kPlanLimit, kStoredPlan);
    }
}

void require_nothing_to_report_of_a_list(const RunOptions &options)
{
    const std::string report = options.tap              ? "--tap"
                               : !options.json.empty()  ? "--json"
                               : !options.junit.empty() ? "--junit"
                                                        : "";
    if (options.list && !report.empty()) {
        throw Failure(Exit::usage, "--list runs nothing that " + report +
                                       " could tell of: leave one of them out");
    }
}

// Kept locked, so that what is looked at now is still so when it is run.
Descriptor ready_device()
{
    require_device();
    return lock_device();
}

} // namespace

Exit run(RunOptions options)
{
    require_nothing_to_report_of_a_list(options);
    settle_outputs(options);
    if (options.as_sent && options.plan.empty()) {
        throw Failure(Exit::usage, "--as-sent is of no use without --plan FILE, which is sent");
    }
    if (options.list) {
        require_standard_output("--list");
    } else {
        look_after_reports(
            {{"--json", options.json}, {"--junit", options.junit}, {"--log", options.log}});
    }
    const Descriptor lock = options.list ? Descriptor(-1) : ready_device();
    const Source source = open_plan(options);
    std::vector<Path> paths;
    for (const std::string &text : options.paths) {
        paths.push_back(parse_path(text, source.plan, source.name, options.force));
    }
    if (paths.empty() && !options.list) {
        throw Failure(Exit::usage, "no PATH given: say what to run, as root/group or "
                                   "root/group/item" +
                                       known_groups(source.plan));
    }
    require_writable_reports(options);
    choose_log(options.log);
    Signals signals;
    std::optional<Host> host(std::in_place);
    const int vendor = ask_vendor(*host);
    if (options.list) {
        list_items(paths.empty() ? all_paths(source.plan) : paths, source.plan,
                   vendor_suffix(vendor).value_or(""));
        return Exit::success;
    }

    const Work work = work_of(paths, source.plan, options.as_group);
    if (work.jobs.empty()) {
        throw Failure(Exit::usage, "there is nothing to run: the groups named have no items");
    }
    require_programs(work, vendor, options.force);
    if (source.use == PlanUse::to_send) {
        store(*host, source.text);
    } else if (!options.plan.empty()) {
        place(source, options.quiet);
        host.emplace(); // the one before keeps the plan that was there when it was asked
    }
    Run run;
    run.plan = source.name;
    run.rounds = options.repeat;
    if (!run.rounds && !options.time_limit && !options.until_fail) {
        run.rounds = 1;
    }
    run.time_limit = options.time_limit;
    run.until_fail = options.until_fail;
    run.pass_code = options.pass_code;
    run.vendor = vendor;
    return run_rounds(options, *host, signals, run, work);
}

} // namespace fptest
