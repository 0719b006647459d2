// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/known_failures.h"

#include "run/choice.h"
#include "util/failure.h"
#include "util/files.h"
#include "util/text.h"
#include "util/write.h"

#include <cstddef>
#include <sstream>

namespace fptest
{
namespace
{

constexpr std::size_t kColumnsOfPath = 100; // of a path in a message
constexpr char kAroundWords[] = " \t\r";

std::string without_blanks(const std::string &text)
{
    const std::size_t first = text.find_first_not_of(kAroundWords);
    return first == std::string::npos
               ? ""
               : text.substr(first, text.find_last_not_of(kAroundWords) + 1 - first);
}

void expect_by(const PathPattern &pattern, const std::string &reason, RoundPlan &round)
{
    for (Suite &suite : round.suites) {
        for (ItemRun &item : suite.items) {
            if (item.expected.empty() && pattern.matches(item.group, item.name)) {
                item.expected = reason;
            }
        }
    }
}

} // namespace

void expect_failures(const std::string &file, const Plan &plan, const std::string &plan_name,
                     RoundPlan &round)
{
    std::istringstream lines(require_file(file));
    std::string line;
    for (int number = 1; std::getline(lines, line); ++number) {
        line = without_blanks(line);
        if (line.empty() || line.front() == '#') {
            continue;
        }
        const std::string place = fmt::format("{}:{}", one_line(file), number);
        const std::string path = line.substr(0, line.find_first_of(kAroundWords));
        const std::string reason = without_blanks(line.substr(path.size()));
        if (reason.empty()) {
            throw Failure(Cause::input, "{}: {} has no reason: write behind it why it fails", place,
                          in_quotes(ellipsize(path, kColumnsOfPath)));
        }
        try {
            const PathPattern pattern(path, plan);
            if (!pattern.matches_some_of(plan)) {
                say("{}: {} matches nothing in {}", place, in_quotes(path), one_line(plan_name));
            }
            expect_by(pattern, reason, round);
        } catch (const Failure &failure) {
            throw Failure(failure.cause(), "{}: {}", place, failure.what());
        }
    }
}

} // namespace fptest
