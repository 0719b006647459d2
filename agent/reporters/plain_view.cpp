// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/reporters.h"

#include "reporters/wording.h"
#include "reporters/writer.h"
#include "util/text.h"
#include "util/times.h"

#include <algorithm>
#include <fmt/core.h>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace fptest
{
namespace
{

constexpr double kBetweenProgressLines = 10; // seconds of the item's time

class PlainView : public Reporter
{
  public:
    PlainView(std::FILE *stream, bool quiet)
        : writer_("standard output", fileno(stream)), quiet_(quiet)
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
        running_.push_back(place);
    }

    void tick(const Run &run) override
    {
        const auto running = std::ranges::find_if(
            running_, [&run](const Place &place) { return !item_at(run, place).seconds; });
        if (quiet_ || running == running_.end()) {
            return;
        }
        if (*running != place_) {
            show_next(*running);
        }
        const ItemRun &item = item_at(run, *place_);
        if (item.running < said_at_ + kBetweenProgressLines) {
            return;
        }
        said_at_ = item.running;
        print(fmt::format(
            "{}: {}{}, {}", one_line(title(run, item)), item.stopping ? "stopping" : "running",
            item.report.progress ? ", progress " + one_line(*item.report.progress) : "",
            duration(item.running)));
        print_lines(last_lines(new_output(item.output)));
        output_said_ = item.output;
    }

    void ended(const Run &run, Place place) override
    {
        show_end(run, place, "");
    }

    void retried(const Run &run, Place place) override
    {
        show_end(run, place, attempt_of(run, item_at(run, place)) + ": ");
    }

    void late(const Run &run, Place place, const TimedReport &report) override
    {
        print(late_report(run, place, report));
    }

    void finish(const Run &run) override
    {
        print(not_finished(run));
        if (quiet_) {
            return;
        }
        print(ended_early(run));
        for (const std::string &line : summary_table(run)) {
            print(line);
        }
        print(total(run));
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
    void show_next(std::optional<Place> place)
    {
        place_ = place;
        said_at_ = 0;
        output_said_.clear();
    }

    // How an attempt has ended that is not the last one is said before.
    void show_end(const Run &run, Place place, const std::string &attempt)
    {
        std::erase(running_, place);
        if (place_ == place) {
            show_next({}); // it may run again
        }
        const ItemRun &item = item_at(run, place);
        const bool passed = item.outcome == Outcome::passed;
        if (quiet_ && passed && item.left_running.empty()) {
            return;
        }
        std::string text = fmt::format("{}: {}{}{}", one_line(title(run, item)), attempt,
                                       word(item.outcome), reported_result(item.report));
        if (const std::string how = how_it_ended(item); !how.empty()) {
            text += ", " + how;
        }
        if (attempt.empty() && !item.earlier.empty()) {
            text += ", " + attempt_of(run, item);
        }
        if (item.seconds) {
            text += ", " + duration(*item.seconds);
        }
        const std::string said = remark(item);
        print(text + (said.empty() ? "" : ": " + said));
        for (const Note &note : notes(item)) {
            print("    " + note.text);
        }
        if (!is_success(item.outcome)) {
            print_lines(last_lines(item));
        }
    }

    // What is new since it was last shown. Once the start of the output has been
    // dropped nobody knows, and the last lines are shown again.
    std::string_view new_output(const std::string &output) const
    {
        const bool is_more = output.starts_with(output_said_);
        return std::string_view(output).substr(is_more ? output_said_.size() : 0);
    }

    void print_lines(const std::vector<std::string> &lines)
    {
        for (const std::string &line : lines) {
            print("    | " + line);
        }
    }

    void print(const std::string &text)
    {
        if (!text.empty()) {
            writer_.write(text + "\n");
        }
    }

    Writer writer_;
    bool quiet_;
    std::vector<Place> running_;
    std::optional<Place> place_; // of whose progress it tells
    double said_at_ = 0;
    std::string output_said_;
};

} // namespace

std::unique_ptr<Reporter> make_plain_view(std::FILE *stream, bool quiet)
{
    return std::make_unique<PlainView>(stream, quiet);
}

} // namespace fptest
