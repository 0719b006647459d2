// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "runs.h"

#include "plan.h"

#include <cstdlib>
#include <optional>

namespace
{

using Lines = std::vector<std::string>;

// The selector as it is read: at most 63 characters of text.
int vendor_number(std::string_view vendor)
{
    return static_cast<int>(std::strtol(std::string(vendor.substr(0, 63)).c_str(), nullptr, 10));
}

void expect_item(const Content &node, int vendor, bool gatherer_runs, Lines &lines)
{
    const std::string *name = node.attribute("name");
    if (name == nullptr || name->empty()) {
        return;
    }
    lines.emplace_back("popen ps | grep /system/bin/SensorProbe");
    if (vendor < 0 || vendor > 2) {
        return;
    }
    const std::string cut = name->substr(0, 1023);
    const std::string program = cut.substr(0, cut.find_first_of("\t\n"));
    if (vendor < 2 && program == "SensorProbe") {
        if (!gatherer_runs) {
            lines.emplace_back("launch");
        }
        lines.emplace_back("trigger");
        return;
    }
    const char *const suffixes[] = {"", "_ca", "_ca_qsee"};
    const std::string *arguments = node.attribute("args");
    const std::string command = "/system/bin/" + (program + suffixes[vendor]).substr(0, 1024) +
                                " " + (arguments != nullptr ? *arguments : "(null)");
    lines.push_back("system " + command.substr(0, 1024));
}

} // namespace

std::vector<std::string> components(std::string_view text, char separator)
{
    Lines found;
    std::string current;
    for (const char character : text) {
        if (character != separator) {
            current += character;
        } else if (!current.empty()) {
            found.push_back(std::move(current));
            current.clear();
        }
    }
    if (!current.empty()) {
        found.push_back(std::move(current));
    }
    return found;
}

std::vector<std::string> expected_starts(mxml_node_t *tree, std::string_view path,
                                         std::string_view vendor, bool gatherer_runs)
{
    Lines lines;
    const Lines names = components(path, '/');
    if (path.find('/') == std::string_view::npos || names.size() == 1) {
        return lines;
    }
    const int number = vendor_number(vendor);
    const auto plan = tree != nullptr ? std::optional<Plan>(tree) : std::nullopt;
    const auto group =
        plan ? plan->group(names.empty() ? "" : names[1].substr(0, 63)) : std::nullopt;
    const auto run = [&](int index) {
        lines.push_back("print vendor = " + std::to_string(number) + "\n");
        const auto node = group ? plan->item_by_index(*group, index) : std::nullopt;
        if (node) {
            expect_item(plan->contents[*node], number, gatherer_runs, lines);
        }
    };
    if (names.size() == 2) {
        const auto count = group ? static_cast<int>(plan->children(*group).size()) : 0;
        for (int index = 0; index < count; ++index) {
            run(index);
        }
        return lines;
    }
    const auto item =
        group ? plan->item(*group, names.empty() ? "" : names[2].substr(0, 63)) : std::nullopt;
    run(item ? static_cast<int>(plan->positions[*item]) : -1);
    return lines;
}
