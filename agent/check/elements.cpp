// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/elements.h"

#include "check/findings.h"
#include "util/text.h"

#include <array>
#include <utility>

namespace fptest
{

namespace
{

constexpr std::size_t kShownPath = 80; // columns

} // namespace

std::string path_of(const std::string &group)
{
    return in_quotes("root/" + group, kShownPath);
}

std::string path_of(const std::string &group, const std::string &item)
{
    return path_of(group + "/" + item);
}

std::string names_of(const Resolution &resolution)
{
    std::string first;
    std::size_t count = 0;
    for (const auto &element : resolution) {
        if (element && ++count == 1) {
            first = quoted_name(element->name.value());
        }
    }
    return count == 0   ? "nothing"
           : count == 1 ? first
                        : fmt::format("{} and {} more", first, count - 1);
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

} // namespace fptest
