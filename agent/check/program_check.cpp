// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/document_checks.h"
#include "check/plan_checks.h"
#include "module/device_property.h"
#include "util/text.h"

#include <array>
#include <cstdlib>
#include <string_view>

namespace fptest
{

namespace
{

constexpr std::array kVendors = {0, 1, 2};

struct VendorName {
    std::string name; // without the suffix
    std::string suffix;
    int vendor = 0;
};

// An item's name with a vendor's suffix in it.
std::optional<VendorName> vendor_name(std::string_view name)
{
    for (const int vendor : {2, 1}) {
        const std::string suffix = vendor_suffix(vendor).value();
        if (name.size() > suffix.size() && name.ends_with(suffix)) {
            return VendorName{std::string(name.substr(0, name.size() - suffix.size())), suffix,
                              vendor};
        }
    }
    return std::nullopt;
}

void check_vendors(const CheckContext &context, const Item &item,
                   const std::unordered_set<std::string> &item_names)
{
    const std::string &name = item.name;
    const std::size_t place = context.places.of(item.number, "name");
    const auto vendor = vendor_name(name);
    if (name == std::string(kGatherer) + "_qsee" || (vendor && vendor->name == kGatherer)) {
        context.findings.warning(place,
                                 "item {} is not the gatherer: that is '{}', to which the library "
                                 "adds the vendor's suffix; leave it out",
                                 quoted_name(name), kGatherer);
    } else if (vendor && item_names.contains(vendor->name)) {
        context.findings.warning(
            place, "item {0} would be run as {1} under vendor {2}, and item {3} as {0}; rename one",
            quoted_name(name), quoted_name(name + vendor->suffix), vendor->vendor,
            quoted_name(vendor->name));
    } else if (vendor) {
        context.findings.warning(
            place,
            "item {} would be run as {} under vendor {}: the library adds the suffix; leave it out",
            quoted_name(name), quoted_name(name + vendor->suffix), vendor->vendor);
    }
}

void check_command_line(const CheckContext &context, const Item &item)
{
    if (!item.args) {
        const std::string line = command_line(item.name, std::nullopt, "");
        context.findings.error(context.places.of(item.number),
                               "item {} has no args: its command line would be {}, which the shell "
                               "refuses; add args=\"\"",
                               quoted_name(item.name), quoted_name(line));
        return;
    }
    std::vector<std::string> excesses;
    for (const int vendor : kVendors) {
        const std::size_t size =
            command_line(item.name, item.args, vendor_suffix(vendor).value()).size();
        if (size > kCommandLimit) {
            excesses.push_back(fmt::format("{} under vendor {}", size - kCommandLimit, vendor));
        }
    }
    if (!excesses.empty()) {
        context.findings.error(
            context.places.of(item.number, "args"),
            "the command line of item {} is cut to {} bytes, by {}; shorten its {}",
            quoted_name(item.name), kCommandLimit, join_and(excesses),
            item.args->empty() ? "name" : "args");
    }
}

// Whether a stop finds the item. The release is known on a device.
void check_stop(const CheckContext &context, const Item &item)
{
    const std::string &name = item.name;
    if (name.size() <= kKernelLimit || name.size() > kNameLimit) {
        return;
    }
    static const std::string release = device_property("ro.build.version.release");
    const bool is_known = std::atoi(release.c_str()) > 0;
    const bool knows_less = std::atoi(release.c_str()) < 6;
    if (is_known && !knows_less && name.size() <= kStopLimit) {
        return;
    }
    const std::string asked = fmt::format("ps is asked for the first {} alone", kStopLimit);
    const std::string found = fmt::format("Android {} finds no name of more than {}",
                                          is_known ? one_line(release) : "5.1", kKernelLimit);
    context.findings.warning(
        context.places.of(item.number, "name"),
        "item {} may not be found to be stopped: its name has {} bytes, but {}; shorten it",
        quoted_name(name), name.size(),
        !is_known    ? fmt::format("{}, and up to {}", asked, found)
        : knows_less ? fmt::format("ps of {}", found)
                     : asked);
}

} // namespace

void check_program(const CheckContext &context, const Item &item,
                   const std::unordered_set<std::string> &item_names, ShellChecker &shell)
{
    const std::string &name = item.name;
    if (name.empty()) {
        return;
    }
    check_stop(context, item);
    shell.check(item);
    check_vendors(context, item, item_names);
    check_command_line(context, item);
}

} // namespace fptest
