// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the runner makes of an item that has ended: its outcome, and the reason.
#include "run/runner.h"

#include "module/stored_plan.h"
#include "plan/library_rules.h"
#include "plan/plan.h"
#include "util/text.h"

#include <fmt/core.h>
#include <unistd.h>

namespace fptest
{
namespace
{

constexpr char kOverwrittenAfter[] =
    "; a process with an old copy of the plan has since overwritten it";

std::string reported(const ItemReport &report)
{
    return report.result_without_value
               ? "reported a result that is not 0, 1 or -2: the plan has no text for it"
               : fmt::format("reported the result {}", report.result.value_or(""));
}

bool passes(const ItemReport &report, const Run &run)
{
    return report.result == std::to_string(run.pass_code);
}

// What it reported, where that counts no more.
std::string though_reported(const ItemReport &report, const Run &run)
{
    return fmt::format("{} {}", passes(report, run) ? ", though it" : "; it had", reported(report));
}

} // namespace

void Runner::judge(const RunningItem &active)
{
    ItemRun &result = item_at(run_, active.place);
    const ItemReport &report = result.report;
    const bool has_reported = has_result(report);
    if (active.stop == Outcome::timed_out ||
        (active.stop == Outcome::stopped && active.was_stopped)) {
        result.outcome = *active.stop;
        result.reason = why_stopped(active);
    } else if (!library_gone_.empty()) {
        result.outcome = has_reported ? Outcome::failed : Outcome::no_result;
        result.reason = library_gone_;
        result.overruled = has_reported;
    } else if (result.signal != 0) {
        result.outcome = Outcome::failed;
        result.reason = fmt::format("died by {}{}{}", name_of_signal(result.signal),
                                    has_reported ? though_reported(report, run_) : "",
                                    active.reporting.is_written_over() ? kOverwrittenAfter : "");
    } else if (!has_reported || active.reporting.lost) {
        result.outcome = Outcome::no_result;
        result.reason = why_silent(active);
    } else if (active.gathers && report.progress != "100") {
        result.outcome = Outcome::failed;
        result.reason = fmt::format(
            "the gatherer {} at progress {}{}{}", active.gatherer_end.empty() ? "was" : "ended",
            report.progress.value_or("0"),
            active.gatherer_end.empty() ? " after " + fine_duration(kForGathering.count()) : "",
            though_reported(report, run_));
        result.overruled = true;
    } else if (options_.fail_on_exit_status && result.exit_status.value_or(0) != 0) {
        result.outcome = Outcome::failed;
        result.reason = fmt::format("ended with exit status {}{}", *result.exit_status,
                                    though_reported(report, run_));
    } else {
        judge_report(active);
    }
}

// By what it has reported, where nothing else speaks against it.
void Runner::judge_report(const RunningItem &active)
{
    ItemRun &result = item_at(run_, active.place);
    const ItemReport &report = result.report;
    if (active.reporting.is_beside_others() && active.reporting.taken_back &&
        !(passes(report, run_) && passes(*active.reporting.taken_back, run_))) {
        result.outcome = Outcome::failed;
        result.reason = fmt::format("{}; a process with an old copy of the plan has then written "
                                    "back what it had reported before",
                                    reported(*active.reporting.taken_back));
        result.overruled = true;
    } else if (passes(report, run_) && report.progress != "100" &&
               active.reporting.is_uncertain()) {
        result.outcome = Outcome::failed;
        result.reason = fmt::format("it was last seen at progress {}: a process that has reported "
                                    "meanwhile may have written over more with its old copy of "
                                    "the plan",
                                    one_line(report.progress.value_or("-")));
        result.overruled = true;
    } else if (passes(report, run_)) {
        result.outcome = Outcome::passed;
    } else {
        result.outcome = Outcome::failed;
        result.reason = reported(report);
        if (active.reporting.overwritten) {
            result.reason += kOverwrittenAfter;
        }
    }
}

std::string Runner::why_stopped(const RunningItem &active)
{
    if (!active.was_stopped && !library_gone_.empty()) {
        return fmt::format("past the limit of {}: {}", fine_duration(options_.timeout->count()),
                           library_gone_);
    }
    const double seconds = *item_at(run_, active.place).seconds;
    if (!active.was_stopped) {
        return fmt::format("{} after {}, past the limit of {}",
                           active.gathers && active.gatherer_end.empty() ? "reported"
                                                                         : "ended by itself",
                           fine_duration(seconds), fine_duration(options_.timeout->count()));
    }
    const bool is_interrupted = active.stop == Outcome::stopped;
    if (!active.killed) {
        return is_interrupted
                   ? fmt::format("stopped by {}", name_for_people(signal_))
                   : fmt::format("stopped after {}{}", duration(seconds),
                                 active.reporting.is_written_over() ? kOverwrittenAfter : "");
    }
    return fmt::format("killed after {}, as it did not end when it was asked to",
                       is_interrupted ? "the run was interrupted by " + name_for_people(signal_)
                                      : duration(seconds));
}

std::string Runner::why_silent(const RunningItem &active)
{
    const auto suffix = vendor_suffix(vendor_);
    if (!suffix) {
        return fmt::format("vendor {} runs no item", vendor_);
    }
    const std::string program = program_of(item_at(run_, active.place).name, *suffix);
    if (is_plain_name(item_at(run_, active.place).name) && access(program.c_str(), X_OK) != 0) {
        return fmt::format("there is no program {}", one_line(program));
    }
    if (active.reporting.overwritten) {
        return active.gathers ? "a process with an old copy of the plan has written it over, "
                                "perhaps the gatherer: let it report by a new process each time"
                              : "a process with an old copy of the plan has written it over, and "
                                "nothing was reported after that";
    }
    if (active.reporting.in_another_plan) {
        return "the stored plan is another one by now: a process that knows that one has saved it";
    }
    if (active.reporting.undone) {
        return "a process with an old copy of the plan has written over what it had reported";
    }
    if (!active.gatherer_end.empty()) {
        return active.gatherer_end;
    }
    if (active.reporting.lost) {
        return fmt::format("what it reported is lost: the stored plan {}", kPlanLost);
    }
    const std::string text = read_stored_plan().value_or("");
    if (text.empty()) {
        return "no report could be written: the stored plan is gone";
    }
    if (!Plan::parse_annotated(text)) {
        return "no report could be written: the stored plan is not whole any more";
    }
    std::string why;
    if (!Plan::load_as_library(text, &why)) {
        return fmt::format("no report can be written any more: the stored plan does not load ({})",
                           why);
    }
    if (active.reporting.is_beside_others()) {
        return "no report is there: there was none, or a process that has reported meanwhile "
               "has written over it with its old copy of the plan";
    }
    return active.gathers
               ? fmt::format("no result was reported within {}",
                             fine_duration(options_.timeout.value_or(kForGathering).count()))
               : "ended without reporting a result";
}

} // namespace fptest
