// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/reporters.h"

#include "reporters/line_printer.h"
#include "reporters/wording.h"
#include "util/terminal.h"
#include "util/text.h"
#include "util/times.h"

#include <algorithm>
#include <charconv>
#include <chrono>
#include <fmt/core.h>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace fptest
{
namespace
{

using Clock = std::chrono::steady_clock;
using namespace std::chrono_literals;

constexpr std::size_t kNarrowest = 40; // columns in which an item's result still shows

Colour colour_of(Outcome outcome)
{
    switch (outcome) {
    case Outcome::passed:
        return Colour::green;
    case Outcome::failed:
    case Outcome::timed_out:
    case Outcome::unexpected:
        return Colour::red;
    default:
        return Colour::yellow;
    }
}

class LiveView : public Reporter
{
  public:
    LiveView(std::FILE *terminal, bool coloured) : printer_(terminal, coloured)
    {
    }

    void begin(const Run &run) override
    {
        for (const Suite &suite : run.suites) {
            for (const ItemRun &item : suite.items) {
                name_width_ = std::max(name_width_, display_width(one_line(item.name)));
            }
        }
        name_width_ = std::min<std::size_t>(name_width_, 28);
        keep_text(heading(run));
        draw(run);
    }

    void started(const Run &run, Place place) override
    {
        if (suite_ != place.suite) {
            suite_ = place.suite;
            const Suite &suite = run.suites[place.suite];
            keep_text(one_line(suite.group) + of_round(run));
        }
        running_.push_back(place);
        draw(run);
    }

    void progressed(const Run &run, Place /* place */) override
    {
        if (Clock::now() - drawn_at_ >= 25ms) {
            draw(run);
        }
    }

    void tick(const Run &run) override
    {
        if (Clock::now() - drawn_at_ >= 100ms) {
            draw(run);
        }
    }

    void ended(const Run &run, Place place) override
    {
        std::erase(running_, place);
        const ItemRun &item = item_at(run, place);
        std::string said = how_it_ended(item);
        std::string more = remark(item);
        if (!is_success(item.outcome)) {
            const std::string attempt = attempt_of(run, item);
            more = attempt + (attempt.empty() || more.empty() ? "" : ": ") + more;
        }
        said += (said.empty() || more.empty() ? "" : ": ") + more;
        Line line = item_line(item);
        const bool has_room = display_width(said) <= line.room();
        line.add(has_room ? said : "");
        printer_.keep(line);
        if (!has_room) {
            keep_text("      " + said);
        }
        for (const Note &note : notes(item)) {
            keep_text("      " + note.text, note.is_bad ? Colour::yellow : Colour::none);
        }
        if (!is_success(item.outcome)) {
            for (const std::string &text : last_lines(item)) {
                keep_text("    | " + text);
            }
        }
        draw(run);
    }

    void retried(const Run &run, Place place) override
    {
        ended(run, place);
    }

    void late(const Run &run, Place place, const TimedReport &report) override
    {
        keep_text(late_report(run, place, report), Colour::yellow);
        draw(run);
    }

    void round_over(const Run & /* run */) override
    {
        suite_ = std::string::npos;
    }

    // The shell writes next.
    void paused(const Run & /* run */) override
    {
        printer_.leave();
    }

    // The shell has written since.
    void resumed(const Run &run) override
    {
        printer_.forget();
        draw(run);
    }

    void finish(const Run &run) override
    {
        running_.clear();
        for (const std::string &line : {not_finished(run), ended_early(run)}) {
            if (!line.empty()) {
                keep_text(line, Colour::yellow);
            }
        }
        for (const std::string &line : summary_table(run)) {
            keep_text(line);
        }
        write_frame(run);
        printer_.leave();
    }

    bool flush() override
    {
        return printer_.is_flushed();
    }

    std::string failure() const override
    {
        return printer_.failure();
    }

  private:
    // All of an item but its description.
    Line item_line(const ItemRun &item) const
    {
        const bool runs = !item.seconds;
        Line line = printer_.new_line();
        const std::size_t width = line.room();
        const std::size_t bar = width >= 95 ? 16 : width >= 60 ? 8 : 0;
        line.add(fmt::format(
            "  {} ", pad_or_ellipsize(one_line(item.name), std::min(name_width_, width / 3))));
        add_progress(line, item.report, bar);
        line.add(right(duration(item.seconds.value_or(item.running)), 6) + "  ");
        const std::string_view state =
            runs ? (item.stopping ? "stopping" : "running") : word(item.outcome);
        line.add(pad_or_ellipsize(state, std::max<std::size_t>(9, state.size())),
                 runs ? Colour::cyan : colour_of(item.outcome));
        line.add(fmt::format(" {}  ", right(result_of(item.report), 2)));
        return line;
    }

    static void add_progress(Line &line, const ItemReport &report, std::size_t bar)
    {
        const std::string text = one_line(report.progress.value_or(""));
        int progress = 0;
        const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), progress);
        const bool is_share = error == std::errc{} && end == text.data() + text.size() &&
                              progress >= 0 && progress <= 100;
        if (bar > 0) {
            const std::size_t full = is_share ? bar * static_cast<std::size_t>(progress) / 100 : 0;
            line.add(fmt::format("[{:<{}}] ", std::string(full, '#'), bar));
        }
        line.add(right(is_share ? text + "%" : text, 4) + " ");
    }

    static std::string right(const std::string &text, std::size_t width)
    {
        const std::size_t taken = display_width(text);
        return (taken < width ? std::string(width - taken, ' ') : "") + text;
    }

    Line total_line(const Run &run) const
    {
        const Counts counts = count(run);
        const auto [passed, failed] = tally(counts);
        Line line = printer_.new_line();
        line.add(passed, counts.passed > 0 ? Colour::green : Colour::none);
        line.add(", ");
        line.add(failed, counts.failed > 0 ? Colour::red : Colour::none);
        line.add(rest_of_total(run));
        if (!running_.empty() && !run.why_unfinished.empty()) {
            line.add("; Ctrl-C again leaves at once");
        }
        return line;
    }

    void keep_text(const std::string &text, Colour colour = Colour::none)
    {
        Line line = printer_.new_line();
        line.add(text, colour);
        printer_.keep(line);
    }

    // Skips frames while the terminal is behind.
    void draw(const Run &run)
    {
        if (printer_.wants_frame()) {
            write_frame(run);
        }
    }

    void write_frame(const Run &run)
    {
        std::vector<Line> frame;
        for (const Place place : running_) {
            const ItemRun &item = item_at(run, place);
            frame.push_back(item_line(item));
            frame.back().add(item.report.description ? one_line(*item.report.description)
                                                     : last_line(item.output));
        }
        frame.push_back(total_line(run));
        printer_.redraw(frame);
        drawn_at_ = Clock::now();
    }

    // The last line that the item printed.
    static std::string last_line(const std::string &output)
    {
        const auto lines =
            last_lines(output.substr(output.size() - std::min(output.size(), kTail)));
        return lines.empty() ? "" : lines.back();
    }

    static constexpr std::size_t kTail = 400;

    LinePrinter printer_;
    std::size_t name_width_ = 8;
    std::size_t suite_ = std::string::npos;
    std::vector<Place> running_;
    Clock::time_point drawn_at_;
};

} // namespace

std::unique_ptr<Reporter> make_live_view(std::FILE *terminal, bool colour)
{
    return std::make_unique<LiveView>(terminal, colour);
}

std::unique_ptr<Reporter> make_suitable_view(std::FILE *stream, bool quiet)
{
    if (quiet || !is_smart_terminal(stream) || terminal_width(stream) < kNarrowest) {
        return make_plain_view(stream, quiet);
    }
    return make_live_view(stream, wants_colour());
}

} // namespace fptest
