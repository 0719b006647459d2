// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What a node path runs, by the library itself and as the agent's Plan tells it: one
// table for both.
#include "plan/plan.h"
#include "unit_test.h"

#include <algorithm>
#include <optional>
#include <ostream>
#include <random>
#include <sstream>
#include <string_view>

using fptest::Plan;

namespace
{

// A plan in shorthand, its parts separated by blanks: "A(" a group and ")" its end,
// "x" an item, "?" one without a name, "!c" a comment, "'w'" words; tags, references
// and white space other than blanks are as they are. Items get numbers, from 1, for
// their arguments.
std::string plan_from(std::string_view shorthand)
{
    std::string text = "<?xml version=\"1.0\"?>\n<Plan>";
    int items = 0;
    while (!shorthand.empty()) {
        const char first = shorthand.front();
        std::size_t end = first == '<' ? shorthand.find('>') + 1
                          : first == '\''
                              ? shorthand.find('\'', 1) + 1
                              : std::min(shorthand.find_first_of(" \t\r\n()"), shorthand.size());
        const std::string part(shorthand.substr(0, end));
        if (shorthand.substr(end, 1) == "(") {
            text += "<CmdGroup name=\"" + part + "\">";
            ++end;
        } else if (part.empty()) {
            text += first == ')' ? "</CmdGroup>" : first == ' ' ? "" : std::string(1, first);
            end = 1;
        } else if (first == '!') {
            text += "<!--" + part.substr(1) + "-->";
        } else if (first == '\'') {
            text += " " + part.substr(1, end - 2) + " ";
        } else if (first == '<' || first == '&') {
            text += part;
        } else {
            text += "<Cmd" + (part != "?" ? " name=\"" + part + "\"" : "") + " args=\"" +
                    std::to_string(++items) + "\"/>";
        }
        shorthand.remove_prefix(end);
    }
    return text + "</Plan>\n";
}

// "NAME ARGUMENTS" for each call of the library that runs an item, "-" for others.
struct Ran {
    Lines runs;
    bool by_item = false; // the path named one

    bool operator==(const Ran &) const = default;
};

Ran by_library(const std::string &plan, const std::string &path)
{
    internals::reset();
    platform::reset();
    platform::write_plan(plan);
    FPTEST_RunTestCmd(("XMLNodePath::root/" + path).c_str(), nullptr, 0);
    Ran ran;
    const std::string program = "system(/system/bin/";
    for (const std::string &event : platform::events()) {
        ran.by_item = ran.by_item || event.starts_with("get_node_index|");
        if (event.starts_with("stdout: vendor")) {
            ran.runs.emplace_back("-");
        } else if (event.starts_with(program)) {
            ran.runs.back() = event.substr(program.size(), event.size() - program.size() - 1);
        }
    }
    return ran;
}

std::string shown(const std::optional<Plan::Element> &element)
{
    return element ? *element->name + " " + element->args.value_or("(null)") : "-";
}

// The same as the agent tells it, whether it is asked by one name or by two.
Lines by_agent(const std::string &text, const std::string &path, bool by_item)
{
    const auto plan = Plan::load_as_library(text);
    if (!plan) {
        return {"not loaded"};
    }
    Lines runs;
    for (const auto &element : plan->resolve(path)) {
        runs.push_back(shown(element));
    }
    if (const auto slash = path.find('/'); slash != path.npos) {
        EXPECT_EQ(shown(plan->resolve(path.substr(0, slash), path.substr(slash + 1))),
                  by_item ? runs.at(0) : "-");
    }
    return runs;
}

struct PathCase {
    const char *what;
    std::string plan; // in shorthand
    std::string path; // after the root
    std::string runs; // names, or "-"; "x#2" is the second item of the plan
};

void PrintTo(const PathCase &one, std::ostream *out)
{
    *out << one.plan << ", " << one.path;
}

class Path : public LibraryTest, public ::testing::WithParamInterface<PathCase>
{
};

TEST_P(Path, RunsTheSameByTheLibraryAndTheAgent)
{
    const std::string plan = plan_from(GetParam().plan);
    const auto [runs, by_item] = by_library(plan, GetParam().path);
    EXPECT_EQ(by_agent(plan, GetParam().path, by_item), runs);

    std::istringstream expected(GetParam().runs);
    std::string names;
    for (const std::string &run : runs) {
        std::string one;
        expected >> one;
        const std::size_t end = one.find('#') != one.npos ? run.size() : run.find(' ');
        std::string name = run.substr(0, end);
        std::replace(name.begin(), name.end(), ' ', '#');
        names += (names.empty() ? "" : " ") + name;
    }
    EXPECT_EQ(names, GetParam().runs);
}

const std::string k62(62, 'n');
const std::string k63 = k62 + "n";
const std::string k64 = k63 + "o";

const PathCase kCases[] = {
    // what a group's path runs
    {"GroupRunsEveryItemInOrder", "A(x y) B(z)", "A", "x y"},
    {"SecondGroupRunsItsOwn", "A(x y) B(z)", "B", "z"},
    {"UnknownGroupRunsNothing", "A(x) B(z)", "C", ""},
    {"GroupsAreToldByCase", "A(x)", "a", ""},
    {"GroupNameIsTakenWhole", "AB(x)", "A", ""},
    {"LongerGroupNameIsAnother", "A(x)", "AB", ""},
    {"EmptyGroupRunsNothing", "A() B(z)", "A", ""},
    {"OtherElementsAreNoGroups", "<Group name='A'> x </Group> <cmdgroup name='A'> y </cmdgroup>",
     "A", ""},
    {"ItemIsNoGroup", "<Cmd name='A'> x </Cmd> A(y)", "A", "y"},
    {"GroupOfAnotherAttributeIsNone", "<CmdGroup title='A'> x </CmdGroup>", "A", ""},
    {"FirstGroupOfANameIsMeant", "B() A(x) A(y)", "A", "x"},
    {"GroupDeepInThePlanIsFound", "<S> <T> A(x y) </T> </S> B(z)", "A", "x y"},
    {"FirstGroupIsTheFirstOfTheDocument", "<S> A(x) </S> A(y z)", "A", "x"},
    {"CommentInFrontAddsOneEmptyCall", "A(!c x y) B(z)", "A", "x y -"},
    {"CommentBetweenItemsIsAnEmptyCall", "A(x !c y)", "A", "x - y"},
    {"EveryWordCounts", "A('two words' x)", "A", "x - -"},
    {"WordBetweenItemsIsAnEmptyCall", "A(x 'w' !c y)", "A", "x - - y"},
    {"BlanksWrittenAsReferencesDoNotCount", "A(&#32;&#9; x)", "A", "x"},
    {"OtherBlanksAreWords", "A(&#160; x)", "A", "x -"},
    {"LayoutDoesNotCount", "<CmdGroup name='A'\n> \n\t x \r\n y </CmdGroup>", "A", "x y"},
    {"NamedElementOfAnotherKindRuns", "A(x <Task name='t' args='7'/> y)", "A", "x t#7 y"},
    {"RunBeginsWithTheFirstItem", "A(<Task name='t'/> x y)", "A", "x y -"},
    {"ItemWithoutANameIsAnEmptyCall", "A(? <Cmd name=''/> x)", "A", "- - x"},
    {"GroupOfCommentsTakesTheNextOnesItems", "A(!c !d !e) B(x y)", "A", "x y -"},
    {"GroupOfOtherElementsTakesTheNextOnesItems", "A(<Task name='t'/>) B(x)", "A", "x"},
    {"LastGroupOfOtherElementsRunsNothing", "A(x) B(<Task name='t'/>)", "B", "-"},
    {"NestedFirstItemLeadsThroughItsSiblings", "A(<S> x y </S> z)", "A", "x y"},
    {"GroupInAGroupIsOneOfItsNodes", "A(x <CmdGroup name='t' args='7'> y </CmdGroup> z)", "A",
     "x t#7 z"},
    {"GroupInAGroupIsAGroup", "A(x B(y z) w)", "B", "y z"},
    {"GroupNameHoldsSixtyThreeCharacters", k63 + "(x) " + k64 + "(y)", k64, "x"},
    {"GroupNameOfSixtyTwoCharactersIsAnother", k62 + "(x) " + k63 + "(y)", k63, "y"},
    {"GroupNameWithASlashIsAnItems", "a/b(x) a(y b)", "a/b", "b"},
    {"UnknownItemAfterASlashIsAnEmptyCall", "a/b(x) a(y b)", "a/q", "-"},
    {"SlashAtTheEndDoesNotMatter", "c/(z) c(w)", "c/", "w"},
    {"SlashesAroundNamesDoNotMatter", "a(y b)", "//a//b//c", "b"},
    {"PathIsCutAtAColon", "a(y) <CmdGroup name='a&#58;b'> x </CmdGroup>", "a:b", "y"},
    {"PathIsCutAtATab", "a(y)", "a\tb", "y"},
    {"PathIsCutAtALineFeed", "a(y)", "a\nb", "y"},
    {"PathOfATabIsTheRootAlone", "a(y)", "\ta", ""},
    {"EmptyGroupNameRunsNothing", "(x) <CmdGroup name=''> y </CmdGroup>", "", ""},
    {"GroupNameOfASlashRunsNothing", "<CmdGroup name=''> y </CmdGroup>", "/", ""},
    {"NothingBeforeASlashIsNoName", "x(y) A(x)", "/x", "y"},
    {"BlanksInNamesStand", "<CmdGroup name=' a group '> x </CmdGroup>", " a group ", "x"},
    {"BlanksInNamesAreNotTrimmed", "<CmdGroup name=' a group '> x </CmdGroup>", "a group", ""},
    // what an item's path runs
    {"ItemRunsAlone", "A(x y) B(x)", "A/y", "y#2"},
    {"FirstItemRunsAlone", "A(x y) B(x)", "A/x", "x#1"},
    {"ItemOfTheNamedGroupComesFirst", "A(x y) B(z x)", "B/x", "x#4"},
    {"UnknownItemIsAnEmptyCall", "A(x)", "A/y", "-"},
    {"ItemsAreToldByCase", "A(x)", "A/X", "-"},
    {"ItemNameIsTakenWhole", "A(xy)", "A/x", "-"},
    {"LongerItemNameIsAnother", "A(x)", "A/xy", "-"},
    {"ItemOfAnUnknownGroupIsAnEmptyCall", "A(x)", "B/x", "-"},
    {"OtherElementsAreNoItems", "A(<cmd name='x'/> <Cmds name='x'/> <Cm name='x'/> y)", "A/x", "-"},
    {"ItemOfAnotherAttributeIsNone", "A(<Cmd title='x'/> <Cmd Name='x'/> y)", "A/x", "-"},
    {"CommentInFrontShiftsTheItem", "A(!c x y z)", "A/x", "y"},
    {"CommentInFrontShiftsTheLastItemAway", "A(!c x y z)", "A/z", "-"},
    {"EveryNodeInFrontShifts", "A('two words' <Task name='o'/> !c v w x y z)", "A/v", "z"},
    {"CommentBetweenItemsShiftsNothing", "A(x !c y)", "A/y", "y"},
    {"ItemOfALaterGroupGivesItsPosition", "A(x y) B(p q r)", "A/q", "y"},
    {"PositionPastTheGroupIsAnEmptyCall", "A(x y) B(p q r)", "A/r", "-"},
    {"ItemOfAnEarlierGroupIsNotFound", "A(x y) B(p)", "B/x", "-"},
    {"EmptyGroupCountsFromTheNextOnesFirstItem", "A() B(p q)", "A/q", "q"},
    {"NestedItemCountsAmongItsOwnSiblings", "A(x <S> y z </S>)", "A/y", "x"},
    {"PositionOfANamelessElementIsAnEmptyCall", "A(x <S> y z </S>)", "A/z", "-"},
    {"ItemAfterANestedGroupIsFound", "A(x B(y z) w)", "B/w", "-"},
    {"FirstItemOfANameRuns", "A(w x y x)", "A/x", "x#2"},
    {"ItemNameHoldsSixtyThreeCharacters", "A(" + k64 + " " + k63 + ")", "A/" + k64, k63},
    {"FourthComponentIsIgnored", "A(y x)", "A/x/y", "x"},
    {"SlashesAroundAnItemDoNotMatter", "A(y x)", "A//x/", "x"},
    {"ItemPathIsCutAtAColon", "A(y x)", "A/x:y", "x"},
    {"ItemPathIsCutAtATab", "A(y x)", "A/x\ty", "x"},
    {"ItemPathIsCutAtALineFeed", "A(y x)", "A/x\ny", "x"},
    {"GroupCutAtAColonRunsTheGroup", "A(y x)", "A:/x", "y x"},
    // 2047 bytes: root/, the group, a '/' and the item
    {"PathHoldsTwoThousandFortySevenBytes", k63 + "(x xy)",
     std::string(2047 - 5 - 1 - 2, 'n') + "/xy", "xy"},
    {"PathOfOneByteMoreIsCut", k63 + "(x xy)", std::string(2047 - 5 - 1 - 1, 'n') + "/xy", "x"},
    {"PathOfTwoBytesMoreLosesTheItem", k63 + "(x xy)", std::string(2047 - 5 - 1, 'n') + "/xy",
     "x xy"},
};

INSTANTIATE_TEST_SUITE_P(Every, Path, ::testing::ValuesIn(kCases),
                         [](const auto &one) { return std::string(one.param.what); });

TEST_F(Path, TopOfADocumentIsNoGroup)
{
    const std::string text =
        "<CmdGroup name=\"A\"><Cmd name=\"x\" args=\"1\"/>"
        "<CmdGroup name=\"B\"><Cmd name=\"y\" args=\"2\"/></CmdGroup></CmdGroup>";
    for (const auto &[path, ran] :
         {std::pair{"A", Ran{}}, {"A/x", Ran{{"-"}, true}}, {"B", Ran{{"y 2"}}}}) {
        EXPECT_EQ(by_library(text, path), ran) << path;
        EXPECT_EQ(by_agent(text, path, ran.by_item), ran.runs) << path;
    }
}

// --- plans at random -----------------------------------------------------

std::string random_plan(std::mt19937 &random)
{
    const auto any = [&](const Lines &texts) { return texts[random() % texts.size()]; };
    std::string content;
    Lines open;
    int elements = 0;
    for (std::size_t left = 4 + random() % 30; left > 0; --left) {
        const std::string attributes =
            (random() % 8 == 0 ? "" : " name=\"" + any({"a", "b", "c", ""}) + "\"") + " args=\"" +
            std::to_string(++elements) + "\"";
        const Lines kinds = {"CmdGroup", "CmdGroup", "S", "Cmd"};
        if (const std::size_t kind = random() % 12; kind < kinds.size()) {
            content += "<" + kinds[kind] + attributes + ">";
            open.push_back(kinds[kind]);
        } else if (kind == 4) {
            content += any({"<!-- c -->", " two words ", "<![CDATA[d]]>", "<?i?>", " &#32;\n"});
        } else if (kind < 8) {
            if (!open.empty()) {
                content += "</" + open.back() + ">";
                open.pop_back();
            }
        } else {
            content += "<Cmd" + attributes + "/>";
        }
    }
    for (; !open.empty(); open.pop_back()) {
        content += "</" + open.back() + ">";
    }
    return (random() % 2 == 0 ? "<?xml version=\"1.0\"?>\n" : "") + ("<P>" + content + "</P>");
}

// Its arguments, which no two elements share; "-" if it runs nothing.
std::string number_of(mxml_node_t *node)
{
    const char *name = mxmlElementGetAttr(node, "name");
    return name != nullptr && *name != '\0' ? mxmlElementGetAttr(node, "args") : "-";
}
std::string number_of(const std::optional<Plan::Element> &element)
{
    return element ? *element->args : "-";
}

TEST_F(Path, OfAnyPlanIsToldByThePlanAsTheLibraryLooksItUp)
{
    std::mt19937 random(11);
    int different = 0;
    platform::state().recording = false;
    for (int round = 0; round < 300; ++round) {
        const std::string text = random_plan(random);
        mxml_node_t *const tree = load_plan(text);
        const auto plan = Plan::load_as_library(text);
        ASSERT_TRUE(plan) << text;
        for (const char *group : {"a", "b", "c"}) {
            Lines expected;
            for (int index = 0; index < internals::get_node_length(group, 2); ++index) {
                expected.push_back(number_of(internals::get_node_byIndex(tree, group, index)));
            }
            Lines told;
            for (const auto &element : plan->resolve(group)) {
                told.push_back(number_of(element));
            }
            ASSERT_EQ(told, expected) << text;
            for (const char *item : {"a", "b", "c"}) {
                const auto found = plan->resolve(group, item);
                const int index = internals::get_node_index(group, item, 3);
                ASSERT_EQ(number_of(found),
                          number_of(internals::get_node_byIndex(tree, group, index)))
                    << text;
                different += found && found->name != item ? 1 : 0;
            }
        }
    }
    EXPECT_GT(different, 100); // the plans were odd enough
}

} // namespace
