// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Reports: what an item says of its progress and its end goes into the plan.
#include "unit_test.h"

#include <cerrno>
#include <climits>
#include <cstring>

namespace
{

const std::string kReason = "(" + std::to_string(EACCES) + ")," + std::strerror(EACCES);

class Report : public LibraryTest
{
  protected:
    // A plan as the library saves it: items "a" and "b" in the group "first", "b"
    // and "c" in the group "second", with what is after the names of a, of
    // the first b, and of c.
    static std::string plan(const std::string &a = "", const std::string &b = "",
                            const std::string &c = "")
    {
        return "<?xml version=\"1.0\"?>\n<P>\n"
               "\t<CmdGroup name=\"first\">\n" +
               item("a", a) + item("b", b) + "</CmdGroup>\n\t<CmdGroup name=\"second\">\n" +
               item("b", "") + item("c", c) + "</CmdGroup>\n</P>\n";
    }
    static std::string item(const std::string &name, const std::string &rest)
    {
        return "\t\t<Cmd name=\"" + name + "\"" + rest + " />\n";
    }

    // With the line that the XML library has broken put together again.
    static std::string unwrapped(std::string text)
    {
        const auto at = text.find("\ndescription");
        return at != std::string::npos ? text.replace(at, 1, " ") : text;
    }

    // A report on the item a, whose answer is always the same.
    static void report(int progress, int result, const char *description)
    {
        EXPECT_EQ(FPTEST_SetTransation("first", "a", progress, result, description), 0);
    }
    // The plan is read, and stays in memory.
    static void load_plan(const std::string &text = plan())
    {
        LibraryTest::load_plan(text);
    }
    static const char *attribute(const char *group, const char *name, const char *attribute_name)
    {
        auto *found =
            mxmlFindElement(g_TestCmdTree, g_TestCmdTree, "CmdGroup", "name", group, MXML_DESCEND);
        auto *element = mxmlFindElement(found, g_TestCmdTree, "Cmd", "name", name, MXML_DESCEND);
        return mxmlElementGetAttr(element, attribute_name);
    }
};

TEST_F(Report, FirstReportLoadsThePlanSetsTheValuesAndSavesThem)
{
    write_plan(plan());
    report(50, 0, "half");

    EXPECT_EQ(events(), report_begun("a", load()) + report_told(0, 50, 0, "half") + updated("a"));
    EXPECT_EQ(plan_text(), plan(" progress=\"50\" result=\"0\" description=\"half\""));
    EXPECT_THAT(left_open(), IsEmpty());
}

TEST_F(Report, LaterReportUsesThePlanInMemory)
{
    load_plan();
    write_plan("<Other/>");
    EXPECT_EQ(FPTEST_SetTransation("first", "b", -1, 1, "bad"), 0);

    EXPECT_EQ(events(), report_begun("b") + report_told(1, -1, 1, "bad") + updated("b"));
    EXPECT_EQ(plan_text(), plan("", " progress=\"-1\" result=\"1\" description=\"bad\""));
}

TEST_F(Report, EachValueIsSetAfterItsOwnLineAndBeforeTheNext)
{
    load_plan(plan(" progress=\"1\" result=\"1\" description=\"old\""));
    Lines seen;
    platform::state().log_hook = [&seen](const std::string &event) {
        if (event.starts_with("updateSrcXmlFile| ")) {
            seen.push_back(std::string(attribute("first", "a", "progress")) + " " +
                           attribute("first", "a", "result") + " " +
                           attribute("first", "a", "description"));
        }
    };
    report(2, -2, "new");

    EXPECT_THAT(seen, ElementsAre("1 1 old", "1 1 old", "1 1 old", "2 1 old", "2 -2 old",
                                  "2 -2 new", "2 -2 new"));
}

TEST_F(Report, FileIsRewrittenBetweenTheSaveLineAndTheSuccessLine)
{
    load_plan();
    Lines seen;
    platform::state().log_hook = [&seen](const std::string &event) {
        if (event.starts_with("updateSrcXmlFile| ") || event.starts_with("save_XmlFile| ")) {
            seen.push_back(plan_text() == plan() ? "old" : "new");
        }
    };
    report(2, 0, "");

    EXPECT_THAT(seen, ElementsAre("old", "old", "old", "old", "old", "old", "old", "new", "new"));
}

TEST_F(Report, ValuesAreWrittenOverTheOldOnesOrAfterTheOtherAttributes)
{
    struct Case {
        int progress, result;
        const char *description; // null: without a value
        std::string before, after;
    };
    std::vector<Case> cases = {
        {1, 0, "", "", " progress=\"1\" result=\"0\" description=\"\""},
        {1, 1, "", "", " progress=\"1\" result=\"1\" description=\"\""},
        {1, -2, "", "", " progress=\"1\" result=\"-2\" description=\"\""},
        {1, 2, "d", "", " progress=\"1\" result description=\"d\""},
        {1, 0, nullptr, " description=\"old\"", " description progress=\"1\" result=\"0\""},
        // wrapped as the XML library does by default
        {100, 0, "this is beyond the usual width", "",
         " progress=\"100\" result=\"0\"\ndescription=\"this is beyond the usual width\""},
        {1, 0, "", " args=\"-t 5\" x=\"y\"",
         " args=\"-t 5\" x=\"y\" progress=\"1\" result=\"0\"\ndescription=\"\""},
    };
    for (const int other : {2, -1, -3, 3, 10, 256, INT_MAX, INT_MIN}) {
        cases.push_back(
            {1, other, "d", " result=\"1\"", " result progress=\"1\" description=\"d\""});
    }
    for (const auto &[progress, nine] : {std::pair{0, "0"},
                                         {7, "7"},
                                         {-1, "-1"},
                                         {12345678, "12345678"},
                                         {123456789, "123456789"},
                                         {999999999, "999999999"},
                                         {1000000000, "100000000"},
                                         {1234567890, "123456789"},
                                         {INT_MAX, "214748364"},
                                         {-12345678, "-12345678"},
                                         {-123456789, "-12345678"},
                                         {INT_MIN, "-21474836"}}) {
        cases.push_back({progress, 0, "", " progress=\"5\"",
                         std::string(" progress=\"") + nine + "\" result=\"0\" description=\"\""});
    }
    for (const Case &one : cases) {
        SCOPED_TRACE(one.after);
        SetUp();
        load_plan(plan(one.before));
        report(one.progress, one.result, one.description);
        EXPECT_EQ(events(),
                  report_begun("a") +
                      report_told(0, one.progress, one.result,
                                  one.description != nullptr ? one.description : "(null)") +
                      updated("a"));
        EXPECT_EQ(unwrapped(plan_text()), plan(unwrapped(one.after)));
    }
}

TEST_F(Report, DescriptionIsKeptUnchangedWhateverItsLengthAndCharacters)
{
    for (const std::string &description :
         {std::string(5000, 'd'), std::string(" a: %s %d\t\n\"<&>' \xc3\xa4 \\ ")}) {
        SetUp();
        load_plan();
        report(1, 0, description.c_str());
        EXPECT_EQ(attribute("first", "a", "description"), description);
        EXPECT_THAT(events(), Contains(report_told(0, 1, 0, description)[1]));

        // and is still the same for who loads the file
        internals::reset();
        ASSERT_NE(internals::load_configs_file(kPath), nullptr);
        EXPECT_EQ(attribute("first", "a", "description"), description);
    }
}

TEST_F(Report, DescriptionIsCopied)
{
    load_plan();
    char description[] = "before";
    report(1, 0, description);
    std::strcpy(description, "after");
    EXPECT_STREQ(attribute("first", "a", "description"), "before");
}

TEST_F(Report, SecondReportOnAnItemReplacesTheFirst)
{
    load_plan();
    report(10, 1, "first");
    report(90, 0, "last");
    EXPECT_EQ(plan_text(), plan(" progress=\"90\" result=\"0\" description=\"last\""));
}

TEST_F(Report, UnknownGroupOrItemChangesNothing)
{
    load_plan();
    for (const auto &[group, name] : {std::pair{"third", "a"},
                                      {"First", "a"},
                                      {"firs", "a"},
                                      {"", "a"},
                                      {"first", "d"},
                                      {"first", "A"},
                                      {"first", "aa"},
                                      {"second", ""},
                                      {"second", "a"}}) {
        SCOPED_TRACE(std::string(group) + "/" + name);
        EXPECT_EQ(FPTEST_SetTransation(group, name, 5, 0, "d"), 0);
        EXPECT_EQ(events(), report_begun(name, {}, kNotFound) + report_told(-1, 5, 0, "d") +
                                not_updated(kNotFound));
        EXPECT_EQ(plan_text(), plan());

        // nor has anything changed that the next report would save
        report(1, 0, "x");
        EXPECT_EQ(plan_text(), plan(" progress=\"1\" result=\"0\" description=\"x\""));
        load_plan();
    }
}

TEST_F(Report, ItemThatTheGroupLacksIsTakenFromALaterGroup)
{
    load_plan();
    EXPECT_EQ(FPTEST_SetTransation("first", "c", 5, 0, "d"), 0);

    EXPECT_EQ(events(), report_begun("c") + report_told(1, 5, 0, "d") + updated("c"));
    EXPECT_EQ(plan_text(), plan("", "", " progress=\"5\" result=\"0\" description=\"d\""));
}

TEST_F(Report, ItemOfTheGroupItselfComesBeforeItsNamesakes)
{
    load_plan();
    FPTEST_SetTransation("second", "b", 5, 0, "d");
    EXPECT_EQ(attribute("first", "b", "progress"), nullptr);
    EXPECT_STREQ(attribute("second", "b", "progress"), "5");

    FPTEST_SetTransation("first", "b", 6, 0, "d");
    EXPECT_STREQ(attribute("first", "b", "progress"), "6");
    EXPECT_STREQ(attribute("second", "b", "progress"), "5");
}

TEST_F(Report, FirstOfSameNamedGroupsAndItemsIsUpdated)
{
    const std::string before = "<?xml version=\"1.0\"?>\n<P>\n\t<CmdGroup name=\"first\">\n";
    const std::string after = "\t\t<Cmd name=\"a\" />\n</CmdGroup>\n\t<CmdGroup name=\"first\">\n"
                              "\t\t<Cmd name=\"a\" />\n</CmdGroup>\n</P>\n";
    load_plan(before + item("a", "") + after);
    report(5, 0, "d");
    EXPECT_EQ(plan_text(),
              before + item("a", " progress=\"5\" result=\"0\" description=\"d\"") + after);
}

TEST_F(Report, ItemBelowANestedElementIsFound)
{
    load_plan("<P><CmdGroup name=\"first\"><Cmd name=\"x\"/><Block><Cmd name=\"y\"/>"
              "<Cmd name=\"a\"/></Block></CmdGroup></P>");
    report(5, 0, "d");

    EXPECT_THAT(events(), Contains(report_told(1, 5, 0, "d")[1]));
    EXPECT_EQ(plan_text(), "<P>\n<CmdGroup name=\"first\">\n\t<Cmd name=\"x\" />\n\t<Block>\n"
                           "\t\t<Cmd name=\"y\" />\n"
                           "\t\t<Cmd name=\"a\" progress=\"5\" result=\"0\" description=\"d\" />\n"
                           "</Block>\n</CmdGroup>\n</P>\n");
}

TEST_F(Report, PlanThatCannotBeLoadedIsToldTwiceAndChangesNothing)
{
    report(5, 0, "d");
    EXPECT_EQ(events(), report_begun("a", failed_load(), kNoPlan) + report_told(-1, 5, 0, "d") +
                            failed_load() + not_updated(kNoPlan));
    EXPECT_FALSE(platform::plan_exists());

    write_plan(plan());
    plan_steps("open", {gives(0, EACCES), gives(0, EACCES)}); // 0 is a failure too
    report(5, 0, "d");
    EXPECT_EQ(events(), report_begun("a", failed_load("0", kReason), kNoPlan) +
                            report_told(-1, 5, 0, "d") + failed_load("0", kReason) +
                            not_updated(kNoPlan));
    EXPECT_EQ(plan_text(), plan());

    write_plan("<?xml version=\"1.0\"?><P><CmdGroup name=\"first\"><Cmd name=\"a\"");
    report(5, 0, "d");
    EXPECT_EQ(events(), report_begun("a", load(), kNoPlan) + report_told(-1, 5, 0, "d") +
                            load("plan#2") + not_updated(kNoPlan));
    EXPECT_EQ(g_TestCmdTree, nullptr);

    write_plan(plan());
    report(6, 1, "e");
    EXPECT_EQ(events(), report_begun("a", load("plan#3")) + report_told(0, 6, 1, "e") +
                            updated("a", saved("plan#4")));
    EXPECT_EQ(plan_text(), plan(" progress=\"6\" result=\"1\" description=\"e\""));
}

TEST_F(Report, PlanThatLoadsOnlyAtTheSecondAttemptIsUpdatedAllTheSame)
{
    write_plan(plan());
    plan_steps("open", {gives(-1, EACCES)});
    report(5, 0, "d");

    EXPECT_EQ(events(), report_begun("a", failed_load("-1", kReason), kNoPlan) +
                            report_told(-1, 5, 0, "d") + load() + updated("a"));
    EXPECT_EQ(plan_text(), plan(" progress=\"5\" result=\"0\" description=\"d\""));
}

TEST_F(Report, FailedSaveIsStillFollowedByTheSuccessLine)
{
    for (const int descriptor : {-1, 0}) {
        SCOPED_TRACE(descriptor);
        SetUp();
        load_plan();
        plan_steps("open", {gives(descriptor, EACCES)});
        report(5, 0, "d");

        EXPECT_EQ(events(), report_begun("a") + report_told(0, 5, 0, "d") +
                                updated("a", not_saved(std::to_string(descriptor), kReason)));
        EXPECT_EQ(plan_text(), plan());
        EXPECT_STREQ(attribute("first", "a", "progress"), "5");
        EXPECT_STREQ(attribute("first", "a", "result"), "0");
        EXPECT_STREQ(attribute("first", "a", "description"), "d");
    }
}

TEST_F(Report, NextSaveWritesTheChangesOfAFailedOneToo)
{
    load_plan();
    plan_steps("open", {gives(-1, EROFS)});
    report(5, 1, "lost");
    EXPECT_EQ(FPTEST_SetTransation("second", "c", 6, -2, "it"), 0);

    EXPECT_EQ(plan_text(), plan(" progress=\"5\" result=\"1\" description=\"lost\"", "",
                                " progress=\"6\" result=\"-2\" description=\"it\""));
}

TEST_F(Report, NullItemNameIsLoggedAsSuch)
{
    EXPECT_EQ(FPTEST_SetTransation("first", nullptr, 5, 0, "d"), 0);
    EXPECT_EQ(events()[1], "FPTEST_SetTransation| input node name = (null)\n");
}

} // namespace
