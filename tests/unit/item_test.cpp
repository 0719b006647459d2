// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The run of one item: the vendor, the item's name, the presence of a gatherer,
// and what is started how.
#include "unit_test.h"

#include <algorithm>
#include <cerrno>
#include <climits>
#include <optional>
#include <ostream>

namespace
{

// What the presence query prints while a gatherer runs.
const std::string kRunning = "root     4711  1     123456 789   0 0 S /system/bin/SensorProbe\n";
const std::string kGatherer = "SensorProbe";

class Item : public LibraryTest
{
  protected:
    static Lines run(int index = 0)
    {
        internals::SingleItemExecute(g_TestCmdTree, "g", index);
        return events();
    }
    // From a clean platform.
    static Lines run_item(const std::string &vendor, const std::string &name)
    {
        platform::reset();
        state().vendor = vendor;
        load_plan(plan_of(cmd(name)));
        return run();
    }
};

// --- what is started -------------------------------------------------------

enum class Starts { Program, Gatherer, Trigger };

struct Run {
    const char *what;
    std::string vendor = "0";
    std::string name = "x";
    std::optional<std::string> args = "-t 5";
    std::optional<std::string> query = ""; // what it prints, if it can be started
    Starts starts = Starts::Program;
    std::string kept = name; // after the cut
};

void PrintTo(const Run &run, std::ostream *out)
{
    *out << run.what;
}

class ItemRun : public Item, public WithParamInterface<Run>
{
  protected:
    static constexpr int kProgramRoom = 1024;

    static void prepare()
    {
        platform::reset();
        state().vendor = GetParam().vendor;
        const std::string name = "<Cmd name=\"" + GetParam().name + "\"";
        load_plan(
            plan_of(name + (GetParam().args ? " args=\"" + *GetParam().args + "\"/>" : "/>")));
        if (GetParam().query) {
            plan_output({*GetParam().query});
        } else {
            plan_steps("popen", {gives(0, EMFILE)});
        }
    }
    // The program, and the command line as far as it goes.
    static std::string program()
    {
        const char *const suffixes[] = {"", "_ca", "_ca_qsee"};
        return (GetParam().kept + suffixes[GetParam().vendor[0] - '0']).substr(0, kProgramRoom);
    }
    static std::string line()
    {
        return ("/system/bin/" + program() + " " + GetParam().args.value_or("(null)"))
            .substr(0, 1024);
    }
    static Lines up_to_the_query()
    {
        const Lines suffixed{"SingleItemExecute| tLine:" + program() + "\n"};
        return found(GetParam().name, GetParam().args.value_or("(null)"), GetParam().vendor) +
               queried(GetParam().query) + (GetParam().vendor != "0" ? suffixed : Lines());
    }
    static Lines gatherer_found()
    {
        const bool runs = GetParam().query && !GetParam().query->empty();
        return command(line()) + ("SingleItemExecute| \nrow=" +
                                  std::to_string(GetParam().query ? int{runs} : -1) + "\n");
    }
};

TEST_P(ItemRun, IsLoggedAndStarted)
{
    prepare();
    const Lines seen = run();
    switch (GetParam().starts) {
    case Starts::Program:
        EXPECT_EQ(seen, up_to_the_query() + executed(line()));
        break;
    case Starts::Gatherer:
        EXPECT_EQ(seen, up_to_the_query() + gatherer_found() + launch() + trigger() + left());
        break;
    case Starts::Trigger: // which says nothing of its leaving
        EXPECT_EQ(seen, up_to_the_query() + gatherer_found() + trigger());
        break;
    }
    EXPECT_EQ(command_name(), recorded(GetParam().kept.substr(0, 64)));
    EXPECT_THAT(
        left_open(),
        ElementsAreArray(GetParam().starts == Starts::Program ? Lines() : Lines{"connection#1"}));

    if (GetParam().starts == Starts::Gatherer) { // the launcher's child tells the command
        prepare();
        plan_steps("vfork", {gives(0)});
        platform::run_child([] { run(); });
        EXPECT_EQ(events(), up_to_the_query() + gatherer_found() + launched(line()));
    }
}

std::string letters(std::size_t count)
{
    std::string text;
    for (std::size_t at = 0; at < count; ++at) {
        text += static_cast<char>('a' + at % 26);
    }
    return text;
}

std::vector<Run> runs()
{
    constexpr auto kGathers = Starts::Gatherer;
    constexpr auto kTriggers = Starts::Trigger;
    std::vector<Run> all = {
        {.what = "OrdinaryItem"},
        {.what = "OrdinaryItemWhileAGathererRuns", .query = kRunning},
        {.what = "OrdinaryItemWhoseQueryFails", .query = std::nullopt},
        {.what = "EmptyArgumentsLeaveABlank", .args = ""},
        {.what = "MissingArgumentsAreANullText", .args = std::nullopt},
        {.what = "ArgumentsAreTakenUnchanged", .args = "  -a 'b c'\t%s | d ; $e  "},
        {.what = "NameIsCutAtATab", .name = "ab\tcd", .kept = "ab"},
        {.what = "NameIsCutAtALineFeed", .name = "ab\ncd", .kept = "ab"},
        {.what = "NameIsCutAtALastTab", .name = "ab\t", .kept = "ab"},
        {.what = "NameIsCutAtTheFirstOfBoth", .name = "ab\n\tcd", .kept = "ab"},
        {.what = "NameThatTheCutLeavesEmptyRuns", .name = "\tab", .kept = ""},
        {.what = "BlanksInANameStay", .name = " a b "},
        {.what = "VendorOneAppendsItsSuffix", .vendor = "1"},
        {.what = "VendorTwoAppendsItsSuffix", .vendor = "2"},
        {.what = "VendorTwoHasNoGatherer", .vendor = "2", .name = kGatherer},
        {.what = "VendorTwoHasNoGathererEvenWhileOneRuns",
         .vendor = "2",
         .name = kGatherer,
         .query = kRunning},
        {.what = "Gatherer", .name = kGatherer, .starts = kGathers},
        {.what = "VendorOnesGatherer", .vendor = "1", .name = kGatherer, .starts = kGathers},
        {.what = "GathererWhoseQueryFails",
         .name = kGatherer,
         .query = std::nullopt,
         .starts = kGathers},
        {.what = "GathererWithEmptyArguments", .name = kGatherer, .args = "", .starts = kGathers},
        {.what = "GathererWithoutArguments",
         .name = kGatherer,
         .args = std::nullopt,
         .starts = kGathers},
        {.what = "RunningGatherer", .name = kGatherer, .query = kRunning, .starts = kTriggers},
        {.what = "VendorOnesRunningGatherer",
         .vendor = "1",
         .name = kGatherer,
         .query = kRunning,
         .starts = kTriggers},
        {.what = "GathererWhoseNameIsCut",
         .name = kGatherer + "\tx",
         .query = kRunning,
         .starts = kTriggers,
         .kept = kGatherer},
    };
    for (const char *name :
         {"SensorProbe_ca", "SensorProbe_qsee", "SensorProbe_ca_qsee", "SensorProb", "SensorProbes",
          "sensorprobe", "SENSORPROBE", "SensorProbe ", " SensorProbe", "xSensorProbe"}) {
        for (const char *vendor : {"0", "1", "2"}) {
            all.push_back({.what = "GathererIsComparedExactly", .vendor = vendor, .name = name});
        }
    }
    for (const std::size_t length :
         {1U, 63U, 64U, 65U, 100U, 1016U, 1017U, 1021U, 1022U, 1023U, 1024U, 1025U, 2000U}) {
        for (const char *vendor : {"0", "1", "2"}) {
            all.push_back({.what = "LongNameAndItsSuffix",
                           .vendor = vendor,
                           .name = letters(length),
                           .kept = letters(std::min<std::size_t>(length, 1023))});
        }
    }
    for (const std::size_t length : {1023U, 1024U, 1025U, 3000U}) {
        for (const std::string &name : {std::string("x"), kGatherer}) {
            const std::size_t rest = length - std::string("/system/bin/ ").size() - name.size();
            all.push_back({.what = "LineHoldsOneThousandTwentyFourCharacters",
                           .name = name,
                           .args = std::string(rest, 'a'),
                           .starts = name == kGatherer ? kGathers : Starts::Program});
        }
    }
    return all;
}

INSTANTIATE_TEST_SUITE_P(Every, ItemRun, ValuesIn(runs()), [](const auto &run) {
    return run.param.what + std::to_string(run.index);
});

TEST_F(Item, StatusOfTheProgramIsIgnored)
{
    for (const int status : {-1, 256, 127 << 8, 9}) {
        plan_steps("system", {gives(status)});
        EXPECT_EQ(run_item("0", "x"), ran("x")) << status;
    }
}

TEST_F(Item, GathererIsTriggeredThoughItsLaunchFailed)
{
    load_plan(plan_of(cmd(kGatherer)));
    plan_steps("vfork", {gives(-1, EAGAIN)});
    EXPECT_EQ(run(), found(kGatherer) + queried() + command("/system/bin/SensorProbe -t 5") +
                         "SingleItemExecute| \nrow=0\n" + failed_launch() + trigger() + left());
}

TEST_F(Item, RunEndsAsUsualWhenTheTriggerFails)
{
    load_plan(plan_of(cmd(kGatherer)));
    plan_steps("Accept", {gives(-1, EMFILE)});
    EXPECT_EQ(run(), found(kGatherer) + queried() + command("/system/bin/SensorProbe -t 5") +
                         "SingleItemExecute| \nrow=0\n" + launch() + listener() +
                         accept_failed(EMFILE) + left());
    EXPECT_THAT(left_open(), ElementsAre("listener#1"));
}

TEST_F(Item, GroupStartsTheGathererOnceAndTriggersItTwice)
{
    load_plan(plan_of(cmd(kGatherer) + cmd(kGatherer, "-x")));
    plan_output({"", kRunning});
    EXPECT_THAT(run(0), Contains("vfork() = 100").Times(1));
    const auto second = run(1);
    EXPECT_THAT(second, Not(Contains(StartsWith("vfork"))));
    EXPECT_THAT(second, Contains("write(connection#2, \"gather again!\", 13) = 13").Times(1));
    EXPECT_THAT(left_open(), ElementsAre("connection#1", "connection#2"));
}

TEST_F(Item, RunChangesNothingInThePlan)
{
    load_plan(plan_of(cmd("x") + "<Cmd name=\"ab\tcd\"/>"));
    const auto first = run(0);
    run(1);
    EXPECT_EQ(run(0).size(), first.size());
    EXPECT_STREQ(mxmlElementGetAttr(mxmlFindElement(g_TestCmdTree, g_TestCmdTree, "Cmd", "name",
                                                    "ab\tcd", MXML_DESCEND),
                                    "name"),
                 "ab\tcd");
}

// --- the vendor ------------------------------------------------------------

TEST_F(Item, VendorIsTheDecimalNumberThatTheTextBeginsWith)
{
    struct Case {
        std::string text;
        int number;
        int clamped = number; // if a long has 32 bits, as it is read as one
    };
    for (const auto &[text, number, clamped] : std::initializer_list<Case>{
             {"0", 0},
             {"1", 1},
             {"2", 2},
             {"3", 3},
             {"-1", -1},
             {"+2", 2},
             {" 1", 1},
             {"\t\n 1", 1},
             {"1abc", 1},
             {"1 2", 1},
             {"1.9", 1},
             {"01", 1},
             {"010", 10},
             {"0x1", 0},
             {"", 0},
             {"abc", 0},
             {"a1", 0},
             {"- 1", 0},
             {"2147483647", INT_MAX},
             {"-2147483648", INT_MIN},
             {std::string(63, '0') + "1", 1},  // 64 characters
             {std::string(63, '0') + "12", 1}, // 65, of which 64 are read
             {"2147483648", INT_MIN, INT_MAX},
             {"-2147483649", INT_MAX, INT_MIN},
             {"4294967295", -1, INT_MAX},
             {"4294967296", 0, INT_MAX},
             {"4294967297", 1, INT_MAX},
             {"-4294967295", 1, INT_MIN},
             {"99999999999999999999", -1, INT_MAX},
         }) {
        platform::reset();
        state().vendor = text;
        load_plan(plan_of(""));

        const int expected = sizeof(long) == 8 ? number : clamped;
        EXPECT_EQ(run(), found_nothing(asked_item("(null)"), std::to_string(expected))) << text;
        EXPECT_EQ(internals::vendor, expected) << text;
    }
}

TEST_F(Item, VendorIsReadAfreshForEveryItemAndZeroWhereThereIsNone)
{
    load_plan(plan_of(cmd("a") + cmd("b")));
    state().vendor = "1";
    EXPECT_THAT(run(0), Contains("system(/system/bin/a_ca -t 5)"));
    state().vendor = "2";
    EXPECT_THAT(run(1), Contains("system(/system/bin/b_ca_qsee -t 5)"));
    platform::reset();
    EXPECT_EQ(run(1), ran("b"));
    EXPECT_EQ(internals::vendor, 0);
}

TEST_F(Item, AnyOtherVendorStartsNothingAfterThePresenceCheck)
{
    for (const std::string vendor : {"3", "-1", "-2", "10", "2147483647", "-2147483648"}) {
        for (const std::string &name : {std::string("x"), kGatherer}) {
            EXPECT_EQ(run_item(vendor, name),
                      found(name, "-t 5", vendor) + queried() +
                          "SingleItemExecute| More than one vendor, Setting error!\n");
            EXPECT_EQ(command_name(), recorded(name));
        }
    }
}

// --- the lookup ------------------------------------------------------------

TEST_F(Item, LookupThatFailsStartsNothingAfterTheVendorIsRead)
{
    state().vendor = "2";
    internals::SingleItemExecute(nullptr, "g", 0);
    EXPECT_EQ(events(), found_nothing(no_item(kNoPlan), "2"));
    EXPECT_EQ(internals::vendor, 2);

    load_plan(plan_of(cmd("a") + cmd("b")));
    internals::SingleItemExecute(g_TestCmdTree, "h", 0);
    EXPECT_EQ(events(), found_nothing(no_item(kNoGroup), "2"));
    for (const int index : {2, 3, INT_MAX, -1, -2, INT_MIN}) {
        EXPECT_EQ(run(index), found_nothing(asked_item("(null)"), "2")) << index;
    }
    EXPECT_EQ(command_name(), recorded(""));
}

TEST_F(Item, NodeWithoutANameStartsNothingAndKeepsTheLastItem)
{
    // the lookup begins at the first item, so that one comes first
    load_plan(
        plan_of(cmd("before") + "<!-- note -->words<Cmd args=\"-t 5\"/>" + cmd("") + "<Cmd/>"));
    run(0);
    EXPECT_EQ(run(1), nameless());
    EXPECT_EQ(run(2), nameless());
    EXPECT_EQ(run(3), nameless("(null)", "-t 5"));
    EXPECT_EQ(run(4), nameless("", "-t 5"));
    EXPECT_EQ(run(5), nameless());
    EXPECT_EQ(run(6), found_nothing());
    EXPECT_EQ(command_name(), recorded("before"));
    EXPECT_THAT(left_open(), IsEmpty());
}

// --- the name --------------------------------------------------------------

TEST_F(Item, ShorterNameLeavesNothingOfALongerOne)
{
    load_plan(plan_of(cmd(std::string(64, 'n')) + cmd("m")));
    run(0);
    run(1);
    EXPECT_EQ(command_name(), recorded("m"));
}

TEST_F(Item, NameIsRecordedBetweenItsLineAndThePresenceCheck)
{
    load_plan(plan_of(cmd("before") + cmd("x")));
    run(0);
    Lines seen;
    state().log_hook = state().system_hook = [&seen](const std::string &) {
        seen.push_back(internals::command_name);
    };
    run(1);
    // enter, the lookup's three, the name; the query's two, the command, its run, leave
    EXPECT_THAT(seen, ElementsAre("before", "before", "before", "before", "before", "x", "x", "x",
                                  "x", "x"));
}

// --- the presence check ----------------------------------------------------

TEST_F(Item, PresenceIsToldByTheFirstLineThatTheQueryPrints)
{
    const std::string longest(128, 'p');
    for (const auto &[output, line, present] :
         std::initializer_list<std::tuple<std::string, std::string, int>>{
             {"", "", 0},
             {kRunning + "root 4712 /system/bin/SensorProbe_ca\n", kRunning, 1},
             {"\n", "\n", 1},
             {" ", " ", 1},
             {"grep: error\n", "grep: error\n", 1},
             {longest.substr(1) + "\n", longest.substr(1) + "\n", 1},
             {longest + "\n", longest, 1},
             {longest + "p\n", longest, 1},
             {longest + longest + "\n", longest, 1}}) {
        platform::reset();
        plan_output({output});
        EXPECT_EQ(internals::ResourceReduce(), present) << output;
        EXPECT_EQ(events(), queried(line)) << output;
        EXPECT_THAT(left_open(), IsEmpty());
    }
}

TEST_F(Item, PresenceIsMinusOneWhenTheQueryCannotBeStarted)
{
    plan_steps("popen", {gives(0, EMFILE)});
    EXPECT_EQ(internals::ResourceReduce(), -1);
    EXPECT_EQ(events(), queried(std::nullopt));
}

TEST_F(Item, StatusOfTheQueryIsIgnored)
{
    plan_steps("pclose", {gives(-1, ECHILD), gives(256)});
    plan_output({kRunning, ""});
    EXPECT_EQ(internals::ResourceReduce(), 1);
    EXPECT_EQ(internals::ResourceReduce(), 0);
}

} // namespace
