// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "view.h"

#include "terminal.h"
#include "text.h"
#include "write.h"

#include <algorithm>
#include <charconv>
#include <chrono>
#include <cstdlib>
#include <numeric>
#include <string>
#include <string_view>
#include <vector>

namespace fptest
{
namespace
{

using Clock = std::chrono::steady_clock;
using namespace std::chrono_literals;

constexpr std::size_t kNarrowest = 40; // in which an item's result can still be seen
constexpr std::size_t kOutputLines = 10;
constexpr auto kBetweenProgressLines = 10s;

// --- words --------------------------------------------------------------------

const ItemRun &item_at(const Run &run, Place place)
{
    return run.suites[place.suite].items[place.item];
}

std::string of_round(const Run &run, const Suite &suite)
{
    return run.rounds > 1 ? " (round " + std::to_string(suite.round) + ")" : "";
}

std::string heading(const Run &run)
{
    const std::size_t items = count(run).all();
    std::string text = one_line(run.plan) + ": " + amount(items, "item") + ", vendor " +
                       std::to_string(run.vendor);
    if (run.rounds > 1) {
        text += ", " + amount(static_cast<std::size_t>(run.rounds), "round");
    }
    return text;
}

std::string result_of(const Report &report)
{
    return report.result_without_value ? "?" : one_line(report.result.value_or("-"));
}

// What an item has said of itself, or what there is to say of it.
std::string remark(const ItemRun &item)
{
    const bool explained = item.outcome == Outcome::silent || item.outcome == Outcome::timed_out ||
                           item.outcome == Outcome::stopped;
    std::string text = one_line(item.report.description.value_or(""));
    if (explained || text.empty()) {
        text = one_line(item.reason) + (text.empty() || item.reason.empty() ? "" : ": ") + text;
    }
    return text;
}

std::string total(const Run &run)
{
    const Counts counts = count(run);
    const std::string rest = run.finished || run.why_unfinished.empty() ? " to go" : " not run";
    std::string text =
        std::to_string(counts.passed) + " passed, " + std::to_string(counts.failed) + " failed";
    if (!run.finished) {
        text += ", " + std::to_string(counts.to_go) + rest;
    }
    return text + ", " + duration(run.seconds);
}

// The last lines that an item printed.
std::vector<std::string> last_lines(const std::string &output)
{
    std::vector<std::string> lines;
    for (std::size_t at = 0; at < output.size();) {
        const std::size_t end = std::min(output.find('\n', at), output.size());
        std::string_view line(output.data() + at, end - at);
        if (line.ends_with('\r')) {
            line.remove_suffix(1);
        }
        lines.push_back(one_line(line));
        at = end + 1;
    }
    if (lines.size() > kOutputLines) {
        const std::size_t left_out = lines.size() - kOutputLines;
        lines.erase(lines.begin(), lines.end() - kOutputLines);
        lines.insert(lines.begin(), "(" + amount(left_out, "line") + " before)");
    }
    return lines;
}

// --- plain --------------------------------------------------------------------

class PlainView : public Listener
{
  public:
    PlainView(std::FILE *stream, bool quiet) : stream_(stream), quiet_(quiet)
    {
    }

    void begin(const Run &run) override
    {
        if (!quiet_) {
            print(heading(run));
        }
    }

    void started(const Run & /* run */, Place place) override
    {
        place_ = place;
        said_ = Clock::now();
        runs_ = true;
    }

    void progressed(const Run & /* run */, Place /* place */) override
    {
    }

    void tick(const Run &run) override
    {
        if (!runs_ || quiet_ || Clock::now() - said_ < kBetweenProgressLines) {
            return;
        }
        said_ = Clock::now();
        const ItemRun &item = item_at(run, place_);
        std::string text = name_of(run, place_) + ": running";
        if (item.report.progress) {
            text += ", progress " + one_line(*item.report.progress);
        }
        if (item.start) {
            const std::chrono::duration<double> taken =
                std::chrono::system_clock::now() - *item.start;
            text += ", " + duration(taken.count());
        }
        print(text);
    }

    void ended(const Run &run, Place place) override
    {
        runs_ = runs_ && (place.suite != place_.suite || place.item != place_.item);
        const ItemRun &item = item_at(run, place);
        if (quiet_ && item.outcome == Outcome::passed) {
            return;
        }
        std::string text = name_of(run, place) + ": " + word(item.outcome);
        if (item.report.result || item.report.result_without_value) {
            text += ", result " + result_of(item.report);
        }
        if (item.seconds) {
            text += ", " + duration(*item.seconds);
        }
        const std::string said = remark(item);
        print(text + (said.empty() ? "" : ": " + said));
        if (item.outcome != Outcome::passed) {
            for (const std::string &line : last_lines(item.output)) {
                print("    | " + line);
            }
        }
    }

    void finish(const Run &run) override
    {
        if (!run.finished) {
            print("not finished: " + one_line(run.why_unfinished));
        }
        if (!quiet_) {
            print(total(run));
        }
    }

    std::string failure() const override
    {
        return failure_;
    }

  private:
    static std::string name_of(const Run &run, Place place)
    {
        const ItemRun &item = item_at(run, place);
        return one_line(item.group) + "/" + one_line(item.name) +
               of_round(run, run.suites[place.suite]);
    }

    void print(const std::string &text)
    {
        if (failure_.empty() &&
            (std::fprintf(stream_, "%s\n", text.c_str()) < 0 || std::fflush(stream_) != 0)) {
            failure_ = "standard output cannot be written";
        }
    }

    std::FILE *stream_;
    bool quiet_;
    Place place_;
    bool runs_ = false;
    Clock::time_point said_;
    std::string failure_;
};

// --- live ---------------------------------------------------------------------

enum class Colour { none, red, green, yellow, cyan };

Colour colour_of(Outcome outcome)
{
    switch (outcome) {
    case Outcome::passed:
        return Colour::green;
    case Outcome::failed:
    case Outcome::timed_out:
        return Colour::red;
    default:
        return Colour::yellow;
    }
}

// A line as it grows, with its width in columns and not in bytes.
class Line
{
  public:
    Line(std::size_t room, bool coloured) : room_(room), coloured_(coloured)
    {
    }

    std::size_t room() const
    {
        return room_ - width_;
    }

    void add(const std::string &text, Colour colour = Colour::none)
    {
        const std::string shown = cut(text, room());
        if (coloured_ && colour != Colour::none && !shown.empty()) {
            static constexpr const char *codes[] = {"", "31", "32", "33", "36"};
            text_ +=
                std::string("\x1b[") + codes[static_cast<int>(colour)] + "m" + shown + "\x1b[0m";
        } else {
            text_ += shown;
        }
        width_ += columns(shown);
    }

    const std::string &text() const
    {
        return text_;
    }
    std::size_t width() const
    {
        return width_;
    }

  private:
    std::size_t room_;
    bool coloured_;
    std::string text_;
    std::size_t width_ = 0;
};

class LiveView : public Listener
{
  public:
    LiveView(std::FILE *terminal, bool coloured) : terminal_(terminal), coloured_(coloured)
    {
    }

    void begin(const Run &run) override
    {
        for (const Suite &suite : run.suites) {
            for (const ItemRun &item : suite.items) {
                name_width_ = std::max(name_width_, columns(one_line(item.name)));
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
            keep_text(one_line(suite.group) + of_round(run, suite));
        }
        running_.push_back(place);
        draw(run);
    }

    void progressed(const Run &run, Place /* place */) override
    {
        draw(run);
    }

    void tick(const Run &run) override
    {
        if (Clock::now() - drawn_at_ >= 100ms) {
            draw(run);
        }
    }

    void ended(const Run &run, Place place) override
    {
        std::erase_if(running_, [&](Place other) {
            return other.suite == place.suite && other.item == place.item;
        });
        const ItemRun &item = item_at(run, place);
        Line line = item_line(item);
        const bool has_room = columns(remark(item)) <= line.room();
        line.add(has_room ? remark(item) : "");
        keep(line);
        if (!has_room) {
            keep_text("      " + remark(item));
        }
        if (item.outcome != Outcome::passed) {
            for (const std::string &text : last_lines(item.output)) {
                keep_text("    | " + text);
            }
        }
        draw(run);
    }

    void finish(const Run &run) override
    {
        running_.clear();
        if (!run.finished) {
            Line line = new_line();
            line.add("not finished: " + one_line(run.why_unfinished), Colour::yellow);
            keep(line);
        }
        draw(run);
        show("\n");
    }

  private:
    // The last column stays free: some terminals wrap as soon as it is written.
    Line new_line() const
    {
        return {terminal_width(terminal_) - 1, coloured_};
    }

    // All of an item but its description.
    Line item_line(const ItemRun &item, bool stopping = false) const
    {
        const bool runs = !item.seconds;
        Line line = new_line();
        const std::size_t width = line.room();
        const std::size_t bar = width >= 95 ? 16 : width >= 60 ? 8 : 0;
        double seconds = item.seconds.value_or(0);
        if (runs && item.start) {
            const std::chrono::duration<double> taken =
                std::chrono::system_clock::now() - *item.start;
            seconds = std::max(0.0, taken.count());
        }
        line.add("  " + fit(one_line(item.name), std::min(name_width_, width / 3)) + " ");
        add_progress(line, item.report, bar);
        line.add(right(duration(seconds), 6) + "  ");
        line.add(fit(runs ? (stopping ? "stopping" : "running") : word(item.outcome), 9),
                 runs ? Colour::cyan : colour_of(item.outcome));
        line.add(" " + right(result_of(item.report), 2) + "  ");
        return line;
    }

    static void add_progress(Line &line, const Report &report, std::size_t bar)
    {
        const std::string text = one_line(report.progress.value_or(""));
        int progress = 0;
        const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), progress);
        const bool is_share = error == std::errc{} && end == text.data() + text.size() &&
                              progress >= 0 && progress <= 100;
        if (bar > 0) {
            const std::size_t full = is_share ? bar * static_cast<std::size_t>(progress) / 100 : 0;
            line.add("[" + std::string(full, '#') + std::string(bar - full, ' ') + "] ");
        }
        line.add(right(is_share ? text + "%" : text, 4) + " ");
    }

    static std::string right(const std::string &text, std::size_t width)
    {
        const std::size_t taken = columns(text);
        return (taken < width ? std::string(width - taken, ' ') : "") + text;
    }

    Line total_line(const Run &run) const
    {
        const Counts counts = count(run);
        Line line = new_line();
        line.add(std::to_string(counts.passed) + " passed",
                 counts.passed > 0 ? Colour::green : Colour::none);
        line.add(", ");
        line.add(std::to_string(counts.failed) + " failed",
                 counts.failed > 0 ? Colour::red : Colour::none);
        const std::string all = total(run);
        // the rest of it, from the comma behind the failed ones
        line.add(all.substr(all.find(',', all.find(',') + 1)));
        if (!running_.empty() && !run.why_unfinished.empty()) {
            line.add("; Ctrl-C again leaves at once");
        }
        return line;
    }

    // Puts a line above those that are redrawn.
    void keep(const Line &line)
    {
        frame_ += erase();
        frame_ += line.text() + "\n";
    }

    void keep_text(const std::string &text)
    {
        Line line = new_line();
        line.add(text);
        keep(line);
    }

    // What takes the drawn lines away and leaves the cursor where they began. A
    // terminal that was made narrower has wrapped them.
    std::string erase()
    {
        if (drawn_.empty()) {
            return {};
        }
        const std::size_t width = terminal_width(terminal_);
        const std::size_t rows = std::accumulate(
            drawn_.begin(), drawn_.end(), std::size_t{0}, [&](std::size_t sum, std::size_t line) {
                return sum + std::max<std::size_t>(1, (line + width - 1) / width);
            });
        drawn_.clear();
        return "\r" + (rows > 1 ? "\x1b[" + std::to_string(rows - 1) + "A" : "") + "\x1b[J";
    }

    // In one piece: a terminal's stream would write line by line, and flicker.
    void show(const std::string &text) const
    {
        write_text(fileno(terminal_), text);
    }

    void draw(const Run &run)
    {
        frame_ += erase();
        for (const Place place : running_) {
            const ItemRun &item = item_at(run, place);
            Line line = item_line(item, !run.why_unfinished.empty());
            line.add(one_line(item.report.description.value_or("")));
            frame_ += line.text() + "\n";
            drawn_.push_back(line.width());
        }
        const Line line = total_line(run);
        frame_ += line.text();
        drawn_.push_back(line.width());
        show(frame_);
        frame_.clear();
        drawn_at_ = Clock::now();
    }

    std::FILE *terminal_;
    bool coloured_;
    std::size_t name_width_ = 8;
    std::size_t suite_ = std::string::npos;
    std::vector<Place> running_;
    std::vector<std::size_t> drawn_; // the widths of the lines that are redrawn
    std::string frame_;
    Clock::time_point drawn_at_;
};

} // namespace

std::unique_ptr<Listener> live_view(std::FILE *terminal, bool colour)
{
    return std::make_unique<LiveView>(terminal, colour);
}

std::unique_ptr<Listener> plain_view(std::FILE *stream, bool quiet)
{
    return std::make_unique<PlainView>(stream, quiet);
}

std::unique_ptr<Listener> suitable_view(std::FILE *stream, bool quiet)
{
    if (quiet || !is_smart_terminal(stream) || terminal_width(stream) < kNarrowest) {
        return plain_view(stream, quiet);
    }
    return live_view(stream, wants_colour());
}

} // namespace fptest
