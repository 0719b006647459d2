// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Node paths: their levels and components, and what is logged of their runs. Which
// items they run: path_test.cpp.
#include "unit_test.h"

#include <cerrno>
#include <utility>

namespace
{

class NodePath : public LibraryTest
{
  protected:
    static constexpr char kPlan[] =
        "<P><CmdGroup name='g'><Cmd name='a' args='1'/><Cmd name='b' args='2 3'/>"
        "<Cmd name='c' args=''/></CmdGroup><CmdGroup name='h'><Cmd name='d' args='4'/>"
        "<Cmd name='e' args='5'/></CmdGroup><CmdGroup name='none'></CmdGroup></P>";

    // The events of the runner, given a path.
    static Lines run(const std::string &path)
    {
        std::string given = path;
        internals::ItemsTest(given.data(), nullptr);
        return events();
    }
    // The first events of a path "P/GROUP" or "P/GROUP/ITEM".
    static Lines begun_by(const std::string &path, const Lines &components)
    {
        return levelled(path, static_cast<int>(components.size()), components.back()) +
               split(components);
    }
    static Lines group_g_ran()
    {
        return ran("a", "1") + ran("b", "2 3", 1) + ran("c", "", 2);
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
};

// --- levels --------------------------------------------------------------

TEST_F(NodePath, LevelIsTheNumberOfComponentsAndTheLastOneIsLogged)
{
    const std::string digits = "0123456789012345678901234567890123456789";
    const std::string cut = digits.substr(0, 31); // of a last component
    const struct {
        std::string path;
        int level;
        std::string last;
    } cases[] = {
        {"a/b", 2, "b"},
        {"a/b/c", 3, "c"},
        {"a/b/c/d", 4, "d"},
        {"a/b/c/d/e/f", 6, "f"},
        {"a long root/a longer group/b", 3, "b"},
        {"a/", 1, "a"},
        {"/a", 1, "a"},
        {"//a//", 1, "a"},
        {"/a/b/", 2, "b"},
        {"a//b", 2, "b"},
        {"a///b////c", 3, "c"},
        {"/", 0, ""},
        {"////", 0, ""},
        {"r r/g g", 2, "g g"},
        {" / ", 2, " "},
        {"a\\b/c|d", 2, "c|d"},
        // without a '/' there is no last component
        {"", 1, ""},
        {"a", 1, ""},
        {"a b", 1, ""},
        {std::string(100, 'a'), 1, ""},
        {std::string(2047, 'a'), 1, ""},
        {"r/" + cut.substr(1), 2, cut.substr(1)},
        {"r/" + cut, 2, cut},
        {"r/" + cut + "1", 2, cut},
        {"r/" + cut + "12", 2, cut},
        {"r/" + digits, 2, cut},
        {"r/ab\tcd", 2, "ab"},
        {"r/ab\ncd", 2, "ab"},
        {"r/ab\tc\nd", 2, "ab"},
    };
    for (const auto &[path, count, expected] : cases) {
        std::string last;
        EXPECT_EQ(level_of(path, last), count) << path;
        EXPECT_EQ(last, filled(expected, 64)) << path;
        EXPECT_EQ(events(), level(count, expected)) << path;
    }
}

TEST_F(NodePath, PathWithoutASlashStandsForItselfUntilItsLastComponentIsCopied)
{
    const std::string path(100, 'a');
    std::string last(65, 'x');
    Lines seen;
    platform::state().log_hook = [&](const std::string & /*event*/) { seen.push_back(last); };
    internals::get_node_level(path.c_str(), last.data(), 64);

    const std::string cut = filled(path.substr(0, 63), 64) + "x";
    EXPECT_THAT(seen, ElementsAre(cut, cut));
    EXPECT_EQ(last, filled("", 64) + "x");
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
    EXPECT_EQ(events(), split({"r r", "g g", "i i"}));
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
    EXPECT_EQ(events(), split({name, name, name}));
}

TEST_F(NodePath, MissingComponentLeavesItsBufferAsItWas)
{
    const struct {
        const char *path;
        std::string group;
        Lines lines;
    } cases[] = {
        {"", "old group", split({})},     {"//", "old group", split({})},
        {"r", "old group", split({"r"})}, {"/r/", "old group", split({"r"})},
        {"r/g", "g", split({"r", "g"})},
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
        EXPECT_EQ(events(), split({"r", group_name, item_name}));
    }
}

// --- runs ----------------------------------------------------------------

TEST_F(NodePath, GroupRunsItsItemsWithTheirLines)
{
    platform::write_plan(kPlan);
    FPTEST_RunTestCmd("XMLNodePath::P/g", nullptr, 0);

    EXPECT_EQ(events(), parsed({"XMLNodePath", "P/g"}) + begun_by("P/g", {"P", "g"}) +
                            asked_length(load(), 3) + group_g_ran());
    EXPECT_STREQ(internals::command_name, "c");
    EXPECT_THAT(left_open(), IsEmpty());
}

TEST_F(NodePath, ItemIsRunAloneWithItsLines)
{
    platform::write_plan(kPlan);
    FPTEST_RunTestCmd("XMLNodePath::P/g/b", nullptr, 0);

    EXPECT_EQ(events(), parsed({"XMLNodePath", "P/g/b"}) + begun_by("P/g/b", {"P", "g", "b"}) +
                            asked_index(load()) + ran("b", "2 3"));
    EXPECT_STREQ(internals::command_name, "b");
}

TEST_F(NodePath, FourthAndLaterComponentsAreCountedAndIgnored)
{
    platform::write_plan(kPlan);
    EXPECT_EQ(run("P/g/a/x/y/"), levelled("P/g/a/x/y/", 5, "y") + split({"P", "g", "a"}) +
                                     asked_index(load()) + ran("a", "1"));
}

TEST_F(NodePath, LookupsThatFailAreLoggedAndOnlyAnItemStillGetsARun)
{
    EXPECT_EQ(run("P/g"), begun_by("P/g", {"P", "g"}) + no_length(failed_load(), kNoPlan));
    EXPECT_EQ(run("P/g/a"), begun_by("P/g/a", {"P", "g", "a"}) +
                                asked_index(failed_load(), kNoPlan) +
                                found_nothing(no_item(kNoPlan)));

    platform::write_plan(kPlan);
    EXPECT_EQ(run("P/x"), begun_by("P/x", {"P", "x"}) + no_length(load(), kNotFound));
    EXPECT_EQ(run("P/none"), begun_by("P/none", {"P", "none"}) + asked_length({}, 0));
    EXPECT_EQ(run("P/g/x"),
              begun_by("P/g/x", {"P", "g", "x"}) + asked_index({}, kNotFound) + found_nothing());
    EXPECT_EQ(run("P/x/a"), begun_by("P/x/a", {"P", "x", "a"}) + asked_index({}, kNotFound) +
                                found_nothing(no_item(kNoGroup)));
    EXPECT_STREQ(internals::command_name, "");
}

TEST_F(NodePath, NodesThatAreNoItemsGetARunOfTheirOwn)
{
    platform::write_plan("<P><CmdGroup name='g'><!-- first --><Cmd name='a' args='1'/>"
                         "<!-- between -->word</CmdGroup></P>");
    EXPECT_EQ(run("P/g"), begun_by("P/g", {"P", "g"}) + asked_length(load(), 4) + ran("a", "1") +
                              nameless() + nameless() + found_nothing());
}

TEST_F(NodePath, ProgramsThatFailDoNotEndTheGroup)
{
    platform::write_plan(kPlan);
    plan_steps("system", {gives(-1, EAGAIN), gives(256), gives(127 << 8)});
    EXPECT_EQ(run("P/g"), begun_by("P/g", {"P", "g"}) + asked_length(load(), 3) + group_g_ran());
}

TEST_F(NodePath, EveryRunOfAGroupIsGivenTheTreeOfItsMoment)
{
    platform::write_plan(kPlan);
    mxml_node_t *const other = mxmlLoadString(
        nullptr, "<P><CmdGroup name='g'><Cmd name='x'/><Cmd name='y' args='9'/></CmdGroup></P>",
        nullptr);
    mxml_node_t *first = nullptr;
    platform::state().system_hook = [&](const std::string &command) {
        if (command == "/system/bin/a 1") {
            first = std::exchange(g_TestCmdTree, other);
        }
    };
    EXPECT_EQ(run("P/g"), begun_by("P/g", {"P", "g"}) + asked_length(load(), 3) + ran("a", "1") +
                              ran("y", "9", 1) + found_nothing());
    mxmlDelete(first);
}

TEST_F(NodePath, LongNamesAreLookedUpByTheirFirst63Characters)
{
    const std::string group(63, 'g');
    const std::string item(63, 'i');
    platform::write_plan("<P><CmdGroup name='" + group + "g'><Cmd name='" + item +
                         "i' args='whole'/></CmdGroup><CmdGroup name='" + group + "'><Cmd name='" +
                         item + "i' args='long'/><Cmd name='" + item +
                         "' args='cut'/></CmdGroup></P>");
    for (const std::string more : {"", "g", "gg and more"}) {
        const std::string path = "P/" + group + more + "/" + item + more;
        EXPECT_THAT(run(path), ::testing::Contains("system(/system/bin/" + item + " cut)"));
    }
}

TEST_F(NodePath, PathOfOneComponentLooksNothingUp)
{
    platform::write_plan(kPlan);
    for (const auto &[path, last] : {std::pair{"g", ""}, {"", ""}, {"g/", "g"}, {"//g//", "g"}}) {
        EXPECT_EQ(run(path), levelled(path, 1, last));
    }
    EXPECT_EQ(g_TestCmdTree, nullptr);
}

TEST_F(NodePath, PathOfSlashesAsksForEmptyNames)
{
    platform::write_plan(kPlan);
    EXPECT_EQ(run("/"), levelled("/", 0, "") + split({}) + asked_index(load(), kNotFound) +
                            found_nothing(no_item(kNoGroup)));

    load_plan("<P><CmdGroup name=''><Cmd name='a' args='1'/><Cmd name='b' args='2'/>"
              "</CmdGroup><CmdGroup name='h'><Cmd name='c'/><Cmd name=''/></CmdGroup></P>");
    EXPECT_EQ(run("///"), levelled("///", 0, "") + split({}) + asked_index() + ran("b", "2"));
}

TEST_F(NodePath, LaterPathsUseTheCachedPlan)
{
    platform::write_plan(kPlan);
    run("P/h");
    platform::write_plan("<P/>");
    EXPECT_EQ(run("P/h"), begun_by("P/h", {"P", "h"}) + asked_length({}, 2) + ran("d", "4", 2) +
                              ran("e", "5", 3));
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
