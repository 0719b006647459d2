// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What a node path starts, worked out apart from the library.
#pragma once

#include <mxml.h>

#include <string>
#include <string_view>
#include <vector>

// The components between the separators, none of them empty.
std::vector<std::string> components(std::string_view text, char separator);

// What doubles::started() tells after a run of the path on that tree (null: not
// loaded); the gatherer runs when the process query printed anything.
std::vector<std::string> expected_starts(mxml_node_t *tree, std::string_view path,
                                         std::string_view vendor, bool gatherer_runs);
