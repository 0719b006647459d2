// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/report_reader.h"

#include "module/stored_plan.h"
#include "plan/plan_text.h"
#include "util/text.h"

#include <algorithm>
#include <array>
#include <filesystem>
#include <iterator>
#include <string_view>
#include <sys/inotify.h>
#include <unistd.h>
#include <utility>

namespace fptest
{
namespace
{

constexpr std::chrono::milliseconds kLongestPause(25);
constexpr std::size_t kSeen = 100; // reports kept for an item
constexpr std::string_view kPlanName =
    std::string_view(kStoredPlan).substr(std::string_view(kStoredPlan).rfind('/') + 1);

} // namespace

ItemReport report_of(const Plan &plan, std::size_t number)
{
    ItemReport report = plan.report(number);
    if (report.description) {
        report.description = sanitize_xml(*report.description);
    }
    if (report.result == "") {
        report.result.reset();
        report.result_without_value = true;
    }
    return report;
}

bool is_same(const ItemReport &one, const ItemReport &other)
{
    return one.progress == other.progress && one.result == other.result &&
           one.result_without_value == other.result_without_value &&
           one.description.value_or("") == other.description.value_or("");
}

namespace
{

// Then whoever has saved the plan has reported for this element.
bool is_only_report(const Plan &plan, std::size_t number)
{
    for (std::size_t other = 0; other < plan.elements().size(); ++other) {
        if (other != number && !is_same(report_of(plan, other), ItemReport{})) {
            return false;
        }
    }
    return true;
}

bool is_among(const std::vector<ItemReport> &reports, const ItemReport &report)
{
    return std::ranges::any_of(reports,
                               [&](const ItemReport &one) { return is_same(one, report); });
}

// False if another plan has been stored meanwhile.
bool is_item(const Plan &plan, std::size_t number, const std::string &name)
{
    if (number >= plan.elements().size()) {
        return false;
    }
    const char *found = mxmlElementGetAttr(plan.elements()[number], "name");
    return found != nullptr && name == found;
}

// Fast, as it is asked of every item that has run after each report.
bool says(const Plan &plan, std::size_t number, const ItemReport &report)
{
    const auto is = [&](const char *name, const std::optional<std::string> &value) {
        const char *found = mxmlElementGetAttr(plan.elements()[number], name);
        return found != nullptr ? value == found : !value;
    };
    return is("progress", report.progress) && is("result", report.result) &&
           is("description", report.description);
}

// An element without the mark was saved from an old copy of the plan.
bool bears_mark(const Plan &plan, std::size_t number, const std::string &mark)
{
    const char *found = mxmlElementGetAttr(plan.elements()[number], kMark);
    return mark.empty() || (found != nullptr && mark == found);
}

} // namespace

ReportReader::ReportReader(Run &run, const std::vector<Reporter *> &reporters, RunningJob &running)
    : run_(run), reporters_(reporters), running_(running),
      saves_(inotify_init1(IN_NONBLOCK | IN_CLOEXEC))
{
    const std::string folder = std::filesystem::path(kStoredPlan).parent_path();
    inotify_add_watch(saves_.get(), folder.c_str(), IN_CLOSE_WRITE | IN_MOVED_TO);
}

void ReportReader::poll(When when)
{
    is_saved_ = take_saves() || is_saved_;
    const auto status = stored_plan_status();
    if ((running_.items.empty() && judged_.empty()) || !status ||
        (when != When::at_once && std::chrono::steady_clock::now() < next_look_) ||
        (!is_saved_ && status->st_mtim.tv_sec == plan_status_.st_mtim.tv_sec &&
         status->st_mtim.tv_nsec == plan_status_.st_mtim.tv_nsec &&
         status->st_size == plan_status_.st_size && status->st_ino == plan_status_.st_ino)) {
        return;
    }
    const auto begin = std::chrono::steady_clock::now();
    is_saved_ = false;
    const ParsedPlan &parsed = parse_stored_plan();
    if (const auto plan = parsed.annotated()) {
        plan_status_ = *status;
        changed_ = std::chrono::seconds(status->st_mtim.tv_sec) +
                   std::chrono::nanoseconds(status->st_mtim.tv_nsec);
        const bool is_sound = parsed.is_sound();
        read(plan);
        if (!is_sound) {
            mend_stored_plan(); // or nobody else could report
        }
    }
    const auto end = std::chrono::steady_clock::now();
    next_look_ = end + std::min<std::chrono::nanoseconds>(end - begin, kLongestPause);
}

// Whether the plan has been saved since. Two saves in one tick of the clock of files may
// leave the same time and size.
bool ReportReader::take_saves()
{
    alignas(inotify_event) std::array<char, 4096> told{};
    bool found = false;
    for (ssize_t got = 0; (got = ::read(saves_.get(), told.data(), told.size())) > 0;) {
        for (std::size_t at = 0; at < static_cast<std::size_t>(got);) {
            const auto *event = reinterpret_cast<const inotify_event *>(&told[at]);
            found = found || (event->mask & IN_Q_OVERFLOW) != 0 ||
                    (event->len > 0 && kPlanName == event->name);
            at += sizeof *event + event->len;
        }
    }
    return found;
}

void ReportReader::read(const std::shared_ptr<const Plan> &plan)
{
    if (!plan) {
        return;
    }
    ++poll_count_;
    for (RunningItem &active : running_.items) {
        read_report(active, *plan);
    }
    for (Judged &judged : judged_) {
        read_late_report(judged, *plan);
    }
    if (std::exchange(marks_are_gone_, false)) {
        std::vector<std::size_t> numbers = running_.job.elements(running_.next);
        for (const RunningItem &active : running_.items) {
            if (active.reporting.overwritten) {
                numbers.push_back(active.element);
            }
        }
        mark_again(numbers, running_.job.mark);
    }
}

// What an old copy of the plan says of items is older than this run of them. But a gatherer
// always saves an old copy: a new report in it is its own.
bool ReportReader::is_stale(RunningItem &active, const Plan &plan, const ItemReport &report)
{
    if (bears_mark(plan, active.element, running_.job.mark)) {
        reports_for_others_ =
            reports_for_others_ || (active.gathers && running_.items.size() == 1 &&
                                    has_news_of_others(plan, active.element));
        return false;
    }
    marks_are_gone_ = true;
    if (!active.gathers || !has_result(report)) {
        return true;
    }
    active.reporting.from_a_copy = active.reporting.from_a_copy || !is_among(gathered_, report) ||
                                   is_saved_as_before(plan, active.element);
    return !active.reporting.from_a_copy;
}

std::chrono::nanoseconds ReportReader::since_change() const
{
    using namespace std::chrono;
    // somebody may set the clock
    return std::clamp<nanoseconds>(system_clock::now().time_since_epoch() - changed_, 0ns, 1s);
}

void ReportReader::begin_gathering()
{
    if (running_.items.empty() || !running_.items.back().gathers) {
        return;
    }
    RunningItem &active = running_.items.back();
    if (!active.gatherer_end.empty() || active.stop) {
        return; // the command was released in its place
    }
    active.reporting.expected = true;
    active.reporting.gathering = true;
    const auto plan = whole_stored_plan().annotated;
    if (!plan || !is_item(*plan, active.element, item_at(run_, active.place).name)) {
        return;
    }
    const ItemReport report = report_of(*plan, active.element);
    if (active.starts_gatherer) {
        gathered_.clear(); // a new process has no copy of them
        item_at(run_, active.place).report = {};
        active.reporting.seen.clear();
        active.reporting.taken_back.reset();
    } else if (has_result(report) &&
               (!is_among(gathered_, report) || is_saved_as_before(*plan, active.element))) {
        report_late(active.place, true, gathered_in_ != 0 ? gathered_in_ : run_.round, report);
    }
    const bool has_mark = bears_mark(*plan, active.element, running_.job.mark);
    if (has_result(report) || !has_mark) {
        // if the mark is still there, reports for later items count
        auto numbers = has_mark ? std::vector<std::size_t>() : running_.job.elements(running_.next);
        numbers.push_back(active.element);
        mark_again(numbers, running_.job.mark);
    }
    active.reporting.overwritten = false;
}

// In the round in which the item ran.
void ReportReader::report_late(const Place &place, bool gathers, int round,
                               const ItemReport &report)
{
    for (RunningItem &active : running_.items) {
        active.reporting.other_changed_at_poll = poll_count_;
    }
    const int now = std::exchange(run_.round, round);
    const TimedReport late{report, std::chrono::system_clock::now()};
    for (Reporter *reporter : reporters_) {
        reporter->late(run_, place, late);
    }
    run_.round = now;
    if (gathers) {
        note_gathered(report);
    }
}

void ReportReader::note_gathered(const std::string &text, int vendor)
{
    const auto plan = ParsedPlan(text).annotated();
    for (std::size_t number = 0; plan && number < plan->elements().size(); ++number) {
        const char *name = mxmlElementGetAttr(plan->elements()[number], "name");
        const ItemReport report = report_of(*plan, number);
        if (name != nullptr && is_gatherer(name, vendor)) {
            note_gathered(report);
        }
        known_.resize(std::max(known_.size(), number + 1));
        if (!is_among(known_[number], report)) {
            known_[number].push_back(report);
        }
        if (known_[number].size() > kSeen) {
            known_[number].erase(known_[number].begin());
        }
    }
}

// Whether somebody has reported for another element than the gatherer's, since its job began.
bool ReportReader::has_news_of_others(const Plan &plan, std::size_t element) const
{
    for (std::size_t other = 0; other < plan.elements().size(); ++other) {
        const ItemReport report = report_of(plan, other);
        if (other != element && !is_same(report, ItemReport{}) &&
            (other >= known_.size() || !is_among(known_[other], report))) {
            return true;
        }
    }
    return false;
}

// A gatherer that reports from its own copy of the plan saves the same text again if it has
// the same to say. If it reports for other items as well, or they run beside it, that may be
// for one of them. What an item left running has a copy with that item's mark.
bool ReportReader::is_saved_as_before(const Plan &plan, std::size_t element) const
{
    const bool is_of_this_round = std::ranges::any_of(judged_, [&](const Judged &judged) {
        return !judged.gathers && !judged.mark.empty() &&
               bears_mark(plan, judged.element, judged.mark);
    });
    return is_only_report(plan, element) ||
           (!is_of_this_round && !reports_for_others_ && running_.job.targets.size() == 1 &&
            !has_news_of_others(plan, element));
}

void ReportReader::watch_for_late_reports(RunningItem &active)
{
    const ItemReport &report = item_at(run_, active.place).report;
    if (active.gathers) {
        note_gathered(report);
        gathered_in_ = run_.round;
    }
    judged_.push_back({active.place, active.element, active.gathers, running_.job.mark, run_.round,
                       std::move(active.reporting.seen)});
    judged_.back().seen.push_back(report);
}

void ReportReader::forget(const Job &job)
{
    const auto elements = job.elements();
    std::erase_if(judged_, [&](const Judged &judged) {
        return std::ranges::find(elements, judged.element) != elements.end();
    });
}

void ReportReader::forget_round()
{
    // its copy of the plan has its last report
    if (gathered_.size() > 1) {
        gathered_.erase(gathered_.begin(), std::prev(gathered_.end()));
    }
    std::erase_if(judged_, [](const Judged &judged) { return !judged.gathers; });
}

void ReportReader::note_gathered(const ItemReport &report)
{
    if (has_result(report)) {
        std::erase_if(gathered_, [&](const ItemReport &one) { return is_same(one, report); });
        gathered_.push_back(report);
    }
}

void ReportReader::read_report(RunningItem &active, const Plan &plan)
{
    const std::size_t number = active.element;
    active.reporting.in_another_plan = !is_item(plan, number, item_at(run_, active.place).name);
    if (active.done || active.reporting.in_another_plan || !active.reporting.expected) {
        return;
    }
    ItemRun &result = item_at(run_, active.place);
    ItemReport report = report_of(plan, number);
    if (is_stale(active, plan, report)) {
        active.reporting.overwritten = true;
        return;
    }
    if (is_same(report, result.report) ||
        // it was done, and what follows is late
        (active.reporting.gathering && has_finished(result.report) && !has_finished(report)) ||
        (active.reporting.overwritten && !has_result(report))) { // as it was cleared
        return;
    }
    active.reporting.overwritten = false;
    active.reporting.undone = has_result(result.report) && !has_result(report);
    if (!is_among(active.reporting.seen, report) ||
        (active.reporting.taken_back && is_same(report, *active.reporting.taken_back))) {
        active.reporting.taken_back.reset();
    } else if (!active.reporting.taken_back) {
        active.reporting.taken_back = result.report;
    }
    if (active.reporting.seen.size() == kSeen) {
        active.reporting.seen.erase(active.reporting.seen.begin());
    }
    active.reporting.seen.push_back(std::exchange(result.report, std::move(report)));
    active.reporting.changed_at_poll = poll_count_;
    for (RunningItem &other : running_.items) {
        if (other.place != active.place) {
            other.reporting.other_changed_at_poll = poll_count_;
        }
    }
    for (Reporter *reporter : reporters_) {
        reporter->progressed(run_, active.place);
    }
}

void ReportReader::read_late_report(Judged &judged, const Plan &plan)
{
    const std::size_t number = judged.element;
    if (!is_item(plan, number, item_at(run_, judged.place).name)) {
        return;
    }
    const auto &items = running_.items;
    if (std::ranges::find(items, judged.place, &RunningItem::place) != items.end()) {
        plan_status_ = {}; // its end is announced first: read again then
        return;
    }
    if (says(plan, number, judged.seen.back())) {
        return;
    }
    const ItemReport report = report_of(plan, number);
    const bool keeps_copy = judged.gathers && (!is_among(gathered_, report) ||
                                               is_saved_as_before(plan, judged.element));
    if (!bears_mark(plan, judged.element, judged.mark) && !keeps_copy) {
        return;
    }
    if (!has_result(report) || is_among(judged.seen, report)) {
        return;
    }
    judged.seen.push_back(report);
    report_late(judged.place, judged.gathers, judged.round, report);
}

} // namespace fptest
