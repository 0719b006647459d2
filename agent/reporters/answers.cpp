// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/answers.h"

#include "util/text.h"

#include <algorithm>
#include <fmt/core.h>
#include <nlohmann/json.hpp>
#include <sstream>

namespace fptest
{

std::string shown(const DeviceAnswer &answer, std::size_t width, bool coloured)
{
    static constexpr const char *kMarks[] = {"ok", "! ", "!!"};
    static constexpr const char *kColours[] = {"32", "33", "31"};
    constexpr std::size_t kIndent = 17;
    const auto verdict = static_cast<std::size_t>(answer.verdict);
    std::string text = coloured
                           ? fmt::format("\x1b[{}m{}\x1b[0m", kColours[verdict], kMarks[verdict])
                           : kMarks[verdict];
    text += fmt::format("  {:{}}", answer.question, kIndent - 4);
    std::istringstream words(answer.text);
    std::size_t column = kIndent;
    for (std::string word; words >> word;) {
        const std::size_t length = display_width(word);
        if (column == kIndent) {
            text += word;
        } else if (column + 1 + length > width) {
            text += fmt::format("\n{:{}}{}", "", kIndent, word);
            column = kIndent;
        } else {
            text += " " + word;
            ++column;
        }
        column += length;
    }
    return text + "\n";
}

bool is_ready(const std::vector<DeviceAnswer> &answers)
{
    return std::ranges::count(answers, Verdict::error, &DeviceAnswer::verdict) == 0;
}

std::string json_of(const std::vector<DeviceAnswer> &answers)
{
    static constexpr const char *kVerdicts[] = {"ok", "warning", "error"};
    nlohmann::ordered_json json = {{"format", 1}, {"program", "fptest"}};
    json["version"] = FPTEST_VERSION;
    json["ready"] = is_ready(answers);
    json["answers"] = nlohmann::ordered_json::array();
    for (const DeviceAnswer &answer : answers) {
        json["answers"].push_back({{"question", answer.question},
                                   {"verdict", kVerdicts[static_cast<int>(answer.verdict)]},
                                   {"text", sanitize_utf8(answer.text)}});
    }
    return json.dump() + "\n";
}

} // namespace fptest
