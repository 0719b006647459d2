// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "filter.h"

#include <stdexcept>

namespace bench
{

Filter::Filter(const std::string &text) : text_(text)
{
    try {
        wanted_.assign(text, std::regex::extended);
    } catch (const std::regex_error &) {
        throw std::runtime_error("--filter '" + text + "' is not a regular expression");
    }
}

bool Filter::takes(const std::string &name) const
{
    return text_.empty() || std::regex_search(name, wanted_);
}

} // namespace bench
