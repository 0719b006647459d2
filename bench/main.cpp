// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the library costs beside the bare calls that its job needs: see README.md.
#include "cases.h"
#include "figures.h"
#include "growth.h"

#include <CLI/CLI.hpp>
#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <functional>
#include <malloc.h>
#include <regex>
#include <sched.h>
#include <stdexcept>
#include <string>
#include <unistd.h>
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
};

struct Pace {
    int rounds;
    double seconds;    // how much shorter a round is
    int most_items;    // that are really run
    int trivial_items; // for the comparison with other programs
    bool judged;       // by limits of time
};

constexpr Pace kFull{15, 1.0, 10000, 400, true};
constexpr Pace kQuick{7, 0.2, 100, 50, true};

// On a terminal, what is being measured; it is wiped away by what comes next.
void tell(const std::string &what)
{
    if (isatty(STDERR_FILENO) != 0) {
        std::fprintf(stderr, "\r\033[K%s", what.c_str());
    }
}

// --- the library beside its baseline --------------------------------------------

using Factory = std::function<Comparison()>;

std::vector<Factory> all_comparisons(const Pace &pace)
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
    for (Comparison (*make)() : {trigger, ps_of_all, ps_beside_toybox, ps_of_one}) {
        all.emplace_back(make);
    }
    for (Comparison (*make)(int) : {agent_run_of_silent, agent_run_of_reporting}) {
        all.emplace_back(
            [make, items = pace.most_items < 1000 ? 40 : 1000] { return make(items); });
    }
    return all;
}

// An iteration is a round. What is printed is handed on as counters, which are in the
// JSON file as well.
void compare(benchmark::State &state, const Factory &make, const Pace &pace)
{
    const Comparison comparison = make();
    tell(comparison.name);
    PairedRun run(comparison, pace.seconds);
    std::vector<double> library;
    std::vector<double> baseline;
    std::vector<double> ratio;
    for ([[maybe_unused]] const auto iteration : state) {
        const Round round = run.round();
        state.SetIterationTime(round.library);
        library.push_back(round.library);
        baseline.push_back(round.baseline);
        ratio.push_back(round.library / round.baseline);
    }
    tell("");
    const double limit = pace.judged ? comparison.limit : 0;
    state.counters = {{"library", median(library)},
                      {"baseline", median(baseline)},
                      {"ratio", median(ratio)},
                      {"spread", spread(ratio)},
                      {"limit", limit}};
    print({comparison.name, time_text(median(library)), time_text(median(baseline)),
           decimal(median(ratio), 3), decimal(spread(ratio), 3),
           limit > 0 ? decimal(limit, 2) : "-", verdict(median(ratio), limit, spread(ratio))});
}

// --- growth ---------------------------------------------------------------------

// A curve of the growth: what it is called, what is measured, up to where.
struct Series {
    std::string name;
    Comparison (*make)(int items);
    int most_items;
};

std::vector<Series> all_series(const Pace &pace)
{
    return {{"group run, for each item", group_run, pace.most_items},
            {"report", report, 10000},
            {"first load", first_load, 10000},
            {"lookup by name", lookup_by_name, 10000},
            {"lookup by position", lookup_by_position, 10000}};
}

const Series kSearch{"document search", search, 10000};

Curve curve_of(const Series &series, const Pace &pace)
{
    Curve curve{series.name, {}};
    for (int items = 10; items <= series.most_items; items *= 10) {
        tell("growth: " + series.name + ", " + grouped(items) + " items");
        curve.points.emplace_back(items, measure(series.make(items), 0.5 * pace.seconds));
    }
    tell("");
    return curve;
}

void grow(benchmark::State &state, const Series &series, const Pace &pace,
          std::vector<Curve> &curves)
{
    for ([[maybe_unused]] const auto iteration : state) {
        curves.push_back(curve_of(series, pace));
        state.SetIterationTime(curves.back().points.back().second);
    }
    for (const auto &[items, seconds] : curves.back().points) {
        state.counters[decimal(items, 0)] = seconds;
    }
    state.counters["exponent"] = exponent(curves.back());
}

// --- the program ------------------------------------------------------------------

// Everything that is measured prints itself.
class SilentReporter : public benchmark::BenchmarkReporter
{
  public:
    bool ReportContext(const Context & /* context */) override
    {
        return true;
    }
    void ReportRuns(const std::vector<Run> & /* runs */) override
    {
    }
};

// Has Google Benchmark run what matches. Gives the curves of the growth, each whole; the
// last is the search.
std::vector<Curve> run_benchmarks(const Options &options, const Pace &pace)
{
    const std::regex wanted(options.filter, std::regex::extended);
    std::vector<Curve> curves;
    std::size_t count = 0;
    const auto add = [&](const std::string &name, int rounds, const auto &function) {
        if (std::regex_search(name, wanted)) {
            benchmark::RegisterBenchmark(name.c_str(), function)
                ->UseManualTime()
                ->Iterations(rounds);
            ++count;
        }
    };
    for (const Factory &make : all_comparisons(pace)) {
        const Comparison comparison = make();
        add(comparison.name, comparison.seconds < kLong ? pace.rounds : kQuick.rounds,
            [&, make](benchmark::State &state) { compare(state, make, pace); });
    }
    std::vector<Series> series = all_series(pace);
    series.push_back(kSearch);
    for (const Series &one : series) {
        add("growth: " + one.name, 1,
            [&, one](benchmark::State &state) { grow(state, one, pace, curves); });
    }
    if (count == 0) {
        throw std::runtime_error("no case matches --filter '" + options.filter +
                                 "'; bench/README.md has all of them");
    }

    std::vector<std::string> words{"bench"};
    if (!options.json.empty()) {
        words.push_back("--benchmark_out=" + options.json);
    }
    std::vector<char *> arguments;
    for (std::string &word : words) {
        arguments.push_back(word.data());
    }
    int argc = static_cast<int>(arguments.size());
    benchmark::Initialize(&argc, arguments.data());
    SilentReporter silent;
    benchmark::RunSpecifiedBenchmarks(&silent, ".");
    if (!curves.empty() && curves.back().name != kSearch.name) {
        curves.push_back(curve_of(kSearch, pace));
    }
    return curves;
}

Options parse(int argc, char **argv)
{
    Options options;
    CLI::App app("Measures the library against the bare calls that its job needs. Runs on the "
                 "virtual device: scripts/bench starts it.");
    app.add_flag("--quick", options.quick, "shorter rounds, seven of each; small group runs only");
    app.add_flag("--unjudged", options.unjudged, "judge no time, only sizes");
    app.add_option("--filter", options.filter, "only what matches this regular expression");
    app.add_option("--json", options.json, "write the figures to this file as well");
    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError &error) {
        std::exit(app.exit(error) == 0 ? 0 : 2);
    }
    return options;
}

// On one processor, children included: what is compared then does not depend on
// which one the scheduler finds idle.
void stay_on_one_processor()
{
    cpu_set_t allowed;
    sched_getaffinity(0, sizeof allowed, &allowed);
    int processor = CPU_SETSIZE - 1;
    while (!CPU_ISSET(processor, &allowed)) {
        --processor;
    }
    CPU_ZERO(&allowed);
    CPU_SET(processor, &allowed);
    sched_setaffinity(0, sizeof allowed, &allowed);
}

// Memory that this process has had once it keeps: what the kernel takes to give
// it again is neither side's.
void keep_memory()
{
    mallopt(M_TRIM_THRESHOLD, 1 << 30);
    mallopt(M_MMAP_THRESHOLD, 1 << 30);
}

void run(const Options &options)
{
    Pace pace = options.quick ? kQuick : kFull;
    pace.judged = !options.unjudged;

    print({"", "library", "baseline", "ratio", "+-", "limit"});
    std::vector<Curve> curves = run_benchmarks(options, pace);
    if (!curves.empty()) {
        const Curve search = curves.back();
        curves.pop_back();
        print({});
        print_growth(curves, search, pace.judged);
    }
    if (options.filter.empty()) {
        print({});
        print_sizes();
        print({});
        print_memory();
        tell("other programs that run tests");
        print({});
        print_peers(measure(group_run(40), 0.5 * pace.seconds),
                    presence_query_share(pace.trivial_items), pace.trivial_items);
    }
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
        bench::set_library_output_aside();
        bench::stay_on_one_processor();
        bench::keep_memory();
        bench::run(options);
        return bench::is_a_limit_missed() ? 1 : 0;
    } catch (const std::exception &failure) {
        std::fprintf(stderr, "bench: %s\n", failure.what());
        return 2;
    }
}
