// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check.h"
#include "commands.h"
#include "files.h"
#include "plan.h"
#include "text.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>

namespace fptest
{
namespace
{

std::string size_of(const std::string &text)
{
    std::size_t groups = 0;
    std::size_t items = 0;
    if (const auto plan = Plan::load(text)) {
        for (const Plan::Group &group : plan->groups()) {
            ++groups;
            items += group.items.size();
        }
    }
    return amount(groups, "group") + ", " + amount(items, "item") + ", " +
           std::to_string(text.size()) + " of " + std::to_string(kPlanLimit) + " bytes";
}

// False where the plan has errors.
bool check_file(const std::string &file, const std::string &text)
{
    const std::string name = file == "-" ? "<stdin>" : one_line(file);
    const auto findings = check(text, PlanUse::to_send);
    for (const Finding &finding : findings) {
        std::fputs(message(name, text, finding).c_str(), stdout);
    }
    const auto errors = static_cast<std::size_t>(
        std::ranges::count(findings, Finding::Severity::error, &Finding::severity));
    const std::size_t warnings = findings.size() - errors;
    std::printf("%s: %s, %s (%s)\n", name.c_str(), amount(errors, "error").c_str(),
                amount(warnings, "warning").c_str(), size_of(text).c_str());
    return errors == 0;
}

} // namespace

Exit check_files(const std::vector<std::string> &files)
{
    bool sound = true;
    bool readable = true;
    for (const std::string &file : files) {
        if (const auto text = read_file(file)) {
            sound = check_file(file, *text) && sound;
        } else {
            std::fprintf(stderr, "fptest: %s: %s\n", one_line(file).c_str(), std::strerror(errno));
            readable = false;
        }
    }
    if (!readable) {
        return Exit::usage;
    }
    return sound ? Exit::success : Exit::items_failed;
}

} // namespace fptest
