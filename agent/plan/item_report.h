// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <optional>
#include <string>

namespace fptest
{

// What an item has reported into the plan.
struct ItemReport {
    std::optional<std::string> progress;
    // For a result that is not 0, 1 or -2 the library writes no value.
    std::optional<std::string> result;
    bool result_without_value = false;
    std::optional<std::string> description;

    bool operator==(const ItemReport &) const = default;
};

inline bool has_result(const ItemReport &report)
{
    return report.result || report.result_without_value;
}

inline bool has_finished(const ItemReport &report)
{
    return report.progress == "100" && has_result(report);
}

} // namespace fptest
