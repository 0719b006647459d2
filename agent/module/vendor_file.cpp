// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/vendor_file.h"

#include "util/failure.h"
#include "vorlane/sysparm.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <dlfcn.h>
#include <fmt/core.h>
#include <sys/stat.h>
#include <unistd.h>

namespace fptest
{
namespace
{

constexpr char kVendorFile[] = "/etc/vorlane/sysparms/vr_common_cfg.xml";
constexpr char kSelector[] = "device/SysParam/Quillmark/vendor";

} // namespace

bool is_vendor_file_there()
{
    return access(kVendorFile, F_OK) == 0 || errno != ENOENT;
}

std::string why_no_vendor()
{
    struct stat status {
    };
    if (!is_vendor_file_there()) {
        return fmt::format("there is no {}", kVendorFile);
    }
    if (stat(kVendorFile, &status) == 0 && !S_ISREG(status.st_mode)) {
        throw Failure(Cause::device, "{} is not a regular file: remove it", kVendorFile);
    }
    if (access(kVendorFile, R_OK) != 0) {
        return fmt::format("{} is not readable: {}", kVendorFile, std::strerror(errno));
    }
    // the platform's own reader, which the library has loaded
    const auto read =
        reinterpret_cast<decltype(&get_node_value)>(dlsym(RTLD_DEFAULT, "get_node_value"));
    std::array<char, 65> value{};
    if (read != nullptr && read(kVendorFile, kSelector, value.data(), value.size()) != 0) {
        return fmt::format("{} has no {}", kVendorFile, kSelector);
    }
    return {};
}

} // namespace fptest
