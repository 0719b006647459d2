// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How the checker's findings are printed.
#pragma once

#include "check/check.h"
#include "plan/markup.h"

#include <cstdio>
#include <string>
#include <string_view>

namespace fptest
{

// Fast for findings in the order of the text.
class FindingPrinter
{
  public:
    // The text is not copied.
    FindingPrinter(const std::string &file, std::string_view text);

    // "FILE:LINE:COLUMN: error: TEXT", the source line and a caret under the place;
    // three lines, each with a line feed. A long source line is cut around the place
    // to fit 80 columns.
    std::string printed(const Finding &finding);

  private:
    std::string file_;
    std::string_view text_;
    Positions positions_;
};

// Prints a plan's findings, at most 1000, errors before warnings.
void print(std::FILE *stream, const CheckedPlan &plan);

} // namespace fptest
