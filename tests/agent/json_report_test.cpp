// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0
// The JSON lines that a run leaves.
#include "reporters_test.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <fcntl.h>
#include <sys/time.h>
#include <thread>
#include <unistd.h>

using namespace reporters_test;
using namespace std::chrono_literals;

namespace
{

TEST_F(JsonReporter, BeginsWithWhatIsPlanned)
{
    RunOfItems run = run_of({suite("Bringup", {passed("SpiCheck"), failed("DeadPixel")}),
                             suite("Gather", {passed("SensorProbe")})});
    run.pass_code = -2;
    run.rounds = 2;
    run.identity = {{{"device", "A\u20227"}, {"job", "1 2"}}, "1.2", "9f86"};
    Json line = events_of(json_of(run)).at(0);
    EXPECT_THAT(line.at("version").get<std::string>(), ::testing::ContainsRegex("^[0-9]+[.][0-9]"));
    line.erase("version");
    EXPECT_EQ(line, Json::parse(R"({
        "event": "run", "format": 2, "program": "fptest",
        "library_version": "1.2", "plan": "plans/demo.xml", "plan_digest": "9f86",
        "vendor": 1, "rounds": 2, "time_limit": null, "until_fail": false, "pass_code": -2,
        "labels": {"device": "A\u20227", "job": "1 2"}, "start": "2024-05-06T07:08:09.123Z",
        "items": [{"group": "Bringup", "item": "SpiCheck"},
                  {"group": "Bringup", "item": "DeadPixel"},
                  {"group": "Gather", "item": "SensorProbe"}]})"));
}

TEST_F(JsonReporter, TellsEveryEventOfAnItem)
{
    const auto reporter = make_json_reporter(path("json"));
    Playback playback(*reporter, run_of({suite("Bringup", {passed("SpiCheck")}),
                                         suite("Pixels", {passed("x"), failed("DeadPixel")})}));
    playback.begin();
    playback.start({1, 1});
    playback.progress({1, 1}, {"40", std::nullopt, false, "row 3"});
    playback.end_item({1, 1});
    playback.start({0, 0});

    std::vector<Json> lines = events_of(read_file(path("json")));
    ASSERT_EQ(lines.size(), 5U);
    EXPECT_EQ(lines[4], Json::parse(R"({"event": "start", "index": 0, "group": "Bringup",
        "item": "SpiCheck", "round": 1, "start": "2024-05-06T07:08:10.123Z"})"));
    EXPECT_EQ(lines[1], Json::parse(R"({"event": "start", "index": 2, "group": "Pixels",
        "item": "DeadPixel", "round": 1, "start": "2024-05-06T07:08:10.123Z"})"));
    EXPECT_THAT(lines[2].at("time").get<std::string>(),
                ::testing::MatchesRegex("20..-..-..T..:..:..\\....Z"));
    lines[2].erase("time");
    EXPECT_EQ(lines[2], Json::parse(R"({"event": "progress", "index": 2, "group": "Pixels",
        "item": "DeadPixel", "round": 1, "progress": "40", "result": null,
        "description": "row 3"})"));
    EXPECT_EQ(lines[3], Json::parse(R"({"event": "end", "index": 2, "group": "Pixels",
        "item": "DeadPixel", "round": 1, "outcome": "failed", "progress": "100",
        "result": "1", "description": "3 dead pixels", "reason": "result 1",
        "start": "2024-05-06T07:08:10.123Z", "seconds": 0.301, "exit_status": null,
        "signal": null, "left_running": [], "measurements": [], "directory": null,
        "files": [], "warning": null, "output": "row 7\nrow 9\n"})"));
}

TEST_F(JsonReporter, ProgressIsTimedByTheClock)
{
    const auto reporter = make_json_reporter(path("json"));
    Playback playback(*reporter, run_of({suite("G", {passed("a")})}));
    playback.begin();
    playback.start({0, 0});
    const auto before = std::chrono::system_clock::now();
    playback.progress({0, 0}, {});
    const std::string time = events_of(read_file(path("json"))).at(2).at("time");
    std::tm parts{};
    ASSERT_NE(strptime(time.c_str(), "%Y-%m-%dT%H:%M:%S", &parts), nullptr);
    const auto told = std::chrono::system_clock::from_time_t(timegm(&parts));
    EXPECT_LT(std::chrono::abs(told - before), 30s);
}

TEST_F(JsonReporter, HasNullForWhatIsNotKnown)
{
    ItemRun one = item("a", Outcome::no_result);
    one.seconds.reset();
    one.start.reset();
    const Json end = events_of(json_of(run_of({suite("G", {one})})), "end").at(0);
    for (const char *key : {"progress", "result", "description", "reason", "start", "seconds",
                            "exit_status", "signal"}) {
        EXPECT_EQ(end.at(key), Json()) << key;
    }
    EXPECT_EQ(end.at("output"), "");
}

TEST_F(JsonReporter, NamesEveryOutcome)
{
    std::vector<std::string> words;
    for (const Json &end : events_of(json_of(mixed_run()), "end")) {
        words.push_back(end.at("outcome"));
    }
    EXPECT_THAT(words,
                ElementsAre("passed", "failed", "no result", "timed out", "stopped", "not run"));
}

TEST_F(JsonReporter, EndsWithTheCounts)
{
    EXPECT_EQ(events_of(json_of(run_of({suite("G", {passed("a"), failed("b")})}))).back(),
              Json::parse(R"({"event": "finish", "finished": true, "reason": null, "rounds": 1,
                  "passed": 1, "failed": 1, "not_run": 0, "seconds": 2.5, "summary": [
                  {"group": "G", "item": "a", "run": 1, "passed": 1,
                   "least": 0.301, "median": 0.301, "longest": 0.301},
                  {"group": "G", "item": "b", "run": 1, "passed": 0,
                   "least": 0.301, "median": 0.301, "longest": 0.301}]})"));
    Json finish = events_of(json_of(mixed_run())).back();
    EXPECT_EQ(finish.at("summary").back(),
              Json::parse(R"({"group": "Endurance", "item": "Last", "run": 0, "passed": 0,
                  "least": null, "median": null, "longest": null})"));
    finish.erase("summary");
    EXPECT_EQ(finish, Json::parse(R"({"event": "finish", "finished": false,
                  "reason": "interrupted by Ctrl-C", "rounds": 1, "passed": 1, "failed": 4,
                  "not_run": 1, "seconds": 2.5})"));
}

TEST_F(JsonReporter, HasOneEndForEachItemAlsoForThoseNotRun)
{
    const std::string text = json_of(mixed_run());
    std::vector<std::size_t> ended;
    for (const Json &end : events_of(text, "end")) {
        ended.push_back(end.at("index"));
    }
    EXPECT_THAT(ended, ElementsAre(0U, 1U, 2U, 3U, 4U, 5U));
    const Json last = events_of(text, "end").back();
    EXPECT_EQ(last.at("reason"), "interrupted by Ctrl-C");
    EXPECT_EQ(last.at("start"), Json());
    EXPECT_EQ(events_of(text, "start").size(), 5U);
}

TEST_F(JsonReporter, ReadsBackWhateverIsReported)
{
    for (const Text &text : hostile_texts_for_json()) {
        const std::string json = json_of(run_with(text.reported));
        const std::vector<Json> lines = events_of(json);
        const Json words = text.read.empty() ? Json() : Json(text.read);
        EXPECT_EQ(lines.at(0).at("plan"), text.read);
        EXPECT_EQ(lines.at(0).at("items").at(0).at("group"), text.read);
        EXPECT_EQ(lines.at(0).at("items").at(0).at("item"), text.read);
        const Json end = events_of(json, "end").at(0);
        for (const char *key : {"group", "item", "progress", "result", "description", "output"}) {
            EXPECT_EQ(end.at(key), text.read) << key;
        }
        EXPECT_EQ(end.at("reason"), words);
        EXPECT_EQ(lines.back().at("reason"), words);
    }
}

TEST_F(JsonReporter, WritesEveryLineAtOnce)
{
    const auto reporter = make_json_reporter(path("json"));
    Playback playback(*reporter, mixed_run());
    const auto lines = [&] { return events_of(read_file(path("json"))).size(); };
    playback.begin();
    EXPECT_EQ(lines(), 1U);
    playback.start({0, 0});
    EXPECT_EQ(lines(), 2U);
    playback.progress({0, 0}, {});
    EXPECT_EQ(lines(), 3U);
    playback.end_item({0, 0});
    EXPECT_EQ(lines(), 4U);
}

TEST_F(JsonReporter, LeavesWholeLinesAndNoFinishWhenItsProcessIsKilled)
{
    EXPECT_EQ(in_a_child([&] {
                  const auto reporter = make_json_reporter(path("json"));
                  Playback playback(*reporter, mixed_run());
                  playback.begin();
                  playback.run_item({0, 0});
                  playback.start({0, 1});
                  std::raise(SIGKILL);
              }),
              -SIGKILL);
    const std::vector<Json> lines = events_of(read_file(path("json")));
    ASSERT_EQ(lines.size(), 5U);
    EXPECT_EQ(lines[3].at("outcome"), "passed");
    EXPECT_EQ(lines[4].at("event"), "start");
    EXPECT_TRUE(events_of(read_file(path("json")), "finish").empty());
}

TEST_F(JsonReporter, TakesThePlaceOfAnOlderFile)
{
    write_file(path("json"), std::string(100000, 'x'));
    EXPECT_EQ(events_of(json_of(run_of({suite("G", {passed("a")})}))).size(), 5U);
}

TEST_F(JsonReporter, IsNotInheritedByPrograms)
{
    const auto reporter = make_json_reporter(path("json"));
    Playback(*reporter, mixed_run()).begin();
    const std::string command = "for f in /proc/$$/fd/*; do readlink \"$f\"; done | grep -c '" +
                                path("json") + "' >" + path("count");
    EXPECT_NE(std::system(command.c_str()), 0);
    EXPECT_EQ(read_file(path("count")), "0\n");
}

// Gives standard output to a descriptor in a child.
int with_output(int descriptor, const std::function<void()> &what)
{
    return in_a_child([&] {
        ASSERT_EQ(dup2(descriptor, STDOUT_FILENO), STDOUT_FILENO);
        what();
    });
}

TEST_F(JsonReporter, GoesToStandardOutputOnRequest)
{
    const int file = open(path("out").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0666);
    EXPECT_EQ(with_output(file, [&] { play(*make_json_reporter("-"), mixed_run()); }), 0);
    close(file);
    EXPECT_EQ(events_of(read_file(path("out"))).back().at("event"), "finish");
    EXPECT_THAT(directory_.names(), ElementsAre("out"));
}

// What comes through a pipe whose reader is late, of a text that does not fit
// into it.
std::string read_late(int flags, const std::string &long_text, const std::function<void()> &before)
{
    std::array<int, 2> ends{};
    EXPECT_EQ(pipe2(ends.data(), flags | O_CLOEXEC), 0);
    Process writer([&] {
        ASSERT_EQ(dup2(ends[1], STDOUT_FILENO), STDOUT_FILENO);
        close(ends[0]);
        before();
        play(*make_json_reporter("-"), run_with(long_text));
    });
    close(ends[1]);
    std::this_thread::sleep_for(200ms);
    EXPECT_EQ(fcntl(ends[0], F_SETFL, 0), 0);
    std::string text;
    std::array<char, 4096> buffer{};
    for (ssize_t got = 1; got > 0;) {
        got = read(ends[0], buffer.data(), buffer.size());
        text.append(buffer.data(), static_cast<std::size_t>(std::max<ssize_t>(got, 0)));
    }
    close(ends[0]);
    EXPECT_EQ(writer.wait().status, 0);
    return text;
}

TEST_F(JsonReporter, WaitsForAReaderOfANonBlockingPipe)
{
    const std::string long_text(300000, 'x');
    const std::string text = read_late(O_NONBLOCK, long_text, [] {});
    EXPECT_EQ(events_of(text).back().at("reason"), long_text);
}

TEST_F(JsonReporter, GoesOnWhereASignalHasComeBetween)
{
    const auto set_alarms = [] {
        struct sigaction action {
        };
        action.sa_handler = [](int) {};
        ASSERT_EQ(sigaction(SIGALRM, &action, nullptr), 0);
        const itimerval often{{0, 10000}, {0, 10000}};
        ASSERT_EQ(setitimer(ITIMER_REAL, &often, nullptr), 0);
    };
    const std::string long_text(300000, 'x');
    const std::string text = read_late(0, long_text, set_alarms);
    EXPECT_EQ(events_of(text).back().at("reason"), long_text);
}

TEST_F(JsonReporter, SaysThatNobodyReadsItsOutput)
{
    std::array<int, 2> ends{};
    ASSERT_EQ(pipe2(ends.data(), O_CLOEXEC), 0);
    close(ends[0]);
    EXPECT_EQ(with_output(ends[1],
                          [&] {
                              const auto reporter = make_json_reporter("-");
                              Playback(*reporter, mixed_run()).begin();
                              EXPECT_EQ(reporter->failure(), "standard output: Broken pipe");
                          }),
              0);
    close(ends[1]);
}

TEST_F(JsonReporter, SaysThatTheDiskIsFullAndStaysQuiet)
{
    const auto reporter = make_json_reporter("/dev/full");
    Playback(*reporter, mixed_run()).play();
    EXPECT_EQ(reporter->failure(), "/dev/full: No space left on device");
}

TEST_F(JsonReporter, TakesBackALineThatFoundNoRoom)
{
    EXPECT_EQ(in_a_child([&] {
                  const Limit limit(RLIMIT_FSIZE, 2000);
                  const auto reporter = make_json_reporter(path("json"));
                  Playback playback(*reporter, mixed_run());
                  playback.play();
                  EXPECT_EQ(reporter->failure(), path("json") + ": File too large");
              }),
              0);
    const std::string text = read_file(path("json"));
    EXPECT_GT(text.size(), 1000U);
    EXPECT_LE(text.size(), 2000U);
    const std::vector<Json> lines = events_of(text);
    EXPECT_EQ(lines.at(0).at("event"), "run");
    EXPECT_TRUE(events_of(read_file(path("json")), "finish").empty());
}

TEST_F(JsonReporter, WritesNoMoreOnceALineHasFoundNoRoom)
{
    // the short line after the long one would fit
    EXPECT_EQ(in_a_child([&] {
                  const Limit limit(RLIMIT_FSIZE, 1500);
                  const auto reporter = make_json_reporter(path("json"));
                  ItemRun loud = passed("a");
                  loud.output = std::string(2000, 'x');
                  Playback(*reporter, run_of({suite("G", {loud, passed("b")})})).play();
                  EXPECT_EQ(reporter->failure(), path("json") + ": File too large");
              }),
              0);
    EXPECT_EQ(events_of(read_file(path("json"))).back().at("event"), "progress");
}

TEST_F(Reports, BadPathIsToldBeforeAnythingRuns)
{
    write_file(path("file"), "x");
    const std::string bad = path("file") + "/report";
    for (const auto &make : {make_json_reporter, make_junit_reporter}) {
        const auto reporter = make(bad);
        Playback playback(*reporter, mixed_run());
        playback.begin();
        EXPECT_EQ(reporter->failure(), bad + ": Not a directory");
        playback.run_item({0, 0});
        playback.tick();
        playback.finish();
        EXPECT_EQ(reporter->failure(), bad + ": Not a directory");
        const auto other = make(directory_.path(""));
        Playback(*other, mixed_run()).begin();
        EXPECT_EQ(other->failure(), directory_.path("") + ": Is a directory");
    }
    EXPECT_THAT(directory_.names(), ElementsAre("file"));
}

} // namespace
