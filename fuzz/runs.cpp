// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "runs.h"

#include "plan/plan.h"

#include <algorithm>
#include <cstdlib>

namespace
{

using Lines = std::vector<std::string>;

// The selector as it is read: at most 63 characters of text.
int vendor_number(std::string_view vendor)
{
    return static_cast<int>(std::strtol(std::string(vendor.substr(0, 63)).c_str(), nullptr, 10));
}

void expect_item(const fptest::Plan::Element &item, int vendor, bool gatherer_runs, Lines &lines)
{
    lines.emplace_back("popen ps | grep /system/bin/SensorProbe");
    const auto suffix = fptest::vendor_suffix(vendor);
    if (!suffix) {
        return;
    }
    if (!fptest::is_gatherer(*item.name, vendor)) {
        lines.push_back(
            "system " +
            fptest::command_line(*item.name, item.args, *suffix).substr(0, fptest::kCommandLimit));
        return;
    }
    if (!gatherer_runs) {
        lines.emplace_back("launch");
    }
    lines.emplace_back("trigger");
}

} // namespace

std::vector<std::string> components(std::string_view text, char separator)
{
    Lines found;
    while (!text.empty()) {
        const std::string_view part = text.substr(0, text.find(separator));
        if (!part.empty()) {
            found.emplace_back(part);
        }
        text.remove_prefix(std::min(part.size() + 1, text.size()));
    }
    return found;
}

std::optional<std::vector<std::string>> expected_starts(const std::string &plan,
                                                        std::string_view path,
                                                        std::string_view vendor, bool gatherer_runs)
{
    const Lines names = components(path, '/');
    if (path.find('/') == std::string_view::npos || names.size() == 1) {
        return Lines();
    }
    const int number = vendor_number(vendor);
    const auto loaded = fptest::Plan::load_as_library(plan);
    if (names.empty() && loaded && loaded->find_group("") != nullptr) {
        return std::nullopt;
    }
    std::vector<std::optional<fptest::Plan::Element>> runs;
    if (loaded && !names.empty()) { // whatever the root, and far from the path's limit
        runs = loaded->resolve(names[1].substr(0, fptest::kNameLimit) +
                               (names.size() > 2 ? "/" + names[2] : "").substr(0, 100));
    } else if (names.size() != 2) {
        runs.emplace_back();
    }
    Lines lines;
    for (const auto &item : runs) {
        lines.push_back("print vendor = " + std::to_string(number) + "\n");
        if (item) {
            expect_item(*item, number, gatherer_runs, lines);
        }
    }
    return lines;
}
