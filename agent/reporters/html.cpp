// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/html.h"

#include "reporters/html_style.h"
#include "reporters/wording.h"
#include "util/text.h"
#include "util/times.h"

#include <algorithm>
#include <fmt/core.h>
#include <map>
#include <utility>

namespace fptest
{
namespace
{

// How many items became what, in the order of their ranks.
using HtmlTally = std::map<int, std::pair<HtmlLook, std::size_t>>;

void add_to(HtmlTally &tally, const std::vector<RackEntry> &rounds)
{
    for (const RackEntry &entry : rounds) {
        const HtmlLook look = look_of(*entry.item);
        ++tally.try_emplace(look.rank, look, 0).first->second.second;
    }
}

// Also what the letters stand for.
std::string html_tally(const HtmlTally &tally)
{
    std::string text;
    for (const auto &[rank, one] : tally) {
        const auto &[look, count] = one;
        text += html_badge(look, look.letter) + fmt::format(" {} {} ", count, look.word);
    }
    return text;
}

std::string in_words(const HtmlTally &tally)
{
    std::string text;
    for (const auto &[rank, one] : tally) {
        text += fmt::format("{}{} {}", text.empty() ? "" : ", ", one.second, one.first.word);
    }
    return text;
}

HtmlTally tally_of(const std::vector<RackTable> &tables)
{
    HtmlTally tally;
    for (const RackTable &table : tables) {
        for (const RackRow &row : table.rows) {
            for (const auto &rounds : row.cells) {
                add_to(tally, rounds);
            }
        }
    }
    return tally;
}

bool has_passed(const std::vector<RackEntry> &rounds)
{
    return std::ranges::all_of(rounds, [](const RackEntry &entry) {
        return entry.item->outcome == Outcome::passed || entry.item->outcome == Outcome::flaky;
    });
}

std::string html_link(const std::string &anchor, const HtmlLook &look, std::string_view escaped,
                      std::string_view title)
{
    return fmt::format(R"(<a class="o {}" href="#{}" title="{}">{}</a>)", look.style, anchor, title,
                       escaped);
}

std::string html_state(const RackRow &row)
{
    return row.run->run.finished ? "" : " <small>not finished</small>";
}

// --- a run: its items below each other -------------------------------------------

std::string html_rounds(const RackRow &row, std::size_t item)
{
    std::string text;
    for (const RackEntry &entry : row.cells[item]) {
        const HtmlLook look = look_of(*entry.item);
        text += html_link(html_anchor(row, item, entry), look, look.letter,
                          fmt::format("round {}: {}", entry.round, look.word));
    }
    return "<div class=\"rounds\">" + text + "</div>";
}

std::string html_items(const RackTable &table)
{
    const RackRow &row = table.rows.front();
    std::string text;
    for (std::size_t item = 0; item < table.items.size(); ++item) {
        const std::vector<RackEntry> &rounds = row.cells[item];
        const ItemRun &first = *rounds.front().item;
        const HtmlLook look = look_of(rounds);
        const bool has_one = rounds.size() == 1;
        const std::string name = html_name(table.items[item]);
        text += fmt::format("<tr><td>{}</td><th scope=\"row\">{}{}</th><td>{}</td></tr>\n",
                            html_link(html_anchor(row, item), look, look.word, name), name,
                            has_one ? fmt::format("<p>{}</p>", xml_escaped(remark(first)))
                                    : html_rounds(row, item),
                            has_one ? html_time(first) : "");
    }
    return "<table class=\"items\">\n<thead><tr><th>Outcome</th><th>Item</th><th>Time</th></tr>"
           "</thead>\n<tbody>\n" +
           text + "</tbody>\n</table>\n";
}

// --- several: a line each, their items beside each other ------------------------------

std::string html_cell(const RackTable &table, const RackRow &row, std::size_t item)
{
    const std::vector<RackEntry> &rounds = row.cells[item];
    if (rounds.empty()) {
        return "<td></td>";
    }
    const HtmlLook look = look_of(rounds);
    const auto bad = std::ranges::count_if(
        rounds, [](const RackEntry &entry) { return !is_success(entry.item->outcome); });
    const std::string title =
        fmt::format("{}, {}: {}{}", html_line(row.name), html_name(table.items[item]), look.word,
                    rounds.size() > 1
                        ? fmt::format(", {} of {} not passed", bad, plural(rounds.size(), "round"))
                        : "");
    return fmt::format("<td>{}</td>",
                       html_link(html_anchor(row, item), look,
                                 rounds.size() > 1 && bad > 0
                                     ? fmt::format("{}<small>{}</small>", look.letter, bad)
                                     : look.letter,
                                 title));
}

std::string html_row(const RackTable &table, const RackRow &row)
{
    std::string cells;
    std::size_t asked = 0;
    std::size_t passed = 0;
    for (std::size_t item = 0; item < table.items.size(); ++item) {
        cells += html_cell(table, row, item);
        asked += row.cells[item].empty() ? 0 : 1;
        passed += row.cells[item].empty() || !has_passed(row.cells[item]) ? 0 : 1;
    }
    return fmt::format(
        "<tr><th scope=\"row\"><a href=\"#r{}\">{}</a>{}</th>{}<td>{}/{}</td></tr>\n", row.number,
        html_line(row.name), html_state(row), cells, passed, asked);
}

std::string html_matrix(const RackTable &table)
{
    std::string heads;
    std::string feet;
    for (std::size_t item = 0; item < table.items.size(); ++item) {
        std::size_t asked = 0;
        std::size_t passed = 0;
        for (const RackRow &row : table.rows) {
            asked += row.cells[item].empty() ? 0 : 1;
            passed += row.cells[item].empty() || !has_passed(row.cells[item]) ? 0 : 1;
        }
        heads +=
            fmt::format("<th scope=\"col\"><span>{}</span></th>", html_name(table.items[item]));
        feet += fmt::format("<td><span>{}/{}</span></td>", passed, asked);
    }
    std::string rows;
    for (const RackRow &row : table.rows) {
        rows += html_row(table, row);
    }
    return fmt::format("<div class=\"wide\"><table class=\"matrix\">\n<thead><tr><th>{}</th>{}"
                       "<th><span>Passed</span></th></tr></thead>\n<tbody>\n{}</tbody>\n"
                       "<tfoot><tr><th scope=\"row\">Passed</th>{}<td></td></tr></tfoot>\n"
                       "</table></div>\n",
                       table.is_of_devices ? "Device" : "Run", heads, rows, feet);
}

std::string html_table(const RackTable &table)
{
    const bool is_single = table.rows.size() == 1;
    const char *const each = table.is_of_devices ? "device" : "run";
    const std::string whose =
        is_single ? html_line(table.rows.front().name) + html_state(table.rows.front())
                  : plural(table.rows.size(), each);
    const std::string digest =
        table.digest.empty()
            ? ""
            : fmt::format("<p class=\"digest\">plan digest {}</p>\n", html_line(table.digest));
    return fmt::format("<section class=\"plan\">\n<h2>{}: {}</h2>\n{}{}{}</section>\n",
                       html_line(table.plan), whose, digest,
                       is_single ? html_items(table) : html_matrix(table), html_plots(table));
}

} // namespace

HtmlLook look_of(const ItemRun &item)
{
    // in the order of Outcome
    static constexpr HtmlLook kLooks[] = {
        {"-", "not run", "none", 3},      {"P", "passed", "passed", 0},
        {"F", "failed", "failed", 9},     {"N", "no result", "silent", 8},
        {"T", "timed out", "silent", 7},  {"S", "stopped", "stopped", 5},
        {"L", "flaky", "flaky", 2},       {"E", "expected", "expected", 1},
        {"U", "unexpected", "failed", 6},
    };
    static constexpr HtmlLook kUnfinished = {"R", "not ended", "stopped", 4};
    return is_unfinished(item) ? kUnfinished : kLooks[static_cast<std::size_t>(item.outcome)];
}

HtmlLook look_of(const std::vector<RackEntry> &rounds)
{
    HtmlLook worst = look_of(*rounds.front().item);
    for (const RackEntry &entry : rounds) {
        const HtmlLook look = look_of(*entry.item);
        worst = look.rank > worst.rank ? look : worst;
    }
    return worst;
}

std::string html_line(std::string_view text)
{
    return xml_escaped(one_line(text));
}

std::string html_name(const EarlierRun::Name &item)
{
    return html_line(item.first + "/" + item.second);
}

std::string html_badge(const HtmlLook &look, std::string_view text)
{
    return fmt::format("<span class=\"o {}\">{}</span>", look.style, text);
}

std::string html_time(const ItemRun &item)
{
    return item.seconds ? fine_duration(*item.seconds) : "";
}

std::string html_anchor(const RackRow &row, std::size_t item)
{
    return fmt::format("r{}i{}", row.number, item + 1);
}

std::string html_anchor(const RackRow &row, std::size_t item, const RackEntry &entry)
{
    const bool has_one = row.cells[item].size() == 1;
    return html_anchor(row, item) + (has_one ? "" : fmt::format("n{}", entry.round));
}

std::string html_page(const std::vector<EarlierRun> &runs, const std::vector<std::string> &unknown)
{
    const std::vector<RackTable> tables = rack_tables(runs);
    const HtmlTally tally = tally_of(tables);
    std::string body;
    for (const std::string &what : unknown) {
        body += fmt::format("<p class=\"unknown\">{}</p>\n", html_line(what));
    }
    if (tables.size() > 1) {
        body += fmt::format("<p>These are runs of {}: a table for each.</p>\n",
                            plural(tables.size(), "plan"));
    }
    for (const RackTable &table : tables) {
        body += html_table(table);
    }
    for (const RackTable &table : tables) {
        for (const RackRow &row : table.rows) {
            body += html_run(table, row);
        }
    }
    return fmt::format("<!DOCTYPE html>\n<html lang=\"en\">\n<head>\n<meta charset=\"utf-8\"/>\n"
                       "<meta http-equiv=\"Content-Security-Policy\" content=\"default-src 'none'; "
                       "style-src 'unsafe-inline'\"/>\n"
                       "<meta name=\"viewport\" content=\"width=device-width, initial-scale=1\"/>\n"
                       "<meta name=\"color-scheme\" content=\"light dark\"/>\n"
                       "<title>{}: fptest</title>\n<style>\n{}</style>\n</head>\n<body>\n"
                       "<h1>Test report</h1>\n<p class=\"tally\">{}</p>\n{}</body>\n</html>\n",
                       in_words(tally), kHtmlStyle, html_tally(tally), body);
}

} // namespace fptest
