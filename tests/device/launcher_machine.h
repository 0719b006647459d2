// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A machine to try device/run on that changes the root it runs in.
#pragma once

#include "launcher_runner.h"

#include <map>
#include <string>

namespace launcher
{

// A machine in a sandbox of its own, with a root of its own to write to. Unless
// told otherwise it refuses further namespaces and shows no sign of a container.
struct Machine {
    bool refuses_namespaces = true;
    bool is_container = false;
    int user = 0;
    std::map<std::string, std::string> sysctls{};
    Words options{}; // bwrap's

    Outcome run(const std::string &script) const;
};

// What is tried on such a machine; the script's $1 is device/run.
class Sandbox : public NamespaceDevice
{
};

} // namespace launcher
