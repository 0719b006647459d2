// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/selection.h"

#include "plan/plan.h"
#include "run/choice.h"
#include "run/known_failures.h"
#include "util/failure.h"
#include "util/text.h"
#include "util/write.h"

#include <random>
#include <string>
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

} // namespace

std::optional<EarlierRun> read_earlier_run(RunOptions &options)
{
    if (options.failed_of.empty()) {
        return std::nullopt;
    }
    EarlierRun earlier = read_earlier_run(options.failed_of);
    if (earlier.is_cut) {
        say("{}: its last line is cut, and left out", earlier.file);
    }
    return earlier;
}

bool leaves_nothing(const RunOptions & /* options */, const EarlierRun &earlier)
{
    if (earlier.failed.empty()) {
        say("{}: no item of that run failed: nothing to do", earlier.file);
        return true;
    }
    return false;
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
    if (earlier) {
        require_items(*earlier, earlier->failed, plan, checked.name);
        choice.only = earlier->failed;
    }
    const std::vector<Path> paths = choose(choice, plan, checked.name);
    if (paths.empty() && !options.list) {
        throw Failure(Cause::input, "{} has nothing to run{}", one_line(checked.name),
                      known_groups(plan));
    }
    RoundPlan round = plan_round(paths, plan, options.as_group);
    if (!options.expect.empty()) {
        expect_failures(options.expect, plan, checked.name, round);
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
        ->transform(range(1, 1000));
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
