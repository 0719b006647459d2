// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "util/numbers.h"

#include <cerrno>
#include <cmath>
#include <cstdlib>
#include <string_view>
#include <system_error>

namespace fptest
{

std::from_chars_result read_number(const char *first, const char *last, int &number)
{
    return std::from_chars(first, last, number);
}

// By strtod, without what it takes besides.
std::from_chars_result read_number(const char *first, const char *last, double &number)
{
    const std::string_view text(first, last);
    char *stop = nullptr;
    errno = 0;
    number = std::strtod(first, &stop);
    if (stop == first || text.find_first_of("+ \t\n\v\f\r") == 0 ||
        text.find_first_of("xX") != text.npos) {
        return {first, std::errc::invalid_argument};
    }
    const bool is_too_far = errno == ERANGE && (number == 0 || std::isinf(number));
    return {stop, is_too_far ? std::errc::result_out_of_range : std::errc{}};
}

} // namespace fptest
