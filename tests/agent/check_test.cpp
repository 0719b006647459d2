// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The plan checker: the cases of check/*.txt, every message as it is printed, and
// what must hold of it for whatever it is given.
#include "check/finding_printer.h"

#include "plan/plan.h"
#include "support/files.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cctype>
#include <chrono>
#include <ctime>
#include <filesystem>
#include <iterator>
#include <map>
#include <ostream>
#include <random>
#include <regex>
#include <set>
#include <sstream>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

using fptest::Finding;
using fptest::Plan;
using fptest::Storing;
using namespace std::string_literals;

namespace
{

std::vector<Finding> findings_in(const std::string &text, Storing storing)
{
    return fptest::check("p.xml", text, storing).findings;
}

std::string messages(const std::string &text, Storing storing)
{
    std::string all;
    for (const Finding &finding : findings_in(text, storing)) {
        all += fptest::FindingPrinter("p.xml", text).printed(finding);
    }
    return all;
}

// --- cases in files -------------------------------------------------------------------

// A case is a line "== KIND: its name", the plan, and below a line of the plan what is
// found in it: the caret where it is printed, and the message.
//
//     == items: an item has no args
//     <Cmd name="x"/>
//     ^ error: item 'x' has no args: ...
//
// KIND is what the lines are: the whole 'plan', one that is 'sent' instead of stored,
// 'groups' in a root, or 'items' in its group 'A'. \xHH, \n, \t and \\ are as in C++,
// \{N*TEXT} is N times TEXT, and a line that ends with \ has no line feed. If a line
// is not printed as it is, "= " begins what is printed below it; the column is
// after a caret that is elsewhere. '#' begins a comment.
struct Case {
    std::string place;
    std::string name;
    std::string kind;
    std::string text;
    std::string findings;

    friend std::ostream &operator<<(std::ostream &out, const Case &one)
    {
        return out << one.place;
    }
};

std::string unescaped(const std::string &line)
{
    static const std::regex kEscape(R"(\\(?:x(..)|\{(\d+)\*([^}]+)\}|(.)))");
    std::string text;
    auto at = line.begin();
    for (std::smatch found; std::regex_search(at, line.end(), found, kEscape);) {
        text.append(at, found[0].first);
        if (found[1].matched) {
            text += static_cast<char>(std::stoi(found[1], nullptr, 16));
        } else if (found[4].matched) {
            text += found[4] == "n" ? "\n" : found[4] == "t" ? "\t" : found[4].str();
        }
        for (int left = found[2].matched ? std::stoi(found[2]) : 0; left > 0; --left) {
            text += found[3];
        }
        at = found[0].second;
    }
    return text.append(at, line.end());
}

std::vector<Case> cases_of(const std::filesystem::path &file)
{
    using Frame = std::pair<std::string, std::string>;
    const std::map<std::string, Frame> frames = {
        {"plan", {"", ""}},
        {"sent", {"", ""}},
        {"groups", {"<P>\n", "</P>\n"}},
        {"items", {"<P>\n<CmdGroup name=\"A\">\n", "</CmdGroup>\n</P>\n"}}};
    const std::regex head("== (plan|sent|groups|items): (.+)");
    const std::regex finding(R"(( *)\^(\d*) ((error|warning): .+))");
    std::vector<Case> cases;
    std::string printed;
    std::smatch found;
    int number = 0;
    for (std::string line : support::lines_of(support::read_file(file))) {
        ++number;
        if (std::regex_match(line, found, head)) {
            std::string name = file.stem().string() + " " + found[2].str();
            std::ranges::replace_if(
                name, [](unsigned char c) { return std::isalnum(c) == 0; }, '_');
            cases.push_back({file.string() + ":" + std::to_string(number), name, found[1],
                             frames.at(found[1]).first, ""});
            printed = "";
        } else if (line.starts_with("#") || (line.empty() && cases.empty())) {
            continue;
        } else if (line.starts_with("= ")) {
            printed = line.substr(2);
        } else if (std::string &text = cases.at(cases.size() - 1).text;
                   std::regex_match(line, found, finding)) {
            const auto ends = std::count(text.begin(), text.end(), '\n');
            const auto column = found[1].length() + 1;
            cases.back().findings +=
                "p.xml:" + std::to_string(text.ends_with('\n') ? ends : ends + 1) + ":" +
                (found[2].length() > 0 ? found[2].str() : std::to_string(column)) + ": " +
                found[3].str() + "\n" + printed + "\n" + found[1].str() + "^\n";
        } else {
            const bool is_continued = line.ends_with('\\');
            line = unescaped(line.substr(0, line.size() - (is_continued ? 1 : 0)));
            text += line + (is_continued ? "" : "\n");
            printed = line.substr(line.rfind('\n') + 1);
        }
    }
    for (Case &one : cases) {
        one.text += frames.at(one.kind).second;
    }
    return cases;
}

std::vector<Case> all_cases()
{
    std::vector<Case> all;
    for (const auto &file :
         std::filesystem::directory_iterator(QUILLMARK_SOURCE_DIR "/tests/agent/check")) {
        if (file.path().extension() == ".txt") {
            std::ranges::copy(cases_of(file), std::back_inserter(all));
        }
    }
    return all;
}

class Check : public testing::TestWithParam<Case>
{
};

TEST_P(Check, Finds)
{
    const Case &one = GetParam();
    EXPECT_EQ(messages(one.text, one.kind == "sent" ? Storing::by_command : Storing::as_file),
              one.findings);
}

INSTANTIATE_TEST_SUITE_P(, Check, testing::ValuesIn(all_cases()),
                         [](const auto &test) { return test.param.name; });

// --- what files do not hold -----------------------------------------------------------

std::string cmd(const std::string &name)
{
    return "<Cmd name=\"" + name + "\" args=\"\"/>";
}

std::string group(const std::string &name, const std::string &content)
{
    return "<CmdGroup name=\"" + name + "\">" + content + "</CmdGroup>";
}

std::string demo_plan()
{
    return support::read_file(QUILLMARK_SOURCE_DIR "/plans/demo.xml");
}

TEST(CheckedPlan, OfTheDemoHasNoFindings)
{
    ASSERT_NE(demo_plan(), "");
    EXPECT_EQ(messages(demo_plan(), Storing::by_command), "");
    EXPECT_EQ(messages(demo_plan(), Storing::as_file), "");
}

TEST(Findings, AreErrorsOrWarnings)
{
    const std::string empty = group("A", "");
    EXPECT_FALSE(fptest::has_errors({}));
    EXPECT_FALSE(fptest::has_errors(findings_in("<P>" + empty + "</P>", Storing::as_file)));
    EXPECT_TRUE(fptest::has_errors(findings_in("", Storing::as_file)));
    EXPECT_TRUE(
        fptest::has_errors(findings_in("<P>" + empty + "<CmdGroup/></P>", Storing::as_file)));
}

// --- any plan, any bytes -------------------------------------------------------------

std::vector<std::string> pieces()
{
    std::istringstream list(R"(<?xml version="1.0"?>|<P>|</P>|<CmdGroup name="A">|)"
                            R"(<CmdGroup name="B">|<CmdGroup>|</CmdGroup>|)"
                            R"(<Cmd name="x" args=""/>|<Cmd name="y" args=""/>|<Cmd name="x_ca"/>|)"
                            R"(<Cmd name="z" args="">|</Cmd>|<Cmd/>|<S name="s">|</S>|)"
                            "<!-- c -->|<!---->|<![CDATA[d]]>| text |\n|:|&amp;|&#58;|&q;|\t|"
                            "name=\"|\"|<|>|result|<Cmd name=\"a/b\" args=\"\"/>|\xC3\xA9|\xFF");
    std::vector<std::string> all;
    for (std::string piece; std::getline(list, piece, '|');) {
        all.push_back(piece);
    }
    return all;
}

const std::vector<std::string> kPieces = pieces();

// The findings of a text are ones that can be shown, and those of a plan with
// errors say so of every path that goes wrong.
void expect_sound(const std::string &text)
{
    for (const Storing storing : {Storing::by_command, Storing::as_file}) {
        std::size_t before = 0;
        for (const Finding &finding : findings_in(text, storing)) {
            ASSERT_LE(before, finding.offset) << text;
            ASSERT_LE(finding.offset, text.size()) << text;
            before = finding.offset;
            const std::string lines = fptest::FindingPrinter("p", text).printed(finding);
            ASSERT_EQ(std::count(lines.begin(), lines.end(), '\n'), 3) << text;
            ASSERT_EQ(lines.find('\r'), std::string::npos) << text;
            ASSERT_LE(finding.text.size(), 2000U) << text;
        }
    }
    if (fptest::has_errors(findings_in(text, Storing::as_file))) {
        return;
    }
    const auto plan = Plan::load_as_library(text);
    ASSERT_TRUE(plan) << text;
    std::set<std::string> groups;
    std::size_t items = 0;
    for (const Plan::Group &one : plan->groups()) {
        ASSERT_TRUE(groups.insert(one.name).second) << text;
        std::vector<std::size_t> run;
        for (const auto &element : plan->resolve(one.name)) {
            if (element) {
                run.push_back(element->number);
            }
        }
        ASSERT_EQ(run.size(), one.items.size()) << text;
        for (std::size_t index = 0; index < run.size(); ++index) {
            const Plan::Element &item = one.items[index];
            ASSERT_EQ(run[index], item.number) << text;
            const auto found = plan->resolve(one.name, *item.name);
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
    // for N comes a name, and for the first of them the end of what is open
    const std::vector<std::string> parts = {"",
                                            "<CmdGroup name=\"N\">",
                                            "<Cmd name=\"N\" args=\"\"/>",
                                            "<Cmd name=\"N\" args=\"\">",
                                            "<Cmd name=\"N\"/>",
                                            "<Cmd args=\"\"/>",
                                            "<S>",
                                            "<S name=\"N\">",
                                            "<!-- c -->",
                                            " text "};
    std::discrete_distribution<std::size_t> any({6, 6, 12, 2, 1, 1, 1, 1, 1, 1});
    std::mt19937 random(5);
    std::size_t sound = 0;
    for (int round = 0; round < 20000; ++round) {
        std::string text = "<P>";
        std::vector<std::string> open;
        for (std::size_t left = 1 + random() % 12; left > 0; --left) {
            std::string part = parts[any(random)];
            if (const std::size_t at = part.find("\"N"); at != part.npos) {
                part[at + 1] = static_cast<char>('a' + random() % 12);
            }
            if (part.empty() && !open.empty()) {
                part = "</" + open.back() + ">";
                open.pop_back();
            } else if (part.ends_with("\">") || part == "<S>") {
                open.push_back(part.substr(1, part.find_first_of(" >") - 1));
            }
            text += part;
        }
        for (; !open.empty(); open.pop_back()) {
            text += "</" + open.back() + ">";
        }
        text += "</P>";
        ASSERT_NO_FATAL_FAILURE(expect_sound(text));
        sound += fptest::has_errors(findings_in(text, Storing::as_file)) ? 0 : 1;
    }
    EXPECT_GT(sound, 500U); // else little has been tried
}

TEST(CheckedPlan, MayBeOfAnyBytes)
{
    std::mt19937 random(3);
    for (int round = 0; round < 20000; ++round) {
        std::string text;
        for (std::size_t left = random() % 25; left > 0; --left) {
            text += kPieces[random() % kPieces.size()];
        }
        if (random() % 3 == 0 && !text.empty()) {
            text[random() % text.size()] = static_cast<char>(random());
        }
        ASSERT_NO_FATAL_FAILURE(expect_sound(text));
    }
}

TEST(CheckedPlan, OfTheDemoMayBeDamagedInAnyWay)
{
    const std::string demo = demo_plan();
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
                text.insert(at, kPieces[random() % kPieces.size()]);
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
        const std::clock_t start = std::clock(); // of this process alone
        EXPECT_NE(findings_in("<P>" + content + "</P>", Storing::as_file).size(), 0U);
        EXPECT_LT(std::clock() - start, 2 * CLOCKS_PER_SEC);
    }
}

// --- messages ------------------------------------------------------------------------

std::string message(const std::string &file, const std::string &text, const Finding &finding)
{
    return fptest::FindingPrinter(file, text).printed(finding);
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
    EXPECT_EQ(message("a\n\x1B\xFF", "x", {Finding::Severity::error, 0, "t"}),
              "a\u240A\u241B\uFFFD:1:1: error: t\nx\n^\n");
}

TEST(Message, ShowsNoWindowsLineEnds)
{
    EXPECT_EQ(shown("ab\r\ncd\r\n", 1), "f:1:2: warning: t\nab\n ^\n");
    EXPECT_EQ(shown("ab\r\ncd\r\n", 2), "f:1:3: warning: t\nab\n  ^\n");
    EXPECT_EQ(shown("ab\r\ncd\r\n", 3), "f:1:4: warning: t\nab\n  ^\n");
    EXPECT_EQ(shown("ab\r\ncd\r\n", 4), "f:2:1: warning: t\ncd\n^\n");
}

TEST(Message, SetsTheCaretUnderTheCharacter)
{
    EXPECT_EQ(shown("\xC3\xA9\xE2\x82\xAC/", 5), "f:1:3: warning: t\n\xC3\xA9\xE2\x82\xAC/\n  ^\n");
    // of two columns, and of none
    EXPECT_EQ(shown("\u65E5\u65E5/", 6), "f:1:3: warning: t\n\u65E5\u65E5/\n    ^\n");
    EXPECT_EQ(shown("e\u0301/", 3), "f:1:3: warning: t\ne\u0301/\n ^\n");
    // under each byte that is no UTF-8
    EXPECT_EQ(shown("a\x80\x80\x80\x80/", 4),
              "f:1:5: warning: t\na\uFFFD\uFFFD\uFFFD\uFFFD/\n    ^\n");
    EXPECT_EQ(shown("\xE2\x82/", 1), "f:1:2: warning: t\n\uFFFD\uFFFD/\n ^\n");
    // a byte order mark is not shown
    EXPECT_EQ(shown("\xEF\xBB\xBF<a>", 4), "f:1:2: warning: t\n<a>\n ^\n");
    EXPECT_EQ(shown("\xEF\xBB\xBF<a>", 0), "f:1:1: warning: t\n<a>\n^\n");
    // after the end
    EXPECT_EQ(shown("ab\n", 3), "f:2:1: warning: t\n\n^\n");
    EXPECT_EQ(shown("ab", 2), "f:1:3: warning: t\nab\n  ^\n");
    EXPECT_EQ(shown("ab", 99), "f:1:3: warning: t\nab\n  ^\n");
    EXPECT_EQ(shown("", 0), "f:1:1: warning: t\n\n^\n");
}

TEST(Message, OfALongLineTakesNoTime)
{
    const std::string item = cmd("\xC3\xA9");
    std::string text;
    for (int left = 30000; left > 0; --left) {
        text += item;
    }
    const auto begin = std::chrono::steady_clock::now();
    fptest::FindingPrinter printer("f", text);
    std::size_t size = 0;
    for (std::size_t at = 0; at < text.size(); at += item.size()) {
        size += printer.printed({Finding::Severity::error, at, "t"}).size();
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
    struct Cut {
        std::size_t size;
        std::size_t offset;
        std::string source;
        std::size_t caret;
    };
    for (const Cut &cut :
         {Cut{80, 79, line.substr(0, 80), 79}, Cut{200, 40, line.substr(0, 77) + "...", 40},
          Cut{200, 41, "..." + line.substr(4, 74) + "...", 40},
          Cut{200, 100, "..." + line.substr(63, 74) + "...", 40},
          Cut{200, 160, "..." + line.substr(123), 40}, Cut{200, 190, "..." + line.substr(123), 70},
          Cut{200, 200, "..." + line.substr(123), 80}}) {
        EXPECT_EQ(shown(line.substr(0, cut.size), cut.offset),
                  "f:1:" + std::to_string(cut.offset + 1) + ": warning: t\n" + cut.source + "\n" +
                      std::string(cut.caret, ' ') + "^\n");
    }
}

TEST(Message, CutsALongLineBetweenCharacters)
{
    std::string line;
    for (int i = 0; i < 60; ++i) {
        line += "\u65E5";
    }
    const std::string text = shown(line, 3 * 40);
    EXPECT_EQ(text, "f:1:41: warning: t\n..." + line.substr(0, 3 * 18) + line.substr(0, 3 * 20) +
                        "\n" + std::string(39, ' ') + "^\n");
}

} // namespace
