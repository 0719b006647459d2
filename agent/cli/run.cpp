// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/finding_printer.h"
#include "cli/desk_paths.h"
#include "cli/identity.h"
#include "cli/log_option.h"
#include "cli/options.h"
#include "cli/outputs.h"
#include "cli/run_options.h"
#include "cli/selection.h"
#include "module/device_lock.h"
#include "module/item_output.h"
#include "module/library_process.h"
#include "module/log_file.h"
#include "module/own_ps.h"
#include "module/preflight.h"
#include "module/processes.h"
#include "module/stored_plan.h"
#include "module/vendor_file.h"
#include "plan/plan.h"
#include "plan/plan_text.h"
#include "reporters/reporters.h"
#include "run/planner.h"
#include "run/rounds.h"
#include "run/runner.h"
#include "util/file_lock.h"
#include "util/files.h"
#include "util/text.h"
#include "util/write.h"

#include <algorithm>
#include <csignal>
#include <cstdio>
#include <iterator>
#include <memory>
#include <optional>
#include <poll.h>
#include <string>
#include <unistd.h>
#include <utility>
#include <vector>

namespace fptest
{
namespace
{

constexpr char kRunExamples[] =
    "A PATH is root/group or root/group/item; the root may be any word, the others\n"
    "patterns as of the shell. Without PATH, every group is run.\n"
    "\n"
    "Examples:\n"
    "  fptest run --plan plans/demo.xml demo/Bringup demo/Gather\n"
    "  fptest run --timeout 30 --junit results.xml demo/Bringup/SpiCheck\n"
    "  fptest run --plan plans/demo.xml --list '*/*/S*'\n"
    "  prove --exec 'fptest run --tap' demo/Bringup";

// --- the plan -----------------------------------------------------------------

// A plan that is too long for a command is placed as a file.
Storing storing_of(const RunOptions &options, const std::string &text)
{
    if (options.plan.empty()) {
        return Storing::as_file;
    }
    return options.as_sent || text.size() <= kPlanLimit ? Storing::by_command : Storing::as_file;
}

// A plan that the library loads.
CheckedPlan open_plan(const RunOptions &options)
{
    const std::string text = options.plan.empty()
                                 ? require_stored_plan(": give one with --plan FILE")
                                 : require_file(options.plan);
    CheckedPlan checked = check(name_of_plan(options.plan), text, storing_of(options, text));
    const bool has_error = has_errors(checked.findings);
    if (has_error && !options.force) {
        print(stderr, checked);
        throw Failure(Cause::input, "nothing was run, because the plan has errors; fix them, or "
                                    "run it as it is with --force");
    }
    if (!checked.findings.empty() && !options.quiet) {
        say("the plan has {}: see fptest check {}{}", has_error ? "errors" : "warnings",
            checked.storing == Storing::as_file ? "--for file " : "", one_line(checked.name));
    }
    if (!checked.loaded.plan) {
        throw Failure(Cause::input, "{}: the library cannot load this plan: {}",
                      one_line(checked.name), one_line(checked.loaded.why));
    }
    return checked;
}

// --- before the run -----------------------------------------------------------

std::vector<std::string> names_of(const RoundPlan &round)
{
    std::vector<std::string> names;
    for (const Suite &suite : round.suites) {
        std::ranges::transform(suite.items, std::back_inserter(names), &ItemRun::name);
    }
    return names;
}

// Why a gatherer that runs is ended before this plan is stored; empty if it may go on. It may
// save an earlier plan with its next report, or still work for a run that was killed; and only
// the run that started it knows what it prints, and gave it a directory.
std::string why_gatherer_is_ended(const RunOptions &options, const RoundPlan &round,
                                  const std::string &text, int vendor)
{
    const std::vector<Leftover> running = ChildProcesses(getpid(), getpid(), vendor).of_gatherer();
    if (running.empty()) {
        return {};
    }
    if ((options.judge_limits || !options.files.empty()) &&
        std::ranges::any_of(names_of(round),
                            [vendor](const auto &name) { return is_gatherer(name, vendor); })) {
        return "its measurements and files would be the run's that started it";
    }
    const std::string earlier = read_stored_plan().value_or("");
    if (!earlier.empty() && (has_marks(earlier) || !is_same_plan(earlier, text))) {
        return "it may have kept an earlier plan, and would write it back";
    }
    if (std::ranges::any_of(running, ItemOutput::is_filling, &Leftover::process)) {
        return "it has printed more than can be kept for it";
    }
    return is_gatherer_outdated() ? "its program has been replaced since it started" : "";
}

// The library starts no gatherer beside one that runs, whatever the plan says.
void report_other_gatherer(const RoundPlan &round, const Plan &plan, int vendor,
                           const std::string &why_ended)
{
    if (!why_ended.empty()) {
        say("the running gatherer is ended first: {}", why_ended);
        return;
    }
    std::vector<std::string> args;
    for (const Job &job : round.jobs) {
        for (const auto &target : job.targets) {
            if (target && is_gatherer(round.suites[job.suite].items[target->item].name, vendor)) {
                args.push_back(attribute(plan.elements()[target->element], "args").value_or(""));
            }
        }
    }
    const std::string other = other_gatherer(args, vendor_suffix(vendor).value_or(""));
    if (!other.empty()) {
        say("a gatherer is running already, as {}: the library triggers that one, and starts none",
            in_quotes(other));
    }
}

void list_items(const RoundPlan &round, const Plan &plan, const std::string &suffix)
{
    const auto items = commands_of(round, plan, suffix);
    std::size_t width = 0;
    for (const auto &[path, command] : items) {
        width = std::max(width, display_width(one_line(path)));
    }
    for (const auto &[path, command] : items) {
        print_to(stdout, "{}  {}\n", pad_or_ellipsize(one_line(path), width), one_line(command));
    }
}

// The running item is stopped by the library's process, which sees that this one is gone;
// result files stay as far as they were written.
[[noreturn]] void exit_at_once()
{
    pollfd errors{STDERR_FILENO, POLLOUT, 0};
    if (poll(&errors, 1, 0) > 0) { // a terminal may be stopped
        std::fputs("\nfptest: interrupted again: exiting now, stopping the running item\n", stderr);
    }
    _exit(static_cast<int>(Exit::interrupted));
}

void refuse_list_with_results(const RunOptions &options)
{
    const std::string results = options.tap              ? "--tap"
                                : !options.json.empty()  ? "--json"
                                : !options.junit.empty() ? "--junit"
                                : !options.files.empty() ? "--files"
                                                         : "";
    if (options.list && !results.empty()) {
        throw Failure(Cause::input,
                      "--list runs nothing, so {} would be empty: leave one of them out", results);
    }
}

// The lock keeps the device as it is found now.
DeviceLock ready_device(const RunNote &note)
{
    require_device();
    return DeviceLock(note);
}

RunNote note_for(const RunOptions &options)
{
    RunNote note;
    note.plan = name_of_plan(options.plan);
    return note;
}

Runner::Options runner_options(const RunOptions &options)
{
    Runner::Options runner;
    if (options.timeout) {
        runner.timeout = std::chrono::duration<double>(*options.timeout);
    }
    if (options.limit) {
        runner.limit = std::chrono::duration<double>(*options.limit);
    }
    runner.grace = std::chrono::duration<double>(options.grace);
    runner.fail_on_exit_status = options.fail_on_exit_status;
    runner.judge_limits = options.judge_limits;
    runner.files = options.files;
    runner.on_second_interrupt = exit_at_once;
    return runner;
}

Run run_of(const RunOptions &options, const std::string &plan, int vendor)
{
    Run run;
    run.plan = plan;
    run.rounds = options.repeat;
    if (!run.rounds && !options.time_limit && !options.until_fail) {
        run.rounds = 1;
    }
    run.time_limit = options.time_limit;
    run.until_fail = options.until_fail;
    run.stop_after = options.stop_after;
    run.retries = options.retries;
    run.has_expectations = !options.expect.empty();
    run.limit = options.limit;
    run.pass_code = options.pass_code;
    run.vendor = vendor;
    return run;
}

void choose_log_of_run(const std::string &option)
{
    choose_log(option);
    if (!lock_log()) {
        throw Failure(Cause::input, "{}", locked_text(label(log_file(option))));
    }
}

// A list asks nothing of the device but its vendor.
void choose_ps_for(const RunOptions &options)
{
    const std::string said = options.list ? "" : choose_ps();
    if (!said.empty() && !options.quiet) {
        say("{}", said);
    }
}

// As the library takes 0 for it in silence.
void report_no_vendor(const RunOptions &options)
{
    const std::string why = why_no_vendor();
    if (is_vendor_file_there() && !why.empty() && !options.quiet) {
        say("{}: the library takes 0 for the vendor selector", why);
    }
}

Exit do_nothing(const RunOptions &options, const EarlierRun &earlier)
{
    if (!options.resume.empty() && !options.plan.empty()) {
        const CheckedPlan checked = open_plan(options);
        require_same_plan(earlier, digest_of(*checked.loaded.plan), checked.name);
    }
    say("{}: {}: nothing to do", earlier.file,
        options.resume.empty()   ? "no item of that run failed"
        : earlier.failed.empty() ? "that run has finished"
                                 : "that run has finished, with failures");
    return earlier.failed.empty() ? Exit::success : Exit::items_failed;
}

/// Refuses what the options can't have together, and settles where results go.
void resolve_outputs(RunOptions &options)
{
    refuse_list_with_results(options);
    resolve_output_conflicts(options);
    if (options.as_sent && options.plan.empty()) {
        throw Failure(Cause::input, "--as-sent is of no use without --plan FILE, which is sent");
    }
    if (options.list) {
        require_standard_output("--list");
        return;
    }
    warn_of_lost_outputs({{"--json", options.json},
                          {"--junit", options.junit},
                          {"--files", options.files},
                          {"--log", options.log}});
}

Exit run(RunOptions options)
{
    resolve_outputs(options);
    const std::optional<EarlierRun> earlier = read_earlier_run(options);
    if (earlier && leaves_nothing(options, *earlier)) {
        return do_nothing(options, *earlier);
    }
    Identity identity = identity_of(options.labels);
    const RunNote note = note_for(options);
    const DeviceLock lock = options.list ? DeviceLock() : ready_device(note);
    const CheckedPlan checked = open_plan(options);
    const Plan &plan = *checked.loaded.plan;
    const std::optional<int> seed = seed_of(options);
    const RoundPlan round = chosen_round(options, checked, earlier, seed);
    require_writable_results(options);
    choose_log_of_run(options.log);
    if (options.hangup == "go-on") {
        std::signal(SIGHUP, SIG_IGN);
    }
    Signals signals([&lock] { return lock.is_asked_to_stop(); });
    choose_ps_for(options);
    report_no_vendor(options);
    std::optional<LibraryProcess> library(std::in_place);
    const int vendor = refer_to_doctor([&] { return ask_vendor(*library); });
    if (options.list) {
        list_items(round, plan, vendor_suffix(vendor).value_or(""));
        return Exit::success;
    }

    require_programs(names_of(round), vendor, options.force);
    const bool is_sent = checked.storing != Storing::as_file;
    const bool is_placed = !is_sent && !options.plan.empty();
    const std::string &to_store = is_sent ? checked.stored : checked.text;
    Runner::Options for_runner = runner_options(options);
    const std::string why_ended = why_gatherer_is_ended(options, round, to_store, vendor);
    for_runner.ends_gatherer = !why_ended.empty();
    if (!options.quiet) {
        report_other_gatherer(round, plan, vendor, why_ended);
    }
    if (is_sent || is_placed) {
        refer_to_doctor([&to_store] { require_room(to_store.size()); });
    }
    if (is_placed && !options.quiet) {
        say("{}: its {} bytes are more than the {} that a command stores, so it is placed as the "
            "file {}",
            one_line(checked.name), checked.text.size(), kPlanLimit, kStoredPlan);
    }
    const auto store_plan = [&] {
        const auto stored = Plan::load_as_library(read_stored_plan().value_or(""));
        if (!options.resume.empty() && stored && digest_of(*stored) == digest_of(plan)) {
            return; // it may have the reports that are taken over
        }
        if (is_sent) {
            send_and_wait(*library, "XMLFile::" + checked.text);
            require_stored(library->read_back(), checked.stored);
        } else if (is_placed) {
            store_as_file(checked.text);
            library.emplace(); // the old one still holds the plan from before
            library->hold_at_ends();
        }
    };
    Run run = run_of(options, checked.name, vendor);
    run.seed = seed;
    name_device(identity);
    run.identity = std::move(identity);
    run.identity.plan_digest = digest_of(plan);
    const EarlierRun *const resumed = take_up(run, options, earlier);
    auto owned = make_reporters(options);
    owned.push_back(make_note_reporter(lock, note));
    std::vector<Reporter *> reporters;
    for (const auto &reporter : owned) {
        reporters.push_back(reporter.get());
    }
    if (!run_rounds(reporters, for_runner, *library, signals, run, round, store_plan, resumed)) {
        return Exit::interrupted;
    }
    const Counts counts = count(run);
    return run.finished && !counts.has_failures() ? Exit::success : Exit::items_failed;
}

} // namespace

void add_run(CLI::App &app, Action &chosen)
{
    const auto options = std::make_shared<RunOptions>();
    CLI::App &command = add_subcommand(app, "run", "Store a plan and run groups or items of it",
                                       kRunExamples, chosen, [options] { return run(*options); });
    command
        .add_option("--plan", options->plan,
                    "store this plan first ('-': standard input);\n"
                    "without, the stored plan is run")
        ->type_name("FILE")
        ->transform(desk_file())
        ->check(not_empty());
    command.add_flag("--as-sent", options->as_sent,
                     "store it by a command, which cuts it after\n"
                     "2048 bytes, and never as a file");
    command.add_flag("--as-group", options->as_group,
                     "one command for each group, not for each\n"
                     "item");
    add_selection(command, *options);
    command.add_option("--timeout", options->timeout, "stop an item that takes longer")
        ->type_name("SECONDS")
        ->transform(range(0.001, 1000000.0));
    command.add_option("--grace", options->grace, "kill it this long after a stop")
        ->type_name("SECONDS")
        ->capture_default_str()
        ->transform(range(0.0, 1000000.0));
    command.add_flag("--exit-status", options->fail_on_exit_status,
                     "an item that ends with a status other than\n"
                     "0 has failed");
    command.add_flag("--judge-limits", options->judge_limits,
                     "an item that measures out of limits, or what\n"
                     "cannot be judged, has failed");
    command.add_flag("--list", options->list, "print what would be run and start nothing");
    command
        .add_option("--junit", options->junit,
                    "write the results as JUnit XML ('-': standard\n"
                    "output)")
        ->type_name("FILE")
        ->check(not_empty());
    command
        .add_option("--json", options->json,
                    "write them as JSON lines, as they come\n"
                    "('-': standard output)")
        ->type_name("FILE")
        ->check(not_empty());
    command
        .add_option("--files", options->files,
                    "a directory, made if need be, with one for the\n"
                    "files of each item: FPTEST_ITEM_DIR")
        ->type_name("DIR")
        ->check(not_empty());
    command.add_flag("--tap", options->tap,
                     "write them as TAP to standard output, in\n"
                     "place of the view");
    command.add_option("--pass-code", options->pass_code, "the result that means passed")
        ->type_name("N")
        ->capture_default_str()
        ->check(result_code());
    command.add_flag("--force", options->force,
                     "run in spite of errors in the plan and of\n"
                     "missing programs");
    command.add_flag("--quiet", options->quiet, "print only what did not pass");
    command.add_flag("--plain", options->plain, "print lines, as a log wants them");
    command
        .add_option("--hangup", options->hangup,
                    "what the end of the terminal means: stop or\n"
                    "go-on")
        ->type_name("WORD")
        ->capture_default_str()
        ->check(one_of({"stop", "go-on"}, "is not stop or go-on"));
    add_labels(command, options->labels);
    add_log(command, options->log);
}

} // namespace fptest
