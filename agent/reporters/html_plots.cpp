// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/html.h"

#include "run/measurements.h"
#include "util/text.h"

#include <algorithm>
#include <fmt/core.h>
#include <iterator>
#include <map>
#include <optional>
#include <tuple>
#include <utility>

namespace fptest
{
namespace
{

// In the picture's own units.
constexpr double kPlotWidth = 320;
constexpr double kPlotHeight = 96;
constexpr double kPlotMargin = 14;

struct PlotPoint {
    const Measurement *one = nullptr;
    std::string anchor;
    std::string whose; // escaped
};

// Of a run or a round only the least and the greatest are drawn.
struct PlotSlot {
    PlotPoint least;
    PlotPoint greatest;
};

struct Plot {
    std::map<std::size_t, PlotSlot> slots; // by their places from the left
    std::size_t values = 0;
    std::size_t out = 0;

    void add(std::size_t place, const PlotPoint &point)
    {
        ++values;
        out += is_out(*point.one) ? 1 : 0;
        PlotSlot &slot = slots.try_emplace(place, PlotSlot{point, point}).first->second;
        if (point.one->value < slot.least.one->value) {
            slot.least = point;
        }
        if (point.one->value > slot.greatest.one->value) {
            slot.greatest = point;
        }
    }
};

// An item's place, a measurement's name and its unit.
using PlotKey = std::tuple<std::size_t, std::string, std::string>;
using Plots = std::map<PlotKey, Plot>;

enum class PlotOver { runs, rounds, times };

PlotOver over_what(const RackTable &table)
{
    if (table.rows.size() > 1) {
        return PlotOver::runs;
    }
    const bool has_rounds = std::ranges::any_of(
        table.rows.front().cells, [](const auto &rounds) { return rounds.size() > 1; });
    return has_rounds ? PlotOver::rounds : PlotOver::times;
}

void add_item(Plots &plots, PlotOver over, std::size_t run, std::size_t round, std::size_t item,
              const ItemRun &attempt, const PlotPoint &from)
{
    for (const Measurement &one : attempt.measured.kept) {
        Plot &plot = plots[{item, one.name, one.unit}];
        const std::size_t place = over == PlotOver::runs     ? run
                                  : over == PlotOver::rounds ? round
                                                             : plot.values;
        plot.add(place, {&one, from.anchor, from.whose});
    }
}

Plots plots_of(const RackTable &table, PlotOver over)
{
    Plots plots;
    for (std::size_t run = 0; run < table.rows.size(); ++run) {
        const RackRow &row = table.rows[run];
        for (std::size_t item = 0; item < row.cells.size(); ++item) {
            for (const RackEntry &entry : row.cells[item]) {
                const std::string round =
                    row.cells[item].size() > 1 ? fmt::format(", round {}", entry.round) : "";
                const PlotPoint from{nullptr, html_anchor(row, item, entry),
                                     html_line(row.name) + round};
                for (const ItemRun &attempt : entry.item->earlier) {
                    add_item(plots, over, run, entry.round - 1, item, attempt, from);
                }
                add_item(plots, over, run, entry.round - 1, item, *entry.item, from);
            }
        }
    }
    return plots;
}

// --- drawing ---------------------------------------------------------------------

class Drawing
{
  public:
    Drawing(const Plot &plot, std::size_t places)
        : plot_(plot), pitch_((kPlotWidth - 2 * kPlotMargin) / static_cast<double>(places))
    {
        least_ = plot.slots.begin()->second.least.one->value;
        greatest_ = least_;
        for (const auto &[place, slot] : plot.slots) {
            for (const std::optional<double> value :
                 {slot.least.one->low, slot.least.one->high, std::optional(slot.least.one->value),
                  std::optional(slot.greatest.one->value)}) {
                least_ = std::min(least_, value.value_or(least_));
                greatest_ = std::max(greatest_, value.value_or(greatest_));
            }
        }
    }

    std::string svg(const std::string &label) const
    {
        std::string inside = limits(&Measurement::low, 10) + limits(&Measurement::high, -3);
        for (const auto &[place, slot] : plot_.slots) {
            if (slot.least.one->value < slot.greatest.one->value) {
                inside += fmt::format("<path class=\"span\" d=\"M{0:.1f} {1:.1f}V{2:.1f}\"/>\n",
                                      x_of(place), y_of(slot.least.one->value),
                                      y_of(slot.greatest.one->value));
                inside += point(place, slot.greatest);
            }
            inside += point(place, slot.least);
        }
        return fmt::format("<svg viewBox=\"0 0 {} {}\" role=\"img\" aria-label=\"{}\">\n{}</svg>\n",
                           kPlotWidth, kPlotHeight, label, inside);
    }

  private:
    double x_of(std::size_t place) const
    {
        return kPlotMargin + (static_cast<double>(place) + 0.5) * pitch_;
    }

    // Quarters, as the distance of two large numbers may be too large for one.
    double y_of(double value) const
    {
        const double range = greatest_ / 4 - least_ / 4;
        const double part = range > 0 ? (value / 4 - least_ / 4) / range : 0.5;
        return kPlotHeight - kPlotMargin - part * (kPlotHeight - 2 * kPlotMargin);
    }

    std::string point(std::size_t place, const PlotPoint &of) const
    {
        const double x = x_of(place);
        const double y = y_of(of.one->value);
        const double size = std::clamp(pitch_ / 2, 1.0, 3.0);
        const std::string shape =
            is_out(*of.one)
                ? fmt::format(R"(<path class="out" d="M{0:.1f} {1:.1f}L{2:.1f} {3:.1f})"
                              R"(M{0:.1f} {3:.1f}L{2:.1f} {1:.1f}"/>)",
                              x - size, y - size, x + size, y + size)
                : fmt::format(R"(<circle cx="{:.1f}" cy="{:.1f}" r="{:.1f}"/>)", x, y, size);
        return fmt::format("<a href=\"#{}\"><title>{}: {}</title>{}</a>\n", of.anchor, of.whose,
                           html_line(text_of(*of.one)), shape);
    }

    // A line as far as the limit is the same.
    std::string limits(std::optional<double> Measurement::*side, int text_below) const
    {
        std::string text;
        for (auto at = plot_.slots.begin(); at != plot_.slots.end();) {
            const std::optional<double> limit = at->second.least.one->*side;
            auto last = at;
            auto next = std::next(at);
            for (; next != plot_.slots.end() && next->second.least.one->*side == limit; ++next) {
                last = next;
            }
            if (limit) {
                text +=
                    fmt::format("<path class=\"limit\" d=\"M{0:.1f} {1:.1f}H{2:.1f}\"/>"
                                "<text x=\"{0:.1f}\" y=\"{3:.1f}\">{4}</text>\n",
                                x_of(at->first) - pitch_ / 2, y_of(*limit),
                                x_of(last->first) + pitch_ / 2, y_of(*limit) + text_below, *limit);
            }
            at = next;
        }
        return text;
    }

    const Plot &plot_;
    double pitch_;
    double least_;
    double greatest_;
};

std::string html_plot(const RackTable &table, const PlotKey &key, const Plot &plot, PlotOver over)
{
    const auto &[item, name, unit] = key;
    const std::size_t places =
        over == PlotOver::runs ? table.rows.size() : plot.slots.rbegin()->first + 1;
    const char *const what = over == PlotOver::times    ? "value"
                             : over == PlotOver::rounds ? "round"
                             : table.is_of_devices      ? "device"
                                                        : "run";
    double least = plot.slots.begin()->second.least.one->value;
    double greatest = least;
    for (const auto &[place, slot] : plot.slots) {
        least = std::min(least, slot.least.one->value);
        greatest = std::max(greatest, slot.greatest.one->value);
    }
    const std::string title = html_name(table.items[item]) + " " + html_line(name);
    const std::string said =
        fmt::format("{}{}{}{}, {}", least, least < greatest ? fmt::format(" to {}", greatest) : "",
                    unit.empty() ? "" : " ", html_line(unit), plural(places, what));
    const std::string out = plot.out == 0 ? "" : plural(plot.out, "value") + " out of limits";
    return fmt::format("<figure><figcaption>{} {}{}</figcaption>\n{}</figure>\n",
                       "<b>" + title + "</b>", said,
                       out.empty() ? "" : ", <strong>" + out + "</strong>",
                       Drawing(plot, places).svg(title + " " + said));
}

} // namespace

std::string html_plots(const RackTable &table)
{
    const PlotOver over = over_what(table);
    std::string text;
    for (const auto &[key, plot] : plots_of(table, over)) {
        text += html_plot(table, key, plot, over);
    }
    return text.empty() ? "" : "<div class=\"plots\">\n" + text + "</div>\n";
}

} // namespace fptest
