// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0
// The TAP that a run leaves, as a parser and prove read it.
#include "reporters_test.h"

#include <array>
#include <fcntl.h>
#include <unistd.h>

using namespace reporters_test;

namespace
{

// What is known of an item of passed().
const std::string kPassedBlock = "      ---\n"
                                 "      outcome: \"passed\"\n"
                                 "      progress: \"100\"\n"
                                 "      result: \"0\"\n"
                                 "      description: \"chip answers\"\n"
                                 "      duration_ms: 301\n"
                                 "      ...\n";

TEST_F(TapReporter, WritesTheExpectedDocument)
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

TEST_F(TapReporter, DoesNotBailOutOfARunThatEnded)
{
    const Tap tap = parse_tap(tap_of(run_of({suite("G", {passed("a"), failed("b")})})));
    EXPECT_FALSE(tap.bail_out);
    EXPECT_FALSE(tap.points.at(0).ok);
    EXPECT_THAT(tap.comments, ElementsAre("1 passed, 1 failed, 0 not run in 2.5 s"));
}

TEST_F(TapReporter, BailsOutAlsoWhereNobodyKnowsWhy)
{
    RunOfItems run = mixed_run();
    run.why_unfinished.clear();
    EXPECT_EQ(parse_tap(tap_of(run)).bail_out, "the run did not finish");
}

TEST_F(TapReporter, IsVersion13UnderAHarness)
{
    const std::string usual = tap_of(mixed_run());
    setenv("HARNESS_ACTIVE", "1", 1);
    const std::string harnessed = tap_of(mixed_run());
    EXPECT_THAT(usual, StartsWith("TAP version 14\n"));
    EXPECT_THAT(harnessed, StartsWith("TAP version 13\n"));
    EXPECT_EQ(usual.substr(15), harnessed.substr(15));
}

TEST_F(TapReporter, HasEveryPlannedPointOnceAlsoWhereTheRunWasInterrupted)
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

TEST_F(TapReporter, WritesAPointWhenItsItemHasEnded)
{
    tap_of(mixed_run(), [&](Playback &playback) {
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

TEST_F(TapReporter, KeepsItsOrderWhereItemsEndInAnother)
{
    const RunOfItems run =
        run_of({suite("G", {passed("a"), passed("b")}), suite("H", {passed("c")})});
    const std::string whole = tap_of(run, [&](Playback &playback) {
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
                                                     kPassedBlock));
        playback.finish();
    });
    EXPECT_EQ(parse_tap(whole).points.size(), 2U);
}

TEST_F(TapReporter, SkipsWhatIsLeftAfterTheItemThatWasWaitedFor)
{
    RunOfItems run = run_of({suite("G", {passed("a"), item("b", Outcome::not_run)})});
    run.why_ended = "G/a did not pass";
    EXPECT_THAT(tap_of(run),
                HasSubstr("    ok 1 - a\n" + kPassedBlock +
                          "    ok 2 - b # SKIP not run: G/a did not pass\nok 1 - G\n"));
}

TEST_F(TapReporter, SkipsWhatHasNoItems)
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

TEST_F(TapReporter, ReadsBackWhateverIsReported)
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

TEST_F(TapReporter, HasNothingThatYamlCannotHold)
{
    // line ends and marks beside the usual ones, and characters that are none
    for (const char *text :
         {"\u2028", "\u2029", "\uFEFF", "\uFFFE", "\uFFFF", "\xC2\x85", "\x7F"}) {
        ItemRun one = item("a", Outcome::failed, text);
        const std::string tap = tap_of(run_of({suite("G", {one})}));
        EXPECT_THAT(tap, Not(HasSubstr(text)));
    }
}

class Prove : public TapReporter
{
  protected:
    void SetUp() override
    {
        TapReporter::SetUp();
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
                       suite("H", {passed("c")}), suite("I", {item("d", Outcome::no_result)})}));
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
    const RunOfItems run =
        run_of({suite("G", {passed("a")}), suite("H", {passed("b"), passed("c")})});
    const std::string text = tap_of(run, [](Playback &playback) {
        playback.begin();
        playback.run_item({0, 0});
        playback.run_item({1, 0});
    });
    const Ended end = prove(path("tap"));
    EXPECT_NE(end.status, 0);
    EXPECT_THAT(end.out, HasSubstr("Bad plan.  You planned 2 tests but ran 1."));
    EXPECT_EQ(parse_tap(text).open.size(), 1U);
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

TEST_F(TapReporter, SaysThatTheDiskIsFullAndStaysQuiet)
{
    const Stream stream(std::fopen("/dev/full", "w"), &std::fclose);
    ASSERT_NE(stream, nullptr);
    const auto reporter = make_tap_reporter(stream.get());
    Playback playback(*reporter, mixed_run());
    playback.begin();
    EXPECT_EQ(reporter->failure(), "the TAP output: No space left on device");
    playback.run_item({0, 0});
    playback.finish();
    EXPECT_EQ(reporter->failure(), "the TAP output: No space left on device");
}

TEST_F(TapReporter, SaysThatNobodyReads)
{
    std::array<int, 2> ends{};
    ASSERT_EQ(pipe2(ends.data(), O_CLOEXEC), 0);
    const Stream stream(fdopen(ends[1], "w"), &std::fclose);
    const auto reporter = make_tap_reporter(stream.get());
    Playback playback(*reporter, mixed_run());
    playback.begin();
    EXPECT_EQ(reporter->failure(), "");
    close(ends[0]);
    playback.run_item({0, 0});
    EXPECT_EQ(reporter->failure(), "the TAP output: Broken pipe");
}

TEST_F(TapReporter, WritesNoMoreOnceItHasFoundNoRoom)
{
    EXPECT_EQ(in_a_child([&] {
                  const Stream stream = open_stream("tap");
                  const auto reporter = make_tap_reporter(stream.get());
                  Playback playback(*reporter, mixed_run());
                  {
                      const Limit limit(RLIMIT_FSIZE, 60);
                      playback.begin();
                      playback.run_item({0, 0});
                  }
                  EXPECT_EQ(reporter->failure(), "the TAP output: File too large");
                  playback.finish();
                  EXPECT_EQ(reporter->failure(), "the TAP output: File too large");
              }),
              0);
    EXPECT_THAT(read_file(path("tap")), Not(HasSubstr("Bail out")));
}

} // namespace
