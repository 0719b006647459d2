// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "plan/library_rules.h"

#include "util/text.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <cstring>
#include <utility>
#include <vector>

namespace fptest
{
namespace
{

constexpr std::size_t kProgramLimit = 1023; // characters of a program's name

std::string up_to_any(std::string_view text, std::string_view ends)
{
    return std::string(text.substr(0, text.find_first_of(ends)));
}

// The name without the vendor's suffix.
std::string program_name(std::string_view name)
{
    return up_to_any(name.substr(0, kProgramLimit), std::string_view("\t\n\0", 3));
}

} // namespace

std::string as_stored(std::string_view text)
{
    text.remove_prefix(std::min(text.find_first_not_of(':'), text.size()));
    return up_to_any(text, std::string_view(":\0", 2)).substr(0, kPlanLimit);
}

std::optional<std::string> vendor_suffix(int vendor)
{
    switch (vendor) {
    case 0:
        return "";
    case 1:
        return "_ca";
    case 2:
        return "_ca_qsee";
    default:
        return std::nullopt;
    }
}

std::string path_damage(std::string_view name)
{
    constexpr std::array<std::pair<char, const char *>, 4> kDamages = {
        std::pair{'/', "is split at '/'"}, std::pair{':', "is cut at ':'"},
        std::pair{'\t', "is cut at a tab"}, std::pair{'\n', "is cut at a line feed"}};
    std::vector<std::string> damages;
    for (const auto &[character, damage] : kDamages) {
        if (name.find(character) != name.npos) {
            damages.emplace_back(damage);
        }
    }
    return join_and(damages);
}

bool is_addressable(std::string_view name)
{
    return !name.empty() && name.size() <= kNameLimit && path_damage(name).empty();
}

bool is_gatherer(std::string_view name, int vendor)
{
    return (vendor == 0 || vendor == 1) && program_name(name) == kGatherer;
}

std::string program_of(std::string_view name, std::string_view suffix)
{
    std::string program = program_name(name);
    program += suffix.substr(0, kCommandLimit - program.size());
    return "/system/bin/" + program;
}

bool is_plain_name(std::string_view name)
{
    return std::ranges::all_of(name, [](unsigned char c) {
        return std::isalnum(c) != 0 || c >= 0x80 || std::strchr("_-.,+@%", c) != nullptr;
    });
}

std::string command_line(std::string_view name, const std::optional<std::string> &args,
                         std::string_view suffix)
{
    return program_of(name, suffix) + " " + args.value_or("(null)");
}

} // namespace fptest
