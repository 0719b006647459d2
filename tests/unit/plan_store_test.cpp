// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The test plan: loading and lookups.
#include "unit_test.h"

#include <cerrno>
#include <climits>
#include <cstring>
#include <memory>

namespace
{

class PlanStore : public LibraryTest
{
  protected:
    static mxml_node_t *item_at(const char *group, int index)
    {
        return internals::get_node_byIndex(g_TestCmdTree, group, index);
    }
};

// --- loading -------------------------------------------------------------

TEST_F(PlanStore, LoadingOpensParsesAndCloses)
{
    EXPECT_EQ(g_TestCmdTree, nullptr);
    write_plan(kLaidOut);
    mxml_node_t *tree = internals::load_configs_file(kPath);

    EXPECT_EQ(events(), load());
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
    mxml_node_t *tree = load_plan(kLaidOut);
    write_plan("<P><CmdGroup name='g'/><CmdGroup name='new'/></P>");
    EXPECT_EQ(internals::load_configs_file(kPath), tree);
    EXPECT_EQ(internals::load_configs_file("/data/vorlane/other.xml"), tree);
    EXPECT_THAT(events(), IsEmpty());
    EXPECT_EQ(internals::get_node_length("g", 2), 3);
    EXPECT_EQ(internals::get_node_index("g", "c", 3), 2);
    EXPECT_EQ(internals::get_node_length("new", 2), -1);
}

TEST_F(PlanStore, MissingFileIsLoggedAndLookedForAgain)
{
    for (int attempt = 0; attempt < 3; ++attempt) {
        EXPECT_EQ(internals::load_configs_file(kPath), nullptr);
        EXPECT_EQ(events(), failed_load());
        EXPECT_EQ(g_TestCmdTree, nullptr);
    }
    write_plan(kLaidOut);
    EXPECT_NE(internals::load_configs_file(kPath), nullptr);
    EXPECT_EQ(events(), load());
}

TEST_F(PlanStore, FileThatCannotBeOpenedIsLoggedWithItsPathAndItsError)
{
    plan_steps("open", {gives(-1, EACCES)});
    EXPECT_EQ(internals::load_configs_file("/data/vorlane/other.xml"), nullptr);
    EXPECT_EQ(events(),
              (Lines{"mxmlSetLoneWhitespaceOff(1)", "open(/data/vorlane/other.xml, O_RDONLY) = -1",
                     "load_configs_file| Open /data/vorlane/other.xml file failed(13)," +
                         std::string(std::strerror(EACCES)) + "\n"}));
}

TEST_F(PlanStore, LoadingTakesDescriptorZeroForAFailureAndLeavesItOpen)
{
    write_plan(kLaidOut);
    platform::free_descriptor_zero();
    errno = EPERM;
    EXPECT_EQ(internals::load_configs_file(kPath), nullptr);

    EXPECT_EQ(events(), failed_load("plan#1", "(1),Operation not permitted"));
    EXPECT_EQ(g_TestCmdTree, nullptr);
    EXPECT_THAT(left_open(), ElementsAre("plan#1"));

    EXPECT_NE(internals::load_configs_file(kPath), nullptr); // 0 is taken now
    EXPECT_EQ(events(), load("plan#2"));
    EXPECT_THAT(left_open(), ElementsAre("plan#1"));
}

TEST_F(PlanStore, LoadingTakesDescriptorOneForASuccess)
{
    write_plan(kLaidOut);
    const mxml_node_t *tree = nullptr;
    {
        const support::FreedDescriptor freed(STDOUT_FILENO);
        tree = internals::load_configs_file(kPath);
    }
    EXPECT_EQ(events(), load());
    EXPECT_NE(tree, nullptr);
}

TEST_F(PlanStore, PlanThatDoesNotParseLeavesTheCacheEmptyWithoutALine)
{
    for (const char *text : {"", "words", "<P><CmdGroup name='g'></P>", "<P><Cmd name=", "<P/><Q/>",
                             "<P><Cmd name/></P>", "\n<P/>"}) {
        platform::reset();
        write_plan(text);
        EXPECT_EQ(internals::load_configs_file(kPath), nullptr) << text;
        EXPECT_EQ(events(), load()) << text;
        EXPECT_EQ(g_TestCmdTree, nullptr);
        EXPECT_THAT(left_open(), IsEmpty());
    }
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
        write_plan(kLaidOut);
        platform::state().load_hook = [place](mxml_node_t *tree) {
            mxmlAdd(tree, place, MXML_ADD_TO_PARENT, mxmlNewCustom(nullptr, nullptr, nullptr));
        };
        EXPECT_EQ(internals::load_configs_file(kPath), nullptr);
        EXPECT_EQ(events(), load());
        EXPECT_EQ(g_TestCmdTree, nullptr);
    }
    platform::state().load_hook = nullptr;
    EXPECT_NE(internals::load_configs_file(kPath), nullptr);
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
        EXPECT_EQ(shape(load_plan(text)), bare) << text;
    }
    // and in one place alone
    for (std::size_t at = places.find('#'); at != places.npos; at = places.find('#', at + 1)) {
        std::string text = places.substr(0, at) + " \n\t" + places.substr(at);
        std::erase(text, '#');
        EXPECT_EQ(shape(load_plan(text)), bare) << text;
    }
}

TEST_F(PlanStore, WhiteSpaceWrittenAsCharacterReferencesMakesNoNode)
{
    for (const std::string white : {"&#32;", "&#9;", "&#10;", "&#13;", "&#x20;", "&#x0A;",
                                    "&#32;&#32;&#9;", " &#32;", "&#32; ", "\n&#10;\n\t&#9;\n"}) {
        EXPECT_EQ(shape(load_plan("<P>" + white + "<A/>" + white + "<B>" + white + "</B>" + white +
                                  "</P>")),
                  "P{A, B}")
            << white;
    }
}

TEST_F(PlanStore, OnlyLoneWhiteSpaceIsTakenAway)
{
    for (const auto &[text, nodes] : std::initializer_list<std::pair<const char *, const char *>>{
             {"<P><a/><></><b/></P>", "P{a, , b}"},
             {"<P>\n\t<!-- c -->\n\t<A/>\n\t<!-- d -->\n</P>\n", "P{!-- c --, A, !-- d --}"},
             {"<P><A/>two words<B/></P>", "P{A, 'two', 'words', B}"},
             {"<P>\n <A/>\n two\n words \n <B> x </B>\n y\n</P>",
              "P{A, 'two', 'words', B{'x'}, 'y'}"},
             {"<P>one &#32; two</P>", "P{'one', 'two'}"},
             {"<P>12 &lt; 3.5</P>", "P{'12', '<', '3.5'}"},
             {"<P><A/>&#160;<B/></P>", "P{A, '\xc2\xa0', B}"},
             {"<P><Cmd name=' a b ' args='  '/></P>", "P{Cmd name= a b  args=  }"},
         }) {
        EXPECT_EQ(shape(load_plan(text)), nodes);
    }
}

// --- lookups: what they find is told in path_test.cpp --------------------

TEST_F(PlanStore, LookupsLoadThePlanFirst)
{
    write_plan(kLaidOut);
    EXPECT_EQ(internals::get_node_index("g", "c", 3), 2);
    EXPECT_EQ(events(), asked_index(load()));
    EXPECT_EQ(internals::get_node_index("empty", "e", 3), 2);
    EXPECT_EQ(events(), asked_index());

    SetUp();
    write_plan(kLaidOut);
    EXPECT_EQ(internals::get_node_length("g", 2), 3);
    EXPECT_EQ(events(), asked_length(load(), 3));
    EXPECT_EQ(internals::get_node_length("h", 2), 3);
    EXPECT_EQ(events(), asked_length({}, 3));
}

TEST_F(PlanStore, LookupsWithoutAPlanFailUntilOneIsStored)
{
    EXPECT_EQ(internals::get_node_index("g", "a", 3), -1);
    EXPECT_EQ(events(), asked_index(failed_load(), kNoPlan));
    EXPECT_EQ(internals::get_node_length("g", 2), -1);
    EXPECT_EQ(events(), no_length(failed_load(), kNoPlan));
    write_plan("<P><CmdGroup name='g'></P>"); // does not parse
    EXPECT_EQ(internals::get_node_index("g", "a", 3), -1);
    EXPECT_EQ(events(), asked_index(load("plan#1"), kNoPlan));
    EXPECT_EQ(internals::get_node_length("g", 2), -1);
    EXPECT_EQ(events(), no_length(load("plan#2"), kNoPlan));

    run_quietly(std::string("XMLFile::") + kLaidOut);
    EXPECT_EQ(item_at("g", 0), nullptr); // loads nothing itself
    EXPECT_EQ(events(), no_item(kNoPlan));
    EXPECT_EQ(internals::get_node_index("g", "b", 3), 1);
    EXPECT_EQ(events(), asked_index(load("plan#4")));
    EXPECT_EQ(internals::get_node_length("g", 2), 3);
    EXPECT_EQ(events(), asked_length({}, 3));
}

TEST_F(PlanStore, LookupsOfMissingNamesFail)
{
    load_plan(kLaidOut);
    for (const auto &[group, item] : {std::pair{"x", "a"}, {"g", "x"}, {"", ""}, {"g", ""}}) {
        EXPECT_EQ(internals::get_node_index(group, item, 3), -1);
        EXPECT_EQ(events(), asked_index({}, kNotFound));
    }
    EXPECT_EQ(internals::get_node_length("x", 2), -1);
    EXPECT_EQ(events(), no_length({}, kNotFound));
    EXPECT_EQ(item_at("x", 0), nullptr);
    EXPECT_EQ(events(), no_item(kNoGroup));
}

TEST_F(PlanStore, LevelOfALookupIsOnlyLogged)
{
    load_plan(kLaidOut);
    for (const int level : {2, 0, -7, 41}) {
        EXPECT_EQ(internals::get_node_index("g", "b", level), 1);
        EXPECT_EQ(events(), asked_index());
        EXPECT_EQ(internals::get_node_length("g", level), 3);
        EXPECT_EQ(events()[1], "get_node_length| input level = " + std::to_string(level) + "\n");
    }
}

TEST_F(PlanStore, NamesMatchExactly)
{
    load_plan("<P><CmdGroup name='group'><Cmd name='item'/></CmdGroup></P>");
    EXPECT_EQ(internals::get_node_index("group", "item", 3), 0);
    for (const char *other : {"Group", "GROUP", "grou", "groups", " group", "group ", ""}) {
        EXPECT_EQ(internals::get_node_index(other, "item", 3), -1) << other;
        EXPECT_EQ(internals::get_node_length(other, 2), -1) << other;
    }
    for (const char *other : {"Item", "ite", "items", " item", "item ", ""}) {
        EXPECT_EQ(internals::get_node_index("group", other, 3), -1) << other;
    }
}

TEST_F(PlanStore, EmptyNamesAreNamesToo)
{
    load_plan("<P><CmdGroup name='g'/><CmdGroup name=''><Cmd name='a'/><Cmd name=''/></CmdGroup>"
              "</P>");
    EXPECT_EQ(internals::get_node_index("", "", 3), 1);
    EXPECT_EQ(internals::get_node_length("", 2), 2);
}

TEST_F(PlanStore, LengthCountsNodesOfEveryKindButNotTheirOwn)
{
    load_plan("<P><CmdGroup name='g'>two words<!-- c --><Cmd name='a'><x/><y/></Cmd><Other/>"
              "</CmdGroup><CmdGroup name='h'></CmdGroup></P>");
    EXPECT_EQ(internals::get_node_length("g", 2), 5);
    EXPECT_EQ(internals::get_node_length("h", 2), 0);
}

TEST_F(PlanStore, PositionIsTheNumberOfEarlierSiblings)
{
    mxml_node_t *tree = load_plan("<P><A/><!-- c -->word<B/></P>");
    EXPECT_EQ(internals::node_position(tree), 0);
    int position = 0;
    for (mxml_node_t *child = mxmlGetFirstChild(tree); child != nullptr;
         child = mxmlGetNextSibling(child)) {
        EXPECT_EQ(internals::node_position(child), position++);
    }
    EXPECT_EQ(position, 4);
    EXPECT_THAT(events(), IsEmpty());
}

TEST_F(PlanStore, NodesAreHandedOutByTheirIndexes)
{
    load_plan("<P><CmdGroup name='g'><!-- before --><Cmd name='a'/><!-- c -->word<Other name='o'/>"
              "<Cmd/></CmdGroup><CmdGroup name='h'><Other name='p'/></CmdGroup></P>");
    const char *const nodes[] = {"Cmd name=a", "!-- c --", "'word'", "Other name=o", "Cmd"};
    const char *const names[] = {"a", "(null)", "(null)", "o", "(null)"};
    for (int index = 0; index < 5; ++index) {
        EXPECT_EQ(shape(item_at("g", index)), nodes[index]);
        EXPECT_EQ(events(), asked_item(names[index]));
    }
    for (const int index : {5, 6, 1000, -1, -2, INT_MIN, INT_MAX}) {
        EXPECT_EQ(item_at("g", index), nullptr) << index;
        EXPECT_EQ(events(), asked_item("(null)"));
    }
    for (const int index : {0, 1, -1}) { // no item in it, nor after it
        EXPECT_EQ(item_at("h", index), nullptr);
        EXPECT_EQ(events(), asked_item("(null)"));
    }
}

TEST_F(PlanStore, NodeByIndexIsOfTheTreeThatItIsGiven)
{
    load_plan(kLaidOut);
    const std::unique_ptr<mxml_node_t, decltype(&mxmlDelete)> other(
        mxmlLoadString(nullptr, "<P><CmdGroup name='g'><Cmd name='other'/></CmdGroup></P>",
                       nullptr),
        &mxmlDelete);
    EXPECT_EQ(shape(internals::get_node_byIndex(other.get(), "g", 0)), "Cmd name=other");
    EXPECT_EQ(events(), asked_item("other"));
    EXPECT_EQ(internals::get_node_byIndex(nullptr, "g", 0), nullptr);
    EXPECT_EQ(events(), no_item(kNoPlan));
}

} // namespace
