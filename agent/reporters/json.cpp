// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/reporters.h"

#include "reporters/wording.h"
#include "reporters/writer.h"
#include "util/text.h"
#include "util/times.h"
#include "util/write.h"

#include <cmath>
#include <fcntl.h>
#include <nlohmann/json.hpp>
#include <optional>
#include <unistd.h>
#include <utility>
#include <vector>

namespace fptest
{

namespace
{

using Json = nlohmann::ordered_json;

constexpr int kFormat = 2; // increased whenever readers would have to change

Json text_or_null(const std::optional<std::string> &text)
{
    return text ? Json(sanitize_utf8(*text)) : Json();
}

Json words_or_null(const std::string &words)
{
    return words.empty() ? Json() : Json(sanitize_utf8(words));
}

// Rounded to milliseconds: finer digits are noise.
Json seconds_or_null(const std::optional<double> &seconds)
{
    return seconds ? Json(std::round(*seconds * 1000) / 1000) : Json();
}

void add_report(Json &json, const ItemReport &report)
{
    json["progress"] = text_or_null(report.progress);
    json["result"] = report.result_without_value ? Json("") : text_or_null(report.result);
    json["description"] = text_or_null(report.description);
}

Json start_of(const ItemRun &item)
{
    return item.start ? Json(timestamp(*item.start)) : Json();
}

// How its process ended.
void add_end(Json &json, const ItemRun &item)
{
    json["exit_status"] = item.exit_status ? Json(*item.exit_status) : Json();
    json["signal"] = item.signal != 0 ? Json(name_of_signal(item.signal)) : Json();
    Json left = Json::array();
    for (const Leftover &one : item.left_running) {
        left.push_back({{"name", sanitize_utf8(one.name)}, {"pid", one.process}});
    }
    json["left_running"] = std::move(left);
}

Json number_or_null(const std::optional<double> &number)
{
    return number ? Json(*number) : Json();
}

void add_measurements(Json &json, const ItemRun &item)
{
    Json all = Json::array();
    for (const Measurement &one : item.measured.kept) {
        all.push_back({{"name", one.name},
                       {"value", one.value},
                       {"unit", words_or_null(one.unit)},
                       {"low", number_or_null(one.low)},
                       {"high", number_or_null(one.high)}});
    }
    json["measurements"] = std::move(all);
}

void add_files(Json &json, const ItemRun &item)
{
    Json files = Json::array();
    for (const std::string &file : item.files) {
        files.push_back(sanitize_utf8(file));
    }
    json["directory"] = words_or_null(item.directory);
    json["files"] = std::move(files);
}

Json summary_of(const Run &run)
{
    Json items = Json::array();
    for (const Summary &one : run.summary) {
        const DurationStats &times = one.times;
        Json json = {{"group", sanitize_utf8(one.group)},
                     {"item", sanitize_utf8(one.name)},
                     {"run", times.count()},
                     {"passed", one.passed}};
        const bool is_run = times.count() > 0;
        json["least"] = is_run ? seconds_or_null(times.least()) : Json();
        json["median"] = is_run ? seconds_or_null(times.median()) : Json();
        json["longest"] = is_run ? seconds_or_null(times.longest()) : Json();
        items.push_back(std::move(json));
    }
    return items;
}

class JsonReporter : public Reporter
{
  public:
    explicit JsonReporter(std::string path) : path_(std::move(path))
    {
    }

    void begin(const Run &run) override
    {
        if (path_ == "-") {
            writer_.emplace("standard output", STDOUT_FILENO);
        } else {
            writer_.emplace(path_, O_WRONLY | O_CREAT | O_TRUNC | O_APPEND, 0666);
        }
        Json items = Json::array();
        for (const Suite &suite : run.suites) {
            first_of_.push_back(ended_.size());
            ended_.resize(ended_.size() + suite.items.size(), false);
            for (const ItemRun &item : suite.items) {
                items.push_back(
                    {{"group", sanitize_utf8(item.group)}, {"item", sanitize_utf8(item.name)}});
            }
        }
        Json json = {{"event", "run"}, {"format", kFormat}};
        json["program"] = "fptest";
        json["version"] = FPTEST_VERSION;
        json["library_version"] = words_or_null(run.identity.library);
        json["plan"] = sanitize_utf8(run.plan);
        json["plan_digest"] = words_or_null(run.identity.plan_digest);
        json["vendor"] = run.vendor;
        json["rounds"] = run.rounds ? Json(*run.rounds) : Json();
        json["time_limit"] = seconds_or_null(run.time_limit);
        json["until_fail"] = run.until_fail;
        json["pass_code"] = run.pass_code;
        json["labels"] = Json::object();
        for (const auto &[key, value] : run.identity.labels) {
            json["labels"][key] = sanitize_utf8(value);
        }
        if (run.stop_after) {
            json["stop_after"] = *run.stop_after;
        }
        if (run.limit) {
            json["limit"] = seconds_or_null(run.limit);
        }
        if (run.retries > 0) {
            json["retries"] = run.retries;
        }
        if (run.seed) {
            json["seed"] = *run.seed;
        }
        if (!run.resumed.empty()) {
            json["resumed"] = sanitize_utf8(run.resumed);
        }
        json["start"] = timestamp(run.start);
        json["items"] = std::move(items);
        write(json);
    }

    void started(const Run &run, Place place) override
    {
        Json json = event_of("start", run, place);
        json["start"] = start_of(item_at(run, place));
        add_attempt(json, run, place);
        write(json);
    }

    void progressed(const Run &run, Place place) override
    {
        Json json = event_of("progress", run, place);
        json["time"] = now();
        add_report(json, item_at(run, place).report);
        write(json);
    }

    void ended(const Run &run, Place place) override
    {
        ended_[first_of_[place.suite] + place.item] = true;
        write_end("end", run, place);
    }

    void retried(const Run &run, Place place) override
    {
        write_end("retry", run, place);
    }

    void late(const Run &run, Place place, const TimedReport &report) override
    {
        Json json = event_of("late", run, place);
        json["time"] = timestamp(report.time);
        add_report(json, report);
        write(json);
    }

    void paused(const Run & /* run */) override
    {
        write({{"event", "paused"}, {"time", now()}});
    }

    void resumed(const Run & /* run */) override
    {
        write({{"event", "resumed"}, {"time", now()}});
    }

    void round_over(const Run & /* run */) override
    {
        ended_.assign(ended_.size(), false);
    }

    void finish(const Run &run) override
    {
        end_the_rest(run);
        const Counts counts = count(run);
        Json json = {{"event", "finish"}, {"finished", run.finished}};
        json["reason"] = words_or_null(why_not_all(run));
        json["rounds"] = run.round;
        json["passed"] = counts.passed;
        json["failed"] = counts.failed;
        json["not_run"] = counts.not_run;
        if (run.retries > 0) {
            json["flaky"] = counts.flaky;
            json["retries"] = counts.retries;
        }
        if (run.has_expectations) {
            json["expected"] = counts.expected;
        }
        json["seconds"] = seconds_or_null(run.seconds);
        json["summary"] = summary_of(run);
        write(json);
    }

    bool flush() override
    {
        return !writer_ || !writer_->is_pending();
    }

    std::string failure() const override
    {
        return writer_ ? writer_->failure() : "";
    }

  private:
    static void add_attempt(Json &json, const Run &run, Place place)
    {
        if (run.retries > 0) {
            json["attempt"] = item_at(run, place).earlier.size() + 1;
        }
    }

    static std::string now()
    {
        return timestamp(std::chrono::system_clock::now());
    }

    // Which item of which round it is about.
    Json event_of(const char *name, const Run &run, Place place) const
    {
        const ItemRun &item = item_at(run, place);
        const auto rounds_before = static_cast<std::size_t>(run.round) - 1;
        return {{"event", name},
                {"index", rounds_before * ended_.size() + first_of_[place.suite] + place.item},
                {"group", sanitize_utf8(item.group)},
                {"item", sanitize_utf8(item.name)},
                {"round", run.round}};
    }

    // Unless the run is killed, every item of a round that began has its "end".
    void end_the_rest(const Run &run)
    {
        for (std::size_t suite = 0; suite < first_of_.size(); ++suite) {
            for (std::size_t item = 0; item < run.suites[suite].items.size(); ++item) {
                if (!ended_[first_of_[suite] + item]) {
                    ended(run, {suite, item});
                }
            }
        }
    }

    void write_end(const char *name, const Run &run, Place place)
    {
        const ItemRun &item = item_at(run, place);
        Json json = event_of(name, run, place);
        json["outcome"] = word(item.outcome);
        add_report(json, item.report);
        json["reason"] =
            words_or_null(item.outcome == Outcome::not_run ? why_not_all(run) : item.reason);
        json["start"] = start_of(item);
        json["seconds"] = seconds_or_null(item.seconds);
        add_end(json, item);
        add_measurements(json, item);
        add_files(json, item);
        json["warning"] = words_or_null(item.warning);
        json["output"] = sanitize_utf8(item.output);
        add_attempt(json, run, place);
        if (!item.expected.empty()) {
            json["expected"] = sanitize_utf8(item.expected);
        }
        write(json);
    }

    void write(const Json &json)
    {
        writer_->write(json.dump() + "\n");
    }

    std::string path_;
    std::optional<Writer> writer_;
    std::vector<std::size_t> first_of_; // of each suite, its first among the round's items
    std::vector<bool> ended_;           // each item of the round
};

} // namespace

std::string json_obstacle(const std::string &path)
{
    const int error = path == "-" ? 0 : Writer::obstacle(path);
    return error == 0 ? "" : failure_of(path, error);
}

std::unique_ptr<Reporter> make_json_reporter(const std::string &path)
{
    return std::make_unique<JsonReporter>(path);
}

} // namespace fptest
