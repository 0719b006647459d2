// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The text of a plan, edited: byte for byte as it was but for what is meant.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

namespace fptest
{

// An attribute by which an item's element is known to be as fptest has left it: a
// process that saves an old copy of the plan brings back one without.
inline constexpr char kMark[] = "fptest-run";

// The text without the progress, result and description of these elements, which
// get the mark; otherwise byte for byte as it was. Nothing where the text is not
// whole.
std::optional<std::string> without_reports(const std::string &text,
                                           const std::vector<std::size_t> &numbers,
                                           const std::string &mark);

// The text made loadable, where it is whole but does not load: attributes without a
// value get an empty one, what no plan can hold is made visible. Nothing where it
// need not or cannot be done.
std::optional<std::string> made_loadable(const std::string &text);

// The text without any marks. Nothing where it is not whole.
std::optional<std::string> without_marks(const std::string &text);

} // namespace fptest
