// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check_messages.h"
#include "commands.h"
#include "device.h"
#include "files.h"
#include "host.h"
#include "plan.h"
#include "reports.h"
#include "runner.h"
#include "text.h"
#include "view.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <memory>
#include <sstream>
#include <thread>
#include <unistd.h>
#include <utility>

namespace fptest
{
namespace
{

// What is to be run: the plan's text and what the module makes of it.
struct Source {
    std::string name; // of the file, for people
    std::string text;
    Plan plan;
    PlanUse use;
};

struct Path {
    std::string text; // as the command carries it
    std::string root;
    std::string group;
    std::string item; // empty where it names a group
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

Source open_plan(const RunOptions &options)
{
    const std::string name = options.plan.empty()  ? std::string(kStoredPlan)
                             : options.plan == "-" ? std::string("<stdin>")
                                                   : options.plan;
    const std::string text = read_plan(options.plan);
    const PlanUse use = use_of(options, text);
    const auto findings = check(text, use);
    if (has_errors(findings) && !options.force) {
        print(stderr, name, text, findings);
        throw Failure(Exit::usage, "nothing was run, because the plan has errors; mend them, or "
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
                      one_line(name) + ": the module cannot load this plan: " + one_line(why));
    }
    return {name, text, std::move(*plan), use};
}

// --- paths --------------------------------------------------------------------

std::string quoted(const std::string &text)
{
    return "'" + one_line(text) + "'";
}

std::vector<std::string> group_names(const Plan &plan)
{
    std::vector<std::string> names;
    for (const Plan::Group &group : plan.groups()) {
        if (std::ranges::find(names, group.name) == names.end()) {
            names.push_back(group.name);
        }
    }
    return names;
}

std::vector<std::string> item_names(const Plan &plan, const std::string &name)
{
    std::vector<std::string> names;
    const auto groups = plan.groups();
    const auto group = std::ranges::find(groups, name, &Plan::Group::name);
    if (group != groups.end()) {
        for (const Plan::Element &item : group->items) {
            names.push_back(item.name.value_or(""));
        }
    }
    return names;
}

// "; did you mean 'x'? The groups are a, b and c", for a name that is not there.
std::string instead(const std::string &name, const std::vector<std::string> &names,
                    const std::string &what)
{
    if (names.empty()) {
        return "; there are no " + what;
    }
    const std::string near = nearest(name, names);
    std::vector<std::string> shown;
    for (const std::string &one : names) {
        shown.push_back(one_line(one));
    }
    return (near.empty() ? "; the " : "; did you mean " + quoted(near) + "? The ") + what +
           " are " + listing(shown);
}

Path parse_path(const std::string &text, const Plan &plan)
{
    std::vector<std::string> parts;
    for (std::size_t at = 0; at < text.size();) {
        const std::size_t end = std::min(text.find('/', at), text.size());
        if (end > at) {
            parts.push_back(text.substr(at, end - at));
        }
        at = end + 1;
    }
    const std::string shape = ": a path is root/group or root/group/item";
    if (parts.size() < 2) {
        throw Failure(Exit::usage, quoted(text) + " names no group" + shape +
                                       instead("", group_names(plan), "groups"));
    }
    if (parts.size() > 3) {
        throw Failure(Exit::usage, quoted(text) + " has too many parts" + shape);
    }
    if (text.find_first_of(":\t\n") != std::string::npos) {
        throw Failure(Exit::usage, quoted(text) + " has a ':', a tab or a line feed, at which the "
                                                  "module would cut it: name it without");
    }
    if (text.size() > kPathLimit) {
        throw Failure(Exit::usage, "a path of " + std::to_string(text.size()) +
                                       " bytes is cut at " + std::to_string(kPathLimit) +
                                       ": name the root with less");
    }
    if (parts.size() == 3) {
        return {text, parts[0], parts[1], parts[2]};
    }
    return {text, parts[0], parts[1], ""};
}

void require_known(const Path &path, const Source &source, bool force)
{
    const auto groups = group_names(source.plan);
    if (std::ranges::find(groups, path.group) == groups.end()) {
        throw Failure(Exit::usage, "no group " + quoted(path.group) + " in " +
                                       one_line(source.name) +
                                       instead(path.group, groups, "groups"));
    }
    const auto items = item_names(source.plan, path.group);
    if (path.item.empty() || force || std::ranges::find(items, path.item) != items.end()) {
        return;
    }
    throw Failure(Exit::usage, "no item " + quoted(path.item) + " in group " + quoted(path.group) +
                                   " of " + one_line(source.name) +
                                   instead(path.item, items, "items of the group"));
}

// Every group, for a list of all there is.
std::vector<Path> all_paths(const Plan &plan)
{
    std::string root = "plan";
    for (mxml_node_t *node : plan.elements()) {
        const std::string tag = mxmlGetElement(node);
        if (!tag.starts_with("?") && !tag.starts_with("!")) {
            const char *name = mxmlElementGetAttr(node, "name");
            root = name != nullptr ? name : tag;
            break;
        }
    }
    std::vector<Path> paths;
    for (const std::string &group : group_names(plan)) {
        paths.push_back({root + "/" + group, root, group, ""});
    }
    return paths;
}

// --- jobs ---------------------------------------------------------------------

// What is run, and what of it one suite after another.
struct Work {
    std::vector<Suite> suites;
    std::vector<Job> jobs;
};

bool runs_something(const std::optional<Plan::Element> &element)
{
    return element && element->name && !element->name->empty();
}

// Whether every item of the group is what a path with its name runs.
bool is_addressable(const Plan &plan, const std::string &group,
                    const std::vector<std::optional<Plan::Element>> &items)
{
    return std::ranges::all_of(items, [&](const auto &item) {
        if (!item || !item->name || item->name->find_first_of("/:\t\n") != std::string::npos) {
            return false;
        }
        const auto found = plan.run_by(group, *item->name);
        return found && found->number == item->number;
    });
}

class WorkPlanner
{
  public:
    WorkPlanner(const Plan &plan, bool as_group) : plan_(plan), as_group_(as_group)
    {
    }

    void add(const Path &path, int round)
    {
        if (!path.item.empty()) {
            add_job(path.text, path.group, round, {plan_.run_by(path.group, path.item)});
            return;
        }
        const auto items = plan_.run_by(path.group);
        if (as_group_ || !is_addressable(plan_, path.group, items)) {
            add_job(path.text, path.group, round, items);
            return;
        }
        for (const auto &item : items) {
            add_job(path.root + "/" + path.group + "/" + item->name.value(), path.group, round,
                    {item});
        }
    }

    Work take()
    {
        return std::move(work_);
    }

  private:
    void add_job(const std::string &path, const std::string &group, int round,
                 const std::vector<std::optional<Plan::Element>> &items)
    {
        if (std::ranges::none_of(items, runs_something)) {
            return;
        }
        if (work_.suites.empty() || work_.suites.back().group != group ||
            work_.suites.back().round != round) {
            work_.suites.push_back({group, round, {}});
        }
        Suite &suite = work_.suites.back();
        Job job;
        job.path = path;
        job.suite = work_.suites.size() - 1;
        for (const auto &item : items) {
            if (!runs_something(item)) {
                job.targets.emplace_back(std::nullopt);
                continue;
            }
            job.targets.emplace_back(Job::Target{suite.items.size(), item->number, {}});
            ItemRun run;
            run.group = group;
            run.name = *item->name;
            suite.items.push_back(run);
        }
        work_.jobs.push_back(std::move(job));
    }

    const Plan &plan_;
    bool as_group_;
    Work work_;
};

void list(const std::vector<Path> &paths, const Plan &plan, const std::string &suffix)
{
    std::vector<std::pair<std::string, std::string>> lines;
    std::size_t width = 0;
    for (const Path &path : paths) {
        const auto items = path.item.empty() ? plan.run_by(path.group)
                                             : std::vector{plan.run_by(path.group, path.item)};
        for (const auto &item : items) {
            if (!runs_something(item)) {
                continue;
            }
            lines.emplace_back(
                one_line(path.root + "/" + path.group + "/" + *item->name),
                one_line(command_line(*item->name, item->args, suffix).substr(0, kCommandLimit)));
            width = std::max(width, columns(lines.back().first));
        }
    }
    for (const auto &[path, command] : lines) {
        std::printf("%s  %s\n", fit(path, width).c_str(), command.c_str());
    }
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

// Reads the stored plan until it is whole: somebody may just be writing it.
template <typename Edit> auto edited_plan(const Edit &edit, std::string &text)
{
    for (int tries = 0;; ++tries) {
        text = read_file(kStoredPlan).value_or("");
        auto edited = edit(text);
        if (edited || tries == 50) {
            return edited;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
}

std::string new_mark()
{
    static unsigned count = 0;
    std::ostringstream mark;
    mark << std::hex << std::chrono::system_clock::now().time_since_epoch().count() << '-'
         << ++count;
    return mark.str();
}

// What is shown is to be of this run: what these items have reported before goes,
// and they are marked, so that it is known for what it is if it comes back.
void clear_reports(Job &job)
{
    std::vector<std::size_t> numbers;
    for (const auto &target : job.targets) {
        if (target) {
            numbers.push_back(target->element);
        }
    }
    const std::string mark = new_mark();
    const Descriptor lock = lock_stored_plan();
    std::string text;
    const auto cleared = edited_plan(
        [&](const std::string &plan) { return without_reports(plan, numbers, mark); }, text);
    if (!cleared && Plan::load(text)) {
        return; // a forced one that is not well-formed: nobody has reported in it
    }
    if (!cleared) {
        throw Failure(Exit::environment,
                      std::string(kStoredPlan) + " is gone, or not whole any more: store it again");
    }
    if (cleared->marked.empty()) {
        return;
    }
    require_room(cleared->text.size());
    replace_stored_plan(cleared->text);
    for (auto &target : job.targets) {
        if (target &&
            std::ranges::find(cleared->marked, target->element) != cleared->marked.end()) {
            target->mark = mark;
        }
    }
}

void clear_marks()
{
    const Descriptor lock = lock_stored_plan();
    std::string text;
    const auto cleared =
        edited_plan([](const std::string &plan) { return without_marks(plan); }, text);
    if (cleared && *cleared != text) {
        replace_stored_plan(*cleared);
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
    } else if (options.json != "-") {
        listeners.push_back(suitable_view(stdout, options.quiet));
    }
    return listeners;
}

std::string first_failure(const std::vector<Listener *> &listeners)
{
    for (const Listener *listener : listeners) {
        if (std::string failure = listener->failure(); !failure.empty()) {
            return failure;
        }
    }
    return {};
}

// --- the run ------------------------------------------------------------------

void run_jobs(Runner &runner, Run &run, const std::vector<Job> &jobs)
{
    for (Job job : jobs) {
        clear_reports(job);
        if (!runner.run(job)) {
            return;
        }
    }
    run.finished = true;
}

Exit run_work(const RunOptions &options, Host &host, Signals &signals, Run &run, const Work &work)
{
    const auto owned = make_listeners(options);
    std::vector<Listener *> listeners;
    for (const auto &listener : owned) {
        listeners.push_back(listener.get());
    }
    run.suites = work.suites;
    run.start = std::chrono::system_clock::now();
    for (Listener *listener : listeners) {
        listener->begin(run);
    }
    if (const std::string failure = first_failure(listeners); !failure.empty()) {
        throw Failure(Exit::environment, failure + "; nothing was run");
    }
    Runner::Limits limits;
    if (options.timeout) {
        limits.item = std::chrono::duration<double>(*options.timeout);
    }
    limits.grace = std::chrono::duration<double>(options.grace);
    limits.exit_status = options.exit_status;
    Runner runner(host, signals, run, listeners, limits);
    bool broken = false;
    try {
        run_jobs(runner, run, work.jobs);
        if (!runner.broken()) {
            clear_marks();
        }
    } catch (const Failure &failure) {
        runner.give_up(failure.what());
        broken = true;
    }
    for (Suite &suite : run.suites) {
        for (ItemRun &item : suite.items) {
            if (item.outcome == Outcome::not_run) {
                item.reason = run.why_unfinished;
            }
        }
    }
    for (Listener *listener : listeners) {
        listener->finish(run);
    }
    if (runner.signal() != 0) {
        return Exit::interrupted;
    }
    if (const std::string failure = first_failure(listeners); !failure.empty()) {
        throw Failure(Exit::environment, failure + "; the run went on without it");
    }
    if (broken || runner.broken()) {
        throw Failure(Exit::environment, run.why_unfinished + runner.advice());
    }
    const Counts counts = count(run);
    return counts.passed == counts.all() ? Exit::success : Exit::items_failed;
}

// Kept locked, so that what is looked at now is still so when it is run.
Descriptor ready_device()
{
    require_device();
    return lock_device();
}

// Each file is written as if it were its own.
void require_different_files(const RunOptions &options)
{
    const std::vector<std::pair<std::string, std::string>> files = {{"--plan", options.plan},
                                                                    {"--json", options.json},
                                                                    {"--junit", options.junit},
                                                                    {"--log", options.log},
                                                                    {"the module", kStoredPlan}};
    for (std::size_t one = 0; one < files.size(); ++one) {
        for (std::size_t other = one + 1; other < files.size(); ++other) {
            const auto &[option, file] = files[one];
            std::error_code none;
            const bool is_special = std::filesystem::exists(file, none) &&
                                    !std::filesystem::is_regular_file(file, none);
            if (!file.empty() && file != "-" && !is_special &&
                std::filesystem::weakly_canonical(file, none) ==
                    std::filesystem::weakly_canonical(files[other].second, none) &&
                !(option == "--plan" && files[other].first == "the module")) {
                throw Failure(Exit::usage, option + " and " + files[other].first +
                                               " both want the file " + one_line(file) +
                                               ": give them files of their own");
            }
        }
    }
}

} // namespace

Exit run(const RunOptions &options)
{
    require_different_files(options);
    if (options.as_sent && options.plan.empty()) {
        throw Failure(Exit::usage, "--as-sent is of no use without --plan FILE, which is sent");
    }
    if (options.tap && options.json == "-") {
        throw Failure(Exit::usage, "--tap and --json - both want standard output: give --json a "
                                   "file");
    }
    const Descriptor lock = options.list ? Descriptor(-1) : ready_device();
    const Source source = open_plan(options);
    std::vector<Path> paths;
    for (const std::string &text : options.paths) {
        paths.push_back(parse_path(text, source.plan));
        require_known(paths.back(), source, options.force);
    }
    if (paths.empty() && !options.list) {
        throw Failure(Exit::usage, "no PATH given: say what to run, as root/group or "
                                   "root/group/item" +
                                       instead("", group_names(source.plan), "groups"));
    }
    choose_log(options.log);
    Signals signals;
    std::optional<Host> host(std::in_place);
    const int vendor = ask_vendor(*host);
    if (options.list) {
        list(paths.empty() ? all_paths(source.plan) : paths, source.plan,
             vendor_suffix(vendor).value_or(""));
        return Exit::success;
    }

    WorkPlanner planner(source.plan, options.as_group);
    for (int round = 1; round <= options.repeat; ++round) {
        for (const Path &path : paths) {
            planner.add(path, round);
        }
    }
    const Work work = planner.take();
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
    run.pass_code = options.pass_code;
    run.vendor = vendor;
    return run_work(options, *host, signals, run, work);
}

} // namespace fptest
