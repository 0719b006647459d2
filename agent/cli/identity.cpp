// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/identity.h"

#include "module/device_property.h"
#include "module/library_file.h"
#include "reporters/reporters.h"
#include "util/failure.h"
#include "util/text.h"

#include <algorithm>
#include <array>
#include <fmt/core.h>
#include <unistd.h>

namespace fptest
{
namespace
{

constexpr char kLetters[] = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789._-";

std::string name_of_device()
{
    if (std::string serial = device_property("ro.serialno"); !serial.empty()) {
        return serial;
    }
    std::array<char, 256> host{};
    return gethostname(host.data(), host.size() - 1) == 0 ? host.data() : "";
}

// What is wrong with a label; empty if nothing is.
std::string refused_label(const std::string &label)
{
    const std::size_t end = label.find('=');
    const std::string key = label.substr(0, end);
    if (label.empty()) {
        return "its value is empty";
    }
    if (end == std::string::npos) {
        return fmt::format("{} has no '=': write KEY=VALUE", in_quotes(label));
    }
    if (key.empty() || key.find_first_not_of(kLetters) != std::string::npos) {
        return fmt::format("{} is no key: use letters, digits, '.', '_' and '-'", in_quotes(key));
    }
    if (is_property_of_junit(key)) {
        return fmt::format("{} is written by fptest itself: choose another key", in_quotes(key));
    }
    return end + 1 == label.size() ? fmt::format("{} has no value", in_quotes(key)) : "";
}

} // namespace

void add_labels(CLI::App &command, std::vector<std::string> &labels)
{
    command
        .add_option("--label", labels,
                    "say whose results these are, several times:\n"
                    "device=A7 (else the serial number), job=12")
        ->type_name("KEY=VALUE")
        ->allow_extra_args(false)
        ->check(refused_label, "");
}

Identity identity_of(const std::vector<std::string> &labels)
{
    Identity identity;
    for (const std::string &label : labels) {
        const std::size_t end = label.find('=');
        const std::string key = label.substr(0, end);
        if (std::ranges::any_of(identity.labels,
                                [&](const auto &one) { return one.first == key; })) {
            throw Failure(Cause::input, "--label {} is given twice: give it once", key);
        }
        identity.labels.emplace_back(key, label.substr(end + 1));
    }
    identity.library = library_version();
    return identity;
}

void name_device(Identity &identity)
{
    if (std::ranges::none_of(identity.labels,
                             [](const auto &one) { return one.first == kDevice; })) {
        identity.labels.emplace(identity.labels.begin(), kDevice, name_of_device());
    }
}

} // namespace fptest
