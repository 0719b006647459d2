// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/document_checks.h"
#include "check/wellformed.h"
#include "plan/markup.h"
#include "util/text.h"

#include <algorithm>

namespace fptest
{

namespace
{

class SizeChecker
{
  public:
    SizeChecker(const CheckedPlan &checked, Findings &findings)
        : checked_(checked), command_(checked.text.substr(0, checked.text.find('\0'))),
          findings_(findings)
    {
        const std::size_t begin = std::min(command_.find_first_not_of(':'), command_.size());
        colon_ = command_.find(':', begin);
        // in UTF-8 it is no XML either, which the form check reports
        zero_ = command_.size() < checked.text.size() && !find_flaw(checked.text);
    }

    void check()
    {
        if (colon_ != kNone) {
            check_colons();
        }
        // cutting blanks does no harm
        if (command_.find_first_not_of(" \t\r\n", kPlanLimit) != command_.npos) {
            check_length();
        }
        if (zero_ && colon_ == kNone && command_.size() <= kPlanLimit) {
            findings_.error(command_.size(),
                            "a command takes a plan up to its first zero byte, so {} would be "
                            "stored, and the library would {}; save it as UTF-8",
                            plural(checked_.stored.size(), "byte"), fate("them"));
        }
    }

  private:
    [[nodiscard]] std::string fate(const char *what) const
    {
        return checked_.loaded.plan ? fmt::format("load {} without the rest", what)
                                    : fmt::format("not load {}", what);
    }

    // Whether a character reference is allowed there, unlike in comments.
    [[nodiscard]] bool takes_references(std::size_t offset) const
    {
        const auto holds = [offset](const Attribute &attribute) {
            return offset >= attribute.value_begin && offset < attribute.value_end;
        };
        const auto tag = std::ranges::find_if(
            checked_.tags, [offset](const Tag &one) { return offset < one.end; });
        return tag != checked_.tags.end() &&
               (tag->kind == Tag::Kind::text || std::ranges::any_of(tag->attributes, holds));
    }

    void check_colons()
    {
        const auto more = std::count(command_.begin() + static_cast<std::ptrdiff_t>(colon_),
                                     command_.end(), ':') -
                          1;
        const std::string effect =
            colon_ < kPlanLimit
                ? fmt::format("so {} of {} would be stored, and the library would {}",
                              checked_.stored.size(), plural(command_.size(), "byte"), fate("them"))
                : fmt::format("which is after the {} bytes that it takes anyway", kPlanLimit);
        findings_.error(colon_, "a command takes a plan up to its first ':', {}; {}{}", effect,
                        takes_references(colon_) ? "write &#58; in its place" : "leave it out",
                        more > 0 ? fmt::format(", and the {} after it", more) : "");
    }

    void check_length()
    {
        findings_.error(kPlanLimit,
                        "{} bytes are {} more than the {} that a command stores: the plan would be "
                        "cut here, {}; shorten it, or have fptest run --plan place it as a file, "
                        "without --as-sent",
                        command_.size(), command_.size() - kPlanLimit, kPlanLimit,
                        colon_ < kPlanLimit ? "if it were not cut at a ':' before that"
                                            : "and the library would " + fate("it"));
    }

    const CheckedPlan &checked_;
    std::string command_;
    Findings &findings_;
    std::size_t colon_;
    bool zero_;
};

} // namespace

void check_size(const CheckedPlan &checked, Findings &findings)
{
    SizeChecker(checked, findings).check();
}

} // namespace fptest
