// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/reporters.h"

#include "reporters/wording.h"
#include "reporters/writer.h"
#include "util/text.h"
#include "util/times.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <fmt/core.h>
#include <optional>
#include <string_view>
#include <utility>
#include <vector>

namespace fptest
{

namespace
{

constexpr char kIndent[] = "    "; // of a subtest

std::string tap_escaped(std::string_view text)
{
    static constexpr Replacement kEscapes[] = {{"#", "\\#"}, {"\\", "\\\\"}};
    return replaced(one_line(text), kEscapes);
}

// A text between double quotes, as both YAML and JSON read it. YAML does not allow
// some characters that a clean text may hold, or breaks the line at them.
std::string yaml_quoted(std::string_view text)
{
    static constexpr Replacement kEscapes[] = {
        {"\"", "\\\""},
        {"\\", "\\\\"},
        {"\n", "\\n"},
        {"\r", "\\r"},
        {"\t", "\\t"},
        {"\u2028", "\\u2028"},
        {"\u2029", "\\u2029"},
        {"\uFEFF", "\\uFEFF"},
        {"\xEF\xBF\xBE", "\\uFFFE"},
        {"\xEF\xBF\xBF", "\\uFFFF"},
    };
    // Perl's YAML reader rejects longer ones
    constexpr std::size_t kLongest = 60000;
    constexpr std::size_t kKept = 10000;
    const std::string whole = '"' + replaced(sanitize_utf8(text), kEscapes) + '"';
    return whole.size() <= kLongest ? whole : yaml_quoted(ellipsize(sanitize_utf8(text), kKept));
}

std::string plan_line(std::size_t points)
{
    return fmt::format("1..{}{}\n", points, points == 0 ? " # SKIP nothing to run" : "");
}

std::string point(bool ok, std::size_t number, const std::string &name)
{
    return fmt::format("{} {} - {}", ok ? "ok" : "not ok", number, tap_escaped(name));
}

std::string skipped(const Run &run)
{
    const std::string &why = why_not_all(run);
    return " # SKIP not run" + (why.empty() ? "" : ": " + tap_escaped(why));
}

std::string entry(const char *name, const std::string &value)
{
    return fmt::format("{}  {}: {}\n", kIndent, name, value);
}

std::string entry(const char *name, const std::optional<std::string> &text)
{
    return text ? entry(name, yaml_quoted(*text)) : "";
}

// The head of a list; each entry's first line begins with "  - ".
std::string list(const char *name, bool is_empty)
{
    return is_empty ? "" : fmt::format("{}  {}:\n", kIndent, name);
}

// What it has measured and left in files, in the YAML that Perl's reader of TAP knows.
std::string notes_of(const ItemRun &item)
{
    std::string text = list("measurements", item.measured.kept.empty());
    for (const Measurement &one : item.measured.kept) {
        const auto value = [&text](const char *name, const std::optional<double> &number) {
            text += number ? entry(name, fmt::format("{}", *number)) : "";
        };
        text += entry("  - name", yaml_quoted(one.name));
        value("    value", one.value);
        if (!one.unit.empty()) {
            text += entry("    unit", yaml_quoted(one.unit));
        }
        value("    low", one.low);
        value("    high", one.high);
    }
    if (!item.directory.empty()) {
        text += entry("directory", yaml_quoted(item.directory));
    }
    text += list("files", item.files.empty());
    for (const std::string &file : item.files) {
        text += entry("  - path", yaml_quoted(file));
    }
    if (!item.warning.empty()) {
        text += entry("warning", yaml_quoted(item.warning));
    }
    return text;
}

// What is known of an item that has been run.
std::string diagnosis(const Run &run, const ItemRun &item)
{
    const ItemReport &report = item.report;
    const std::string left = left_running(item);
    std::string text = std::string(kIndent) + "  ---\n";
    text += entry("outcome", yaml_quoted(word(item.outcome)));
    if (!item.reason.empty()) {
        text += entry("reason", yaml_quoted(item.reason));
    }
    if (run.retries > 0) {
        text += entry("attempts", std::to_string(item.earlier.size() + 1));
    }
    text += entry("progress", report.progress);
    text += report.result_without_value ? entry("result", yaml_quoted(""))
                                        : entry("result", report.result);
    text += entry("description", report.description);
    if (item.seconds) {
        text += entry("duration_ms", std::to_string(std::llround(*item.seconds * 1000)));
    }
    if (item.exit_status) {
        text += entry("exit_status", std::to_string(*item.exit_status));
    }
    if (item.signal != 0) {
        text += entry("signal", yaml_quoted(name_of_signal(item.signal)));
    }
    if (!left.empty()) {
        text += entry("left_running", yaml_quoted(left));
    }
    return text + notes_of(item) + kIndent + "  ...\n";
}

std::string directive(const Run &run, const ItemRun &item)
{
    switch (item.outcome) {
    case Outcome::not_run:
        return skipped(run);
    case Outcome::expected:
        return " # TODO " + tap_escaped(item.expected);
    case Outcome::flaky:
    case Outcome::unexpected:
        return fmt::format(" # {}", word(item.outcome));
    default:
        return "";
    }
}

std::string item_point(const Run &run, const ItemRun &item, std::size_t number)
{
    const bool ran = item.outcome != Outcome::not_run;
    const bool ok = !ran || (is_success(item.outcome) && item.outcome != Outcome::expected);
    return fmt::format("{}{}{}\n{}", kIndent, point(ok, number, item.name), directive(run, item),
                       ran ? diagnosis(run, item) : "");
}

std::string suite_point(const Run &run, const Suite &suite, std::size_t number)
{
    const Counts counts = count(suite.items);
    std::string text = point(counts.failed == 0, number, title(run, suite));
    if (suite.items.empty()) {
        text += " # SKIP nothing to run";
    } else if (counts.not_run == suite.items.size()) {
        text += skipped(run);
    }
    return text + "\n";
}

class TapReporter : public Reporter
{
  public:
    explicit TapReporter(std::FILE *stream) : writer_("the TAP output", fileno(stream))
    {
    }

    void begin(const Run &run) override
    {
        begin_round(run);
        // Perl's Test::Harness, common on benches, refuses version 14 up to its 3.44. The
        // rest is the same: to version 13 a subtest is lines that it ignores.
        const bool harness = std::getenv("HARNESS_ACTIVE") != nullptr;
        write(harness ? "TAP version 13\n" : "TAP version 14\n");
        if (has_fixed_rounds(run)) {
            write(plan_line(run.suites.size() * static_cast<std::size_t>(*run.rounds)));
        }
        for (const auto &[name, value] : named_identity(run)) {
            write(comment(fmt::format("{}: {}", name, one_line(value))));
        }
        if (run.seed) {
            write(comment(by_seed(run)));
        }
        if (!run.resumed.empty()) {
            write(comment("resumed from " + one_line(run.resumed)));
        }
    }

    void started(const Run &run, Place place) override
    {
        begun_ = std::max(begun_, place.suite + 1);
        write(next_lines(run, false));
    }

    void ended(const Run &run, Place place) override
    {
        begun_ = std::max(begun_, place.suite + 1);
        ended_[place.suite][place.item] = true;
        write(next_lines(run, false));
    }

    void retried(const Run &run, Place place) override
    {
        const ItemRun &item = item_at(run, place);
        const std::string said = remark(item);
        write((open_ ? kIndent : "") +
              comment(fmt::format("{}: {}: {}{}{}", one_line(title(run, item)),
                                  attempt_of(run, item), word(item.outcome),
                                  reported_result(item.report), said.empty() ? "" : ": " + said)));
    }

    void late(const Run &run, Place place, const TimedReport &report) override
    {
        write((open_ ? kIndent : "") + comment(late_report(run, place, report)));
    }

    void round_over(const Run &run) override
    {
        write(next_lines(run, true));
        begin_round(run);
    }

    void finish(const Run &run) override
    {
        const Counts counts = count(run);
        const auto [passed, failed] = tally(counts);
        std::string text = next_lines(run, true);
        if (run.finished && !has_fixed_rounds(run)) {
            text += plan_line(points_);
        }
        for (const std::string &line : summary_table(run)) {
            text += comment(line);
        }
        text += comment(fmt::format("{}, {}{}, {} not run in {}", passed, failed,
                                    tally_of_others(run), counts.not_run, duration(run.seconds)));
        if (!run.finished) {
            text += fmt::format("Bail out!  {}\n", run.why_unfinished.empty()
                                                       ? "the run did not finish"
                                                       : one_line(run.why_unfinished));
        }
        write(text);
    }

    bool flush() override
    {
        return !writer_.is_pending();
    }

    std::string failure() const override
    {
        return writer_.failure();
    }

  private:
    static std::string comment(const std::string &text)
    {
        return fmt::format("# {}\n", text);
    }

    void begin_round(const Run &run)
    {
        ended_.clear();
        for (const Suite &suite : run.suites) {
            ended_.emplace_back(suite.items.size(), false);
        }
        begun_ = 0;
        suite_ = 0;
    }

    // The lines that are due. Points keep the order of the plan, or a harness complains:
    // an item that ends early waits for those before it.
    std::string next_lines(const Run &run, bool all)
    {
        std::string text;
        while (suite_ < run.suites.size() && (all || suite_ < begun_)) {
            const Suite &suite = run.suites[suite_];
            if (!std::exchange(open_, true)) {
                text += fmt::format("# Subtest: {}\n", tap_escaped(title(run, suite)));
                text += kIndent + plan_line(suite.items.size());
            }
            for (; item_ < suite.items.size() && (all || ended_[suite_][item_]); ++item_) {
                text += item_point(run, suite.items[item_], item_ + 1);
            }
            // the round's last point waits until all that items left running has ended
            if (item_ < suite.items.size() || (!all && suite_ + 1 == run.suites.size())) {
                break;
            }
            text += suite_point(run, suite, ++points_);
            ++suite_;
            item_ = 0;
            open_ = false;
        }
        return text;
    }

    void write(const std::string &text)
    {
        if (!text.empty()) {
            writer_.write(text);
        }
    }

    Writer writer_;
    std::vector<std::vector<bool>> ended_;
    std::size_t points_ = 0; // of suites, written
    std::size_t begun_ = 0;  // suites of the round
    std::size_t suite_ = 0;  // the next point to be written
    std::size_t item_ = 0;
    bool open_ = false; // its subtest
};

} // namespace

std::unique_ptr<Reporter> make_tap_reporter(std::FILE *stream)
{
    return std::make_unique<TapReporter>(stream);
}

} // namespace fptest
