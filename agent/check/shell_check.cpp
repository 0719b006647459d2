// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/shell_check.h"

#include "check/document_checks.h"
#include "plan/plan.h"

#include <algorithm>
#include <vector>

namespace fptest
{

namespace
{

using Fault = ShellReading::Fault;
using Effect = ShellReading::Effect;

// The characters of a program's name that mean something to the shell.
std::string shell_characters(std::string_view name)
{
    constexpr std::string_view kTaken = " \"'\\$`;&|<>()*?[{";
    std::vector<std::string> found;
    for (const char taken : kTaken) {
        if (name.find(taken) != name.npos) {
            found.push_back(taken == ' ' ? "a blank" : fmt::format("'{}'", taken));
        }
    }
    return join_and(found);
}

// Whether it may hold more than words.
bool may_hold_syntax(std::string_view line)
{
    return line.size() <= kCommandLimit && // else it is cut, and what is left of it changes
           line.find_first_of("\"'\\$`;&|<>()#\n\r") != line.npos;
}

std::string reason(const Fault &fault)
{
    const std::string mark = quoted_name(fault.mark);
    switch (fault.kind) {
    case Fault::Kind::no_end:
        return fmt::format("it finds no end of the {} here; end it, or put a '\\' before it", mark);
    case Fault::Kind::unexpected:
        return fmt::format("it takes no {} here; put it in quotes, or leave it out", mark);
    case Fault::Kind::nothing_after:
        return fmt::format("nothing follows the {} here; put it in quotes, or leave it out", mark);
    }
    return {};
}

// What the shell runs for the text between backticks, in which a '\' escapes these.
std::string without_escapes(const std::string &text, std::string_view escaped)
{
    std::string plain;
    for (std::size_t at = 0; at < text.size(); ++at) {
        const bool is_escape =
            text[at] == '\\' && at + 1 < text.size() && escaped.find(text[at + 1]) != escaped.npos;
        plain += text[is_escape ? ++at : at];
    }
    return plain;
}

} // namespace

ShellChecker::ShellChecker(const CheckContext &context) : context_(context)
{
}

void ShellChecker::check(const Item &item)
{
    const std::string args = item.args.value_or("");
    const std::string line = command_line(item.name, args, "");
    const std::size_t args_begin = line.size() - args.size();
    const Verdict verdict = may_hold_syntax(line) ? judge(item, line) : Verdict{};
    const std::string characters = shell_characters(item.name);
    const bool is_of_name = verdict.is_line_refused && verdict.reading.fault
                                ? verdict.reading.fault->at < args_begin
                                : !characters.empty() && !may_hold_syntax(args);
    if (!characters.empty()) {
        report_name(item, characters, verdict.is_line_refused && is_of_name);
    }
    if (verdict.is_line_refused && !is_of_name) {
        report_refusal(item, verdict, args_begin);
    }
    if (!verdict.is_line_refused) {
        for (const Effect &effect : verdict.reading.effects) {
            if (effect.at >= args_begin) {
                report_effect(item, effect, args_place(item, effect.at - args_begin));
            }
        }
    }
    // with a line feed after it that is reported, it is the same mistake
    const bool ends_line = std::ranges::any_of(verdict.reading.effects, [&](const Effect &effect) {
        return effect.mark == "\n" && line[effect.at - 1] == '\r';
    });
    if (const std::size_t at = args.find('\r'); at != args.npos && !ends_line) {
        context_.findings.warning(args_place(item, at),
                                  "the shell takes the carriage return here for a character like "
                                  "any other, and would hand it to item {}; leave it out",
                                  quoted_name(item.name));
    }
}

// If there is a shell, its word counts.
ShellChecker::Verdict ShellChecker::judge(const Item &item, const std::string &line)
{
    const auto [place, is_new] = verdicts_.try_emplace(line);
    Verdict &verdict = place->second;
    if (is_new) {
        verdict.reading = read_shell_line(line);
        const DeviceShell::Answer answer = shell_.ask(line, verdict.why);
        verdict.is_line_refused = answer == DeviceShell::Answer::unknown
                                      ? verdict.reading.fault.has_value()
                                      : answer == DeviceShell::Answer::refused;
        if (answer == DeviceShell::Answer::unknown && shell_.is_out_of_time() && !is_limit_told_) {
            is_limit_told_ = true;
            context_.findings.warning(
                context_.places.of(item.number, "name"),
                "the device's shell has been asked for as long as fptest waits for it: from item "
                "{} on, what it would refuse may be missed; check the rest as a plan of its own",
                quoted_name(item.name));
        }
    }
    return verdict;
}

// With -n the shell does not look between backticks. A fault in nested ones only costs
// what the outer ones print.
bool ShellChecker::is_substitution_refused(const Effect &substitution, std::string &why)
{
    const std::string &text = substitution.text;
    if (substitution.mark != "`") {
        return shell_.ask(text, why) == DeviceShell::Answer::refused ||
               std::ranges::any_of(read_shell_line(text).effects, [&](const Effect &effect) {
                   return effect.kind == Effect::Kind::substitution &&
                          is_substitution_refused(effect, why);
               });
    }
    // within double quotes a '\' escapes a '"' as well
    return shell_.ask(without_escapes(text, "$`\\"), why) == DeviceShell::Answer::refused &&
           shell_.ask(without_escapes(text, "$`\\\""), why) == DeviceShell::Answer::refused;
}

std::size_t ShellChecker::args_place(const Item &item, std::size_t at) const
{
    return context_.places.inside(item.number, "args", at);
}

void ShellChecker::report_name(const Item &item, const std::string &characters,
                               bool is_line_refused)
{
    context_.findings.add(
        is_line_refused ? Finding::Severity::error : Finding::Severity::warning,
        context_.places.of(item.number, "name"),
        "item {} has {} in its name, which the shell reads as its own: it would {}; rename it",
        quoted_name(item.name), characters,
        is_line_refused ? "refuse the command line" : "not run a program of that name");
}

void ShellChecker::report_refusal(const Item &item, const Verdict &verdict, std::size_t args_begin)
{
    const auto &fault = verdict.reading.fault;
    context_.findings.error(
        args_place(item, fault ? fault->at - args_begin : 0),
        "the shell would refuse the command line of item {}: {}", quoted_name(item.name),
        fault ? reason(*fault) : fmt::format("{}; fix its args", one_line(verdict.why)));
}

void ShellChecker::report_effect(const Item &item, const Effect &effect, std::size_t place)
{
    const std::string name = quoted_name(item.name);
    const std::string text = quoted_name(effect.text);
    const std::string mark = quoted_name(effect.mark);
    std::string why;
    switch (effect.kind) {
    case Effect::Kind::command:
        report_command(item, effect, place);
        break;
    case Effect::Kind::expansion:
        if (shell_.ask_to_expand(effect.text, why) == DeviceShell::Answer::refused) {
            context_.findings.error(place,
                                    "the shell would refuse the command line of item {}: {}; put a "
                                    "'\\' before the '$' here if it is meant for the item",
                                    name, one_line(why));
        }
        break;
    case Effect::Kind::substitution:
        if (is_substitution_refused(effect, why)) {
            context_.findings.error(place,
                                    "the shell would refuse the command line of item {}: in {} "
                                    "here, {}; put a '\\' before {} if it is meant for the item",
                                    name, effect.mark == "`" ? "the backticks" : text,
                                    one_line(why), mark);
            break;
        }
        context_.findings.warning(
            place,
            "the shell would run {} as a command of its own before item {}, and put what that "
            "prints here; put a '\\' before it if it is meant for the item",
            text, name);
        break;
    case Effect::Kind::redirection:
        context_.findings.warning(place,
                                  "the shell would redirect item {} by {}, and not hand it that; "
                                  "put the {} in quotes if it is meant for the item",
                                  name, text, mark);
        break;
    case Effect::Kind::no_descriptor:
        context_.findings.error(place,
                                "the shell would refuse the command line of item {}: {} names no "
                                "descriptor; write '>FILE 2>&1' to redirect both outputs, or put "
                                "the {} in quotes if it is meant for the item",
                                name, text, mark);
        break;
    case Effect::Kind::comment:
        context_.findings.warning(place,
                                  "the shell would take {} for a comment, and not hand it to item "
                                  "{}; put the {} in quotes if it is meant for the item",
                                  text, name, mark);
        break;
    case Effect::Kind::continuation:
        context_.findings.warning(place,
                                  "the shell would take away the {} and the line feed here, and "
                                  "join what is before and after them; leave them out",
                                  mark);
        break;
    case Effect::Kind::function:
        context_.findings.error(place,
                                "the shell would make a function of item {} here, and run nothing; "
                                "put the {} in quotes if it is meant for the item",
                                name, mark);
        break;
    }
}

// Reports what ends the item's own command.
void ShellChecker::report_command(const Item &item, const Effect &effect, std::size_t place)
{
    const std::string name = quoted_name(item.name);
    const std::string text = quoted_name(effect.text);
    const std::string mark = quoted_name(effect.mark);
    if (effect.mark == "\n") {
        context_.findings.error(place,
                                "the shell would end the command of item {} at the line feed here, "
                                "and run {} as a command of its own; write a blank in its place",
                                name, text);
    } else if (effect.mark == "&" || effect.mark == "|&") {
        context_.findings.warning(place,
                                  "the shell would run item {} in the background, {}; put the {} "
                                  "in quotes if it is meant for the item",
                                  name,
                                  effect.text.empty()
                                      ? "so that it ends at once for the library"
                                      : fmt::format("and run {} as a command of its own", text),
                                  mark);
    } else if (effect.text.empty()) {
        context_.findings.warning(place,
                                  "the shell would end the command of item {0} here, and not hand "
                                  "it the {1}; put the {1} in quotes if it is meant for the item",
                                  name, mark);
    } else {
        const std::string when = effect.mark == "&&" ? fmt::format(" where item {} succeeds", name)
                                 : effect.mark == "||" ? fmt::format(" where item {} fails", name)
                                 : effect.mark == "|" ? fmt::format(" on what item {} prints", name)
                                                      : fmt::format(", after item {}", name);
        context_.findings.warning(place,
                                  "the shell would run {} as a command of its own{}; put the {} in "
                                  "quotes if it is meant for the item",
                                  text, when, mark);
    }
}

} // namespace fptest
