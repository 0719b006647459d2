// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reports.h"

#include "descriptor.h"
#include "text.h"
#include "write.h"

#include <cmath>
#include <fcntl.h>
#include <nlohmann/json.hpp>
#include <optional>
#include <sys/stat.h>
#include <utility>
#include <vector>

namespace fptest
{

namespace
{

using Json = nlohmann::ordered_json;

constexpr int kFormat = 1; // one more whenever a reader would have to be changed

Json text_or_null(const std::optional<std::string> &text)
{
    return text ? Json(clean(*text)) : Json();
}

Json words_or_null(const std::string &words)
{
    return words.empty() ? Json() : Json(clean(words));
}

// In milliseconds: the digits behind them are noise.
Json seconds_or_null(const std::optional<double> &seconds)
{
    return seconds ? Json(std::round(*seconds * 1000) / 1000) : Json();
}

Json event(const char *name)
{
    return {{"event", name}};
}

// Which of the planned items an event is about.
Json event(const char *name, const Run &run, Place place)
{
    std::size_t index = place.item;
    for (std::size_t suite = 0; suite < place.suite; ++suite) {
        index += run.suites[suite].items.size();
    }
    const Suite &suite = run.suites[place.suite];
    const ItemRun &item = suite.items[place.item];
    return {{"event", name},
            {"index", index},
            {"group", clean(item.group)},
            {"item", clean(item.name)},
            {"round", suite.round}};
}

void add_report(Json &json, const Report &report)
{
    json["progress"] = text_or_null(report.progress);
    json["result"] = report.result_without_value ? Json("") : text_or_null(report.result);
    json["description"] = text_or_null(report.description);
}

Json start_of(const ItemRun &item)
{
    return item.start ? Json(timestamp(*item.start)) : Json();
}

Json planned_items(const Run &run)
{
    Json items = Json::array();
    for (const Suite &suite : run.suites) {
        for (const ItemRun &item : suite.items) {
            items.push_back(
                {{"group", clean(item.group)}, {"item", clean(item.name)}, {"round", suite.round}});
        }
    }
    return items;
}

class JsonReport : public Listener
{
  public:
    explicit JsonReport(std::string path) : path_(std::move(path))
    {
    }

    void begin(const Run &run) override
    {
        open_file();
        for (const Suite &suite : run.suites) {
            ended_.emplace_back(suite.items.size(), false);
        }
        Json json = event("run");
        json["format"] = kFormat;
        json["program"] = "fptest";
        json["version"] = FPTEST_VERSION;
        json["plan"] = clean(run.plan);
        json["vendor"] = run.vendor;
        json["rounds"] = run.rounds;
        json["pass_code"] = run.pass_code;
        json["start"] = timestamp(run.start);
        json["items"] = planned_items(run);
        write(json);
    }

    void started(const Run &run, Place place) override
    {
        Json json = event("start", run, place);
        json["start"] = start_of(item_at(run, place));
        write(json);
    }

    void progressed(const Run &run, Place place) override
    {
        Json json = event("progress", run, place);
        json["time"] = timestamp(std::chrono::system_clock::now());
        add_report(json, item_at(run, place).report);
        write(json);
    }

    void ended(const Run &run, Place place) override
    {
        ended_[place.suite][place.item] = true;
        const ItemRun &item = item_at(run, place);
        Json json = event("end", run, place);
        json["outcome"] = word(item.outcome);
        add_report(json, item.report);
        json["reason"] = words_or_null(item.reason);
        json["start"] = start_of(item);
        json["seconds"] = seconds_or_null(item.seconds);
        json["output"] = clean(item.output);
        write(json);
    }

    void finish(const Run &run) override
    {
        end_the_rest(run);
        const Counts counts = count(run);
        Json json = event("finish");
        json["finished"] = run.finished;
        json["reason"] = words_or_null(run.why_unfinished);
        json["passed"] = counts.passed;
        json["failed"] = counts.failed;
        json["not_run"] = counts.to_go;
        json["seconds"] = seconds_or_null(run.seconds);
        write(json);
    }

    std::string failure() const override
    {
        return failure_;
    }

  private:
    static const ItemRun &item_at(const Run &run, Place place)
    {
        return run.suites[place.suite].items[place.item];
    }

    void open_file()
    {
        if (path_ == "-") {
            path_ = "standard output";
            descriptor_ = STDOUT_FILENO;
            return;
        }
        file_ = Descriptor(
            open(path_.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_APPEND | O_CLOEXEC, 0666));
        descriptor_ = file_.get();
        if (!file_.is_open()) {
            failure_ = failure_of(path_, errno);
        }
    }

    // So that every planned item has its end in the file of a run that was not
    // killed.
    void end_the_rest(const Run &run)
    {
        for (std::size_t suite = 0; suite < ended_.size(); ++suite) {
            for (std::size_t item = 0; item < ended_[suite].size(); ++item) {
                if (!ended_[suite][item]) {
                    ended(run, {suite, item});
                }
            }
        }
    }

    void write(const Json &json)
    {
        if (!failure_.empty()) {
            return;
        }
        const std::string line = json.dump() + "\n";
        const std::size_t written = write_text(descriptor_, line);
        if (written < line.size()) {
            failure_ = failure_of(path_, errno);
            take_back(written);
        }
    }

    // A line that found no room would be taken for a broken file. What goes to
    // standard output is not this object's to cut.
    void take_back(std::size_t written)
    {
        struct stat status {
        };
        if (file_.is_open() && fstat(file_.get(), &status) == 0 && S_ISREG(status.st_mode)) {
            // where even that fails the last line is left broken, and the failure is told
            [[maybe_unused]] const int result =
                ftruncate(file_.get(), status.st_size - static_cast<off_t>(written));
        }
    }

    std::string path_;
    Descriptor file_{-1};
    int descriptor_ = -1;
    std::vector<std::vector<bool>> ended_;
    std::string failure_;
};

} // namespace

std::unique_ptr<Listener> json_report(const std::string &path)
{
    return std::make_unique<JsonReport>(path);
}

} // namespace fptest
