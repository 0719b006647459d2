// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/wellformed.h"

#include "plan/markup.h"
#include "util/text.h"

#include <algorithm>
#include <cctype>
#include <expat.h>
#include <memory>
#include <new>
#include <type_traits>

namespace fptest
{

namespace
{

// Nested entities can overflow the stack, and the library knows none: a declaration of one
// ends the parse.
void XMLCALL stop_at_entity(void *parser, const XML_Char *, int, const XML_Char *, int,
                            const XML_Char *, const XML_Char *, const XML_Char *, const XML_Char *)
{
    XML_StopParser(static_cast<XML_Parser>(parser), XML_FALSE);
}

// What to parse it as, whatever it declares; null for what it declares. The library reads
// UTF-8, and saves reports so.
const char *imposed_encoding(std::string_view text)
{
    const auto declares = [declared = declared_encoding(text)](std::string_view name) {
        const auto is_same = [](char one, char other) { return std::tolower(one) == other; };
        return std::ranges::equal(declared, name, is_same);
    };
    const bool is_read_as_declared =
        !declares("us-ascii") && (!declares("iso-8859-1") || first_not_utf8(text) != text.npos);
    return is_read_as_declared ? nullptr : "UTF-8";
}

} // namespace

std::string_view declared_encoding(std::string_view text)
{
    constexpr std::string_view kName = "encoding";
    if (text.starts_with(kByteOrderMark)) {
        text.remove_prefix(kByteOrderMark.size());
    }
    if (!text.starts_with("<?xml")) {
        return {};
    }
    text = text.substr(0, text.find("?>"));
    const std::size_t name = text.find(kName);
    const std::size_t begin = text.find_first_of("\"'", name);
    if (name == text.npos || begin == text.npos) {
        return {};
    }
    return text.substr(begin + 1, text.find(text[begin], begin + 1) - begin - 1);
}

std::optional<Flaw> find_flaw(std::string_view text)
{
    constexpr std::size_t kPiece = 1U << 30U; // the parser counts in int
    const std::unique_ptr<std::remove_pointer_t<XML_Parser>, decltype(&XML_ParserFree)> parser(
        XML_ParserCreate(imposed_encoding(text)), &XML_ParserFree);
    if (!parser) {
        throw std::bad_alloc();
    }
    XML_UseParserAsHandlerArg(parser.get());
    XML_SetEntityDeclHandler(parser.get(), stop_at_entity);
    const std::size_t size = text.size();
    bool last = false;
    while (!last) {
        const std::string_view piece = text.substr(0, kPiece);
        text.remove_prefix(piece.size());
        last = text.empty();
        if (XML_Parse(parser.get(), piece.data(), static_cast<int>(piece.size()), last ? 1 : 0) !=
            XML_STATUS_OK) {
            const XML_Index index = XML_GetCurrentByteIndex(parser.get());
            return Flaw{index < 0 ? 0 : std::min(static_cast<std::size_t>(index), size),
                        XML_GetErrorCode(parser.get())};
        }
    }
    return std::nullopt;
}

} // namespace fptest
