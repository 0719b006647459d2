// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstddef>
#include <expat.h>
#include <optional>
#include <string_view>

namespace fptest
{

// Where a text stops being XML, and why.
struct Flaw {
    std::size_t offset = 0;
    XML_Error error = XML_ERROR_NONE;
};

// The name in the text's declaration, a part of the text; empty if it has none.
std::string_view declared_encoding(std::string_view text);

std::optional<Flaw> find_flaw(std::string_view text);

} // namespace fptest
