// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/check.h"

#include "check/checks.h"

#include <algorithm>
#include <utility>

namespace fptest
{

CheckedPlan check(std::string name, std::string text, PlanSource use)
{
    CheckedPlan read{std::move(name), std::move(text), use, "", {}, {}, "", {}};
    read.stored = use == PlanSource::stored ? read.text : as_stored(read.text);
    read.plan = Plan::load_as_library(read.stored, &read.why);
    Findings findings;
    if (read.text.starts_with("\xFF\xFE") || read.text.starts_with("\xFE\xFF")) {
        findings.error(0, "the plan is UTF-16: save it as UTF-8");
    } else {
        read.tags = scan(read.text);
        if (use != PlanSource::stored) {
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
