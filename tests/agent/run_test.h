// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the tests of fptest's runs share: the items that they run, and what is
// reported of them.
#pragma once

#include "fptest_runner.h"
#include "support/reports.h"

#include <algorithm>
#include <cstddef>
#include <iterator>
#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <utility>
#include <vector>

using Items = std::vector<device::PlanItem>;

inline constexpr char kPasses[] = "report G 100 0 fine";
inline constexpr char kSleeps[] = "tell-signal /tmp/scene/signal report G 10 -2 begun sleep 60";

// Its argument within quotes for the shell.
inline std::string script(const std::string &text)
{
    return "'" + text + "'";
}

inline std::string script_report(const std::string &result, const std::string &description)
{
    return "fptest report G Script --progress 100 --result " + result + " --description &quot;" +
           description + "&quot;";
}

// Notes its name in the order of the items, and reports.
inline std::string notes(const std::string &description, const std::string &result = "0")
{
    return "note /tmp/scene/order report G 100 " + result + " " + description;
}

inline const Items kThreeThatNote = {
    {"Item", notes("one")}, {"Other", notes("two")}, {"Third", notes("three")}};

// A comment in the group: the library counts it, and every name leads one after
// its item.
inline const std::string kShifted =
    "<P><CmdGroup name=\"G\"><!-- about it -->"
    "<Cmd name=\"Item\" args=\"note /tmp/scene/order report G 100 0 one\"/>"
    "<Cmd name=\"Other\" args=\"note /tmp/scene/order report G 100 1 two\"/>"
    "<Cmd name=\"Third\" args=\"note /tmp/scene/order report G 100 0 three\"/>"
    "</CmdGroup></P>";

class RunCommand : public FptestTest
{
  protected:
    using Json = nlohmann::json;
    using Ended = support::Ended;
    using Lines = device::Lines;

    // "run --json FILE" with these; what is asked below is of that file.
    static Lines with_json(Lines arguments)
    {
        arguments.insert(arguments.begin(), {"run", "--json", work("json")});
        return arguments;
    }
    // The same of the group G of these items.
    static Lines with_group(const Items &items, Lines options = {})
    {
        options.insert(options.begin(), {"--plan", plan(device::group_of(items))});
        options.emplace_back("P/G");
        return with_json(std::move(options));
    }
    static Ended run(Lines arguments)
    {
        return fptest_runner::run_fptest(with_json(std::move(arguments)));
    }
    static Ended run_group(const Items &items, Lines options = {})
    {
        return fptest_runner::run_fptest(with_group(items, std::move(options)));
    }
    // With that limit, as "-n 64", which the shell sets.
    static Ended run_limited(const std::string &limit, Lines arguments)
    {
        support::Start start;
        start.arguments = {"/system/bin/sh", "-c", "ulimit " + limit + "; exec \"$0\" \"$@\"",
                           "fptest"};
        std::ranges::move(arguments, back_inserter(start.arguments));
        start.environment = {{"VR_LOG_FILE", std::nullopt}}; // items write to it
        return support::run(start);
    }

    static std::string json()
    {
        return support::read_file(work("json"));
    }
    static std::string junit()
    {
        return support::read_file(work("junit"));
    }
    // "Item: passed" for each end.
    static Lines outcomes()
    {
        return support::outcomes(json());
    }
    static Lines reasons()
    {
        return support::reasons(json());
    }
    static std::vector<Json> events(const std::string &kind)
    {
        return support::events_of(json(), kind);
    }
    static Json end_of(std::size_t item)
    {
        return events("end").at(item);
    }
    static std::string description(std::size_t item)
    {
        return end_of(item).at("description");
    }
    static std::string output(std::size_t item)
    {
        return end_of(item).at("output");
    }

    // Waits for so many of those that have been written whole.
    static bool wait_for_events(const std::string &kind, std::size_t count)
    {
        const auto so_far = [&] {
            const std::string text = json();
            return support::events_of(text.substr(0, text.rfind('\n') + 1), kind).size();
        };
        return support::eventually([&] { return so_far() >= count; }, 30);
    }
};
