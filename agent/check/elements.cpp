// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/elements.h"

#include "check/findings.h"
#include "util/text.h"

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

} // namespace fptest
