// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/library_file.h"

#include "util/files.h"
#include "util/sha256.h"

#include <dlfcn.h>
#include <string_view>

namespace fptest
{

std::string provider_of(const char *name)
{
    return provider_at(dlsym(RTLD_DEFAULT, name));
}

std::string provider_at(const void *place)
{
    Dl_info found{};
    return place != nullptr && dladdr(place, &found) != 0 && found.dli_fname != nullptr
               ? found.dli_fname
               : "";
}

std::string library_version()
{
    constexpr std::string_view kBefore = ".so.";
    const std::string file = end_of_links(provider_of("FPTEST_RunTestCmd"));
    if (const std::size_t at = file.rfind(kBefore); at != std::string::npos) {
        return file.substr(at + kBefore.size());
    }
    const auto bytes = read_file(file);
    return bytes ? "sha256:" + sha256(*bytes) : "";
}

} // namespace fptest
