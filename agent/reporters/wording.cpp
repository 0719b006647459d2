// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/wording.h"

#include "util/text.h"
#include "util/times.h"

#include <algorithm>
#include <csignal>
#include <fmt/core.h>
#include <string_view>
#include <utility>

namespace fptest
{
namespace
{

constexpr std::size_t kOutputLines = 10;
constexpr std::size_t kOutputColumns = 200;
constexpr std::size_t kTableColumns = 80;

// "2 h", in the largest unit that gives a whole number.
std::string time_limit(double seconds)
{
    static constexpr std::pair<long long, const char *> kUnits[] = {
        {86400, "d"}, {3600, "h"}, {60, "min"}, {1, "s"}};
    const auto whole = static_cast<long long>(seconds);
    for (const auto &[size, unit] : kUnits) {
        if (static_cast<double>(whole) == seconds && whole % size == 0) {
            return fmt::format("{} {}", whole / size, unit);
        }
    }
    return fine_duration(seconds);
}

// "3 rounds", "rounds for 2 h or until an item fails"
std::string rounds(const Run &run)
{
    std::string text =
        run.rounds ? plural(static_cast<std::size_t>(*run.rounds), "round") : "rounds";
    if (run.rounds && !has_fixed_rounds(run)) {
        text = "at most " + text;
    }
    if (run.time_limit) {
        text += fmt::format(" for {}", time_limit(*run.time_limit));
    }
    if (run.until_fail) {
        text += run.time_limit ? " or until an item fails" : " until an item fails";
    }
    return text;
}

} // namespace

std::string heading(const Run &run)
{
    std::size_t items = 0;
    for (const Suite &suite : run.suites) {
        items += suite.items.size();
    }
    return fmt::format("{}: {}, vendor {}{}{}{}", one_line(run.plan), plural(items, "item"),
                       run.vendor, has_rounds(run) ? ", " + rounds(run) : "",
                       run.seed ? ", " + by_seed(run) : "",
                       run.resumed.empty() ? "" : ", resumed from " + one_line(run.resumed));
}

std::string by_seed(const Run &run)
{
    return fmt::format("shuffled with seed {}", run.seed.value_or(0));
}

std::vector<std::pair<std::string, std::string>> named_identity(const Run &run)
{
    auto all = run.identity.labels;
    all.emplace_back("fptest_version", FPTEST_VERSION);
    all.emplace_back("library_version", run.identity.library);
    all.emplace_back("plan_digest", run.identity.plan_digest);
    return run.identity.labels.empty() ? run.identity.labels : all;
}

std::string total(const Run &run)
{
    const auto [passed, failed] = tally(count(run));
    return passed + ", " + failed + rest_of_total(run);
}

std::pair<std::string, std::string> tally(const Counts &counts)
{
    return {fmt::format("{} passed", counts.passed), fmt::format("{} failed", counts.failed)};
}

std::string rest_of_total(const Run &run)
{
    const Counts counts = count(run);
    const std::string rest = has_ended(run) && (counts.not_run > 0 || !run.finished)
                                 ? fmt::format(", {} not run", counts.not_run)
                             : has_ended(run)        ? ""
                             : has_fixed_rounds(run) ? fmt::format(", {} to go", counts.not_run)
                                                     : fmt::format(", round {}", run.round);
    return fmt::format("{}{}, {}", tally_of_others(run), rest, duration(run.seconds));
}

std::string tally_of_others(const Run &run)
{
    const Counts counts = count(run);
    std::string text;
    if (run.retries > 0) {
        text = fmt::format(", {} flaky, {} {}", counts.flaky, counts.retries,
                           counts.retries == 1 ? "retry" : "retries");
    }
    if (run.has_expectations) {
        text += fmt::format(", {} failed as expected", counts.expected);
    }
    return text;
}

std::string not_finished(const Run &run)
{
    return run.finished ? "" : "not finished: " + one_line(run.why_unfinished);
}

std::string ended_early(const Run &run)
{
    return run.why_ended.empty() ? "" : "ended: " + one_line(run.why_ended);
}

std::string how_it_ended(const ItemRun &item)
{
    const bool was_ended = item.outcome == Outcome::timed_out || item.outcome == Outcome::stopped;
    if (item.signal != 0 && !(was_ended && item.signal == SIGTERM)) {
        return fmt::format("died by {}", name_of_signal(item.signal));
    }
    const int status = item.exit_status.value_or(0);
    return status != 0 ? fmt::format("exit status {}", status) : "";
}

std::string left_running(const ItemRun &item)
{
    std::string text;
    for (const Leftover &one : item.left_running) {
        text += fmt::format("{}{} (pid {})", text.empty() ? "" : ", ", one.name, one.process);
    }
    return text;
}

std::vector<Note> notes(const ItemRun &item)
{
    std::vector<Note> all;
    if (!item.left_running.empty()) {
        all.push_back({"left running: " + one_line(left_running(item)), true});
    }
    const auto &measured = item.measured.kept;
    std::vector<Note> lines;
    for (const Measurement &one : measured) {
        lines.push_back(
            {fmt::format("measured {}{}", text_of(one), is_out(one) ? ": out of limits" : ""),
             is_out(one)});
    }
    // if not all can be shown
    std::stable_partition(lines.begin(), lines.end(), [](const Note &one) { return one.is_bad; });
    const std::size_t shown = std::min(lines.size(), kOutputLines);
    all.insert(all.end(), lines.begin(), lines.begin() + static_cast<std::ptrdiff_t>(shown));
    if (const std::size_t rest = lines.size() + item.measured.left_out - shown; rest > 0) {
        all.push_back({fmt::format("({} more)", plural(rest, "measurement"))});
    }
    if (!item.directory.empty()) {
        std::string files;
        for (const std::string &file : item.files) {
            files += (files.empty() ? ": " : ", ") + one_line(file);
        }
        all.push_back({ellipsize("files in " + one_line(item.directory) + files, kOutputColumns)});
    }
    if (!item.warning.empty()) {
        all.push_back({"warning: " + one_line(item.warning), true});
    }
    return all;
}

std::string result_of(const ItemReport &report)
{
    return report.result_without_value ? "?" : one_line(report.result.value_or("-"));
}

std::string reported_result(const ItemReport &report)
{
    return has_result(report) ? fmt::format(", result {}", result_of(report)) : "";
}

std::string attempt_of(const Run &run, const ItemRun &item)
{
    return run.retries == 0
               ? ""
               : fmt::format("attempt {} of {}", item.earlier.size() + 1, run.retries + 1);
}

std::string remark(const ItemRun &item)
{
    const bool explained = item.outcome != Outcome::passed && item.outcome != Outcome::failed;
    std::string text = one_line(item.report.description.value_or(""));
    if (text.empty() && item.signal != 0 && !explained) {
        return {}; // how_it_ended() says it
    }
    if (explained || item.overruled || text.empty()) {
        text = one_line(item.reason) + (text.empty() || item.reason.empty() ? "" : ": ") + text;
    }
    return text;
}

std::string late_report(const Run &run, Place place, const ItemReport &report)
{
    const ItemRun &item = item_at(run, place);
    const std::string progress = !has_result(report) && report.progress
                                     ? fmt::format(", progress {}", one_line(*report.progress))
                                     : "";
    const std::string said = one_line(report.description.value_or(""));
    return fmt::format("{}: late report{}{}{}; it changes nothing", one_line(title(run, item)),
                       reported_result(report), progress, said.empty() ? "" : ": " + said);
}

std::vector<std::string> last_lines(std::string_view output)
{
    std::vector<std::string> lines;
    for (std::size_t at = 0; at < output.size();) {
        const std::size_t end = std::min(output.find('\n', at), output.size());
        std::string_view line = output.substr(at, end - at);
        if (line.ends_with('\r')) {
            line.remove_suffix(1);
        }
        lines.push_back(ellipsize(one_line(line), kOutputColumns));
        at = end + 1;
    }
    if (lines.size() > kOutputLines) {
        const std::size_t left_out = lines.size() - kOutputLines;
        lines.erase(lines.begin(), lines.end() - kOutputLines);
        lines.insert(lines.begin(), fmt::format("({} before)", plural(left_out, "line")));
    }
    return lines;
}

std::vector<std::string> last_lines(const ItemRun &item)
{
    std::string others;
    const std::string_view output = item.output;
    for (std::size_t at = 0; at < output.size();) {
        const std::size_t end = std::min(output.find('\n', at), output.size());
        if (!is_measurement(output.substr(at, end - at))) {
            others.append(output.substr(at, end + 1 - at));
        }
        at = end + 1;
    }
    return last_lines(others);
}

std::vector<std::string> summary_table(const Run &run)
{
    if (run.round == 1) {
        return {};
    }
    std::vector<std::vector<std::string>> rows = {{"ITEM", "PASSED", "LEAST", "MEDIAN", "LONGEST"}};
    for (const Summary &one : run.summary) {
        const DurationStats &times = one.times;
        rows.push_back({one_line(one.group) + "/" + one_line(one.name),
                        fmt::format("{} of {}", one.passed, times.count())});
        for (const double seconds : {times.least(), times.median(), times.longest()}) {
            rows.back().push_back(times.count() > 0 ? fine_duration(seconds) : "-");
        }
    }
    return aligned(rows, {false, true, true, true, true}, kTableColumns);
}

} // namespace fptest
