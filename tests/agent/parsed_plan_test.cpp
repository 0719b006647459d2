// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// That a plan whose text changes says what that text says when it is parsed anew.
#include "plan/parsed_plan.h"
#include "plan/plan_text.h"

#include <gtest/gtest.h>

using namespace fptest;

namespace
{

std::string in_plan(const std::string &items)
{
    return "<?xml version=\"1.0\"?>\n<!-- one -->\n<P>\n<CmdGroup name=\"A\">" + items +
           "</CmdGroup>\n</P>\n";
}

const std::string kItemsAsStored = "<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" />";

// After kItemsAsStored, each a change of its own.
const std::vector<std::string> kTexts{
    in_plan(kItemsAsStored),
    in_plan("<Cmd name=\"x\" args=\"-a\" progress=\"100\" result=\"0\"/>\n"
            "<Cmd name=\"y\" args=\"\" />"),
    in_plan("<Cmd fptest-run=\"m\" name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" description=\"7 &gt; "
            "&quot;6&quot; &#x41; \xC2\xB5 > &amp;\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" result=\"1\" "
            "description=\"\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" result description=\"\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" description=\"\xC2\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" description=\"\x01\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" description=\"\xEF\xBF\xBE"
            "\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" description=\"a\nb\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" result='0' result='1' />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" result = 0 />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" 'result'=\"0\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" result=\"0 />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"/><Cmd name='z'\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" /><Cmd name=\"z\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" ></Cmd>"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" result=\"0\"></Cmd>"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" /></Cmd>"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\" >"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y\" args=\"\"/>b\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Cmd name=\"y2\" args=\"\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\n<Note name=\"y\" args=\"\" />"),
    in_plan("<Cmd name=\"x\" args=\"-b\"/>\n<Cmd name=\"y\" args=\"b\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>\ntext <Cmd name=\"y\" args=\"\" />"),
    in_plan("<Cmd name=\"x\" args=\"-a\"/>"),
    in_plan(kItemsAsStored) + "<!-- more -->",
    in_plan(kItemsAsStored).substr(0, 60),
    "\xEF\xBB\xBF" + in_plan(kItemsAsStored),
    "<!-- other -->" + in_plan(kItemsAsStored).substr(22),
    "<P/>",
    "<P a=\"1\"/>",
    "text",
    "",
};

// All that a text comes to.
std::string seen_in(const ParsedPlan &parsed)
{
    std::string seen = parsed.is_sound() ? "sound: " : "not sound: ";
    const auto plan = parsed.annotated();
    for (std::size_t number = 0; plan && number < plan->elements().size(); ++number) {
        mxml_node_t *const node = plan->elements()[number];
        seen += '<' + std::string(mxmlGetElement(node));
        for (int index = 0; index < mxmlElementGetAttrCount(node); ++index) {
            const char *name = nullptr;
            const char *value = mxmlElementGetAttrByIndex(node, index, &name);
            seen +=
                std::string(" ") + name + (value != nullptr ? "='" + std::string(value) + "'" : "");
        }
        seen += '>';
    }
    for (const char *item : {"x", "y", "y2"}) {
        const auto found = plan ? plan->resolve("A", item) : std::nullopt;
        seen += found ? std::string(item) + " is " + std::to_string(found->number) : "";
    }
    return parsed.text() + "\n" + seen + (plan ? "" : "not whole");
}

TEST(ParsedPlan, SaysAfterEachChangeWhatTheTextSays)
{
    for (const std::string &before : kTexts) {
        for (const std::string &after : kTexts) {
            ParsedPlan plan(before);
            plan.read(after);
            EXPECT_EQ(seen_in(plan), seen_in(ParsedPlan(after))) << "after\n" << before;
            plan.read(before);
            EXPECT_EQ(seen_in(plan), seen_in(ParsedPlan(before))) << "after\n" << after;
        }
    }
}

TEST(ParsedPlan, ClearedSaysWhatTheClearedTextSays)
{
    for (const std::string &text : kTexts) {
        for (const std::vector<std::size_t> &numbers : std::vector<std::vector<std::size_t>>{
                 {}, {0}, {1}, {3}, {4}, {5}, {5, 4, 5}, {4, 99}}) {
            ParsedPlan plan(text);
            const auto wanted = without_reports(text, numbers, "n");
            EXPECT_EQ(plan.clear(numbers, "n"), wanted) << text;
            EXPECT_EQ(seen_in(plan), seen_in(ParsedPlan(wanted.value_or(text))));
            plan.read(kTexts[1]);
            EXPECT_EQ(seen_in(plan), seen_in(ParsedPlan(kTexts[1]))) << "after\n" << text;
        }
    }
}

TEST(ParsedPlan, IsSoundIfNothingIsToBeMended)
{
    for (const std::string &text : kTexts) {
        EXPECT_FALSE(ParsedPlan(text).is_sound() && made_loadable(text)) << text;
    }
    EXPECT_TRUE(ParsedPlan(kTexts[1]).is_sound());
}

TEST(ParsedPlan, ParsesNothingButTheTagThatHasChanged)
{
    ParsedPlan plan(kTexts[0]);
    const Plan *const tree = plan.annotated().get();
    plan.read(kTexts[0]);
    plan.read(kTexts[1]);
    plan.read(kTexts[2]);
    plan.read(kTexts[0]);
    plan.read(kTexts[3]);
    plan.clear({4, 5}, "n");
    EXPECT_EQ(plan.annotated().get(), tree);
}

TEST(ParsedPlan, LeavesATreeThatIsInUseAsItIs)
{
    ParsedPlan plan(kTexts[1]);
    const auto held = plan.annotated();
    plan.read(kTexts[2]);
    EXPECT_EQ(held->report(4).result, "0");
    EXPECT_EQ(plan.annotated()->report(4).result, std::nullopt);
    const auto next = plan.annotated();
    plan.clear({4}, "n");
    EXPECT_EQ(attribute(next->elements()[4], kMark), "m");
}

} // namespace
