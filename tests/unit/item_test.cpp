// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The run of one item: the vendor, the item's name, the presence of a gatherer,
// and what is started how.
#include "sequences.h"
#include "unit_test.h"

#include <algorithm>
#include <cerrno>
#include <climits>

using platform::events;
using platform::gives;
using platform::left_open;
using platform::plan_output;
using platform::plan_steps;
using platform::set_vendor;
using sequences::failed_accept;
using sequences::failed_launch;
using sequences::launch;
using sequences::launched;
using sequences::trigger;
using ::testing::Contains;
using ::testing::Not;
using ::testing::StartsWith;

namespace
{

// What the presence query prints while a gatherer runs.
const std::string kRunning = "root     4711  1     123456 789   0 0 S /system/bin/SensorProbe\n";

// The one item of most tests.
std::string item(const std::string &name, const std::string &args = "-t 5")
{
    return "<Cmd name=\"" + name + "\" args=\"" + args + "\"/>";
}

class Item : public LibraryTest
{
  protected:
    // Loads a plan whose group "g" has those children.
    static void load(const std::string &children)
    {
        internals::reset();
        platform::write_plan("<?xml version=\"1.0\"?><P><CmdGroup name=\"g\">" + children +
                             "</CmdGroup></P>");
        ASSERT_NE(internals::load_configs_file("/data/vorlane/src1.xml"), nullptr);
        events();
    }
    static Lines run(int index = 0)
    {
        internals::SingleItemExecute(g_TestCmdTree, "g", index);
        return events();
    }
    static Lines run_item(const std::string &name, const std::string &args = "-t 5")
    {
        load(item(name, args));
        return run();
    }
    // The same from a clean platform, under a vendor.
    static Lines run_item_under(const std::string &vendor, const std::string &name,
                                const std::string &args = "-t 5")
    {
        platform::reset();
        set_vendor(vendor);
        return run_item(name, args);
    }
    // What the launcher's child does for an item.
    static Lines run_child(const std::string &name, const std::string &args = "-t 5")
    {
        load(item(name, args));
        plan_steps("vfork", {gives(0)});
        platform::run_child([] { internals::SingleItemExecute(g_TestCmdTree, "g", 0); });
        return events();
    }

    // The events of a run, piece by piece: up to the vendor line,
    static Lines begun(const std::string &vendor = "0")
    {
        return {"SingleItemExecute| enter... !\n",
                "get_node_value(/etc/vorlane/sysparms/vr_common_cfg.xml, "
                "device/SysParam/Quillmark/vendor, 64)",
                "stdout: vendor = " + vendor + "\n"};
    }
    // the lookup of the item,
    static Lines looked_up(const std::string &name)
    {
        return {"get_node_byIndex| enter...\n",
                "get_node_byIndex| curernt leaf node name = " + name + "\n",
                "get_node_byIndex| leave...\n"};
    }
    static Lines read(const std::string &name, const std::string &args = "-t 5")
    {
        return {"SingleItemExecute| mxmlElementGetAttr name=" + name + "- args=" + args + "\n"};
    }
    // the presence check,
    static Lines asked()
    {
        return {"ResourceReduce| \ncbuf=ps | grep /system/bin/SensorProbe\n"};
    }
    static Lines absent()
    {
        return joined({asked(),
                       {"popen(ps | grep /system/bin/SensorProbe, r) = stream#1",
                        "fgets(stream#1, 129) = null",
                        "ResourceReduce| target process not exist!\n", "pclose(stream#1)"}});
    }
    static Lines present(const std::string &line)
    {
        return joined({asked(),
                       {"popen(ps | grep /system/bin/SensorProbe, r) = stream#1",
                        "fgets(stream#1, 129) = \"" + line + "\"",
                        "ResourceReduce| \ntbuf=" + line + "\n", "pclose(stream#1)"}});
    }
    static Lines unanswered()
    {
        return joined({asked(),
                       {"popen(ps | grep /system/bin/SensorProbe, r) = null",
                        "ResourceReduce| popen error!\n"}});
    }
    // and the start.
    static Lines suffixed(const std::string &name)
    {
        return {"SingleItemExecute| tLine:" + name + "\n"};
    }
    static Lines command(const std::string &command)
    {
        return {"SingleItemExecute| tpCmd:" + command + "\n"};
    }
    static Lines ordinary(const std::string &line)
    {
        return joined({command(line), {"system(" + line + ")"}, left()});
    }
    static Lines row(int result)
    {
        return {"SingleItemExecute| \nrow=" + std::to_string(result) + "\n"};
    }
    static Lines left()
    {
        return {"SingleItemExecute| leave... !\n"};
    }

    // The whole run of an ordinary item while no gatherer runs.
    static Lines ordinary_run(const std::string &name, const std::string &line)
    {
        return joined({begun(), looked_up(name), read(name), absent(), ordinary(line)});
    }
    static Lines suffixed_run(const std::string &vendor, const std::string &name,
                              const std::string &program)
    {
        return joined({begun(vendor), looked_up(name), read(name), absent(), suffixed(program),
                       ordinary("/system/bin/" + program + " -t 5")});
    }
    // A run that ends at a lookup that found nothing, or nothing with a name.
    static Lines not_found(const std::string &vendor = "0")
    {
        return joined({begun(vendor), looked_up("(null)"), no_item()});
    }
    static Lines no_item()
    {
        return {"SingleItemExecute| get node by Index fail!\n"};
    }
    static Lines nameless(const std::string &name, const std::string &args)
    {
        return joined({begun(),
                       looked_up(name),
                       read(name, args),
                       {"SingleItemExecute| current node is null !\n"}});
    }

    // All 65 bytes of the name of the item last started.
    static std::string command_name()
    {
        return {internals::command_name, sizeof internals::command_name};
    }
    static std::string padded(std::string name)
    {
        name.resize(sizeof internals::command_name);
        return name;
    }
};

// --- the vendor ------------------------------------------------------------

TEST_F(Item, NullTreeStillReadsAndPrintsTheVendor)
{
    set_vendor("2");
    internals::SingleItemExecute(nullptr, "g", 0);

    EXPECT_THAT(events(),
                ElementsAreArray(joined({begun("2"),
                                         {"get_node_byIndex| enter...\n",
                                          "get_node_byIndex| get_node_byIndex[]:load config file "
                                          "failed\n"},
                                         no_item()})));
    EXPECT_EQ(internals::vendor, 2);
    EXPECT_EQ(command_name(), padded(""));
}

TEST_F(Item, VendorIsTheDecimalNumberThatTheTextBeginsWith)
{
    const std::pair<std::string, int> cases[] = {
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
    };
    for (const auto &[text, number] : cases) {
        SCOPED_TRACE(text);
        platform::reset();
        set_vendor(text);
        load("");

        EXPECT_THAT(run(), ElementsAreArray(not_found(std::to_string(number))));
        EXPECT_EQ(internals::vendor, number);
    }
}

// The text is read as a long: 32-bit devices meet its end before the cut.
TEST_F(Item, VendorBeyondThirtyTwoBitsIsCutWhereLongHoldsIt)
{
    struct Case {
        const char *text;
        int cut;
        int clamped;
    };
    const bool cut = sizeof(long) == 8;
    for (const auto &[text, number, clamped] :
         {Case{"2147483648", INT_MIN, INT_MAX}, Case{"-2147483649", INT_MAX, INT_MIN},
          Case{"4294967295", -1, INT_MAX}, Case{"4294967296", 0, INT_MAX},
          Case{"-4294967295", 1, INT_MIN}, Case{"99999999999999999999", -1, INT_MAX}}) {
        SCOPED_TRACE(text);
        platform::reset();
        set_vendor(text);
        load("");

        const int expected = cut ? number : clamped;
        EXPECT_THAT(run(), ElementsAreArray(not_found(std::to_string(expected))));
        EXPECT_EQ(internals::vendor, expected);
    }
    if (cut) {
        EXPECT_THAT(run_item_under("4294967297", "x"),
                    ElementsAreArray(suffixed_run("1", "x", "x_ca")));
    }
}

TEST_F(Item, MissingVendorCountsAsZero)
{
    load(item("x"));
    set_vendor("1");
    run();
    EXPECT_EQ(internals::vendor, 1);

    platform::reset();
    EXPECT_THAT(run(), ElementsAreArray(ordinary_run("x", "/system/bin/x -t 5")));
    EXPECT_EQ(internals::vendor, 0);
}

TEST_F(Item, VendorIsReadAfreshForEveryItem)
{
    load(item("a") + item("b"));
    set_vendor("1");
    EXPECT_THAT(run(0), Contains("system(/system/bin/a_ca -t 5)"));
    set_vendor("2");
    EXPECT_THAT(run(1), Contains("system(/system/bin/b_ca_qsee -t 5)"));
}

// --- the lookup ------------------------------------------------------------

TEST_F(Item, UnknownGroupStartsNothing)
{
    load(item("x"));
    internals::SingleItemExecute(g_TestCmdTree, "h", 0);

    EXPECT_THAT(events(),
                ElementsAreArray(joined({begun(),
                                         {"get_node_byIndex| enter...\n",
                                          "get_node_byIndex| get_node_byIndex[]: Find Element "
                                          "\"registers\" failed\n"},
                                         no_item()})));
}

TEST_F(Item, IndexOutsideTheGroupStartsNothing)
{
    load(item("a") + item("b"));
    for (const int index : {2, 3, INT_MAX, -1, -2, INT_MIN}) {
        SCOPED_TRACE(index);
        EXPECT_THAT(run(index), ElementsAreArray(not_found()));
    }
    EXPECT_EQ(command_name(), padded(""));
    EXPECT_THAT(run(1), ElementsAreArray(ordinary_run("b", "/system/bin/b -t 5")));
}

TEST_F(Item, NodeWithoutANameStartsNothingAndKeepsTheLastItem)
{
    run_item("before");
    const std::string before = command_name();
    EXPECT_EQ(before, padded("before"));

    // the lookup begins at the first item, so that one comes first
    platform::write_plan("<?xml version=\"1.0\"?><P><CmdGroup name=\"g\"><Cmd name=\"a\"/>"
                         "<!-- note -->words<Cmd args=\"-t 5\"/><Cmd name=\"\" args=\"-t 5\"/>"
                         "<Cmd/></CmdGroup></P>");
    mxmlDelete(g_TestCmdTree);
    g_TestCmdTree = nullptr;
    ASSERT_NE(internals::load_configs_file("/data/vorlane/src1.xml"), nullptr);
    events();
    EXPECT_THAT(run(1), ElementsAreArray(nameless("(null)", "(null)")));
    EXPECT_THAT(run(2), ElementsAreArray(nameless("(null)", "(null)")));
    EXPECT_THAT(run(3), ElementsAreArray(nameless("(null)", "-t 5")));
    EXPECT_THAT(run(4), ElementsAreArray(nameless("", "-t 5")));
    EXPECT_THAT(run(5), ElementsAreArray(nameless("(null)", "(null)")));
    EXPECT_THAT(run(6), ElementsAreArray(not_found()));
    EXPECT_EQ(command_name(), before);
    EXPECT_THAT(left_open(), IsEmpty());
}

TEST_F(Item, ElementOfAnotherNameRunsLikeAnItem)
{
    load(item("a") + "<Step name=\"x\" args=\"-t 5\"/>");
    EXPECT_THAT(run(1), ElementsAreArray(ordinary_run("x", "/system/bin/x -t 5")));
}

// --- the name --------------------------------------------------------------

TEST_F(Item, NameIsCutAtItsFirstTabOrLineFeed)
{
    for (const std::string name : {"ab\tcd", "ab\ncd", "ab\t", "ab\n\tcd"}) {
        SCOPED_TRACE(name);
        platform::reset();
        EXPECT_THAT(run_item(name), ElementsAreArray(ordinary_run(name, "/system/bin/ab -t 5")));
        EXPECT_EQ(command_name(), padded("ab"));
    }
}

TEST_F(Item, NameThatTheCutLeavesEmptyStillRuns)
{
    load(item("before") + item("\tab"));
    run(0);
    platform::reset();
    EXPECT_THAT(run(1), ElementsAreArray(ordinary_run("\tab", "/system/bin/ -t 5")));
    EXPECT_EQ(command_name(), padded(""));
}

TEST_F(Item, BlanksInANameStay)
{
    EXPECT_THAT(run_item(" a b "),
                ElementsAreArray(ordinary_run(" a b ", "/system/bin/ a b  -t 5")));
    EXPECT_EQ(command_name(), padded(" a b "));
}

TEST_F(Item, LastItemsNameHoldsSixtyFourCharactersWhileTheWholeNameRuns)
{
    std::string name;
    for (int at = 0; at < 100; ++at) {
        name += static_cast<char>('a' + at % 26);
    }
    for (const std::size_t length : {1U, 63U, 64U, 65U, 100U}) {
        SCOPED_TRACE(length);
        platform::reset();
        const std::string whole = name.substr(0, length);
        EXPECT_THAT(run_item(whole),
                    ElementsAreArray(ordinary_run(whole, "/system/bin/" + whole + " -t 5")));
        EXPECT_EQ(command_name(), padded(name.substr(0, std::min<std::size_t>(length, 64))));
    }
}

TEST_F(Item, ShorterNameLeavesNothingOfALongerOne)
{
    load(item(std::string(64, 'n')) + item("m"));
    run(0);
    run(1);
    EXPECT_EQ(command_name(), padded("m"));
}

TEST_F(Item, NameIsRecordedBetweenItsLineAndThePresenceCheck)
{
    load(item("before") + item("x"));
    run(0);
    Lines seen;
    platform::on_log([&seen](const std::string &) { seen.push_back(internals::command_name); });
    platform::on_system([&seen](const std::string &) { seen.push_back(internals::command_name); });
    run(1);
    // enter, the lookup's three, the name; the query's two, the command, its run, leave
    EXPECT_THAT(seen, ElementsAre("before", "before", "before", "before", "before", "x", "x", "x",
                                  "x", "x"));
}

TEST_F(Item, NameIsRecordedWithoutTheVendorsSuffix)
{
    run_item_under("1", "x");
    EXPECT_EQ(command_name(), padded("x"));
    run_item_under("2", "yz");
    EXPECT_EQ(command_name(), padded("yz"));
    run_item_under("1", "SensorProbe");
    EXPECT_EQ(command_name(), padded("SensorProbe"));
}

TEST_F(Item, NameThatLeavesRoomForTheSuffixRunsWhole)
{
    for (const auto &[vendor, length] : {std::pair{"1", 1021U}, std::pair{"2", 1016U}}) {
        SCOPED_TRACE(vendor);
        const std::string name(length, 'n');
        const std::string whole = name + (vendor[0] == '1' ? "_ca" : "_ca_qsee");
        EXPECT_THAT(run_item_under(vendor, name),
                    ElementsAreArray(joined({begun(vendor), looked_up(name), read(name), absent(),
                                             suffixed(whole),
                                             ordinary(("/system/bin/" + whole).substr(0, 1024))})));
    }
}

TEST_F(Item, NameIsCutAtItsBufferAndTheSuffixStaysWithinIt)
{
    for (const std::string vendor : {"1", "2"}) {
        for (const std::size_t length : {1017U, 1022U, 1023U, 1024U, 1025U, 2000U}) {
            SCOPED_TRACE(length);
            const auto seen = run_item_under(vendor, std::string(length, 'n'));
            const std::string start = "SingleItemExecute| tLine:";
            const auto line = std::find_if(seen.begin(), seen.end(), [&start](const auto &event) {
                return event.starts_with(start);
            });
            ASSERT_NE(line, seen.end());
            const std::string name = line->substr(start.size(), line->size() - start.size() - 1);
            EXPECT_EQ(name.find_first_not_of('n'), std::min<std::size_t>(length, 1023));
            EXPECT_LE(name.size(), 1024U);
        }
    }
}

// --- the presence check ----------------------------------------------------

TEST_F(Item, PresenceIsOneWhenTheQueryPrintsALine)
{
    plan_output({kRunning + "root 4712 /system/bin/SensorProbe_ca\n"});
    EXPECT_EQ(internals::ResourceReduce(), 1);
    EXPECT_THAT(events(), ElementsAreArray(present(kRunning)));
    EXPECT_THAT(left_open(), IsEmpty());
}

TEST_F(Item, PresenceIsOneWhateverTheLineSays)
{
    for (const std::string line : {"\n", " ", "grep: error\n"}) {
        SCOPED_TRACE(line);
        platform::reset();
        plan_output({line});
        EXPECT_EQ(internals::ResourceReduce(), 1);
        EXPECT_THAT(events(), ElementsAreArray(present(line)));
    }
}

TEST_F(Item, PresenceIsZeroWhenTheQueryPrintsNothing)
{
    EXPECT_EQ(internals::ResourceReduce(), 0);
    EXPECT_THAT(events(), ElementsAreArray(absent()));
    EXPECT_THAT(left_open(), IsEmpty());
}

TEST_F(Item, PresenceIsMinusOneWhenTheQueryCannotBeStarted)
{
    plan_steps("popen", {gives(0, EMFILE)});
    EXPECT_EQ(internals::ResourceReduce(), -1);
    EXPECT_THAT(events(), ElementsAreArray(unanswered()));
}

TEST_F(Item, PresenceLineIsReadUpToOneHundredTwentyEightCharacters)
{
    for (const std::size_t length : {127U, 128U, 129U, 500U}) {
        SCOPED_TRACE(length);
        platform::reset();
        const std::string line = std::string(length, 'p') + "\n";
        plan_output({line});
        EXPECT_EQ(internals::ResourceReduce(), 1);
        EXPECT_THAT(events(), ElementsAreArray(present(line.substr(0, 128))));
    }
}

TEST_F(Item, StatusOfTheQueryIsIgnored)
{
    plan_steps("pclose", {gives(-1, ECHILD), gives(256)});
    plan_output({kRunning, ""});
    EXPECT_EQ(internals::ResourceReduce(), 1);
    EXPECT_EQ(internals::ResourceReduce(), 0);
}

// --- ordinary items --------------------------------------------------------

TEST_F(Item, OrdinaryItemRunsThroughTheBlockingCall)
{
    EXPECT_THAT(run_item("x"), ElementsAreArray(ordinary_run("x", "/system/bin/x -t 5")));
    EXPECT_THAT(left_open(), IsEmpty());
}

TEST_F(Item, OrdinaryItemRunsWhateverThePresenceCheckSays)
{
    plan_output({kRunning});
    EXPECT_THAT(run_item("x"),
                ElementsAreArray(joined({begun(), looked_up("x"), read("x"), present(kRunning),
                                         ordinary("/system/bin/x -t 5")})));

    platform::reset();
    plan_steps("popen", {gives(0, EMFILE)});
    EXPECT_THAT(run_item("x"),
                ElementsAreArray(joined({begun(), looked_up("x"), read("x"), unanswered(),
                                         ordinary("/system/bin/x -t 5")})));
}

TEST_F(Item, StatusOfTheProgramIsIgnored)
{
    for (const int status : {-1, 256, 127 << 8, 9}) {
        SCOPED_TRACE(status);
        platform::reset();
        plan_steps("system", {gives(status)});
        EXPECT_THAT(run_item("x"), ElementsAreArray(ordinary_run("x", "/system/bin/x -t 5")));
    }
}

TEST_F(Item, EmptyArgumentsLeaveOneBlankAfterTheProgram)
{
    EXPECT_THAT(run_item("x", ""),
                ElementsAreArray(joined({begun(), looked_up("x"), read("x", ""), absent(),
                                         ordinary("/system/bin/x ")})));
}

TEST_F(Item, MissingArgumentsAreANullText)
{
    load("<Cmd name=\"x\"/>");
    EXPECT_THAT(run(), ElementsAreArray(joined({begun(), looked_up("x"), read("x", "(null)"),
                                                absent(), ordinary("/system/bin/x (null)")})));
}

TEST_F(Item, ArgumentsAreTakenUnchanged)
{
    const std::string args = "  -a 'b c'\t%s | d ; $e  ";
    EXPECT_THAT(run_item("x", args),
                ElementsAreArray(joined({begun(), looked_up("x"), read("x", args), absent(),
                                         ordinary("/system/bin/x " + args)})));
}

TEST_F(Item, CommandLineIsCutAtOneThousandTwentyFourCharacters)
{
    const std::string program = "/system/bin/x ";
    for (const std::size_t length : {1023U, 1024U, 1025U, 3000U}) {
        SCOPED_TRACE(length);
        platform::reset();
        const std::string args(length - program.size(), 'a');
        EXPECT_THAT(run_item("x", args),
                    ElementsAreArray(joined({begun(), looked_up("x"), read("x", args), absent(),
                                             ordinary((program + args).substr(0, 1024))})));
    }
}

TEST_F(Item, GathererIsComparedExactly)
{
    for (const std::string name :
         {"SensorProbe_ca", "SensorProbe_qsee", "SensorProbe_ca_qsee", "SensorProb", "SensorProbes",
          "sensorprobe", "SENSORPROBE", "SensorProbe ", " SensorProbe", "xSensorProbe"}) {
        SCOPED_TRACE(name);
        platform::reset();
        EXPECT_THAT(run_item(name),
                    ElementsAreArray(ordinary_run(name, "/system/bin/" + name + " -t 5")));
    }
}

TEST_F(Item, VendorOneAppendsItsSuffix)
{
    for (const std::string name :
         {"x", "SensorProbe_ca", "SensorProb", "SensorProbes", "sensorprobe", "SensorProbe_qsee"}) {
        SCOPED_TRACE(name);
        EXPECT_THAT(run_item_under("1", name),
                    ElementsAreArray(suffixed_run("1", name, name + "_ca")));
    }
}

TEST_F(Item, VendorTwoAppendsItsSuffixAndHasNoGatherer)
{
    for (const std::string name : {"x", "SensorProbe", "SensorProbe_qsee", "SensorProbe_ca"}) {
        SCOPED_TRACE(name);
        EXPECT_THAT(run_item_under("2", name),
                    ElementsAreArray(suffixed_run("2", name, name + "_ca_qsee")));
    }
}

TEST_F(Item, VendorTwoHasNoGathererEvenWhileOneRuns)
{
    set_vendor("2");
    plan_output({kRunning});
    EXPECT_THAT(run_item("SensorProbe"),
                ElementsAreArray(joined({begun("2"), looked_up("SensorProbe"), read("SensorProbe"),
                                         present(kRunning), suffixed("SensorProbe_ca_qsee"),
                                         ordinary("/system/bin/SensorProbe_ca_qsee -t 5")})));
}

TEST_F(Item, AnyOtherVendorStartsNothingAfterThePresenceCheck)
{
    for (const std::string vendor : {"3", "-1", "-2", "10", "2147483647", "-2147483648"}) {
        for (const std::string name : {"x", "SensorProbe"}) {
            SCOPED_TRACE(vendor + name);
            EXPECT_THAT(run_item_under(vendor, name),
                        ElementsAreArray(joined(
                            {begun(vendor),
                             looked_up(name),
                             read(name),
                             absent(),
                             {"SingleItemExecute| More than one vendor, Setting error!\n"}})));
            EXPECT_EQ(command_name(), padded(name));
        }
    }
}

// --- the gatherer ----------------------------------------------------------

TEST_F(Item, GathererIsStartedInTheBackgroundAndThenTriggered)
{
    EXPECT_THAT(run_item("SensorProbe"),
                ElementsAreArray(joined({begun(), looked_up("SensorProbe"), read("SensorProbe"),
                                         absent(), command("/system/bin/SensorProbe -t 5"), row(0),
                                         launch(), trigger(), left()})));
    EXPECT_EQ(command_name(), padded("SensorProbe"));
    EXPECT_THAT(left_open(), ElementsAre("connection#1"));
}

TEST_F(Item, GatherersCommandReachesTheShell)
{
    EXPECT_THAT(run_child("SensorProbe"),
                ElementsAreArray(joined({begun(), looked_up("SensorProbe"), read("SensorProbe"),
                                         absent(), command("/system/bin/SensorProbe -t 5"), row(0),
                                         launched("/system/bin/SensorProbe -t 5")})));

    platform::reset();
    set_vendor("1");
    EXPECT_THAT(run_child("SensorProbe"),
                ElementsAreArray(
                    joined({begun("1"), looked_up("SensorProbe"), read("SensorProbe"), absent(),
                            suffixed("SensorProbe_ca"), command("/system/bin/SensorProbe_ca -t 5"),
                            row(0), launched("/system/bin/SensorProbe_ca -t 5")})));
}

TEST_F(Item, VendorOneStartsItsOwnGatherer)
{
    EXPECT_THAT(run_item_under("1", "SensorProbe"),
                ElementsAreArray(
                    joined({begun("1"), looked_up("SensorProbe"), read("SensorProbe"), absent(),
                            suffixed("SensorProbe_ca"), command("/system/bin/SensorProbe_ca -t 5"),
                            row(0), launch(), trigger(), left()})));
}

TEST_F(Item, RunningGathererIsOnlyTriggeredWithNoLeaveLine)
{
    plan_output({kRunning});
    EXPECT_THAT(run_item("SensorProbe"),
                ElementsAreArray(joined({begun(), looked_up("SensorProbe"), read("SensorProbe"),
                                         present(kRunning), command("/system/bin/SensorProbe -t 5"),
                                         row(1), trigger()})));
    EXPECT_THAT(left_open(), ElementsAre("connection#1"));

    platform::reset();
    set_vendor("1");
    plan_output({kRunning});
    EXPECT_THAT(
        run_item("SensorProbe"),
        ElementsAreArray(joined({begun("1"), looked_up("SensorProbe"), read("SensorProbe"),
                                 present(kRunning), suffixed("SensorProbe_ca"),
                                 command("/system/bin/SensorProbe_ca -t 5"), row(1), trigger()})));
}

TEST_F(Item, GathererIsStartedWhenThePresenceQueryFails)
{
    plan_steps("popen", {gives(0, EMFILE)});
    EXPECT_THAT(run_item("SensorProbe"),
                ElementsAreArray(joined({begun(), looked_up("SensorProbe"), read("SensorProbe"),
                                         unanswered(), command("/system/bin/SensorProbe -t 5"),
                                         row(-1), launch(), trigger(), left()})));
}

TEST_F(Item, GathererIsTriggeredThoughItsLaunchFailed)
{
    plan_steps("vfork", {gives(-1, EAGAIN)});
    EXPECT_THAT(run_item("SensorProbe"),
                ElementsAreArray(joined({begun(), looked_up("SensorProbe"), read("SensorProbe"),
                                         absent(), command("/system/bin/SensorProbe -t 5"), row(0),
                                         failed_launch(), trigger(), left()})));
}

TEST_F(Item, RunEndsAsUsualWhenTheTriggerFails)
{
    plan_steps("Accept", {gives(-1, EMFILE)});
    EXPECT_THAT(
        run_item("SensorProbe"),
        ElementsAreArray(joined({begun(), looked_up("SensorProbe"), read("SensorProbe"), absent(),
                                 command("/system/bin/SensorProbe -t 5"), row(0), launch(),
                                 failed_accept(std::to_string(EMFILE)), left()})));
    EXPECT_THAT(left_open(), ElementsAre("listener#1"));
}

TEST_F(Item, GathererWhoseNameIsCutIsTheGatherer)
{
    plan_output({kRunning});
    EXPECT_THAT(
        run_item("SensorProbe\tx"),
        ElementsAreArray(
            joined({begun(), looked_up("SensorProbe\tx"), read("SensorProbe\tx"), present(kRunning),
                    command("/system/bin/SensorProbe -t 5"), row(1), trigger()})));
}

TEST_F(Item, GatherersArgumentsMayBeEmptyOrMissing)
{
    EXPECT_THAT(run_child("SensorProbe", ""),
                ElementsAreArray(joined({begun(), looked_up("SensorProbe"), read("SensorProbe", ""),
                                         absent(), command("/system/bin/SensorProbe "), row(0),
                                         launched("/system/bin/SensorProbe ")})));

    platform::reset();
    load("<Cmd name=\"SensorProbe\"/>");
    EXPECT_THAT(run(), ElementsAreArray(
                           joined({begun(), looked_up("SensorProbe"), read("SensorProbe", "(null)"),
                                   absent(), command("/system/bin/SensorProbe (null)"), row(0),
                                   launch(), trigger(), left()})));
}

TEST_F(Item, GatherersCommandLineIsCutAtOneThousandTwentyFourCharacters)
{
    const std::string program = "/system/bin/SensorProbe ";
    for (const std::size_t length : {1023U, 1024U, 1025U, 3000U}) {
        SCOPED_TRACE(length);
        platform::reset();
        const std::string args(length - program.size(), 'a');
        const std::string cut = (program + args).substr(0, 1024);
        EXPECT_THAT(
            run_child("SensorProbe", args),
            ElementsAreArray(joined({begun(), looked_up("SensorProbe"), read("SensorProbe", args),
                                     absent(), command(cut), row(0), launched(cut)})));
    }
}

TEST_F(Item, GroupStartsTheGathererOnceAndTriggersItTwice)
{
    load(item("SensorProbe") + item("SensorProbe", "-x"));
    plan_output({"", kRunning});
    EXPECT_THAT(run(0), Contains("vfork() = 100").Times(1));
    const auto second = run(1);
    EXPECT_THAT(second, Not(Contains(StartsWith("vfork"))));
    EXPECT_THAT(second, Contains("write(connection#2, \"gather again!\", 13) = 13").Times(1));
    EXPECT_THAT(left_open(), ElementsAre("connection#1", "connection#2"));
}

TEST_F(Item, RunChangesNothingInThePlan)
{
    load(item("x") + "<Cmd name=\"ab\tcd\"/>");
    const auto first = run(0);
    run(1);
    EXPECT_EQ(run(0).size(), first.size());
    EXPECT_STREQ(mxmlElementGetAttr(mxmlFindElement(g_TestCmdTree, g_TestCmdTree, "Cmd", "name",
                                                    "ab\tcd", MXML_DESCEND),
                                    "name"),
                 "ab\tcd");
}

} // namespace
