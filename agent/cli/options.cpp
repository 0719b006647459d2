// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/options.h"

#include "cli/desk_paths.h"
#include "cli/usage.h"
#include "run/choice.h"
#include "util/numbers.h"
#include "util/text.h"

#include <algorithm>
#include <fmt/core.h>
#include <system_error>
#include <type_traits>
#include <utility>

namespace fptest
{
namespace
{

// What is wrong with a value; an unset variable in a shell may have left it empty.
std::string refused(const std::string &value, const std::string &why)
{
    return value.empty() ? "its value is empty" : fmt::format("{} {}", in_quotes(value), why);
}

template <typename Number> CLI::Validator number_in(Number least, Number most)
{
    return {[least, most](std::string &text) {
                Number number{};
                const char *end = text.data() + text.size();
                const auto [stop, error] = read_number(text.data(), end, number);
                const bool is_number = error == std::errc{} && stop == end;
                // written so that NaN is rejected
                if (is_number && number >= least && number <= most) {
                    text = fmt::format("{}", number); // CLI11 reads 010 as octal
                    return std::string();
                }
                return refused(text, fmt::format("is not a {}number from {} to {}",
                                                 std::is_integral_v<Number> ? "whole " : "", least,
                                                 most));
            },
            ""};
}

} // namespace

CLI::App &add_subcommand(CLI::App &app, const char *name, const char *purpose, const char *examples,
                         Action &chosen, Action action)
{
    CLI::App *command = app.add_subcommand(name, purpose);
    command->footer(examples);
    command->failure_message(usage_line);
    command->callback([&chosen, action = std::move(action)] { chosen = action; });
    return *command;
}

CLI::Validator range(double least, double most)
{
    return number_in(least, most);
}

CLI::Validator range(int least, int most)
{
    return number_in(least, most);
}

CLI::Validator time_span()
{
    return {[](std::string &text) {
                constexpr double kMostDays = 1000;
                static constexpr std::pair<char, double> kUnits[] = {
                    {'s', 1}, {'m', 60}, {'h', 3600}, {'d', 86400}};
                double number = 0;
                const char *const last = text.data() + text.size();
                const auto [stop, error] = read_number(text.data(), last, number);
                double seconds = error == std::errc{} && stop == last ? number : 0;
                for (const auto &[unit, size] : kUnits) {
                    if (error == std::errc{} && stop + 1 == last && *stop == unit) {
                        seconds = number * size;
                    }
                }
                if (seconds > kMostDays * 86400) {
                    return refused(text, "is longer than 1000 days");
                }
                if (!(seconds >= 0.001)) {
                    return refused(text, "is not a time such as 90, 90s, 10m, 2h or 1d");
                }
                text = fmt::format("{}", seconds);
                return std::string();
            },
            ""};
}

CLI::Validator one_of(std::vector<std::string> words, std::string otherwise)
{
    return {[words = std::move(words), otherwise = std::move(otherwise)](std::string &text) {
                return std::ranges::find(words, text) != words.end() ? ""
                                                                     : refused(text, otherwise);
            },
            ""};
}

CLI::Validator result_code()
{
    return one_of({"0", "1", "-2"}, "is not 0, 1 or -2");
}

CLI::Validator not_empty()
{
    return {[](std::string &text) { return text.empty() ? refused(text, "") : ""; }, ""};
}

CLI::Validator order_seed()
{
    return {[](std::string &text) { return text == "true" ? "" : range(0, kSeedLimit)(text); }, ""};
}

CLI::Validator desk_file()
{
    return {[](std::string &text) {
                text = found_on_desk(text);
                return std::string();
            },
            ""};
}

} // namespace fptest
