// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the library costs beside the bare calls that its job needs: see README.md.
#include "cases.h"
#include "figures.h"
#include "filter.h"
#include "growth.h"
#include "memory.h"
#include "peers.h"
#include "plan.h"

#include <CLI/CLI.hpp>
#include <benchmark/benchmark.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <fcntl.h>
#include <fstream>
#include <functional>
#include <malloc.h>
#include <map>
#include <memory>
#include <sched.h>
#include <stdexcept>
#include <string>
#include <unistd.h>
#include <utility>
#include <vector>

namespace bench
{
namespace
{

struct Options {
    bool quick = false;
    bool unjudged = false;
    std::string filter; // empty: everything
    std::string json;
    std::string into;
};

struct Pace {
    int rounds;
    double seconds; // how much shorter a round is
    int most_items; // that are really run
    bool judged;    // by limits of time
};

constexpr Pace kFull{15, 1.0, 10000, true};
constexpr Pace kQuick{7, 0.2, 100, true};

// --- output ---------------------------------------------------------------

// The library prints a line for each item. So that it is not among the figures,
// standard output goes nowhere, and the figures go where that went before.
class Output
{
  public:
    Output() : stream_(fdopen(dup(STDOUT_FILENO), "w"))
    {
        if (stream_ == nullptr) {
            fail();
        }
        const int nowhere = open("/dev/null", O_WRONLY);
        dup2(nowhere, STDOUT_FILENO);
        close(nowhere);
    }
    ~Output()
    {
        std::fclose(stream_);
    }
    Output(const Output &) = delete;
    Output &operator=(const Output &) = delete;

    void put(const std::string &text)
    {
        text_ += text;
        if (std::fputs(text.c_str(), stream_) < 0 || std::fflush(stream_) != 0) {
            fail();
        }
    }
    [[nodiscard]] const std::string &text() const
    {
        return text_;
    }

  private:
    [[noreturn]] static void fail()
    {
        throw std::runtime_error(std::string("standard output cannot be written: ") +
                                 std::strerror(errno));
    }

    FILE *stream_;
    std::string text_;
};

// On a terminal, what is being measured; it is wiped away by what comes next.
void tell(const std::string &what)
{
    if (isatty(STDERR_FILENO) != 0) {
        std::fprintf(stderr, "\r\033[K%s", what.c_str());
    }
}

// --- measuring ------------------------------------------------------------

using Factory = std::function<std::unique_ptr<Contest>()>;

void set_time(benchmark::State &state, double seconds)
{
    state.SetIterationTime(seconds);
}

// An iteration is a round. All that is to be printed is handed on as counters,
// which are in the JSON file as well.
void play(benchmark::State &state, const Factory &factory, const Pace &pace)
{
    std::vector<double> module;
    std::vector<double> floor;
    std::vector<double> ratio;
    try {
        const auto contest = factory();
        tell(contest->name());
        Match match(*contest, pace.seconds);
        for ([[maybe_unused]] const auto iteration : state) {
            const Round round = match.round();
            set_time(state, round.module);
            module.push_back(round.module);
            floor.push_back(round.floor);
            ratio.push_back(round.module / round.floor);
        }
        state.counters["module"] = median(module);
        state.counters["floor"] = median(floor);
        state.counters["ratio"] = median(ratio);
        state.counters["spread"] = spread(ratio);
        state.counters["limit"] = pace.judged ? contest->limit() : 0;
    } catch (const std::exception &failure) {
        state.SkipWithError(failure.what());
    }
    tell("");
}

void measure_alone(benchmark::State &state, const Factory &factory, double seconds)
{
    try {
        const auto contest = factory();
        tell("growth: " + contest->name());
        contest->prepare();
        for ([[maybe_unused]] const auto iteration : state) {
            const double took = alone(*contest, seconds);
            set_time(state, took);
            state.counters["seconds"] = took;
        }
    } catch (const std::exception &failure) {
        state.SkipWithError(failure.what());
    }
    tell("");
}

// A curve of the growth: what it is called, what is measured, up to where.
struct Series {
    std::string name;
    std::unique_ptr<Contest> (*contest)(int items);
    int most_items;
};

constexpr const char *kSearch = "document search";

std::vector<Series> all_series(const Pace &pace)
{
    return {{"group run, for each item", group_run, pace.most_items},
            {"report", report, 10000},
            {"first load", first_load, 10000},
            {"lookup by name", lookup_by_name, 10000},
            {"lookup by position", lookup_by_position, 10000},
            {kSearch, search, 10000}};
}

std::vector<int> sizes_of(const Series &series)
{
    std::vector<int> sizes;
    for (int items = 10; items <= series.most_items; items *= 10) {
        sizes.push_back(items);
    }
    return sizes;
}

std::string point_name(const Series &series, int items)
{
    return "growth: " + series.name + ", " + grouped(items) + " items";
}

std::vector<Factory> all_contests(const Pace &pace)
{
    std::vector<Factory> all{ping, unknown_head, store};
    for (const int items : {40, 1000}) {
        if (items <= std::max(pace.most_items, 40)) {
            all.emplace_back([items] { return group_run(items); });
        }
    }
    for (const int items : {40, 1000}) {
        all.emplace_back([items] { return report(items); });
    }
    for (const int kilobytes : {2, 64, 1024}) {
        all.emplace_back([kilobytes] { return read_back(kilobytes); });
    }
    for (const int items : {40, 1000, 10000}) {
        all.emplace_back([items] { return first_load(items); });
        all.emplace_back([items] { return first_load_to_parser(items); });
    }
    all.emplace_back(trigger);
    return all;
}

void register_contest(const Factory &factory, const Contest &contest, const Pace &pace)
{
    const int rounds = contest.round() < kLong ? pace.rounds : kQuick.rounds;
    benchmark::RegisterBenchmark(
        contest.name().c_str(),
        [factory, pace](benchmark::State &state) { play(state, factory, pace); })
        ->UseManualTime()
        ->Iterations(rounds);
}

void register_series(const Series &series, const Pace &pace)
{
    for (const int items : sizes_of(series)) {
        const Factory factory = [series, items] { return series.contest(items); };
        const double seconds = 0.5 * pace.seconds;
        benchmark::RegisterBenchmark(
            point_name(series, items).c_str(),
            [factory, seconds](benchmark::State &state) { measure_alone(state, factory, seconds); })
            ->UseManualTime()
            ->Iterations(1);
    }
}

// A curve is measured whole, and with it the search that it is judged by.
int register_growth(const Filter &filter, const Pace &pace)
{
    int count = 0;
    for (const Series &series : all_series(pace)) {
        const bool wanted = filter.takes("growth: " + series.name);
        if (wanted || (count > 0 && series.name == kSearch)) {
            register_series(series, pace);
            ++count;
        }
    }
    return count;
}

void register_all(const Filter &filter, const Pace &pace)
{
    int count = 0;
    for (const Factory &factory : all_contests(pace)) {
        const auto contest = factory();
        if (filter.takes(contest->name())) {
            register_contest(factory, *contest, pace);
            ++count;
        }
    }
    count += register_growth(filter, pace);
    if (count == 0) {
        throw std::runtime_error("no case matches --filter '" + filter.text() +
                                 "'; bench/README.md has all of them");
    }
}

// --- what came of it ------------------------------------------------------

// Prints each contest as soon as it is decided, and keeps the growth's points.
class Reporter : public benchmark::BenchmarkReporter
{
  public:
    explicit Reporter(Output &output) : output_(output)
    {
    }
    bool ReportContext(const Context & /* context */) override
    {
        output_.put(heading());
        return true;
    }
    void ReportRuns(const std::vector<Run> &runs) override
    {
        for (const Run &run : runs) {
            const std::string &name = run.run_name.function_name;
            if (run.error_occurred) {
                throw std::runtime_error(run.error_message);
            }
            if (run.counters.contains("seconds")) {
                points_[name] = run.counters.at("seconds");
                continue;
            }
            const Result result{run.counters.at("module"), run.counters.at("floor"),
                                run.counters.at("ratio"), run.counters.at("spread"),
                                run.counters.at("limit")};
            missed_ |= result.missed();
            unclear_ |= result.barely();
            results_[name] = result;
            output_.put(result_line(name, result));
        }
    }

    [[nodiscard]] bool missed() const
    {
        return missed_;
    }
    [[nodiscard]] bool unclear() const
    {
        return unclear_;
    }
    [[nodiscard]] const std::map<std::string, Result> &results() const
    {
        return results_;
    }
    [[nodiscard]] const std::map<std::string, double> &points() const
    {
        return points_;
    }

  private:
    Output &output_;
    bool missed_ = false;
    bool unclear_ = false;
    std::map<std::string, Result> results_;
    std::map<std::string, double> points_;
};

std::vector<Curve> curves_of(const std::map<std::string, double> &points, const Pace &pace)
{
    std::vector<Curve> curves;
    for (const Series &series : all_series(pace)) {
        Curve curve{series.name, {}};
        for (const int items : sizes_of(series)) {
            const auto point = points.find(point_name(series, items));
            if (point != points.end()) {
                curve.points.push_back({static_cast<double>(items), point->second});
            }
        }
        if (curve.points.size() > 1) {
            curves.push_back(curve);
        }
    }
    return curves;
}

// --- the program ----------------------------------------------------------

Options parse(int argc, char **argv)
{
    Options options;
    CLI::App app("Measures the library against the bare calls that its job needs. Runs on the "
                 "virtual device: scripts/bench starts it.");
    app.add_flag("--quick", options.quick, "shorter rounds, seven of each; small group runs only");
    app.add_flag("--unjudged", options.unjudged, "judge no time, only sizes");
    app.add_option("--filter", options.filter, "only what matches this regular expression");
    app.add_option("--json", options.json, "write the figures to this file as well");
    app.add_option("--into", options.into, "write table.txt and growth.svg into this directory");
    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError &error) {
        std::exit(app.exit(error) == 0 ? 0 : 2);
    }
    return options;
}

void initialise_benchmark(const Options &options)
{
    std::vector<std::string> words{"bench"};
    if (!options.json.empty()) {
        words.push_back("--benchmark_out=" + options.json);
    }
    std::vector<char *> arguments;
    for (std::string &word : words) {
        arguments.push_back(word.data());
    }
    int count = static_cast<int>(arguments.size());
    benchmark::Initialize(&count, arguments.data());
}

// On one processor, children included: what is compared then does not depend on
// which one the scheduler finds idle.
void stay_on_one_processor()
{
    cpu_set_t allowed;
    sched_getaffinity(0, sizeof allowed, &allowed);
    for (int processor = CPU_SETSIZE - 1; processor >= 0; --processor) {
        if (CPU_ISSET(processor, &allowed)) {
            CPU_ZERO(&allowed);
            CPU_SET(processor, &allowed);
            sched_setaffinity(0, sizeof allowed, &allowed);
            return;
        }
    }
}

void write_file(const std::string &path, const std::string &text)
{
    std::ofstream file(path, std::ios::trunc);
    file << text;
    if (!file.flush()) {
        throw std::runtime_error(path + " cannot be written");
    }
}

// Memory that this process has had once it keeps: what the kernel takes to give
// it again is neither side's.
void keep_memory()
{
    mallopt(M_TRIM_THRESHOLD, 1 << 30);
    mallopt(M_MMAP_THRESHOLD, 1 << 30);
}

int run(const Options &options)
{
    Pace pace = options.quick ? kQuick : kFull;
    pace.judged = !options.unjudged;
    Output output;
    Reporter reporter(output);

    register_all(Filter(options.filter), pace);
    initialise_benchmark(options);
    benchmark::RunSpecifiedBenchmarks(&reporter, ".");
    bool missed = reporter.missed();
    const std::vector<Curve> curves = curves_of(reporter.points(), pace);
    if (!curves.empty()) {
        const Verdict verdict = growth_table(curves, pace.judged);
        missed |= verdict.missed;
        output.put("\n" + verdict.table);
    }
    if (options.filter.empty()) {
        for (const Verdict &verdict : {size_table(), memory_table()}) {
            missed |= verdict.missed;
            output.put("\n" + verdict.table);
        }
        tell("other programs that run tests");
        const std::string peers =
            peer_table(reporter.results().at(group_run(40)->name()).module,
                       presence_query_share(options.quick ? 50 : 500), options.quick ? 50 : 400);
        tell("");
        output.put("\n" + peers);
    }
    if (!options.into.empty()) {
        write_file(options.into + "/table.txt", output.text());
        if (!curves.empty()) {
            write_file(options.into + "/growth.svg", chart(curves));
        }
    }
    if (reporter.unclear()) {
        output.put("\nUnclear: by no more than the rounds differ; let nothing else run, and "
                   "repeat.\n");
    }
    output.put(missed        ? "\nA limit is missed.\n"
               : pace.judged ? "\nNo limit is missed.\n"
                             : "\nNo limit is missed; times were not judged.\n");
    return missed ? 1 : 0;
}

} // namespace
} // namespace bench

int main(int argc, char **argv)
{
    const bench::Options options = bench::parse(argc, argv);
    if (std::getenv("QUILLMARK_DEVICE") == nullptr) {
        std::fputs("bench: this is not the virtual device: run scripts/bench\n", stderr);
        return 2;
    }
    try {
        bench::stay_on_one_processor();
        bench::keep_memory();
        return bench::run(options);
    } catch (const std::exception &failure) {
        std::fprintf(stderr, "bench: %s\n", failure.what());
        return 2;
    }
}
