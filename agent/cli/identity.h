// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Whose results a run's are.
#pragma once

#include "run/results.h"

#include <CLI/CLI.hpp>

#include <string>
#include <vector>

namespace fptest
{

// The label that says of which unit a run's results are.
inline constexpr char kDevice[] = "device";

void add_labels(CLI::App &command, std::vector<std::string> &labels);

// Of labels KEY=VALUE. Throws a Failure if a key is given twice.
Identity identity_of(const std::vector<std::string> &labels);

// Adds the label device, if there is none: the serial number, or the host's name. A program
// is asked for it.
void name_device(Identity &identity);

} // namespace fptest
