// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The test plan: its layout, and saving it.
#include "unit_test.h"

#include <cerrno>
#include <cstring>
#include <memory>

namespace
{

class PlanSave : public LibraryTest
{
  protected:
    // The bytes that the file has after a plan was loaded and saved.
    static std::string save_of(const std::string &text)
    {
        internals::save_XmlFile(load_plan(text));
        return plan_text();
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
};

// --- layout --------------------------------------------------------------

TEST_F(PlanSave, OpeningTagsAreIndentedByTheirAncestorsButOne)
{
    mxml_node_t *node = load_plan(nested(12));
    const std::size_t tabs[] = {0, 0, 1, 2, 3, 4, 5, 6, 7, 8, 8, 8, 8};
    for (const std::size_t expected : tabs) {
        ASSERT_NE(node, nullptr);
        EXPECT_EQ(internals::whitespace_cb(node, MXML_WS_BEFORE_OPEN), std::string(expected, '\t'));
        node = mxmlGetFirstChild(node);
    }
    EXPECT_EQ(node, nullptr);
}

TEST_F(PlanSave, IndentationsAreTailsOfOneText)
{
    mxml_node_t *node = load_plan(nested(10));
    const char *top = internals::whitespace_cb(node, MXML_WS_BEFORE_OPEN);
    for (; node != nullptr; node = mxmlGetFirstChild(node)) {
        const char *text = internals::whitespace_cb(node, MXML_WS_BEFORE_OPEN);
        EXPECT_EQ(text + std::strlen(text), top);
    }
}

TEST_F(PlanSave, TagsAreFollowedByLineFeedsAndClosingTagsNotIndented)
{
    for (mxml_node_t *node = load_plan(nested(10)); node != nullptr;
         node = mxmlGetFirstChild(node)) {
        EXPECT_STREQ(internals::whitespace_cb(node, MXML_WS_AFTER_OPEN), "\n");
        EXPECT_STREQ(internals::whitespace_cb(node, MXML_WS_AFTER_CLOSE), "\n");
        EXPECT_EQ(internals::whitespace_cb(node, MXML_WS_BEFORE_CLOSE), nullptr);
        for (const int other : {-1, 4, 5, 100}) {
            EXPECT_EQ(internals::whitespace_cb(node, other), nullptr);
        }
    }
}

TEST_F(PlanSave, DeclarationsAreFollowedByALineFeedAndNothingElse)
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

TEST_F(PlanSave, OtherNamesAreNoDeclarations)
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

TEST_F(PlanSave, TextIsLaidOutAsAnElementInItsPlace)
{
    mxml_node_t *top = load_plan(nested(1));
    mxml_node_t *text = mxmlNewText(mxmlGetFirstChild(top), 0, "?xml");
    ASSERT_EQ(mxmlGetElement(text), nullptr);

    EXPECT_STREQ(internals::whitespace_cb(text, MXML_WS_BEFORE_OPEN), "\t");
    EXPECT_STREQ(internals::whitespace_cb(text, MXML_WS_AFTER_OPEN), "\n");
    EXPECT_EQ(internals::whitespace_cb(text, MXML_WS_BEFORE_CLOSE), nullptr);
    EXPECT_STREQ(internals::whitespace_cb(text, MXML_WS_AFTER_CLOSE), "\n");
}

// --- saving --------------------------------------------------------------

TEST_F(PlanSave, SavingReplacesTheFileAndCloses)
{
    mxml_node_t *tree = load_plan(kLaidOut);
    write_plan(std::string(5000, 'x'));
    internals::save_XmlFile(tree);

    EXPECT_EQ(events(), saved());
    EXPECT_EQ(plan_text(), kLaidOut);
    EXPECT_THAT(left_open(), IsEmpty());
    EXPECT_EQ(g_TestCmdTree, tree);
}

TEST_F(PlanSave, SavingCreatesAFileThatIsGone)
{
    mxml_node_t *tree = load_plan(kLaidOut);
    platform::reset();
    internals::save_XmlFile(tree);
    EXPECT_EQ(events(), saved("plan#1"));
    EXPECT_EQ(plan_text(), kLaidOut);
}

TEST_F(PlanSave, SavingWritesTheTreeThatItIsGiven)
{
    load_plan(kLaidOut);
    const std::unique_ptr<mxml_node_t, decltype(&mxmlDelete)> other(
        mxmlLoadString(nullptr, "<P><A/></P>", nullptr), &mxmlDelete);
    internals::save_XmlFile(other.get());
    EXPECT_EQ(plan_text(), "<P>\n<A />\n</P>\n");
}

TEST_F(PlanSave, PlansAreSavedInOneLayout)
{
    const std::string long_name(30, 'n');
    const std::string long_args(40, 'a');
    for (const auto &[text, expected] : std::initializer_list<std::pair<std::string, std::string>>{
             {"<?xml version=\"1.0\"?><P><CmdGroup name='g'><Cmd name='a' args='1'/>"
              "<Cmd name='b' args='2'/><Cmd name='c' args='3'></Cmd></CmdGroup>"
              "<CmdGroup name='empty'></CmdGroup><CmdGroup name='h'><Cmd name='d' args='4'/>"
              "<Cmd name='b' args='5'/><Cmd name='e' args='6'/></CmdGroup></P>",
              kLaidOut},
             // from another layout
             {"<?xml version=\"1.0\" encoding='utf-8'?>\r\n\r\n<P >\r\n  <CmdGroup\n"
              "   name = 'g'>  <Cmd  name='a'\targs='1'> </Cmd>\n\n  </CmdGroup>\r\n</P>",
              "<?xml version=\"1.0\" encoding='utf-8'?>\n<P>\n\t<CmdGroup name=\"g\">\n"
              "\t\t<Cmd name=\"a\" args=\"1\" />\n</CmdGroup>\n</P>\n"},
             // without a declaration: one tab less
             {"<P><CmdGroup name='g'><Cmd name='a'/></CmdGroup><CmdGroup name='h'/></P>",
              "<P>\n<CmdGroup name=\"g\">\n\t<Cmd name=\"a\" />\n</CmdGroup>\n"
              "<CmdGroup name=\"h\" />\n</P>\n"},
             // comments have lines of their own
             {"<?xml version=\"1.0\"?><!-- top --><P><!-- a: b --><CmdGroup name='g'>"
              "<!--c--><Cmd name='a'/></CmdGroup><!-- end --></P>",
              "<?xml version=\"1.0\"?>\n<!-- top -->\n<P>\n\t<!-- a: b -->\n"
              "\t<CmdGroup name=\"g\">\n\t\t<!--c-->\n\t\t<Cmd name=\"a\" />\n</CmdGroup>\n"
              "\t<!-- end -->\n</P>\n"},
             // attributes are escaped, in their order
             {"<P><Cmd args='a &lt;&gt;&amp;&quot;&apos; \xc3\xa9' name=\"it's\" x=''/></P>",
              "<P>\n<Cmd args=\"a &lt;&gt;&amp;&quot;' \xc3\xa9\" name=\"it's\" x=\"\" />\n"
              "</P>\n"},
             // and wrapped at the XML library's own margin
             {"<P><Cmd name='" + long_name + "' args='" + long_args + "' progress='10'/></P>",
              "<P>\n<Cmd name=\"" + long_name + "\"\nargs=\"" + long_args +
                  "\" progress=\"10\" />\n</P>\n"},
         }) {
        EXPECT_EQ(save_of(text), expected);
    }
}

TEST_F(PlanSave, NestingBeyondNineLevelsIsSavedWithEightTabs)
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
    EXPECT_EQ(save_of(nested(12)), expected);
    EXPECT_EQ(shape(load_plan(expected)), shape(load_plan(nested(12))));
}

TEST_F(PlanSave, ChangesInTheTreeAreSaved)
{
    mxml_node_t *tree = load_plan(kLaidOut);
    mxmlElementSetAttr(internals::get_node_byIndex(tree, "g", 1), "progress", "50");
    internals::save_XmlFile(tree);
    EXPECT_EQ(internals::load_configs_file(kPath), tree);

    std::string expected = kLaidOut;
    const std::string item = "<Cmd name=\"b\" args=\"2\" ";
    expected.insert(expected.find(item) + item.size(), "progress=\"50\" ");
    EXPECT_EQ(plan_text(), expected);
}

TEST_F(PlanSave, SavedPlanLoadsAsTheSameTreeAndSavesAsTheSameBytes)
{
    for (const std::string &text :
         {std::string(kLaidOut),
          std::string("<P><CmdGroup name='g'><!-- c --><Cmd name='a'/></CmdGroup></P>"), nested(3),
          nested(15), "<?xml version=\"1.0\"?>" + nested(15),
          std::string("<?xml version=\"1.0\"?>\n<!-- top -->\n<P>\n<A><B> <C/>\n</B></A>"
                      "<D e='f &amp; g'/></P>\n"),
          std::string("<P><CmdGroup name='g'><Cmd name='") + std::string(200, 'n') + "' args='" +
              std::string(200, 'a') + "'/></CmdGroup></P>",
          std::string("<?xml version=\"1.0\"?>"), std::string("<P/>")}) {
        const std::string before = shape(load_plan(text));
        const std::string first = save_of(text);
        EXPECT_EQ(shape(load_plan(first)), before) << first;
        EXPECT_EQ(save_of(first), first);
    }
}

TEST_F(PlanSave, WordsOfASavedPlanLoadAsTheSameWords)
{
    for (const char *text : {"<P><A>two words</A></P>",
                             "<P>\n <CmdGroup name='g'>one <Cmd name='a'/> two\n</CmdGroup></P>"}) {
        const std::string before = shape(load_plan(text));
        EXPECT_EQ(shape(load_plan(save_of(text))), before);
    }
}

TEST_F(PlanSave, FileThatCannotBeOpenedForSavingStaysAndTheTreeKeepsItsChanges)
{
    mxml_node_t *tree = load_plan(kLaidOut);
    mxmlElementSetAttr(internals::get_node_byIndex(tree, "g", 1), "progress", "50");
    events();
    plan_steps("open", {gives(-1, EROFS)});
    internals::save_XmlFile(tree);

    EXPECT_EQ(events(), not_saved("-1", "(30),Read-only file system"));
    EXPECT_EQ(plan_text(), kLaidOut);
    EXPECT_EQ(g_TestCmdTree, tree);
    EXPECT_STREQ(mxmlElementGetAttr(internals::get_node_byIndex(tree, "g", 1), "progress"), "50");
}

TEST_F(PlanSave, SavingTakesDescriptorZeroForAFailureAndLeavesItOpen)
{
    mxml_node_t *tree = load_plan(kLaidOut);
    const std::string before = shape(tree);
    platform::free_descriptor_zero();
    internals::save_XmlFile(tree);

    const Lines seen = events();
    ASSERT_EQ(seen.size(), 3U);
    EXPECT_TRUE(seen[2].starts_with("save_XmlFile| Open /data/vorlane/src1.xml file failed("));
    EXPECT_EQ(Lines(seen.begin(), seen.end() - 1), opened_to_save("plan#2"));
    EXPECT_EQ(plan_text(), ""); // the open has emptied it
    EXPECT_THAT(left_open(), ElementsAre("plan#2"));
    EXPECT_EQ(shape(tree), before);

    plan_steps("open", {gives(0, EIO)});
    internals::save_XmlFile(tree);
    EXPECT_EQ(events(), not_saved("plan#2", "(5)," + std::string(std::strerror(EIO))));
}

TEST_F(PlanSave, SavingTakesDescriptorOneForASuccess)
{
    mxml_node_t *tree = load_plan(kLaidOut);
    write_plan("");
    {
        const support::FreedDescriptor freed(STDOUT_FILENO);
        internals::save_XmlFile(tree);
    }
    EXPECT_EQ(events(), saved());
    EXPECT_EQ(plan_text(), kLaidOut);
}

} // namespace
