// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The page that fptest html writes, and its pieces. It has no scripts and loads nothing;
// what a run says stands in it as text alone.
#pragma once

#include "run/rack.h"

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace fptest
{

// Of these runs, and what is to be said of files that hold none.
std::string html_page(const std::vector<EarlierRun> &runs, const std::vector<std::string> &unknown);

// --- its pieces ------------------------------------------------------------------

// How an outcome looks.
struct HtmlLook {
    const char *letter;
    const char *word;
    const char *style;
    int rank; // the worse, the higher
};
HtmlLook look_of(const ItemRun &item);
// The worst of an item's rounds.
HtmlLook look_of(const std::vector<RackEntry> &rounds);

// On one line, escaped.
std::string html_line(std::string_view text);
// "Bringup/SpiCheck", escaped
std::string html_name(const EarlierRun::Name &item);
std::string html_badge(const HtmlLook &look, std::string_view text);

std::string html_time(const ItemRun &item);

// Where the page tells of an item, or of one round of it.
std::string html_anchor(const RackRow &row, std::size_t item);
std::string html_anchor(const RackRow &row, std::size_t item, const RackEntry &entry);

// A run, and all that is known of its items.
std::string html_run(const RackTable &table, const RackRow &row);

// A plot for each measurement, over the runs, the rounds or the times that it was made.
std::string html_plots(const RackTable &table);

} // namespace fptest
