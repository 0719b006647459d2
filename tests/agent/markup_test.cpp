// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The scanner: which tags a text has, and where.
#include "plan/markup.h"

#include <gmock/gmock.h>

#include <array>
#include <random>
#include <string>
#include <string_view>
#include <vector>

using fptest::Attribute;
using fptest::Position;
using fptest::Tag;
using testing::ElementsAre;
using testing::IsEmpty;
using namespace std::string_view_literals;

namespace
{

// "KIND NAME|what is there", with " ..." after what is not complete.
std::vector<std::string> scanned(std::string_view text)
{
    constexpr std::array<const char *, 8> kKinds = {
        "open", "empty", "close", "comment", "cdata", "instruction", "declaration", "text"};
    std::vector<std::string> tags;
    for (const Tag &tag : fptest::scan(text)) {
        tags.push_back(std::string(kKinds.at(static_cast<std::size_t>(tag.kind))) +
                       (tag.name.empty() ? "" : " ") + tag.name + "|" +
                       std::string(text.substr(tag.begin, tag.end - tag.begin)) +
                       (tag.complete ? "" : " ..."));
    }
    return tags;
}

// "NAME|what is there|its value" for the attributes of the first tag.
std::vector<std::string> attributes(std::string_view text)
{
    std::vector<std::string> list;
    const std::vector<Tag> tags = fptest::scan(text);
    for (const Attribute &attribute : tags.at(0).attributes) {
        std::string line =
            attribute.name + "|" +
            std::string(text.substr(attribute.begin, attribute.end - attribute.begin));
        if (attribute.has_value) {
            line += "|" + std::string(text.substr(attribute.value_begin,
                                                  attribute.value_end - attribute.value_begin));
        }
        list.push_back(line);
    }
    return list;
}

// "LINE:COLUMN" of every byte, of the end and of what is after it.
std::string places(std::string_view text)
{
    std::string all;
    fptest::Positions positions(text);
    for (std::size_t offset = 0; offset <= text.size() + 1; ++offset) {
        const Position place = positions.of(offset);
        all += (offset > 0 ? " " : "") + std::to_string(place.line) + ":" +
               std::to_string(place.column);
    }
    return all;
}

// --- tags -------------------------------------------------------------------

TEST(Scan, FindsNothingInNothingAndInWhiteSpace)
{
    EXPECT_THAT(scanned(""), IsEmpty());
    EXPECT_THAT(scanned(" \t\r\n "), IsEmpty());
}

TEST(Scan, FindsEveryKindOfTagInOrder)
{
    EXPECT_THAT(
        scanned("<?xml version=\"1.0\"?>\n<!DOCTYPE Plan>\r\n<Plan>\n\t<!-- one > two -->\n"
                "  some  words\n <A name=\"x\"/><![CDATA[ <b> ]]></Plan >\n"),
        ElementsAre("instruction xml|<?xml version=\"1.0\"?>", "declaration|<!DOCTYPE Plan>",
                    "open Plan|<Plan>", "comment|<!-- one > two -->", "text|some  words",
                    "empty A|<A name=\"x\"/>", "cdata|<![CDATA[ <b> ]]>", "close Plan|</Plan >"));
}

TEST(Scan, TakesTextUpToItsLastWord)
{
    EXPECT_THAT(scanned("a\n b \n<x> \n c</x>d "),
                ElementsAre("text|a\n b", "open x|<x>", "text|c", "close x|</x>", "text|d"));
}

TEST(Scan, EndsATagAfterQuotesOnly)
{
    EXPECT_THAT(scanned("<a b='<c>/>'><d e=\"?>'/>\"/>"),
                ElementsAre("open a|<a b='<c>/>'>", "empty d|<d e=\"?>'/>\"/>"));
    // a question mark, too, makes it an empty one
    EXPECT_THAT(scanned("<a b='c'?>d"), ElementsAre("empty a|<a b='c'?>", "text|d"));
}

TEST(Scan, SeesNoEndInACommentOfNothingOrAfterThreeHyphens)
{
    EXPECT_THAT(scanned("<!----><a/><!-- b --><c/>"),
                ElementsAre("comment|<!----><a/><!-- b -->", "empty c|<c/>"));
    EXPECT_THAT(scanned("<!--><a/>-->"), ElementsAre("comment|<!--><a/>-->"));
    EXPECT_THAT(scanned("<!---><a/>-->"), ElementsAre("comment|<!---><a/>-->"));
    EXPECT_THAT(scanned("<!--a-->b"), ElementsAre("comment|<!--a-->", "text|b"));
    EXPECT_THAT(scanned("<!-- a ---> b --> c"), ElementsAre("comment|<!-- a ---> b -->", "text|c"));
}

TEST(Scan, EndsADeclarationAtItsFirstBracket)
{
    EXPECT_THAT(
        scanned("<!DOCTYPE a [<!ELEMENT b ANY>]><a/>"),
        ElementsAre("declaration|<!DOCTYPE a [<!ELEMENT b ANY>", "text|]>", "empty a|<a/>"));
}

TEST(Scan, EndsAnInstructionAtItsFirstQuestionMarkAndBracket)
{
    EXPECT_THAT(scanned("<?a b='?>'?>"), ElementsAre("instruction a|<?a b='?>", "text|'?>"));
    EXPECT_THAT(scanned("<?>a"), ElementsAre("instruction|<?>", "text|a"));
    EXPECT_THAT(scanned("<?a?>"), ElementsAre("instruction a|<?a?>"));
}

TEST(Scan, EndsAnUnfinishedTagWithTheText)
{
    EXPECT_THAT(scanned("<"), ElementsAre("open|< ..."));
    EXPECT_THAT(scanned("<a"), ElementsAre("open a|<a ..."));
    EXPECT_THAT(scanned("<a b"), ElementsAre("open a|<a b ..."));
    EXPECT_THAT(scanned("<a b="), ElementsAre("open a|<a b= ..."));
    EXPECT_THAT(scanned("<a b=\"c>"), ElementsAre("open a|<a b=\"c> ..."));
    EXPECT_THAT(scanned("<a b=\"c\" "), ElementsAre("open a|<a b=\"c\"  ..."));
    EXPECT_THAT(scanned("<a /"), ElementsAre("open a|<a / ..."));
    EXPECT_THAT(scanned("</"), ElementsAre("close|</ ..."));
    EXPECT_THAT(scanned("</a "), ElementsAre("close a|</a  ..."));
    EXPECT_THAT(scanned("<!"), ElementsAre("declaration|<! ..."));
    EXPECT_THAT(scanned("<!--"), ElementsAre("comment|<!-- ..."));
    EXPECT_THAT(scanned("<!-- --"), ElementsAre("comment|<!-- -- ..."));
    EXPECT_THAT(scanned("<![CDATA[]]"), ElementsAre("cdata|<![CDATA[]] ..."));
    EXPECT_THAT(scanned("<?xml ?"), ElementsAre("instruction xml|<?xml ? ..."));
}

TEST(Scan, GoesOnWithTheNextTagWhereOneBreaksOffAndPassesOverStrayCharacters)
{
    EXPECT_THAT(scanned("<a b=\"c\"\n<d/>"),
                ElementsAre("open a|<a b=\"c\"\n ...", "empty d|<d/>"));
    EXPECT_THAT(scanned("<a<d/>"), ElementsAre("open a|<a ...", "empty d|<d/>"));
    EXPECT_THAT(scanned("<a / b='c' ?d>"), ElementsAre("open a|<a / b='c' ?d>"));
}

// --- attributes --------------------------------------------------------------

TEST(ScannedAttributes, HaveNamesAndValuesInEitherQuotesWithOrWithoutBlanksBetweenThem)
{
    EXPECT_THAT(attributes("<Cmd name=\"x\" args='a \"b\"'\n\td = \"\" />"),
                ElementsAre("name|name=\"x\"|x", "args|args='a \"b\"'|a \"b\"", "d|d = \"\"|"));
    EXPECT_THAT(attributes("<a b=\"c\"d='e'/>"), ElementsAre("b|b=\"c\"|c", "d|d='e'|e"));
}

TEST(ScannedAttributes, MayLackTheirValue)
{
    EXPECT_THAT(attributes("<Cmd result name=\"x\" progress\n/>"),
                ElementsAre("result|result", "name|name=\"x\"|x", "progress|progress"));
    EXPECT_THAT(attributes("<Cmd result>"), ElementsAre("result|result"));
    EXPECT_THAT(attributes("<Cmd result/>"), ElementsAre("result|result"));
}

TEST(ScannedAttributes, MayHaveQuotesElsewhereOrNone)
{
    EXPECT_THAT(attributes("<a b=c d= e/>"), ElementsAre("b|b=c|c", "d|d= e|e"));
    EXPECT_THAT(attributes("<a b==c>"), ElementsAre("b|b==c|=c"));
    EXPECT_THAT(attributes("<a 'b c'=\"d\" \"e>"), ElementsAre("'b c'|'b c'=\"d\"|d", "\"e>|\"e>"));
    EXPECT_THAT(attributes("<a b=\"c d='e'/>"), ElementsAre("b|b=\"c d='e'/>|c d='e'/>"));
    EXPECT_THAT(attributes("<a b="), ElementsAre("b|b=|"));
}

TEST(ScannedAttributes, BelongToElementsOnly)
{
    EXPECT_THAT(attributes("<?xml version=\"1.0\"?>"), IsEmpty());
    EXPECT_THAT(attributes("<!DOCTYPE a SYSTEM=\"b\">"), IsEmpty());
}

// --- any bytes ----------------------------------------------------------------

TEST(Scan, CoversWhateverItIsGiven)
{
    std::mt19937 random(7);
    constexpr std::string_view kBytes = "<>/?!-=\"'& ab[]CDATA\n\0\xC3\xA9\xFF"sv;
    for (int round = 0; round < 20000; ++round) {
        std::string text;
        for (std::size_t size = random() % 40; text.size() < size;) {
            text += kBytes[random() % kBytes.size()];
        }
        std::size_t at = 0;
        for (const Tag &tag : fptest::scan(text)) {
            ASSERT_LE(at, tag.begin) << text;
            ASSERT_LT(tag.begin, tag.end) << text;
            ASSERT_LE(tag.end, text.size()) << text;
            // nothing but white space is left out
            ASSERT_EQ(text.find_first_not_of(" \t\r\n", at), tag.begin) << text;
            at = tag.end;
            std::size_t inside = tag.begin;
            for (const Attribute &attribute : tag.attributes) {
                ASSERT_LT(inside, attribute.begin) << text;
                ASSERT_LT(attribute.begin, attribute.end) << text;
                ASSERT_LE(attribute.end, tag.end) << text;
                ASSERT_FALSE(attribute.name.empty()) << text;
                if (attribute.has_value) {
                    ASSERT_LT(attribute.begin, attribute.value_begin) << text;
                    ASSERT_LE(attribute.value_begin, attribute.value_end) << text;
                    ASSERT_LE(attribute.value_end, attribute.end) << text;
                }
                inside = attribute.end - 1;
            }
        }
        ASSERT_EQ(text.find_first_not_of(" \t\r\n", at), std::string::npos) << text;
    }
}

// --- positions ------------------------------------------------------------------

TEST(PositionInText, CountsLinesAndCharactersFromOne)
{
    EXPECT_EQ(places(""), "1:1 1:1");
    EXPECT_EQ(places("abc"), "1:1 1:2 1:3 1:4 1:4");
    EXPECT_EQ(places("a\nbc\n\nd"), "1:1 1:2 2:1 2:2 2:3 3:1 4:1 4:2 4:2");
    EXPECT_EQ(places("a\n"), "1:1 1:2 2:1 2:1");
    EXPECT_EQ(places("\u00E9\u20AC\U0001F600x"), "1:1 1:1 1:2 1:2 1:2 1:3 1:3 1:3 1:3 1:4 1:5 1:5");
    // bytes that are no UTF-8, one by one
    EXPECT_EQ(places("\xFF\xA9\xC3x\xE2\x82"), "1:1 1:2 1:3 1:4 1:5 1:6 1:7 1:7");
    EXPECT_EQ(places("\xC1\x80\xC2\x80"), "1:1 1:2 1:3 1:3 1:4 1:4");
    // no byte order mark at the beginning
    EXPECT_EQ(places("\uFEFF<\n\uFEFFx"), "1:1 1:1 1:1 1:1 1:2 2:1 2:1 2:1 2:2 2:3 2:3");
}

TEST(PositionInText, ComesInAnyOrder)
{
    const std::string text = "\uFEFFa\n\u00E9b";
    fptest::Positions positions(text);
    for (const std::size_t offset : {7U, 6U, 7U, 3U, 1U, 8U}) {
        const Position place = positions.of(offset);
        const Position alone = fptest::Positions(text).of(offset);
        EXPECT_EQ(place.line, alone.line) << offset;
        EXPECT_EQ(place.column, alone.column) << offset;
    }
}

} // namespace
