// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What a word that is not known may have been meant for.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace fptest
{

// The candidate that is spelled most like the word; empty if none is near enough.
std::string nearest(std::string_view word, const std::vector<std::string> &candidates);

// "; did you mean 'near'?", or empty.
std::string did_you_mean(const std::string &near);

// "; did you mean 'x'? The groups are x, y and z", with "the groups are" as introduction.
std::string known_names(const std::string &word, const std::vector<std::string> &names,
                        const std::string &introduction);

// "text; advice", or "text? Advice".
std::string with_advice(const std::string &text, std::string advice);

} // namespace fptest
