// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Test plans as the library sees them. What it runs is compared with its own
// lookups, done on the same tree by the same calls of Mini-XML.
#include "plan/plan.h"
#include "plan/plan_text.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <csignal>
#include <cstring>
#include <fstream>
#include <iterator>
#include <optional>
#include <random>
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
    std::optional<Plan> plan = Plan::load(text, &why);
    if (!plan) {
        throw std::runtime_error("not loaded: " + why);
    }
    return std::move(*plan);
}

std::string reason(const std::string &text)
{
    std::string why = "(loaded)";
    EXPECT_FALSE(Plan::load(text, &why)) << text;
    return why;
}

// "-" where nothing is run.
std::string name_of(const std::optional<Plan::Element> &element)
{
    return element ? element->name.value_or("(no name)") : "-";
}

Names run_by(const Plan &plan, const std::string &group)
{
    Names names;
    for (const auto &element : plan.run_by(group)) {
        names.push_back(name_of(element));
    }
    return names;
}

std::string run_by(const Plan &plan, const std::string &group, const std::string &item)
{
    return name_of(plan.run_by(group, item));
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

std::string file_text(const std::string &path)
{
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

// --- what a command stores ------------------------------------------------------

TEST(StoredPart, IsTheWholeOfAShortTextWithoutColons)
{
    EXPECT_EQ(fptest::stored_part("<Plan/>\n"), "<Plan/>\n");
    EXPECT_EQ(fptest::stored_part(""), "");
}

TEST(StoredPart, EndsAtTheFirstColon)
{
    EXPECT_EQ(fptest::stored_part("<Plan a=\"b:c:d\"/>"), "<Plan a=\"b");
}

TEST(StoredPart, BeginsAfterTheColonsAtTheStart)
{
    EXPECT_EQ(fptest::stored_part(":::<a/>:<b/>"), "<a/>");
    EXPECT_EQ(fptest::stored_part("::"), "");
}

TEST(StoredPart, EndsAtAZeroByte)
{
    EXPECT_EQ(fptest::stored_part("<a/>\0<b/>"s), "<a/>");
}

TEST(StoredPart, HoldsTwoThousandAndFortyEightBytes)
{
    EXPECT_EQ(fptest::stored_part(std::string(2048, 'x')), std::string(2048, 'x'));
    EXPECT_EQ(fptest::stored_part(std::string(2049, 'x')), std::string(2048, 'x'));
    EXPECT_EQ(fptest::stored_part("::" + std::string(2049, 'x')), std::string(2048, 'x'));
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
    EXPECT_TRUE(fptest::is_gatherer("SensorProbe", 0));
    EXPECT_TRUE(fptest::is_gatherer("SensorProbe", 1));
    EXPECT_FALSE(fptest::is_gatherer("SensorProbe", 2));
    EXPECT_FALSE(fptest::is_gatherer("SensorProbe", 3));
    EXPECT_FALSE(fptest::is_gatherer("SensorProbe", -1));
}

TEST(Gatherer, HasNoSuffixInItsName)
{
    EXPECT_FALSE(fptest::is_gatherer("SensorProbe_ca", 0));
    EXPECT_FALSE(fptest::is_gatherer("SensorProbe_ca", 1));
    EXPECT_FALSE(fptest::is_gatherer("SensorProbe_qsee", 2));
    EXPECT_FALSE(fptest::is_gatherer("sensorprobe", 0));
    EXPECT_FALSE(fptest::is_gatherer("SensorProb", 0));
}

TEST(Gatherer, MayHaveMoreAfterATab)
{
    EXPECT_TRUE(fptest::is_gatherer("SensorProbe\t2", 0));
    EXPECT_TRUE(fptest::is_gatherer("SensorProbe\n", 1));
}

TEST(CommandLine, IsTheProgramWithTheSuffixAndItsArgs)
{
    EXPECT_EQ(fptest::command_line("x", "-t 5", ""), "/system/bin/x -t 5");
    EXPECT_EQ(fptest::command_line("x", "-t 5", "_ca"), "/system/bin/x_ca -t 5");
    EXPECT_EQ(fptest::command_line("SensorProbe", "-t 5", "_ca_qsee"),
              "/system/bin/SensorProbe_ca_qsee -t 5");
}

TEST(CommandLine, EndsWithABlankWhereArgsAreEmpty)
{
    EXPECT_EQ(fptest::command_line("x", "", ""), "/system/bin/x ");
}

TEST(CommandLine, SaysNullWhereArgsAreMissing)
{
    EXPECT_EQ(fptest::command_line("x", std::nullopt, "_ca"), "/system/bin/x_ca (null)");
}

TEST(CommandLine, CutsTheNameAtATabOrLineFeedButNotTheArgs)
{
    EXPECT_EQ(fptest::command_line("ab\tcd", "e\tf", ""), "/system/bin/ab e\tf");
    EXPECT_EQ(fptest::command_line("ab\ncd", "e\nf", "_ca"), "/system/bin/ab_ca e\nf");
    EXPECT_EQ(fptest::command_line("\tab", "", ""), "/system/bin/ ");
}

TEST(CommandLine, IsWholeHoweverLong)
{
    const std::string args(3000, 'a');
    EXPECT_EQ(fptest::command_line("x", args, ""), "/system/bin/x " + args);
}

TEST(CommandLine, HoldsWhatThereIsRoomForOfALongName)
{
    const std::string name(2000, 'n');
    EXPECT_EQ(fptest::command_line(name, "a", ""), "/system/bin/" + name.substr(0, 1023) + " a");
    EXPECT_EQ(fptest::command_line(name, "a", "_ca"),
              "/system/bin/" + name.substr(0, 1023) + "_ a");
    EXPECT_EQ(fptest::command_line(name.substr(0, 1017), "a", "_ca_qsee"),
              "/system/bin/" + name.substr(0, 1017) + "_ca_qse a");
}

// --- loading --------------------------------------------------------------------------

TEST(LoadedPlan, IsOfTheDeclarationAndWhatStandsBelow)
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
    EXPECT_THAT(run_by(plan, "A"), ElementsAre("x", "y"));
    EXPECT_EQ(run_by(plan, "A", "y"), "y");
}

TEST(LoadedPlan, MayBeInUtf16AsForTheModule)
{
    std::string text = "\xFF\xFE";
    for (const char c : plan_of(group("A", cmd("x")))) {
        text += c;
        text += '\0';
    }
    EXPECT_THAT(listed(loaded(text)), ElementsAre("A: x"));
}

TEST(LoadedPlan, LacksWhatAFileEndsWithAtABadCharacter)
{
    // without a declaration the root needs no end
    EXPECT_THAT(
        listed(loaded("<P>" + group("A", cmd("x")) + "\x01" + group("B", cmd("y")) + "</P>")),
        ElementsAre("A: x"));
    EXPECT_THAT(
        listed(loaded("<P>" + group("A", cmd("x")) + "\0"s + group("B", cmd("y")) + "</P>")),
        ElementsAre("A: x"));
    EXPECT_THAT(
        listed(loaded("<P>" + group("A", cmd("x")) + "\xFFz" + group("B", cmd("y")) + "</P>")),
        ElementsAre("A: x"));
}

TEST(LoadedPlan, IsNoneOfATextThatTheLibraryRefuses)
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
    EXPECT_FALSE(Plan::load("x"));
}

TEST(LoadedPlan, PrintsNothingAndLeavesTheLibraryAsItWas)
{
    testing::internal::CaptureStderr();
    EXPECT_FALSE(Plan::load("x"));
    EXPECT_FALSE(Plan::read("<a><b></a></b>"));
    EXPECT_TRUE(Plan::load("<a/>"));
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
    testing::internal::CaptureStderr();
    EXPECT_EQ(mxmlLoadString(nullptr, "x", nullptr), nullptr);
    EXPECT_EQ(testing::internal::GetCapturedStderr(),
              "mxml: XML does not start with '<' (saw 'x').\n");
}

// Sets a limit of this process until the end of a test.
class Limit
{
  public:
    Limit(__rlimit_resource what, rlim_t value) : what_(what)
    {
        getrlimit(what_, &before_);
        const rlimit limit = {value, before_.rlim_max};
        setrlimit(what_, &limit);
    }
    Limit(const Limit &) = delete;
    Limit &operator=(const Limit &) = delete;
    ~Limit()
    {
        setrlimit(what_, &before_);
    }

  private:
    __rlimit_resource what_;
    rlimit before_{};
};

TEST(LoadedPlan, MayHaveDescriptorZero)
{
    const int kept = dup(STDIN_FILENO);
    close(STDIN_FILENO);
    const auto plan = Plan::load("<P/>");
    dup2(kept, STDIN_FILENO);
    close(kept);
    EXPECT_TRUE(plan);
}

TEST(LoadedPlan, NeedsRoomInMemory)
{
    std::signal(SIGXFSZ, SIG_IGN);
    {
        const Limit small(RLIMIT_FSIZE, 10);
        EXPECT_TRUE(Plan::load("<P></P>"));
        EXPECT_THROW(Plan::load("<P>       </P>"), std::system_error);
    }
    std::signal(SIGXFSZ, SIG_DFL);
    EXPECT_TRUE(Plan::load("<P>       </P>"));
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
    EXPECT_THAT(run_by(plan, "A"), IsEmpty());
    EXPECT_EQ(run_by(plan, "A", "x"), "-");
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

TEST(Groups, HaveNumbersOfElements)
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

// --- what a group's path runs -----------------------------------------------------------

TEST(GroupPath, RunsEveryItemInOrder)
{
    const Plan plan = loaded(
        plan_of("\n" + group("A", "\n\t" + cmd("x") + " \r\n" + cmd("y")) + group("B", cmd("z"))));
    EXPECT_THAT(run_by(plan, "A"), ElementsAre("x", "y"));
    EXPECT_THAT(run_by(plan, "B"), ElementsAre("z"));
}

TEST(GroupPath, RunsNothingOfAGroupThatIsNotThereOrEmpty)
{
    const Plan plan = loaded(plan_of(group("A", "") + group("B", cmd("z"))));
    EXPECT_THAT(run_by(plan, "C"), IsEmpty());
    EXPECT_THAT(run_by(plan, "A"), IsEmpty());
}

TEST(GroupPath, GivesOneMoreCallForACommentInFront)
{
    const Plan plan =
        loaded(plan_of(group("A", "<!-- c -->" + cmd("x") + cmd("y")) + group("B", cmd("z"))));
    EXPECT_THAT(run_by(plan, "A"), ElementsAre("x", "y", "-"));
}

TEST(GroupPath, FindsNothingToRunInACommentBetweenItems)
{
    const Plan plan = loaded(plan_of(group("A", cmd("x") + "<!-- c -->" + cmd("y"))));
    EXPECT_THAT(run_by(plan, "A"), ElementsAre("x", "-", "y"));
}

TEST(GroupPath, CountsEveryWord)
{
    const Plan plan = loaded(plan_of(group("A", " two words " + cmd("x"))));
    EXPECT_THAT(run_by(plan, "A"), ElementsAre("x", "-", "-"));
}

TEST(GroupPath, DoesNotCountBlanksWrittenAsReferences)
{
    EXPECT_THAT(run_by(loaded(plan_of(group("A", "&#32;&#9;" + cmd("x")))), "A"), ElementsAre("x"));
    EXPECT_THAT(run_by(loaded(plan_of(group("A", "&#160;" + cmd("x")))), "A"),
                ElementsAre("x", "-"));
}

TEST(GroupPath, RunsAnElementOfAnotherNameThatHasAName)
{
    const Plan plan =
        loaded(plan_of(group("A", cmd("x") + "<Task name=\"t\" args=\"1\"/>" + cmd("y"))));
    EXPECT_THAT(run_by(plan, "A"), ElementsAre("x", "t", "y"));
    EXPECT_EQ(plan.run_by("A")[1]->tag, "Task");
    EXPECT_EQ(plan.run_by("A")[1]->args, "1");
}

TEST(GroupPath, BeginsWithTheFirstItem)
{
    const Plan plan = loaded(plan_of(group("A", "<Task name=\"t\"/>" + cmd("x"))));
    EXPECT_THAT(run_by(plan, "A"), ElementsAre("x", "-"));
}

TEST(GroupPath, DoesNotRunAnItemWithoutAName)
{
    const Plan plan = loaded(plan_of(group("A", "<Cmd/>" + cmd("") + cmd("x"))));
    EXPECT_THAT(run_by(plan, "A"), ElementsAre("-", "-", "x"));
}

TEST(GroupPath, TakesItemsOfTheNextGroupWhereTheGroupHasNone)
{
    const Plan plan = loaded(
        plan_of(group("A", "<!-- c --><!-- d --><!-- e -->") + group("B", cmd("x") + cmd("y"))));
    EXPECT_THAT(run_by(plan, "A"), ElementsAre("x", "y", "-"));
}

TEST(GroupPath, GoesThroughTheSiblingsOfANestedItemThatIsFirst)
{
    const Plan plan = loaded(plan_of(group("A", "<S>" + cmd("x") + cmd("y") + "</S>" + cmd("z"))));
    EXPECT_THAT(run_by(plan, "A"), ElementsAre("x", "y"));
}

TEST(GroupPath, HoldsSixtyThreeCharactersOfAName)
{
    const std::string name(63, 'n');
    const Plan plan = loaded(plan_of(group(name, cmd("x")) + group(name + "o", cmd("y"))));
    EXPECT_THAT(run_by(plan, name), ElementsAre("x"));
    EXPECT_THAT(run_by(plan, name + "o"), ElementsAre("x"));
}

TEST(GroupPath, OfANameWithASlashIsAnItems)
{
    const Plan plan = loaded(plan_of(group("a/b", cmd("x")) + group("a", cmd("y") + cmd("b")) +
                                     group("c/", cmd("z")) + group("c", cmd("w"))));
    EXPECT_THAT(run_by(plan, "a/b"), ElementsAre("b"));
    EXPECT_THAT(run_by(plan, "a/q"), ElementsAre("-"));
    EXPECT_THAT(run_by(plan, "c/"), ElementsAre("w"));
    EXPECT_THAT(run_by(plan, "//a//b//c"), ElementsAre("b"));
}

TEST(GroupPath, IsCutAtAColonATabALineFeedAndAZeroByte)
{
    const Plan plan = loaded(plan_of(group("a", cmd("y")) + group("a&#58;b", cmd("x"))));
    EXPECT_THAT(run_by(plan, "a:b"), ElementsAre("y"));
    EXPECT_THAT(run_by(plan, "a\tb"), ElementsAre("y"));
    EXPECT_THAT(run_by(plan, "a\nb"), ElementsAre("y"));
    EXPECT_THAT(run_by(plan, "a\0b"s), ElementsAre("y"));
    EXPECT_THAT(run_by(plan, "\ta"), IsEmpty());
}

TEST(GroupPath, OfAnEmptyNameRunsNothing)
{
    EXPECT_THAT(run_by(loaded(plan_of(group("", cmd("x")))), ""), IsEmpty());
    EXPECT_THAT(run_by(loaded(plan_of(group("", cmd("x")))), "/"), IsEmpty());
}

// --- what an item's path runs -----------------------------------------------------------

TEST(ItemPath, RunsTheItem)
{
    const Plan plan = loaded(plan_of(group("A", cmd("x") + cmd("y")) + group("B", cmd("x"))));
    EXPECT_EQ(plan.run_by("A", "x")->number, 3U);
    EXPECT_EQ(plan.run_by("A", "y")->number, 4U);
    EXPECT_EQ(plan.run_by("B", "x")->number, 6U);
}

TEST(ItemPath, RunsNothingWhereGroupOrItemIsNotThere)
{
    const Plan plan = loaded(plan_of(group("A", cmd("x"))));
    EXPECT_EQ(run_by(plan, "B", "x"), "-");
    EXPECT_EQ(run_by(plan, "A", "y"), "-");
    EXPECT_EQ(run_by(plan, "A", ""), "-");
    EXPECT_EQ(run_by(plan, "", "x"), "-");
}

TEST(ItemPath, IsShiftedByWhatStandsInFrontOfTheItem)
{
    const Plan plan = loaded(plan_of(group("A", "<!-- c -->" + cmd("x") + cmd("y") + cmd("z"))));
    EXPECT_EQ(run_by(plan, "A", "x"), "y");
    EXPECT_EQ(run_by(plan, "A", "y"), "z");
    EXPECT_EQ(run_by(plan, "A", "z"), "-");
}

TEST(ItemPath, IsNotShiftedByACommentBetweenItems)
{
    const Plan plan = loaded(plan_of(group("A", cmd("x") + "<!-- c -->" + cmd("y"))));
    EXPECT_EQ(run_by(plan, "A", "x"), "x");
    EXPECT_EQ(run_by(plan, "A", "y"), "y");
}

TEST(ItemPath, TakesThePositionOfAnItemOfALaterGroup)
{
    const Plan plan = loaded(
        plan_of(group("A", cmd("x") + cmd("y")) + group("B", cmd("p") + cmd("q") + cmd("r"))));
    EXPECT_EQ(run_by(plan, "A", "p"), "x");
    EXPECT_EQ(run_by(plan, "A", "q"), "y");
    EXPECT_EQ(run_by(plan, "A", "r"), "-");
    EXPECT_EQ(run_by(plan, "B", "x"), "-"); // those of earlier groups are not found
}

TEST(ItemPath, CountsFromTheNextGroupsFirstItemWhereTheGroupHasNone)
{
    const Plan plan = loaded(plan_of(group("A", "") + group("B", cmd("p") + cmd("q"))));
    EXPECT_EQ(run_by(plan, "A", "q"), "q");
}

TEST(ItemPath, CountsANestedItemAmongItsOwnSiblings)
{
    const Plan plan = loaded(plan_of(group("A", cmd("x") + "<S>" + cmd("y") + cmd("z") + "</S>")));
    EXPECT_EQ(run_by(plan, "A", "y"), "x");
    EXPECT_EQ(run_by(plan, "A", "z"), "-"); // the element S, which has no name
}

TEST(ItemPath, FindsTheFirstOfItsName)
{
    const Plan plan = loaded(plan_of(group("A", cmd("x") + cmd("y") + cmd("x"))));
    EXPECT_EQ(plan.run_by("A", "x")->number, 3U);
}

TEST(ItemPath, HoldsSixtyThreeCharactersOfAName)
{
    const std::string name(63, 'n');
    const Plan plan = loaded(plan_of(group("A", cmd(name + "o") + cmd(name))));
    EXPECT_EQ(plan.run_by("A", name)->number, 4U);
    EXPECT_EQ(plan.run_by("A", name + "o")->number, 4U);
}

TEST(ItemPath, HoldsTwoThousandAndFortySevenBytes)
{
    const Plan plan = loaded(plan_of(group(std::string(63, 'g'), cmd("x") + cmd("xy"))));
    // root/, the group, a '/' and the item
    EXPECT_EQ(run_by(plan, std::string(2047 - 5 - 1 - 2, 'g'), "xy"), "xy");
    EXPECT_EQ(run_by(plan, std::string(2047 - 5 - 1 - 1, 'g'), "xy"), "x");
    EXPECT_EQ(run_by(plan, std::string(2047 - 5 - 1, 'g'), "xy"), "-");
}

TEST(ItemPath, IgnoresWhatStandsAfterASlash)
{
    const Plan plan = loaded(plan_of(group("A", cmd("y") + cmd("x"))));
    EXPECT_EQ(run_by(plan, "A", "x/y"), "x");
    EXPECT_EQ(run_by(plan, "A", "/x/"), "x");
    EXPECT_EQ(run_by(plan, "A/y", "x"), "y");
}

TEST(ItemPath, IsCutAtAColonATabAndALineFeed)
{
    const Plan plan = loaded(plan_of(group("A", cmd("y") + cmd("x"))));
    EXPECT_EQ(run_by(plan, "A", "x:y"), "x");
    EXPECT_EQ(run_by(plan, "A", "x\ty"), "x");
    EXPECT_EQ(run_by(plan, "A", "x\ny"), "x");
    EXPECT_EQ(run_by(plan, "A:", "x"), "-");
}

// --- the library's own lookups -----------------------------------------------------------

mxml_node_t *module_item(mxml_node_t *tree, const std::string &name, int index)
{
    mxml_node_t *start =
        mxmlFindElement(tree, tree, "CmdGroup", "name", name.c_str(), MXML_DESCEND);
    if (start == nullptr) {
        return nullptr;
    }
    mxml_node_t *node = mxmlFindElement(start, tree, "Cmd", nullptr, nullptr, MXML_DESCEND);
    for (int counter = 0; node != nullptr && counter != index; ++counter) {
        node = mxmlGetNextSibling(node);
    }
    const char *item = mxmlElementGetAttr(node, "name");
    return item != nullptr && *item != '\0' ? node : nullptr;
}

int module_length(mxml_node_t *tree, const std::string &name)
{
    mxml_node_t *start =
        mxmlFindElement(tree, tree, "CmdGroup", "name", name.c_str(), MXML_DESCEND);
    int length = 0;
    for (mxml_node_t *child = mxmlGetFirstChild(start); child != nullptr;
         child = mxmlGetNextSibling(child)) {
        ++length;
    }
    return length;
}

int module_index(mxml_node_t *tree, const std::string &name, const std::string &item)
{
    mxml_node_t *start =
        mxmlFindElement(tree, tree, "CmdGroup", "name", name.c_str(), MXML_DESCEND);
    mxml_node_t *node = mxmlFindElement(start, tree, "Cmd", "name", item.c_str(), MXML_DESCEND);
    int index = node != nullptr ? 0 : -1;
    for (; node != nullptr && (node = mxmlGetPrevSibling(node)) != nullptr; ++index) {
    }
    return index;
}

TEST(Paths, RunWhatTheModulesLookupsGive)
{
    std::mt19937 random(11);
    const auto any = [&](const Names &names) { return names[random() % names.size()]; };
    const Names names = {"a", "b", "c", ""};
    int different = 0;
    for (int round = 0; round < 3000; ++round) {
        std::string content;
        Names open;
        for (std::size_t left = 4 + random() % 30; left > 0; --left) {
            const std::string attributes = random() % 8 == 0 ? "" : " name=\"" + any(names) + "\"";
            switch (random() % 12) {
            case 0:
            case 1:
                content += "<CmdGroup" + attributes + ">";
                open.emplace_back("CmdGroup");
                break;
            case 2:
                content += "<S" + attributes + ">";
                open.emplace_back("S");
                break;
            case 3:
                content += "<Cmd" + attributes + ">";
                open.emplace_back("Cmd");
                break;
            case 4:
                content += any({"<!-- c -->", " two words ", "<![CDATA[d]]>", "<?i?>", " &#32;\n"});
                break;
            case 5:
            case 6:
            case 7:
                if (!open.empty()) {
                    content += "</" + open.back() + ">";
                    open.pop_back();
                }
                break;
            default:
                content += "<Cmd" + attributes + "/>";
            }
        }
        for (; !open.empty(); open.pop_back()) {
            content += "</" + open.back() + ">";
        }
        const Plan plan =
            loaded((random() % 2 == 0 ? kDeclaration : "") + ("<P>" + content + "</P>"));
        for (const char *one : {"a", "b", "c"}) {
            std::vector<mxml_node_t *> expected;
            for (int index = 0; index < module_length(plan.top(), one); ++index) {
                expected.push_back(module_item(plan.top(), one, index));
            }
            const auto run = plan.run_by(one);
            ASSERT_EQ(run.size(), expected.size()) << content;
            for (std::size_t index = 0; index < run.size(); ++index) {
                ASSERT_EQ(run[index] ? plan.elements()[run[index]->number] : nullptr,
                          expected[index])
                    << content;
            }
            for (const char *item : {"a", "b", "c"}) {
                mxml_node_t *const node =
                    module_item(plan.top(), one, module_index(plan.top(), one, item));
                const auto found = plan.run_by(one, item);
                ASSERT_EQ(found ? plan.elements()[found->number] : nullptr, node) << content;
                different += found && found->name != item ? 1 : 0;
            }
        }
    }
    EXPECT_GT(different, 1000); // the plans were odd enough
}

// --- reading while it is written ----------------------------------------------------------

constexpr char kAnnotated[] =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<TestPlan>\n\t<CmdGroup name=\"A\">\n"
    "\t\t<Cmd name=\"x\" args=\"-a\" progress=\"100\" result=\"0\" description=\"chip "
    "&quot;7&quot; "
    "&gt;\" />\n\t\t<Cmd name=\"y\" args=\"\" progress=\"50\" result description=\"\" />\n"
    "\t\t<Cmd name=\"z\" args=\"\" progress=\"5\"\nresult=\"-2\" description />\n"
    "\t\t<Cmd name=\"w\" args=\"\" />\n</CmdGroup>\n</TestPlan>\n";

TEST(ReadPlan, TellsWhatEveryItemHasReported)
{
    const auto plan = Plan::read(kAnnotated);
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

TEST(ReadPlan, IsNoneOfATextThatIsNotWhole)
{
    const std::string text = kAnnotated;
    const std::size_t end = text.rfind('>') + 1;
    for (std::size_t size = 0; size < end; ++size) {
        EXPECT_FALSE(Plan::read(text.substr(0, size))) << size;
    }
    EXPECT_TRUE(Plan::read(text.substr(0, end)));
}

TEST(ReadPlan, IsNoneOfATextWithoutADeclarationThatIsNotWhole)
{
    const std::string text = "<P><CmdGroup name=\"A\"><Cmd name=\"x\" args=\"\" /></CmdGroup></P>";
    for (std::size_t size = 0; size < text.size(); ++size) {
        EXPECT_FALSE(Plan::read(text.substr(0, size))) << size;
    }
    EXPECT_TRUE(Plan::read(text));
    EXPECT_TRUE(Plan::read("<P />"));
    EXPECT_FALSE(Plan::read("<P /"));
}

TEST(ReadPlan, IsNoneOfATextThatTheLibraryRefuses)
{
    EXPECT_FALSE(Plan::read("<P><a></b></P>"));
    EXPECT_FALSE(Plan::read("</P>"));
    EXPECT_FALSE(Plan::read("text"));
}

TEST(ReadPlan, ShowsControlCharactersAndBytesThatAreNoUtf8)
{
    const auto plan =
        Plan::read("<P><CmdGroup name=\"A\"><Cmd name=\"x\" description=\"a\x01\x1B\xFF"
                   "b\0c\"/></CmdGroup></P>"s);
    ASSERT_TRUE(plan);
    EXPECT_EQ(plan->groups()[0].items[0].report.description, "a\u2401\u241B\uFFFD"
                                                             "b\u2400c");
}

TEST(ReadPlan, KeepsLineFeedsAndTabsOfADescription)
{
    const auto plan =
        Plan::read("<P><CmdGroup name=\"A\"><Cmd name=\"x\" description=\"a\n\tb\r\"/>"
                   "</CmdGroup></P>");
    ASSERT_TRUE(plan);
    EXPECT_EQ(plan->groups()[0].items[0].report.description, "a\n\tb\r");
}

TEST(ReadPlan, TakesOtherAttributesWithoutValueForEmptyOnes)
{
    const auto plan =
        Plan::read("<P><CmdGroup name=\"A\"><Cmd name=\"x\" args progress/></CmdGroup></P>");
    ASSERT_TRUE(plan);
    EXPECT_EQ(plan->groups()[0].items[0].args, "");
    EXPECT_EQ(plan->groups()[0].items[0].report.progress, "");
    EXPECT_FALSE(plan->groups()[0].items[0].report.result_without_value);
}

TEST(ReadPlan, TellsAlsoOfTheTop)
{
    const auto plan = Plan::read("<Cmd name=\"x\" result/>");
    ASSERT_TRUE(plan);
    EXPECT_TRUE(plan->report(0).result_without_value);
}

TEST(ReadPlan, TellsAnEmptyResultFromOneWithoutValue)
{
    const auto plan =
        Plan::read("<P><CmdGroup name=\"A\"><Cmd name=\"x\" result=\"\"/></CmdGroup></P>");
    ASSERT_TRUE(plan);
    EXPECT_EQ(plan->groups()[0].items[0].report,
              (ItemReport{std::nullopt, "", false, std::nullopt}));
}

// --- places of elements ---------------------------------------------------------------------

TEST(ElementTags, BelongToTheElementsOneByOne)
{
    const std::string text = "<?xml version=\"1.0\"?><!DOCTYPE P><P><!-- c -->text<![CDATA[d]]>"
                             "<?e f?><Cmd /></P>";
    std::vector<std::string> places;
    for (const Tag &tag : fptest::element_tags(loaded(text), text)) {
        places.push_back(text.substr(tag.begin, tag.end - tag.begin));
    }
    EXPECT_THAT(places, ElementsAre("<?xml version=\"1.0\"?>", "<!DOCTYPE P>", "<P>", "<!-- c -->",
                                    "<![CDATA[d]]>", "<?e f?>", "<Cmd />"));
}

TEST(ElementTags, AreNoneWhereTheTextHasOthers)
{
    const Plan plan = loaded("<P><a/><b/></P>");
    EXPECT_THAT(fptest::element_tags(plan, "<P><a/><b/></P>"), testing::SizeIs(3));
    EXPECT_THAT(fptest::element_tags(plan, "<P><a/><c/></P>"), IsEmpty());
    EXPECT_THAT(fptest::element_tags(plan, "<P><a/></P>"), IsEmpty());
    EXPECT_THAT(fptest::element_tags(plan, "<P><a/><b/><c/></P>"), IsEmpty());
    EXPECT_THAT(fptest::element_tags(plan, "<P><a/><!-- b --></P>"), IsEmpty());
    EXPECT_THAT(fptest::element_tags(loaded("<P><!-- b --></P>"), "<P><?b?></P>"), IsEmpty());
    EXPECT_THAT(fptest::element_tags(loaded("<P><!-- b --></P>"), "<P><![CDATA[b]]></P>"),
                IsEmpty());
    EXPECT_THAT(fptest::element_tags(loaded("<P><?b?></P>"), "<P><!b></P>"), IsEmpty());
    EXPECT_THAT(fptest::element_tags(plan, ""), IsEmpty());
}

TEST(ElementTags, FollowTheLibraryThroughItsOddities)
{
    for (const std::string text :
         {"<P><!----><a/><!-- b --><c/></P>", "<!DOCTYPE P [<!ELEMENT P ANY>]><P><c/></P>",
          "<P><!-- a ---> b --><c/></P>", "<P><a b='<c>'/><c d=\"/>\"/></P>",
          "<?xml?><P/><P/><!-- c -->"}) {
        const Plan plan = loaded(text);
        EXPECT_EQ(fptest::element_tags(plan, text).size(), plan.elements().size()) << text;
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
    const Plan plan = loaded(file_text(std::string(QUILLMARK_SOURCE_DIR) + "/plans/demo.xml"));
    EXPECT_THAT(listed(plan), ElementsAre("Bringup: SpiCheck DeadPixel FingerWait QuietRun",
                                          "Gather: SensorProbe", "Endurance: BurnIn"));
    for (const Plan::Group &one : plan.groups()) {
        const auto run = plan.run_by(one.name);
        ASSERT_EQ(run.size(), one.items.size());
        for (std::size_t index = 0; index < run.size(); ++index) {
            ASSERT_TRUE(run[index]);
            EXPECT_EQ(run[index]->number, one.items[index].number);
            EXPECT_EQ(plan.run_by(one.name, *one.items[index].name)->number,
                      one.items[index].number);
        }
    }
}

} // namespace
