// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/check.h"

#include "check/checks.h"

#include <algorithm>
#include <utility>

namespace fptest
{

CheckedPlan check(std::string name, std::string text, Storing storing)
{
    const std::string stored = storing == Storing::as_file ? text : as_stored(text);
    CheckedPlan read{std::move(name), std::move(text), storing, stored, Loaded(stored), {}, {}, {}};
    if (read.stored != read.text) {
        read.uncut.emplace(read.text);
    }
    Findings findings;
    if (read.text.starts_with("\xFF\xFE") || read.text.starts_with("\xFE\xFF")) {
        findings.error(0, "the plan is UTF-16: save it as UTF-8");
    } else {
        read.tags = scan(read.text);
        if (storing != Storing::as_file) {
            check_size(read, findings);
        }
        check_form(read, findings);
    }
    read.findings = findings.take();
    return read;
}

bool has_errors(const std::vector<Finding> &findings)
{
    return std::ranges::any_of(findings, [](const Finding &finding) {
        return finding.severity == Finding::Severity::error;
    });
}

} // namespace fptest
