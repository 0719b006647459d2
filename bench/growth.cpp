// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "growth.h"

#include <algorithm>
#include <array>
#include <cmath>

namespace bench
{
namespace
{

constexpr double kLeft = 70;
constexpr double kRight = 470;
constexpr double kTop = 50;
constexpr double kBottom = 390;
constexpr double kWidth = 720;
constexpr double kHeight = 450;

constexpr Widths kWidths{-25, 8, 8, 8, 8, 6, 6, 7};

// By how much the exponents of linear growth may differ: where large plans leave
// the caches depends on what else is there, most of all between two points.
constexpr double kFit = 0.05;
constexpr double kLastFit = 0.15;

// A search takes a step for each item: measured below that, it was lucky.
double limit_of(double search, double fit)
{
    return std::max(search, 1.0) + fit;
}

// Told apart without colours too: by their markers and the names at their ends.
constexpr std::array kColours{"#1b4f9c", "#b03a00", "#1d6b2f", "#6a2c91", "#8a5a00", "#333333"};

std::string number(double value)
{
    return decimal(value, 1);
}

// The whole powers of ten around all values of one axis.
struct Axis {
    int low;
    int high;
    double from;
    double to;

    [[nodiscard]] double place(double value) const
    {
        return from + (std::log10(value) - low) / (high - low) * (to - from);
    }
};

struct Axes {
    Axis items;
    Axis seconds;
};

template <typename Value>
Axis axis_around(const std::vector<Curve> &curves, Value value, double from, double to)
{
    double least = INFINITY;
    double most = 0;
    for (const Curve &curve : curves) {
        for (const Point &point : curve.points) {
            least = std::min(least, value(point));
            most = std::max(most, value(point));
        }
    }
    const int low = static_cast<int>(std::floor(std::log10(least) + 1e-9));
    const int high = static_cast<int>(std::ceil(std::log10(most) - 1e-9));
    return {low, std::max(high, low + 1), from, to};
}

std::string text(double x, double y, const std::string &anchor, const std::string &words,
                 const std::string &more = "")
{
    return "<text x=\"" + number(x) + "\" y=\"" + number(y) + "\" text-anchor=\"" + anchor + "\"" +
           more + ">" + words + "</text>\n";
}

std::string line(double x1, double y1, double x2, double y2, const std::string &colour)
{
    return "<line x1=\"" + number(x1) + "\" y1=\"" + number(y1) + "\" x2=\"" + number(x2) +
           "\" y2=\"" + number(y2) + "\" stroke=\"" + colour + "\"/>\n";
}

std::string duration(int power)
{
    static constexpr std::array kUnits{"s", "ms", "&#181;s", "ns"};
    const int unit = power >= 0 ? 0 : std::min((2 - power) / 3, 3);
    return decimal(std::pow(10, power + 3 * unit), 0) + " " +
           kUnits.at(static_cast<std::size_t>(unit));
}

std::string grid(const Axes &axes)
{
    std::string svg;
    for (int power = axes.items.low; power <= axes.items.high; ++power) {
        const double x = axes.items.place(std::pow(10, power));
        svg += line(x, kTop, x, kBottom, "#cccccc");
        svg += text(x, kBottom + 20, "middle", grouped(std::lround(std::pow(10, power))));
    }
    for (int power = axes.seconds.low; power <= axes.seconds.high; ++power) {
        const double y = axes.seconds.place(std::pow(10, power));
        svg += line(kLeft, y, kRight, y, "#cccccc");
        svg += text(kLeft - 8, y + 4, "end", duration(power));
    }
    svg += text((kLeft + kRight) / 2, kBottom + 45, "middle", "items in the plan");
    const double middle = (kTop + kBottom) / 2;
    svg += text(14, middle, "middle", "time for one",
                " transform=\"rotate(-90 14 " + number(middle) + ")\"");
    return svg;
}

std::string marker(std::size_t kind, double x, double y, const std::string &colour)
{
    const std::string fill = " fill=\"" + colour + "\"/>\n";
    switch (kind % 4) {
    case 0:
        return "<circle cx=\"" + number(x) + "\" cy=\"" + number(y) + "\" r=\"4\"" + fill;
    case 1:
        return "<rect x=\"" + number(x - 4) + "\" y=\"" + number(y - 4) +
               "\" width=\"8\" height=\"8\"" + fill;
    case 2:
        return "<path d=\"M" + number(x) + " " + number(y - 5) + "l5 9h-10z\"" + fill;
    default:
        return "<path d=\"M" + number(x) + " " + number(y - 5) + "l5 5l-5 5l-5 -5z\"" + fill;
    }
}

std::string curve_of(const Curve &curve, std::size_t kind, const Axes &axes, double label)
{
    const std::string colour = kColours.at(kind % kColours.size());
    std::string points;
    std::string markers;
    double x = 0;
    double y = 0;
    for (const Point &point : curve.points) {
        x = axes.items.place(point.items);
        y = axes.seconds.place(point.seconds);
        points += number(x) + "," + number(y) + " ";
        markers += marker(kind, x, y, colour);
    }
    return "<polyline points=\"" + points + "\" fill=\"none\" stroke=\"" + colour +
           "\" stroke-width=\"2\"/>\n" + markers + line(x + 6, y, kRight + 16, label - 4, colour) +
           text(kRight + 20, label, "start",
                curve.name + " (" + decimal(exponent(curve.points), 2) + ")",
                " fill=\"" + colour + "\"");
}

// Where the names stand: beside the ends of the curves, but not on each other.
std::vector<double> label_places(const std::vector<Curve> &curves, const Axes &axes)
{
    std::vector<std::size_t> order(curves.size());
    std::vector<double> places;
    for (std::size_t at = 0; at < curves.size(); ++at) {
        order[at] = at;
        places.push_back(axes.seconds.place(curves[at].points.back().seconds) + 4);
    }
    std::ranges::sort(order, {}, [&places](std::size_t at) { return places[at]; });
    for (std::size_t at = 1; at < order.size(); ++at) {
        places[order[at]] = std::max(places[order[at]], places[order[at - 1]] + 20);
    }
    return places;
}

} // namespace

double exponent(const std::vector<Point> &points)
{
    const auto count = static_cast<double>(points.size());
    double x = 0;
    double y = 0;
    double xx = 0;
    double xy = 0;
    for (const Point &point : points) {
        const double items = std::log(point.items);
        const double seconds = std::log(point.seconds);
        x += items;
        y += seconds;
        xx += items * items;
        xy += items * seconds;
    }
    return (count * xy - x * y) / (count * xx - x * x);
}

double last_exponent(const std::vector<Point> &points)
{
    return exponent({points.end() - 2, points.end()});
}

Verdict growth_table(const std::vector<Curve> &curves, bool judge)
{
    const std::vector<Point> &search = curves.back().points;
    const double limit = limit_of(exponent(search), kFit);
    const double last_limit = limit_of(last_exponent(search), kLastFit);
    Verdict verdict;

    verdict.table =
        table_line({"growth, for one", "10", "100", "1,000", "10,000", "x^", "last^", ""}, kWidths);
    for (const Curve &curve : curves) {
        std::vector<std::string> columns{curve.name};
        for (const Point &point : curve.points) {
            columns.push_back(time_text(point.seconds));
        }
        columns.resize(5);
        const double fitted = exponent(curve.points);
        const double last = last_exponent(curve.points);
        const bool judged = judge && &curve != &curves.back();
        const bool faster = judged && (fitted > limit || last > last_limit);
        verdict.missed |= faster;
        columns.push_back(decimal(fitted, 2));
        columns.push_back(decimal(last, 2));
        columns.emplace_back(faster ? "MISSED" : judged ? "ok" : "");
        verdict.table += table_line(columns, kWidths);
    }
    if (judge) {
        verdict.table += table_line(
            {"limits, as of a search", "", "", "", "", decimal(limit, 2), decimal(last_limit, 2)},
            kWidths);
    }
    verdict.table += "x is the number of items; x^ is fitted to all, last^ to the last two.\n";
    return verdict;
}

std::string chart(const std::vector<Curve> &curves)
{
    const auto items = [](const Point &point) { return point.items; };
    const auto seconds = [](const Point &point) { return point.seconds; };
    const Axes axes{axis_around(curves, items, kLeft, kRight),
                    axis_around(curves, seconds, kBottom, kTop)};
    std::string svg = "<svg xmlns=\"http://www.w3.org/2000/svg\" viewBox=\"0 0 " + number(kWidth) +
                      " " + number(kHeight) +
                      "\" font-family=\"sans-serif\" font-size=\"13\" fill=\"#222222\">\n"
                      "<rect width=\"100%\" height=\"100%\" fill=\"#ffffff\"/>\n";
    svg += text(kLeft, 28, "start", "Cost against the number of items (fitted exponent)",
                " font-size=\"16\"");
    svg += grid(axes);
    const std::vector<double> labels = label_places(curves, axes);
    for (std::size_t at = 0; at < curves.size(); ++at) {
        svg += curve_of(curves[at], at, axes, labels[at]);
    }
    return svg + "</svg>\n";
}

} // namespace bench
