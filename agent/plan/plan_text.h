// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Edits a plan's text, and leaves everything else byte for byte as it is.
#pragma once

#include "plan/plan.h"

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

namespace fptest
{

// fptest gives this attribute to an item's element before the item runs. If it is gone, a
// process has saved an old copy of the plan.
inline constexpr char kMark[] = "fptest-run";

// The text without progress, result and description of these elements, and with the mark on
// them; nullopt if the text is not whole.
std::optional<std::string> without_reports(const std::string &text,
                                           const std::vector<std::size_t> &numbers,
                                           const std::string &mark);

// The same, of the text's elements that have these tags.
std::string without_reports_in(const std::string &text, const std::vector<Tag> &tags,
                               const std::vector<std::size_t> &numbers, const std::string &mark);

// Whether it has only characters that XML has, or at least not all that sanitize_xml()
// replaces: control characters from U+007F on are XML's.
bool is_xml(const std::string &text);

// A text that is whole but does not load, or has characters that are none in XML, with an empty
// value for attributes that have none, and with invalid characters made visible; nullopt for any
// other text.
std::optional<std::string> made_loadable(const std::string &text);

// Whether an element bears a mark, as after a run that did not come to its end.
bool has_marks(const std::string &text);

// Whether both have the same elements with the same names and args, whatever was reported.
bool is_same_plan(const std::string &one, const std::string &other);

// The same 64 hexadecimal digits for the same plan in that sense, nested alike: a file's and
// those of what is stored of it agree.
std::string digest_of(const Plan &plan);

// The text without any marks; nullopt if it is not whole.
std::optional<std::string> without_marks(const std::string &text);

} // namespace fptest
