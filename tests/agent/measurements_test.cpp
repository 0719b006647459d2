// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What lines of an item's output measure.
#include "run/measurements.h"
#include "run/verdict.h"

#include <gmock/gmock.h>

using namespace fptest;
using namespace testing;

namespace
{

// Of an output that comes in pieces of that size.
Measured measured(const std::string &output, std::size_t size = std::string::npos)
{
    Measured result;
    MeasureReader reader;
    for (std::size_t at = 0; at < output.size(); at += std::min(size, output.size())) {
        reader.read(std::string_view(output).substr(at, size), result);
    }
    reader.end(result);
    return result;
}

std::vector<std::string> texts(const Measured &measured)
{
    std::vector<std::string> all;
    for (const Measurement &one : measured.kept) {
        all.push_back(one.name + " " + words_of(one));
    }
    return all;
}

std::vector<std::string> texts(const std::string &output, std::size_t size = std::string::npos)
{
    return texts(measured(output, size));
}

TEST(Measurements, AreLinesOfTheOutput)
{
    const std::string output = "#measure a 1\n"
                               "text #measure b\n"
                               "#measured d 4\n"
                               "#measure\te\t 5  mV \t -1 2.50\r\n"
                               "#meas\n"
                               "\n"
                               "#measure a 6 % - 7\n"
                               "#measure last 8 - 9 -";
    for (const std::size_t size : {std::string::npos, std::size_t{1}, std::size_t{7}}) {
        EXPECT_THAT(texts(output, size),
                    ElementsAre("a 1", "e 5 mV -1 2.5", "a 6 % - 7", "last 8 - 9 -"));
        EXPECT_EQ(warning_of(measured(output, size)), "");
    }
}

// Where a program prints faster than that is read.
TEST(Measurements, AreNotMadeOfLinesOfWhichAPieceIsLeftOut)
{
    Measured result;
    MeasureReader reader;
    reader.read("#measure a 1\n#measure b 1", result);
    reader.skip();
    reader.read("5\n#measure c 2\n#measure d 3", result);
    reader.skip();
    reader.read("#measure e", result);
    reader.read(" 4\r#measure f 5\n", result);
    EXPECT_THAT(texts(result), ElementsAre("a 1", "c 2", "f 5"));
    EXPECT_EQ(warning_of(result), "");
}

// An earlier print may have left the line without an end.
TEST(Measurements, StandAtTheStartOfALineOrAfterACarriageReturn)
{
    const std::string output = "10%\r#measure a 1\rdone\n"
                               ".#measure b 2\n"
                               "use: #measure NAME VALUE\n"
                               "#measure#measure c 3\n"
                               "#measure d 4";
    for (const std::size_t size : {std::string::npos, std::size_t{1}, std::size_t{7}}) {
        EXPECT_THAT(texts(output, size), ElementsAre("a 1", "d 4"));
        EXPECT_EQ(warning_of(measured(output, size)),
                  "2 malformed #measure lines: '#measure b 2': it is not at the start of its line");
    }
    EXPECT_EQ(measured("x #measure a 3 V 0 2\n").out, 0U);
    for (const std::string lost : {"x 1,5", "x uV 1 2", "x -.5V", "refused: '' is not a number",
                                   "a 1 V 0 2 #measure b 9 V 0 2", "a 1 V 0 2#measure b 9 V 0 2"}) {
        EXPECT_EQ(measured("reading... #measure " + lost).malformed, 1U) << lost;
    }
}

TEST(Measurements, HaveDecimalNumbers)
{
    for (const auto &[word, read] :
         std::vector<std::pair<std::string, std::string>>{{"-1.50", "-1.5"},
                                                          {"+2", "2"},
                                                          {".5", "0.5"},
                                                          {"-.5", "-0.5"},
                                                          {"7.", "7"},
                                                          {"2e-6", "2e-06"},
                                                          {"1E3", "1000"},
                                                          {"+0.25", "0.25"},
                                                          {"007", "7"}}) {
        EXPECT_THAT(texts("#measure x " + word), ElementsAre("x " + read));
    }
    for (const std::string word : {"nan", "inf", "-infinity", "0x10", "1e999", "1,5", "1_000", "5V",
                                   "-", "+", "+-1", "++1", "--1", "e5", "NAN(1)", "1e"}) {
        EXPECT_EQ(warning_of(measured("#measure x " + word)),
                  "1 malformed #measure line: '#measure x " + word + "': '" + word +
                      "' is not a number such as -1.5 or 2e-6");
    }
}

// A wrong chip's number is no right one, nor shown as another.
TEST(Measurements, HaveTheDigitsThatAreKept)
{
    for (const std::string id :
         {"9007199254740993", "-76561198012345678", "00012345678901234567", "36028797018963968"}) {
        EXPECT_EQ(warning_of(measured("#measure x " + id)),
                  "1 malformed #measure line: '#measure x " + id + "': '" + id +
                      "' has more digits than are kept");
        EXPECT_EQ(measured("#measure x 1 - - " + id).malformed, 1U);
    }
    for (const std::string id : {"9007199254740992", "-0009007199254740991", "123456789012345",
                                 "10000000000000000000000", "0", "-0"}) {
        EXPECT_EQ(measured("#measure x " + id + " - " + id + " " + id).kept.size(), 1U) << id;
    }
    for (const auto &[value, limit] : std::vector<std::pair<std::string, std::string>>{
             {"0.30000000000000001", "0.3"}, {"9007199254740993.0", "9007199254740992"}}) {
        for (const auto &limits : {limit + " -", "- " + limit}) {
            EXPECT_EQ(warning_of(measured("#measure x " + value + " V " + limits)),
                      "1 malformed #measure line: '#measure x " + value + " V " + limits + "': '" +
                          value + "' and '" + limit + "' differ in digits that are not kept");
        }
    }
    // as bc writes it; limits in other words
    for (const std::string words :
         {"x .33333333333333333333 - .3 .4", "x 1200 - 1.2e3 1200.00", "x -.5 - -0.50 -5e-1",
          "x 0.0 - -0 0e-99999999999999999999", "x +7 - 7 7."}) {
        const auto read = measured("#measure " + words);
        EXPECT_EQ(warning_of(read), "");
        EXPECT_EQ(read.out, 0U) << words;
    }
}

TEST(Measurements, HaveNamesAndUnitsThatEveryFormatTakes)
{
    const std::string name(64, 'n');
    EXPECT_THAT(texts("#measure " + name + " 1"), ElementsAre(name + " 1"));
    EXPECT_THAT(texts("#measure _a.b-C9 1 \u00B5A/\u221AHz"),
                ElementsAre("_a.b-C9 1 \u00B5A/\u221AHz"));
    for (const std::string &wrong :
         std::vector<std::string>{name + "n", "a/b", "-a", "a\u00B5", "<a>"}) {
        EXPECT_THAT(warning_of(measured("#measure " + wrong + " 1")),
                    HasSubstr("' is not a name: letters, digits, '_', '.' and '-', at most 64"));
    }
    for (const std::string wrong : {"\x1b[2J", "a\xff", "abcdefghijklmnopq", "\u202Ea"}) {
        EXPECT_THAT(warning_of(measured("#measure x 1 " + wrong)),
                    HasSubstr("' is not a unit of 1 to 16 characters"));
    }
}

TEST(Measurements, AreMalformedWithAReason)
{
    for (const auto &[words, why] : std::vector<std::pair<std::string, std::string>>{
             {"", "it needs a name and a value"},
             {" ", "it needs a name and a value"},
             {" x", "it needs a name and a value"},
             {" x 1 V 2", "LOW is there without HIGH: write '-' for no limit"},
             {" x 1 2 3", "'2' is in the unit's place: write '-' for none"},
             {" x 1 0", "'0' is in the unit's place: write '-' for none"},
             {" x 1 V a 2", "'a' is not a number such as -1.5 or 2e-6"},
             {" x 1 V 3 2", "LOW 3 is above HIGH 2"},
             {" x 1 V 2 3 4", "'4' is one word too many"}}) {
        EXPECT_EQ(warning_of(measured("#measure" + words)),
                  "1 malformed #measure line: '#measure" + words + "': " + why);
    }
    const Measured two = measured("#measure\n#measure a 1\n#measure b\n");
    EXPECT_THAT(texts(two), ElementsAre("a 1"));
    EXPECT_EQ(warning_of(two),
              "2 malformed #measure lines: '#measure': it needs a name and a value");
}

TEST(Measurements, OfALineWithoutEndAreMalformed)
{
    const std::string line = "#measure a 1" + std::string(100'000, ' ') + "V\n#measure b 2\n";
    for (const std::size_t size : {std::string::npos, std::size_t{100}}) {
        EXPECT_THAT(texts(line, size), ElementsAre("b 2"));
        EXPECT_THAT(warning_of(measured(line, size)), EndsWith("...': longer than 512 bytes"));
    }
}

TEST(Measurements, AreKeptUpToANumberAndJudgedBeyond)
{
    std::string output;
    for (std::size_t at = 0; at < Measured::kMost; ++at) {
        output += "#measure a 1 V 0 2\n";
    }
    const Measured result = measured(output + "#measure a 3 V 0 2\n#measure a 1\n");
    EXPECT_EQ(result.kept.size(), Measured::kMost);
    EXPECT_EQ(warning_of(result), "2 measurements after the first 256 left out");
    EXPECT_EQ(what_is_out(result), "1 measurement out of limits: a 3 V (0 to 2)");
}

TEST(Measurements, OfAProgramThatGoesWildAreSaidToBeNotJudged)
{
    constexpr std::size_t kMost = 1'000'000;
    std::string output;
    for (std::size_t at = 0; at < kMost - 1; ++at) {
        output += "#measure a 1\n";
    }
    const Measured result = measured(output + "#measure z 3 V 0 2\n#measure z 4 V 0 2\n");
    EXPECT_EQ(result.out, 1U);
    EXPECT_EQ(warning_of(result), "999744 measurements after the first 256 left out; 1 after "
                                  "1000000 not judged");
}

TEST(Measurements, MayBeEqualToTheirLimits)
{
    EXPECT_EQ(measured("#measure a 1 V 1 2\n#measure a 2 V 1 2\n#measure a 5 - - 5\n").out, 0U);
    EXPECT_EQ(measured("#measure a 0.999 V 1 2\n#measure a 2.001 V 1 2\n"
                       "#measure a 6 - - 5\n#measure a 6 - 7 -\n")
                  .out,
              4U);
}

class LimitVerdict : public Test
{
  protected:
    LimitVerdict()
    {
        item_.report = {"100", "0", false, "fine"};
        item_.measured = measured("#measure vcore 1.4 V - 1.3\n#measure noise 9 LSB 10 20\n");
        context_.judge_limits = true;
    }

    Verdict verdict() const
    {
        return judge(RunningItem(), item_, context_);
    }

    ItemRun item_;
    JudgeContext context_;
};

TEST_F(LimitVerdict, FailsAnItemThatMeasuresOutOfLimits)
{
    EXPECT_EQ(verdict().outcome, Outcome::failed);
    EXPECT_TRUE(verdict().overruled);
    EXPECT_EQ(verdict().reason, "2 measurements out of limits: vcore 1.4 V (at most 1.3) ..., "
                                "though it reported the result 0");
}

TEST_F(LimitVerdict, IsNotAskedForUnlessTheUserDoes)
{
    context_.judge_limits = false;
    EXPECT_EQ(verdict().outcome, Outcome::passed);
}

TEST_F(LimitVerdict, LeavesOtherFailuresTheirReasons)
{
    item_.report.result = "1";
    EXPECT_EQ(verdict().reason, "reported the result 1");
}

} // namespace
