// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/junit_document.h"

#include "reporters/reporters.h"
#include "reporters/wording.h"
#include "util/text.h"
#include "util/times.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cmath>
#include <fmt/core.h>
#include <optional>
#include <string_view>

namespace fptest
{

namespace
{

// --- XML ---------------------------------------------------------------------

// Readers turn tabs and line feeds in attributes into blanks.
std::string attribute(const char *name, std::string_view value)
{
    static constexpr Replacement kEscapes[] = {{"\t", "&#9;"}, {"\n", "&#10;"}};
    return fmt::format(" {}=\"{}\"", name, replaced(xml_escaped(value), kEscapes));
}

std::string attribute(const char *name, std::size_t value)
{
    return fmt::format(" {}=\"{}\"", name, value);
}

std::string time_attribute(double seconds)
{
    const long long milliseconds = std::llround(seconds * 1000);
    return fmt::format(" time=\"{}.{:03}\"", milliseconds / 1000, milliseconds % 1000);
}

// In whole seconds and without a zone, as the format wants.
std::string timestamp_attribute(std::chrono::system_clock::time_point time)
{
    return attribute("timestamp", timestamp(time).substr(0, 19));
}

std::string property(const std::string &indent, const char *name,
                     const std::optional<std::string> &value)
{
    return value ? fmt::format("{}<property{}{}/>\n", indent, attribute("name", name),
                               attribute("value", *value))
                 : "";
}

std::string hostname_attribute(const Run &run)
{
    for (const auto &[key, value] : run.identity.labels) {
        if (key == "device") {
            return attribute("hostname", value);
        }
    }
    return {};
}

std::string properties(const std::string &indent, const std::string &inside)
{
    return inside.empty() ? ""
                          : fmt::format("{0}<properties>\n{1}{0}</properties>\n", indent, inside);
}

// --- its pieces --------------------------------------------------------------

void add(TestCounts &tests, const Run &run, const Suite &suite)
{
    for (const ItemRun &item : suite.items) {
        ++tests.all;
        switch (item.outcome) {
        case Outcome::passed:
        case Outcome::flaky:
            break;
        case Outcome::expected:
            ++tests.skipped;
            break;
        case Outcome::not_run:
            ++(run.finished ? tests.skipped : tests.errors);
            break;
        case Outcome::failed:
        case Outcome::unexpected:
            ++tests.failures;
            break;
        case Outcome::no_result:
        case Outcome::timed_out:
        case Outcome::stopped:
            ++tests.errors;
            break;
        }
    }
}

std::string attributes(const TestCounts &tests)
{
    return attribute("tests", tests.all) + attribute("failures", tests.failures) +
           attribute("errors", tests.errors) + attribute("skipped", tests.skipped);
}

// What is known of an item that has not passed, for readers that show no properties.
std::string details(const ItemRun &item)
{
    const ItemReport &report = item.report;
    std::string text;
    if (report.result) {
        text += fmt::format("result: {}\n", *report.result);
    }
    if (report.progress) {
        text += fmt::format("progress: {}\n", *report.progress);
    }
    if (report.description) {
        text += fmt::format("description: {}\n", *report.description);
    }
    if (item.exit_status) {
        text += fmt::format("exit status: {}\n", *item.exit_status);
    }
    if (item.signal != 0) {
        text += fmt::format("signal: {}\n", name_of_signal(item.signal));
    }
    if (!item.left_running.empty()) {
        text += fmt::format("left running: {}\n", left_running(item));
    }
    return text;
}

// For an item or a round without an outcome.
std::string not_run(const Run &run, bool was_running)
{
    const std::string &why = why_not_all(run);
    const std::string message =
        attribute("message", !why.empty()  ? why
                             : was_running ? "was running when this was written"
                                           : "not run yet when this was written");
    return run.finished
               ? fmt::format("      <skipped{}/>\n", message)
               : fmt::format("      <error{}{}/>\n",
                             attribute("type", was_running ? "running" : "not run"), message);
}

// The elements are those for a failed item and for any other.
std::string failure(const ItemRun &item, const char *if_failed, const char *otherwise,
                    const std::string &text)
{
    const bool has_failed = item.outcome == Outcome::failed || item.outcome == Outcome::unexpected;
    return fmt::format(
        "      <{0}{1}{2}>{3}</{0}>\n", has_failed ? if_failed : otherwise,
        attribute("type", item.outcome == Outcome::failed ? "result" : word(item.outcome)),
        attribute("message", item.reason.empty() ? word(item.outcome) : item.reason),
        xml_escaped(text));
}

// As Jenkins and GitLab find files.
std::string attachments(const ItemRun &item)
{
    std::string lines;
    for (const std::string &file : item.files) {
        lines += fmt::format(
            "{}[[ATTACHMENT|{}]]\n",
            lines.empty() && !item.output.empty() && !item.output.ends_with('\n') ? "\n" : "",
            one_line(item.directory + "/" + file));
    }
    return lines;
}

// With the elements that Surefire has for attempts before the last one.
std::string verdict(const Run &run, const ItemRun &item)
{
    std::string text;
    if (item.outcome == Outcome::not_run) {
        text = not_run(run, item.start.has_value());
    } else if (item.outcome == Outcome::expected) {
        text = failure(item, "", "skipped", details(item));
    } else if (!is_success(item.outcome)) {
        text = failure(item, "failure", "error", details(item));
    }
    for (const ItemRun &one : item.earlier) {
        const std::string known =
            details(one) + (one.output.empty() ? "" : "output:\n" + one.output) + attachments(one);
        text += item.outcome == Outcome::flaky ? failure(one, "flakyFailure", "flakyError", known)
                                               : failure(one, "rerunFailure", "rerunError", known);
    }
    return text;
}

std::optional<std::string> value_of(const std::string &text)
{
    return text.empty() ? std::nullopt : std::optional(text);
}

std::string test_case(const Run &run, const ItemRun &item)
{
    const std::string indent(8, ' ');
    const ItemReport &report = item.report;
    using Value = std::optional<std::string>;
    const Value result = report.result_without_value ? Value("") : report.result;
    const Value status = item.exit_status ? Value(std::to_string(*item.exit_status)) : Value();
    const Value signal = item.signal != 0 ? Value(name_of_signal(item.signal)) : Value();
    const bool is_flaky = item.outcome == Outcome::flaky;
    const Value outcome = is_flaky || !item.expected.empty() ? Value(word(item.outcome)) : Value();
    const Value reason = is_flaky ? Value(item.reason) : Value();
    const Value expected = item.expected.empty() ? Value() : Value(item.expected);
    const bool has_begun = item.outcome != Outcome::not_run || item.start.has_value();
    const Value attempts = run.retries > 0
                               ? Value(std::to_string(item.earlier.size() + (has_begun ? 1 : 0)))
                               : Value();
    const Value left = item.left_running.empty() ? Value() : Value(left_running(item));
    std::string inside =
        property(indent, "outcome", outcome) + property(indent, "reason", reason) +
        property(indent, "expected", expected) + property(indent, "attempts", attempts) +
        property(indent, "progress", report.progress) + property(indent, "result", result) +
        property(indent, "description", report.description) +
        property(indent, "exit_status", status) + property(indent, "signal", signal) +
        property(indent, "left_running", left);
    for (const Measurement &one : item.measured.kept) {
        inside += property(indent, ("measure " + one.name).c_str(), words_of(one));
    }
    inside += property(indent, "directory", value_of(item.directory)) +
              property(indent, "warning", value_of(item.warning));
    const std::string printed = item.output + attachments(item);
    const std::string output =
        printed.empty() ? ""
                        : fmt::format("      <system-out>{}</system-out>\n", xml_escaped(printed));
    return fmt::format(
        "    <testcase{}{}{}>\n{}{}{}    </testcase>\n", attribute("classname", item.group),
        attribute("name", item.name + of_round(run)), time_attribute(item.seconds.value_or(0)),
        properties("      ", inside), verdict(run, item), output);
}

// Each item over its rounds.
std::string summary_properties(const Run &run, const std::string &indent)
{
    std::string text;
    for (const Summary &one : run.summary) {
        const DurationStats &times = one.times;
        std::string value = fmt::format("{} of {} passed", one.passed, times.count());
        if (times.count() > 0) {
            value += fmt::format(", least {}, median {}, longest {}", fine_duration(times.least()),
                                 fine_duration(times.median()), fine_duration(times.longest()));
        }
        text += property(indent, fmt::format("summary {}/{}", one.group, one.name).c_str(), value);
    }
    return text;
}

std::string identity_properties(const Run &run, const std::string &indent)
{
    std::string text;
    for (const auto &[name, value] : named_identity(run)) {
        text += property(indent, name.c_str(), value);
    }
    return text;
}

std::string test_suite(const Run &run, std::size_t number, const std::vector<LateReport> &late)
{
    const Suite &suite = run.suites[number];
    TestCounts tests;
    add(tests, run, suite);
    double seconds = 0;
    auto start = run.start;
    for (std::size_t at = suite.items.size(); at-- > 0;) {
        seconds += suite.items[at].seconds.value_or(0);
        start = suite.items[at].start.value_or(start);
    }
    const std::string indent(6, ' ');
    std::string inside = property(indent, "plan", run.plan) +
                         property(indent, "vendor", std::to_string(run.vendor)) +
                         property(indent, "pass_code", std::to_string(run.pass_code));
    if (run.seed) {
        inside += property(indent, "seed", std::to_string(*run.seed));
    }
    if (!run.resumed.empty()) {
        inside += property(indent, "resumed", run.resumed);
    }
    if (run.retries > 0) {
        const Counts counts = count(suite.items);
        inside += property(indent, "flaky", std::to_string(counts.flaky)) +
                  property(indent, "retries", std::to_string(counts.retries));
    }
    if (run.has_expectations) {
        inside += property(indent, "expected", std::to_string(count(suite.items).expected));
    }
    inside += kStateGoesHere + identity_properties(run, indent);
    for (const LateReport &one : late) {
        if (one.suite == number) {
            inside += property(indent, "late_report", one.text);
        }
    }
    if (has_ended(run) && run.round > 1 && number + 1 == run.suites.size()) {
        inside += summary_properties(run, indent);
    }
    std::string cases;
    for (const ItemRun &item : suite.items) {
        cases += test_case(run, item);
    }
    return fmt::format("  <testsuite{}{}{}{}{}>\n{}{}  </testsuite>\n",
                       attribute("name", title(run, suite)), attributes(tests),
                       time_attribute(seconds), timestamp_attribute(start), hostname_attribute(run),
                       properties("    ", inside), cases);
}

} // namespace

bool is_property_of_junit(const std::string &name)
{
    constexpr std::array kNames{"plan",        "vendor",         "pass_code",       "seed",
                                "resumed",     "flaky",          "retries",         "expected",
                                "plan_digest", "fptest_version", "library_version", "finished",
                                "reason",      "late_report"};
    return std::ranges::find(kNames, name) != kNames.end();
}

TestCounts &TestCounts::operator+=(const TestCounts &more)
{
    all += more.all;
    failures += more.failures;
    errors += more.errors;
    skipped += more.skipped;
    return *this;
}

TestCounts tests_of_round(const Run &run)
{
    TestCounts tests;
    for (const Suite &suite : run.suites) {
        add(tests, run, suite);
    }
    return tests;
}

namespace
{

// Whether the document needs an error for what is still to come: rounds that have not
// begun, or the end of the run if nothing else shows that it was cut off.
bool has_rest(const Run &run)
{
    return rounds_to_come(run) > 0 || (!run.finished && tests_of_round(run).errors == 0);
}

std::string name_of_rest(const Run &run)
{
    const int first = run.round + 1;
    if (rounds_to_come(run) > 1) {
        return fmt::format("rounds {} to {}", first, *run.rounds);
    }
    return run.round == run.rounds ? "end of the run" : fmt::format("round {}", first);
}

} // namespace

std::string junit_head(const Run &run, const TestCounts &before)
{
    TestCounts tests = before;
    tests += tests_of_round(run);
    if (has_rest(run)) {
        ++tests.all;
        ++tests.errors;
    }
    return fmt::format(
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<testsuites name=\"fptest\"{}{}{}>\n",
        attributes(tests), time_attribute(run.seconds), timestamp_attribute(run.start));
}

std::string junit_round(const Run &run, const std::vector<LateReport> &late)
{
    std::string text;
    for (std::size_t number = 0; number < run.suites.size(); ++number) {
        text += test_suite(run, number, late);
    }
    return text;
}

std::string junit_state(const Run &run)
{
    const std::string indent(6, ' ');
    std::string text = property(indent, "finished", run.finished ? "true" : "false");
    if (!run.finished) {
        text += property(indent, "reason",
                         has_ended(run) ? run.why_unfinished : "the run was still going on");
    }
    return text;
}

std::string junit_tail(const Run &run)
{
    if (!has_rest(run)) {
        return "</testsuites>\n";
    }
    TestCounts tests;
    tests.all = 1;
    tests.errors = 1;
    const std::string inside = junit_state(run) + identity_properties(run, std::string(6, ' '));
    return fmt::format("  <testsuite name=\"{0}\"{1}{2}{3}{4}>\n{5}    <testcase "
                       "classname=\"rounds\" name=\"{0}\"{2}>\n{6}    </testcase>\n"
                       "  </testsuite>\n</testsuites>\n",
                       name_of_rest(run), attributes(tests), time_attribute(0),
                       timestamp_attribute(run.start), hostname_attribute(run),
                       properties("    ", inside), not_run(run, false));
}

} // namespace fptest
