// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/device_property.h"

#include "util/programs.h"

#include <chrono>

namespace fptest
{

std::string device_property(const std::string &name)
{
    const Said said = ask_program({"/system/bin/getprop", name},
                                  std::chrono::steady_clock::now() + std::chrono::seconds(2));
    return said.is_whole ? said.output.substr(0, said.output.find('\n')) : "";
}

} // namespace fptest
