// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Runs that are not run: what reporters are told of them.
#pragma once

#include "run/results.h"

#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace playback
{

using namespace fptest;
using RunOfItems = fptest::Run; // a test has a Run of its own

const std::chrono::system_clock::time_point
    kStart(std::chrono::milliseconds(1714979289123)); // 2024-05-06T07:08:09.123Z

inline ItemRun item(const std::string &name, Outcome outcome, const std::string &reason = "")
{
    ItemRun item;
    item.name = name;
    item.outcome = outcome;
    item.reason = reason;
    if (outcome != Outcome::not_run) {
        item.start = kStart + std::chrono::seconds(1);
        item.seconds = 0.301;
    }
    return item;
}

inline ItemRun passed(const std::string &name)
{
    ItemRun one = item(name, Outcome::passed);
    one.report = {"100", "0", false, "chip answers"};
    return one;
}

inline ItemRun failed(const std::string &name)
{
    ItemRun one = item(name, Outcome::failed, "result 1");
    one.report = {"100", "1", false, "3 dead pixels"};
    one.output = "row 7\nrow 9\n";
    return one;
}

inline Suite suite(const std::string &group, std::vector<ItemRun> items)
{
    for (ItemRun &one : items) {
        one.group = group;
    }
    return {group, std::move(items)};
}

inline RunOfItems run_of(std::vector<Suite> suites)
{
    RunOfItems run;
    run.plan = "plans/demo.xml";
    run.vendor = 1;
    run.pass_code = 0;
    run.suites = std::move(suites);
    run.start = kStart;
    run.seconds = 2.5;
    run.finished = true;
    return run;
}

// One of every outcome.
inline RunOfItems mixed_run()
{
    RunOfItems run =
        run_of({suite("Bringup", {passed("SpiCheck"), failed("DeadPixel"),
                                  item("QuietRun", Outcome::no_result, "it reported nothing")}),
                suite("Endurance", {item("Slow", Outcome::timed_out, "stopped after 5 s"),
                                    item("BurnIn", Outcome::stopped, "interrupted by Ctrl-C"),
                                    item("Last", Outcome::not_run)})});
    run.finished = false;
    run.why_unfinished = "interrupted by Ctrl-C";
    return run;
}

// Tells reporters of a run as the runner does: what has not happened yet is not
// in the run either.
class Playback
{
  public:
    Playback(Reporter &reporter, const RunOfItems &end) : reporter_(reporter), end_(end), now_(end)
    {
        now_.finished = false;
        now_.why_unfinished.clear();
        now_.seconds = 0;
        plan();
    }

    void begin()
    {
        reporter_.begin(now_);
    }
    void start(Place place)
    {
        now(place).start = end(place).start;
        reporter_.started(now_, place);
    }
    void progress(Place place, const ItemReport &report)
    {
        now(place).report = report;
        reporter_.progressed(now_, place);
    }
    void end_item(Place place)
    {
        now(place) = end(place);
        reporter_.ended(now_, place);
    }
    void report_late(Place place, const ItemReport &report)
    {
        reporter_.late(now_, place, {report, std::chrono::system_clock::now()});
    }
    void run_item(Place place)
    {
        start(place);
        progress(place, {"10", std::nullopt, false, std::nullopt});
        end_item(place);
    }
    void tick()
    {
        reporter_.tick(now_);
    }
    // It has ended, but one that started before it has not, which is told first.
    void end_unseen(Place place)
    {
        now(place).seconds = end(place).seconds;
    }
    // After that many seconds of it, with what it has printed until then.
    void tick(Place place, double seconds, const std::string &output)
    {
        now(place).running = seconds;
        now(place).output = output;
        tick();
    }
    // Which ends as the one before.
    void begin_next_round()
    {
        summarize(now_);
        reporter_.round_over(now_);
        for (const Suite &one : now_.suites) {
            now_.before += count(one.items);
        }
        plan();
        ++now_.round;
    }
    // What becomes of it from now on.
    void end_as(const RunOfItems &end)
    {
        end_ = end;
    }
    void finish()
    {
        RunOfItems last = end_;
        last.round = now_.round;
        last.before = now_.before;
        last.summary = now_.summary;
        now_ = last;
        summarize(now_);
        reporter_.finish(now_);
        while (!reporter_.flush()) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
    }

    // All of it.
    void play(int rounds = 1)
    {
        begin();
        play_round();
        for (; rounds > 1; --rounds) {
            begin_next_round();
            play_round();
        }
        finish();
    }
    void pause()
    {
        reporter_.paused(now_);
    }
    void resume()
    {
        reporter_.resumed(now_);
    }

    void play_round()
    {
        for (std::size_t suite = 0; suite < end_.suites.size(); ++suite) {
            for (std::size_t item = 0; item < end_.suites[suite].items.size(); ++item) {
                if (end({suite, item}).outcome != Outcome::not_run) {
                    run_item({suite, item});
                }
            }
        }
    }

  private:
    void plan()
    {
        for (Suite &one : now_.suites) {
            for (ItemRun &item : one.items) {
                ItemRun planned;
                planned.group = item.group;
                planned.name = item.name;
                item = planned;
            }
        }
    }
    ItemRun &now(Place place)
    {
        return now_.suites[place.suite].items[place.item];
    }
    const ItemRun &end(Place place) const
    {
        return end_.suites[place.suite].items[place.item];
    }

    Reporter &reporter_;
    RunOfItems end_;
    RunOfItems now_;
};

inline void play(Reporter &reporter, const RunOfItems &run)
{
    Playback(reporter, run).play();
    EXPECT_EQ(reporter.failure(), "");
}

} // namespace playback
