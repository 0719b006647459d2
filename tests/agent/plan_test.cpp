// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Test plans as the library sees them. What a path runs is compared with the library
// itself in tests/unit/path_test.cpp.
#include "plan/plan.h"
#include "plan/plan_text.h"
#include "support/files.h"
#include "support/this_process.h"

#include <gmock/gmock.h>

#include <csignal>
#include <cstring>
#include <optional>
#include <stdexcept>
#include <string>
#include <sys/resource.h>
#include <system_error>
#include <unistd.h>
#include <vector>

using fptest::ItemReport;
using fptest::Plan;
using fptest::Tag;
using testing::ElementsAre;
using testing::IsEmpty;
using namespace std::string_literals;

namespace
{

using Names = std::vector<std::string>;

constexpr char kDeclaration[] = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n";

std::string cmd(const std::string &name)
{
    return "<Cmd name=\"" + name + "\" args=\"\"/>";
}

std::string group(const std::string &name, const std::string &content)
{
    return "<CmdGroup name=\"" + name + "\">" + content + "</CmdGroup>";
}

std::string plan_of(const std::string &content)
{
    return kDeclaration + ("<Plan>" + content + "</Plan>");
}

Plan loaded(const std::string &text)
{
    std::string why;
    std::optional<Plan> plan = Plan::load_as_library(text, &why);
    if (!plan) {
        throw std::runtime_error("not loaded: " + why);
    }
    return std::move(*plan);
}

std::string reason(const std::string &text)
{
    std::string why = "(loaded)";
    EXPECT_FALSE(Plan::load_as_library(text, &why)) << text;
    return why;
}

// "GROUP: ITEM ITEM", in order.
Names listed(const Plan &plan)
{
    Names lines;
    for (const Plan::Group &one : plan.groups()) {
        std::string line = one.name + ":";
        for (const Plan::Element &item : one.items) {
            line += " " + item.name.value();
        }
        lines.push_back(line);
    }
    return lines;
}

// --- what a command stores ------------------------------------------------------

TEST(StoredPlan, IsTheTextWithoutColonsInFrontUpToAColonAZeroByteOrItsLimit)
{
    const std::string limit(2048, 'x');
    for (const auto &[text, stored] : std::initializer_list<std::pair<std::string, std::string>>{
             {"<Plan/>\n", "<Plan/>\n"},
             {"", ""},
             {"<Plan a=\"b:c:d\"/>", "<Plan a=\"b"},
             {":::<a/>:<b/>", "<a/>"},
             {"::", ""},
             {"<a/>\0<b/>"s, "<a/>"},
             {limit, limit},
             {limit + "x", limit},
             {"::" + limit + "x", limit},
         }) {
        EXPECT_EQ(fptest::as_stored(text), stored) << text;
    }
}

// --- what an item is run as --------------------------------------------------------

TEST(Vendor, HasASuffixUnlessItRunsNothing)
{
    EXPECT_EQ(fptest::vendor_suffix(0), "");
    EXPECT_EQ(fptest::vendor_suffix(1), "_ca");
    EXPECT_EQ(fptest::vendor_suffix(2), "_ca_qsee");
    EXPECT_EQ(fptest::vendor_suffix(3), std::nullopt);
    EXPECT_EQ(fptest::vendor_suffix(-1), std::nullopt);
}

TEST(Gatherer, IsTheItemOfThatNameUnderVendors0And1)
{
    for (const char *name : {"SensorProbe", "SensorProbe\t2", "SensorProbe\n"}) {
        for (const int vendor : {-1, 0, 1, 2, 3}) {
            EXPECT_EQ(fptest::is_gatherer(name, vendor), vendor == 0 || vendor == 1) << vendor;
        }
    }
    for (const char *name :
         {"SensorProbe_ca", "SensorProbe_qsee", "sensorprobe", "SensorProb", "SensorProbes", ""}) {
        for (const int vendor : {0, 1, 2}) {
            EXPECT_FALSE(fptest::is_gatherer(name, vendor)) << name;
        }
    }
}

TEST(CommandLine, IsTheProgramWithTheSuffixAndItsArgs)
{
    struct Case {
        std::string name;
        std::optional<std::string> args;
        std::string suffix, line; // after /system/bin/
    };
    const std::string args(3000, 'a');
    const std::string name(1023, 'n'); // what there is room for, with one character more
    for (const auto &[item, given, suffix, line] : std::initializer_list<Case>{
             {"x", "-t 5", "", "x -t 5"},
             {"x", "-t 5", "_ca", "x_ca -t 5"},
             {"SensorProbe", "-t 5", "_ca_qsee", "SensorProbe_ca_qsee -t 5"},
             {"x", "", "", "x "},
             {"x", std::nullopt, "_ca", "x_ca (null)"},
             // cut at a tab or a line feed, the arguments are not
             {"ab\tcd", "e\tf", "", "ab e\tf"},
             {"ab\ncd", "e\nf", "_ca", "ab_ca e\nf"},
             {"\tab", "", "", " "},
             {"x", args, "", "x " + args},
             {name + "nn", "a", "", name + " a"},
             {name + "nn", "a", "_ca", name + "_ a"},
             {name.substr(6), "a", "_ca_qsee", name.substr(6) + "_ca_qse a"},
         }) {
        EXPECT_EQ(fptest::command_line(item, given, suffix), "/system/bin/" + line);
    }
}

// --- loading --------------------------------------------------------------------------

TEST(LoadedPlan, HasTheDeclarationOnTop)
{
    const Plan plan = loaded(plan_of(group("A", cmd("x"))));
    ASSERT_EQ(plan.elements().size(), 4U);
    EXPECT_EQ(plan.top(), plan.elements()[0]);
    EXPECT_STREQ(mxmlGetElement(plan.elements()[0]), "?xml version=\"1.0\" encoding=\"UTF-8\"?");
    EXPECT_STREQ(mxmlGetElement(plan.elements()[1]), "Plan");
    EXPECT_STREQ(mxmlGetElement(plan.elements()[2]), "CmdGroup");
    EXPECT_STREQ(mxmlGetElement(plan.elements()[3]), "Cmd");
    for (std::size_t number = 0; number < 4; ++number) {
        EXPECT_EQ(plan.number(plan.elements()[number]), number);
    }
}

TEST(LoadedPlan, CountsCommentsAndTheLikeAmongItsElements)
{
    const Plan plan = loaded("<?xml version=\"1.0\"?><!DOCTYPE P><P><!-- c --><![CDATA[d]]>"
                             "text<?e f?><Cmd/></P>");
    Names names;
    for (mxml_node_t *node : plan.elements()) {
        names.emplace_back(mxmlGetElement(node));
    }
    EXPECT_THAT(names, ElementsAre("?xml version=\"1.0\"?", "!DOCTYPE P", "P", "!-- c --",
                                   "![CDATA[d", "?e f?", "Cmd"));
}

TEST(LoadedPlan, StaysWholeWhenItIsMoved)
{
    Plan first = loaded(plan_of(group("A", cmd("x") + cmd("y"))));
    const Plan plan = std::move(first);
    EXPECT_EQ(plan.number(plan.elements()[3]), 3U);
    EXPECT_THAT(listed(plan), ElementsAre("A: x y"));
    EXPECT_EQ(plan.resolve("A", "y")->number, 4U);
}

TEST(LoadedPlan, MayBeInUtf16AsForTheLibrary)
{
    std::string text = "\xFF\xFE";
    for (const char c : plan_of(group("A", cmd("x")))) {
        text += c;
        text += '\0';
    }
    EXPECT_THAT(listed(loaded(text)), ElementsAre("A: x"));
}

TEST(LoadedPlan, EndsAtABadCharacter)
{
    // without a declaration the root needs no end
    for (const std::string &bad : {"\x01"s, "\0"s, "\xFFz"s}) {
        EXPECT_THAT(
            listed(loaded("<P>" + group("A", cmd("x")) + bad + group("B", cmd("y")) + "</P>")),
            ElementsAre("A: x"));
    }
}

TEST(LoadedPlan, SaysWhyMiniXmlRefusesAText)
{
    EXPECT_EQ(reason(""), "it is empty");
    EXPECT_EQ(reason("Plan"), "XML does not start with '<' (saw 'P').");
    EXPECT_EQ(reason("<?xml?><P><a></b></P>"), "Mismatched close tag </b> under parent <a>.");
    EXPECT_EQ(reason("<?xml?>\n<P>\n<Cmd name=\"x\" result/></P>"),
              "Missing value for attribute 'result' in element Cmd.");
    EXPECT_EQ(reason("<?xml?><P>"), "Missing close tag </P> under parent <?xml?>.");
    EXPECT_EQ(reason("<P><Cmd name=\"x"), "a tag in it is broken off or malformed");
    EXPECT_EQ(reason("<!-- c --><P/>"), "<P> cannot be a second root node after <!-- c -->.");
}

// A value as Mini-XML has it after saving and loading.
TEST(LoadedPlan, HasValuesAsTheyComeBackFromAFile)
{
    using namespace std::string_literals;
    for (const std::string &value : {""s, " a  b "s, "\t\n\r"s, "<&>\"'"s, "&amp;&#10;"s,
                                     "\xC3\xA9\U0001F600\u200B\u2028\uFFFE"s}) {
        EXPECT_EQ(fptest::as_loaded(value), value);
    }
    EXPECT_EQ(fptest::as_loaded("a\uFEFF"
                                "b"),
              "ab");
    EXPECT_EQ(fptest::as_loaded("\uFEFF\uFEFF"), "");
}

TEST(LoadedPlan, KeepsTheFirstReasonOfThisTextOnly)
{
    EXPECT_EQ(reason("x"), "XML does not start with '<' (saw 'x').");
    EXPECT_EQ(reason("<P><Cmd name=\"x"), "a tag in it is broken off or malformed");
    // &q; has two things against it
    EXPECT_EQ(reason("<P>&q;</P>"), "Entity name 'q;' not supported under parent <P>.");
    EXPECT_FALSE(Plan::load_as_library("x"));
}

TEST(LoadedPlan, PrintsNothingAndLeavesTheLibraryAsItWas)
{
    testing::internal::CaptureStderr();
    EXPECT_FALSE(Plan::load_as_library("x"));
    EXPECT_FALSE(Plan::parse_annotated("<a><b></a></b>"));
    EXPECT_TRUE(Plan::load_as_library("<a/>"));
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
    testing::internal::CaptureStderr();
    EXPECT_EQ(mxmlLoadString(nullptr, "x", nullptr), nullptr);
    EXPECT_EQ(testing::internal::GetCapturedStderr(),
              "mxml: XML does not start with '<' (saw 'x').\n");
}

TEST(LoadedPlan, LoadsFromDescriptorZero)
{
    const support::FreedDescriptor freed(STDIN_FILENO);
    EXPECT_TRUE(Plan::load_as_library("<P/>"));
}

TEST(LoadedPlan, NeedsRoomInMemory)
{
    std::signal(SIGXFSZ, SIG_IGN);
    {
        const support::Limit small(RLIMIT_FSIZE, 10);
        EXPECT_TRUE(Plan::load_as_library("<P></P>"));
        EXPECT_THROW(Plan::load_as_library("<P>       </P>"), std::system_error);
    }
    std::signal(SIGXFSZ, SIG_DFL);
    EXPECT_TRUE(Plan::load_as_library("<P>       </P>"));
}

// --- groups -----------------------------------------------------------------------------

TEST(Groups, AreListedInOrderWithTheirItems)
{
    EXPECT_THAT(listed(loaded(plan_of(group("B", cmd("x") + cmd("y")) + group("A", "") +
                                      group("B", cmd("z"))))),
                ElementsAre("B: x y", "A:", "B: z"));
}

TEST(Groups, AndItemsWithoutANameAreLeftOut)
{
    EXPECT_THAT(
        listed(loaded(plan_of("<CmdGroup>" + cmd("x") + "</CmdGroup>" + group("", cmd("y")) +
                              group("A", "<Cmd/><Cmd name=\"\"/>" + cmd("z"))))),
        ElementsAre("A: z"));
}

TEST(Groups, HaveTheirDirectItemsOnly)
{
    EXPECT_THAT(
        listed(loaded(plan_of(cmd("w") + group("A", "<S>" + cmd("x") + "</S><T name=\"t\"/>" +
                                                        cmd("y") + group("B", cmd("z")))))),
        ElementsAre("A: y", "B: z"));
}

TEST(Groups, AreNotFoundAtTheTopOfADocument)
{
    const Plan plan = loaded(group("A", cmd("x") + group("B", cmd("y"))));
    EXPECT_THAT(listed(plan), ElementsAre("B: y"));
    EXPECT_EQ(plan.find_group("A"), nullptr);
    EXPECT_NE(plan.find_group("B"), nullptr);
    EXPECT_THAT(listed(loaded(kDeclaration + group("A", cmd("x")))), ElementsAre("A: x"));
    EXPECT_THAT(listed(loaded("<!DOCTYPE CmdGroup>" + group("A", cmd("x")))), ElementsAre("A: x"));
}

TEST(Groups, AreFoundByTheFirstOfTheirName)
{
    const Plan plan = loaded(plan_of(group("B", "") + group("A", cmd("x")) + group("A", cmd("y"))));
    EXPECT_EQ(plan.find_group("A"), plan.elements()[3]);
    EXPECT_EQ(plan.find_group("a"), nullptr);
    EXPECT_EQ(plan.find_group(""), nullptr);
}

TEST(Groups, KnowTheirElementNumbers)
{
    const Plan plan =
        loaded(plan_of("<!-- c -->" + group("A", cmd("x") + "<!-- d -->" + cmd("y"))));
    const auto groups = plan.groups();
    ASSERT_EQ(groups.size(), 1U);
    EXPECT_EQ(groups[0].number, 3U);
    ASSERT_EQ(groups[0].items.size(), 2U);
    EXPECT_EQ(groups[0].items[0].number, 4U);
    EXPECT_EQ(groups[0].items[1].number, 6U);
    EXPECT_EQ(groups[0].items[0].tag, "Cmd");
}

TEST(Paths, TellWhichElementsRunAndWhatTheyAre)
{
    const Plan plan = loaded(
        plan_of(group("A", cmd("x") + "<Task name=\"t\" args=\"1\"/>" + cmd("y") + "<!-- c -->")));
    const auto run = plan.resolve("A");
    ASSERT_EQ(run.size(), 4U);
    EXPECT_EQ(run[0]->number, 3U);
    EXPECT_EQ(run[1]->tag, "Task");
    EXPECT_EQ(run[1]->args, "1");
    EXPECT_FALSE(run[3]);
    EXPECT_EQ(plan.resolve("A", "y")->number, 5U);
    EXPECT_THAT(plan.resolve("A\0b"s), testing::SizeIs(4)); // a zero byte ends a path
    EXPECT_FALSE(plan.resolve("", "x"));
}

// --- reading while it is written ----------------------------------------------------------

constexpr char kAnnotated[] =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<TestPlan>\n\t<CmdGroup name=\"A\">\n"
    "\t\t<Cmd name=\"x\" args=\"-a\" progress=\"100\" result=\"0\" description=\"chip "
    "&quot;7&quot; "
    "&gt;\" />\n\t\t<Cmd name=\"y\" args=\"\" progress=\"50\" result description=\"\" />\n"
    "\t\t<Cmd name=\"z\" args=\"\" progress=\"5\"\nresult=\"-2\" description />\n"
    "\t\t<Cmd name=\"w\" args=\"\" />\n</CmdGroup>\n</TestPlan>\n";

TEST(PlanWithReports, TellsWhatEveryItemHasReported)
{
    const auto plan = Plan::parse_annotated(kAnnotated);
    ASSERT_TRUE(plan);
    const auto groups = plan->groups();
    ASSERT_EQ(groups.size(), 1U);
    ASSERT_EQ(groups[0].items.size(), 4U);
    EXPECT_EQ(groups[0].items[0].report, (ItemReport{"100", "0", false, "chip \"7\" >"}));
    EXPECT_EQ(groups[0].items[1].report, (ItemReport{"50", std::nullopt, true, ""}));
    EXPECT_EQ(groups[0].items[2].report, (ItemReport{"5", "-2", false, std::nullopt}));
    EXPECT_EQ(groups[0].items[3].report, ItemReport{});
    EXPECT_EQ(plan->report(groups[0].items[1].number), groups[0].items[1].report);
    EXPECT_EQ(plan->report(1), ItemReport{}); // has no attributes
    EXPECT_EQ(plan->report(999), ItemReport{});
}

TEST(PlanWithReports, NeedsAWholeTextThatTheLibraryLoads)
{
    const std::string annotated = kAnnotated;
    for (const std::string &whole :
         {annotated.substr(0, annotated.rfind('>') + 1),
          "<P><CmdGroup name=\"A\"><Cmd name=\"x\" args=\"\" /></CmdGroup></P>"s, "<P />"s}) {
        EXPECT_TRUE(Plan::parse_annotated(whole));
        for (std::size_t size = 0; size < whole.size(); ++size) {
            EXPECT_FALSE(Plan::parse_annotated(whole.substr(0, size))) << size;
        }
    }
    for (const char *text : {"<P><a></b></P>", "</P>", "text"}) {
        EXPECT_FALSE(Plan::parse_annotated(text)) << text;
    }
}

// As it is read from a plan.
std::optional<ItemReport> item_report_with(const std::string &attributes)
{
    const auto plan = Plan::parse_annotated("<P><CmdGroup name=\"A\"><Cmd name=\"x\" " +
                                            attributes + "/></CmdGroup></P>");
    return plan ? std::optional(plan->groups().at(0).items.at(0).report) : std::nullopt;
}

TEST(PlanWithReports, ShowsWhatNoPlanCanHoldAndKeepsTheRest)
{
    EXPECT_EQ(item_report_with("description=\"a\x01\x1B\xFF"
                               "b\0c\""s)
                  ->description,
              "a\u2401\u241B\uFFFD"
              "b\u2400c");
    EXPECT_EQ(item_report_with("description=\"a\n\tb\r\"")->description, "a\n\tb\r");
}

TEST(PlanWithReports, TellsAValueThatIsEmptyFromOneThatIsMissing)
{
    EXPECT_EQ(item_report_with("result=\"\""), (ItemReport{std::nullopt, "", false, std::nullopt}));
    EXPECT_EQ(item_report_with("result"),
              (ItemReport{std::nullopt, std::nullopt, true, std::nullopt}));
    EXPECT_EQ(item_report_with("progress"), (ItemReport{"", std::nullopt, false, std::nullopt}));
    EXPECT_EQ(Plan::parse_annotated("<P><CmdGroup name=\"A\"><Cmd name=\"x\" args/></CmdGroup></P>")
                  ->groups()
                  .at(0)
                  .items.at(0)
                  .args,
              "");
    EXPECT_TRUE(Plan::parse_annotated("<Cmd name=\"x\" result/>")->report(0).result_without_value);
}

// --- places of elements ---------------------------------------------------------------------

TEST(ElementTags, MatchTheElementsOneToOne)
{
    const std::string text = "<?xml version=\"1.0\"?><!DOCTYPE P><P><!-- c -->text<![CDATA[d]]>"
                             "<?e f?><Cmd /></P>";
    std::vector<std::string> places;
    for (const Tag &tag : fptest::element_tags(loaded(text), fptest::scan(text))) {
        places.push_back(text.substr(tag.begin, tag.end - tag.begin));
    }
    EXPECT_THAT(places, ElementsAre("<?xml version=\"1.0\"?>", "<!DOCTYPE P>", "<P>", "<!-- c -->",
                                    "<![CDATA[d]]>", "<?e f?>", "<Cmd />"));
}

TEST(ElementTags, AreNoneWhereTheTextHasOthers)
{
    const std::string plan = "<P><a/><b/></P>";
    EXPECT_THAT(fptest::element_tags(loaded(plan), fptest::scan(plan)), testing::SizeIs(3));
    for (const auto &[text, other] : std::initializer_list<std::pair<std::string, std::string>>{
             {plan, "<P><a/><c/></P>"},
             {plan, "<P><a/></P>"},
             {plan, "<P><a/><b/><c/></P>"},
             {plan, "<P><a/><!-- b --></P>"},
             {plan, ""},
             {"<P><!-- b --></P>", "<P><?b?></P>"},
             {"<P><!-- b --></P>", "<P><![CDATA[b]]></P>"},
             {"<P><?b?></P>", "<P><!b></P>"},
         }) {
        EXPECT_THAT(fptest::element_tags(loaded(text), fptest::scan(other)), IsEmpty()) << other;
    }
}

TEST(ElementTags, FollowTheLibraryThroughItsOddities)
{
    for (const std::string text :
         {"<P><!----><a/><!-- b --><c/></P>", "<!DOCTYPE P [<!ELEMENT P ANY>]><P><c/></P>",
          "<P><!-- a ---> b --><c/></P>", "<P><a b='<c>'/><c d=\"/>\"/></P>",
          "<?xml?><P/><P/><!-- c -->"}) {
        const Plan plan = loaded(text);
        EXPECT_EQ(fptest::element_tags(plan, fptest::scan(text)).size(), plan.elements().size())
            << text;
    }
}

// --- a plan without its results --------------------------------------------------------------

TEST(WithoutReports, IsTheTextAsItWasBeforeTheReportsWithAMark)
{
    const auto cleared = fptest::without_reports(kAnnotated, {3, 4, 5, 6}, "m");
    ASSERT_TRUE(cleared);
    EXPECT_EQ(*cleared,
              "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<TestPlan>\n\t<CmdGroup name=\"A\">\n"
              "\t\t<Cmd fptest-run=\"m\" name=\"x\" args=\"-a\" />\n"
              "\t\t<Cmd fptest-run=\"m\" name=\"y\" args=\"\" />\n"
              "\t\t<Cmd fptest-run=\"m\" name=\"z\" args=\"\" />\n"
              "\t\t<Cmd fptest-run=\"m\" name=\"w\" args=\"\" />\n</CmdGroup>\n</TestPlan>\n");
}

TEST(WithoutReports, TouchesTheNamedElementsOnly)
{
    const std::string text = kAnnotated;
    std::string expected = text;
    const std::string reports = " progress=\"50\" result description=\"\"";
    expected.erase(expected.find(reports), reports.size());
    expected.insert(expected.find(" name=\"y\""), " fptest-run=\"m\"");
    EXPECT_EQ(fptest::without_reports(text, {4}, "m"), expected);
    EXPECT_EQ(fptest::without_reports(text, {}, "m"), text);
    EXPECT_EQ(fptest::without_reports(text, {0, 99}, "m"), text);
}

TEST(WithoutReports, LeavesEveryOtherByte)
{
    EXPECT_EQ(
        fptest::without_reports("<P a='1'  >\r\n<Cmd  result='0'\tname = 'x' \n progress=\"1\"  "
                                "args='\x01\xFF' description ='>'/>\xC3\xA9</P>\n\n",
                                {1}, "m"),
        "<P a='1'  >\r\n<Cmd fptest-run=\"m\"\tname = 'x'  args='\x01\xFF'/>\xC3\xA9</P>\n\n");
}

TEST(WithoutReports, PutsANewMarkInAnOldOnesPlace)
{
    const std::string text = "<P><Cmd name=\"x\" fptest-run=\"m\" result=\"0\"/></P>";
    EXPECT_EQ(fptest::without_reports(text, {1}, "n"), "<P><Cmd fptest-run=\"n\" name=\"x\"/></P>");
}

TEST(WithoutReports, KeepsAttributesOfSimilarNames)
{
    EXPECT_EQ(fptest::without_reports(
                  "<P><Cmd results=\"0\" Progress=\"1\" descriptions=\"2\"/></P>", {1}, "m"),
              "<P><Cmd fptest-run=\"m\" results=\"0\" Progress=\"1\" descriptions=\"2\"/></P>");
}

TEST(WithoutReports, IsNothingOfATextThatIsNotWhole)
{
    EXPECT_FALSE(fptest::without_reports("<P><Cmd result=\"0\"/>", {1}, "m"));
    EXPECT_FALSE(fptest::without_reports("", {0}, "m"));
}

TEST(WithoutMarks, TakesThemAwayWhereverTheyAre)
{
    EXPECT_EQ(fptest::without_marks("<P fptest-run=\"a\"><Cmd fptest-run=\"b\" name=\"x\"/>\n"
                                    "<Cmd name=\"y\" result=\"0\"\nfptest-run=\"c\"/></P>"),
              "<P><Cmd name=\"x\"/>\n<Cmd name=\"y\" result=\"0\"/></P>");
    EXPECT_EQ(fptest::without_marks("<P><Cmd name=\"x\"/></P>"), "<P><Cmd name=\"x\"/></P>");
    EXPECT_FALSE(fptest::without_marks("<P>"));
}

TEST(DemoPlan, RunsWhatItSays)
{
    const Plan plan = loaded(support::read_file(QUILLMARK_SOURCE_DIR "/plans/demo.xml"));
    EXPECT_THAT(listed(plan), ElementsAre("Bringup: SpiCheck DeadPixel FingerWait QuietRun",
                                          "Gather: SensorProbe", "Endurance: BurnIn"));
    for (const Plan::Group &one : plan.groups()) {
        const auto run = plan.resolve(one.name);
        ASSERT_EQ(run.size(), one.items.size());
        for (std::size_t index = 0; index < run.size(); ++index) {
            ASSERT_TRUE(run[index]);
            EXPECT_EQ(run[index]->number, one.items[index].number);
            EXPECT_EQ(plan.resolve(one.name, *one.items[index].name)->number,
                      one.items[index].number);
        }
    }
}

} // namespace
