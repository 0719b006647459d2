// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/measurements.h"

#include "util/numbers.h"
#include "util/text.h"

#include <algorithm>
#include <cctype>
#include <cmath>
#include <cstdlib>
#include <fmt/core.h>
#include <system_error>
#include <utility>

namespace fptest
{
namespace
{

constexpr std::string_view kMeasureMark = "#measure";
constexpr std::size_t kLongestLine = 512;
constexpr std::size_t kLongestName = 64;
constexpr std::size_t kLongestUnit = 16;
constexpr std::size_t kMostJudged = 1'000'000; // beyond, a program goes wild
constexpr std::size_t kShownColumns = 80;      // of a malformed line

bool is_blank(char c)
{
    return c == ' ' || c == '\t';
}

bool is_line_end(char c)
{
    return c == '\n' || c == '\r'; // a bar of progress is written over
}

// What has been read of a line may become "#measure", or "#measure" and a blank.
bool may_be_about_one(std::string_view line)
{
    const std::size_t size = std::min(line.size(), kMeasureMark.size());
    return line.substr(0, size) == kMeasureMark.substr(0, size) &&
           (line.size() <= kMeasureMark.size() || is_blank(line[kMeasureMark.size()]) ||
            line.substr(kMeasureMark.size()) == "\r");
}

bool is_about_one(std::string_view line)
{
    return line.size() >= kMeasureMark.size() && may_be_about_one(line);
}

std::vector<std::string> words_after_mark(std::string_view line)
{
    line.remove_prefix(kMeasureMark.size());
    if (line.ends_with('\r')) {
        line.remove_suffix(1);
    }
    std::vector<std::string> words;
    for (std::size_t at = 0; at < line.size();) {
        const std::size_t end = std::min(line.find_first_of(" \t", at), line.size());
        if (end > at) {
            words.emplace_back(line.substr(at, end - at));
        }
        at = end + 1;
    }
    return words;
}

bool is_name(const std::string &word)
{
    const auto is_letter_or_digit = [](char c) {
        const auto byte = static_cast<unsigned char>(c);
        return byte < 0x80 && std::isalnum(byte) != 0;
    };
    return !word.empty() && word.size() <= kLongestName &&
           (is_letter_or_digit(word.front()) || word.front() == '_') &&
           std::ranges::all_of(word, [&](char c) {
               return is_letter_or_digit(c) || c == '_' || c == '.' || c == '-';
           });
}

bool is_unit(const std::string &word)
{
    return !word.empty() && word.find(' ') == word.npos && one_line(word) == word &&
           characters(word).size() <= kLongestUnit;
}

// printf() writes a plus if it is asked to.
std::optional<double> finite_number(const std::string &word)
{
    const std::size_t sign = word.starts_with('+') && !word.starts_with("+-") ? 1 : 0;
    const char *const last = word.data() + word.size();
    double number = 0;
    const auto [stop, error] = read_number(word.data() + sign, last, number);
    return error == std::errc{} && stop == last && std::isfinite(number) ? std::optional(number)
                                                                         : std::nullopt;
}

// What a number says, however it is written: "-12 1" for -1.2e2.
std::string digits_of(const std::string &word)
{
    std::string digits;
    long power = 0;
    const std::size_t end = std::min(word.find_first_of("eE"), word.size());
    const std::size_t point = std::min(word.find('.'), end);
    for (std::size_t at = 0; at < end; ++at) {
        const char c = word[at];
        power -= at > point ? 1 : 0;
        digits += (c > '0' && c <= '9') || (c == '0' && !digits.empty()) ? std::string(1, c) : "";
    }
    for (; digits.ends_with('0'); ++power) {
        digits.pop_back();
    }
    if (digits.empty()) {
        return "0";
    }
    power += end < word.size() ? std::strtol(word.c_str() + end + 1, nullptr, 10) : 0;
    return fmt::format("{}{} {}", word.starts_with('-') ? "-" : "", digits, power);
}

// Why a word is no number that can be kept; empty if it is one.
std::string refused_number(const std::string &word, std::optional<double> number)
{
    if (!number) {
        return in_quotes(word) + " is not a number such as -1.5 or 2e-6";
    }
    const bool is_whole = word.find_first_of(".eE") == word.npos;
    return is_whole && digits_of(word) != digits_of(fmt::format("{}", *number))
               ? in_quotes(word) + " has more digits than are kept"
               : "";
}

// Reads them into a measurement; says why they cannot be, or nothing.
std::string read_numbers(const std::vector<std::string> &words, Measurement &one)
{
    std::optional<double> value;
    for (const auto &[at, number] :
         {std::pair{1U, &value}, std::pair{3U, &one.low}, std::pair{4U, &one.high}}) {
        if (at >= words.size() || (at > 1 && words[at] == "-")) {
            continue;
        }
        *number = finite_number(words[at]);
        if (std::string why = refused_number(words[at], *number); !why.empty()) {
            return why;
        }
        if (*number == value && digits_of(words[at]) != digits_of(words[1])) {
            return fmt::format("{} and {} differ in digits that are not kept", in_quotes(words[1]),
                               in_quotes(words[at]));
        }
    }
    one.value = *value;
    return "";
}

bool is_below(const Measurement &one)
{
    return one.low && one.value < *one.low;
}

std::string limits_of(const Measurement &one)
{
    return one.low && one.high ? fmt::format(" ({} to {})", *one.low, *one.high)
           : one.low           ? fmt::format(" (at least {})", *one.low)
           : one.high          ? fmt::format(" (at most {})", *one.high)
                               : "";
}

} // namespace

std::optional<Measurement> measurement_of(const std::vector<std::string> &words, std::string &why)
{
    const auto refuse = [&why](std::string text) {
        why = std::move(text);
        return std::nullopt;
    };
    if (!words.empty() && words.front() == kRefused) {
        return refuse("fptest measure has refused it");
    }
    if (words.size() < 2) {
        return refuse("it needs a name and a value");
    }
    Measurement one;
    one.name = words[0];
    if (!is_name(one.name)) {
        return refuse(in_quotes(one.name) + " is not a name: letters, digits, '_', '.' and '-', "
                                            "at most 64, no '.' or '-' first");
    }
    why = read_numbers(words, one);
    if (!why.empty()) {
        return std::nullopt;
    }
    if (words.size() > 2 && words[2] != "-") {
        one.unit = words[2];
        if (finite_number(one.unit)) {
            return refuse(in_quotes(one.unit) + " is in the unit's place: write '-' for none");
        }
        if (!is_unit(one.unit)) {
            return refuse(in_quotes(one.unit) + " is not a unit of 1 to 16 characters");
        }
    }
    if (words.size() == 4) {
        return refuse("LOW is there without HIGH: write '-' for no limit");
    }
    if (words.size() > 5) {
        return refuse(in_quotes(words[5]) + " is one word too many");
    }
    if (one.low && one.high && *one.low > *one.high) {
        return refuse(fmt::format("LOW {} is above HIGH {}", *one.low, *one.high));
    }
    return one;
}

bool is_out(const Measurement &one)
{
    return is_below(one) || (one.high && one.value > *one.high);
}

std::string words_of(const Measurement &one)
{
    const auto number = [](const std::optional<double> &limit) {
        return limit ? fmt::format("{}", *limit) : "-";
    };
    std::string text = fmt::format("{}", one.value);
    if (!one.unit.empty() || one.low || one.high) {
        text += " " + (one.unit.empty() ? "-" : one.unit);
    }
    if (one.low || one.high) {
        text += " " + number(one.low) + " " + number(one.high);
    }
    return text;
}

std::string text_of(const Measurement &one)
{
    return fmt::format("{} {}{}{}{}", one.name, one.value, one.unit.empty() ? "" : " ", one.unit,
                       limits_of(one));
}

std::string what_is_out(const Measured &measured)
{
    return fmt::format("{} out of limits: {}{}", plural(measured.out, "measurement"),
                       measured.first_out, measured.out > 1 ? " ..." : "");
}

std::string what_is_lost(const Measured &measured)
{
    Measured lost = measured;
    lost.left_out = 0; // but judged
    return warning_of(lost);
}

std::string warning_of(const Measured &measured)
{
    std::string text;
    const auto add = [&text](const std::string &part) {
        text += (text.empty() ? "" : "; ") + part;
    };
    if (measured.malformed > 0) {
        add(fmt::format("{}: {}", plural(measured.malformed, "malformed #measure line"),
                        measured.first_malformed));
    }
    if (measured.left_out > 0) {
        add(fmt::format("{} after the first {} left out", plural(measured.left_out, "measurement"),
                        Measured::kMost));
    }
    if (measured.not_judged > 0) {
        add(fmt::format("{} after {} not judged", measured.not_judged, kMostJudged));
    }
    if (measured.is_cut) {
        add("it has opened its output anew, as '> /dev/stderr' does, and what it had just printed "
            "may be lost: write '>&2'");
    }
    if (!measured.is_read) {
        add("it printed too fast to be read for measurements");
    }
    return text;
}

bool is_measurement(std::string_view line)
{
    std::string why;
    return is_about_one(line) && line.size() <= kLongestLine &&
           measurement_of(words_after_mark(line), why);
}

namespace
{

// Not a sentence about "#measure NAME VALUE".
bool is_meant_for_one(std::string_view line)
{
    const std::vector<std::string> words = words_after_mark(line);
    const auto has_number = [](const std::string &word) {
        const std::size_t at = word.find_first_not_of("+-.");
        return at != word.npos && std::isdigit(static_cast<unsigned char>(word[at])) != 0;
    };
    return !words.empty() &&
           (words.front() == kRefused || std::any_of(words.begin() + 1, words.end(), has_number));
}

// From its mark on. What stands before that may be a line that another print began.
void take_line(const std::string &line, bool is_whole, Measured &measured)
{
    if (!is_about_one(line) || (!is_whole && !is_meant_for_one(line))) {
        return;
    }
    if (measured.kept.size() + measured.left_out + measured.malformed >= kMostJudged) {
        ++measured.not_judged;
        return;
    }
    std::string why;
    auto one =
        line.size() <= kLongestLine ? measurement_of(words_after_mark(line), why) : std::nullopt;
    if (!is_whole) {
        one.reset();
        why = "it is not at the start of its line";
    }
    if (!one) {
        if (++measured.malformed == 1) {
            measured.first_malformed =
                fmt::format("{}: {}", in_quotes(line, kShownColumns),
                            why.empty() ? fmt::format("longer than {} bytes", kLongestLine) : why);
        }
        return;
    }
    if (is_out(*one) && ++measured.out == 1) {
        measured.first_out = text_of(*one);
    }
    if (measured.kept.size() < Measured::kMost) {
        measured.kept.push_back(std::move(*one));
    } else {
        ++measured.left_out;
    }
}

} // namespace

void MeasureReader::read(std::string_view text, Measured &measured)
{
    if (is_skipping_) {
        const std::size_t end = text.find_first_of("\n\r");
        is_skipping_ = end == text.npos;
        text.remove_prefix(is_skipping_ ? text.size() : end + 1);
    }
    while (!text.empty()) {
        // not byte by byte, as a program that prints without end has many
        const std::size_t skipped = line_.empty() ? text.find(kMeasureMark.front()) : 0;
        if (skipped > 0) {
            const std::string_view other = text.substr(0, skipped);
            is_at_start_ = is_line_end(other.back());
            text.remove_prefix(other.size());
            continue;
        }
        if (line_.empty() && text.size() >= kMeasureMark.size() &&
            !text.starts_with(kMeasureMark)) {
            is_at_start_ = false;
            text.remove_prefix(1);
            continue;
        }
        if (line_.size() > kMeasureMark.size() && !is_line_end(text.front())) {
            const std::string_view rest = text.substr(0, text.find_first_of("\n\r"));
            line_ += rest.substr(0, kLongestLine + 1 - std::min(line_.size(), kLongestLine + 1));
            text.remove_prefix(rest.size());
            continue;
        }
        const char c = text.front();
        if (is_line_end(c)) {
            end(measured);
        } else {
            line_ += c;
        }
        text.remove_prefix(1);
        if (!may_be_about_one(line_)) { // but this byte may begin another
            line_ = c == kMeasureMark.front() ? std::string(1, c) : "";
            is_at_start_ = false;
        }
    }
}

void MeasureReader::skip()
{
    line_.clear();
    is_skipping_ = true;
    is_at_start_ = true;
}

void MeasureReader::end(Measured &measured)
{
    take_line(line_, is_at_start_, measured);
    line_.clear();
    is_at_start_ = true;
}

} // namespace fptest
