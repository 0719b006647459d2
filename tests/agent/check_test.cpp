// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The plan checker: every message as it is printed, and what must hold of it for
// whatever it is given.
#include "check/messages.h"

#include "plan/markup.h"
#include "plan/plan.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <fstream>
#include <iterator>
#include <random>
#include <set>
#include <string>
#include <string_view>
#include <vector>

using fptest::check;
using fptest::Finding;
using fptest::Plan;
using fptest::PlanUse;
using testing::HasSubstr;
using namespace std::string_literals;

namespace
{

// --- plans ------------------------------------------------------------------------

// What the library would look for, in a plan that has a root element around it.
std::string plan_of(const std::string &content)
{
    return "<P>" + content + "</P>";
}

std::string cmd(const std::string &name)
{
    return "<Cmd name=\"" + name + "\" args=\"\"/>";
}

std::string group(const std::string &name, const std::string &content)
{
    return "<CmdGroup name=\"" + name + "\">" + content + "</CmdGroup>";
}

// Items on lines of their own, from the third line on.
std::string group_of(const std::string &content)
{
    return "<P>\n<CmdGroup name=\"A\">\n" + content + "</CmdGroup>\n</P>\n";
}

std::string file_text(const std::string &path)
{
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

// --- what is printed ----------------------------------------------------------------

std::string messages(const std::string &text, PlanUse use)
{
    std::string all;
    for (const Finding &finding : check(text, use)) {
        all += fptest::Messages("p.xml", text).of(finding);
    }
    return all;
}

std::string stored(const std::string &text)
{
    return messages(text, PlanUse::stored);
}

std::string to_send(const std::string &text)
{
    return messages(text, PlanUse::to_send);
}

// --- sound plans --------------------------------------------------------------------

TEST(CheckedPlan, OfTheDemoHasNoFindings)
{
    const std::string demo = file_text(std::string(QUILLMARK_SOURCE_DIR) + "/plans/demo.xml");
    ASSERT_NE(demo, "");
    EXPECT_EQ(to_send(demo), "");
    EXPECT_EQ(stored(demo), "");
}

TEST(CheckedPlan, HasNoFindingsWithResultsInIt)
{
    EXPECT_EQ(stored("<?xml version=\"1.0\"?>\n<P>\n\t<CmdGroup name=\"A\">\n\t\t<Cmd name=\"x\" "
                     "args=\"\" progress=\"100\" result=\"-2\" description=\"12:30\" />\n"
                     "</CmdGroup>\n</P>\n"),
              "");
}

TEST(CheckedPlan, HasNoFindingsForWhatStandsOutsideOfGroups)
{
    EXPECT_EQ(
        to_send("<?xml version=\"1.0\"?><!-- a --><!DOCTYPE P><P>text <!-- b --><S name=\"s\"/>" +
                group("A", cmd("x")) + "<![CDATA[c]]><T>" + group("B", cmd("y")) +
                "</T></P><!-- d --><?e f?>\r\n"),
        "");
}

TEST(CheckedPlan, HasNoFindingsForItemsOfTheSameNameInEveryGroup)
{
    EXPECT_EQ(to_send(plan_of(group("A", cmd("x") + cmd("y")) + group("B", cmd("y") + cmd("x")))),
              "");
}

TEST(CheckedPlan, HasNoFindingsAtTheLimits)
{
    const std::string name(63, 'g');
    const std::string item(28, 'i');
    const std::string args(1024 - 12 - 28 - 8 - 1, 'a'); // "/system/bin/", "_ca_qsee" and a blank
    std::string text = plan_of(group(name, "<Cmd name=\"" + item + "\" args=\"" + args + "\"/>"));
    text += std::string(2048 - text.size(), '\n');
    EXPECT_EQ(to_send(text), "");
}

TEST(CheckedPlan, HasNoFindingsForNamesOfPlainCharacters)
{
    EXPECT_EQ(to_send(plan_of(
                  group("A b $ ' &amp; * ?", cmd("a.b_c-d+e,f=g@h%i~j#k") + cmd("\xC3\xA9")))),
              "");
}

// --- ':' --------------------------------------------------------------------------------

TEST(CheckedColon, EndsWhatIsStored)
{
    EXPECT_EQ(
        to_send("<?xml version=\"1.0\"?>\n<P>\n<CmdGroup name=\"A\">\n"
                "<Cmd name=\"x\" args=\"--at 12:30\"/>\n</CmdGroup>\n</P>\n"),
        "p.xml:4:28: error: a command takes a plan up to its first ':', so 73 of 97 bytes would be "
        "stored, and the library would not load them; write &#58; in its place\n"
        "<Cmd name=\"x\" args=\"--at 12:30\"/>\n"
        "                           ^\n");
}

TEST(CheckedColon, IsOfNoMatterInAPlanThatIsStored)
{
    EXPECT_EQ(stored(plan_of(group("A", "<Cmd name=\"x\" args=\"12:30\"/>"))), "");
}

TEST(CheckedColon, MayLeaveAPlanThatLoads)
{
    EXPECT_EQ(to_send("<P>" + group("A", cmd("x")) + "<a:b/></P>"),
              "p.xml:1:59: error: a command takes a plan up to its first ':', so 58 of 66 bytes "
              "would be stored, "
              "and the library would load them without the rest; leave it out\n"
              "<P><CmdGroup name=\"A\"><Cmd name=\"x\" args=\"\"/></CmdGroup><a:b/></P>\n"
              "                                                          ^\n");
}

TEST(CheckedColon, IsCountedWithTheOnesAfterIt)
{
    EXPECT_EQ(
        to_send("<P a=\"b:c\" d=\":\">" + group("A", cmd("x")) + "e:f</P>"),
        "p.xml:1:8: error: a command takes a plan up to its first ':', so 7 of 77 bytes would be "
        "stored, "
        "and the library would not load them; write &#58; in its place, and the 2 after it\n"
        "<P a=\"b:c\" d=\":\"><CmdGroup name=\"A\"><Cmd name=\"x\" args=\"\"/></CmdGroup>e:f</P>\n"
        "       ^\n");
}

TEST(CheckedColon, CanBeWrittenOtherwiseInText)
{
    EXPECT_THAT(to_send("<P>a:b" + group("A", cmd("x")) + "</P>"),
                HasSubstr("; write &#58; in its place\n"));
    EXPECT_THAT(to_send("<P>" + group("A", cmd("x")) + "<!-- a:b --></P>"),
                HasSubstr("; leave it out\n"));
    EXPECT_THAT(to_send("<P>" + group("A", cmd("x")) + "<![CDATA[a:b]]></P>"),
                HasSubstr("; leave it out\n"));
    EXPECT_THAT(to_send("<P xmlns:a=\"b\">" + group("A", cmd("x")) + "</P>"),
                HasSubstr("; leave it out\n"));
    EXPECT_THAT(to_send("<?xml version=\"1.0\"?><!DOCTYPE P SYSTEM \"http://a\"><P>" +
                        group("A", cmd("x")) + "</P>"),
                HasSubstr("; leave it out\n"));
    EXPECT_THAT(to_send("<P a=':'>" + group("A", cmd("x")) + "</P>"),
                HasSubstr("; write &#58; in its place\n"));
}

// --- length -------------------------------------------------------------------------------

TEST(CheckedLength, SaysWhereAPlanIsCut)
{
    const std::string begin = "<?xml version=\"1.0\"?>\n<P>" + group("A", cmd("x")) + "\n";
    const std::string text =
        begin + std::string(2000 - begin.size(), ' ') + "\n" + group("B", cmd("x")) + "</P>\n";
    EXPECT_EQ(to_send(text),
              "p.xml:4:48: error: 2059 bytes are 11 more than the 2048 that a command stores: the "
              "plan would be cut here, and the library would not load it; shorten it, or have "
              "fptest run --plan place it as a file\n"
              "<CmdGroup name=\"B\"><Cmd name=\"x\" args=\"\"/></CmdGroup></P>\n"
              "                                               ^\n");
    EXPECT_EQ(stored(text), "");
}

TEST(CheckedLength, SaysThatTheRestMayBeMissedOnly)
{
    // without a declaration the root needs no end
    const std::string begin = "<P>" + group("A", cmd("x")) + "\n";
    const std::string text =
        begin + std::string(2047 - begin.size(), ' ') + "\n" + group("B", cmd("x")) + "</P>\n";
    EXPECT_EQ(to_send(text),
              "p.xml:3:1: error: 2106 bytes are 58 more than the 2048 that a command stores: the "
              "plan would be cut here, and the library would load it without the rest; shorten it, "
              "or have fptest run --plan place it as a file\n"
              "<CmdGroup name=\"B\"><Cmd name=\"x\" args=\"\"/></CmdGroup></P>\n"
              "^\n");
}

TEST(CheckedLength, StandsAtTheCharacterThatIsCut)
{
    const std::string begin = "<P>" + group("A", cmd("x")) + "\n";
    const std::string text = begin + std::string(2046 - begin.size(), ' ') + "\xE2\x82\xAC</P>";
    EXPECT_EQ(to_send(text),
              "p.xml:2:1990: error: 2053 bytes are 5 more than the 2048 that a command stores: the "
              "plan would be cut here, and the library would load it without the rest; shorten it, "
              "or have fptest run --plan place it as a file\n"
              "..." +
                  std::string(72, ' ') + "\xE2\x82\xAC</P>\n" + std::string(75, ' ') + "^\n");
}

TEST(CheckedLength, YieldsToAColonInFrontOfIt)
{
    const std::string begin = "<P a=\":\">" + group("A", cmd("x")) + "\n";
    const std::string text = begin + std::string(2047 - begin.size(), ' ') + "\n<S/></P>";
    EXPECT_EQ(
        to_send(text),
        "p.xml:1:7: error: a command takes a plan up to its first ':', so 6 of 2056 bytes would be "
        "stored, "
        "and the library would not load them; write &#58; in its place\n"
        "<P a=\":\"><CmdGroup name=\"A\"><Cmd name=\"x\" args=\"\"/></CmdGroup>\n"
        "      ^\n"
        "p.xml:3:1: error: 2056 bytes are 8 more than the 2048 that a command stores: the plan "
        "would be cut here, were it not cut at a ':' before; shorten it, or have fptest run --plan "
        "place it as a file\n"
        "<S/></P>\n"
        "^\n");
}

TEST(CheckedLength, ComesInFrontOfAColonAfterIt)
{
    const std::string begin = "<P>" + group("A", cmd("x")) + "\n";
    const std::string text = begin + std::string(2046 - begin.size(), ' ') + "\n<S a=\":\"/></P>";
    EXPECT_EQ(to_send(text),
              "p.xml:3:2: error: 2061 bytes are 13 more than the 2048 that a command stores: the "
              "plan would be cut here, and the library would load it without the rest; shorten it, "
              "or have fptest run --plan place it as a file\n"
              "<S a=\":\"/></P>\n"
              " ^\n"
              "p.xml:3:7: error: a command takes a plan up to its first ':', which is after the "
              "2048 bytes that it takes anyway; write &#58; in its place\n"
              "<S a=\":\"/></P>\n"
              "      ^\n");
}

TEST(CheckedLength, MeetsAColonAtTheLimit)
{
    const std::string begin = "<P>" + group("A", cmd("x")) + "\n";
    const std::string filled = begin + std::string(2047 - begin.size(), ' ');
    EXPECT_THAT(to_send(filled + ":</P>"), HasSubstr("':', so 2047 of 2052 bytes would be stored"));
    EXPECT_THAT(to_send(filled + ":</P>"), HasSubstr("cut here, were it not cut at a ':' before"));
    EXPECT_THAT(to_send(filled + " :</P>"), HasSubstr("':', which is after the 2048 bytes"));
    EXPECT_THAT(to_send(filled + " :</P>"), HasSubstr("cut here, and the library would load it"));
}

TEST(CheckedLength, EndsAtAZeroByte)
{
    std::string text; // in UTF-16, without a mark of it
    for (const char c : plan_of(group("A", cmd("x")))) {
        text += c;
        text += '\0';
    }
    EXPECT_THAT(to_send(text),
                HasSubstr("error: a command takes a plan up to its first zero byte, so 1 byte "
                          "would be stored, and the library would load them without the rest; "
                          "save it as UTF-8\n"));
    // one that is no XML for its zero byte has that said of it once
    EXPECT_EQ(check("<P>\0</P>"s, PlanUse::to_send).size(), 1U);
}

TEST(CheckedEncoding, OfUtf16IsAnErrorHoweverItIsStored)
{
    for (const std::string mark : {"\xFF\xFE", "\xFE\xFF"}) {
        for (const std::size_t size : {0U, 40U, 5000U}) {
            std::string text = mark;
            for (const char c : plan_of(group("A", cmd("x"))) + std::string(size, '\n')) {
                text += mark[0] == '\xFF' ? std::string{c, '\0'} : std::string{'\0', c};
            }
            for (const PlanUse use : {PlanUse::to_send, PlanUse::stored}) {
                const auto findings = check(text, use);
                ASSERT_EQ(findings.size(), 1U);
                EXPECT_EQ(findings[0].severity, Finding::Severity::error);
                EXPECT_EQ(findings[0].text, "the plan is UTF-16: save it as UTF-8");
            }
        }
    }
}

// --- well-formedness --------------------------------------------------------------------------

TEST(CheckedForm, OfNothing)
{
    EXPECT_EQ(stored(""),
              "p.xml:1:1: error: not well-formed, no element found: the library would not "
              "load it; write a plan\n"
              "\n"
              "^\n");
    EXPECT_EQ(stored("<!-- a -->\n\n"),
              "p.xml:1:11: error: not well-formed, no element found: the library would load it all "
              "the same, and run what it took from it; write a plan\n"
              "<!-- a -->\n"
              "          ^\n");
}

TEST(CheckedForm, OfWhiteSpace)
{
    EXPECT_EQ(stored(" \n "),
              "p.xml:1:1: error: not well-formed, no element found: the library would "
              "not load it; write a plan\n"
              " \n"
              "^\n");
}

TEST(CheckedForm, OfATextThatEndsTooEarly)
{
    EXPECT_EQ(
        stored("<P>\n" + group("A", cmd("x")) + "\n\n"),
        "p.xml:2:54: error: not well-formed, the text ends too early: the library would load it "
        "all the same, and run what it took from it; close <P>\n"
        "<CmdGroup name=\"A\"><Cmd name=\"x\" args=\"\"/></CmdGroup>\n"
        "                                                     ^\n");
    EXPECT_EQ(
        stored("<?xml version=\"1.0\"?>\n<P><CmdGroup name=\"A\">"),
        "p.xml:2:23: error: not well-formed, the text ends too early: the library would not load "
        "it; close <CmdGroup>\n"
        "<P><CmdGroup name=\"A\">\n"
        "                      ^\n");
}

TEST(CheckedForm, OfTagsThatDoNotMatch)
{
    EXPECT_EQ(
        stored("<P>\n<CmdGroup name=\"A\">\n<Cmd name=\"x\" args=\"\">\n</CmdGroup>\n</P>"),
        "p.xml:4:3: error: not well-formed, mismatched tag: the library would not load it; close "
        "<Cmd> before\n"
        "</CmdGroup>\n"
        "  ^\n");
}

TEST(CheckedForm, OfATagThatDoesNotEnd)
{
    EXPECT_EQ(
        stored("<P>\n" + group("A", cmd("x")) + "\n</P"),
        "p.xml:3:1: error: not well-formed, unclosed token: the library would load it all the "
        "same, and run what it took from it; end what begins here\n"
        "</P\n"
        "^\n");
}

TEST(CheckedForm, OfCharactersThatMeanSomething)
{
    EXPECT_EQ(
        stored(plan_of(group("A", "<Cmd name=\"x\" args=\"a && b\"/>"))),
        "p.xml:1:46: error: not well-formed, invalid token: the library would not load it; write "
        "&amp; for a '&'\n"
        "<P><CmdGroup name=\"A\"><Cmd name=\"x\" args=\"a && b\"/></CmdGroup></P>\n"
        "                                             ^\n");
    EXPECT_EQ(
        stored(plan_of(group("A", "<Cmd name=\"x\" args=\"a<b\"/>"))),
        "p.xml:1:44: error: not well-formed, invalid token: the library would load it all the "
        "same, and run what it took from it; write &lt; for a '<'\n"
        "<P><CmdGroup name=\"A\"><Cmd name=\"x\" args=\"a<b\"/></CmdGroup></P>\n"
        "                                           ^\n");
    EXPECT_EQ(
        stored(plan_of(group("A", "<Cmd name=x args=\"\"/>"))),
        "p.xml:1:33: error: not well-formed, invalid token: the library would load it all the "
        "same, and run what it took from it; fix it here\n"
        "<P><CmdGroup name=\"A\"><Cmd name=x args=\"\"/></CmdGroup></P>\n"
        "                                ^\n");
    EXPECT_EQ(
        stored(plan_of(group("A", "<Cmd name=\"x\" args=\"&nbsp;\"/>"))),
        "p.xml:1:43: error: not well-formed, undefined entity: the library would load it all the "
        "same, and run what it took from it; write &amp; for a '&'\n"
        "<P><CmdGroup name=\"A\"><Cmd name=\"x\" args=\"&nbsp;\"/></CmdGroup></P>\n"
        "                                          ^\n");
}

TEST(CheckedForm, OfAnEntityAfterOthers)
{
    EXPECT_THAT(stored(plan_of(group("A", "<Cmd name=\"x\" args=\"&lt;&gt;&amp;&quot;&apos;&#65;"
                                          "&nbsp;\"/>"))),
                HasSubstr("p.xml:1:73: error: not well-formed, undefined entity"));
}

TEST(CheckedForm, OfControlCharacters)
{
    EXPECT_EQ(
        stored(plan_of(group("A", "<Cmd name=\"x\" args=\"a\x1B[1m\"/>"))),
        "p.xml:1:44: error: not well-formed, invalid token: the library would not load it; leave "
        "the control character out\n"
        "<P><CmdGroup name=\"A\"><Cmd name=\"x\" args=\"a\u241B[1m\"/></CmdGroup></P>\n"
        "                                           ^\n");
    EXPECT_EQ(
        stored(plan_of(group("A", "<Cmd name=\"x\" args=\"&#27;\"/>"))),
        "p.xml:1:43: error: not well-formed, reference to invalid character number: the library "
        "would not load it; leave it out\n"
        "<P><CmdGroup name=\"A\"><Cmd name=\"x\" args=\"&#27;\"/></CmdGroup></P>\n"
        "                                          ^\n");
    EXPECT_EQ(stored("<P>\0</P>"s), "p.xml:1:4: error: not well-formed, invalid token: the library "
                                    "would load it all the same, and run what it took from it; "
                                    "leave the control character out\n"
                                    "<P>\u2400</P>\n"
                                    "   ^\n");
}

TEST(CheckedForm, OfBytesThatAreNoUtf8)
{
    EXPECT_EQ(
        stored(plan_of(group("A", "<Cmd name=\"x\" args=\"caf\xE9 2\"/>"))),
        "p.xml:1:46: error: not well-formed, invalid token: the library would not load it; save "
        "it as UTF-8\n"
        "<P><CmdGroup name=\"A\"><Cmd name=\"x\" args=\"caf\uFFFD 2\"/></CmdGroup></P>\n"
        "                                             ^\n");
    EXPECT_EQ(
        stored("<P>\xC3"),
        "p.xml:1:4: error: not well-formed, partial character: the library would load it all the "
        "same, and run what it took from it; complete the character\n"
        "<P>\uFFFD\n"
        "   ^\n");
    EXPECT_EQ(
        stored("<?xml version=\"1.0\" encoding=\"klingon\"?>\n<P/>"),
        "p.xml:1:31: error: not well-formed, unknown encoding: the library would load it all the "
        "same, and run what it took from it; declare UTF-8, or leave the declaration out\n"
        "<?xml version=\"1.0\" encoding=\"klingon\"?>\n"
        "                              ^\n");
    EXPECT_EQ(
        stored("<?xml version=\"1.0\" encoding=\"UTF-16\"?>\n<P/>"),
        "p.xml:1:31: error: not well-formed, encoding specified in XML declaration is incorrect: "
        "the library would load it all the same, and run what it took from it; declare UTF-8, or "
        "leave the declaration out\n"
        "<?xml version=\"1.0\" encoding=\"UTF-16\"?>\n"
        "                              ^\n");
}

TEST(CheckedForm, OfSecondOnes)
{
    EXPECT_EQ(
        stored("<?xml version=\"1.0\"?>\n<P>" + group("A", cmd("x")) + "</P>\n<Q/>\n"),
        "p.xml:3:1: error: not well-formed, junk after document element: the library would load it "
        "all the same, and run what it took from it; put everything into one element\n"
        "<Q/>\n"
        "^\n");
    EXPECT_EQ(
        stored(plan_of(group("A", "<Cmd name=\"x\" name=\"y\" args=\"\"/>"))),
        "p.xml:1:37: error: not well-formed, duplicate attribute: the library would not load it; "
        "keep one of the two\n"
        "<P><CmdGroup name=\"A\"><Cmd name=\"x\" name=\"y\" args=\"\"/></CmdGroup></P>\n"
        "                                    ^\n");
}

TEST(CheckedForm, OfADeclarationThatIsNotTheBegin)
{
    EXPECT_EQ(
        stored("\n<?xml version=\"1.0\"?>\n<P/>"),
        "p.xml:2:1: error: not well-formed, XML or text declaration not at start of entity: the "
        "library would not load it; begin the text with it\n"
        "<?xml version=\"1.0\"?>\n"
        "^\n");
}

TEST(CheckedForm, OfASectionThatDoesNotEnd)
{
    EXPECT_EQ(
        stored("<P><![CDATA[ </P>"),
        "p.xml:1:4: error: not well-formed, unclosed CDATA section: the library would not load "
        "it; end what begins here\n"
        "<P><![CDATA[ </P>\n"
        "   ^\n");
}

TEST(CheckedForm, OfAnythingElse)
{
    EXPECT_EQ(
        stored("<?xml version=\"1.0\"?>\n<!DOCTYPE P FOO><P/>"),
        "p.xml:2:13: error: not well-formed, syntax error: the library would load it all the same, "
        "and run what it took from it; fix it here\n"
        "<!DOCTYPE P FOO><P/>\n"
        "            ^\n");
}

TEST(CheckedForm, OfADeclaredEntity)
{
    EXPECT_EQ(
        stored("<!DOCTYPE P [\n<!ENTITY a \"b\">]>\n<P>&a;" + group("A", cmd("x")) + "</P>"),
        "p.xml:2:12: error: an entity is declared here: the library would not load the plan; write "
        "its text where it is used\n"
        "<!ENTITY a \"b\">]>\n"
        "           ^\n");
    EXPECT_THAT(stored("<!DOCTYPE P [<!ENTITY a \"b\">]><P>" + group("A", cmd("x")) + "</P>"),
                HasSubstr(": error: an entity is declared here: the library would not know it; "
                          "write its text where it is used\n"));
}

TEST(CheckedForm, HasOneFindingWhateverFollowsFromIt)
{
    EXPECT_EQ(
        check("<P><Cmd/><CmdGroup/><CmdGroup/><Cmd name=\"a/b\"></P>", PlanUse::to_send).size(),
        1U);
}

// --- attributes without a value -----------------------------------------------------------------

TEST(CheckedValue, IsMissing)
{
    EXPECT_EQ(
        stored(group_of("<Cmd name=\"x\" args=\"\" progress=\"5\" result description=\"a\"/>\n"
                        "<Cmd name=\"y\" args/>\n")),
        "p.xml:3:36: error: attribute 'result' has no value: the library would not load the plan; "
        "write result=\"\" or leave it out\n"
        "<Cmd name=\"x\" args=\"\" progress=\"5\" result description=\"a\"/>\n"
        "                                   ^\n"
        "p.xml:4:15: error: attribute 'args' has no value: the library would not load the plan; "
        "write args=\"\" or leave it out\n"
        "<Cmd name=\"y\" args/>\n"
        "              ^\n");
}

TEST(CheckedValue, DoesNotHideOtherFindings)
{
    EXPECT_EQ(
        stored(group_of("<Cmd name=\"x\" args=\"\" result/>\n<Cmd name=\"x\" args=\"\"/>\n")),
        "p.xml:3:23: error: attribute 'result' has no value: the library would not load the plan; "
        "write result=\"\" or leave it out\n"
        "<Cmd name=\"x\" args=\"\" result/>\n"
        "                      ^\n"
        "p.xml:4:12: error: a second item 'x' in group 'A': 'root/A/x' finds the one in line 3, "
        "and so do reports; rename it\n"
        "<Cmd name=\"x\" args=\"\"/>\n"
        "           ^\n");
}

TEST(CheckedValue, OfANameIsMissedOnce)
{
    EXPECT_EQ(
        stored(plan_of("<CmdGroup name><Cmd name args=\"\"/></CmdGroup>")),
        "p.xml:1:14: error: attribute 'name' has no value: the library would not load the plan; "
        "write name=\"\" or leave it out\n"
        "<P><CmdGroup name><Cmd name args=\"\"/></CmdGroup></P>\n"
        "             ^\n"
        "p.xml:1:24: error: attribute 'name' has no value: the library would not load the plan; "
        "write name=\"\" or leave it out\n"
        "<P><CmdGroup name><Cmd name args=\"\"/></CmdGroup></P>\n"
        "                       ^\n");
}

TEST(CheckedValue, DoesNotMoveWhatIsFoundAfterIt)
{
    EXPECT_EQ(
        stored("<P a><Q b>\n</P>"),
        "p.xml:1:4: error: attribute 'a' has no value: the library would not load the plan; write "
        "a=\"\" or leave it out\n"
        "<P a><Q b>\n"
        "   ^\n"
        "p.xml:1:9: error: attribute 'b' has no value: the library would not load the plan; write "
        "b=\"\" or leave it out\n"
        "<P a><Q b>\n"
        "        ^\n"
        "p.xml:2:3: error: not well-formed, mismatched tag: the library would not load it; close "
        "<Q> before\n"
        "</P>\n"
        "  ^\n");
}

TEST(CheckedValue, IsNotMissedAfterAPlaceThatIsNotWellFormed)
{
    EXPECT_EQ(
        stored("<P>&</P><Q a/>"),
        "p.xml:1:5: error: not well-formed, invalid token: the library would not load it; write "
        "&amp; for a '&'\n"
        "<P>&</P><Q a/>\n"
        "    ^\n");
}

TEST(CheckedValue, IsMissedWhateverTheNameBeginsWith)
{
    EXPECT_THAT(stored("<P _a/>"), HasSubstr("p.xml:1:4: error: attribute '_a' has no value: "));
    EXPECT_THAT(stored("<P \xC3\xA9/>"),
                HasSubstr("p.xml:1:4: error: attribute '\xC3\xA9' has no "));
    EXPECT_THAT(stored("<P a1-b.c_/>"), HasSubstr("p.xml:1:4: error: attribute 'a1-b.c_' has no "));
}

TEST(CheckedValue, IsNotMissedWhereAQuoteIs)
{
    EXPECT_EQ(
        stored("<P a=\"b c=\"d\">"),
        "p.xml:1:12: error: not well-formed, invalid token: the library would not load it; fix it "
        "here\n"
        "<P a=\"b c=\"d\">\n"
        "           ^\n");
    EXPECT_EQ(
        stored(plan_of(group("A", "<Cmd name=\"x\" args=\"\"\"/>"))),
        "p.xml:1:44: error: not well-formed, invalid token: the library would not load it; fix it "
        "here\n"
        "<P><CmdGroup name=\"A\"><Cmd name=\"x\" args=\"\"\"/></CmdGroup></P>\n"
        "                                           ^\n");
    EXPECT_EQ(
        stored("<P a\"/>"),
        "p.xml:1:5: error: not well-formed, invalid token: the library would not load it; fix it "
        "here\n"
        "<P a\"/>\n"
        "    ^\n");
    EXPECT_EQ(
        stored("<P 1/>"),
        "p.xml:1:4: error: not well-formed, invalid token: the library would not load it; fix it "
        "here\n"
        "<P 1/>\n"
        "   ^\n");
}

// --- well-formed, but not loaded
// ------------------------------------------------------------------

TEST(CheckedRefusal, OfWhiteSpaceInFront)
{
    EXPECT_EQ(
        stored(" <P>" + group("A", cmd("x")) + "</P>"),
        "p.xml:1:1: error: the library would not load a text that begins with white space; begin "
        "it with a '<'\n"
        " <P><CmdGroup name=\"A\"><Cmd name=\"x\" args=\"\"/></CmdGroup></P>\n"
        "^\n");
}

TEST(CheckedRefusal, OfSomethingBesideARootWithoutADeclaration)
{
    EXPECT_EQ(stored("<!-- a -->\n<P>" + group("A", cmd("x")) + "</P>"),
              "p.xml:1:1: error: the library would not load a plan without a declaration that has "
              "something beside its root element; begin it with <?xml version=\"1.0\"?>\n"
              "<!-- a -->\n"
              "^\n");
    EXPECT_EQ(stored("<P>" + group("A", cmd("x")) + "</P>\n<!-- a -->\n"),
              "p.xml:2:1: error: the library would not load a plan without a declaration that has "
              "something beside its root element; begin it with <?xml version=\"1.0\"?>\n"
              "<!-- a -->\n"
              "^\n");
    EXPECT_EQ(stored("<P/>\n<?a b?>\n"),
              "p.xml:2:1: error: the library would not load a plan without a declaration that has "
              "something beside its root element; begin it with <?xml version=\"1.0\"?>\n"
              "<?a b?>\n"
              "^\n");
}

TEST(CheckedRefusal, OfAnEmptyComment)
{
    EXPECT_EQ(
        stored("<P>\n<!---->" + group("A", cmd("x")) + "</P>"),
        "p.xml:2:1: error: an empty comment has no end for the library, which would take what "
        "follows for a comment as well; write something into it\n"
        "<!----><CmdGroup name=\"A\"><Cmd name=\"x\" args=\"\"/></CmdGroup></P>\n"
        "^\n");
    EXPECT_EQ(
        stored("<P>" + group("A", cmd("x")) + "\n<!---->" + cmd("y") + "<!-- a --></P>"),
        "p.xml:2:1: error: an empty comment has no end for the library, which would take what "
        "follows for a comment as well; write something into it\n"
        "<!----><Cmd name=\"y\" args=\"\"/><!-- a --></P>\n"
        "^\n");
}

TEST(CheckedRefusal, OfAnythingElseIsInTheLibrarysWords)
{
    EXPECT_EQ(
        stored("<!DOCTYPE P SYSTEM \"p.dtd\">\n<P>&q;</P>"),
        "p.xml:2:4: error: well-formed, but the library would not load it: Entity name 'q;' not "
        "supported under parent <P>; fix that\n"
        "<P>&q;</P>\n"
        "   ^\n");
}

// --- groups
// ---------------------------------------------------------------------------------------

TEST(CheckedGroup, IsMissing)
{
    EXPECT_EQ(stored("<?xml version=\"1.0\"?>\n<!-- a -->\n<P>" + cmd("x") + "</P>"),
              "p.xml:3:1: error: no CmdGroup in it: the library would find nothing to run; put the "
              "items into <CmdGroup name=\"...\">\n"
              "<P><Cmd name=\"x\" args=\"\"/></P>\n"
              "^\n");
    EXPECT_EQ(stored("<P><cmdgroup name=\"A\"/></P>"),
              "p.xml:1:1: error: no CmdGroup in it: the library would find nothing to run; put the "
              "items into <CmdGroup name=\"...\">\n"
              "<P><cmdgroup name=\"A\"/></P>\n"
              "^\n"
              "p.xml:1:4: warning: <cmdgroup> is ignored: element names are case-sensitive; write "
              "<CmdGroup>\n"
              "<P><cmdgroup name=\"A\"/></P>\n"
              "   ^\n");
}

TEST(CheckedGroup, IsTheTopOfTheDocument)
{
    EXPECT_EQ(
        stored(group("A", cmd("x") + "<!-- a -->")),
        "p.xml:1:1: error: the library looks for groups below the top of the document, and would "
        "not find this one; begin it with <?xml version=\"1.0\"?>\n"
        "<CmdGroup name=\"A\"><Cmd name=\"x\" args=\"\"/><!-- a --></CmdGroup>\n"
        "^\n");
    EXPECT_EQ(stored("<?xml version=\"1.0\"?>" + group("A", cmd("x"))), "");
    EXPECT_EQ(stored("<!DOCTYPE CmdGroup>" + group("A", cmd("x"))), "");
}

TEST(CheckedGroup, HasNoName)
{
    EXPECT_EQ(stored(plan_of("<CmdGroup>" + cmd("x") + "</CmdGroup>")),
              "p.xml:1:4: error: a group has no name: no node path leads to it; add name=\"...\"\n"
              "<P><CmdGroup><Cmd name=\"x\" args=\"\"/></CmdGroup></P>\n"
              "   ^\n");
    EXPECT_EQ(
        stored(plan_of(group("", cmd("x")))),
        "p.xml:1:20: error: the name of a group is empty: no node path leads to it; write one\n"
        "<P><CmdGroup name=\"\"><Cmd name=\"x\" args=\"\"/></CmdGroup></P>\n"
        "                   ^\n");
}

TEST(CheckedGroup, HasANameThatAPathSplits)
{
    EXPECT_EQ(
        stored(plan_of(group("a/b", cmd("x")))),
        "p.xml:1:20: error: group 'a/b' cannot be addressed: a node path is split at '/', and "
        "'root/a/b' would run nothing; rename it\n"
        "<P><CmdGroup name=\"a/b\"><Cmd name=\"x\" args=\"\"/></CmdGroup></P>\n"
        "                   ^\n");
    EXPECT_EQ(
        stored(plan_of(group("a&#58;b", cmd("x")) + group("a", cmd("x")))),
        "p.xml:1:20: error: group 'a:b' cannot be addressed: a node path is cut at ':', and "
        "'root/a:b' would run 'x'; rename it\n"
        "<P><CmdGroup name=\"a&#58;b\"><Cmd name=\"x\" args=\"\"/></CmdGroup><CmdGroup name=...\n"
        "                   ^\n");
    EXPECT_EQ(
        stored(plan_of(group("a\tb&#10;c/:", cmd("x")) + group("a", cmd("x") + cmd("y")))),
        "p.xml:1:20: error: group 'a\u2409b\u240Ac/:' cannot be addressed: a node path is split "
        "at '/', is cut at ':', is cut at a tab and is cut at a line feed, and "
        "'root/a\u2409b\u240Ac/:' would run 'x' and 1 more; rename it\n"
        "<P><CmdGroup name=\"a b&#10;c/:\"><Cmd name=\"x\" args=\"\"/></CmdGroup><CmdGroup n...\n"
        "                   ^\n");
}

TEST(CheckedGroup, HasANameThatIsTooLong)
{
    const std::string name(63, 'n');
    EXPECT_EQ(
        stored("<P>\n" + group(name + "o", cmd("x")) + "</P>"),
        "p.xml:2:17: error: group "
        "'nnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnn...' "
        "cannot be addressed: its name has 64 bytes, a node path holds 63 of it and would run "
        "nothing; shorten it\n"
        "<CmdGroup name=\"nnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnn...\n"
        "                ^\n");
    EXPECT_THAT(stored("<P>\n" + group(name, cmd("x")) + group(name + "o", cmd("x")) + "</P>"),
                HasSubstr("holds 63 of it and would run 'x'; shorten it\n"));
}

TEST(CheckedGroup, HasTheNameOfAnEarlierOne)
{
    EXPECT_EQ(
        stored("<P>\n" + group("A", cmd("x")) + "\n" + group("B", cmd("x")) + "\n" +
               group("A", cmd("x")) + "\n" + group("A", cmd("x")) + "</P>"),
        "p.xml:4:17: error: a second group 'A': 'root/A' finds the one in line 2, and never this "
        "one; rename it\n"
        "<CmdGroup name=\"A\"><Cmd name=\"x\" args=\"\"/></CmdGroup>\n"
        "                ^\n"
        "p.xml:5:17: error: a second group 'A': 'root/A' finds the one in line 2, and never this "
        "one; rename it\n"
        "<CmdGroup name=\"A\"><Cmd name=\"x\" args=\"\"/></CmdGroup></P>\n"
        "                ^\n");
}

TEST(CheckedGroup, IsEmpty)
{
    EXPECT_EQ(
        stored("<P>\n<CmdGroup name=\"A\">\n</CmdGroup>" + group("B", cmd("x")) + "</P>"),
        "p.xml:2:1: warning: group 'A' is empty: 'root/A' would run nothing, and an item of it is "
        "looked for in the groups after it; put items into it\n"
        "<CmdGroup name=\"A\">\n"
        "^\n");
}

// --- items
// ------------------------------------------------------------------------------------------

TEST(CheckedItem, IsInNoGroup)
{
    EXPECT_EQ(
        stored("<P>\n" + group("A", cmd("x")) + "\n" + cmd("y") + "\n<S>" + cmd("z") +
               "<Cmd/></S></P>"),
        "p.xml:3:1: error: item 'y' is in no group: no node path leads to it; put it into a "
        "<CmdGroup>\n"
        "<Cmd name=\"y\" args=\"\"/>\n"
        "^\n"
        "p.xml:4:4: error: item 'z' is in no group: no node path leads to it; put it into a "
        "<CmdGroup>\n"
        "<S><Cmd name=\"z\" args=\"\"/><Cmd/></S></P>\n"
        "   ^\n"
        "p.xml:4:27: error: an item without a name is in no group: no node path leads to it; put "
        "it into a <CmdGroup>\n"
        "<S><Cmd name=\"z\" args=\"\"/><Cmd/></S></P>\n"
        "                          ^\n");
}

TEST(CheckedTags, AreTakenLetterByLetter)
{
    EXPECT_EQ(
        stored("<P>\n" + group("A", cmd("x")) + "\n<cmdgroup name=\"B\"/>\n" +
               "<CMD name=\"y\"/>\n<Command/></P>"),
        "p.xml:3:1: warning: <cmdgroup> is ignored: element names are case-sensitive; write "
        "<CmdGroup>\n"
        "<cmdgroup name=\"B\"/>\n"
        "^\n"
        "p.xml:4:1: warning: <CMD> is ignored: element names are case-sensitive; write <Cmd>\n"
        "<CMD name=\"y\"/>\n"
        "^\n");
}

TEST(CheckedItem, HasNoName)
{
    EXPECT_EQ(
        stored(group_of("<Cmd args=\"\"/>\n<Cmd name=\"\"/>\n")),
        "p.xml:3:1: error: an item has no name: the library would not run it; add name=\"...\" "
        "with the name of its program\n"
        "<Cmd args=\"\"/>\n"
        "^\n"
        "p.xml:4:12: error: the name of an item is empty: the library would not run it; write the "
        "name of its program\n"
        "<Cmd name=\"\"/>\n"
        "           ^\n");
}

TEST(CheckedItem, HasANameThatAPathSplits)
{
    EXPECT_EQ(
        stored(group_of(cmd("a/b") + "\n" + cmd("c&#58;d") + "\n" + cmd("e\tf") + "\n" + cmd("a") +
                        "\n")),
        "p.xml:3:12: error: item 'a/b' cannot be addressed: a node path is split at '/', and "
        "'root/A/a/b' would run 'a'; rename it\n"
        "<Cmd name=\"a/b\" args=\"\"/>\n"
        "           ^\n"
        "p.xml:4:12: error: item 'c:d' cannot be addressed: a node path is cut at ':', and "
        "'root/A/c:d' would run nothing; rename it\n"
        "<Cmd name=\"c&#58;d\" args=\"\"/>\n"
        "           ^\n"
        "p.xml:5:12: error: item 'e\u2409f' cannot be addressed: a node path is cut at a tab, as "
        "is the name of its program, and 'root/A/e\u2409f' would run nothing; rename it\n"
        "<Cmd name=\"e f\" args=\"\"/>\n"
        "           ^\n");
    EXPECT_EQ(
        stored(group_of(cmd("a\nb") + "\n")),
        "p.xml:3:12: error: item 'a\u240Ab' cannot be addressed: a node path is cut at a line "
        "feed, as is the name of its program, and 'root/A/a\u240Ab' would run nothing; rename "
        "it\n"
        "<Cmd name=\"a\n"
        "           ^\n");
}

TEST(CheckedItem, HasANameThatIsTooLong)
{
    const std::string name(64, 'n');
    EXPECT_EQ(
        stored(group_of(cmd(name) + "\n")),
        "p.xml:3:12: error: item 'nnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnn...' "
        "cannot be addressed: its name has 64 bytes, a node path holds 63 of it and would run "
        "nothing; shorten it\n"
        "<Cmd name=\"nnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnnn\" ...\n"
        "           ^\n");
}

TEST(CheckedItem, HasAPathThatIsShownInPart)
{
    EXPECT_THAT(
        stored("<P>\n" + group(std::string(55, 'g'), cmd("a/" + std::string(20, 'i'))) + "</P>"),
        HasSubstr(", and 'root/" + std::string(55, 'g') + "/a/" + std::string(14, 'i') +
                  "...' would run nothing; rename it\n"));
    EXPECT_THAT(
        stored("<P>\n" + group(std::string(55, 'g'), cmd("a/" + std::string(17, 'i'))) + "</P>"),
        HasSubstr(", and 'root/" + std::string(55, 'g') + "/a/" + std::string(17, 'i') +
                  "' would run nothing; rename it\n"));
}

TEST(CheckedItem, HasANameThatPsIsAskedAPartOf)
{
    EXPECT_EQ(
        stored(group_of(cmd("SpiCheckOfTheSecondSensorPort") + "\n")),
        "p.xml:3:12: warning: item 'SpiCheckOfTheSecondSensorPort' may not be found to be "
        "stopped: ps is asked for the first 28 of the 29 bytes of its name, and finds another "
        "or none; shorten it\n"
        "<Cmd name=\"SpiCheckOfTheSecondSensorPort\" args=\"\"/>\n"
        "           ^\n");
}

TEST(CheckedItem, HasTheNameOfAnEarlierOne)
{
    EXPECT_EQ(
        stored(group_of(cmd("x") + "\n" + cmd("y") + "\n" + cmd("x") + "\n" + cmd("x") + "\n")),
        "p.xml:5:12: error: a second item 'x' in group 'A': 'root/A/x' finds the one in line 3, "
        "and so do reports; rename it\n"
        "<Cmd name=\"x\" args=\"\"/>\n"
        "           ^\n"
        "p.xml:6:12: error: a second item 'x' in group 'A': 'root/A/x' finds the one in line 3, "
        "and so do reports; rename it\n"
        "<Cmd name=\"x\" args=\"\"/>\n"
        "           ^\n");
}

TEST(CheckedItem, HasANameThatTheShellReads)
{
    EXPECT_EQ(
        stored(group_of(cmd("a b") + "\n" + cmd("c$d;e") + "\n")),
        "p.xml:3:12: warning: item 'a b' has a blank in its name, which the shell reads as its "
        "own: it would not run a program of that name; rename it\n"
        "<Cmd name=\"a b\" args=\"\"/>\n"
        "           ^\n"
        "p.xml:4:12: warning: item 'c$d;e' has '$' and ';' in its name, which the shell reads as "
        "its own: it would not run a program of that name; rename it\n"
        "<Cmd name=\"c$d;e\" args=\"\"/>\n"
        "           ^\n");
    for (const std::string sign : {" ", "&quot;", "'", "\\", "$", "`", ";", "&amp;", "|", "&lt;",
                                   ">", "(", ")", "*", "?", "[", "{"}) {
        EXPECT_THAT(stored(group_of(cmd("a" + sign))),
                    HasSubstr("which the shell reads as its own"))
            << sign;
    }
}

TEST(CheckedItem, HasNoArgs)
{
    EXPECT_EQ(stored(group_of("<Cmd name=\"x\"/>\n")),
              "p.xml:3:1: error: item 'x' has no args: its command line would be '/system/bin/x "
              "(null)', which the shell refuses; add args=\"\"\n"
              "<Cmd name=\"x\"/>\n"
              "^\n");
}

TEST(CheckedItem, HasACommandLineThatIsCut)
{
    const auto item = [](std::size_t size) {
        return group_of("<Cmd name=\"x\" args=\"" + std::string(size, 'a') + "\"/>\n");
    };
    const std::string place =
        "<Cmd name=\"x\" args=\"aaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaa"
        "aaaaaaaaaa...\n"
        "                    ^\n";
    // "/system/bin/x " are 14
    EXPECT_EQ(stored(item(1024 - 14 - 8)), "");
    EXPECT_EQ(
        stored(item(1024 - 14 - 7)),
        "p.xml:3:21: error: the command line of item 'x' is cut to 1024 bytes, by 1 under vendor "
        "2; shorten its args\n" +
            place);
    EXPECT_EQ(
        stored(item(1024 - 14 - 2)),
        "p.xml:3:21: error: the command line of item 'x' is cut to 1024 bytes, by 1 under vendor "
        "1 and 6 under vendor 2; shorten its args\n" +
            place);
    EXPECT_EQ(
        stored(item(1024 - 14 + 5)),
        "p.xml:3:21: error: the command line of item 'x' is cut to 1024 bytes, by 5 under vendor "
        "0, 8 under vendor 1 and 13 under vendor 2; shorten its args\n" +
            place);
}

TEST(CheckedItem, HasAVendorsSuffixInItsName)
{
    EXPECT_EQ(
        stored(group_of(cmd("x_ca") + "\n" + cmd("y_ca_qsee") + "\n")),
        "p.xml:3:12: warning: item 'x_ca' would be run as 'x_ca_ca' under vendor 1: the library "
        "adds the suffix; leave it out\n"
        "<Cmd name=\"x_ca\" args=\"\"/>\n"
        "           ^\n"
        "p.xml:4:12: warning: item 'y_ca_qsee' would be run as 'y_ca_qsee_ca_qsee' under vendor "
        "2: the library adds the suffix; leave it out\n"
        "<Cmd name=\"y_ca_qsee\" args=\"\"/>\n"
        "           ^\n");
    EXPECT_EQ(stored(group_of(cmd("_ca") + cmd("_ca_qsee") + cmd("x_qsee") + cmd("ca"))),
              // the name of nothing with a suffix
              "");
}

TEST(CheckedItem, HasTheNameOfAnotherWithAVendorsSuffix)
{
    EXPECT_EQ(
        stored("<P>\n" + group("A", cmd("x_ca") + cmd("y")) + "\n" +
               group("B", cmd("y_ca_qsee") + cmd("x")) + "</P>"),
        "p.xml:2:31: warning: item 'x_ca' would be run as 'x_ca_ca' under vendor 1, and item 'x' "
        "as 'x_ca'; rename one\n"
        "<CmdGroup name=\"A\"><Cmd name=\"x_ca\" args=\"\"/><Cmd name=\"y\" "
        "args=\"\"/></CmdGroup>\n"
        "                              ^\n"
        "p.xml:3:31: warning: item 'y_ca_qsee' would be run as 'y_ca_qsee_ca_qsee' under vendor "
        "2, and item 'y' as 'y_ca_qsee'; rename one\n"
        "<CmdGroup name=\"B\"><Cmd name=\"y_ca_qsee\" args=\"\"/><Cmd name=\"x\" "
        "args=\"\"/></Cm...\n"
        "                              ^\n");
}

TEST(CheckedItem, HasAVendorsNameOfTheGatherer)
{
    for (const std::string suffix : {"_ca", "_qsee", "_ca_qsee"}) {
        EXPECT_EQ(stored(group_of(cmd("SensorProbe" + suffix) + "\n" + cmd("SensorProbe") + "\n")),
                  "p.xml:3:12: warning: item 'SensorProbe" + suffix +
                      "' is not the gatherer: that is 'SensorProbe', to which the library adds the "
                      "vendor's suffix; leave it out\n"
                      "<Cmd name=\"SensorProbe" +
                      suffix +
                      "\" args=\"\"/>\n"
                      "           ^\n");
    }
}

// --- positions
// ----------------------------------------------------------------------------------------

TEST(CheckedPositions, AreShiftedByAComment)
{
    EXPECT_EQ(
        stored(group_of("<!-- a -->\n" + cmd("x") + "\n" + cmd("y") + "\n")),
        "p.xml:3:1: error: a comment in group 'A', which shifts the positions: 'root/A/x' would "
        "run 'y' and 'root/A/y' would run nothing; keep all but items out of the group\n"
        "<!-- a -->\n"
        "^\n");
}

TEST(CheckedPositions, AreShiftedByText)
{
    EXPECT_EQ(
        stored(group_of("two words" + cmd("x") + "\n" + cmd("y") + cmd("z") + "\n")),
        "p.xml:3:1: error: text in group 'A', which shifts the positions: 'root/A/x' would run "
        "'z', 'root/A/y' would run nothing and 'root/A/z' would run nothing; keep all but items "
        "out of the group\n"
        "two words<Cmd name=\"x\" args=\"\"/>\n"
        "^\n");
}

TEST(CheckedPositions, AreShiftedByWhateverIsNoItem)
{
    EXPECT_EQ(
        stored(group_of("<?a b?>\n<![CDATA[c]]>\n<S/>\n<!-- d --><!-- e --> f\n" + cmd("x") +
                        cmd("y") + "\n" + cmd("z") + "\n" + cmd("w") + "\n")),
        "p.xml:3:1: error: an instruction, CDATA, <S>, a comment and text in group 'A', which "
        "shifts the positions: 'root/A/x' would run nothing, 'root/A/y' would run nothing, "
        "'root/A/z' would run nothing and so on for 1 more; keep all but items out of the group\n"
        "<?a b?>\n"
        "^\n");
}

TEST(CheckedPositions, StandAtTheFirstThatIsNoItem)
{
    EXPECT_THAT(stored(group_of(cmd("x") + "\n a <!-- b -->")),
                HasSubstr("p.xml:4:2: warning: text and a comment in group 'A'"));
    EXPECT_THAT(stored(group_of(cmd("x") + "\n <!-- b --> a")),
                HasSubstr("p.xml:4:2: warning: a comment and text in group 'A'"));
}

TEST(CheckedPositions, MayHoldInSpiteOfAComment)
{
    EXPECT_EQ(
        stored(group_of(cmd("x") + "\n" + cmd("y") + "<!-- a -->\n")),
        "p.xml:4:24: warning: a comment in group 'A': 'root/A' would look for more items than "
        "there are, and go on; keep all but items out of the group\n"
        "<Cmd name=\"y\" args=\"\"/><!-- a -->\n"
        "                       ^\n");
    EXPECT_THAT(stored(group_of(cmd("x") + "<!-- a -->\n" + cmd("y"))),
                HasSubstr("p.xml:3:24: warning: a comment in group 'A': "));
}

TEST(CheckedPositions, AreThoseOfTheNextGroupWhereAGroupHasNoItems)
{
    EXPECT_EQ(
        stored("<P>\n<CmdGroup name=\"A\"><!-- a --> b</CmdGroup>\n" +
               group("B", cmd("x") + cmd("y")) + "</P>"),
        "p.xml:2:20: error: a comment and text in group 'A', which shifts the positions: 'root/A' "
        "would run 'x' and 1 more; keep all but items out of the group\n"
        "<CmdGroup name=\"A\"><!-- a --> b</CmdGroup>\n"
        "                   ^\n");
}

TEST(CheckedPositions, AreShiftedBySoMuchThatSomeOfItIsSaid)
{
    EXPECT_THAT(
        stored(group_of("<a/><b/><c/><d/><e/><f/><g/>" + cmd("x"))),
        HasSubstr("error: <a>, <b>, <c>, <d>, <e> and others in group 'A', which shifts the "
                  "positions: 'root/A/x' would run nothing; keep"));
    EXPECT_THAT(stored(group_of("<a/><b/><c/><d/><e/><a/>" + cmd("x"))),
                HasSubstr("error: <a>, <b>, <c>, <d> and <e> in group 'A', which"));
    EXPECT_THAT(
        stored(group_of("<!-- a -->" + cmd("x") + cmd("y") + cmd("z"))),
        HasSubstr("'root/A/x' would run 'y', 'root/A/y' would run 'z' and 'root/A/z' would run "
                  "nothing; keep"));
}

TEST(CheckedPositions, HoldAnElementThatIsRunLikeAnItem)
{
    EXPECT_EQ(
        stored(group_of(cmd("x") + "\n<Task name=\"t\" args=\"\"/>\n")),
        "p.xml:4:1: error: <Task> in group 'A' has a name, by which 'root/A' would run it like an "
        "item; put it outside of the group\n"
        "<Task name=\"t\" args=\"\"/>\n"
        "^\n");
    // one without a name, or in front, it does not reach
    EXPECT_THAT(stored(group_of(cmd("x") + "\n<Task/>\n")),
                HasSubstr("p.xml:4:1: warning: <Task> in group 'A': 'root/A' would look for more"));
    EXPECT_THAT(
        stored(group_of("<Task name=\"t\"/>" + cmd("x"))),
        testing::AllOf(HasSubstr("<Task> in group 'A', which shifts the positions: 'root/A/x' "
                                 "would run nothing; keep"),
                       testing::Not(HasSubstr("has a name"))));
}

TEST(CheckedPositions, HoldAGroupInAGroup)
{
    EXPECT_EQ(
        stored(group_of(cmd("x") + "\n" + group("B", cmd("y")) + "\n")),
        "p.xml:4:1: error: <CmdGroup> in group 'A' has a name, by which 'root/A' would run it "
        "like an item; put it outside of the group\n"
        "<CmdGroup name=\"B\"><Cmd name=\"y\" args=\"\"/></CmdGroup>\n"
        "^\n");
}

TEST(CheckedPositions, OfANestedItemAreCountedWhereItStands)
{
    EXPECT_EQ(
        stored(group_of(cmd("x") + "\n" + cmd("y") + "\n<S>" + cmd("v") + cmd("w") + "</S>\n")),
        "p.xml:5:4: error: item 'v' is not directly in its group, but in <S>: 'root/A/v' would run "
        "'x'; put it directly into a group\n"
        "<S><Cmd name=\"v\" args=\"\"/><Cmd name=\"w\" args=\"\"/></S>\n"
        "   ^\n"
        "p.xml:5:27: error: item 'w' is not directly in its group, but in <S>: 'root/A/w' would "
        "run "
        "'y'; put it directly into a group\n"
        "<S><Cmd name=\"v\" args=\"\"/><Cmd name=\"w\" args=\"\"/></S>\n"
        "                          ^\n");
}

TEST(CheckedPositions, OfANestedItemThatIsFirstAreEveryones)
{
    EXPECT_EQ(
        stored(group_of("<S>" + cmd("v") + "</S>\n" + cmd("x") + "\n")),
        "p.xml:3:1: error: <S> in group 'A', which shifts the positions: 'root/A' would run 'v' "
        "and "
        "'root/A/x' would run nothing; keep all but items out of the group\n"
        "<S><Cmd name=\"v\" args=\"\"/></S>\n"
        "^\n"
        "p.xml:3:4: error: item 'v' is not directly in its group, but in <S>: 'root/A/v' finds it "
        "by chance; put it directly into a group\n"
        "<S><Cmd name=\"v\" args=\"\"/></S>\n"
        "   ^\n");
}

TEST(CheckedPositions, OfAnItemInAnItemAreItsOwn)
{
    EXPECT_EQ(stored(group_of("<Cmd name=\"x\" args=\"\">\n" + cmd("y") + "</Cmd>\n")),
              "p.xml:4:1: error: item 'y' is not directly in its group, but in <Cmd>: 'root/A/y' "
              "would run "
              "'x'; put it directly into a group\n"
              "<Cmd name=\"y\" args=\"\"/></Cmd>\n"
              "^\n");
}

TEST(CheckedPositions, OfANestedItemWithoutAPathAreNobodys)
{
    EXPECT_EQ(
        stored("<P>\n<CmdGroup name=\"\">\n<S>" + cmd("v") + "</S></CmdGroup></P>"),
        "p.xml:2:17: error: the name of a group is empty: no node path leads to it; write one\n"
        "<CmdGroup name=\"\">\n"
        "                ^\n"
        "p.xml:3:4: error: item 'v' is not directly in its group, but in <S>: no node path leads "
        "to "
        "it; put it directly into a group\n"
        "<S><Cmd name=\"v\" args=\"\"/></S></CmdGroup></P>\n"
        "   ^\n");
    EXPECT_EQ(stored(group_of(cmd("x") + "\n<S><Cmd/></S>")),
              "p.xml:4:4: error: an item without a name is not directly in its group, but in <S>: "
              "no node "
              "path leads to it; put it directly into a group\n"
              "<S><Cmd/></S></CmdGroup>\n"
              "   ^\n");
}

TEST(CheckedPositions, AreNotLookedAtInAGroupThatIsNotFound)
{
    EXPECT_EQ(
        check(plan_of("<CmdGroup><!-- a -->" + cmd("x") + cmd("x") + cmd("a/b") + "</CmdGroup>"),
              PlanUse::stored)
            .size(),
        1U);
}

// --- groups after it
// ----------------------------------------------------------------------------------

TEST(CheckedGroupAfter, HasAnItemThatOtherGroupsHave)
{
    EXPECT_EQ(
        stored("<P>\n" + group("A", cmd("x")) + "\n" + group("B", cmd("y")) + "\n" +
               group("C", cmd("x")) + "</P>"),
        "p.xml:4:31: warning: group 'B' has no item 'x', and finds this one after it: 'root/B/x' "
        "would run 'y'; check the group in paths to it\n"
        "<CmdGroup name=\"C\"><Cmd name=\"x\" args=\"\"/></CmdGroup></P>\n"
        "                              ^\n");
}

TEST(CheckedGroupAfter, HasAnItemThatIsCalledMuchTheSame)
{
    EXPECT_EQ(
        stored("<P>\n" + group("A", cmd("Wait_1")) + "\n" + group("B", cmd("wait2")) + "</P>"),
        "p.xml:3:31: warning: group 'A' has no item 'wait2', and finds this one after it: "
        "'root/A/wait2' would run 'Wait_1'; check the group in paths to it\n"
        "<CmdGroup name=\"B\"><Cmd name=\"wait2\" args=\"\"/></CmdGroup></P>\n"
        "                              ^\n");
}

TEST(CheckedGroupAfter, IsSaidOnceForAGroup)
{
    EXPECT_EQ(stored("<P>\n" + group("A", cmd("T1") + cmd("T2") + cmd("T3")) + "\n" +
                     group("B", cmd("T4") + cmd("T5") + cmd("T6") + cmd("T7")) + "</P>"),
              "p.xml:3:31: warning: group 'A' has no item 'T4', and finds this one after it: "
              "'root/A/T4' "
              "would run 'T1'; check the group in paths to it, and to 2 more here\n"
              "<CmdGroup name=\"B\"><Cmd name=\"T4\" args=\"\"/><Cmd name=\"T5\" args=\"\"/><Cmd "
              "name=...\n"
              "                              ^\n");
}

TEST(CheckedGroupAfter, MayHaveTwoSuchItems)
{
    EXPECT_THAT(
        stored(plan_of(group("A", cmd("T1") + cmd("T2")) + group("B", cmd("T3") + cmd("T4")))),
        HasSubstr("; check the group in paths to it, and to 1 more here\n"));
}

TEST(CheckedGroupAfter, IsOfNoMatterWhereNothingWouldBeRun)
{
    // the position is after the last item of the group in front
    EXPECT_EQ(stored(plan_of(group("A", cmd("x")) + group("B", cmd("y")) +
                             group("C", cmd("z") + cmd("x")))),
              "");
}

TEST(CheckedGroupAfter, IsOfNoMatterWhereTheItemItselfWouldBeRun)
{
    EXPECT_EQ(
        stored("<P>\n" + group("A", cmd("x")) + "\n" + group("B", "") + "\n" +
               group("C", cmd("x")) + "</P>"),
        "p.xml:3:1: warning: group 'B' is empty: 'root/B' would run nothing, and an item of it is "
        "looked for in the groups after it; put items into it\n"
        "<CmdGroup name=\"B\"></CmdGroup>\n"
        "^\n");
}

TEST(CheckedGroupAfter, IsNotReachedPastAGroupThatHasTheItem)
{
    // 'root/A/T2' finds that of B
    EXPECT_EQ(stored(plan_of(group("A", cmd("T1")) + group("B", cmd("z") + cmd("T2")) +
                             group("C", cmd("T2")))),
              "");
}

TEST(CheckedGroupAfter, IsOfNoMatterForNamesOfItsOwn)
{
    EXPECT_EQ(stored(plan_of(group("A", cmd("SpiCheck")) + group("B", cmd("BurnIn")))), "");
    EXPECT_EQ(stored(plan_of(group("A", cmd("a")) + group("B", cmd("b")))), "");
}

// --- order, and what errors are
// ---------------------------------------------------------------------

TEST(Findings, StandInTheOrderOfTheText)
{
    std::vector<std::size_t> offsets;
    for (const Finding &finding :
         check("<P a=\":\">" + cmd("s") + group("A", "<!-- -->" + cmd("x") + cmd("x/y")) +
                   "<CmdGroup/></P>",
               PlanUse::to_send)) {
        offsets.push_back(finding.offset);
    }
    EXPECT_EQ(offsets.size(), 5U);
    EXPECT_TRUE(std::is_sorted(offsets.begin(), offsets.end()));
}

TEST(Findings, AreErrorsOrWarnings)
{
    EXPECT_FALSE(fptest::has_errors({}));
    EXPECT_FALSE(fptest::has_errors(check(plan_of(group("A", "")), PlanUse::stored)));
    EXPECT_TRUE(fptest::has_errors(check("", PlanUse::stored)));
    EXPECT_TRUE(
        fptest::has_errors(check(plan_of(group("A", "") + "<CmdGroup/>"), PlanUse::stored)));
}

TEST(Findings, StandInTheFirstLineWhereTheirPlaceIsNotKnown)
{
    // in UTF-16 without its mark the tags are not found
    std::string text;
    for (const char c : "<?xml version=\"1.0\"?>\n\n" + plan_of(group("", cmd("x")))) {
        text += c;
        text += '\0';
    }
    const auto findings = check(text, PlanUse::stored);
    ASSERT_EQ(findings.size(), 1U);
    EXPECT_EQ(findings[0].offset, 0U); // and not where the root begins, in the third line
    EXPECT_EQ(findings[0].text, "no CmdGroup in it: the library would find nothing to run; put the "
                                "items into <CmdGroup name=\"...\">");
}

// --- any plan, any bytes
// ------------------------------------------------------------------------------

const std::vector<std::string> &pieces()
{
    static const std::vector<std::string> list = {"<?xml version=\"1.0\"?>",
                                                  "<P>",
                                                  "</P>",
                                                  "<CmdGroup name=\"A\">",
                                                  "<CmdGroup name=\"B\">",
                                                  "<CmdGroup>",
                                                  "</CmdGroup>",
                                                  "<Cmd name=\"x\" args=\"\"/>",
                                                  "<Cmd name=\"y\" args=\"\"/>",
                                                  "<Cmd name=\"x_ca\"/>",
                                                  "<Cmd name=\"z\" args=\"\">",
                                                  "</Cmd>",
                                                  "<Cmd/>",
                                                  "<S name=\"s\">",
                                                  "</S>",
                                                  "<!-- c -->",
                                                  "<!---->",
                                                  "<![CDATA[d]]>",
                                                  " text ",
                                                  "\n",
                                                  ":",
                                                  "&amp;",
                                                  "&#58;",
                                                  "&q;",
                                                  "\t",
                                                  "name=\"",
                                                  "\"",
                                                  "<",
                                                  ">",
                                                  "result",
                                                  "<Cmd name=\"a/b\" args=\"\"/>",
                                                  "\xC3\xA9",
                                                  "\xFF"};
    return list;
}

// The findings of a text are ones that can be shown, and those of a plan with
// errors say so of every path that goes wrong.
void expect_sound(const std::string &text)
{
    for (const PlanUse use : {PlanUse::to_send, PlanUse::stored}) {
        std::size_t before = 0;
        for (const Finding &finding : check(text, use)) {
            ASSERT_LE(before, finding.offset) << text;
            ASSERT_LE(finding.offset, text.size()) << text;
            before = finding.offset;
            const std::string lines = fptest::Messages("p", text).of(finding);
            ASSERT_EQ(std::count(lines.begin(), lines.end(), '\n'), 3) << text;
            ASSERT_EQ(lines.find('\r'), std::string::npos) << text;
            ASSERT_LE(finding.text.size(), 2000U) << text;
        }
    }
    if (fptest::has_errors(check(text, PlanUse::stored))) {
        return;
    }
    const auto plan = Plan::load(text);
    ASSERT_TRUE(plan) << text;
    std::set<std::string> groups;
    std::size_t items = 0;
    for (const Plan::Group &one : plan->groups()) {
        ASSERT_TRUE(groups.insert(one.name).second) << text;
        std::vector<std::size_t> run;
        for (const auto &element : plan->run_by(one.name)) {
            if (element) {
                run.push_back(element->number);
            }
        }
        ASSERT_EQ(run.size(), one.items.size()) << text;
        for (std::size_t index = 0; index < run.size(); ++index) {
            const Plan::Element &item = one.items[index];
            ASSERT_EQ(run[index], item.number) << text;
            const auto found = plan->run_by(one.name, *item.name);
            ASSERT_TRUE(found && found->number == item.number) << text;
            ASSERT_TRUE(item.args) << text;
            ++items;
        }
    }
    ASSERT_FALSE(groups.empty()) << text;
    for (mxml_node_t *node : plan->elements()) {
        items -= std::string_view(mxmlGetElement(node)) == "Cmd" ? 1 : 0;
    }
    ASSERT_EQ(items, 0U) << text;
}

TEST(CheckedPlan, WithoutErrorsRunsWhatItSays)
{
    std::mt19937 random(5);
    std::size_t sound = 0;
    for (int round = 0; round < 20000; ++round) {
        std::string content;
        std::vector<std::string> open;
        for (std::size_t left = 1 + random() % 12; left > 0; --left) {
            const std::string name(1, static_cast<char>('a' + random() % 12));
            switch (random() % 16) {
            case 0:
            case 1:
            case 2:
                content += "<CmdGroup name=\"" + name + "\">";
                open.emplace_back("CmdGroup");
                break;
            case 3:
            case 4:
            case 5:
                if (!open.empty()) {
                    content += "</" + open.back() + ">";
                    open.pop_back();
                }
                break;
            case 6:
                content += random() % 2 == 0 ? "<!-- c -->" : " text ";
                break;
            case 7:
                content += random() % 2 == 0 ? "<S>" : "<S name=\"" + name + "\">";
                open.emplace_back("S");
                break;
            case 8:
                content += random() % 4 == 0 ? "<Cmd args=\"\"/>" : "<Cmd name=\"" + name + "\"/>";
                break;
            case 9:
                content += "<Cmd name=\"" + name + "\" args=\"\">";
                open.emplace_back("Cmd");
                break;
            default:
                content += cmd(name);
            }
        }
        for (; !open.empty(); open.pop_back()) {
            content += "</" + open.back() + ">";
        }
        const std::string text = plan_of(content);
        ASSERT_NO_FATAL_FAILURE(expect_sound(text));
        sound += fptest::has_errors(check(text, PlanUse::stored)) ? 0 : 1;
    }
    EXPECT_GT(sound, 500U); // else little has been tried
}

TEST(CheckedPlan, MayBeOfAnyBytes)
{
    std::mt19937 random(3);
    for (int round = 0; round < 20000; ++round) {
        std::string text;
        for (std::size_t left = random() % 25; left > 0; --left) {
            text += pieces()[random() % pieces().size()];
        }
        if (random() % 3 == 0 && !text.empty()) {
            text[random() % text.size()] = static_cast<char>(random());
        }
        ASSERT_NO_FATAL_FAILURE(expect_sound(text));
    }
}

TEST(CheckedPlan, OfTheDemoMayBeDamagedInAnyWay)
{
    const std::string demo = file_text(std::string(QUILLMARK_SOURCE_DIR) + "/plans/demo.xml");
    for (std::size_t size = 0; size < demo.size(); ++size) {
        ASSERT_NO_FATAL_FAILURE(expect_sound(demo.substr(0, size)));
    }
    std::mt19937 random(9);
    for (int round = 0; round < 5000; ++round) {
        std::string text = demo;
        for (std::size_t left = 1 + random() % 3; left > 0; --left) {
            const std::size_t at = random() % text.size();
            switch (random() % 3) {
            case 0:
                text[at] = static_cast<char>(random());
                break;
            case 1:
                text.erase(at, 1 + random() % 20);
                break;
            default:
                text.insert(at, pieces()[random() % pieces().size()]);
            }
            text += text.empty() ? "<" : "";
        }
        ASSERT_NO_FATAL_FAILURE(expect_sound(text));
    }
}

TEST(CheckedPlan, OfTenThousandItemsTakesNoTime)
{
    std::string comments = "<!-- a -->";
    std::string nested;
    std::string groups;
    std::string others;
    for (int i = 0; i < 10000; ++i) {
        const std::string name = "i" + std::to_string(i);
        comments += cmd(name) + " w ";
        nested += "<S" + name + ">" + cmd(name + "/") + "</S" + name + ">";
        groups += group("g" + name, cmd("x") + cmd(name));
        others += "<S name=\"s\"/>" + cmd("T" + name);
    }
    for (const std::string &content : {group("A", comments), group("A", nested), groups,
                                       group("A", others) + group("B", others)}) {
        const auto start = std::chrono::steady_clock::now();
        EXPECT_NE(check(plan_of(content), PlanUse::stored).size(), 0U);
        EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(2));
    }
}

// --- messages
// ----------------------------------------------------------------------------------------

std::string message(const std::string &file, const std::string &text, const Finding &finding)
{
    return fptest::Messages(file, text).of(finding);
}

std::string shown(const std::string &text, std::size_t offset)
{
    return message("f", text, {Finding::Severity::warning, offset, "t"});
}

TEST(Message, HasAPlaceASourceLineAndACaret)
{
    EXPECT_EQ(message("a b.xml", "one\ntwo\nthree\n", {Finding::Severity::error, 5, "it is so"}),
              "a b.xml:2:2: error: it is so\ntwo\n ^\n");
    EXPECT_EQ(message("a", "one", {Finding::Severity::warning, 0, "it is so"}),
              "a:1:1: warning: it is so\none\n^\n");
}

TEST(Message, ShowsAFileNameOnOneLine)
{
    EXPECT_EQ(message("a\n\x1B\xFF", "x", {Finding::Severity::error, 0, "t"}),
              "a\u240A\u241B\uFFFD:1:1: error: t\nx\n^\n");
}

TEST(Message, ShowsTabsAsABlankEach)
{
    EXPECT_EQ(shown("\t\ta\tb", 4), "f:1:5: warning: t\n  a b\n    ^\n");
}

TEST(Message, ShowsNoWindowsLineEnds)
{
    EXPECT_EQ(shown("ab\r\ncd\r\n", 1), "f:1:2: warning: t\nab\n ^\n");
    EXPECT_EQ(shown("ab\r\ncd\r\n", 2), "f:1:3: warning: t\nab\n  ^\n");
    EXPECT_EQ(shown("ab\r\ncd\r\n", 3), "f:1:4: warning: t\nab\n  ^\n");
    EXPECT_EQ(shown("ab\r\ncd\r\n", 4), "f:2:1: warning: t\ncd\n^\n");
}

TEST(Message, ShowsOtherBytesAsSomethingToSee)
{
    EXPECT_EQ(shown("a\x1B\xFF\0b\rc"s, 4),
              "f:1:5: warning: t\na\u241B\uFFFD\u2400b\u240Dc\n    ^\n");
}

TEST(Message, SetsTheCaretUnderTheCharacter)
{
    EXPECT_EQ(shown("\xC3\xA9\xE2\x82\xAC/", 5), "f:1:3: warning: t\n\xC3\xA9\xE2\x82\xAC/\n  ^\n");
    // of two columns, and of none
    EXPECT_EQ(shown("\u65E5\u65E5/", 6), "f:1:3: warning: t\n\u65E5\u65E5/\n    ^\n");
    EXPECT_EQ(shown("e\u0301/", 3), "f:1:3: warning: t\ne\u0301/\n ^\n");
    // inside of one
    EXPECT_EQ(shown("a\xE2\x82\xAC/", 3), "f:1:2: warning: t\na\xE2\x82\xAC/\n ^\n");
}

TEST(Message, FindsTheBeginOfALongCharacter)
{
    EXPECT_EQ(shown("a\U0001F600/", 4), "f:1:2: warning: t\na\U0001F600/\n ^\n");
}

TEST(Message, SetsTheCaretUnderAByteThatIsNoUtf8)
{
    EXPECT_EQ(shown("a\x80\x80\x80\x80/", 4),
              "f:1:5: warning: t\na\uFFFD\uFFFD\uFFFD\uFFFD/\n    ^\n");
    EXPECT_EQ(shown("\xE2\x82/", 1), "f:1:2: warning: t\n\uFFFD\uFFFD/\n ^\n");
}

TEST(Message, DoesNotShowAByteOrderMark)
{
    EXPECT_EQ(shown("\xEF\xBB\xBF<a>", 4), "f:1:2: warning: t\n<a>\n ^\n");
    EXPECT_EQ(shown("\xEF\xBB\xBF<a>", 0), "f:1:1: warning: t\n<a>\n^\n");
}

TEST(Message, OfThePlaceAfterTheEnd)
{
    EXPECT_EQ(shown("ab\n", 3), "f:2:1: warning: t\n\n^\n");
    EXPECT_EQ(shown("ab", 2), "f:1:3: warning: t\nab\n  ^\n");
    EXPECT_EQ(shown("ab", 99), "f:1:3: warning: t\nab\n  ^\n");
    EXPECT_EQ(shown("", 0), "f:1:1: warning: t\n\n^\n");
}

TEST(Message, ComesInAnyOrder)
{
    fptest::Messages messages("f", "\xEF\xBB\xBF"
                                   "a\n\xC3\xA9"
                                   "b");
    const auto place_of = [&messages](std::size_t offset) {
        const std::string text = messages.of({Finding::Severity::warning, offset, "t"});
        return text.substr(0, text.find(' '));
    };
    EXPECT_EQ(place_of(7), "f:2:2:");
    EXPECT_EQ(place_of(6), "f:2:1:");
    EXPECT_EQ(place_of(7), "f:2:2:");
    EXPECT_EQ(place_of(3), "f:1:1:");
    EXPECT_EQ(place_of(1), "f:1:1:");
    EXPECT_EQ(place_of(8), "f:2:3:");
}

TEST(Message, OfALongLineTakesNoTime)
{
    const std::string item = cmd("\xC3\xA9");
    std::string text;
    for (int left = 30000; left > 0; --left) {
        text += item;
    }
    const auto begin = std::chrono::steady_clock::now();
    fptest::Messages messages("f", text);
    std::size_t size = 0;
    for (std::size_t at = 0; at < text.size(); at += item.size()) {
        size += messages.of({Finding::Severity::error, at, "t"}).size();
    }
    EXPECT_GT(size, 100 * text.size() / item.size());
    EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(10));
}

TEST(Message, CutsALongLineAroundThePlace)
{
    std::string line;
    for (int i = 0; i < 200; ++i) {
        line += static_cast<char>('a' + i % 26);
    }
    EXPECT_EQ(shown(line.substr(0, 80), 79),
              "f:1:80: warning: t\n" + line.substr(0, 80) + "\n" + std::string(79, ' ') + "^\n");
    EXPECT_EQ(shown(line, 40),
              "f:1:41: warning: t\n" + line.substr(0, 77) + "...\n" + std::string(40, ' ') + "^\n");
    EXPECT_EQ(shown(line, 41), "f:1:42: warning: t\n..." + line.substr(4, 74) + "...\n" +
                                   std::string(40, ' ') + "^\n");
    EXPECT_EQ(shown(line, 100), "f:1:101: warning: t\n..." + line.substr(63, 74) + "...\n" +
                                    std::string(40, ' ') + "^\n");
    EXPECT_EQ(shown(line, 160),
              "f:1:161: warning: t\n..." + line.substr(123) + "\n" + std::string(40, ' ') + "^\n");
    EXPECT_EQ(shown(line, 190),
              "f:1:191: warning: t\n..." + line.substr(123) + "\n" + std::string(70, ' ') + "^\n");
    EXPECT_EQ(shown(line, 200),
              "f:1:201: warning: t\n..." + line.substr(123) + "\n" + std::string(80, ' ') + "^\n");
}

TEST(Message, CutsALongLineBetweenCharacters)
{
    std::string line;
    for (int i = 0; i < 60; ++i) {
        line += "\u65E5";
    }
    const std::string text = shown(line, 3 * 40);
    EXPECT_THAT(text, testing::StartsWith("f:1:41: warning: t\n..."));
    EXPECT_EQ(text, "f:1:41: warning: t\n..." + line.substr(0, 3 * 18) + line.substr(0, 3 * 20) +
                        "\n" + std::string(39, ' ') + "^\n");
}

// --- what only the whole of it shows -----------------------------------------

TEST(CheckedForm, OfAnotherEncodingThanTheModules)
{
    const std::string text =
        "<?xml version=\"1.0\" encoding=\"ISO-8859-1\"?>\n<P>" + group("G\xE4", cmd("x")) + "</P>";
    EXPECT_EQ(
        stored(text),
        "p.xml:2:21: error: not UTF-8: the library looks at no encoding declaration, and would "
        "read something else here; save it as UTF-8\n"
        "<P><CmdGroup name=\"G\uFFFD\"><Cmd name=\"x\" args=\"\"/></CmdGroup></P>\n" +
            std::string(20, ' ') + "^\n");
}

TEST(CheckedForm, IsSaidOfWhatTheModuleWouldGet)
{
    // what stands in front of the ':' loads, the whole does not
    const std::string text = "<P>" + group("G", cmd("x")) + "</P:>";
    const auto findings = fptest::check(text, fptest::PlanUse::to_send);
    ASSERT_EQ(findings.size(), 2U);
    EXPECT_THAT(findings[0].text, testing::HasSubstr("the library would load it all the same"));
    EXPECT_THAT(findings[1].text, testing::HasSubstr("the library would load them"));
}

TEST(CheckedItem, IsToldToShortenWhatIsLong)
{
    const std::string text = "<P>" + group("G", cmd(std::string(1100, 'n'))) + "</P>";
    EXPECT_THAT(stored(text), testing::HasSubstr("; shorten its name\n"));
    EXPECT_THAT(stored(text), testing::Not(testing::HasSubstr("shorten its args")));
}

} // namespace
