// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/check.h"

#include "check/document_checks.h"

#include <utility>

namespace fptest
{

CheckedPlan check(std::string name, std::string text, Storing storing)
{
    const std::string stored = storing == Storing::as_file ? text : as_stored(text);
    CheckedPlan checked{
        std::move(name), std::move(text), storing, stored, Loaded(stored), {}, {}, {}};
    if (checked.stored != checked.text) {
        checked.uncut.emplace(checked.text);
    }
    Findings findings;
    if (checked.text.starts_with("\xFF\xFE") || checked.text.starts_with("\xFE\xFF")) {
        findings.error(0, "the plan is UTF-16: save it as UTF-8");
    } else {
        checked.tags = scan(checked.text);
        if (storing != Storing::as_file) {
            check_size(checked, findings);
        }
        check_form(checked, findings);
    }
    checked.findings = findings.take();
    return checked;
}

} // namespace fptest
