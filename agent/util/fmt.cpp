// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// fmt, compiled once: header-only it would slow down every object's build. Debian has no
// static library of it, and the shared one would have to be installed on the phone.
#include <fmt/format-inl.h>

FMT_BEGIN_NAMESPACE
namespace detail
{
template FMT_API auto dragonbox::to_decimal(double) noexcept -> dragonbox::decimal_fp<double>;
template FMT_API auto thousands_sep_impl(locale_ref) -> thousands_sep_result<char>;
template FMT_API auto decimal_point_impl(locale_ref) -> char;
template FMT_API void buffer<char>::append(const char *, const char *);
template FMT_API void vformat_to(buffer<char> &, string_view,
                                 basic_format_args<FMT_BUFFER_CONTEXT(char)>, locale_ref);
} // namespace detail
FMT_END_NAMESPACE
