// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/document_checks.h"
#include "check/plan_checks.h"

#include <cctype>
#include <string>
#include <string_view>
#include <unordered_map>

namespace fptest
{

namespace
{

// The same for names that differ only in case, numbers and signs, and so are easily
// confused.
std::string likeness(std::string_view name)
{
    std::string letters;
    for (const char c : name) {
        const auto byte = static_cast<unsigned char>(c);
        if (std::isalpha(byte) != 0 || byte >= 0x80) {
            letters += static_cast<char>(std::tolower(byte));
        }
    }
    return letters;
}

// The library looks for an item that its group lacks in the groups after it, and then runs
// its position here. That is true of every item of every later group; it is reported only
// where the mistake is easy: another group has an item of that name, or the earlier group
// has a similar one.
class LaterGroupsCheck
{
  public:
    LaterGroupsCheck(const CheckContext &context, const std::vector<Group> &groups)
        : context_(context)
    {
        for (const Group &group : groups) {
            if (group.found) {
                groups_.push_back({&group, addressable_items(group)});
            }
        }
    }

    void check()
    {
        for (const Entry &entry : groups_) {
            for (const Item *item : entry.items) {
                ++uses_[item->name];
            }
        }
        for (at_ = 0; at_ < groups_.size(); ++at_) {
            check_group(groups_[at_]);
            for (const Item *item : groups_[at_].items) {
                after_last_[item->name] = at_ + 1;
                alike_[likeness(item->name)] = at_;
            }
        }
    }

  private:
    struct Entry {
        const Group *group = nullptr;
        std::vector<const Item *> items;
    };

    void check_group(const Entry &entry)
    {
        const Item *first = nullptr;
        std::string text;
        std::size_t more = 0;
        for (const Item *item : entry.items) {
            const Group *earlier = earlier_group(item->name);
            const auto run = earlier != nullptr ? context_.plan.resolve(earlier->name, item->name)
                                                : std::nullopt;
            if (!run || run->number == item->number) {
                continue;
            }
            if (first != nullptr) {
                ++more;
                continue;
            }
            first = item;
            text = fmt::format("group {} has no item {}, and finds this one after it: {} would run "
                               "{}; check the group in paths to it",
                               quoted_name(earlier->name), quoted_name(item->name),
                               path_of(earlier->name, item->name), names_of({run}));
        }
        if (first != nullptr) {
            context_.findings.warning(context_.places.of(first->number, "name"), "{}{}", text,
                                      more > 0 ? fmt::format(", and to {} more here", more) : "");
        }
    }

    // A group before this one whose path with that name leads here.
    [[nodiscard]] const Group *earlier_group(const std::string &name) const
    {
        const auto last = after_last_.find(name);
        const std::size_t begin = last != after_last_.end() ? last->second : 0;
        if (uses_.at(name) > 1 && begin < at_) {
            return groups_[at_ - 1].group;
        }
        const auto alike = alike_.find(likeness(name));
        return alike != alike_.end() && alike->second >= begin ? groups_[alike->second].group
                                                               : nullptr;
    }

    const CheckContext context_;
    std::vector<Entry> groups_;
    std::size_t at_ = 0;
    std::unordered_map<std::string, std::size_t> uses_;
    std::unordered_map<std::string, std::size_t> after_last_; // group that has the name
    std::unordered_map<std::string, std::size_t> alike_;      // the last group with such a name
};

} // namespace

void check_later_groups(const CheckContext &context, const std::vector<Group> &groups)
{
    LaterGroupsCheck(context, groups).check();
}

} // namespace fptest
