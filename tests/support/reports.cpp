// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reports.h"

#include <expat.h>
#include <gmock/gmock.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <iterator>
#include <memory>
#include <ostream>
#include <utility>

namespace support
{

// --- XML ---------------------------------------------------------------------

namespace
{

// The elements that are open while a document is read.
using Open = std::vector<Element>;

void start(void *data, const char *name, const char **attributes)
{
    Element element;
    element.name = name;
    for (; *attributes != nullptr; attributes += 2) {
        element.attributes[attributes[0]] = attributes[1];
    }
    static_cast<Open *>(data)->push_back(std::move(element));
}

void end(void *data, const char * /* name */)
{
    Open &open = *static_cast<Open *>(data);
    Element done = std::move(open.back());
    open.pop_back();
    open.back().children.push_back(std::move(done));
}

void characters(void *data, const char *text, int size)
{
    static_cast<Open *>(data)->back().text.append(text, static_cast<std::size_t>(size));
}

} // namespace

std::vector<Element> Element::all(const std::string &child) const
{
    std::vector<Element> found;
    std::copy_if(children.begin(), children.end(), std::back_inserter(found),
                 [&](const Element &element) { return element.name == child; });
    return found;
}

std::map<std::string, std::string> Element::properties() const
{
    std::map<std::string, std::string> values;
    for (const Element &list : all("properties")) {
        for (const Element &one : list.all("property")) {
            values[one.attributes.at("name")] = one.attributes.at("value");
        }
    }
    return values;
}

Element parse_xml(const std::string &text)
{
    const std::unique_ptr<XML_ParserStruct, decltype(&XML_ParserFree)> parser(
        XML_ParserCreate(nullptr), &XML_ParserFree);
    Open open(1);
    XML_SetUserData(parser.get(), &open);
    XML_SetElementHandler(parser.get(), start, end);
    XML_SetCharacterDataHandler(parser.get(), characters);
    if (XML_Parse(parser.get(), text.data(), static_cast<int>(text.size()), 1) != XML_STATUS_OK) {
        ADD_FAILURE() << "line " << XML_GetCurrentLineNumber(parser.get()) << ": "
                      << XML_ErrorString(XML_GetErrorCode(parser.get())) << "\n"
                      << text.substr(0, 2000);
        return {};
    }
    return open.front().children.front();
}

std::string verdict_of(const Element &test)
{
    std::vector<std::string> verdicts;
    for (const Element &child : test.children) {
        if (child.name == "error") {
            verdicts.push_back(child.attributes.at("type"));
        } else if (child.name == "failure" || child.name == "skipped") {
            verdicts.push_back(child.name);
        }
    }
    EXPECT_LE(verdicts.size(), 1U);
    return verdicts.empty() ? "passed" : verdicts.front();
}

// --- JSON lines --------------------------------------------------------------

std::vector<nlohmann::json> events_of(const std::string &text)
{
    EXPECT_TRUE(text.empty() || text.ends_with('\n')) << text;
    std::vector<nlohmann::json> events;
    for (const std::string &line : lines_of(text)) {
        events.push_back(nlohmann::json::parse(line, nullptr, false));
        EXPECT_FALSE(events.back().is_discarded()) << line;
    }
    return events;
}

std::vector<nlohmann::json> events_of(const std::string &text, const std::string &kind)
{
    auto events = events_of(text);
    std::erase_if(events, [&](const nlohmann::json &event) { return event.at("event") != kind; });
    return events;
}

Lines outcomes(const std::string &text)
{
    Lines all;
    for (const nlohmann::json &end : events_of(text, "end")) {
        all.push_back(end.at("item").get<std::string>() + ": " +
                      end.at("outcome").get<std::string>());
    }
    return all;
}

Lines reasons(const std::string &text)
{
    Lines all;
    for (const nlohmann::json &end : events_of(text, "end")) {
        all.push_back(end.at("reason").is_null() ? "" : end.at("reason").get<std::string>());
    }
    return all;
}

// --- TAP ---------------------------------------------------------------------

namespace
{

// What is after the number of a point.
struct PointText {
    std::string name;
    std::optional<std::string> directive;
};

// A directive begins at a '#' that is not escaped.
PointText parse_point(const std::string &text)
{
    PointText point;
    std::string *part = &point.name;
    for (std::size_t at = 0; at < text.size(); ++at) {
        if (text[at] == '\\') {
            ++at;
            EXPECT_TRUE(at < text.size() && (text[at] == '#' || text[at] == '\\')) << text;
        } else if (text[at] == '#') {
            EXPECT_FALSE(point.directive) << text;
            part = &point.directive.emplace();
        }
        *part += text.substr(at, 1);
    }
    return point;
}

class TapParser
{
  public:
    explicit TapParser(const std::string &text) : lines_(lines_of(text))
    {
        EXPECT_THAT(text, ::testing::EndsWith("\n"));
    }

    Tap parse()
    {
        Tap tap;
        tap.version = take("TAP version ").value_or("");
        EXPECT_NE(tap.version, "");
        if (starts_plan()) {
            tap.planned = plan("");
        }
        while (at_ < lines_.size()) {
            if (const auto name = take("# Subtest: ")) {
                subtest(tap, *name);
            } else if (tap.planned == 0 && starts_plan()) {
                tap.planned = plan("");
            } else if (const auto reason = take("Bail out!  ")) {
                tap.bail_out = *reason;
                EXPECT_EQ(at_, lines_.size()) << "more after the end";
            } else if (const auto comment = take("# ")) {
                tap.comments.push_back(*comment);
            } else {
                wrong();
            }
        }
        return tap;
    }

  private:
    static constexpr char kIndent[] = "    ";

    // The rest of the next line, which is taken if it begins so.
    std::optional<std::string> take(const std::string &start)
    {
        if (at_ == lines_.size() || !lines_[at_].starts_with(start)) {
            return std::nullopt;
        }
        const std::string &line = lines_[at_++];
        return line.substr(start.size());
    }

    void wrong()
    {
        ADD_FAILURE() << "line " << at_ + 1 << ": " << lines_[at_];
        ++at_;
    }

    bool starts_plan() const
    {
        return at_ < lines_.size() && lines_[at_].starts_with("1..");
    }

    std::size_t plan(const std::string &indent)
    {
        const std::optional<std::string> size = take(indent + "1..");
        EXPECT_TRUE(size);
        return size ? std::stoul(*size) : 0;
    }

    void subtest(Tap &tap, const std::string &name)
    {
        const std::size_t planned = plan(kIndent);
        std::vector<Point> inside;
        for (;;) {
            while (const auto comment = take(std::string(kIndent) + "# ")) {
                tap.comments.push_back(*comment);
            }
            std::optional<Point> one = point(kIndent, inside.size() + 1);
            if (!one) {
                break;
            }
            inside.push_back(std::move(*one));
        }
        std::optional<Point> whole = point("", tap.points.size() + 1);
        if (!whole) {
            EXPECT_EQ(at_, lines_.size()) << "a subtest that is not closed";
            tap.open = std::move(inside);
            return;
        }
        EXPECT_EQ(whole->name, parse_point(name).name);
        EXPECT_EQ(inside.size(), planned);
        whole->inside = std::move(inside);
        whole->planned = planned;
        tap.points.push_back(std::move(*whole));
    }

    std::optional<Point> point(const std::string &indent, std::size_t number)
    {
        Point point;
        std::optional<std::string> rest = take(indent + "ok " + std::to_string(number) + " - ");
        point.ok = rest.has_value();
        if (!rest) {
            rest = take(indent + "not ok " + std::to_string(number) + " - ");
        }
        if (!rest) {
            return std::nullopt;
        }
        PointText text = parse_point(*rest);
        if (text.directive) {
            EXPECT_TRUE(text.directive->starts_with("# SKIP ")) << *rest;
            EXPECT_TRUE(text.name.ends_with(' ')) << *rest;
            text.name.pop_back();
            point.skipped = text.directive->substr(7);
        }
        point.name = text.name;
        diagnosis(indent + "  ", point);
        return point;
    }

    void diagnosis(const std::string &indent, Point &point)
    {
        if (!take(indent + "---")) {
            return;
        }
        while (!take(indent + "...")) {
            const std::string line = take(indent).value_or("");
            const std::size_t colon = line.find(": ");
            if (colon == std::string::npos) {
                ADD_FAILURE() << "no end of the diagnosis at line " << at_;
                return;
            }
            const std::string value = line.substr(colon + 2);
            EXPECT_FALSE(point.diagnosis.contains(line.substr(0, colon))) << line;
            // YAML reads it as JSON does
            const auto json = nlohmann::json::parse(value);
            point.diagnosis[line.substr(0, colon)] =
                json.is_string() ? json.get<std::string>() : value;
        }
    }

    Lines lines_;
    std::size_t at_ = 0;
};

} // namespace

Tap parse_tap(const std::string &text)
{
    return TapParser(text).parse();
}

Ended prove(const std::string &path)
{
    return run({.arguments = {"/usr/bin/prove", "--exec", "cat", path}, .is_one_stream = true});
}

// --- counts --------------------------------------------------------------------

void PrintTo(const Tally &tally, std::ostream *stream)
{
    *stream << tally.passed << " passed, " << tally.failed << " failed, " << tally.not_run
            << " not run";
}

Tally tally_of_json(const std::string &text)
{
    Tally tally;
    for (const nlohmann::json &end : events_of(text, "end")) {
        const std::string outcome = end.at("outcome");
        ++(outcome == "passed"    ? tally.passed
           : outcome == "not run" ? tally.not_run
                                  : tally.failed);
    }
    const auto finish = events_of(text, "finish");
    EXPECT_EQ(finish.size(), 1U);
    if (!finish.empty()) {
        EXPECT_EQ(finish[0].at("passed"), tally.passed);
        EXPECT_EQ(finish[0].at("failed"), tally.failed);
        EXPECT_EQ(finish[0].at("not_run"), tally.not_run);
    }
    return tally;
}

Tally tally_of_junit(const std::string &text)
{
    Tally tally;
    const Element top = parse_xml(text);
    for (const Element &suite : top.all("testsuite")) {
        for (const Element &test : suite.all("testcase")) {
            const std::string verdict = verdict_of(test);
            ++(verdict == "passed"                            ? tally.passed
               : verdict == "not run" || verdict == "skipped" ? tally.not_run
                                                              : tally.failed);
        }
    }
    const auto number = [&](const char *name) { return std::stoul(top.attributes.at(name)); };
    EXPECT_EQ(number("tests"), tally.passed + tally.failed + tally.not_run);
    EXPECT_EQ(number("failures") + number("errors") + number("skipped"),
              tally.failed + tally.not_run);
    return tally;
}

Tally tally_of_tap(const std::string &text)
{
    Tally tally;
    const Tap tap = parse_tap(text);
    EXPECT_EQ(tap.planned, tap.points.size());
    for (const Point &suite : tap.points) {
        EXPECT_EQ(suite.planned, suite.inside.size());
        EXPECT_EQ(suite.ok, std::ranges::all_of(suite.inside, &Point::ok));
        for (const Point &point : suite.inside) {
            ++(point.skipped ? tally.not_run : point.ok ? tally.passed : tally.failed);
        }
    }
    return tally;
}

} // namespace support
