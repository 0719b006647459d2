// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <optional>
#include <string>

namespace fptest
{

// What an item has reported, as the test plan has it.
struct ItemReport {
    std::optional<std::string> progress;
    // An attribute without a value is a result that is not 0, 1 or -2.
    std::optional<std::string> result;
    bool result_without_value = false;
    std::optional<std::string> description;

    bool operator==(const ItemReport &) const = default;
};

inline bool has_result(const ItemReport &report)
{
    return report.result || report.result_without_value;
}

} // namespace fptest
