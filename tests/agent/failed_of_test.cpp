// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// fptest run --failed-of: an earlier run's JSON lines, as far as they go.
#include "run_test.h"

#include <csignal>
#include <filesystem>

namespace
{

const Items kFour = {{"Item", kPasses},
                     {"Other", "report G 100 1 bad"},
                     {"Third", ""},
                     {"Fourth", "report G 100 0 fine"}};

class FailedOf : public RunCommand
{
  protected:
    // The JSON lines of a run of these, with these options.
    static std::string left_by(const Items &items, const Lines &options = {})
    {
        run_group(items, options);
        std::filesystem::rename(work("json"), work("before"));
        std::filesystem::remove(device::kLogFile);
        return work("before");
    }
    static std::string changed(const std::string &from, const std::string &to)
    {
        std::string text = read_file(work("before"));
        const std::size_t at = text.find(from);
        EXPECT_NE(at, std::string::npos) << from << "\n" << text;
        return file("before", text.replace(std::min(at, text.size()), from.size(), to));
    }
    static void expect_refused(const std::string &line, const std::string &before)
    {
        expect_refusal(2, "fptest: " + line,
                       {"run", "--failed-of", before, "--plan", plan(group_of(kFour))});
    }
};

TEST_F(FailedOf, RunsWhatDidNotPass)
{
    const std::string before = left_by(kFour);
    const Ended ended = run_group(kFour, {"--failed-of", before});
    EXPECT_EQ(ended.status, 1);
    EXPECT_EQ(ended.err, "");
    EXPECT_THAT(outcomes(), ElementsAre("Other: failed", "Third: no result"));
    EXPECT_THAT(paths_run(), ElementsAre("P/G/Other", "P/G/Third"));
    const auto listed = [&](Lines options) {
        options.insert(options.begin(),
                       {"run", "--list", "--failed-of", before, "--plan", plan(group_of(kFour))});
        return run_fptest(options).out;
    };
    EXPECT_EQ(listed({"P/*/[FT]*"}), "P/G/Third  /system/bin/Third \n");
    EXPECT_EQ(listed({"--skip", "P/G/Third"}), "P/G/Other  /system/bin/Other report G 100 1 bad\n");
}

TEST_F(FailedOf, CountsByTheOutcome)
{
    const std::string expect = file("known", "P/G/Other QM-7\nP/G/Fourth QM-8\n");
    const std::string before = left_by(kFour, {"--expect", expect});
    run_group(kFour, {"--failed-of", before});
    EXPECT_THAT(outcomes(), ElementsAre("Third: no result", "Fourth: passed"));
}

TEST_F(FailedOf, HasNothingToDoWhereAllPassed)
{
    const std::string before = left_by({{"Item", kPasses}});
    const Ended ended = run_group(kFour, {"--failed-of", before});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "fptest: " + before + ": no item of that run failed: nothing to do\n");
    EXPECT_EQ(ended.out, "");
    EXPECT_THAT(paths_run(), IsEmpty());
}

// The item that ran when the device went down has not passed either.
TEST_F(FailedOf, UsesARunThatWasKilledAsFarAsItGoes)
{
    FptestProcess fptest(with_group({{"Item", "report G 100 1 bad"}, {"Other", kSleeps}}));
    ASSERT_TRUE(wait_for_events("start", 2));
    fptest.signal(SIGKILL);
    fptest.wait();
    expect_items_to_end();
    const std::string text = read_file(work("json"));
    const std::string whole = text.substr(0, text.rfind('\n') + 1);
    const std::string before = file("before", whole + "{\"event\":\"progr");
    const Ended ended = run_group(kFour, {"--failed-of", before});
    EXPECT_EQ(ended.err, "fptest: " + before + ": its last line is cut, and left out\n");
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed", "Other: failed"));
}

// It may have been killed between two items.
TEST_F(FailedOf, RunsWhatTheRunDidNotComeTo)
{
    const Items items = {{"Item", kPasses}, {"Other", kPasses}, {"Third", kPasses}};
    const auto cut_after = [](const std::string &kind, const std::string &text) {
        return file("before",
                    text.substr(0, text.find('\n', text.find("{\"event\":\"" + kind)) + 1));
    };
    run_group(items);
    const std::string before = cut_after("end", json());
    Ended ended = run_group(items, {"--failed-of", before});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "");
    EXPECT_THAT(outcomes(), ElementsAre("Other: passed", "Third: passed"));
    run_group(items, {"--repeat", "2"});
    cut_after("end", json());
    run_group(items, {"--failed-of", before});
    EXPECT_EQ(events("end").size(), 3U) << "of the second round";
    std::filesystem::remove(work("json"));
    FptestProcess fptest(with_group({{"Item", kPasses}, {"Other", kSleeps}, {"Third", kPasses}}));
    ASSERT_TRUE(wait_for_events("start", 2));
    fptest.signal(SIGINT);
    EXPECT_EQ(fptest.wait(10).status, 130);
    file("before", json());
    run_group(items, {"--failed-of", before});
    EXPECT_THAT(outcomes(), ElementsAre("Other: passed", "Third: passed"));
    // not what a run that has finished left out
    run_group(kFour, {"--stop-after", "1"});
    file("before", json());
    run_group(kFour, {"--failed-of", before});
    EXPECT_THAT(outcomes(), ElementsAre("Other: failed"));
}

TEST_F(FailedOf, SaysThatTheRunHasNoEnd)
{
    std::string text = read_file(left_by({{"Item", kPasses}}, {"--for", "0.001"}));
    text.resize(text.find("{\"event\":\"finish\""));
    const std::string before = file("before", text);
    const Ended ended = run_group(kFour, {"--failed-of", before});
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "fptest: " + before +
                             ": that run has no end: nobody knows whether it was to begin further "
                             "rounds\nfptest: " +
                             before + ": no item of that run failed: nothing to do\n");
}

TEST_F(FailedOf, RefusesAnotherPlan)
{
    const std::string before =
        left_by({{"Item", ""}, {"Script", ""}, {"Stubborn", ""}, {"Scrip", ""}, {"Other_ca", ""}});
    expect_refused(before + " is of another plan: it has G/Other_ca, G/Scrip, G/Script and 1 more, "
                            "and /tmp/scene/plan.xml has not",
                   before);
    const std::string once = left_by({{"Item", ""}});
    expect_refusal(2, "fptest: nothing is left to run: --failed-of leaves out all of it",
                   {"run", "--failed-of", once, "--plan", plan(group_of(kFour)), "P/G/Other"});
}

TEST_F(FailedOf, RefusesWhatIsNoReport)
{
    const std::string before = left_by({{"Item", ""}});
    const std::string whole = read_file(before);
    const std::string not_written = before + " is not what fptest run --json writes";
    expect_refused(work("none") + ": No such file or directory", work("none"));
    expect_refused("/tmp/scene: Is a directory", "/tmp/scene");
    expect_refused(before + " is empty: nothing is known of that run", file("before", ""));
    expect_refused(before + " is cut in its first line: nothing is known of that run",
                   file("before", "{\"event\":\"run\""));
    for (const std::string text :
         {"<xml/>\n", "{\"event\":\"run\"}\n", "7\n", "[]\n", "\n\n", "{\"event\":\"start\"}\n"}) {
        expect_refused(not_written, file("before", text));
    }
    file("before", whole);
    expect_refused(before + " has the format 3, and this fptest reads 2",
                   changed("\"format\":2", "\"format\":3"));
    const std::string wrong = ": this is not what fptest run --json writes: ";
    const auto expect_wrong = [&](const std::string &from, const std::string &to,
                                  const std::string &why) {
        file("before", whole);
        const std::string changed_file = changed(from, to);
        const Ended ended =
            run_fptest({"run", "--failed-of", changed_file, "--plan", plan(group_of(kFour))});
        EXPECT_EQ(ended.status, 2);
        EXPECT_THAT(ended.err, StartsWith("fptest: " + before + ":"));
        EXPECT_THAT(ended.err, HasSubstr(wrong + why));
        EXPECT_EQ(lines_of(ended.err).size(), 1U);
    };
    expect_wrong("\"index\":0,", "\"index\":-1,", "its index is no number");
    expect_wrong("\"outcome\":\"no result\"", "\"outcome\":\"grand\"",
                 "there is no outcome 'grand'");
    expect_wrong("\"event\":\"end\",\"index\":0,\"group\":\"G\",\"item\":\"Item\"",
                 "\"event\":\"end\",\"index\":0,\"group\":\"G\",\"item\":\"Else\"",
                 "its item is not the one that the index says");
    expect_wrong("\"reason\":", "\"reason\":7,\"raison\":", "");
    // what is cut is the last line only
    expect_wrong("{\"event\":\"start\"", "{\"event\":\"sta", "it is no JSON object");
}

TEST_F(FailedOf, HasNoPartInWhatCannotBe)
{
    const std::string before = left_by({{"Item", ""}});
    const std::string whole = read_file(before);
    const std::string wrong = ":1: this is not what fptest run --json writes: ";
    for (const auto &[key, value] :
         std::vector<std::pair<std::string, std::string>>{{"\"rounds\":1,", "0"},
                                                          {"\"rounds\":1,", "99999999999"},
                                                          {"\"rounds\":1,", "18446744073709551615"},
                                                          {"\"rounds\":1,", "1.5"},
                                                          {"\"rounds\":1,", "\"1\""},
                                                          {"\"pass_code\":0,", "77"}}) {
        file("before", whole);
        const std::string name = key.substr(1, key.rfind('"') - 1);
        expect_refused(before + wrong + "'" + name + "' is " + value,
                       changed(key, "\"" + name + "\":" + value + ","));
    }
    expect_refused(before + ":" + std::to_string(lines_of(whole).size() + 1) + wrong.substr(2) +
                       "another run begins here",
                   file("before", whole + whole));
}

TEST_F(FailedOf, IsNotReadWithoutEnd)
{
    expect_refused("/dev/zero:1: this line is longer than the 64 MiB that fptest reads",
                   "/dev/zero");
}

// As from <(zcat earlier.jsonl.gz), also where that takes long.
TEST_F(FailedOf, MayComeThroughAPipeToWhichSomebodyWrites)
{
    const std::string before = left_by({{"Item", ""}});
    for (const std::string name : {"pipe", "nobodys"}) {
        ASSERT_EQ(mkfifo(work(name).c_str(), 0600), 0);
    }
    FptestProcess refused(
        {"run", "--failed-of", work("nobodys"), "--plan", file("other.xml", group_of(kFour))});
    const support::Process writer({.arguments = {"sh", "-c", "exec >\"$1\"; sleep 6; cat \"$2\"",
                                                 "sh", work("pipe"), before}});
    EXPECT_EQ(run_group({{"Item", kPasses}}, {"--failed-of", work("pipe")}).status, 0);
    EXPECT_THAT(outcomes(), ElementsAre("Item: passed"));
    const Ended ended = refused.wait();
    EXPECT_EQ(ended.status, 2);
    EXPECT_EQ(ended.err,
              "fptest: " + work("nobodys") + ": nobody writes to this pipe within 5 s\n");
}

TEST_F(FailedOf, IsNotOverwritten)
{
    const std::string before = left_by(kFour);
    const Ended ended = run_fptest(
        {"run", "--failed-of", before, "--json", before, "--plan", plan(group_of(kFour))});
    EXPECT_EQ(ended.status, 2);
    EXPECT_THAT(ended.err, HasSubstr("--failed-of and --json both want the file "));
    EXPECT_FALSE(events_of(read_file(before)).empty());
}

} // namespace
