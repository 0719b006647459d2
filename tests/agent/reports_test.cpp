// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What a run leaves in files, read back by other programs' parsers.
#include "playback.h"
#include "reporters/reporters.h"
#include "support/process.h"
#include "support/reports.h"
#include "support/temporary_directory.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <array>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <functional>
#include <memory>
#include <random>
#include <string>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/time.h>
#include <thread>
#include <unistd.h>
#include <vector>

using namespace fptest;
using namespace support;
using namespace std::chrono_literals;
using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::StartsWith;
using Json = nlohmann::json;
using namespace playback;

namespace
{

// --- hostile texts -----------------------------------------------------------

struct Text {
    std::string reported;
    std::string read; // what a reader gets
};

// The picture of a control character.
std::string picture(int code)
{
    return {'\xE2', '\x90', static_cast<char>(0x80 + code)};
}

std::vector<Text> hostile_texts()
{
    std::vector<Text> texts = {
        {"", ""},
        {" a  b ", " a  b "},
        {"\ta\nb\r\nc\r", "\ta\nb\r\nc\r"},
        {"<a href='x'>&amp;\"</a>", "<a href='x'>&amp;\"</a>"},
        {"]]>", "]]>"},
        {"<![CDATA[x]]>]]>]]", "<![CDATA[x]]>]]>]]"},
        {"&#0; &#x1b; %s %n", "&#0; &#x1b; %s %n"},
        {"#1 # SKIP \\# \\\\ \\", "#1 # SKIP \\# \\\\ \\"},
        {"\nok 1 - no\nBail out!  no\n...\n---\n", "\nok 1 - no\nBail out!  no\n...\n---\n"},
        {"{\"event\":\"finish\"}\n", "{\"event\":\"finish\"}\n"},
        {": - ? | > ! % @ ` ~ null", ": - ? | > ! % @ ` ~ null"},
        {"\u65E5\u672C\u8A9E \U0001F600 e\u0301", "\u65E5\u672C\u8A9E \U0001F600 e\u0301"},
        {"\u2028\u2029\uFEFF\U0001FFFE", "\u2028\u2029\uFEFF\U0001FFFE"},
        {"\x7F", "\u2421"},
        {"\xC2\x85\xC2\x9B", "\uFFFD\uFFFD"},
        {"a\xC3", "a\uFFFD"},
        {"\xED\xA0\x80", "\uFFFD\uFFFD\uFFFD"},
        {"\xF4\x90\x80\x80", "\uFFFD\uFFFD\uFFFD\uFFFD"},
        {std::string(10000, '&'), std::string(10000, '&')},
        {std::string(10000, '\n') + "x", std::string(10000, '\n') + "x"},
    };
    for (int code = 0; code < 0x20; ++code) {
        const std::string byte(1, static_cast<char>(code));
        const bool kept = code == '\t' || code == '\n' || code == '\r';
        texts.push_back({"<" + byte + ">", "<" + (kept ? byte : picture(code)) + ">"});
    }
    for (int code = 0x80; code < 0x100; ++code) {
        texts.push_back({std::string(1, static_cast<char>(code)), "\uFFFD"});
    }
    return texts;
}

// XML has no place for two characters that others have.
std::vector<Text> hostile_texts_for_xml()
{
    std::vector<Text> texts = hostile_texts();
    texts.push_back({"a\uFFFEb\uFFFF\uFFFDc", "a\uFFFDb\uFFFD\uFFFDc"});
    return texts;
}

std::vector<Text> hostile_texts_for_json()
{
    std::vector<Text> texts = hostile_texts();
    texts.push_back({"a\uFFFEb\uFFFF", "a\uFFFEb\uFFFF"});
    return texts;
}

// A failed item with that text wherever one can stand.
RunOfItems run_with(const std::string &text)
{
    ItemRun one = item(text, Outcome::failed, text);
    one.report = {text, text, false, text};
    one.output = text;
    RunOfItems run = run_of({suite(text, {one, item("b", Outcome::not_run, text)})});
    run.plan = text;
    run.finished = false;
    run.why_unfinished = text;
    return run;
}

// --- reading -----------------------------------------------------------------

std::vector<Json> events(const std::vector<Json> &lines, const std::string &name)
{
    std::vector<Json> found;
    std::copy_if(lines.begin(), lines.end(), std::back_inserter(found),
                 [&](const Json &line) { return line.at("event") == name; });
    return found;
}

ino_t inode(const std::string &path)
{
    struct stat status {
    };
    EXPECT_EQ(stat(path.c_str(), &status), 0) << path;
    return status.st_ino;
}

class Reports : public ::testing::Test
{
  protected:
    // As the agent does.
    void SetUp() override
    {
        std::signal(SIGPIPE, SIG_IGN);
        std::signal(SIGXFSZ, SIG_IGN);
        unsetenv("HARNESS_ACTIVE");
    }

    std::string path(const std::string &name) const
    {
        return directory_.path(name);
    }

    std::string json_of(const RunOfItems &run) const
    {
        play(*json_report(path("json")), run);
        return read_file(path("json"));
    }
    std::vector<Json> json_lines_of(const RunOfItems &run) const
    {
        return events_of(json_of(run));
    }
    std::string junit_of(const RunOfItems &run) const
    {
        play(*junit_report(path("xml")), run);
        return read_file(path("xml"));
    }
    std::string tap_of(const RunOfItems &run) const
    {
        play_tap([&](Listener &tap) { play(tap, run); });
        return read_file(path("tap"));
    }

    void play_tap(const std::function<void(Listener &)> &what) const
    {
        const Stream stream(std::fopen(path("tap").c_str(), "w"), &std::fclose);
        ASSERT_NE(stream, nullptr);
        what(*tap_report(stream.get()));
    }

    using Stream = std::unique_ptr<std::FILE, decltype(&std::fclose)>;

    TemporaryDirectory directory_;
};

class JsonReport : public Reports
{
};
class JunitReport : public Reports
{
};
class TapReport : public Reports
{
};

// Its exit status, or minus the signal.
int in_a_child(const std::function<void()> &what)
{
    return Process(what).wait().status;
}

void limit_file_size(rlim_t bytes)
{
    rlimit limit{};
    ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &limit), 0);
    limit.rlim_cur = std::min(bytes, limit.rlim_max);
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
}

// --- JSON lines --------------------------------------------------------------

TEST_F(JsonReport, BeginsWithWhatIsPlanned)
{
    RunOfItems run = run_of({suite("Bringup", {passed("SpiCheck"), failed("DeadPixel")}),
                             suite("Gather", {passed("SensorProbe")})});
    run.pass_code = -2;
    run.rounds = 2;
    Json line = json_lines_of(run).at(0);
    EXPECT_THAT(line.at("version").get<std::string>(), ::testing::ContainsRegex("^[0-9]+[.][0-9]"));
    line.erase("version");
    EXPECT_EQ(line, Json::parse(R"({
        "event": "run", "format": 2, "program": "fptest",
        "plan": "plans/demo.xml", "vendor": 1, "rounds": 2, "time_limit": null,
        "until_fail": false, "pass_code": -2, "start": "2024-05-06T07:08:09.123Z",
        "items": [{"group": "Bringup", "item": "SpiCheck"},
                  {"group": "Bringup", "item": "DeadPixel"},
                  {"group": "Gather", "item": "SensorProbe"}]})"));
}

TEST_F(JsonReport, TellsEveryEventOfAnItem)
{
    const auto report = json_report(path("json"));
    Playback playback(*report, run_of({suite("Bringup", {passed("SpiCheck")}),
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
        "signal": null, "left_running": [], "output": "row 7\nrow 9\n"})"));
}

TEST_F(JsonReport, ProgressIsTimedByTheClock)
{
    const auto report = json_report(path("json"));
    Playback playback(*report, run_of({suite("G", {passed("a")})}));
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

TEST_F(JsonReport, HasNullForWhatIsNotKnown)
{
    ItemRun one = item("a", Outcome::silent);
    one.seconds.reset();
    one.start.reset();
    const Json end = events(json_lines_of(run_of({suite("G", {one})})), "end").at(0);
    for (const char *key : {"progress", "result", "description", "reason", "start", "seconds",
                            "exit_status", "signal"}) {
        EXPECT_EQ(end.at(key), Json()) << key;
    }
    EXPECT_EQ(end.at("output"), "");
}

TEST_F(JsonReport, TellsOfAResultWithoutAValueByAnEmptyText)
{
    ItemRun one = item("a", Outcome::failed);
    one.report.result_without_value = true;
    EXPECT_EQ(events(json_lines_of(run_of({suite("G", {one})})), "end").at(0).at("result"), "");
}

TEST_F(JsonReport, NamesEveryOutcome)
{
    std::vector<std::string> words;
    for (const Json &end : events(json_lines_of(mixed_run()), "end")) {
        words.push_back(end.at("outcome"));
    }
    EXPECT_THAT(words,
                ElementsAre("passed", "failed", "no result", "timed out", "stopped", "not run"));
}

TEST_F(JsonReport, EndsWithTheCounts)
{
    EXPECT_EQ(json_lines_of(run_of({suite("G", {passed("a"), failed("b")})})).back(),
              Json::parse(R"({"event": "finish", "finished": true, "reason": null, "rounds": 1,
                  "passed": 1, "failed": 1, "not_run": 0, "seconds": 2.5, "summary": [
                  {"group": "G", "item": "a", "run": 1, "passed": 1,
                   "least": 0.301, "median": 0.301, "longest": 0.301},
                  {"group": "G", "item": "b", "run": 1, "passed": 0,
                   "least": 0.301, "median": 0.301, "longest": 0.301}]})"));
    Json finish = json_lines_of(mixed_run()).back();
    EXPECT_EQ(finish.at("summary").back(),
              Json::parse(R"({"group": "Endurance", "item": "Last", "run": 0, "passed": 0,
                  "least": null, "median": null, "longest": null})"));
    finish.erase("summary");
    EXPECT_EQ(finish, Json::parse(R"({"event": "finish", "finished": false,
                  "reason": "interrupted by Ctrl-C", "rounds": 1, "passed": 1, "failed": 4,
                  "not_run": 1, "seconds": 2.5})"));
}

TEST_F(JsonReport, HasOneEndForEachItemAlsoForThoseNotRun)
{
    const std::vector<Json> lines = json_lines_of(mixed_run());
    std::vector<std::size_t> ended;
    for (const Json &end : events(lines, "end")) {
        ended.push_back(end.at("index"));
    }
    EXPECT_THAT(ended, ElementsAre(0U, 1U, 2U, 3U, 4U, 5U));
    const Json last = events(lines, "end").back();
    EXPECT_EQ(last.at("reason"), "interrupted by Ctrl-C");
    EXPECT_EQ(last.at("start"), Json());
    EXPECT_EQ(events(lines, "start").size(), 5U);
}

TEST_F(JsonReport, ReadsBackWhateverIsReported)
{
    for (const Text &text : hostile_texts_for_json()) {
        const std::vector<Json> lines = json_lines_of(run_with(text.reported));
        const Json words = text.read.empty() ? Json() : Json(text.read);
        EXPECT_EQ(lines.at(0).at("plan"), text.read);
        EXPECT_EQ(lines.at(0).at("items").at(0).at("group"), text.read);
        EXPECT_EQ(lines.at(0).at("items").at(0).at("item"), text.read);
        const Json end = events(lines, "end").at(0);
        for (const char *key : {"group", "item", "progress", "result", "description", "output"}) {
            EXPECT_EQ(end.at(key), text.read) << key;
        }
        EXPECT_EQ(end.at("reason"), words);
        EXPECT_EQ(lines.back().at("reason"), words);
    }
}

TEST_F(JsonReport, WritesEveryLineAtOnce)
{
    const auto report = json_report(path("json"));
    Playback playback(*report, mixed_run());
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

TEST_F(JsonReport, LeavesWholeLinesAndNoFinishWhenItsProcessIsKilled)
{
    EXPECT_EQ(in_a_child([&] {
                  const auto report = json_report(path("json"));
                  Playback playback(*report, mixed_run());
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
    EXPECT_TRUE(events(lines, "finish").empty());
}

TEST_F(JsonReport, TakesThePlaceOfAnOlderFile)
{
    write_file(path("json"), std::string(100000, 'x'));
    EXPECT_EQ(json_lines_of(run_of({suite("G", {passed("a")})})).size(), 5U);
}

TEST_F(JsonReport, IsNotInheritedByPrograms)
{
    const auto report = json_report(path("json"));
    Playback(*report, mixed_run()).begin();
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

TEST_F(JsonReport, GoesToStandardOutputOnRequest)
{
    const int file = open(path("out").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0666);
    EXPECT_EQ(with_output(file, [&] { play(*json_report("-"), mixed_run()); }), 0);
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
        play(*json_report("-"), run_with(long_text));
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

TEST_F(JsonReport, WaitsForAReaderOfANonBlockingPipe)
{
    const std::string long_text(300000, 'x');
    const std::string text = read_late(O_NONBLOCK, long_text, [] {});
    EXPECT_EQ(events_of(text).back().at("reason"), long_text);
}

TEST_F(JsonReport, GoesOnWhereASignalHasComeBetween)
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

TEST_F(JsonReport, SaysThatNobodyReadsItsOutput)
{
    std::array<int, 2> ends{};
    ASSERT_EQ(pipe2(ends.data(), O_CLOEXEC), 0);
    close(ends[0]);
    EXPECT_EQ(with_output(ends[1],
                          [&] {
                              const auto report = json_report("-");
                              Playback(*report, mixed_run()).begin();
                              EXPECT_EQ(report->failure(), "standard output: Broken pipe");
                          }),
              0);
    close(ends[1]);
}

TEST_F(JsonReport, SaysThatTheDiskIsFullAndStaysQuiet)
{
    const auto report = json_report("/dev/full");
    Playback(*report, mixed_run()).play();
    EXPECT_EQ(report->failure(), "/dev/full: No space left on device");
}

TEST_F(JsonReport, TakesBackALineThatFoundNoRoom)
{
    EXPECT_EQ(in_a_child([&] {
                  limit_file_size(2000);
                  const auto report = json_report(path("json"));
                  Playback playback(*report, mixed_run());
                  playback.play();
                  EXPECT_EQ(report->failure(), path("json") + ": File too large");
              }),
              0);
    const std::string text = read_file(path("json"));
    EXPECT_GT(text.size(), 1000U);
    EXPECT_LE(text.size(), 2000U);
    const std::vector<Json> lines = events_of(text);
    EXPECT_EQ(lines.at(0).at("event"), "run");
    EXPECT_TRUE(events(lines, "finish").empty());
}

TEST_F(JsonReport, WritesNoMoreOnceALineHasFoundNoRoom)
{
    // the short line after the long one would fit
    EXPECT_EQ(in_a_child([&] {
                  limit_file_size(1500);
                  const auto report = json_report(path("json"));
                  ItemRun loud = passed("a");
                  loud.output = std::string(2000, 'x');
                  Playback(*report, run_of({suite("G", {loud, passed("b")})})).play();
                  EXPECT_EQ(report->failure(), path("json") + ": File too large");
              }),
              0);
    EXPECT_EQ(events_of(read_file(path("json"))).back().at("event"), "progress");
}

TEST_F(Reports, BadPathIsToldBeforeAnythingRuns)
{
    write_file(path("file"), "x");
    const std::string bad = path("file") + "/report";
    for (const auto &make : {json_report, junit_report}) {
        const auto report = make(bad);
        Playback playback(*report, mixed_run());
        playback.begin();
        EXPECT_EQ(report->failure(), bad + ": Not a directory");
        playback.run_item({0, 0});
        playback.tick();
        playback.finish();
        EXPECT_EQ(report->failure(), bad + ": Not a directory");
        const auto other = make(directory_.path(""));
        Playback(*other, mixed_run()).begin();
        EXPECT_EQ(other->failure(), directory_.path("") + ": Is a directory");
    }
    EXPECT_THAT(directory_.names(), ElementsAre("file"));
}

// --- JUnit XML ---------------------------------------------------------------

TEST_F(JunitReport, IsThisDocument)
{
    RunOfItems run =
        run_of({suite("Bringup", {passed("SpiCheck"), failed("DeadPixel"),
                                  item("QuietRun", Outcome::silent, "nothing reported")})});
    EXPECT_EQ(junit_of(run), R"(<?xml version="1.0" encoding="UTF-8"?>
<testsuites name="fptest" tests="3" failures="1" errors="1" skipped="0" time="2.500" timestamp="2024-05-06T07:08:09">
  <testsuite name="Bringup" tests="3" failures="1" errors="1" skipped="0" time="0.903" timestamp="2024-05-06T07:08:10">
    <properties>
      <property name="plan" value="plans/demo.xml"/>
      <property name="vendor" value="1"/>
      <property name="pass_code" value="0"/>
      <property name="finished" value="true"/>
    </properties>
    <testcase classname="Bringup" name="SpiCheck" time="0.301">
      <properties>
        <property name="progress" value="100"/>
        <property name="result" value="0"/>
        <property name="description" value="chip answers"/>
      </properties>
    </testcase>
    <testcase classname="Bringup" name="DeadPixel" time="0.301">
      <properties>
        <property name="progress" value="100"/>
        <property name="result" value="1"/>
        <property name="description" value="3 dead pixels"/>
      </properties>
      <failure type="result" message="result 1">result: 1
progress: 100
description: 3 dead pixels
</failure>
      <system-out>row 7
row 9
</system-out>
    </testcase>
    <testcase classname="Bringup" name="QuietRun" time="0.301">
      <error type="no result" message="nothing reported"></error>
    </testcase>
  </testsuite>
</testsuites>
)");
}

using Attributes = std::map<std::string, std::string>;

Attributes counts_of(const Element &element)
{
    Attributes counts;
    for (const char *name : {"tests", "failures", "errors", "skipped"}) {
        counts[name] = element.attributes.at(name);
    }
    return counts;
}

TEST_F(JunitReport, CountsEveryOutcome)
{
    const Element top = parse_xml(junit_of(mixed_run()));
    EXPECT_EQ(counts_of(top), (Attributes{
                                  {"tests", "6"},
                                  {"failures", "1"},
                                  {"errors", "4"},
                                  {"skipped", "0"},
                              }));
    EXPECT_EQ(counts_of(top.children.at(1)), (Attributes{
                                                 {"tests", "3"},
                                                 {"failures", "0"},
                                                 {"errors", "3"},
                                                 {"skipped", "0"},
                                             }));
    EXPECT_EQ(top.children.at(1).attributes.at("time"), "0.602");
}

TEST_F(JunitReport, HasAnElementForEveryOutcome)
{
    std::vector<std::string> verdicts;
    for (const Element &group : parse_xml(junit_of(mixed_run())).all("testsuite")) {
        for (const Element &test : group.all("testcase")) {
            std::string verdict = test.attributes.at("name") + " " + test.attributes.at("time");
            for (const Element &child : test.children) {
                if (child.name != "properties" && child.name != "system-out") {
                    verdict += " " + child.name;
                    for (const auto &[name, value] : child.attributes) {
                        verdict += " " + name + "=" + value;
                    }
                }
            }
            verdicts.push_back(verdict);
        }
    }
    EXPECT_THAT(verdicts,
                ElementsAre("SpiCheck 0.301",
                            "DeadPixel 0.301 failure message=result 1 type=result",
                            "QuietRun 0.301 error message=it reported nothing type=no result",
                            "Slow 0.301 error message=stopped after 5 s type=timed out",
                            "BurnIn 0.301 error message=interrupted by Ctrl-C type=stopped",
                            "Last 0.000 error message=interrupted by Ctrl-C type=not run"));
}

TEST_F(JunitReport, HasAMessageAlsoWhereNoReasonIsKnown)
{
    RunOfItems run = run_of({suite("G", {item("a", Outcome::stopped), item("b", Outcome::not_run),
                                         item("c", Outcome::not_run, "no program")})});
    run.finished = false;
    run.why_unfinished = "SIGTERM";
    const Element group = parse_xml(junit_of(run)).children.at(0);
    EXPECT_EQ(group.all("testcase").at(0).all("error").at(0).attributes.at("message"), "stopped");
    EXPECT_EQ(group.all("testcase").at(1).all("error").at(0).attributes.at("message"), "SIGTERM");
    EXPECT_EQ(group.all("testcase").at(2).all("error").at(0).attributes.at("message"),
              "no program");
}

TEST_F(JunitReport, TellsOnEverySuiteWhetherTheRunEnded)
{
    for (const Element &group : parse_xml(junit_of(mixed_run())).all("testsuite")) {
        EXPECT_EQ(group.properties().at("finished"), "false");
        EXPECT_EQ(group.properties().at("reason"), "interrupted by Ctrl-C");
    }
    const RunOfItems done = run_of({suite("G", {passed("a")}), suite("H", {failed("b")})});
    for (const Element &group : parse_xml(junit_of(done)).all("testsuite")) {
        EXPECT_EQ(group.properties().at("finished"), "true");
        EXPECT_FALSE(group.properties().contains("reason"));
    }
}

TEST_F(JunitReport, TellsOfAResultWithoutAValueByAnEmptyProperty)
{
    ItemRun one = item("a", Outcome::failed);
    one.report.result_without_value = true;
    const Element test =
        parse_xml(junit_of(run_of({suite("G", {one})}))).children.at(0).all("testcase").at(0);
    EXPECT_EQ(test.properties(), (Attributes{{"result", ""}}));
}

TEST_F(JunitReport, ReadsBackWhateverIsReported)
{
    for (const Text &text : hostile_texts_for_xml()) {
        const Element group = parse_xml(junit_of(run_with(text.reported))).children.at(0);
        EXPECT_EQ(group.attributes.at("name"), text.read);
        EXPECT_EQ(group.properties().at("plan"), text.read);
        EXPECT_EQ(group.properties().at("reason"),
                  text.read.empty() ? "the run went on when this was written" : text.read);
        const Element test = group.all("testcase").at(0);
        EXPECT_EQ(test.attributes.at("classname"), text.read);
        EXPECT_EQ(test.attributes.at("name"), text.read);
        EXPECT_EQ(test.properties(),
                  (Attributes{
                      {"progress", text.read}, {"result", text.read}, {"description", text.read}}));
        const Element failure = test.all("failure").at(0);
        EXPECT_EQ(failure.attributes.at("message"), text.read.empty() ? "failed" : text.read);
        EXPECT_EQ(failure.text, "result: " + text.read + "\nprogress: " + text.read +
                                    "\ndescription: " + text.read + "\n");
        const std::vector<Element> output = test.all("system-out");
        EXPECT_EQ(output.empty() ? "" : output.at(0).text, text.read);
        const Element not_run = group.all("testcase").at(1).all("error").at(0);
        EXPECT_EQ(not_run.attributes.at("message"),
                  text.read.empty() ? "not run yet when this was written" : text.read);
    }
}

TEST_F(JunitReport, IsAWholeDocumentFromTheBeginningOn)
{
    const auto report = junit_report(path("xml"));
    Playback(*report, mixed_run()).begin();
    EXPECT_EQ(report->failure(), "");
    const Element top = parse_xml(read_file(path("xml")));
    EXPECT_EQ(top.attributes.at("errors"), "6");
    EXPECT_EQ(top.attributes.at("skipped"), "0");
    EXPECT_EQ(top.children.at(0).properties().at("finished"), "false");
    EXPECT_EQ(top.children.at(0).properties().at("reason"),
              "the run went on when this was written");
    EXPECT_EQ(top.children.at(0).all("testcase").at(0).all("error").at(0).attributes,
              (Attributes{{"type", "not run"}, {"message", "not run yet when this was written"}}));
}

TEST_F(JunitReport, IsReplacedOnceASecondWhileTheRunLasts)
{
    const auto report = junit_report(path("xml"));
    Playback playback(*report, mixed_run());
    playback.begin();
    const ino_t first = inode(path("xml"));
    playback.run_item({0, 0});
    playback.start({0, 1});
    playback.tick();
    EXPECT_EQ(inode(path("xml")), first);
    EXPECT_EQ(parse_xml(read_file(path("xml"))).attributes.at("errors"), "6");

    std::this_thread::sleep_for(1100ms);
    playback.tick();
    const Element top = parse_xml(read_file(path("xml")));
    EXPECT_EQ(top.attributes.at("errors"), "5");
    EXPECT_EQ(top.children.at(0).all("testcase").at(1).all("error").at(0).attributes,
              (Attributes{{"type", "running"}, {"message", "was running when this was written"}}));

    const ino_t second = inode(path("xml"));
    std::this_thread::sleep_for(1100ms);
    playback.tick(); // nothing has changed
    EXPECT_EQ(inode(path("xml")), second);
    playback.progress({0, 1}, {"50", std::nullopt, false, std::nullopt});
    EXPECT_EQ(parse_xml(read_file(path("xml")))
                  .children.at(0)
                  .all("testcase")
                  .at(1)
                  .properties()
                  .at("progress"),
              "50");
    playback.end_item({0, 1});
    playback.finish(); // at once
    EXPECT_EQ(parse_xml(read_file(path("xml"))).attributes.at("errors"), "4");
    EXPECT_THAT(directory_.names(), ElementsAre("xml"));
}

TEST_F(JunitReport, LeavesAWholeDocumentWhenItsProcessIsKilled)
{
    EXPECT_EQ(in_a_child([&] {
                  const auto report = junit_report(path("xml"));
                  Playback playback(*report, mixed_run());
                  playback.begin();
                  std::this_thread::sleep_for(1100ms);
                  playback.run_item({0, 0});
                  playback.start({0, 1});
                  std::raise(SIGKILL);
              }),
              -SIGKILL);
    const Element top = parse_xml(read_file(path("xml")));
    EXPECT_EQ(top.attributes.at("tests"), "6");
    EXPECT_EQ(top.attributes.at("errors"), "6");
    for (const Element &group : top.all("testsuite")) {
        EXPECT_EQ(group.properties().at("finished"), "false");
    }
}

TEST_F(JunitReport, KeepsALinkToItsFile)
{
    write_file(path("target"), "old");
    ASSERT_EQ(symlink(path("target").c_str(), path("xml").c_str()), 0);
    EXPECT_THAT(junit_of(mixed_run()), StartsWith("<?xml"));
    EXPECT_THAT(read_file(path("target")), StartsWith("<?xml"));
    struct stat status {
    };
    ASSERT_EQ(lstat(path("xml").c_str(), &status), 0);
    EXPECT_TRUE(S_ISLNK(status.st_mode));
    EXPECT_THAT(directory_.names(), ElementsAre("target", "xml"));
}

TEST_F(JunitReport, GoesWhereALinkLeadsThoughThatIsNotThereYet)
{
    ASSERT_EQ(symlink("next", path("xml").c_str()), 0);
    ASSERT_EQ(symlink("target", path("next").c_str()), 0);
    EXPECT_THAT(junit_of(mixed_run()), StartsWith("<?xml"));
    EXPECT_THAT(read_file(path("target")), StartsWith("<?xml"));
    EXPECT_THAT(directory_.names(), ElementsAre("next", "target", "xml"));
}

TEST_F(JunitReport, KeepsThePermissionsOfItsFile)
{
    write_file(path("xml"), "old");
    ASSERT_EQ(chmod(path("xml").c_str(), 0604), 0);
    junit_of(mixed_run());
    struct stat status {
    };
    ASSERT_EQ(stat(path("xml").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777, 0604U);
}

TEST_F(JunitReport, HasThePermissionsOfAnyNewFile)
{
    const mode_t mask = umask(0027);
    junit_of(mixed_run());
    umask(mask);
    struct stat status {
    };
    ASSERT_EQ(stat(path("xml").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0640U);
}

TEST_F(JunitReport, GoesIntoAPipeOnceAtTheEnd)
{
    ASSERT_EQ(mkfifo(path("pipe").c_str(), 0666), 0);
    const int reader = open(path("pipe").c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    ASSERT_GE(reader, 0);
    const auto report = junit_report(path("pipe"));
    Playback playback(*report, mixed_run());
    playback.begin();
    std::this_thread::sleep_for(1100ms);
    playback.run_item({0, 0});
    playback.tick();
    std::array<char, 65536> buffer{};
    EXPECT_EQ(read(reader, buffer.data(), buffer.size()), -1); // nothing there yet
    EXPECT_EQ(errno, EAGAIN);
    playback.finish();
    const ssize_t got = read(reader, buffer.data(), buffer.size());
    ASSERT_GT(got, 0);
    EXPECT_EQ(parse_xml({buffer.data(), static_cast<std::size_t>(got)}).attributes.at("tests"),
              "6");
    close(reader);
    EXPECT_EQ(report->failure(), "");
    EXPECT_THAT(directory_.names(), ElementsAre("pipe"));
}

TEST_F(JunitReport, DoesNotReplaceAFileThatIsSomebodysOutput)
{
    const int file = open(path("out").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666);
    ASSERT_EQ(write(file, "before\n", 7), 7);
    const ino_t before = inode(path("out"));
    play(*junit_report("/dev/fd/" + std::to_string(file)), mixed_run());
    close(file);
    EXPECT_EQ(inode(path("out")), before);
    EXPECT_THAT(read_file(path("out")), StartsWith("before\n<?xml"));
    EXPECT_THAT(directory_.names(), ElementsAre("out"));
}

// No device of /dev is named here: a report that replaced what it should write
// into would take it from the machine.
TEST_F(JunitReport, SaysThatWhatItWritesIntoHasNoRoom)
{
    EXPECT_EQ(in_a_child([&] {
                  const int file = open(path("out").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666);
                  const std::string name = "/dev/fd/" + std::to_string(file);
                  limit_file_size(1000);
                  const auto report = junit_report(name);
                  Playback playback(*report, mixed_run());
                  playback.begin();
                  playback.run_item({0, 0});
                  EXPECT_EQ(report->failure(), "");
                  playback.finish();
                  EXPECT_EQ(report->failure(), name + ": File too large");
              }),
              0);
    EXPECT_EQ(read_file(path("out")).size(), 1000U);
}

TEST_F(JunitReport, KeepsTheLastWholeDocumentWhereTheNextFindsNoRoom)
{
    EXPECT_EQ(in_a_child([&] {
                  RunOfItems run = mixed_run();
                  run.suites[0].items[0].output = std::string(10000, 'x');
                  limit_file_size(5000);
                  const auto report = junit_report(path("xml"));
                  Playback(*report, run).play();
                  EXPECT_EQ(report->failure(), path("xml") + ": File too large");
              }),
              0);
    EXPECT_EQ(parse_xml(read_file(path("xml"))).attributes.at("errors"), "6");
    EXPECT_THAT(directory_.names(), ElementsAre("xml"));
}

// --- TAP ---------------------------------------------------------------------

// What is known of an item of passed().
const std::string kPassedBlock = "      ---\n"
                                 "      outcome: \"passed\"\n"
                                 "      progress: \"100\"\n"
                                 "      result: \"0\"\n"
                                 "      description: \"chip answers\"\n"
                                 "      duration_ms: 301\n"
                                 "      ...\n";

TEST_F(TapReport, IsThisText)
{
    EXPECT_EQ(tap_of(mixed_run()), R"(TAP version 14
1..2
# Subtest: Bringup
    1..3
    ok 1 - SpiCheck
      ---
      outcome: "passed"
      progress: "100"
      result: "0"
      description: "chip answers"
      duration_ms: 301
      ...
    not ok 2 - DeadPixel
      ---
      outcome: "failed"
      reason: "result 1"
      progress: "100"
      result: "1"
      description: "3 dead pixels"
      duration_ms: 301
      ...
    not ok 3 - QuietRun
      ---
      outcome: "no result"
      reason: "it reported nothing"
      duration_ms: 301
      ...
not ok 1 - Bringup
# Subtest: Endurance
    1..3
    not ok 1 - Slow
      ---
      outcome: "timed out"
      reason: "stopped after 5 s"
      duration_ms: 301
      ...
    not ok 2 - BurnIn
      ---
      outcome: "stopped"
      reason: "interrupted by Ctrl-C"
      duration_ms: 301
      ...
    ok 3 - Last # SKIP not run: interrupted by Ctrl-C
not ok 2 - Endurance
# 1 passed, 4 failed, 1 not run in 2.5 s
Bail out!  interrupted by Ctrl-C
)");
}

TEST_F(TapReport, DoesNotBailOutOfARunThatEnded)
{
    const Tap tap = parse_tap(tap_of(run_of({suite("G", {passed("a"), failed("b")})})));
    EXPECT_FALSE(tap.bail_out);
    EXPECT_FALSE(tap.points.at(0).ok);
    EXPECT_THAT(tap.comments, ElementsAre("1 passed, 1 failed, 0 not run in 2.5 s"));
}

TEST_F(TapReport, BailsOutAlsoWhereNobodyKnowsWhy)
{
    RunOfItems run = mixed_run();
    run.why_unfinished.clear();
    EXPECT_EQ(parse_tap(tap_of(run)).bail_out, "the run did not finish");
}

TEST_F(TapReport, IsVersion13UnderAHarness)
{
    const std::string usual = tap_of(mixed_run());
    setenv("HARNESS_ACTIVE", "1", 1);
    const std::string harnessed = tap_of(mixed_run());
    EXPECT_THAT(usual, StartsWith("TAP version 14\n"));
    EXPECT_THAT(harnessed, StartsWith("TAP version 13\n"));
    EXPECT_EQ(usual.substr(15), harnessed.substr(15));
}

TEST_F(TapReport, HasEveryPlannedPointOnceAlsoWhereTheRunWasInterrupted)
{
    RunOfItems run = mixed_run();
    run.suites.push_back(
        suite("Never", {item("x", Outcome::not_run), item("y", Outcome::not_run)}));
    const Tap tap = parse_tap(tap_of(run));
    EXPECT_EQ(tap.planned, 3U);
    ASSERT_EQ(tap.points.size(), 3U);
    EXPECT_EQ(tap.points[2].skipped, "not run: interrupted by Ctrl-C");
    for (const Point &point : tap.points[2].inside) {
        EXPECT_TRUE(point.ok);
        EXPECT_EQ(point.skipped, "not run: interrupted by Ctrl-C");
    }
    EXPECT_EQ(tap.points[1].skipped, std::nullopt);
}

TEST_F(TapReport, WritesAPointWhenItsItemHasEnded)
{
    play_tap([&](Listener &report) {
        Playback playback(report, mixed_run());
        const auto text = [&] { return read_file(path("tap")); };
        playback.begin();
        EXPECT_EQ(text(), "TAP version 14\n1..2\n");
        playback.start({0, 0});
        EXPECT_THAT(text(), EndsWith("# Subtest: Bringup\n    1..3\n"));
        playback.progress({0, 0}, {});
        playback.end_item({0, 0});
        EXPECT_THAT(text(), EndsWith("    1..3\n    ok 1 - SpiCheck\n" + kPassedBlock));
        playback.run_item({0, 1});
        EXPECT_THAT(text(), EndsWith("...\n"));
        playback.run_item({0, 2});
        EXPECT_THAT(text(), EndsWith("...\nnot ok 1 - Bringup\n"));
        playback.start({1, 0});
        EXPECT_THAT(text(), EndsWith("# Subtest: Endurance\n    1..3\n"));
    });
}

TEST_F(TapReport, KeepsItsOrderWhereItemsEndInAnother)
{
    play_tap([&](Listener &report) {
        Playback playback(
            report, run_of({suite("G", {passed("a"), passed("b")}), suite("H", {passed("c")})}));
        playback.begin();
        playback.start({0, 0});
        playback.run_item({0, 1});
        playback.run_item({1, 0});
        EXPECT_THAT(read_file(path("tap")), EndsWith("# Subtest: G\n    1..2\n"));
        playback.end_item({0, 0});
        EXPECT_THAT(read_file(path("tap")), EndsWith("    1..2\n    ok 1 - a\n" + kPassedBlock +
                                                     "    ok 2 - b\n" + kPassedBlock +
                                                     "ok 1 - G\n"
                                                     "# Subtest: H\n    1..1\n    ok 1 - c\n" +
                                                     kPassedBlock + "ok 2 - H\n"));
        playback.finish();
    });
    EXPECT_EQ(parse_tap(read_file(path("tap"))).points.size(), 2U);
}

TEST_F(TapReport, ItemThatEndedWithoutHavingBeenRunIsSkipped)
{
    const std::string text =
        tap_of(run_of({suite("G", {item("a", Outcome::not_run, "no program"), passed("b")})}));
    EXPECT_THAT(text, HasSubstr("    ok 1 - a # SKIP not run: no program\n    ok 2 - b\n" +
                                kPassedBlock + "ok 1 - G\n"));
}

TEST_F(TapReport, SkipsWhatHasNoItems)
{
    EXPECT_EQ(tap_of(run_of({suite("Empty", {}), suite("G", {passed("a")})})), R"(TAP version 14
1..2
# Subtest: Empty
    1..0 # SKIP nothing to run
ok 1 - Empty # SKIP nothing to run
# Subtest: G
    1..1
    ok 1 - a
      ---
      outcome: "passed"
      progress: "100"
      result: "0"
      description: "chip answers"
      duration_ms: 301
      ...
ok 2 - G
# 1 passed, 0 failed, 0 not run in 2.5 s
)");
    EXPECT_EQ(tap_of(run_of({})), "TAP version 14\n1..0 # SKIP nothing to run\n"
                                  "# 0 passed, 0 failed, 0 not run in 2.5 s\n");
}

// On one line, tabs and line ends are seen, too.
std::string on_one_line(const std::string &text)
{
    std::string line;
    for (const char byte : text) {
        const bool seen = byte == '\t' || byte == '\n' || byte == '\r';
        line += seen ? picture(byte) : std::string(1, byte);
    }
    return line;
}

TEST_F(TapReport, ReadsBackWhateverIsReported)
{
    for (const Text &text : hostile_texts_for_json()) {
        const Tap tap = parse_tap(tap_of(run_with(text.reported)));
        const std::string line = on_one_line(text.read);
        EXPECT_EQ(tap.bail_out, line.empty() ? "the run did not finish" : line);
        ASSERT_EQ(tap.points.size(), 1U);
        EXPECT_EQ(tap.points[0].name, line);
        ASSERT_EQ(tap.points[0].inside.size(), 2U);
        const Point failed = tap.points[0].inside[0];
        EXPECT_FALSE(failed.ok);
        EXPECT_EQ(failed.name, line);
        Attributes expected = {{"outcome", "failed"},      {"reason", text.read},
                               {"progress", text.read},    {"result", text.read},
                               {"description", text.read}, {"duration_ms", "301"}};
        if (text.read.empty()) {
            expected.erase("reason");
        }
        EXPECT_EQ(failed.diagnosis, expected);
        EXPECT_EQ(tap.points[0].inside[1].skipped, line.empty() ? "not run" : "not run: " + line);
    }
}

TEST_F(TapReport, HasNothingThatYamlCannotHold)
{
    // line ends and marks beside the usual ones, and characters that are none
    for (const char *text :
         {"\u2028", "\u2029", "\uFEFF", "\uFFFE", "\uFFFF", "\xC2\x85", "\x7F"}) {
        ItemRun one = item("a", Outcome::failed, text);
        const std::string tap = tap_of(run_of({suite("G", {one})}));
        EXPECT_THAT(tap, Not(HasSubstr(text)));
    }
}

TEST_F(TapReport, TellsOfAResultWithoutAValueByAnEmptyText)
{
    ItemRun one = item("a", Outcome::failed);
    one.report.result_without_value = true;
    const Tap tap = parse_tap(tap_of(run_of({suite("G", {one})})));
    EXPECT_EQ(tap.points.at(0).inside.at(0).diagnosis.at("result"), "");
}

class Prove : public TapReport
{
  protected:
    void SetUp() override
    {
        TapReport::SetUp();
        setenv("HARNESS_ACTIVE", "1", 1);
    }
    Ended proved(const RunOfItems &run) const
    {
        tap_of(run);
        return prove(path("tap"));
    }
};

TEST_F(Prove, AcceptsARunThatPassed)
{
    const Ended end = proved(
        run_of({suite("G", {passed("a"), passed("b#\\")}), suite("H # SKIP \\", {passed("c")})}));
    EXPECT_EQ(end.status, 0) << end.out;
    EXPECT_THAT(end.out, HasSubstr("All tests successful."));
    EXPECT_THAT(end.out, HasSubstr("Files=1, Tests=2"));
    EXPECT_THAT(end.out, Not(HasSubstr("skipped")));
}

TEST_F(Prove, CountsTheGroupsThatFailed)
{
    const Ended end =
        proved(run_of({suite("G", {passed("a"), failed("b"), failed("c")}),
                       suite("H", {passed("c")}), suite("I", {item("d", Outcome::silent)})}));
    EXPECT_NE(end.status, 0);
    EXPECT_THAT(end.out, HasSubstr("Failed 2/3 subtests"));
    EXPECT_THAT(end.out, HasSubstr("Failed tests:  1, 3"));
    EXPECT_THAT(end.out, Not(HasSubstr("Parse errors")));
}

TEST_F(Prove, SeesThatARunWasInterrupted)
{
    RunOfItems run = run_of({suite("G", {passed("a"), item("b", Outcome::not_run)})});
    run.finished = false;
    run.why_unfinished = "interrupted by Ctrl-C";
    const Ended end = proved(run);
    EXPECT_NE(end.status, 0);
    EXPECT_THAT(end.out, HasSubstr("Bailout called.  Further testing stopped:  "
                                   "interrupted by Ctrl-C"));
    EXPECT_THAT(end.out, Not(HasSubstr("Parse errors")));
}

TEST_F(Prove, SeesThatARunWasCutOff)
{
    play_tap([&](Listener &report) {
        Playback playback(
            report, run_of({suite("G", {passed("a")}), suite("H", {passed("b"), passed("c")})}));
        playback.begin();
        playback.run_item({0, 0});
        playback.run_item({1, 0});
    });
    const Ended end = prove(path("tap"));
    EXPECT_NE(end.status, 0);
    EXPECT_THAT(end.out, HasSubstr("Bad plan.  You planned 2 tests but ran 1."));
    EXPECT_EQ(parse_tap(read_file(path("tap"))).open.size(), 1U);
}

TEST_F(Prove, IsNotDeceivedByWhatItemsReport)
{
    for (const char *text : {"\nBail out!", "\n1..7\n", "\nok 2\nok 3\n", " # TODO later", "# SKIP",
                             "\\# SKIP", "\\", "\n  ---\n", "\xFF\xFE"}) {
        ItemRun bad = item(text, Outcome::failed, text);
        bad.report = {text, text, false, text};
        const Ended failing = proved(run_of({suite(text, {bad}), suite("H", {passed("b")})}));
        EXPECT_NE(failing.status, 0);
        EXPECT_THAT(failing.out, HasSubstr("Failed 1/2 subtests")) << text;
        EXPECT_THAT(failing.out, Not(HasSubstr("Parse errors"))) << text;
        const Ended passing = proved(run_of({suite(text, {passed(text)})}));
        EXPECT_EQ(passing.status, 0) << passing.out;
        EXPECT_THAT(passing.out, Not(HasSubstr("skipped"))) << text;
    }
}

TEST_F(Prove, ReadsALongDescriptionsBeginning)
{
    for (const std::string piece : {"d", "\u2028"}) {
        ItemRun one = passed("a");
        one.report.description = "";
        while (one.report.description->size() < 200000) {
            *one.report.description += piece;
        }
        const Ended finished = proved(run_of({suite("G", {one})}));
        EXPECT_EQ(finished.status, 0);
        EXPECT_THAT(finished.out, Not(HasSubstr("Parse errors")));
    }
}

TEST_F(TapReport, SaysThatTheDiskIsFullAndStaysQuiet)
{
    const Stream stream(std::fopen("/dev/full", "w"), &std::fclose);
    ASSERT_NE(stream, nullptr);
    const auto report = tap_report(stream.get());
    Playback playback(*report, mixed_run());
    playback.begin();
    EXPECT_EQ(report->failure(), "the TAP output: No space left on device");
    playback.run_item({0, 0});
    playback.finish();
    EXPECT_EQ(report->failure(), "the TAP output: No space left on device");
}

TEST_F(TapReport, SaysThatNobodyReads)
{
    std::array<int, 2> ends{};
    ASSERT_EQ(pipe2(ends.data(), O_CLOEXEC), 0);
    const Stream stream(fdopen(ends[1], "w"), &std::fclose);
    const auto report = tap_report(stream.get());
    Playback playback(*report, mixed_run());
    playback.begin();
    EXPECT_EQ(report->failure(), "");
    close(ends[0]);
    playback.run_item({0, 0});
    EXPECT_EQ(report->failure(), "the TAP output: Broken pipe");
}

TEST_F(TapReport, WritesNoMoreOnceItHasFoundNoRoom)
{
    EXPECT_EQ(in_a_child([&] {
                  const Stream stream(std::fopen(path("tap").c_str(), "w"), &std::fclose);
                  const auto report = tap_report(stream.get());
                  Playback playback(*report, mixed_run());
                  limit_file_size(60);
                  playback.begin();
                  playback.run_item({0, 0});
                  EXPECT_EQ(report->failure(), "the TAP output: File too large");
                  limit_file_size(RLIM_INFINITY);
                  playback.finish();
                  EXPECT_EQ(report->failure(), "the TAP output: File too large");
              }),
              0);
    EXPECT_THAT(read_file(path("tap")), Not(HasSubstr("Bail out")));
}

// --- all of them -------------------------------------------------------------

RunOfItems random_run(std::mt19937 &random)
{
    const std::vector<Text> texts = hostile_texts_for_xml();
    const auto below = [&](std::size_t limit) { return random() % limit; };
    const auto text = [&] {
        const std::string &chosen = texts[below(texts.size())].reported;
        return below(2) == 0 ? chosen.substr(0, 40) : "Item" + std::to_string(below(9));
    };
    const auto maybe = [&] { return below(2) == 0 ? std::optional(text()) : std::nullopt; };
    std::vector<Suite> suites;
    for (std::size_t count = below(5); count > 0; --count) {
        std::vector<ItemRun> items;
        for (std::size_t size = below(6); size > 0; --size) {
            ItemRun one = item(text(), static_cast<Outcome>(below(6)), text());
            one.report = {maybe(), maybe(), below(4) == 0, maybe()};
            one.output = text();
            items.push_back(one);
        }
        suites.push_back(suite(text(), items));
    }
    RunOfItems run = run_of(suites);
    run.finished = below(2) == 0;
    run.why_unfinished = run.finished ? "" : text();
    return run;
}

Tally counted_by_hand(const RunOfItems &run)
{
    Tally tally;
    for (const Suite &one : run.suites) {
        for (const ItemRun &item : one.items) {
            ++(item.outcome == Outcome::passed    ? tally.passed
               : item.outcome == Outcome::not_run ? tally.not_run
                                                  : tally.failed);
        }
    }
    return tally;
}

TEST_F(Reports, AgreeOnTheCountsOfAnyRun)
{
    std::mt19937 random(7);
    for (int round = 0; round < 300 && !HasFailure(); ++round) {
        const RunOfItems run = random_run(random);
        const Tally expected = counted_by_hand(run);
        const auto &[passed, failed, not_run] = expected;
        EXPECT_EQ(count(run).passed, passed);
        EXPECT_EQ(count(run).failed, failed);
        EXPECT_EQ(count(run).to_go, not_run);
        EXPECT_EQ(count(run).all(), passed + failed + not_run);
        const std::string json = json_of(run);
        const std::string text = tap_of(run);
        EXPECT_EQ(tally_of_json(json), expected);
        EXPECT_EQ(tally_of_junit(junit_of(run)), expected);
        EXPECT_EQ(tally_of_tap(text), expected);
        EXPECT_EQ(events_of(json).back().at("finished"), run.finished);
        const Tap tap = parse_tap(text);
        EXPECT_EQ(tap.bail_out.has_value(), !run.finished);
        EXPECT_THAT(tap.comments,
                    ElementsAre(std::to_string(passed) + " passed, " + std::to_string(failed) +
                                " failed, " + std::to_string(not_run) + " not run in 2.5 s"));
    }
}

TEST_F(Reports, AreReadableAndUnfinishedWhereTheRunWasCutOff)
{
    std::mt19937 random(8);
    for (int round = 0; round < 100 && !HasFailure(); ++round) {
        const RunOfItems run = random_run(random);
        const std::size_t stop = random() % 6;
        const auto play_a_part = [&](Listener &report) {
            Playback playback(report, run);
            playback.begin();
            for (std::size_t suite = 0; suite < run.suites.size() && suite < stop; ++suite) {
                for (std::size_t at = 0; at < run.suites[suite].items.size() && at < stop; ++at) {
                    playback.start({suite, at});
                    if (at + 1 < stop) {
                        playback.end_item({suite, at});
                    }
                }
            }
        };
        play_a_part(*json_report(path("json")));
        EXPECT_TRUE(events(events_of(read_file(path("json"))), "finish").empty());
        play_a_part(*junit_report(path("xml")));
        for (const Element &group : parse_xml(read_file(path("xml"))).all("testsuite")) {
            EXPECT_EQ(group.properties().at("finished"), "false");
        }
        play_tap(play_a_part);
        const Tap tap = parse_tap(read_file(path("tap")));
        EXPECT_EQ(tap.planned, run.suites.size());
        EXPECT_TRUE(tap.comments.empty());
    }
}

TEST(Counts, TakeEveryOtherOutcomeForFailed)
{
    const Counts counts = count(mixed_run());
    EXPECT_EQ(counts.passed, 1U);
    EXPECT_EQ(counts.failed, 4U);
    EXPECT_EQ(counts.to_go, 1U);
    EXPECT_EQ(count(mixed_run().suites[1].items).failed, 2U);
}

} // namespace
