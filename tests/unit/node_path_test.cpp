// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Node paths: their levels and components, and the items that they run.
#include "sequences.h"

#include <algorithm>
#include <cerrno>
#include <utility>

using platform::events;
using platform::gives;
using platform::left_open;
using platform::plan_steps;
using sequences::load;

namespace
{

class NodePath : public LibraryTest
{
  protected:
    // --- what the events of a command are made of ---

    static Lines parsed(const std::string &path)
    {
        return {"fptest_ParseCmdLine| testHead is : XMLNodePath\n",
                "fptest_ParseCmdLine| testName is : " + path + "\n"};
    }
    // What is logged of a path before its components are looked at.
    static Lines levelled(const std::string &path, int level, const std::string &last)
    {
        return {"fptest_ItemsTest| Input cmdline : " + path + "\n",
                "get_node_level| level = " + std::to_string(level) + "\n",
                "get_node_level| node name = " + last + "\n"};
    }
    static Lines split()
    {
        return {"get_node_name| enter...\n"};
    }
    static Lines split(const std::string &root)
    {
        return joined({split(), {"get_node_name| root node:" + root + "\n"}});
    }
    static Lines split(const std::string &root, const std::string &group)
    {
        return joined({split(root), {"get_node_name| mid node:" + group + "\n"}});
    }
    static Lines split(const std::string &root, const std::string &group, const std::string &item)
    {
        return joined({split(root, group), {"get_node_name| leaf node:" + item + "\n"}});
    }

    static Lines not_loaded()
    {
        return sequences::failed_load("-1", "(2),No such file or directory");
    }
    // A lookup's lines; the plan is loaded after the first of them.
    static Lines asked_length(const Lines &loading, const std::string &outcome)
    {
        return joined({{"get_node_length| Enter node length calculate!\n",
                        "get_node_length| input level = 2\n"},
                       loading,
                       {"get_node_length| " + outcome + "\n"}});
    }
    static Lines asked_index(const Lines &loading)
    {
        return joined({{"get_node_index| enter...\n"}, loading});
    }
    static Lines asked_index(const Lines &loading, const std::string &failure)
    {
        return joined(
            {asked_index(loading), {"get_node_index| get_node_index[]:" + failure + "\n"}});
    }

    static Lines run_entered()
    {
        return {"SingleItemExecute| enter... !\n",
                "get_node_value(/etc/vorlane/sysparms/vr_common_cfg.xml, "
                "device/SysParam/Quillmark/vendor, 64)",
                "stdout: vendor = 0\n", "get_node_byIndex| enter...\n"};
    }
    static Lines found(const std::string &name, const std::string &args)
    {
        return joined(
            {run_entered(),
             {"get_node_byIndex| curernt leaf node name = " + name + "\n",
              "get_node_byIndex| leave...\n",
              "SingleItemExecute| mxmlElementGetAttr name=" + name + "- args=" + args + "\n"}});
    }
    // An ordinary item's run; the queries before it were that many.
    static Lines ran(const std::string &name, const std::string &args, int queries = 0)
    {
        const std::string query = "stream#" + std::to_string(queries + 1);
        const std::string command = "/system/bin/" + name + " " + args;
        return joined(
            {found(name, args),
             {"ResourceReduce| \ncbuf=ps | grep /system/bin/SensorProbe\n",
              "popen(ps | grep /system/bin/SensorProbe, r) = " + query,
              "fgets(" + query + ", 129) = null", "ResourceReduce| target process not exist!\n",
              "pclose(" + query + ")", "SingleItemExecute| tpCmd:" + command + "\n",
              "system(" + command + ")", "SingleItemExecute| leave... !\n"}});
    }
    // A run that finds a node which is no item.
    static Lines ran_nameless()
    {
        return joined({found("(null)", "(null)"), {"SingleItemExecute| current node is null !\n"}});
    }
    static Lines run_failed(const Lines &reason)
    {
        return joined({run_entered(), reason, {"SingleItemExecute| get node by Index fail!\n"}});
    }
    static Lines past_the_end()
    {
        return {"get_node_byIndex| curernt leaf node name = (null)\n",
                "get_node_byIndex| leave...\n"};
    }
    static Lines no_tree()
    {
        return {"get_node_byIndex| get_node_byIndex[]:load config file failed\n"};
    }
    static Lines no_group()
    {
        return {"get_node_byIndex| get_node_byIndex[]: Find Element \"registers\" failed\n"};
    }

    // --- running ---

    // The events of the runner, given a path.
    static Lines run(const std::string &path)
    {
        std::string given = path;
        internals::ItemsTest(given.data(), nullptr);
        return events();
    }

    // What get_node_level makes of a path, and all 64 bytes that it leaves.
    static int level_of(const std::string &path, std::string &last)
    {
        std::string given = path;
        last = std::string(65, 'x');
        const int level = internals::get_node_level(given.c_str(), last.data(), 64);
        EXPECT_EQ(given, path);
        EXPECT_EQ(last.back(), 'x');
        last.pop_back();
        return level;
    }

    static std::string filled(std::string text, std::size_t size)
    {
        text.resize(size, '\0');
        return text;
    }

    static constexpr char kCouldNotLoad[] = "load config file failed";
    static constexpr char kNotFound[] = "mxml Find Path failed";
    static constexpr char kPlan[] = "<?xml version=\"1.0\"?>\n"
                                    "<P>\n"
                                    "\t<CmdGroup name=\"g\">\n"
                                    "\t\t<Cmd name=\"a\" args=\"1\" />\n"
                                    "\t\t<Cmd name=\"b\" args=\"2 3\" />\n"
                                    "\t\t<Cmd name=\"c\" args=\"\" />\n"
                                    "\t</CmdGroup>\n"
                                    "\t<CmdGroup name=\"h\">\n"
                                    "\t\t<Cmd name=\"d\" args=\"4\" />\n"
                                    "\t\t<Cmd name=\"e\" args=\"5\" />\n"
                                    "\t</CmdGroup>\n"
                                    "\t<CmdGroup name=\"none\">\n"
                                    "\t</CmdGroup>\n"
                                    "</P>\n";

    static Lines group_g_ran()
    {
        return joined({ran("a", "1"), ran("b", "2 3", 1), ran("c", "", 2)});
    }
};

// --- levels --------------------------------------------------------------

TEST_F(NodePath, LevelIsTheNumberOfComponents)
{
    const struct {
        const char *path;
        int level;
        const char *last;
    } cases[] = {
        {"a/b", 2, "b"},         {"a/b/c", 3, "c"}, {"a/b/c/d", 4, "d"},
        {"a/b/c/d/e/f", 6, "f"}, {"a/", 1, "a"},    {"/a", 1, "a"},
        {"//a//", 1, "a"},       {"/a/b/", 2, "b"}, {"a//b", 2, "b"},
        {"a///b////c", 3, "c"},  {"/", 0, ""},      {"////", 0, ""},
        {"r r/g g", 2, "g g"},   {" / ", 2, " "},   {"a\\b/c|d", 2, "c|d"},
    };
    for (const auto &[path, level, expected] : cases) {
        std::string last;
        EXPECT_EQ(level_of(path, last), level) << path;
        EXPECT_EQ(last, filled(expected, 64)) << path;
        EXPECT_EQ(events(), (Lines{"get_node_level| level = " + std::to_string(level) + "\n",
                                   std::string("get_node_level| node name = ") + expected + "\n"}));
    }
}

TEST_F(NodePath, PathWithoutASlashHasLevelOneAndEndsWithoutALastComponent)
{
    for (const std::string &path : {std::string(), std::string("a"), std::string("a b"),
                                    std::string(100, 'a'), std::string(2047, 'a')}) {
        std::string last;
        EXPECT_EQ(level_of(path, last), 1);
        EXPECT_EQ(last, filled("", 64));
        EXPECT_THAT(events(),
                    ElementsAre("get_node_level| level = 1\n", "get_node_level| node name = \n"));
    }
}

TEST_F(NodePath, PathWithoutASlashStandsForItselfUntilItsLastComponentIsCopied)
{
    const std::string path(100, 'a');
    std::string last(65, 'x');
    Lines seen;
    platform::on_log([&](const std::string & /*event*/) { seen.push_back(last); });
    internals::get_node_level(path.c_str(), last.data(), 64);

    const std::string cut = filled(path.substr(0, 63), 64) + "x";
    EXPECT_THAT(seen, ElementsAre(cut, cut));
    EXPECT_EQ(last, filled("", 64) + "x");
}

TEST_F(NodePath, LastComponentIsLoggedWithItsFirst31Characters)
{
    const std::string name = "0123456789012345678901234567890123456789";
    for (const std::size_t size : {30U, 31U, 32U, 33U, 34U, 40U}) {
        std::string last;
        EXPECT_EQ(level_of("r/" + name.substr(0, size), last), 2);
        const std::string kept = name.substr(0, std::min<std::size_t>(size, 31));
        EXPECT_EQ(last, filled(kept, 64)) << size;
        EXPECT_THAT(events(), ElementsAre("get_node_level| level = 2\n",
                                          "get_node_level| node name = " + kept + "\n"));
    }
}

TEST_F(NodePath, LastComponentIsLoggedUpToItsFirstTabOrLineFeed)
{
    for (const char *path : {"r/ab\tcd", "r/ab\ncd", "r/ab\tc\nd"}) {
        std::string last;
        EXPECT_EQ(level_of(path, last), 2);
        EXPECT_EQ(last, filled("ab", 64));
        EXPECT_THAT(events(),
                    ElementsAre("get_node_level| level = 2\n", "get_node_level| node name = ab\n"));
    }
}

TEST_F(NodePath, ShorterLastComponentAfterALongerOneIsLoggedAlone)
{
    std::string last;
    EXPECT_EQ(level_of("a long root/a longer group/b", last), 3);
    EXPECT_EQ(last, filled("b", 64));
}

TEST_F(NodePath, PathThatCannotBeCopiedRunsNothing)
{
    plan_steps("strdup", {gives(0, ENOMEM)});
    EXPECT_EQ(run("r/g"), levelled("r/g", 1, ""));
}

// --- components ----------------------------------------------------------

TEST_F(NodePath, ComponentsAreSplitInPlaceLoggedAndZeroFilled)
{
    std::string path = "//r r/g g///i i/x/y";
    std::string group(65, 'x');
    std::string item(65, 'x');
    internals::get_node_name(path.data(), group.data(), 64, item.data(), 64);

    EXPECT_EQ(group, filled("g g", 64) + "x");
    EXPECT_EQ(item, filled("i i", 64) + "x");
    EXPECT_EQ(events(), split("r r", "g g", "i i"));
    EXPECT_STREQ(path.c_str() + 2, "r r");
    EXPECT_STREQ(path.c_str() + 6, "g g");
}

TEST_F(NodePath, NothingButSlashesSeparates)
{
    const std::string name = every_character_but("/");
    std::string path = name + "/" + name + "/" + name;
    std::string last(64, 'x');
    EXPECT_EQ(internals::get_node_level(path.c_str(), last.data(), 64), 3);
    events();

    std::string group(64, 'x');
    std::string item(64, 'x');
    internals::get_node_name(path.data(), group.data(), 64, item.data(), 64);
    EXPECT_EQ(events(), split(name, name, name));
}

TEST_F(NodePath, MissingComponentLeavesItsBufferAsItWas)
{
    const struct {
        const char *path;
        std::string group;
        Lines lines;
    } cases[] = {
        {"", "old group", split()},     {"//", "old group", split()},
        {"r", "old group", split("r")}, {"/r/", "old group", split("r")},
        {"r/g", "g", split("r", "g")},
    };
    for (const auto &[text, expected, lines] : cases) {
        std::string path = text;
        std::string group = filled("old group", 64);
        std::string item = filled("old item", 64);
        internals::get_node_name(path.data(), group.data(), 64, item.data(), 64);
        EXPECT_EQ(group, filled(expected, 64)) << text;
        EXPECT_EQ(item, filled("old item", 64)) << text;
        EXPECT_EQ(events(), lines) << text;
    }
}

TEST_F(NodePath, GroupAndItemNamesAreCutTo63CharactersAndLoggedWhole)
{
    for (const std::size_t size : {62U, 63U, 64U, 65U, 200U}) {
        const std::string group_name(size, 'g');
        const std::string item_name(size, 'i');
        std::string path = "r/" + group_name + "/" + item_name;
        std::string group(65, 'x');
        std::string item(65, 'x');
        internals::get_node_name(path.data(), group.data(), 64, item.data(), 64);

        EXPECT_EQ(group, filled(group_name.substr(0, 63), 64) + "x");
        EXPECT_EQ(item, filled(item_name.substr(0, 63), 64) + "x");
        EXPECT_EQ(events(), split("r", group_name, item_name));
    }
}

// --- groups --------------------------------------------------------------

TEST_F(NodePath, GroupRunsEveryItemInDocumentOrder)
{
    platform::write_plan(kPlan);
    FPTEST_RunTestCmd("XMLNodePath::P/g", nullptr, 0);

    EXPECT_EQ(events(), joined({parsed("P/g"), levelled("P/g", 2, "g"), split("P", "g"),
                                asked_length(load(), "node length = 3!"), group_g_ran()}));
    EXPECT_STREQ(internals::command_name, "c");
    EXPECT_THAT(left_open(), IsEmpty());
}

TEST_F(NodePath, SlashesAroundAndBetweenTheComponentsDoNotMatter)
{
    for (const char *path : {"P/g/", "P//g", "/P/g", "///P///g///"}) {
        internals::reset();
        platform::reset();
        platform::write_plan(kPlan);
        EXPECT_EQ(run(path), joined({levelled(path, 2, "g"), split("P", "g"),
                                     asked_length(load(), "node length = 3!"), group_g_ran()}));
    }
}

TEST_F(NodePath, AnyRootIsAccepted)
{
    const std::string long_root(500, 'r');
    for (const std::string &root :
         {std::string("Q"), std::string("g"), std::string(" "), long_root}) {
        internals::reset();
        platform::reset();
        platform::write_plan(kPlan);
        const std::string path = root + "/g";
        EXPECT_EQ(run(path), joined({levelled(path, 2, "g"), split(root, "g"),
                                     asked_length(load(), "node length = 3!"), group_g_ran()}));
    }
}

TEST_F(NodePath, NamesAreTakenAsTheyStandWithTheirBlanks)
{
    platform::write_plan("<P><CmdGroup name='g'/><CmdGroup name=' a group '>"
                         "<Cmd name='an item ' args='1'/><Cmd name='an item' args='2'/>"
                         "</CmdGroup></P>");
    EXPECT_EQ(run(" P / a group /an item"), joined({levelled(" P / a group /an item", 3, "an item"),
                                                    split(" P ", " a group ", "an item"),
                                                    asked_index(load()), ran("an item", "2")}));
}

TEST_F(NodePath, ProgramsThatFailDoNotEndTheGroup)
{
    platform::write_plan(kPlan);
    plan_steps("system", {gives(-1, EAGAIN), gives(256), gives(127 << 8)});
    EXPECT_EQ(run("P/g"), joined({levelled("P/g", 2, "g"), split("P", "g"),
                                  asked_length(load(), "node length = 3!"), group_g_ran()}));
}

TEST_F(NodePath, EmptyGroupRunsNothing)
{
    platform::write_plan(kPlan);
    EXPECT_EQ(run("P/none"), joined({levelled("P/none", 2, "none"), split("P", "none"),
                                     asked_length(load(), "node length = 0!")}));
}

TEST_F(NodePath, GroupThatThePlanLacksRunsNothing)
{
    platform::write_plan(kPlan);
    EXPECT_EQ(run("P/x"),
              joined({levelled("P/x", 2, "x"), split("P", "x"),
                      asked_length(load(), std::string("get_node_length[]:") + kNotFound)}));
}

TEST_F(NodePath, GroupOfAPlanThatCannotBeLoadedRunsNothing)
{
    EXPECT_EQ(run("P/g"), joined({levelled("P/g", 2, "g"), split("P", "g"),
                                  asked_length(not_loaded(), std::string("get_node_length[]:") +
                                                                 kCouldNotLoad)}));
}

TEST_F(NodePath, EveryChildNodeOfAGroupGetsARun)
{
    platform::write_plan("<P><CmdGroup name='g'><!-- first --><Cmd name='a' args='1'/>"
                         "<Cmd name='b' args='2'/></CmdGroup></P>");
    EXPECT_EQ(run("P/g"), joined({levelled("P/g", 2, "g"), split("P", "g"),
                                  asked_length(load(), "node length = 3!"), ran("a", "1"),
                                  ran("b", "2", 1), run_failed(past_the_end())}));
}

TEST_F(NodePath, NodesBetweenTheItemsGetARunOfTheirOwn)
{
    platform::write_plan("<P><CmdGroup name='g'><Cmd name='a' args='1'/><!-- between -->word"
                         "<Other name='o' args='2'/></CmdGroup></P>");
    EXPECT_EQ(run("P/g"), joined({levelled("P/g", 2, "g"), split("P", "g"),
                                  asked_length(load(), "node length = 4!"), ran("a", "1"),
                                  ran_nameless(), ran_nameless(), ran("o", "2", 1)}));
}

TEST_F(NodePath, GroupWithoutAnItemOfItsOwnRunsTheNextGroups)
{
    platform::write_plan("<P><CmdGroup name='g'><!-- only --></CmdGroup>"
                         "<CmdGroup name='h'><Cmd name='a' args='1'/></CmdGroup></P>");
    EXPECT_EQ(run("P/g"), joined({levelled("P/g", 2, "g"), split("P", "g"),
                                  asked_length(load(), "node length = 1!"), ran("a", "1")}));
}

TEST_F(NodePath, EveryRunOfAGroupIsGivenTheTreeOfItsMoment)
{
    platform::write_plan(kPlan);
    mxml_node_t *const other = mxmlLoadString(
        nullptr, "<P><CmdGroup name='g'><Cmd name='x'/><Cmd name='y' args='9'/></CmdGroup></P>",
        nullptr);
    mxml_node_t *first = nullptr;
    platform::on_system([&](const std::string &command) {
        if (command == "/system/bin/a 1") {
            first = std::exchange(g_TestCmdTree, other);
        }
    });
    EXPECT_EQ(run("P/g"), joined({levelled("P/g", 2, "g"), split("P", "g"),
                                  asked_length(load(), "node length = 3!"), ran("a", "1"),
                                  ran("y", "9", 1), run_failed(past_the_end())}));
    mxmlDelete(first);
}

// --- items ---------------------------------------------------------------

TEST_F(NodePath, ItemIsRunAlone)
{
    platform::write_plan(kPlan);
    FPTEST_RunTestCmd("XMLNodePath::P/g/b", nullptr, 0);

    EXPECT_EQ(events(), joined({parsed("P/g/b"), levelled("P/g/b", 3, "b"), split("P", "g", "b"),
                                asked_index(load()), ran("b", "2 3")}));
    EXPECT_STREQ(internals::command_name, "b");
}

TEST_F(NodePath, FirstAndLastItemAreRunByTheirNames)
{
    platform::write_plan(kPlan);
    EXPECT_EQ(run("P/g/a"), joined({levelled("P/g/a", 3, "a"), split("P", "g", "a"),
                                    asked_index(load()), ran("a", "1")}));
    EXPECT_EQ(run("P/g/c"), joined({levelled("P/g/c", 3, "c"), split("P", "g", "c"),
                                    asked_index({}), ran("c", "", 1)}));
}

TEST_F(NodePath, FourthAndLaterComponentsAreCountedAndIgnored)
{
    platform::write_plan(kPlan);
    EXPECT_EQ(run("P/g/b/c"), joined({levelled("P/g/b/c", 4, "c"), split("P", "g", "b"),
                                      asked_index(load()), ran("b", "2 3")}));
    EXPECT_EQ(run("P/g/a/x/y/"), joined({levelled("P/g/a/x/y/", 5, "y"), split("P", "g", "a"),
                                         asked_index({}), ran("a", "1", 1)}));
}

TEST_F(NodePath, ItemOfALaterGroupGivesItsPositionToTheNamedGroup)
{
    platform::write_plan(kPlan);
    EXPECT_EQ(run("P/g/e"), joined({levelled("P/g/e", 3, "e"), split("P", "g", "e"),
                                    asked_index(load()), ran("b", "2 3")}));
}

TEST_F(NodePath, ItemOfAnEarlierGroupIsNotFound)
{
    platform::write_plan(kPlan);
    EXPECT_EQ(run("P/h/a"), joined({levelled("P/h/a", 3, "a"), split("P", "h", "a"),
                                    asked_index(load(), kNotFound), run_failed(past_the_end())}));
}

TEST_F(NodePath, ItemThatThePlanLacksStillGetsARunThatFails)
{
    platform::write_plan(kPlan);
    EXPECT_EQ(run("P/g/x"), joined({levelled("P/g/x", 3, "x"), split("P", "g", "x"),
                                    asked_index(load(), kNotFound), run_failed(past_the_end())}));
    EXPECT_STREQ(internals::command_name, "");
}

TEST_F(NodePath, ItemOfAGroupThatThePlanLacksStillGetsARunThatFails)
{
    platform::write_plan(kPlan);
    EXPECT_EQ(run("P/x/a"), joined({levelled("P/x/a", 3, "a"), split("P", "x", "a"),
                                    asked_index(load(), kNotFound), run_failed(no_group())}));
}

TEST_F(NodePath, ItemOfAPlanThatCannotBeLoadedStillGetsARunThatFails)
{
    EXPECT_EQ(run("P/g/a"),
              joined({levelled("P/g/a", 3, "a"), split("P", "g", "a"),
                      asked_index(not_loaded(), kCouldNotLoad), run_failed(no_tree())}));
}

TEST_F(NodePath, PositionOfAnItemAfterACommentIsUsedAsItIs)
{
    platform::write_plan("<P><CmdGroup name='g'><!-- first --><Cmd name='a' args='1'/>"
                         "<Cmd name='b' args='2'/></CmdGroup></P>");
    EXPECT_EQ(run("P/g/a"), joined({levelled("P/g/a", 3, "a"), split("P", "g", "a"),
                                    asked_index(load()), ran("b", "2")}));
}

TEST_F(NodePath, LongGroupAndItemNamesAreLookedUpByTheirFirst63Characters)
{
    const std::string group(63, 'g');
    const std::string item(63, 'i');
    platform::write_plan("<P><CmdGroup name='" + group + "g'><Cmd name='" + item +
                         "i' args='whole'/></CmdGroup><CmdGroup name='" + group + "'><Cmd name='" +
                         item + "i' args='long'/><Cmd name='" + item +
                         "' args='cut'/></CmdGroup></P>");
    Lines first = load();
    int queries = 0;
    for (const char *more : {"", "g", "gg and more"}) {
        const std::string path = "P/" + group + more + "/" + item + (*more != '\0' ? "ii" : "");
        EXPECT_EQ(run(path),
                  joined({levelled(path, 3, item.substr(0, 31)),
                          split("P", group + more, item + (*more != '\0' ? "ii" : "")),
                          asked_index(std::exchange(first, {})), ran(item, "cut", queries++)}));
    }
}

// --- paths that name neither ---------------------------------------------

TEST_F(NodePath, PathOfOneComponentRunsNothing)
{
    platform::write_plan(kPlan);
    EXPECT_EQ(run("g"), levelled("g", 1, ""));
    EXPECT_EQ(run(""), levelled("", 1, ""));
    EXPECT_EQ(run("g/"), levelled("g/", 1, "g"));
    EXPECT_EQ(run("/g"), levelled("/g", 1, "g"));
    EXPECT_EQ(run("//g//"), levelled("//g//", 1, "g"));
    EXPECT_EQ(g_TestCmdTree, nullptr);
}

TEST_F(NodePath, PathOfSlashesAsksForEmptyNamesAndGetsARunThatFails)
{
    platform::write_plan(kPlan);
    EXPECT_EQ(run("/"), joined({levelled("/", 0, ""), split(), asked_index(load(), kNotFound),
                                run_failed(no_group())}));
    EXPECT_EQ(run("///"), joined({levelled("///", 0, ""), split(), asked_index({}, kNotFound),
                                  run_failed(no_group())}));
}

TEST_F(NodePath, PathOfSlashesFindsAGroupAndAnItemWithEmptyNames)
{
    platform::write_plan("<P><CmdGroup name=''><Cmd name='a' args='1'/><Cmd name='b' args='2'/>"
                         "</CmdGroup><CmdGroup name='h'><Cmd name='c'/><Cmd name=''/>"
                         "</CmdGroup></P>");
    EXPECT_EQ(run("/"),
              joined({levelled("/", 0, ""), split(), asked_index(load()), ran("b", "2")}));
}

// --- the run as a whole --------------------------------------------------

TEST_F(NodePath, LaterPathsUseTheCachedPlan)
{
    platform::write_plan(kPlan);
    run("P/h");
    platform::write_plan("<P/>");
    EXPECT_EQ(run("P/h"),
              joined({levelled("P/h", 2, "h"), split("P", "h"),
                      asked_length({}, "node length = 2!"), ran("d", "4", 2), ran("e", "5", 3)}));
}

TEST_F(NodePath, ResultBufferStaysAsItIs)
{
    platform::write_plan(kPlan);
    for (const char *path : {"P", "P/g", "P/g/a", "P/x", "P/g/x", "/"}) {
        std::string given = path;
        std::string result(1025, 'x');
        internals::ItemsTest(given.data(), result.data());
        EXPECT_EQ(result, std::string(1025, 'x')) << path;
    }
}

} // namespace
