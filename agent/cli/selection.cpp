// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/selection.h"

#include "cli/identity.h"
#include "plan/plan.h"
#include "run/choice.h"
#include "run/known_failures.h"
#include "util/failure.h"
#include "util/text.h"
#include "util/write.h"

#include <algorithm>
#include <cstddef>
#include <map>
#include <random>
#include <set>
#include <string>
#include <utility>
#include <vector>

namespace fptest
{
namespace
{

// Only an item that has a command of its own can be run again.
void require_single_items(const RoundPlan &round)
{
    for (const Job &job : round.jobs) {
        if (job.targets.size() > 1) {
            throw Failure(Cause::input,
                          "--retry runs items by their own paths, and {} runs as one command: "
                          "leave --as-group out, or see fptest check",
                          in_quotes(job.path));
        }
    }
}

void refuse_what_the_run_began_with(const RunOptions &options)
{
    const std::pair<bool, const char *> given[] = {
        {!options.paths.empty(), "PATH"},
        {!options.skips.empty(), "--skip"},
        {!options.failed_of.empty(), "--failed-of"},
        {!options.shuffle.empty(), "--shuffle"},
        {options.as_group, "--as-group"},
        {options.repeat.has_value(), "--repeat"},
        {options.time_limit.has_value(), "--for"},
        {options.until_fail, "--until-fail"},
        {options.stop_after.has_value(), "--stop-after"},
        {options.retries > 0, "--retry"},
        {options.pass_code != 0, "--pass-code"},
    };
    for (const auto &[is_given, name] : given) {
        if (is_given && !options.resume.empty()) {
            throw Failure(Cause::input, "--resume goes on with a run as it was begun: leave {} out",
                          name);
        }
    }
}

// The paths of all its items, and its order.
std::vector<Path> paths_of(const EarlierRun &earlier, const Plan &plan,
                           const std::string &plan_name)
{
    const std::set<EarlierRun::Name> items(earlier.items.begin(), earlier.items.end());
    require_items(earlier, items, plan, plan_name);
    std::map<EarlierRun::Name, Path> known;
    for (const Path &group : all_paths(plan)) {
        for (const std::string &item : runnable_items(plan, group.group)) {
            const EarlierRun::Name name(sanitize_utf8(group.group), sanitize_utf8(item));
            if (items.contains(name)) {
                known.emplace(name, item_path(plan, group, item));
            }
        }
    }
    std::vector<Path> paths;
    for (const EarlierRun::Name &name : earlier.items) {
        const auto found = known.find(name);
        if (found == known.end()) {
            throw Failure(Cause::input, "{} is of another plan: {} does not run {}", earlier.file,
                          one_line(plan_name), one_line(name.first + "/" + name.second));
        }
        paths.push_back(found->second);
    }
    return paths;
}

// Whether it had come to its end, by the failures that it was to end after.
bool is_over_by_failures(const EarlierRun &earlier)
{
    const auto failed = std::ranges::count_if(earlier.ended, [&](std::size_t index) {
        return !is_success(earlier.attempts.at(index).outcome);
    });
    const Run &run = earlier.run;
    return (run.until_fail && failed > 0) || (run.stop_after && failed >= *run.stop_after);
}

bool has_known_rounds(const Run &run)
{
    return run.rounds && !run.time_limit;
}

// What has not ended in each of its rounds, by the indices in a round.
std::vector<std::size_t> left_of(const EarlierRun &earlier, bool begins_unknown_rounds)
{
    std::vector<std::size_t> left;
    const std::size_t all = earlier.items.size();
    const auto &told = earlier.attempts;
    const std::size_t begun = told.empty() || all == 0 ? 1 : told.rbegin()->first / all + 1;
    const Run &run = earlier.run;
    const bool has_more = (!run.rounds || begun < static_cast<std::size_t>(*run.rounds)) &&
                          (!run.time_limit || run.seconds < *run.time_limit) &&
                          (has_known_rounds(run) || begins_unknown_rounds);
    for (std::size_t at = 0; at < all; ++at) {
        std::size_t times = 0;
        while (times < begun && earlier.ended.contains(times * all + at)) {
            ++times;
        }
        if (has_more || times < begun) {
            left.push_back(at);
        }
    }
    return left;
}

// For a list.
void leave_out_ended(RoundPlan &round, const EarlierRun &earlier)
{
    std::vector<Job> jobs;
    if (!is_over_by_failures(earlier)) {
        for (const std::size_t at : left_of(earlier, true)) {
            jobs.push_back(round.jobs[at]);
        }
    }
    round.jobs = jobs;
}

// For --failed-of: what did not pass, and what the run did not come to.
std::set<EarlierRun::Name> failed_or_left(const EarlierRun &earlier)
{
    std::set<EarlierRun::Name> items = earlier.failed;
    if (!earlier.run.finished) {
        for (const std::size_t at : left_of(earlier, false)) {
            items.insert(earlier.items[at]);
        }
        for (const auto &[index, item] : earlier.unended) {
            items.emplace(item.group, item.name);
        }
    }
    return items;
}

// One report is of one unit. Other labels are that run's where they are not given again.
void take_labels(Identity &identity, const EarlierRun &earlier)
{
    for (const auto &label : earlier.run.identity.labels) {
        const auto now = std::ranges::find_if(
            identity.labels, [&](const auto &one) { return one.first == label.first; });
        if (now == identity.labels.end()) {
            identity.labels.push_back(label);
        } else if (label.first == kDevice && now->second != label.second) {
            throw Failure(Cause::input,
                          "{} is of device {}, and this is {}: if it is that one all the same, say "
                          "--label device={}",
                          earlier.file, in_quotes(label.second), in_quotes(now->second),
                          label.second);
        }
    }
}

} // namespace

std::optional<EarlierRun> read_earlier_run(RunOptions &options)
{
    if (options.failed_of.empty() && options.resume.empty()) {
        return std::nullopt;
    }
    refuse_what_the_run_began_with(options);
    const std::string &file = options.resume.empty() ? options.failed_of : options.resume;
    EarlierRun earlier = read_earlier_run(file, file);
    if (earlier.is_cut) {
        say("{}: its last line is cut, and left out", earlier.file);
    }
    const bool has_end = earlier.run.finished || !earlier.run.why_unfinished.empty();
    if (options.resume.empty() && !has_end && !has_known_rounds(earlier.run)) {
        say("{}: that run has no end: nobody knows whether it was to begin further rounds",
            earlier.file);
    }
    if (!options.resume.empty()) {
        options.repeat = earlier.run.rounds;
        options.time_limit = earlier.run.time_limit;
        options.until_fail = earlier.run.until_fail;
        options.stop_after = earlier.run.stop_after;
        options.retries = earlier.run.retries;
        options.pass_code = earlier.run.pass_code;
    }
    return earlier;
}

bool leaves_nothing(const RunOptions &options, const EarlierRun &earlier)
{
    return options.resume.empty() ? failed_or_left(earlier).empty() : earlier.run.finished;
}

void require_same_plan(const EarlierRun &earlier, const std::string &digest,
                       const std::string &plan)
{
    const std::string &was = earlier.run.identity.plan_digest;
    if (!was.empty() && was != digest) {
        throw Failure(Cause::input,
                      "{} is of another plan: {} has other items, or other args; run it anew",
                      earlier.file, one_line(plan));
    }
}

const EarlierRun *take_up(Run &run, const RunOptions &options,
                          const std::optional<EarlierRun> &given)
{
    if (options.resume.empty()) {
        return nullptr;
    }
    const EarlierRun &earlier = *given;
    if (earlier.run.vendor != run.vendor) {
        throw Failure(Cause::input,
                      "{} is of vendor {}, and this device's is {}: their items are other programs",
                      earlier.file, earlier.run.vendor, run.vendor);
    }
    require_same_plan(earlier, run.identity.plan_digest, run.plan);
    take_labels(run.identity, earlier);
    run.seed = earlier.run.seed;
    run.resumed = earlier.file;
    run.seconds_before = earlier.run.seconds;
    run.seconds = run.seconds_before;
    for (const auto &[index, item] : earlier.attempts) {
        run.has_expectations = run.has_expectations || !item.expected.empty();
    }
    return &earlier;
}

std::optional<int> seed_of(const RunOptions &options)
{
    if (options.shuffle.empty()) {
        return std::nullopt;
    }
    if (options.shuffle != "true") {
        return std::stoi(options.shuffle);
    }
    const int seed = static_cast<int>(std::random_device()() % (kSeedLimit + 1));
    say("shuffled with seed {0}: --shuffle={0} runs this order again", seed);
    return seed;
}

RoundPlan chosen_round(const RunOptions &options, const CheckedPlan &checked,
                       const std::optional<EarlierRun> &earlier, std::optional<int> seed)
{
    const Plan &plan = *checked.loaded.plan;
    Choice choice{options.paths, options.skips, options.as_group, options.force};
    const bool is_resumed = !options.resume.empty();
    if (earlier && !is_resumed) {
        choice.only = failed_or_left(*earlier);
        require_items(*earlier, *choice.only, plan, checked.name);
    }
    const std::vector<Path> paths =
        is_resumed ? paths_of(*earlier, plan, checked.name) : choose(choice, plan, checked.name);
    if (paths.empty() && !options.list) {
        throw Failure(Cause::input, "{} has nothing to run{}", one_line(checked.name),
                      known_groups(plan));
    }
    RoundPlan round = plan_round(paths, plan, options.as_group);
    if (!options.expect.empty()) {
        expect_failures(options.expect, plan, checked.name, round);
    }
    if (is_resumed && options.list) {
        leave_out_ended(round, *earlier);
    }
    if (options.retries > 0) {
        require_single_items(round);
    }
    return seed ? shuffled(round, *seed) : round;
}

void add_selection(CLI::App &command, RunOptions &options)
{
    command.add_option("PATH", options.paths, "what to run")->type_name("");
    command.add_option("--skip", options.skips, "leave out what this pattern of paths matches")
        ->type_name("PATTERN")
        ->allow_extra_args(false)
        ->check(not_empty());
    command
        .add_option("--failed-of", options.failed_of,
                    "only what failed in the run that left these\n"
                    "JSON lines")
        ->type_name("FILE")
        ->transform(desk_file())
        ->check(not_empty());
    command
        .add_option("--resume", options.resume,
                    "complete the run that left these JSON lines,\n"
                    "with results of all of it")
        ->type_name("FILE")
        ->transform(desk_file())
        ->check(not_empty());
    command.add_option("--repeat", options.repeat, "run everything N times")
        ->type_name("N")
        ->transform(range(1, 1000000));
    command
        .add_option("--for", options.time_limit,
                    "begin further rounds until this time is\n"
                    "over: 90, 90s, 10m, 2h, 1d")
        ->type_name("TIME")
        ->transform(time_span());
    command.add_flag("--until-fail", options.until_fail,
                     "end with the first item that does not pass;\n"
                     "begin another round until then");
    command.add_option("--stop-after", options.stop_after, "end after N items that did not pass")
        ->type_name("N")
        ->transform(range(1, 1000000));
    command.add_option("--limit", options.limit, "stop the whole run when this time is over")
        ->type_name("TIME")
        ->transform(time_span());
    command
        .add_option("--retry", options.retries,
                    "try an item that does not pass again, up to\n"
                    "N times")
        ->type_name("N")
        ->transform(range(1, 100));
    command
        .add_flag("--shuffle", options.shuffle,
                  "in another order: by chance, or the one of\n"
                  "this SEED: --shuffle=SEED")
        ->disable_flag_override(false)
        ->check(order_seed());
    command
        .add_option("--expect", options.expect,
                    "what is known to fail: a path or pattern and\n"
                    "the reason on each line")
        ->type_name("FILE")
        ->transform(desk_file())
        ->check(not_empty());
}

} // namespace fptest
