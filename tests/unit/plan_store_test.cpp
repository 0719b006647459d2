// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The test plan: loading, lookups, saving.
#include "sequences.h"

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstring>
#include <memory>
#include <unistd.h>

using platform::events;
using platform::gives;
using platform::left_open;
using platform::plan_steps;
using platform::plan_text;
using platform::write_plan;

namespace
{

class PlanStore : public LibraryTest
{
  protected:
    static constexpr char kPath[] = "/data/vorlane/src1.xml";

    // --- expected events ---

    static Lines not_opened(const std::string &result = "-1",
                            const std::string &error = "(2),No such file or directory")
    {
        return sequences::failed_load(result, error);
    }
    static Lines index_lines(const Lines &loading)
    {
        return joined({{"get_node_index| enter...\n"}, loading});
    }
    static Lines index_lines(const Lines &loading, const std::string &failure)
    {
        return joined(
            {index_lines(loading), {"get_node_index| get_node_index[]:" + failure + "\n"}});
    }
    static Lines length_lines(const Lines &loading, const std::string &outcome)
    {
        return joined({{"get_node_length| Enter node length calculate!\n",
                        "get_node_length| input level = 2\n"},
                       loading,
                       {"get_node_length| " + outcome + "\n"}});
    }
    static Lines length_failure(const Lines &loading, const std::string &failure)
    {
        return length_lines(loading, "get_node_length[]:" + failure);
    }
    static Lines item_lines(const std::string &name)
    {
        return {"get_node_byIndex| enter...\n",
                "get_node_byIndex| curernt leaf node name = " + name + "\n",
                "get_node_byIndex| leave...\n"};
    }
    static Lines item_failure(const std::string &failure)
    {
        return {"get_node_byIndex| enter...\n",
                "get_node_byIndex| get_node_byIndex[]:" + failure + "\n"};
    }
    static Lines saved_lines(const std::string &plan)
    {
        return {"save_XmlFile| enter...\n",
                "open(/data/vorlane/src1.xml, O_RDWR|O_CREAT|O_TRUNC|O_SYNC, 0666) = " + plan,
                "close(" + plan + ")", "save_XmlFile| leave...\n"};
    }
    static Lines not_saved(const std::string &result, const std::string &error)
    {
        return {"save_XmlFile| enter...\n",
                "open(/data/vorlane/src1.xml, O_RDWR|O_CREAT|O_TRUNC|O_SYNC, 0666) = " + result,
                "save_XmlFile| Open /data/vorlane/src1.xml file failed" + error + "\n"};
    }
    static constexpr char kCouldNotLoad[] = "load config file failed";
    static constexpr char kNotFound[] = "mxml Find Path failed";
    static constexpr char kGroupNotFound[] = " Find Element \"registers\" failed";

    // --- doing ---

    // The tree of a plan, loaded anew; its events are forgotten.
    static mxml_node_t *load(const std::string &text)
    {
        internals::reset();
        write_plan(text);
        mxml_node_t *tree = internals::load_configs_file(kPath);
        EXPECT_NE(tree, nullptr) << text;
        events();
        return tree;
    }
    // The bytes that the file has after a plan was loaded and saved.
    static std::string saved(const std::string &text)
    {
        internals::save_XmlFile(load(text));
        events();
        return plan_text();
    }
    static int index_of(const char *group, const char *item)
    {
        return internals::get_node_index(group, item, 3);
    }
    static int length_of(const char *group)
    {
        return internals::get_node_length(group, 2);
    }
    // The name of the item at a position, as the lookup hands it out. Forgets
    // what happened before.
    static std::string item_at(const char *group, int index)
    {
        events();
        mxml_node_t *node = internals::get_node_byIndex(g_TestCmdTree, group, index);
        const Lines seen = events();
        if (node == nullptr) {
            EXPECT_EQ(seen, item_lines("(null)"));
            return "nothing";
        }
        const char *name = mxmlElementGetAttr(node, "name");
        EXPECT_EQ(seen, item_lines(name != nullptr ? name : "(null)"));
        return name != nullptr ? name : "nameless";
    }

    // The next open gets descriptor 1; the body must leave it closed, and must
    // not print.
    template <typename Body> static void with_descriptor_one_free(const Body &body)
    {
        std::fflush(stdout);
        const int output = dup(STDOUT_FILENO);
        ::close(STDOUT_FILENO);
        body();
        EXPECT_EQ(dup2(output, STDOUT_FILENO), STDOUT_FILENO);
        ::close(output);
    }

    // The tree in one line: elements with their attributes and children, texts.
    static std::string shape(mxml_node_t *node)
    {
        if (mxmlGetType(node) == MXML_TEXT) {
            return std::string("'") + mxmlGetText(node, nullptr) + "'";
        }
        std::string text = mxmlGetElement(node);
        for (int at = 0; at < mxmlElementGetAttrCount(node); ++at) {
            const char *name = nullptr;
            const char *value = mxmlElementGetAttrByIndex(node, at, &name);
            text += std::string(" ") + name + "=" + (value != nullptr ? value : "(none)");
        }
        std::string children;
        for (mxml_node_t *child = mxmlGetFirstChild(node); child != nullptr;
             child = mxmlGetNextSibling(child)) {
            children += (children.empty() ? "" : ", ") + shape(child);
        }
        return children.empty() ? text : text + "{" + children + "}";
    }

    // A chain of elements without a declaration, the innermost with that many
    // ancestors.
    static std::string nested(int ancestors)
    {
        std::string text;
        for (int depth = 0; depth < ancestors; ++depth) {
            text += "<n>";
        }
        text += "<n/>";
        for (int depth = 0; depth < ancestors; ++depth) {
            text += "</n>";
        }
        return text;
    }

    static constexpr char kPlan[] = "<?xml version=\"1.0\"?>\n"
                                    "<P>\n"
                                    "\t<CmdGroup name=\"g\">\n"
                                    "\t\t<Cmd name=\"a\" args=\"1\" />\n"
                                    "\t\t<Cmd name=\"b\" args=\"2\" />\n"
                                    "\t\t<Cmd name=\"c\" args=\"3\" />\n"
                                    "</CmdGroup>\n"
                                    "\t<CmdGroup name=\"empty\" />\n"
                                    "\t<CmdGroup name=\"h\">\n"
                                    "\t\t<Cmd name=\"d\" args=\"4\" />\n"
                                    "\t\t<Cmd name=\"b\" args=\"5\" />\n"
                                    "\t\t<Cmd name=\"e\" args=\"6\" />\n"
                                    "</CmdGroup>\n"
                                    "</P>\n";
    static constexpr char kCommented[] =
        "<P><CmdGroup name='g'><!-- three items --><Cmd name='a'/><Cmd name='b'/>"
        "<Cmd name='c'/></CmdGroup></P>";
};

// --- loading -------------------------------------------------------------

TEST_F(PlanStore, NothingIsLoadedAtFirst)
{
    EXPECT_EQ(g_TestCmdTree, nullptr);
}

TEST_F(PlanStore, LoadingOpensParsesAndCloses)
{
    write_plan(kPlan);
    mxml_node_t *tree = internals::load_configs_file(kPath);

    EXPECT_EQ(events(), sequences::load());
    EXPECT_THAT(left_open(), IsEmpty());
    EXPECT_EQ(g_TestCmdTree, tree);
    ASSERT_NE(tree, nullptr);
    EXPECT_EQ(shape(tree),
              "?xml version=\"1.0\"?{P{"
              "CmdGroup name=g{Cmd name=a args=1, Cmd name=b args=2, Cmd name=c args=3}, "
              "CmdGroup name=empty, "
              "CmdGroup name=h{Cmd name=d args=4, Cmd name=b args=5, Cmd name=e args=6}}}");
}

TEST_F(PlanStore, CachedTreeIsReturnedWithoutALookAtTheFile)
{
    mxml_node_t *tree = load(kPlan);
    write_plan("<P/>");
    EXPECT_EQ(internals::load_configs_file(kPath), tree);
    EXPECT_EQ(internals::load_configs_file("/data/vorlane/other.xml"), tree);
    EXPECT_THAT(events(), IsEmpty());
}

TEST_F(PlanStore, PlanChangedOnDiskIsNotSeenWhileATreeIsCached)
{
    load(kPlan);
    write_plan("<P><CmdGroup name='g'/><CmdGroup name='new'/></P>");
    EXPECT_EQ(length_of("g"), 3);
    EXPECT_EQ(index_of("g", "c"), 2);
    EXPECT_EQ(item_at("g", 2), "c");
    EXPECT_EQ(length_of("new"), -1);
}

TEST_F(PlanStore, MissingFileIsLoggedAndLookedForAgain)
{
    for (int attempt = 0; attempt < 3; ++attempt) {
        EXPECT_EQ(internals::load_configs_file(kPath), nullptr);
        EXPECT_EQ(events(), not_opened());
        EXPECT_EQ(g_TestCmdTree, nullptr);
    }
    write_plan(kPlan);
    EXPECT_NE(internals::load_configs_file(kPath), nullptr);
    EXPECT_EQ(events(), sequences::load());
}

TEST_F(PlanStore, FileThatCannotBeOpenedIsLoggedWithItsPathAndItsError)
{
    plan_steps("open", {gives(-1, EACCES)});
    EXPECT_EQ(internals::load_configs_file("/data/vorlane/other.xml"), nullptr);
    EXPECT_EQ(events(),
              (Lines{"mxmlSetLoneWhitespaceOff(1)", "open(/data/vorlane/other.xml, O_RDONLY) = -1",
                     "load_configs_file| Open /data/vorlane/other.xml file failed(13),"
                     "Permission denied\n"}));
}

TEST_F(PlanStore, LoadingTakesDescriptorZeroForAFailureAndLeavesItOpen)
{
    write_plan(kPlan);
    platform::free_descriptor_zero();
    errno = EPERM;
    EXPECT_EQ(internals::load_configs_file(kPath), nullptr);

    EXPECT_EQ(events(), not_opened("plan#1", "(1),Operation not permitted"));
    EXPECT_EQ(g_TestCmdTree, nullptr);
    EXPECT_THAT(left_open(), ElementsAre("plan#1"));

    EXPECT_NE(internals::load_configs_file(kPath), nullptr); // 0 is taken now
    EXPECT_EQ(events(), sequences::load("plan#2"));
    EXPECT_THAT(left_open(), ElementsAre("plan#1"));
}

TEST_F(PlanStore, LoadingTakesDescriptorOneForASuccess)
{
    write_plan(kPlan);
    const mxml_node_t *tree = nullptr;
    with_descriptor_one_free([&] { tree = internals::load_configs_file(kPath); });
    EXPECT_EQ(events(), sequences::load());
    EXPECT_NE(tree, nullptr);
}

TEST_F(PlanStore, PlanThatDoesNotParseLeavesTheCacheEmptyWithoutALine)
{
    for (const char *text : {"", "words", "<P><CmdGroup name='g'></P>", "<P><Cmd name=", "<P/><Q/>",
                             "<P><Cmd name/></P>", "\n<P/>"}) {
        platform::reset();
        write_plan(text);
        EXPECT_EQ(internals::load_configs_file(kPath), nullptr) << text;
        EXPECT_EQ(events(), sequences::load()) << text;
        EXPECT_EQ(g_TestCmdTree, nullptr);
        EXPECT_THAT(left_open(), IsEmpty());
    }
}

TEST_F(PlanStore, ElementWithoutANameIsANode)
{
    EXPECT_EQ(shape(load("<P><a/><></><b/></P>")), "P{a, , b}");
}

TEST_F(PlanStore, WordOfAnyOneVisibleCharacterIsANode)
{
    std::string words;
    int count = 0;
    for (char character = '!'; character <= '~'; ++character) {
        if (character != '<' && character != '&') {
            words += std::string(" ") + character;
            ++count;
        }
    }
    write_plan("<P><CmdGroup name='g'>" + words + " </CmdGroup></P>");
    EXPECT_EQ(internals::get_node_length("g", 2), count);
}

// A tree in which Mini-XML has left out what it had no memory for. The library
// makes none on request; a node of a kind that the library does not load is as
// nameless to it.
TEST_F(PlanStore, PlanThatIsNotWholeIsAsOneThatDoesNotParse)
{
    for (const int place : {MXML_ADD_BEFORE, MXML_ADD_AFTER}) { // first, last
        platform::reset();
        write_plan(kPlan);
        platform::on_load([place](mxml_node_t *tree) {
            mxmlAdd(tree, place, MXML_ADD_TO_PARENT, mxmlNewCustom(nullptr, nullptr, nullptr));
        });
        EXPECT_EQ(internals::load_configs_file(kPath), nullptr);
        EXPECT_EQ(events(), sequences::load());
        EXPECT_EQ(g_TestCmdTree, nullptr);
    }
    platform::on_load(nullptr);
    EXPECT_NE(internals::load_configs_file(kPath), nullptr);
}

TEST_F(PlanStore, PlanThatDoesNotParseFailsTheLookupsAndIsTriedAgain)
{
    write_plan("<P><CmdGroup name='g'></P>");
    EXPECT_EQ(index_of("g", "a"), -1);
    EXPECT_EQ(events(), index_lines(sequences::load("plan#1"), kCouldNotLoad));
    EXPECT_EQ(length_of("g"), -1);
    EXPECT_EQ(events(), length_failure(sequences::load("plan#2"), kCouldNotLoad));

    write_plan(kPlan);
    EXPECT_EQ(length_of("g"), 3);
    EXPECT_EQ(events(), length_lines(sequences::load("plan#3"), "node length = 3!"));
}

TEST_F(PlanStore, LookupsWithoutAFileFailUntilOneIsStored)
{
    EXPECT_EQ(index_of("g", "a"), -1);
    EXPECT_EQ(events(), index_lines(not_opened(), kCouldNotLoad));
    EXPECT_EQ(length_of("g"), -1);
    EXPECT_EQ(events(), length_failure(not_opened(), kCouldNotLoad));
    EXPECT_EQ(internals::get_node_byIndex(g_TestCmdTree, "g", 0), nullptr);
    EXPECT_EQ(events(), item_failure(kCouldNotLoad));
    EXPECT_EQ(g_TestCmdTree, nullptr);

    run_quietly(std::string("XMLFile::") + kPlan);
    EXPECT_EQ(internals::get_node_byIndex(g_TestCmdTree, "g", 0), nullptr);
    EXPECT_EQ(events(), item_failure(kCouldNotLoad)); // loads nothing itself
    EXPECT_EQ(index_of("g", "b"), 1);
    EXPECT_EQ(events(),
              index_lines({"mxmlSetLoneWhitespaceOff(1)",
                           "open(/data/vorlane/src1.xml, O_RDONLY) = plan#2", "close(plan#2)"}));
    EXPECT_EQ(length_of("g"), 3);
    EXPECT_EQ(events(), length_lines({}, "node length = 3!"));
}

// --- white space ---------------------------------------------------------

TEST_F(PlanStore, WhiteSpaceAloneMakesNoNodeWhereverItStands)
{
    const std::string bare = "?xml version=\"1.0\"?{P{CmdGroup name=g{Cmd name=a, Cmd name=b}, "
                             "CmdGroup name=h}}";
    // #: every place between two tags, before closing tags and at the end
    const std::string places = "<?xml version=\"1.0\"?>#<P>#<CmdGroup name='g'>#<Cmd name='a'/>#"
                               "<Cmd name='b'>#</Cmd>#</CmdGroup>#<CmdGroup name='h'>#"
                               "</CmdGroup>#</P>#";
    for (const char *white : {"", " ", "\t", "\n", "\r", "\r\n", "    ", "\n\t\t", " \t\n\r "}) {
        std::string text;
        for (const char at : places) {
            text += at == '#' ? white : std::string(1, at);
        }
        EXPECT_EQ(shape(load(text)), bare) << text;
    }
}

TEST_F(PlanStore, WhiteSpaceInOnePlaceAloneMakesNoNode)
{
    for (const char *text : {
             "<P> <A/></P>",
             "<P><A/> </P>",
             "<P>\n\t<A/></P>",
             "<P><A/>\n</P>",
             "<P><A> </A></P>",
             "<P><A>\n\t</A></P>",
             "<P><A/></P> \n",
         }) {
        EXPECT_EQ(shape(load(text)), "P{A}") << text;
    }
}

TEST_F(PlanStore, WhiteSpaceWrittenAsCharacterReferencesMakesNoNode)
{
    for (const char *white : {"&#32;", "&#9;", "&#10;", "&#13;", "&#x20;", "&#x0A;",
                              "&#32;&#32;&#9;", " &#32;", "&#32; ", "\n&#10;\n\t&#9;\n"}) {
        const std::string between = white;
        EXPECT_EQ(shape(load("<P>" + between + "<A/>" + between + "<B>" + between + "</B>" +
                             between + "</P>")),
                  "P{A, B}")
            << between;
    }
}

TEST_F(PlanStore, WhiteSpaceAroundCommentsMakesNoNode)
{
    EXPECT_EQ(shape(load("<?xml version=\"1.0\"?>\n<!-- top -->\n<P>\n\t<!-- c -->\n\t<A/>\n"
                         "\t<!-- d -->\n</P>\n")),
              "?xml version=\"1.0\"?{!-- top --, P{!-- c --, A, !-- d --}}");
}

TEST_F(PlanStore, EveryWordIsANodeAndWhiteSpaceAroundItIsNot)
{
    EXPECT_EQ(shape(load("<P><A/>two words<B/></P>")), "P{A, 'two', 'words', B}");
    EXPECT_EQ(shape(load("<P>\n <A/>\n two\n words \n <B> x </B>\n y\n</P>")),
              "P{A, 'two', 'words', B{'x'}, 'y'}");
    EXPECT_EQ(shape(load("<P>one &#32; two</P>")), "P{'one', 'two'}");
    EXPECT_EQ(shape(load("<P>12 &lt; 3.5</P>")), "P{'12', '<', '3.5'}");
}

TEST_F(PlanStore, OtherSpacesAreText)
{
    EXPECT_EQ(shape(load("<P><A/>&#160;<B/></P>")), "P{A, '\xc2\xa0', B}");
}

TEST_F(PlanStore, WhiteSpaceInAttributesStays)
{
    EXPECT_EQ(shape(load("<P><Cmd name=' a b ' args='  '/></P>")), "P{Cmd name= a b  args=  }");
}

TEST_F(PlanStore, LaidOutPlanCountsLikeABareOne)
{
    for (const char *text :
         {"<P><CmdGroup name='g'><Cmd name='a'/><Cmd name='b'/><Cmd name='c'/></CmdGroup></P>",
          "<P>\n\t<CmdGroup name='g'>\n\t\t<Cmd name='a'/>\n\t\t<Cmd name='b'/>\n\n"
          "\t\t<Cmd name='c'/>\n\t</CmdGroup>\n</P>\n",
          "<P>\r\n  <CmdGroup name='g'>  <Cmd name='a'/>&#32;<Cmd name='b'> </Cmd>\r\n"
          "<Cmd name='c'></Cmd>&#9;</CmdGroup></P>"}) {
        load(text);
        EXPECT_EQ(length_of("g"), 3) << text;
        EXPECT_EQ(index_of("g", "a"), 0);
        EXPECT_EQ(index_of("g", "b"), 1);
        EXPECT_EQ(index_of("g", "c"), 2);
        EXPECT_EQ(item_at("g", 0), "a");
        EXPECT_EQ(item_at("g", 1), "b");
        EXPECT_EQ(item_at("g", 2), "c");
        EXPECT_EQ(item_at("g", 3), "nothing");
    }
}

// --- positions -----------------------------------------------------------

TEST_F(PlanStore, PositionIsTheNumberOfEarlierSiblings)
{
    mxml_node_t *tree = load("<P><A/><!-- c -->word<B/></P>");
    EXPECT_EQ(internals::node_position(tree), 0);
    int position = 0;
    for (mxml_node_t *child = mxmlGetFirstChild(tree); child != nullptr;
         child = mxmlGetNextSibling(child)) {
        EXPECT_EQ(internals::node_position(child), position++);
    }
    EXPECT_EQ(position, 4);
    EXPECT_THAT(events(), IsEmpty());
}

// --- index by names ------------------------------------------------------

TEST_F(PlanStore, IndexLoadsThePlanFirst)
{
    write_plan(kPlan);
    EXPECT_EQ(index_of("g", "c"), 2);
    EXPECT_EQ(events(), index_lines(sequences::load()));
    EXPECT_EQ(index_of("g", "a"), 0);
    EXPECT_EQ(events(), index_lines({}));
}

TEST_F(PlanStore, IndexDoesNotDependOnTheLevel)
{
    load(kPlan);
    for (const int level : {3, 0, -1, 2}) {
        EXPECT_EQ(internals::get_node_index("g", "b", level), 1);
        EXPECT_EQ(events(), index_lines({}));
    }
}

TEST_F(PlanStore, IndexOfAMissingGroupOrItemFails)
{
    load(kPlan);
    for (const auto &[group, item] : {std::pair{"x", "a"}, {"g", "x"}, {"", ""}, {"g", ""}}) {
        EXPECT_EQ(index_of(group, item), -1);
        EXPECT_EQ(events(), index_lines({}, kNotFound));
    }
}

TEST_F(PlanStore, IndexOfAnItemOfALaterGroupIsItsPositionThere)
{
    load(kPlan);
    EXPECT_EQ(index_of("g", "d"), 0);
    EXPECT_EQ(index_of("g", "e"), 2);
    EXPECT_EQ(index_of("empty", "e"), 2);
    EXPECT_EQ(events(), joined({index_lines({}), index_lines({}), index_lines({})}));
}

TEST_F(PlanStore, IndexOfAnItemOfAnEarlierGroupFails)
{
    load(kPlan);
    EXPECT_EQ(index_of("h", "a"), -1);
    EXPECT_EQ(index_of("empty", "c"), -1);
    EXPECT_EQ(events(), joined({index_lines({}, kNotFound), index_lines({}, kNotFound)}));
}

TEST_F(PlanStore, IndexPrefersTheNamedGroupsItemAndThenTheNext)
{
    load(kPlan);
    EXPECT_EQ(index_of("g", "b"), 1);
    EXPECT_EQ(index_of("h", "b"), 1);
    load("<P><CmdGroup name='g'><Cmd name='a'/><Cmd name='x'/><Cmd name='x'/></CmdGroup>"
         "<CmdGroup name='h'><Cmd name='x'/></CmdGroup></P>");
    EXPECT_EQ(index_of("g", "x"), 1);
    EXPECT_EQ(index_of("h", "x"), 0);
}

TEST_F(PlanStore, IndexCountsEveryNodeBeforeTheItem)
{
    load(kCommented);
    EXPECT_EQ(index_of("g", "a"), 1);
    EXPECT_EQ(index_of("g", "c"), 3);
    load(
        "<P><CmdGroup name='g'>two words<Other name='o'/><!-- c --><Cmd name='a'/></CmdGroup></P>");
    EXPECT_EQ(index_of("g", "a"), 4);
}

TEST_F(PlanStore, OnlyCmdElementsAreItems)
{
    load("<P><CmdGroup name='g'><Other name='a'/><cmd name='a'/><Cmds name='a'/><Cm name='a'/>"
         "<Cmd title='a'/><Cmd Name='a'/></CmdGroup></P>");
    EXPECT_EQ(index_of("g", "a"), -1);
}

TEST_F(PlanStore, OnlyCmdGroupElementsAreGroups)
{
    load("<P><Group name='g'><Cmd name='a'/></Group><cmdgroup name='g'><Cmd name='a'/></cmdgroup>"
         "<Cmd name='g'/><CmdGroups name='g'/><CmdGrou name='g'/><CmdGroup title='g'/></P>");
    EXPECT_EQ(index_of("g", "a"), -1);
    EXPECT_EQ(length_of("g"), -1);
    events();
    EXPECT_EQ(internals::get_node_byIndex(g_TestCmdTree, "g", 0), nullptr);
    EXPECT_EQ(events(), item_failure(kGroupNotFound));
}

TEST_F(PlanStore, NamesMatchExactly)
{
    load("<P><CmdGroup name='group'><Cmd name='item'/></CmdGroup></P>");
    EXPECT_EQ(index_of("group", "item"), 0);
    for (const char *other : {"Group", "GROUP", "grou", "groups", " group", "group ", ""}) {
        EXPECT_EQ(index_of(other, "item"), -1) << other;
        EXPECT_EQ(length_of(other), -1) << other;
    }
    for (const char *other : {"Item", "ite", "items", " item", "item ", ""}) {
        EXPECT_EQ(index_of("group", other), -1) << other;
    }
}

TEST_F(PlanStore, EmptyNamesAreNamesToo)
{
    load("<P><CmdGroup name='g'/><CmdGroup name=''><Cmd name='a'/><Cmd name=''/></CmdGroup></P>");
    EXPECT_EQ(index_of("", ""), 1);
    EXPECT_EQ(length_of(""), 2);
}

// --- the search for groups -----------------------------------------------

TEST_F(PlanStore, GroupsAreFoundAtAnyDepth)
{
    load("<?xml version=\"1.0\"?><P><A><B><CmdGroup name='deep'><Cmd name='a'/></CmdGroup></B></A>"
         "<CmdGroup name='shallow'/></P>");
    EXPECT_EQ(length_of("deep"), 1);
    EXPECT_EQ(length_of("shallow"), 0);
    EXPECT_EQ(index_of("deep", "a"), 0);
}

TEST_F(PlanStore, FirstOfSeveralGroupsInDocumentOrderWins)
{
    load("<P><A><CmdGroup name='g'><Cmd name='a'/></CmdGroup></A>"
         "<CmdGroup name='g'><Cmd name='b'/><Cmd name='c'/></CmdGroup></P>");
    EXPECT_EQ(length_of("g"), 1);
    EXPECT_EQ(item_at("g", 0), "a");
    EXPECT_EQ(index_of("g", "c"), 1); // found on its way through the document
}

TEST_F(PlanStore, GroupInsideAGroupIsOneOfItsNodesAndAGroupItself)
{
    load("<P><CmdGroup name='g'><Cmd name='a'/><CmdGroup name='i'><Cmd name='b'/><Cmd name='c'/>"
         "</CmdGroup><Cmd name='d'/></CmdGroup></P>");
    EXPECT_EQ(length_of("g"), 3);
    EXPECT_EQ(length_of("i"), 2);
    EXPECT_EQ(index_of("g", "c"), 1);
    EXPECT_EQ(index_of("g", "d"), 2);
    EXPECT_EQ(index_of("i", "d"), 2); // after it, in the outer group
    EXPECT_EQ(item_at("g", 1), "i");
    EXPECT_EQ(item_at("g", 2), "d");
    EXPECT_EQ(item_at("i", 1), "c");
}

TEST_F(PlanStore, TopNodeItselfIsNoGroup)
{
    load("<CmdGroup name='g'><Cmd name='a'/></CmdGroup>");
    EXPECT_EQ(length_of("g"), -1);
    EXPECT_EQ(index_of("g", "a"), -1);
    events();
    EXPECT_EQ(internals::get_node_byIndex(g_TestCmdTree, "g", 0), nullptr);
    EXPECT_EQ(events(), item_failure(kGroupNotFound));

    load("<?xml version=\"1.0\"?><CmdGroup name='g'><Cmd name='a'/></CmdGroup>");
    EXPECT_EQ(length_of("g"), 1);
}

// --- item by index -------------------------------------------------------

TEST_F(PlanStore, ItemsAreFoundByTheirIndexes)
{
    load(kPlan);
    EXPECT_EQ(item_at("g", 0), "a");
    EXPECT_EQ(item_at("g", 1), "b");
    EXPECT_EQ(item_at("g", 2), "c");
    EXPECT_EQ(item_at("h", 0), "d");
    EXPECT_EQ(item_at("h", 1), "b");
    mxml_node_t *node = internals::get_node_byIndex(g_TestCmdTree, "h", 1);
    EXPECT_STREQ(mxmlElementGetAttr(node, "args"), "5");
}

TEST_F(PlanStore, IndexesOutsideTheItemsFindNothing)
{
    load(kPlan);
    for (const int index : {3, 4, 1000, -1, -2, INT_MIN, INT_MAX}) {
        EXPECT_EQ(item_at("g", index), "nothing") << index;
    }
}

TEST_F(PlanStore, ItemsAreCountedFromTheFirstOfThem)
{
    load(kCommented);
    EXPECT_EQ(length_of("g"), 4);
    EXPECT_EQ(index_of("g", "a"), 1);
    EXPECT_EQ(item_at("g", 0), "a");
    EXPECT_EQ(item_at("g", 2), "c");
    EXPECT_EQ(item_at("g", 3), "nothing");
}

TEST_F(PlanStore, NodesBetweenTheItemsAreSteppedOnAndHandedOut)
{
    load("<P><CmdGroup name='g'><Cmd name='a'/><!-- c -->word<Other name='o'/><Cmd/></CmdGroup>"
         "</P>");
    EXPECT_EQ(item_at("g", 1), "nameless");
    EXPECT_EQ(item_at("g", 2), "nameless");
    EXPECT_EQ(item_at("g", 3), "o");
    EXPECT_EQ(item_at("g", 4), "nameless");
    EXPECT_EQ(item_at("g", 5), "nothing");
    EXPECT_EQ(mxmlGetType(internals::get_node_byIndex(g_TestCmdTree, "g", 2)), MXML_TEXT);
}

TEST_F(PlanStore, FirstItemIsTheFirstCmdEvenWithoutAName)
{
    load("<P><CmdGroup name='g'><Other name='o'/><Cmd args='1'/><Cmd name='b'/></CmdGroup></P>");
    EXPECT_EQ(item_at("g", 0), "nameless");
    EXPECT_EQ(item_at("g", 1), "b");
}

TEST_F(PlanStore, GroupWithoutAnItemYieldsThoseOfTheNext)
{
    load(kPlan);
    EXPECT_EQ(item_at("empty", 0), "d");
    EXPECT_EQ(item_at("empty", 2), "e");
    EXPECT_EQ(item_at("empty", 3), "nothing");
}

TEST_F(PlanStore, GroupWithNoItemAfterItYieldsNothing)
{
    load("<P><CmdGroup name='g'><Cmd name='a'/></CmdGroup>"
         "<CmdGroup name='h'><Other name='o'/></CmdGroup></P>");
    for (const int index : {0, 1, -1}) {
        EXPECT_EQ(item_at("h", index), "nothing");
    }
}

TEST_F(PlanStore, ItemByIndexOfAMissingGroupFails)
{
    load(kPlan);
    EXPECT_EQ(internals::get_node_byIndex(g_TestCmdTree, "x", 0), nullptr);
    EXPECT_EQ(events(), item_failure(kGroupNotFound));
}

TEST_F(PlanStore, ItemByIndexUsesTheTreeThatItIsGiven)
{
    load(kPlan);
    const std::unique_ptr<mxml_node_t, decltype(&mxmlDelete)> other(
        mxmlLoadString(nullptr, "<P><CmdGroup name='g'><Cmd name='other'/></CmdGroup></P>",
                       nullptr),
        &mxmlDelete);
    mxml_node_t *node = internals::get_node_byIndex(other.get(), "g", 0);
    EXPECT_EQ(events(), item_lines("other"));
    EXPECT_STREQ(mxmlElementGetAttr(node, "name"), "other");
}

TEST_F(PlanStore, ItemByIndexWithoutATreeFailsEvenIfOneIsCached)
{
    load(kPlan);
    EXPECT_EQ(internals::get_node_byIndex(nullptr, "g", 0), nullptr);
    EXPECT_EQ(events(), item_failure(kCouldNotLoad));
}

// --- group length --------------------------------------------------------

TEST_F(PlanStore, LengthLoadsThePlanFirst)
{
    write_plan(kPlan);
    EXPECT_EQ(length_of("g"), 3);
    EXPECT_EQ(events(), length_lines(sequences::load(), "node length = 3!"));
    EXPECT_EQ(length_of("h"), 3);
    EXPECT_EQ(events(), length_lines({}, "node length = 3!"));
}

TEST_F(PlanStore, LengthOfAnEmptyGroupIsZero)
{
    load("<P><CmdGroup name='g'/><CmdGroup name='h'></CmdGroup><CmdGroup name='i'>\n\t</CmdGroup>"
         "</P>");
    for (const char *group : {"g", "h", "i"}) {
        EXPECT_EQ(length_of(group), 0);
        EXPECT_EQ(events(), length_lines({}, "node length = 0!"));
    }
}

TEST_F(PlanStore, LengthCountsNodesOfEveryKindButNotTheirOwn)
{
    load("<P><CmdGroup name='g'>two words<!-- c --><Cmd name='a'><x/><y/></Cmd><Other/></CmdGroup>"
         "</P>");
    EXPECT_EQ(length_of("g"), 5);
}

TEST_F(PlanStore, LengthOfAMissingGroupFails)
{
    load(kPlan);
    EXPECT_EQ(length_of("x"), -1);
    EXPECT_EQ(events(), length_failure({}, kNotFound));
}

TEST_F(PlanStore, LengthLogsTheLevelThatItIsGiven)
{
    load(kPlan);
    for (const int level : {2, 0, -7, 41}) {
        EXPECT_EQ(internals::get_node_length("g", level), 3);
        EXPECT_THAT(events(),
                    ElementsAre("get_node_length| Enter node length calculate!\n",
                                "get_node_length| input level = " + std::to_string(level) + "\n",
                                "get_node_length| node length = 3!\n"));
    }
}

// --- layout --------------------------------------------------------------

TEST_F(PlanStore, OpeningTagsAreIndentedByTheirAncestorsButOne)
{
    mxml_node_t *node = load(nested(12));
    const std::size_t tabs[] = {0, 0, 1, 2, 3, 4, 5, 6, 7, 8, 8, 8, 8};
    for (const std::size_t expected : tabs) {
        ASSERT_NE(node, nullptr);
        EXPECT_EQ(internals::whitespace_cb(node, MXML_WS_BEFORE_OPEN), std::string(expected, '\t'));
        node = mxmlGetFirstChild(node);
    }
    EXPECT_EQ(node, nullptr);
}

TEST_F(PlanStore, IndentationsAreTailsOfOneText)
{
    mxml_node_t *node = load(nested(10));
    const char *top = internals::whitespace_cb(node, MXML_WS_BEFORE_OPEN);
    for (; node != nullptr; node = mxmlGetFirstChild(node)) {
        const char *text = internals::whitespace_cb(node, MXML_WS_BEFORE_OPEN);
        EXPECT_EQ(text + std::strlen(text), top);
    }
}

TEST_F(PlanStore, TagsAreFollowedByLineFeedsAndClosingTagsNotIndented)
{
    for (mxml_node_t *node = load(nested(10)); node != nullptr; node = mxmlGetFirstChild(node)) {
        EXPECT_STREQ(internals::whitespace_cb(node, MXML_WS_AFTER_OPEN), "\n");
        EXPECT_STREQ(internals::whitespace_cb(node, MXML_WS_AFTER_CLOSE), "\n");
        EXPECT_EQ(internals::whitespace_cb(node, MXML_WS_BEFORE_CLOSE), nullptr);
        for (const int other : {-1, 4, 5, 100}) {
            EXPECT_EQ(internals::whitespace_cb(node, other), nullptr);
        }
    }
}

TEST_F(PlanStore, DeclarationsAreFollowedByALineFeedAndNothingElse)
{
    for (const char *name : {"?xml version=\"1.0\"?", "?xml", "?xml-stylesheet?", "?xmlx"}) {
        const std::unique_ptr<mxml_node_t, decltype(&mxmlDelete)> node(
            mxmlNewElement(nullptr, name), &mxmlDelete);
        EXPECT_EQ(internals::whitespace_cb(node.get(), MXML_WS_BEFORE_OPEN), nullptr) << name;
        EXPECT_STREQ(internals::whitespace_cb(node.get(), MXML_WS_AFTER_OPEN), "\n");
        EXPECT_EQ(internals::whitespace_cb(node.get(), MXML_WS_BEFORE_CLOSE), nullptr);
        EXPECT_EQ(internals::whitespace_cb(node.get(), MXML_WS_AFTER_CLOSE), nullptr);
        EXPECT_EQ(internals::whitespace_cb(node.get(), 4), nullptr);
    }
}

TEST_F(PlanStore, OtherNamesAreNoDeclarations)
{
    for (const char *name : {"?xm", "?XML", "xml", "?php", "!-- ?xml --", "?", ""}) {
        const std::unique_ptr<mxml_node_t, decltype(&mxmlDelete)> node(
            mxmlNewElement(nullptr, name), &mxmlDelete);
        EXPECT_STREQ(internals::whitespace_cb(node.get(), MXML_WS_BEFORE_OPEN), "") << name;
        EXPECT_STREQ(internals::whitespace_cb(node.get(), MXML_WS_AFTER_OPEN), "\n");
        EXPECT_EQ(internals::whitespace_cb(node.get(), MXML_WS_BEFORE_CLOSE), nullptr);
        EXPECT_STREQ(internals::whitespace_cb(node.get(), MXML_WS_AFTER_CLOSE), "\n");
    }
}

// --- saving --------------------------------------------------------------

TEST_F(PlanStore, SavingReplacesTheFileAndCloses)
{
    mxml_node_t *tree = load(kPlan);
    write_plan(std::string(5000, 'x'));
    internals::save_XmlFile(tree);

    EXPECT_EQ(events(), saved_lines("plan#2"));
    EXPECT_EQ(plan_text(), kPlan);
    EXPECT_THAT(left_open(), IsEmpty());
    EXPECT_EQ(g_TestCmdTree, tree);
}

TEST_F(PlanStore, SavingCreatesAFileThatIsGone)
{
    mxml_node_t *tree = load(kPlan);
    platform::reset();
    internals::save_XmlFile(tree);
    EXPECT_EQ(events(), saved_lines("plan#1"));
    EXPECT_EQ(plan_text(), kPlan);
}

TEST_F(PlanStore, SavingWritesTheTreeThatItIsGiven)
{
    load(kPlan);
    const std::unique_ptr<mxml_node_t, decltype(&mxmlDelete)> other(
        mxmlLoadString(nullptr, "<P><A/></P>", nullptr), &mxmlDelete);
    internals::save_XmlFile(other.get());
    EXPECT_EQ(plan_text(), "<P>\n<A />\n</P>\n");
}

TEST_F(PlanStore, BarePlanIsSavedLaidOut)
{
    EXPECT_EQ(saved("<?xml version=\"1.0\"?><P><CmdGroup name='g'><Cmd name='a' args='1'/>"
                    "<Cmd name='b' args='2'/><Cmd name='c' args='3'></Cmd></CmdGroup>"
                    "<CmdGroup name='empty'></CmdGroup><CmdGroup name='h'><Cmd name='d' args='4'/>"
                    "<Cmd name='b' args='5'/><Cmd name='e' args='6'/></CmdGroup></P>"),
              kPlan);
}

TEST_F(PlanStore, PlanInAnotherLayoutIsSavedInTheOneLayout)
{
    EXPECT_EQ(saved("<?xml version=\"1.0\" encoding='utf-8'?>\r\n\r\n<P >\r\n  <CmdGroup\n"
                    "   name = 'g'>  <Cmd  name='a'\targs='1'> </Cmd>\n\n  </CmdGroup>\r\n</P>"),
              "<?xml version=\"1.0\" encoding='utf-8'?>\n"
              "<P>\n"
              "\t<CmdGroup name=\"g\">\n"
              "\t\t<Cmd name=\"a\" args=\"1\" />\n"
              "</CmdGroup>\n"
              "</P>\n");
}

TEST_F(PlanStore, PlanWithoutADeclarationIsSavedOneTabLess)
{
    EXPECT_EQ(saved("<P><CmdGroup name='g'><Cmd name='a'/></CmdGroup><CmdGroup name='h'/></P>"),
              "<P>\n"
              "<CmdGroup name=\"g\">\n"
              "\t<Cmd name=\"a\" />\n"
              "</CmdGroup>\n"
              "<CmdGroup name=\"h\" />\n"
              "</P>\n");
}

TEST_F(PlanStore, NestingBeyondNineLevelsIsSavedWithEightTabs)
{
    const std::size_t tabs[] = {0, 0, 1, 2, 3, 4, 5, 6, 7, 8, 8, 8};
    std::string expected;
    for (const std::size_t count : tabs) {
        expected += std::string(count, '\t') + "<n>\n";
    }
    expected += std::string(8, '\t') + "<n />\n";
    for ([[maybe_unused]] const std::size_t count : tabs) {
        expected += "</n>\n";
    }
    EXPECT_EQ(saved(nested(12)), expected);
    EXPECT_EQ(shape(load(expected)), shape(load(nested(12))));
}

TEST_F(PlanStore, CommentsAreSavedOnLinesOfTheirOwn)
{
    EXPECT_EQ(saved("<?xml version=\"1.0\"?><!-- top --><P><!-- a: b --><CmdGroup name='g'>"
                    "<!--c--><Cmd name='a'/></CmdGroup><!-- end --></P>"),
              "<?xml version=\"1.0\"?>\n"
              "<!-- top -->\n"
              "<P>\n"
              "\t<!-- a: b -->\n"
              "\t<CmdGroup name=\"g\">\n"
              "\t\t<!--c-->\n"
              "\t\t<Cmd name=\"a\" />\n"
              "</CmdGroup>\n"
              "\t<!-- end -->\n"
              "</P>\n");
}

TEST_F(PlanStore, AttributesAreSavedEscapedAndInOrder)
{
    EXPECT_EQ(saved("<P><Cmd args='a &lt;&gt;&amp;&quot;&apos; \xc3\xa9' name=\"it's\" x=''/></P>"),
              "<P>\n"
              "<Cmd args=\"a &lt;&gt;&amp;&quot;' \xc3\xa9\" name=\"it's\" x=\"\" />\n"
              "</P>\n");
}

TEST_F(PlanStore, LongAttributeListIsWrappedAtTheLibrarysOwnMargin)
{
    EXPECT_EQ(saved("<P><Cmd name='" + std::string(30, 'n') + "' args='" + std::string(40, 'a') +
                    "' progress='10'/></P>"),
              "<P>\n"
              "<Cmd name=\"" +
                  std::string(30, 'n') + "\"\nargs=\"" + std::string(40, 'a') +
                  "\" progress=\"10\" />\n"
                  "</P>\n");
}

TEST_F(PlanStore, ChangesInTheTreeAreSaved)
{
    mxml_node_t *tree = load(kPlan);
    mxmlElementSetAttr(internals::get_node_byIndex(tree, "g", 1), "progress", "50");
    internals::save_XmlFile(tree);
    EXPECT_EQ(internals::load_configs_file(kPath), tree);

    std::string expected = kPlan;
    const std::string item = "<Cmd name=\"b\" args=\"2\" ";
    expected.insert(expected.find(item) + item.size(), "progress=\"50\" ");
    EXPECT_EQ(plan_text(), expected);
}

TEST_F(PlanStore, SavedPlanLoadsAsTheSameTreeAndSavesAsTheSameBytes)
{
    for (const std::string &text :
         {std::string(kPlan), std::string(kCommented), nested(3), nested(15),
          "<?xml version=\"1.0\"?>" + nested(15),
          std::string("<?xml version=\"1.0\"?>\n<!-- top -->\n<P>\n<A><B> <C/>\n</B></A>"
                      "<D e='f &amp; g'/></P>\n"),
          std::string("<P><CmdGroup name='g'><Cmd name='") + std::string(200, 'n') + "' args='" +
              std::string(200, 'a') + "'/></CmdGroup></P>",
          std::string("<?xml version=\"1.0\"?>"), std::string("<P/>")}) {
        const std::string before = shape(load(text));
        const std::string first = saved(text);
        EXPECT_EQ(shape(load(first)), before) << first;
        EXPECT_EQ(saved(first), first);
    }
}

TEST_F(PlanStore, WordsOfASavedPlanLoadAsTheSameWords)
{
    for (const char *text : {"<P><A>two words</A></P>",
                             "<P>\n <CmdGroup name='g'>one <Cmd name='a'/> two\n</CmdGroup></P>"}) {
        const std::string before = shape(load(text));
        EXPECT_EQ(shape(load(saved(text))), before);
    }
}

TEST_F(PlanStore, EveryTagOfASavedPlanEndsItsLine)
{
    const std::string text = saved(kPlan);
    for (std::size_t at = text.find('>'); at != std::string::npos; at = text.find('>', at + 1)) {
        EXPECT_EQ(text.at(at + 1), '\n') << at;
    }
    for (std::size_t at = text.find("</"); at != std::string::npos; at = text.find("</", at + 1)) {
        EXPECT_EQ(text.at(at - 1), '\n') << at;
    }
}

TEST_F(PlanStore, FileThatCannotBeOpenedForSavingStaysAndTheTreeKeepsItsChanges)
{
    mxml_node_t *tree = load(kPlan);
    mxmlElementSetAttr(internals::get_node_byIndex(tree, "g", 1), "progress", "50");
    events();
    plan_steps("open", {gives(-1, EROFS)});
    internals::save_XmlFile(tree);

    EXPECT_EQ(events(), not_saved("-1", "(30),Read-only file system"));
    EXPECT_EQ(plan_text(), kPlan);
    EXPECT_EQ(g_TestCmdTree, tree);
    EXPECT_STREQ(mxmlElementGetAttr(internals::get_node_byIndex(tree, "g", 1), "progress"), "50");
}

TEST_F(PlanStore, SavingTakesDescriptorZeroForAFailureAndLeavesItOpen)
{
    mxml_node_t *tree = load(kPlan);
    const std::string before = shape(tree);
    platform::free_descriptor_zero();
    internals::save_XmlFile(tree);

    const Lines seen = events();
    ASSERT_EQ(seen.size(), 3U);
    const std::string line = seen[2];
    EXPECT_TRUE(line.starts_with("save_XmlFile| Open /data/vorlane/src1.xml file failed("));
    EXPECT_EQ(
        Lines(seen.begin(), seen.end() - 1),
        (Lines{"save_XmlFile| enter...\n",
               "open(/data/vorlane/src1.xml, O_RDWR|O_CREAT|O_TRUNC|O_SYNC, 0666) = plan#2"}));
    EXPECT_EQ(plan_text(), ""); // the open has emptied it
    EXPECT_THAT(left_open(), ElementsAre("plan#2"));
    EXPECT_EQ(shape(tree), before);

    plan_steps("open", {gives(0, EIO)});
    internals::save_XmlFile(tree);
    EXPECT_EQ(events(), not_saved("plan#2", "(5),Input/output error"));
}

TEST_F(PlanStore, SavingTakesDescriptorOneForASuccess)
{
    mxml_node_t *tree = load(kPlan);
    write_plan("");
    with_descriptor_one_free([&] { internals::save_XmlFile(tree); });
    EXPECT_EQ(events(), saved_lines("plan#2"));
    EXPECT_EQ(plan_text(), kPlan);
}

} // namespace
