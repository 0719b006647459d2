// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/html.h"
#include "reporters/wording.h"
#include "util/text.h"
#include "util/times.h"

#include <algorithm>
#include <fmt/core.h>
#include <optional>

namespace fptest
{
namespace
{

std::string html_fact(const char *name, std::string_view escaped)
{
    return escaped.empty() ? "" : fmt::format("<dt>{}</dt><dd>{}</dd>\n", name, escaped);
}

std::string html_list(const std::vector<std::string> &lines)
{
    std::string text;
    for (const std::string &line : lines) {
        text += fmt::format("<li>{}</li>", line);
    }
    return text.empty() ? "" : "<ul>" + text + "</ul>";
}

std::string html_measurements(const ItemRun &item)
{
    std::vector<std::string> lines;
    for (const Measurement &one : item.measured.kept) {
        lines.push_back(html_line(text_of(one)) +
                        (is_out(one) ? " <strong>out of limits</strong>" : ""));
    }
    return html_list(lines);
}

std::string html_files(const ItemRun &item)
{
    std::vector<std::string> lines;
    for (const std::string &file : item.files) {
        lines.push_back(html_line(item.directory + "/" + file));
    }
    return lines.empty() ? html_line(item.directory) : html_list(lines);
}

std::string html_output(const ItemRun &item)
{
    if (item.output.empty()) {
        return "";
    }
    const auto lines = static_cast<std::size_t>(std::ranges::count(item.output, '\n')) +
                       (item.output.ends_with('\n') ? 0 : 1);
    // a parser drops the first line feed
    return fmt::format("<details{}><summary>Output, {}</summary><pre>\n{}</pre></details>\n",
                       is_success(item.outcome) ? "" : " open=\"\"", plural(lines, "line"),
                       xml_escaped(item.output));
}

// What is known of one attempt.
std::string html_attempt(const ItemRun &item)
{
    const std::string said = item.report.description.value_or("");
    const std::string &progress = item.report.progress.value_or("");
    return fmt::format(
        "{}<dl>\n{}{}{}{}{}{}{}{}{}{}</dl>\n{}",
        said.empty() ? "" : fmt::format("<p class=\"said\">{}</p>\n", xml_escaped(said)),
        html_fact("Reason", xml_escaped(item.reason)),
        html_fact("Known to fail", xml_escaped(item.expected)),
        html_fact("Result", has_result(item.report) ? html_line(result_of(item.report)) : ""),
        html_fact("Progress", progress == "100" ? "" : html_line(progress)),
        html_fact("Start", item.start ? timestamp(*item.start) : ""),
        html_fact("Process", how_it_ended(item)),
        html_fact("Left running", html_line(left_running(item))),
        html_fact("Warning", html_line(item.warning)),
        html_fact("Measured", html_measurements(item)), html_fact("Files", html_files(item)),
        html_output(item));
}

std::string html_attempts(const ItemRun &item)
{
    if (item.earlier.empty()) {
        return html_attempt(item);
    }
    std::string text;
    std::vector<const ItemRun *> attempts;
    for (const ItemRun &one : item.earlier) {
        attempts.push_back(&one);
    }
    attempts.push_back(&item);
    for (std::size_t at = 0; at < attempts.size(); ++at) {
        const ItemRun &one = *attempts[at];
        text += fmt::format(
            "<section class=\"attempt\">\n<h6>Attempt {} {} {}</h6>\n{}</section>\n", at + 1,
            html_badge(look_of(one), look_of(one).word), html_time(one), html_attempt(one));
    }
    return text;
}

// What it reported after its end.
std::string html_late(const RackRow &row, const RackEntry &entry)
{
    std::string text;
    const auto [first, last] = row.run->late.equal_range(entry.index);
    for (auto one = first; one != last; ++one) {
        const ItemReport &report = one->second;
        text += fmt::format("<p>Late report{}, which changed nothing: {}</p>\n",
                            html_line(reported_result(report)),
                            xml_escaped(report.description.value_or("")));
    }
    return text;
}

std::string html_told(const RackRow &row, const RackEntry &entry)
{
    return html_attempts(*entry.item) + html_late(row, entry);
}

std::string html_item(const RackTable &table, const RackRow &row, std::size_t item)
{
    const std::vector<RackEntry> &rounds = row.cells[item];
    const HtmlLook look = look_of(rounds);
    const bool has_one = rounds.size() == 1;
    std::string inside = has_one ? html_told(row, rounds.front()) : "";
    for (const RackEntry &entry : has_one ? std::vector<RackEntry>() : rounds) {
        const HtmlLook of_round = look_of(*entry.item);
        inside += fmt::format("<section class=\"round\" id=\"{}\">\n<h5>Round {} {} {}</h5>\n"
                              "{}</section>\n",
                              html_anchor(row, item, entry), entry.round,
                              html_badge(of_round, of_round.word), html_time(*entry.item),
                              html_told(row, entry));
    }
    return fmt::format(
        "<article id=\"{}\">\n<h4>{} {} <small>{} <a href=\"#r{}\">{}</a></small></h4>\n"
        "{}</article>\n",
        html_anchor(row, item), html_badge(look, look.word), html_name(table.items[item]),
        has_one ? html_time(*rounds.front().item) : plural(rounds.size(), "round"), row.number,
        html_line(row.name), inside);
}

// Why it did not run everything.
std::string html_end_of(const EarlierRun &run)
{
    if (!run.run.why_unfinished.empty()) {
        return "not finished: " + html_line(run.run.why_unfinished);
    }
    if (run.run.finished) {
        return run.run.why_ended.empty() ? "" : "ended: " + html_line(run.run.why_ended);
    }
    std::string running;
    for (const auto &[index, item] : run.unended) {
        if (is_unfinished(item)) {
            running = html_name({item.group, item.name});
        }
    }
    return "not finished: the file ends " +
           (running.empty() ? "before the run does" : "while " + running + " runs");
}

} // namespace

std::string html_run(const RackTable &table, const RackRow &row)
{
    const EarlierRun &earlier = *row.run;
    const Run &run = earlier.run;
    std::string labels;
    for (const auto &[key, value] : run.identity.labels) {
        labels += fmt::format("{}{}={}", labels.empty() ? "" : ", ", key, value);
    }
    const std::string asked =
        fmt::format("vendor {}{}{}{}", run.vendor, run.seed ? ", " + by_seed(run) : "",
                    run.retries > 0 ? fmt::format(", at most {} attempts", run.retries + 1) : "",
                    run.resumed.empty() ? "" : ", resumed from " + run.resumed);
    std::string text = fmt::format(
        "<section class=\"run\" id=\"r{}\">\n<h3>{}</h3>\n<dl>\n{}{}{}{}{}{}{}{}{}</dl>\n",
        row.number, html_line(row.name), html_fact("End", html_end_of(earlier)),
        html_fact("Cut", earlier.is_cut ? "its last line is cut, and left out" : ""),
        html_fact("File", html_line(earlier.file)), html_fact("Labels", html_line(labels)),
        html_fact("Start", timestamp(run.start)), html_fact("Time", duration(run.seconds)),
        html_fact("Run", html_line(asked)), html_fact("fptest", html_line(earlier.version)),
        html_fact("Library", html_line(run.identity.library)));
    for (std::size_t item = 0; item < row.cells.size(); ++item) {
        if (!row.cells[item].empty()) {
            text += html_item(table, row, item);
        }
    }
    return text + "</section>\n";
}

} // namespace fptest
