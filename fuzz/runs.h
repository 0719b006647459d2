// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What a node path starts, as the agent's Plan tells it.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

// The components between the separators, none of them empty.
std::vector<std::string> components(std::string_view text, char separator);

// What doubles::started() tells after a run of the path, up to its first colon, tab or
// line feed, on that plan; the gatherer runs when the process query printed anything.
// Nothing if the agent's Plan has no such path: of '/' alone, which asks for a group
// without a name that the plan has.
std::optional<std::vector<std::string>> expected_starts(const std::string &plan,
                                                        std::string_view path,
                                                        std::string_view vendor,
                                                        bool gatherer_runs);
