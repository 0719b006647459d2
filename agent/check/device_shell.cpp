// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/device_shell.h"

#include "util/programs.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <chrono>
#include <string_view>
#include <sys/wait.h>
#include <unistd.h>

namespace fptest
{
namespace
{

using Clock = std::chrono::steady_clock;

bool may_be_in_a_name(unsigned char byte)
{
    return std::isalpha(byte) != 0 || byte == '_' || byte >= 0x80;
}

// Whether it stays a mere expansion between double quotes, and runs nothing. No end, quote
// or expansion inside it is allowed, because the shell expands a subscript in arithmetic
// twice. Nor may arithmetic depend on a variable, which may be set on the device.
bool is_safe_to_expand(std::string_view expansion)
{
    const bool is_arithmetic = expansion.starts_with("$((");
    const std::size_t mark = is_arithmetic ? 3 : 2;
    const std::string_view inside = expansion.substr(mark, expansion.size() - 2 * mark + 1);
    const std::string_view marks =
        is_arithmetic ? " =!<>+-*/%^~&|,:?.[]()" : " =!+-*/%^~,:@#.;[]&|<>()";
    const auto is_taken = [&](char byte) {
        const auto character = static_cast<unsigned char>(byte);
        return may_be_in_a_name(character) || std::isdigit(character) != 0 ||
               marks.find(byte) != marks.npos;
    };
    return std::ranges::all_of(inside, is_taken) &&
           (is_arithmetic || inside.find_first_of(" |<&(") != 0) &&
           !(std::ranges::any_of(inside, may_be_in_a_name) &&
             inside.find_first_of("/%?") != inside.npos);
}

} // namespace

DeviceShell::Answer DeviceShell::ask(const std::string &line, std::string &why)
{
    return ask_timed("-n", line, why);
}

DeviceShell::Answer DeviceShell::ask_to_expand(const std::string &expansion, std::string &why)
{
    return is_safe_to_expand(expansion) ? ask_timed("-f", ": \"" + expansion + "\"", why)
                                        : Answer::unknown;
}

DeviceShell::Answer DeviceShell::ask_timed(const std::string &option, const std::string &line,
                                           std::string &why)
{
    const auto begin = Clock::now();
    const Answer answer = ask_once(option, line, why);
    left_ -= std::chrono::duration<double>(Clock::now() - begin).count();
    return answer;
}

DeviceShell::Answer DeviceShell::ask_once(const std::string &option, const std::string &line,
                                          std::string &why) const
{
    if (left_ <= 0 || access("/system/bin/sh", X_OK) != 0) {
        return Answer::unknown;
    }
    const auto end =
        Clock::now() + std::chrono::ceil<Clock::duration>(std::chrono::duration<double>(left_));
    const std::array<char *, 1> environment = {nullptr};
    // the text may begin with a '-'
    const Said said =
        ask_program({"/system/bin/sh", option, "-c", "--", line}, end, environment.data());
    if (!said.is_whole || !WIFEXITED(said.status)) {
        return Answer::unknown;
    }
    if (WEXITSTATUS(said.status) == 0) {
        return Answer::accepted;
    }
    // "E: sh: syntax error: ...", "sh: ..."
    why = said.errors.substr(0, said.errors.find('\n'));
    if (const std::size_t begin = why.find("sh: "); begin != why.npos) {
        why.erase(0, begin + 4);
    }
    return Answer::refused;
}

} // namespace fptest
