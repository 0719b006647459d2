// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What reports say of rounds, of breaks, and of how items ended.
#include "reporters/wording.h"
#include "reporters_test.h"

#include <thread>

using namespace reporters_test;

namespace
{

RunOfItems two_items(std::optional<int> rounds)
{
    RunOfItems run = run_of({suite("G", {passed("a")}), suite("H", {failed("b")})});
    run.rounds = rounds;
    return run;
}

// Interrupted before its second item.
RunOfItems interrupted(RunOfItems run)
{
    run.suites[1].items[0] = item("b", Outcome::not_run);
    run.suites[1].items[0].group = "H";
    run.finished = false;
    run.why_unfinished = "interrupted by SIGTERM";
    return run;
}

// Two rounds and the first item of a third.
void play_into_third(Playback &playback)
{
    playback.begin();
    playback.play_round();
    playback.begin_next_round();
    playback.play_round();
    playback.begin_next_round();
    playback.run_item({0, 0});
}

// Of a million rounds.
void play_until_interrupted(Playback &playback)
{
    play_into_third(playback);
    playback.end_as(interrupted(two_items(1'000'000)));
    playback.finish();
}

void play_two(Playback &playback)
{
    playback.play(2);
}

// --- JSON -----------------------------------------------------------------------

TEST_F(RoundReports, NumberTheEventsOfAllRoundsInJson)
{
    const std::string text = json_of(two_items(3), play_into_third);
    std::vector<std::string> ends;
    for (const Json &end : events_of(text, "end")) {
        ends.push_back(std::to_string(end.at("index").get<int>()) + " " +
                       end.at("item").get<std::string>() + " " +
                       std::to_string(end.at("round").get<int>()));
    }
    EXPECT_THAT(ends, ElementsAre("0 a 1", "1 b 1", "2 a 2", "3 b 2", "4 a 3"));
    EXPECT_EQ(events_of(text, "run").at(0).at("items").size(), 2U);
}

TEST_F(RoundReports, EndTheRestOfABrokenRoundAndCountTheOthersInJson)
{
    const std::string text = json_of(two_items(1'000'000), play_until_interrupted);
    EXPECT_EQ(events_of(text, "end").size(), 6U);
    const Json last = events_of(text, "end").back();
    EXPECT_EQ(last.at("index"), 5);
    EXPECT_EQ(last.at("outcome"), "not run");
    EXPECT_EQ(last.at("reason"), "interrupted by SIGTERM");
    const Json finish = events_of(text, "finish").at(0);
    EXPECT_EQ(finish.at("rounds"), 3);
    EXPECT_EQ(finish.at("not_run"), 1 + 2 * 999'997);
}

TEST_F(RoundReports, SayInJsonWhatEndsTheRun)
{
    RunOfItems run = two_items(std::nullopt);
    run.time_limit = 7200;
    run.until_fail = true;
    run.why_ended = "H/b did not pass (--until-fail)";
    const std::string text = json_of(run);
    const Json begin = events_of(text, "run").at(0);
    EXPECT_EQ(begin.at("rounds"), Json());
    EXPECT_EQ(begin.at("time_limit"), 7200.0);
    EXPECT_EQ(begin.at("until_fail"), true);
    EXPECT_EQ(events_of(text, "finish").at(0).at("reason"), "H/b did not pass (--until-fail)");
}

// --- TAP ------------------------------------------------------------------------

TEST_F(RoundReports, PlanAllRoundsInFrontWhereTapKnowsTheirNumber)
{
    const std::string text = tap_of(two_items(2), play_two);
    const Tap read = parse_tap(text);
    EXPECT_THAT(text, StartsWith("TAP version 14\n1..4\n"));
    std::vector<std::string> names;
    for (const Point &point : read.points) {
        names.push_back(point.name);
    }
    EXPECT_THAT(names, ElementsAre("G (round 1)", "H (round 1)", "G (round 2)", "H (round 2)"));
    EXPECT_THAT(read.comments, ElementsAre("ITEM  PASSED    LEAST   MEDIAN  LONGEST",
                                           "G/a   2 of 2  0.301 s  0.301 s  0.301 s",
                                           "H/b   0 of 2  0.301 s  0.301 s  0.301 s",
                                           "2 passed, 2 failed, 0 not run in 2.5 s"));
}

TEST_F(RoundReports, PlanTheRoundsAtTheEndWhereTapDoesNotKnowTheirNumber)
{
    RunOfItems run = two_items(std::nullopt);
    run.time_limit = 3600;
    const std::string text = tap_of(run, play_two);
    EXPECT_THAT(text, StartsWith("TAP version 14\n# Subtest: G (round 1)\n"));
    EXPECT_THAT(text, HasSubstr("not ok 4 - H (round 2)\n1..4\n# ITEM"));
    EXPECT_EQ(parse_tap(text).planned, 4U);
    // the version that prove knows
    write_file(path("tap"), "TAP version 13\n" + text.substr(15));
    EXPECT_THAT(prove(path("tap")).out, Not(HasSubstr("Parse errors")));
}

TEST_F(RoundReports, SkipTheRestOfABrokenRoundInTap)
{
    EXPECT_THAT(tap_of(two_items(1'000'000), play_until_interrupted),
                EndsWith("ok 5 - G (round 3)\n"
                         "# Subtest: H (round 3)\n"
                         "    1..1\n"
                         "    ok 1 - b # SKIP not run: interrupted by SIGTERM\n"
                         "ok 6 - H (round 3) # SKIP not run: interrupted by SIGTERM\n"
                         "# ITEM  PASSED    LEAST   MEDIAN  LONGEST\n"
                         "# G/a   3 of 3  0.301 s  0.301 s  0.301 s\n"
                         "# H/b   0 of 2  0.301 s  0.301 s  0.301 s\n"
                         "# 3 passed, 2 failed, 1999995 not run in 2.5 s\n"
                         "Bail out!  interrupted by SIGTERM\n"));
}

// --- JUnit ----------------------------------------------------------------------

// "Case: verdict" of each, in their order.
std::vector<std::string> verdicts(const Element &top)
{
    std::vector<std::string> all;
    for (const Element &group : top.all("testsuite")) {
        for (const Element &test : group.all("testcase")) {
            all.push_back(test.attributes.at("classname") + "/" + test.attributes.at("name") +
                          ": " + verdict_of(test));
        }
    }
    return all;
}

TEST_F(RoundReports, NameTheTestCasesOfEachRoundInJunit)
{
    const Element top = parse_xml(junit_of(two_items(4), [](Playback &playback) {
        play_into_third(playback);
        playback.play_round();
        playback.finish();
    }));
    EXPECT_THAT(verdicts(top), ElementsAre("G/a (round 1): passed", "H/b (round 1): failure",
                                           "G/a (round 2): passed", "H/b (round 2): failure",
                                           "G/a (round 3): passed", "H/b (round 3): failure"));
    EXPECT_EQ(top.attributes.at("tests"), "6");
    EXPECT_EQ(top.attributes.at("failures"), "3");
    EXPECT_EQ(top.attributes.at("errors"), "0");
    for (const Element &group : top.all("testsuite")) {
        EXPECT_EQ(group.properties().at("finished"), "true") << group.attributes.at("name");
    }
    EXPECT_EQ(top.children.back().properties().at("summary G/a"),
              "3 of 3 passed, least 0.301 s, median 0.301 s, longest 0.301 s");
    EXPECT_THAT(directory_.names(), ElementsAre("xml"));
}

TEST_F(RoundReports, TellTheRoundsThatHaveNotBegunAsOneErrorInJunit)
{
    RunOfItems run = two_items(1'000'000);
    run.identity.labels = {{"device", "unit 7"}, {"station", "5"}};
    const Element top = parse_xml(junit_of(run, [&run](Playback &playback) {
        play_into_third(playback);
        playback.end_as(interrupted(run));
        playback.finish();
    }));
    EXPECT_THAT(verdicts(top), ElementsAre("G/a (round 1): passed", "H/b (round 1): failure",
                                           "G/a (round 2): passed", "H/b (round 2): failure",
                                           "G/a (round 3): passed", "H/b (round 3): not run",
                                           "rounds/rounds 4 to 1000000: not run"));
    EXPECT_EQ(top.attributes.at("tests"), "7");
    EXPECT_EQ(top.attributes.at("errors"), "2");
    const Element rounds = top.children.back().all("testcase").at(0);
    EXPECT_EQ(rounds.all("error").at(0).attributes.at("message"), "interrupted by SIGTERM");
    for (const Element &group : top.all("testsuite")) {
        EXPECT_EQ(group.properties().at("finished"), "false");
        EXPECT_EQ(group.properties().at("reason"), "interrupted by SIGTERM");
        EXPECT_EQ(group.properties().at("station"), "5");
        EXPECT_EQ(group.attributes.at("hostname"), "unit 7");
    }
}

TEST_F(RoundReports, AreRedInJunitFromTheFirstMomentOn)
{
    const Element top = parse_xml(junit_of(two_items(2), std::mem_fn(&Playback::begin)));
    EXPECT_THAT(verdicts(top), ElementsAre("G/a (round 1): not run", "H/b (round 1): not run",
                                           "rounds/round 2: not run"));
    EXPECT_EQ(top.attributes.at("errors"), "3");
}

TEST_F(RoundReports, AreRedInJunitWhereAnOpenRunIsCutOffBetweenItsRounds)
{
    RunOfItems run = two_items(std::nullopt);
    run.time_limit = 3600;
    run.finished = false;
    run.why_unfinished = "interrupted by SIGTERM";
    const Element top = parse_xml(junit_of(run));
    EXPECT_EQ(verdicts(top).back(), "rounds/round 2: not run");
    EXPECT_EQ(top.attributes.at("tests"), "3");
    EXPECT_EQ(top.attributes.at("errors"), "1");
}

TEST_F(RoundReports, SkipWhatIsLeftAfterTheItemThatWasWaitedForInJunit)
{
    RunOfItems run = two_items(std::nullopt);
    run.until_fail = true;
    run.suites[1].items[0] = item("b", Outcome::not_run);
    run.suites[1].items[0].group = "H";
    run.why_ended = "G/a did not pass (--until-fail)";
    const Element top = parse_xml(junit_of(run));
    EXPECT_THAT(verdicts(top), ElementsAre("G/a (round 1): passed", "H/b (round 1): skipped"));
    EXPECT_EQ(top.attributes.at("errors"), "0");
    EXPECT_EQ(
        top.children.at(1).all("testcase").at(0).all("skipped").at(0).attributes.at("message"),
        "G/a did not pass (--until-fail)");
}

TEST_F(RoundReports, GoThroughAPipeThatHoldsLessThanTheJunitDocument)
{
    RunOfItems run = two_items(2);
    run.suites[1].items[0].output = std::string(200'000, 'x');
    ASSERT_EQ(mkfifo(path("pipe").c_str(), 0600), 0);
    std::string text;
    std::thread reader([&] { text = read_file(path("pipe")); });
    {
        const auto reporter = make_junit_reporter(path("pipe"));
        Playback playback(*reporter, run);
        playback.play(2);
        EXPECT_EQ(reporter->failure(), "");
    }
    reader.join();
    EXPECT_THAT(verdicts(parse_xml(text)),
                ElementsAre("G/a (round 1): passed", "H/b (round 1): failure",
                            "G/a (round 2): passed", "H/b (round 2): failure"));
}

// --- how items ended --------------------------------------------------------------

// One that reported success, crashed, and left two processes.
RunOfItems crashed_run()
{
    ItemRun crash = passed("a");
    crash.outcome = Outcome::failed;
    crash.reason = "died by SIGSEGV";
    crash.signal = SIGSEGV;
    crash.left_running = {{"sh", 812}, {"logcat", 815}};
    ItemRun odd = passed("b");
    odd.exit_status = 5;
    return run_of({suite("G", {crash, odd})});
}

TEST_F(RoundReports, TellInJsonHowAnItemEnded)
{
    const auto ends = events_of(json_of(crashed_run()), "end");
    EXPECT_EQ(ends.at(0).at("exit_status"), Json());
    EXPECT_EQ(ends.at(0).at("signal"), "SIGSEGV");
    EXPECT_EQ(ends.at(0).at("left_running"),
              Json::parse(R"([{"name": "sh", "pid": 812}, {"name": "logcat", "pid": 815}])"));
    EXPECT_EQ(ends.at(1).at("exit_status"), 5);
    EXPECT_EQ(ends.at(1).at("signal"), Json());
    EXPECT_EQ(ends.at(1).at("left_running"), Json::array());
}

TEST_F(RoundReports, TellInJunitHowAnItemEnded)
{
    const Element group = parse_xml(junit_of(crashed_run())).children.at(0);
    const Element crash = group.all("testcase").at(0);
    EXPECT_EQ(crash.properties().at("signal"), "SIGSEGV");
    EXPECT_EQ(crash.properties().at("left_running"), "sh (pid 812), logcat (pid 815)");
    EXPECT_FALSE(crash.properties().contains("exit_status"));
    EXPECT_EQ(crash.all("failure").at(0).text, "result: 0\nprogress: 100\n"
                                               "description: chip answers\n"
                                               "signal: SIGSEGV\n"
                                               "left running: sh (pid 812), logcat (pid 815)\n");
    EXPECT_EQ(group.all("testcase").at(1).properties().at("exit_status"), "5");
}

TEST_F(RoundReports, TellInTapHowAnItemEnded)
{
    const Tap read = parse_tap(tap_of(crashed_run()));
    EXPECT_EQ(
        read.points.at(0).inside.at(0).diagnosis,
        (std::map<std::string, std::string>{{"outcome", "failed"},
                                            {"reason", "died by SIGSEGV"},
                                            {"progress", "100"},
                                            {"result", "0"},
                                            {"description", "chip answers"},
                                            {"duration_ms", "301"},
                                            {"signal", "SIGSEGV"},
                                            {"left_running", "sh (pid 812), logcat (pid 815)"}}));
    EXPECT_EQ(read.points.at(0).inside.at(1).diagnosis.at("exit_status"), "5");
    EXPECT_EQ(read.points.at(0).inside.at(1).diagnosis.at("outcome"), "passed");
}

TEST_F(RoundReports, ShowHowAnItemEnded)
{
    EXPECT_EQ(plain_of(crashed_run()),
              "plans/demo.xml: 2 items, vendor 1\n"
              "G/a: failed, result 0, died by SIGSEGV, 0.3 s: chip answers\n"
              "    left running: sh (pid 812), logcat (pid 815)\n"
              "G/b: passed, result 0, exit status 5, 0.3 s: chip answers\n"
              "1 passed, 1 failed, 2.5 s\n");
}

TEST_F(RoundReports, ShowNoSignalOfAnItemThatWasStoppedByIt)
{
    ItemRun stopped = item("a", Outcome::timed_out, "stopped after 1.0 s");
    stopped.signal = SIGTERM;
    EXPECT_EQ(how_it_ended(stopped), "");
    stopped.signal = SIGKILL;
    EXPECT_EQ(how_it_ended(stopped), "died by SIGKILL");
    ItemRun own = item("a", Outcome::failed);
    own.signal = SIGTERM;
    EXPECT_EQ(how_it_ended(own), "died by SIGTERM");
    EXPECT_EQ(name_of_signal(40), "signal 40");
}

// --- late reports -----------------------------------------------------------------

void play_with_a_late_report(Playback &playback)
{
    playback.begin();
    playback.run_item({0, 0});
    playback.report_late({0, 0}, {"100", "0", false, "of round 1\nreally"});
    playback.run_item({1, 0});
    playback.finish();
}

constexpr char kLate[] = "G/a: late report, result 0: of round 1␊really; it changes nothing";

TEST_F(RoundReports, TellALateReportOnALineOfItsOwn)
{
    EXPECT_THAT(plain_of(two_items(1), play_with_a_late_report),
                HasSubstr(std::string("\n") + kLate + "\nH/b: failed"));
    EXPECT_EQ(parse_tap(tap_of(two_items(1), play_with_a_late_report)).comments.at(0), kLate);

    const std::string junit = junit_of(two_items(1), play_with_a_late_report);
    EXPECT_EQ(parse_xml(junit).children.at(0).properties().at("late_report"), kLate);

    Json late = events_of(json_of(two_items(1), play_with_a_late_report), "late").at(0);
    late.erase("time");
    EXPECT_EQ(late, Json::parse(R"({"event": "late", "index": 0, "group": "G", "item": "a",
        "round": 1, "progress": "100", "result": "0", "description": "of round 1\nreally"})"));
}

TEST_F(RoundReports, TellWhatIsKnownOfALateReport)
{
    RunOfItems run = two_items(1);
    EXPECT_EQ(late_report(run, {0, 0}, {"50", std::nullopt, false, std::nullopt}),
              "G/a: late report, progress 50; it changes nothing");
    run.rounds = 2;
    EXPECT_EQ(late_report(run, {0, 0}, {"50", std::nullopt, true, std::nullopt}),
              "G/a (round 1): late report, result ?; it changes nothing");
}

// --- views ------------------------------------------------------------------------

TEST_F(RoundReports, SayInTheHeadingHowManyRoundsThereAre)
{
    const auto head = [](std::optional<int> rounds, std::optional<double> time, bool until_fail) {
        RunOfItems run = two_items(rounds);
        run.time_limit = time;
        run.until_fail = until_fail;
        return heading(run).substr(std::string("plans/demo.xml: 2 items, vendor 1").size());
    };
    EXPECT_EQ(head(1, {}, false), "");
    EXPECT_EQ(head(3, {}, false), ", 3 rounds");
    EXPECT_EQ(head({}, 7200, false), ", rounds for 2 h");
    EXPECT_EQ(head({}, 5400, false), ", rounds for 90 min");
    EXPECT_EQ(head({}, 86400, false), ", rounds for 1 d");
    EXPECT_EQ(head({}, 1.5, false), ", rounds for 1.500 s");
    EXPECT_EQ(head({}, {}, true), ", rounds until an item fails");
    EXPECT_EQ(head(200, 90, true), ", at most 200 rounds for 90 s or until an item fails");
}

TEST_F(RoundReports, EndAViewWithATableOfTheItems)
{
    const std::string long_name(100, 'n');
    RunOfItems run = run_of({suite("G", {passed(long_name), failed("b")})});
    run.rounds = 2;
    const std::string text = plain_of(run, play_two);
    const std::string name = "G/" + std::string(40, 'n') + "...";
    EXPECT_THAT(text,
                HasSubstr("\nITEM" + std::string(43, ' ') + "PASSED    LEAST   MEDIAN  LONGEST\n" +
                          name + "  2 of 2  0.301 s  0.301 s  0.301 s\nG/b" + std::string(42, ' ') +
                          "  0 of 2  0.301 s  0.301 s  0.301 s\n2 passed, 2 failed, "));
}

TEST_F(RoundReports, AreQuietButForWhatIsWrong)
{
    ItemRun left = passed("b");
    left.left_running = {{"sh", 812}};
    const RunOfItems run = run_of({suite("G", {passed("a"), left, failed("c")})});
    EXPECT_EQ(plain_of(run, play_two, true), "G/b: passed, result 0, 0.3 s: chip answers\n"
                                             "    left running: sh (pid 812)\n"
                                             "G/c: failed, result 1, 0.3 s: 3 dead pixels\n"
                                             "    | row 7\n"
                                             "    | row 9\n"
                                             "G/b: passed, result 0, 0.3 s: chip answers\n"
                                             "    left running: sh (pid 812)\n"
                                             "G/c: failed, result 1, 0.3 s: 3 dead pixels\n"
                                             "    | row 7\n"
                                             "    | row 9\n");
}

TEST_F(RoundReports, LeaveTheShellsLinesAloneAfterAPause)
{
    const Stream stream = open_stream("live");
    const auto view = make_live_view(stream.get(), false);
    Playback playback(*view, two_items(1));
    playback.begin();
    playback.start({0, 0});
    playback.pause();
    std::fputs("[1]+  Stopped\n$ fg\n", stream.get());
    std::fflush(stream.get());
    playback.resume();
    const std::string frame = "  a        [        ]       0.0 s  running    -  \n"
                              "0 passed, 0 failed, 2 to go, 0.0 s";
    EXPECT_THAT(read_file(path("live")),
                EndsWith("G\n" + frame + "\n[1]+  Stopped\n$ fg\n" + frame))
        << "what was drawn before the pause is not erased after it";
}

TEST_F(RoundReports, SayEveryTenSecondsWhatAnItemHasSaid)
{
    const How play_long_items = [](Playback &playback) {
        playback.begin();
        playback.start({0, 0});
        playback.tick({0, 0}, 9.9, "one\n");
        playback.tick({0, 0}, 10.1, "one\n");
        playback.tick({0, 0}, 20, "one\ntwo\n");
        playback.tick({0, 0}, 20.2, "one\ntwo\n");
        playback.end_item({0, 0});
        playback.start({0, 1});
        playback.tick({0, 1}, 10, "");
    };
    EXPECT_EQ(plain_of(run_of({suite("G", {passed("a"), passed("b")})}), play_long_items),
              "plans/demo.xml: 2 items, vendor 1\n"
              "G/a: running, 10.1 s\n"
              "    | one\n"
              "G/a: running, 20.2 s\n"
              "    | two\n"
              "G/a: passed, result 0, 0.3 s: chip answers\n"
              "G/b: running, 10.0 s\n");
}

TEST_F(RoundReports, TellOfTheItemThatRunsAndNotOfALaterOneThatHasEnded)
{
    const How play_a_gatherer = [](Playback &playback) {
        playback.begin();
        playback.start({0, 0});
        playback.start({0, 1});
        playback.end_unseen({0, 1});
        playback.tick({0, 0}, 10, "");
        playback.end_item({0, 0});
        playback.end_item({0, 1});
    };
    EXPECT_EQ(plain_of(run_of({suite("G", {passed("a"), passed("b")})}), play_a_gatherer),
              "plans/demo.xml: 2 items, vendor 1\n"
              "G/a: running, 10.0 s\n"
              "G/a: passed, result 0, 0.3 s: chip answers\n"
              "G/b: passed, result 0, 0.3 s: chip answers\n");
}

TEST_F(RoundReports, CutALineOfOutputThatIsTooLong)
{
    ItemRun loud = failed("a");
    loud.output = std::string(60'000, 'x') + "\nshort\n";
    const std::string text = plain_of(run_of({suite("G", {loud})}));
    EXPECT_THAT(text, HasSubstr("\n    | " + std::string(197, 'x') + "...\n    | short\n"));
    const std::string ten = "1\n2\n3\n4\n5\n6\n7\n8\n9\n10\n";
    EXPECT_THAT(last_lines(ten), SizeIs(10));
    EXPECT_EQ(last_lines("0\n" + ten).at(0), "(1 line before)");
}

} // namespace
