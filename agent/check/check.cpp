// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/check.h"

#include "check/checks.h"
#include "plan/plan.h"

#include <algorithm>

namespace fptest
{

std::vector<Finding> check(const std::string &text, PlanSource use)
{
    Findings findings;
    if (text.starts_with("\xFF\xFE") || text.starts_with("\xFE\xFF")) {
        findings.error(0, "the plan is UTF-16: save it as UTF-8");
        return findings.take();
    }
    if (use != PlanSource::stored) {
        check_size(text, use, findings);
    }
    const std::string stored = use == PlanSource::stored ? text : as_stored(text);
    if (const std::optional<Plan> plan = check_form(text, stored, findings)) {
        check_plan(text, *plan, findings);
    }
    return findings.take();
}

bool has_errors(const std::vector<Finding> &findings)
{
    return std::ranges::any_of(findings, [](const Finding &finding) {
        return finding.severity == Finding::Severity::error;
    });
}

} // namespace fptest
