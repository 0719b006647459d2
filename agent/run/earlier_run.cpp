// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/earlier_run.h"

#include "util/failure.h"
#include "util/input_file.h"
#include "util/text.h"

#include <csignal>
#include <ctime>
#include <nlohmann/json.hpp>
#include <optional>
#include <stdexcept>
#include <string_view>

namespace fptest
{
namespace
{

using Object = nlohmann::json;

constexpr int kFormatRead = 2;
constexpr int kMostRounds = 1'000'000;
constexpr int kMostRetries = 100;
constexpr std::string_view kBegin = R"({"event":"run")"; // of the first line

template <typename Value> std::optional<Value> value_or_none(const Object &object, const char *key)
{
    const auto found = object.find(key);
    return found == object.end() || found->is_null() ? std::nullopt
                                                     : std::optional(found->get<Value>());
}

// A whole number that fptest takes for the option, or none.
std::optional<int> number_or_none(const Object &object, const char *key, int low, int high)
{
    const auto found = object.find(key);
    if (found == object.end() || found->is_null()) {
        return std::nullopt;
    }
    if (!found->is_number_integer() || *found < low || *found > high) {
        throw std::runtime_error(fmt::format("{} is {}", in_quotes(key), found->dump()));
    }
    return found->get<int>();
}

std::string text_of(const Object &object, const char *key)
{
    return value_or_none<std::string>(object, key).value_or("");
}

Outcome outcome_of(const std::string &text)
{
    for (int at = 0; at <= static_cast<int>(Outcome::unexpected); ++at) {
        if (text == word(static_cast<Outcome>(at))) {
            return static_cast<Outcome>(at);
        }
    }
    throw std::runtime_error("there is no outcome " + in_quotes(text));
}

int signal_named(const std::string &text)
{
    int signal = 0;
    while (signal < NSIG && (signal == 0 || name_of_signal(signal) != text)) {
        ++signal;
    }
    return signal < NSIG ? signal : 0;
}

// As timestamp() writes it.
std::optional<std::chrono::system_clock::time_point> time_of(const std::string &text)
{
    std::tm parts{};
    const char *const rest = strptime(text.c_str(), "%Y-%m-%dT%H:%M:%S", &parts);
    if (rest == nullptr || *rest != '.') {
        return std::nullopt;
    }
    return std::chrono::system_clock::from_time_t(timegm(&parts)) +
           std::chrono::milliseconds(std::strtol(rest + 1, nullptr, 10));
}

ItemReport report_of(const Object &object)
{
    ItemReport report;
    report.progress = value_or_none<std::string>(object, "progress");
    report.result = value_or_none<std::string>(object, "result");
    report.result_without_value = report.result == "";
    if (report.result_without_value) {
        report.result.reset();
    }
    report.description = value_or_none<std::string>(object, "description");
    return report;
}

// A run before this one may have none.
void add_what_it_left(ItemRun &item, const Object &end)
{
    for (const Object &one : end.value("measurements", Object::array())) {
        item.measured.kept.push_back({one.at("name"), one.at("value"), text_of(one, "unit"),
                                      value_or_none<double>(one, "low"),
                                      value_or_none<double>(one, "high")});
    }
    for (const Object &file : end.value("files", Object::array())) {
        item.files.push_back(file);
    }
    item.directory = text_of(end, "directory");
    item.warning = text_of(end, "warning");
}

ItemRun item_of(const Object &end)
{
    ItemRun item;
    item.group = end.at("group");
    item.name = end.at("item");
    item.outcome = outcome_of(end.at("outcome"));
    item.report = report_of(end);
    item.reason = text_of(end, "reason");
    item.start = time_of(text_of(end, "start"));
    item.seconds = value_or_none<double>(end, "seconds");
    item.exit_status = value_or_none<int>(end, "exit_status");
    item.signal = signal_named(text_of(end, "signal"));
    for (const Object &one : end.at("left_running")) {
        item.left_running.push_back({one.at("name"), one.at("pid"), 0, 0});
    }
    add_what_it_left(item, end);
    item.output = text_of(end, "output");
    item.expected = text_of(end, "expected");
    return item;
}

class EarlierRunReader
{
  public:
    explicit EarlierRunReader(const std::string &file)
    {
        earlier_.file = one_line(file);
    }

    EarlierRun read(LineReader lines)
    {
        std::string line;
        bool is_more = lines.next(line);
        if (!is_more) {
            throw NothingKnown(Cause::input, "{} is empty: nothing is known of that run",
                               earlier_.file);
        }
        for (number_ = 1; is_more; ++number_) {
            Object object = Object::parse(line, nullptr, false);
            const bool may_begin = line.starts_with(kBegin) || kBegin.starts_with(line);
            is_more = lines.next(line);
            earlier_.is_cut = object.is_discarded() && !is_more;
            if (earlier_.is_cut) {
                if (!has_begun_ && may_begin) {
                    throw NothingKnown(Cause::input,
                                       "{} is cut in its first line: nothing is known of that run",
                                       earlier_.file);
                }
                break;
            }
            take(object);
        }
        if (!has_begun_) {
            throw not_written();
        }
        for (const std::size_t index : running_) {
            earlier_.failed.insert(name_at(index));
        }
        add_attempts_to_unended();
        return std::move(earlier_);
    }

  private:
    Failure not_written() const
    {
        return {Cause::input, "{} is not what fptest run --json writes", earlier_.file};
    }

    void take(const Object &object)
    {
        try {
            const std::string event = object.is_object() ? text_of(object, "event") : "";
            if (!has_begun_) {
                begin(object, event);
            } else if (!object.is_object()) {
                throw std::runtime_error("it is no JSON object");
            } else if (event == "run") {
                throw std::runtime_error("another run begins here");
            } else if (event == "start") {
                start(object);
            } else if (event == "progress") {
                unended(object).report = report_of(object);
            } else if (event == "late") {
                earlier_.late.emplace(
                    index_of(object),
                    TimedReport{report_of(object),
                                time_of(text_of(object, "time")).value_or(earlier_.run.start)});
            } else if (event == "retry") {
                add_attempt(object);
                running_.insert(index_of(object)); // it is to begin again
            } else if (event == "end") {
                end(object);
            } else if (event == "finish") {
                finish(object);
            }
        } catch (const std::exception &error) {
            if (dynamic_cast<const Failure *>(&error) != nullptr) {
                throw;
            }
            throw Failure(Cause::input, "{}:{}: this is not what fptest run --json writes: {}",
                          earlier_.file, number_, one_line(error.what()));
        }
    }

    void begin(const Object &object, const std::string &event)
    {
        if (event != "run" || text_of(object, "program") != "fptest") {
            throw not_written();
        }
        if (object.at("format") != kFormatRead) {
            throw Failure(Cause::input, "{} has the format {}, and this fptest reads {}",
                          earlier_.file, one_line(object.at("format").dump()), kFormatRead);
        }
        Run &run = earlier_.run;
        earlier_.version = text_of(object, "version");
        run.identity.library = text_of(object, "library_version");
        const Object labels = object.value("labels", Object::object());
        for (const auto &[key, value] : labels.items()) {
            run.identity.labels.emplace_back(key, value);
        }
        run.start = time_of(text_of(object, "start")).value_or(run.start);
        run.resumed = text_of(object, "resumed");
        run.plan = object.at("plan");
        run.identity.plan_digest = value_or_none<std::string>(object, "plan_digest").value_or("");
        run.vendor = object.at("vendor");
        run.rounds = number_or_none(object, "rounds", 1, kMostRounds);
        run.time_limit = value_or_none<double>(object, "time_limit");
        run.until_fail = object.at("until_fail");
        run.pass_code = number_or_none(object, "pass_code", -2, 1).value_or(0);
        run.stop_after = number_or_none(object, "stop_after", 1, kMostRounds);
        run.retries = number_or_none(object, "retries", 0, kMostRetries).value_or(0);
        run.seed = value_or_none<int>(object, "seed");
        for (const Object &item : object.at("items")) {
            earlier_.items.emplace_back(item.at("group"), item.at("item"));
        }
        has_begun_ = true;
    }

    // It must be one of the items that the run began with.
    std::size_t index_of(const Object &object) const
    {
        if (!object.at("index").is_number_unsigned()) {
            throw std::runtime_error("its index is no number");
        }
        const auto index = object.at("index").get<std::size_t>();
        if (earlier_.items.empty() ||
            name_at(index) != EarlierRun::Name(object.at("group"), object.at("item"))) {
            throw std::runtime_error("its item is not the one that the index says");
        }
        return index;
    }

    const EarlierRun::Name &name_at(std::size_t index) const
    {
        return earlier_.items[index % earlier_.items.size()];
    }

    ItemRun &unended(const Object &object)
    {
        ItemRun &item = earlier_.unended[index_of(object)];
        item.group = object.at("group");
        item.name = object.at("item");
        return item;
    }

    void start(const Object &object)
    {
        running_.insert(index_of(object));
        ItemRun &item = unended(object);
        item.start = time_of(text_of(object, "start"));
    }

    void add_attempts_to_unended()
    {
        for (auto &[index, item] : earlier_.unended) {
            const auto before = earlier_.attempts.find(index);
            if (before != earlier_.attempts.end()) {
                item.earlier = before->second.earlier;
                item.earlier.push_back(before->second);
                item.earlier.back().earlier.clear();
            }
        }
    }

    ItemRun &add_attempt(const Object &object)
    {
        const std::size_t index = index_of(object);
        ItemRun item = item_of(object);
        ItemRun &last = earlier_.attempts[index];
        if (!last.name.empty()) {
            item.earlier = std::exchange(last.earlier, {});
            item.earlier.push_back(std::move(last));
        }
        earlier_.run.seconds += item.seconds.value_or(0);
        last = std::move(item);
        running_.erase(index);
        earlier_.unended.erase(index);
        return last;
    }

    void end(const Object &object)
    {
        const std::size_t index = index_of(object);
        const Outcome outcome = outcome_of(object.at("outcome"));
        if (outcome == Outcome::stopped) {
            running_.insert(index); // it has to begin again
        }
        if (outcome == Outcome::stopped || outcome == Outcome::not_run) {
            ItemRun &item = unended(object);
            item = item_of(object);
            earlier_.run.seconds += item.seconds.value_or(0);
            return;
        }
        add_attempt(object);
        earlier_.ended.insert(index);
        if (!is_success(outcome)) {
            earlier_.failed.insert(name_at(index));
        }
    }

    void finish(const Object &object)
    {
        earlier_.run.finished = object.at("finished");
        earlier_.run.seconds = value_or_none<double>(object, "seconds").value_or(0);
        (earlier_.run.finished ? earlier_.run.why_ended : earlier_.run.why_unfinished) =
            text_of(object, "reason");
    }

    EarlierRun earlier_;
    std::size_t number_ = 0; // of the line
    bool has_begun_ = false;
    std::set<std::size_t> running_; // or are to begin again
};

} // namespace

EarlierRun read_earlier_run(const std::string &file, const std::string &name)
{
    return EarlierRunReader(name).read(LineReader(file, name));
}

void require_items(const EarlierRun &earlier, const std::set<EarlierRun::Name> &items,
                   const Plan &plan, const std::string &plan_name)
{
    constexpr std::size_t kNamed = 3;
    std::set<EarlierRun::Name> here;
    for (const std::string &group : group_names(plan)) {
        for (const std::string &item : item_names(plan, group)) {
            here.emplace(sanitize_utf8(group), sanitize_utf8(item));
        }
    }
    std::vector<std::string> missing;
    std::size_t count = 0;
    for (const EarlierRun::Name &item : items) {
        if (!here.contains(item) && ++count <= kNamed) {
            missing.push_back(one_line(item.first + "/" + item.second));
        }
    }
    if (count > kNamed) {
        missing.push_back(fmt::format("{} more", count - kNamed));
    }
    if (count > 0) {
        throw Failure(Cause::input, "{} is of another plan: it has {}, and {} has not",
                      earlier.file, join_and(missing), one_line(plan_name));
    }
}

} // namespace fptest
