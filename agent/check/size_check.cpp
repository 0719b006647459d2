// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/checks.h"
#include "check/wellformed.h"
#include "plan/markup.h"
#include "util/text.h"

#include <algorithm>

namespace fptest
{

namespace
{

constexpr std::size_t kNone = std::string::npos;

class SizeChecker
{
  public:
    SizeChecker(const std::string &text, Findings &findings)
        : stored_(as_stored(text)), command_(text.substr(0, text.find('\0'))), findings_(findings)
    {
        const std::size_t begin = std::min(command_.find_first_not_of(':'), command_.size());
        colon_ = command_.find(':', begin);
        // in UTF-8 it is no XML either, which is said elsewhere
        zero_ = command_.size() < text.size() && !find_flaw(text);
    }

    void check()
    {
        if (colon_ != kNone) {
            check_colons();
        }
        // blanks may be cut
        if (command_.find_first_not_of(" \t\r\n", kPlanLimit) != command_.npos) {
            check_length();
        }
        if (zero_ && colon_ == kNone && command_.size() <= kPlanLimit) {
            findings_.error(command_.size(),
                            "a command takes a plan up to its first zero byte, so " +
                                plural(stored_.size(), "byte") + " would be stored" + fate("them") +
                                "; save it as UTF-8");
        }
    }

  private:
    [[nodiscard]] std::string fate(const std::string &what) const
    {
        return std::string(", and the library would ") + (Plan::load_as_library(stored_)
                                                              ? "load " + what + " without the rest"
                                                              : "not load " + what);
    }

    // Whether a character reference may stand there: not in comments and the like.
    [[nodiscard]] bool takes_references(std::size_t offset) const
    {
        const auto holds = [offset](const Attribute &attribute) {
            return offset >= attribute.value_begin && offset < attribute.value_end;
        };
        const std::vector<Tag> tags = scan(command_);
        const auto tag =
            std::ranges::find_if(tags, [offset](const Tag &one) { return offset < one.end; });
        return tag != tags.end() &&
               (tag->kind == Tag::Kind::text || std::ranges::any_of(tag->attributes, holds));
    }

    void check_colons()
    {
        const auto more = std::count(command_.begin() + static_cast<std::ptrdiff_t>(colon_),
                                     command_.end(), ':') -
                          1;
        std::string text = "a command takes a plan up to its first ':', ";
        if (colon_ < kPlanLimit) {
            text += "so " + std::to_string(stored_.size()) + " of " +
                    plural(command_.size(), "byte") + " would be stored" + fate("them");
        } else {
            text +=
                "which is after the " + std::to_string(kPlanLimit) + " bytes that it takes anyway";
        }
        text += takes_references(colon_) ? "; write &#58; in its place" : "; leave it out";
        if (more > 0) {
            text += ", and the " + std::to_string(more) + " after it";
        }
        findings_.error(colon_, text);
    }

    void check_length()
    {
        findings_.error(
            kPlanLimit,
            std::to_string(command_.size()) + " bytes are " +
                std::to_string(command_.size() - kPlanLimit) + " more than the " +
                std::to_string(kPlanLimit) + " that a command stores: the plan would be cut here" +
                (colon_ < kPlanLimit ? ", were it not cut at a ':' before" : fate("it")) +
                "; shorten it, or have fptest run --plan place it as a file");
    }

    std::string stored_;
    std::string command_;
    Findings &findings_;
    std::size_t colon_;
    bool zero_;
};

} // namespace

void check_size(const std::string &text, Findings &findings)
{
    SizeChecker(text, findings).check();
}

} // namespace fptest
