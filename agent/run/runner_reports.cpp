// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the runner learns of items from the stored plan: their reports while they run, and
// those that come late.
#include "run/runner.h"

#include "module/stored_plan.h"
#include "plan/plan_text.h"
#include "util/failure.h"

#include <algorithm>
#include <sys/stat.h>
#include <utility>

namespace fptest
{
namespace
{

using namespace std::chrono_literals;

constexpr std::size_t kSeen = 100; // reports that are kept of an item

// A gatherer that is being started may not be there yet.
constexpr auto kBeforeMissed = 500ms;
constexpr auto kBetweenPolls = 250ms;

// As it reads once the plan has been made loadable.
ItemReport as_made_loadable(ItemReport report)
{
    if (report.result_without_value) {
        report.result_without_value = false;
        report.result = "";
    }
    report.description = report.description.value_or("");
    return report;
}

// Whether that element is the item still, and not one of another plan.
bool is_item(const Plan &plan, std::size_t number, const std::string &name)
{
    if (number >= plan.elements().size()) {
        return false;
    }
    const char *found = mxmlElementGetAttr(plan.elements()[number], "name");
    return found != nullptr && name == found;
}

// One without it is as a process with an old copy of the plan has written it.
bool bears_mark(const Plan &plan, const Job::Target &target)
{
    const char *found = mxmlElementGetAttr(plan.elements()[target.element], kMark);
    return target.mark.empty() || (found != nullptr && target.mark == found);
}

} // namespace

// Reads the plan where it has changed; one that is being written is left for the
// next time.
void Runner::poll_reports()
{
    struct stat status {
    };
    if ((!active_.empty() || !judged_.empty()) && stat(kStoredPlan, &status) == 0 &&
        S_ISREG(status.st_mode) &&
        (status.st_mtim.tv_sec != plan_status_.st_mtim.tv_sec ||
         status.st_mtim.tv_nsec != plan_status_.st_mtim.tv_nsec ||
         status.st_size != plan_status_.st_size || status.st_ino != plan_status_.st_ino)) {
        const std::string text = read_stored_plan().value_or("");
        if (const auto plan = Plan::parse_annotated(text)) {
            plan_status_ = status;
            read_reports(plan);
            if (!Plan::load_as_library(text)) {
                mend_stored_plan(); // or who reports next could not
            }
        }
    }
    for (RunningItem &active : active_) {
        poll_gatherer(active);
        const ItemReport &report = item(active.place).report;
        const bool has_ended = report.progress == "100" && has_result(report);
        if (active.moved_on && !active.done &&
            (has_ended || !active.gatherer_end.empty() ||
             (!limits_.item && now() - active.moved_on_at > kForGathering))) {
            finish(active, now());
        }
    }
}

// Without it the library would wait at its port without end, and what has died
// reports no more.
void Runner::poll_gatherer(RunningItem &active)
{
    if (active.done || !active.gatherer_end.empty() || !gathers(active) ||
        now() - active.gatherer_looked_for < kBetweenPolls) {
        return;
    }
    active.gatherer_looked_for = now();
    active.gatherer_missed = library_.processes().has_gatherer() ? 0 : active.gatherer_missed + 1;
    if (active.gatherer_missed < 2 || now() - active.start < kBeforeMissed) {
        return;
    }
    active.gatherer_end = active.moved_on ? "the gatherer ended before it had reported"
                                          : "the gatherer ended before it connected";
    if (!active.moved_on) {
        release_command();
    }
}

void Runner::read_reports(const std::optional<Plan> &plan)
{
    if (!plan) {
        return;
    }
    for (RunningItem &active : active_) {
        read_report(active, *plan);
    }
    for (Judged &judged : judged_) {
        read_late_report(judged, *plan);
    }
    if (std::exchange(marks_are_gone_, false)) {
        mark_again();
    }
}

// What a process with an old copy of the plan says of items is older than they are. A
// gatherer's own copy is always old: what is new in it is what it has to report.
bool Runner::is_older(RunningItem &active, const Plan &plan, const ItemReport &report)
{
    if (bears_mark(plan, active.target)) {
        return false;
    }
    marks_are_gone_ = true;
    if (!gathers(active) || !has_result(report)) {
        return true;
    }
    active.keeps_copy = active.keeps_copy || !was_gathered(report);
    return !active.keeps_copy;
}

// So that what is reported from now on counts again. What is there is cleared.
void Runner::mark_again()
{
    std::vector<std::size_t> numbers;
    std::string mark;
    for (RunningItem &active : active_) {
        if (active.overwritten) {
            numbers.push_back(active.target.element);
            mark = active.target.mark;
        }
    }
    for (std::size_t at = next_; at < job_.targets.size(); ++at) {
        if (const auto &target = job_.targets[at]) {
            numbers.push_back(target->element);
            mark = target->mark;
        }
    }
    if (numbers.empty()) {
        return;
    }
    const Descriptor lock = lock_stored_plan();
    try {
        if (const auto marked = without_reports(whole_stored_plan(), numbers, mark)) {
            replace_stored_plan(*marked);
        }
    } catch (const Failure &) {
        return; // the disk is full
    }
}

// The gatherer is about to be told: what is there is of an earlier gathering.
void Runner::begin_gathering()
{
    if (!active_.empty() && gathers(active_.back())) {
        RunningItem &active = active_.back();
        active.told = true;
        const std::size_t number = active.target.element;
        const auto plan = Plan::parse_annotated(whole_stored_plan());
        if (plan && is_item(*plan, number, item(active.place).name)) {
            const ItemReport report = plan->report(number);
            if (has_result(report) && !was_gathered(report)) {
                tell_late(active.place, gathered_in_ != 0 ? gathered_in_ : run_.round, report);
            }
            active.overwritten = has_result(report) || !bears_mark(*plan, active.target);
            if (active.overwritten) {
                mark_again();
            }
            active.overwritten = false;
        }
    }
    library_.go_on();
}

// As of the round of its item.
void Runner::tell_late(const Place &place, int round, const ItemReport &report)
{
    const int now = std::exchange(run_.round, round);
    for (Listener *listener : listeners_) {
        listener->late(run_, place, report);
    }
    run_.round = now;
    if (is_gatherer(item(place).name, vendor_)) {
        note_gathered(report);
    }
}

void Runner::note_earlier_plan(const std::string &text)
{
    const auto plan = Plan::parse_annotated(text);
    for (std::size_t number = 0; plan && number < plan->elements().size(); ++number) {
        const char *name = mxmlElementGetAttr(plan->elements()[number], "name");
        if (name != nullptr && is_gatherer(name, vendor_)) {
            note_gathered(plan->report(number));
        }
    }
}

void Runner::note_gathered(const ItemReport &report)
{
    if (has_result(report)) {
        std::erase(gathered_, as_made_loadable(report));
        gathered_.push_back(as_made_loadable(report));
    }
}

bool Runner::was_gathered(const ItemReport &report) const
{
    return std::ranges::find(gathered_, as_made_loadable(report)) != gathered_.end();
}

void Runner::read_report(RunningItem &active, const Plan &plan)
{
    const std::size_t number = active.target.element;
    active.in_another_plan = !is_item(plan, number, item(active.place).name);
    if (active.done || active.in_another_plan || (gathers(active) && !active.told)) {
        return;
    }
    ItemRun &result = item(active.place);
    ItemReport report = plan.report(number);
    if (report.result == "") { // it has been made loadable already
        report.result.reset();
        report.result_without_value = true;
    }
    if (is_older(active, plan, report)) {
        active.overwritten = true;
        return;
    }
    if (as_made_loadable(report) == as_made_loadable(result.report) ||
        (active.overwritten && !has_result(report))) { // as it was cleared
        return;
    }
    active.overwritten = false;
    active.undone = result.report.result && !report.result;
    if (active.seen.size() == kSeen) {
        active.seen.erase(active.seen.begin());
    }
    active.seen.push_back(std::exchange(result.report, std::move(report)));
    for (Listener *listener : listeners_) {
        listener->progressed(run_, active.place);
    }
}

void Runner::read_late_report(Judged &judged, const Plan &plan)
{
    const std::size_t number = judged.target.element;
    if (!is_item(plan, number, item(judged.place).name)) {
        return;
    }
    const auto is_same = [&](const RunningItem &active) {
        return active.place.suite == judged.place.suite && active.place.item == judged.place.item;
    };
    if (std::ranges::any_of(active_, is_same)) {
        plan_status_ = {}; // its end is told first: look again then
        return;
    }
    const ItemReport report = plan.report(number);
    const bool keeps_copy = is_gatherer(item(judged.place).name, vendor_) && !was_gathered(report);
    if (!bears_mark(plan, judged.target) && !keeps_copy) {
        return;
    }
    const auto is_report = [&](const ItemReport &one) {
        return as_made_loadable(one) == as_made_loadable(report);
    };
    if (!has_result(report) || std::ranges::any_of(judged.seen, is_report)) {
        return;
    }
    judged.seen.push_back(report);
    tell_late(judged.place, judged.round, report);
}

} // namespace fptest
