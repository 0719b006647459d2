// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What Mini-XML asks of the platform: its memory and its files. Its library is
// linked with these calls renamed, so that any one of them can be made to fail.
#pragma once

#include <functional>
#include <string>

namespace mini_xml
{

// The functions, as faults name them.
constexpr char kMemory[] = "Mini-XML's memory";
constexpr char kRead[] = "Mini-XML's read";
constexpr char kWrite[] = "Mini-XML's write";

// Makes that call of the function fail, counted from 1 from now on. Just before
// it does, it calls the hook.
void plan_fault(const std::string &function, long number, std::function<void()> hook);

} // namespace mini_xml
