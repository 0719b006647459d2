// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/verdict.h"

#include "module/stored_plan.h"
#include "plan/library_rules.h"
#include "plan/plan.h"
#include "run/signals.h"
#include "util/text.h"
#include "util/times.h"

#include <fmt/core.h>
#include <unistd.h>

namespace fptest
{
namespace
{

constexpr char kOverwrittenAfter[] =
    "; meanwhile a process with an old copy of the plan has overwritten its report";

std::string reported(const ItemReport &report)
{
    return report.result_without_value
               ? "reported a result that is not 0, 1 or -2: the plan has no text for it"
               : fmt::format("reported the result {}", one_line(report.result.value_or("")));
}

class Judge
{
  public:
    Judge(const RunningItem &active, const ItemRun &item, const JudgeContext &context)
        : active_(active), reporting_(active.reporting), item_(item), report_(item.report),
          context_(context)
    {
    }

    Verdict verdict() const
    {
        const bool has_reported = has_result(report_);
        if (active_.stop == Outcome::timed_out ||
            (active_.stop == Outcome::stopped && active_.was_stopped)) {
            return {*active_.stop, why_stopped()};
        }
        if (!context_.library_gone.empty()) {
            return {has_reported ? Outcome::failed : Outcome::no_result, context_.library_gone,
                    has_reported};
        }
        if (item_.signal != 0) {
            return {Outcome::failed,
                    fmt::format("died by {}{}{}", name_of_signal(item_.signal),
                                has_reported ? though_reported() : "", if_written_over())};
        }
        if (!has_reported || reporting_.lost) {
            return {Outcome::no_result, why_silent()};
        }
        if (active_.gathers && !active_.gatherer_end.empty() && !reporting_.gathering) {
            return {Outcome::failed, active_.gatherer_end + though_reported(), true};
        }
        if (active_.gathers && report_.progress != "100") {
            const bool has_ended = !active_.gatherer_end.empty();
            return {Outcome::failed,
                    fmt::format("the gatherer {} at progress {}{}{}", has_ended ? "ended" : "was",
                                one_line(report_.progress.value_or("0")),
                                has_ended ? "" : " after " + fine_duration(kForGathering.count()),
                                though_reported()),
                    true};
        }
        if (context_.fail_on_exit_status && item_.exit_status.value_or(0) != 0) {
            return {Outcome::failed, fmt::format("ended with exit status {}{}", *item_.exit_status,
                                                 though_reported())};
        }
        return by_report();
    }

  private:
    bool passes(const ItemReport &report) const
    {
        return report.result == std::to_string(context_.pass_code);
    }

    // For a report that does not decide the outcome.
    std::string though_reported() const
    {
        return fmt::format("{} {}", passes(report_) ? ", though it" : "; it had",
                           reported(report_));
    }

    const char *if_written_over() const
    {
        return reporting_.is_written_over() ? kOverwrittenAfter : "";
    }

    Verdict by_report() const
    {
        if (reporting_.is_beside_others() && reporting_.taken_back &&
            !(passes(report_) && passes(*reporting_.taken_back))) {
            return {Outcome::failed,
                    fmt::format("{}; a process with an old copy of the plan has then written back "
                                "what it had reported before",
                                reported(*reporting_.taken_back)),
                    true};
        }
        if (!passes(report_)) {
            return {Outcome::failed,
                    reported(report_) + (reporting_.overwritten ? kOverwrittenAfter : "")};
        }
        if (report_.progress != "100" && reporting_.is_uncertain()) {
            return {Outcome::failed,
                    fmt::format("it was last seen at progress {}: a process that has reported "
                                "meanwhile may have written over more with its old copy of the "
                                "plan",
                                one_line(report_.progress.value_or("-"))),
                    true};
        }
        if (context_.judge_limits && item_.measured.out > 0) {
            return {Outcome::failed, what_is_out(item_.measured) + though_reported(), true};
        }
        if (const std::string lost = what_is_lost(item_.measured);
            context_.judge_limits && !lost.empty()) {
            return {Outcome::failed, "limits cannot be judged" + though_reported() + ": " + lost,
                    true};
        }
        return {Outcome::passed};
    }

    std::string stopped_by() const
    {
        return context_.over_limit ? "--limit" : name_for_people(context_.signal);
    }

    std::string why_stopped() const
    {
        const auto limit = [this] { return fine_duration(context_.timeout->count()); };
        if (!active_.was_stopped && !context_.library_gone.empty()) {
            return fmt::format("past the limit of {}: {}", limit(), context_.library_gone);
        }
        const double seconds = *item_.seconds;
        if (!active_.was_stopped) {
            return fmt::format("{} after {}, past the limit of {}",
                               active_.gathers && active_.gatherer_end.empty() ? "reported"
                                                                               : "ended by itself",
                               fine_duration(seconds), limit());
        }
        const bool is_interrupted = active_.stop == Outcome::stopped;
        if (active_.killed) {
            return fmt::format("killed after {}, as it did not end when it was asked to{}{}",
                               is_interrupted ? "the run was interrupted by " + stopped_by()
                                              : duration(seconds),
                               active_.goes_on ? ", and goes on running" : "", if_written_over());
        }
        return is_interrupted
                   ? fmt::format("stopped by {}", stopped_by())
                   : fmt::format("stopped after {}{}", duration(seconds), if_written_over());
    }

    std::string why_silent() const
    {
        const auto suffix = vendor_suffix(context_.vendor);
        if (!suffix) {
            return fmt::format("vendor {} runs no item", context_.vendor);
        }
        const std::string program = program_of(item_.name, *suffix);
        if (is_plain_name(item_.name) && access(program.c_str(), X_OK) != 0) {
            return fmt::format("there is no program {}", one_line(program));
        }
        if (reporting_.overwritten) {
            return active_.gathers
                       ? "a process with an old copy of the plan has overwritten it, perhaps the "
                         "gatherer: let it report by a new process each time"
                       : "a process with an old copy of the plan has overwritten it, and nothing "
                         "was reported after that";
        }
        if (reporting_.in_another_plan) {
            return "another plan has been stored meanwhile, or saved by a process that still "
                   "had it";
        }
        if (reporting_.undone) {
            return "a process with an old copy of the plan has written over what it had reported";
        }
        if (!active_.gatherer_end.empty()) {
            return active_.gatherer_end;
        }
        if (reporting_.lost) {
            return fmt::format("what it reported is lost: the stored plan {}", kPlanLost);
        }
        const ParsedPlan &plan = parse_stored_plan();
        if (plan.text().empty()) {
            return "no report could be written: the stored plan is gone";
        }
        if (!plan.annotated()) {
            return "no report could be written: the stored plan is damaged";
        }
        std::string why;
        if (!plan.is_sound() && !Plan::load_as_library(plan.text(), &why)) {
            return fmt::format(
                "no report can be written any more: the stored plan does not load ({})",
                one_line(why));
        }
        if (reporting_.is_beside_others()) {
            return "no report is there: there was none, or a process that has reported meanwhile "
                   "has written over it with its old copy of the plan";
        }
        return active_.gathers
                   ? fmt::format("no result was reported within {}",
                                 fine_duration(context_.timeout.value_or(kForGathering).count()))
                   : "ended without reporting a result";
    }

    const RunningItem &active_;
    const RunningItem::Reporting &reporting_;
    const ItemRun &item_;
    const ItemReport &report_;
    const JudgeContext &context_;
};

} // namespace

Verdict judge(const RunningItem &active, const ItemRun &item, const JudgeContext &context)
{
    return Judge(active, item, context).verdict();
}

} // namespace fptest
