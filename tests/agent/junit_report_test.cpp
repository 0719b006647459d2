// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0
// The JUnit XML that a run leaves.
#include "reporters_test.h"

#include <chrono>
#include <fcntl.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

using namespace reporters_test;
using namespace std::chrono_literals;

namespace
{

TEST_F(JunitReporter, WritesTheExpectedDocument)
{
    EXPECT_EQ(junit_of(mixed_run()), R"(<?xml version="1.0" encoding="UTF-8"?>
<testsuites name="fptest" tests="6" failures="1" errors="4" skipped="0" time="2.500" timestamp="2024-05-06T07:08:09">
  <testsuite name="Bringup" tests="3" failures="1" errors="1" skipped="0" time="0.903" timestamp="2024-05-06T07:08:10">
    <properties>
      <property name="plan" value="plans/demo.xml"/>
      <property name="vendor" value="1"/>
      <property name="pass_code" value="0"/>
      <property name="finished" value="false"/>
      <property name="reason" value="interrupted by Ctrl-C"/>
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
      <error type="no result" message="it reported nothing"></error>
    </testcase>
  </testsuite>
  <testsuite name="Endurance" tests="3" failures="0" errors="3" skipped="0" time="0.602" timestamp="2024-05-06T07:08:10">
    <properties>
      <property name="plan" value="plans/demo.xml"/>
      <property name="vendor" value="1"/>
      <property name="pass_code" value="0"/>
      <property name="finished" value="false"/>
      <property name="reason" value="interrupted by Ctrl-C"/>
    </properties>
    <testcase classname="Endurance" name="Slow" time="0.301">
      <error type="timed out" message="stopped after 5 s"></error>
    </testcase>
    <testcase classname="Endurance" name="BurnIn" time="0.301">
      <error type="stopped" message="interrupted by Ctrl-C"></error>
    </testcase>
    <testcase classname="Endurance" name="Last" time="0.000">
      <error type="not run" message="interrupted by Ctrl-C"/>
    </testcase>
  </testsuite>
</testsuites>
)");
}

TEST_F(JunitReporter, HasAMessageAlsoWhereNoReasonIsKnown)
{
    RunOfItems run =
        run_of({suite("G", {item("a", Outcome::stopped), item("b", Outcome::not_run)})});
    run.finished = false;
    run.why_unfinished = "SIGTERM";
    const Element group = parse_xml(junit_of(run)).children.at(0);
    EXPECT_EQ(group.all("testcase").at(0).all("error").at(0).attributes.at("message"), "stopped");
    EXPECT_EQ(group.all("testcase").at(1).all("error").at(0).attributes.at("message"), "SIGTERM");
}

TEST_F(JunitReporter, TellsOnEverySuiteThatTheRunEnded)
{
    const RunOfItems done = run_of({suite("G", {passed("a")}), suite("H", {failed("b")})});
    for (const Element &group : parse_xml(junit_of(done)).all("testsuite")) {
        EXPECT_EQ(group.properties().at("finished"), "true");
        EXPECT_FALSE(group.properties().contains("reason"));
    }
}

TEST_F(JunitReporter, ReadsBackWhateverIsReported)
{
    for (const Text &text : hostile_texts_for_xml()) {
        const Element group = parse_xml(junit_of(run_with(text.reported))).children.at(0);
        EXPECT_EQ(group.attributes.at("name"), text.read);
        EXPECT_EQ(group.properties().at("plan"), text.read);
        EXPECT_EQ(group.properties().at("reason"),
                  text.read.empty() ? "the run was still going on" : text.read);
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

TEST_F(JunitReporter, IsAWholeDocumentFromTheBeginningOn)
{
    const auto reporter = make_junit_reporter(path("xml"));
    Playback(*reporter, mixed_run()).begin();
    EXPECT_EQ(reporter->failure(), "");
    const Element top = parse_xml(read_file(path("xml")));
    EXPECT_EQ(top.attributes.at("errors"), "6");
    EXPECT_EQ(top.attributes.at("skipped"), "0");
    EXPECT_EQ(top.children.at(0).properties().at("finished"), "false");
    EXPECT_EQ(top.children.at(0).properties().at("reason"), "the run was still going on");
    EXPECT_EQ(top.children.at(0).all("testcase").at(0).all("error").at(0).attributes,
              (Attributes{{"type", "not run"}, {"message", "not run yet when this was written"}}));
}

TEST_F(JunitReporter, IsReplacedOnceASecondWhileTheRunLasts)
{
    const auto reporter = make_junit_reporter(path("xml"));
    Playback playback(*reporter, mixed_run());
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

TEST_F(JunitReporter, LeavesAWholeDocumentWhenItsProcessIsKilled)
{
    EXPECT_EQ(in_a_child([&] {
                  const auto reporter = make_junit_reporter(path("xml"));
                  Playback playback(*reporter, mixed_run());
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

TEST_F(JunitReporter, KeepsALinkToItsFile)
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

TEST_F(JunitReporter, GoesWhereALinkLeadsThoughThatIsNotThereYet)
{
    ASSERT_EQ(symlink("next", path("xml").c_str()), 0);
    ASSERT_EQ(symlink("target", path("next").c_str()), 0);
    EXPECT_THAT(junit_of(mixed_run()), StartsWith("<?xml"));
    EXPECT_THAT(read_file(path("target")), StartsWith("<?xml"));
    EXPECT_THAT(directory_.names(), ElementsAre("next", "target", "xml"));
}

TEST_F(JunitReporter, KeepsThePermissionsOfItsFile)
{
    write_file(path("xml"), "old");
    ASSERT_EQ(chmod(path("xml").c_str(), 0604), 0);
    junit_of(mixed_run());
    struct stat status {
    };
    ASSERT_EQ(stat(path("xml").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777, 0604U);
}

TEST_F(JunitReporter, HasThePermissionsOfAnyNewFile)
{
    const mode_t mask = umask(0027);
    junit_of(mixed_run());
    umask(mask);
    struct stat status {
    };
    ASSERT_EQ(stat(path("xml").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0640U);
}

TEST_F(JunitReporter, GoesIntoAPipeOnceAtTheEnd)
{
    ASSERT_EQ(mkfifo(path("pipe").c_str(), 0666), 0);
    const int reader = open(path("pipe").c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    ASSERT_GE(reader, 0);
    const auto reporter = make_junit_reporter(path("pipe"));
    Playback playback(*reporter, mixed_run());
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
    EXPECT_EQ(reporter->failure(), "");
    EXPECT_THAT(directory_.names(), ElementsAre("pipe"));
}

TEST_F(JunitReporter, GoesIntoAnOpenDescriptorWithoutReplacingItsFile)
{
    const int file = open(path("out").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666);
    ASSERT_EQ(write(file, "before\n", 7), 7);
    const ino_t before = inode(path("out"));
    play(*make_junit_reporter("/dev/fd/" + std::to_string(file)), mixed_run());
    close(file);
    EXPECT_EQ(inode(path("out")), before);
    EXPECT_THAT(read_file(path("out")), StartsWith("before\n<?xml"));
    EXPECT_THAT(directory_.names(), ElementsAre("out"));
}

TEST_F(JunitReporter, SaysWhyItCannotBeReplaced)
{
    const auto reporter = make_junit_reporter(path("xml"));
    Playback playback(*reporter, mixed_run());
    playback.begin();
    std::filesystem::create_directory(path("xml." + std::to_string(getpid()) + ".tmp"));
    playback.finish();
    EXPECT_EQ(reporter->failure(), path("xml") + ": Is a directory");
}

// No device of /dev is named here: a reporter that replaced what it should write
// into would take it from the machine.
TEST_F(JunitReporter, SaysThatWhatItWritesIntoHasNoRoom)
{
    EXPECT_EQ(in_a_child([&] {
                  const int file = open(path("out").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666);
                  const std::string name = "/dev/fd/" + std::to_string(file);
                  const Limit limit(RLIMIT_FSIZE, 1000);
                  const auto reporter = make_junit_reporter(name);
                  Playback playback(*reporter, mixed_run());
                  playback.begin();
                  playback.run_item({0, 0});
                  EXPECT_EQ(reporter->failure(), "");
                  playback.finish();
                  EXPECT_EQ(reporter->failure(), name + ": File too large");
              }),
              0);
    EXPECT_EQ(read_file(path("out")).size(), 1000U);
}

TEST_F(JunitReporter, KeepsTheLastWholeDocumentWhereTheNextFindsNoRoom)
{
    EXPECT_EQ(in_a_child([&] {
                  RunOfItems run = mixed_run();
                  run.suites[0].items[0].output = std::string(10000, 'x');
                  const Limit limit(RLIMIT_FSIZE, 5000);
                  const auto reporter = make_junit_reporter(path("xml"));
                  Playback(*reporter, run).play();
                  EXPECT_EQ(reporter->failure(), path("xml") + ": File too large");
              }),
              0);
    EXPECT_EQ(parse_xml(read_file(path("xml"))).attributes.at("errors"), "6");
    EXPECT_THAT(directory_.names(), ElementsAre("xml"));
}

} // namespace
