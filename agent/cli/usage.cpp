// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/usage.h"

#include "util/failure.h"
#include "util/spelling.h"
#include "util/text.h"

#include <algorithm>
#include <fmt/core.h>
#include <utility>
#include <vector>

namespace fptest
{

namespace
{

// The parser's error begins with the option's name, for a flag without its dashes.
const CLI::Option *option_of(const CLI::App &command, const std::string &text)
{
    for (const CLI::Option *option : command.get_options()) {
        const std::string name = option->get_name();
        const std::string word = name.substr(std::min(name.find_first_not_of('-'), name.size()));
        if (text.starts_with(name + ":") || text.starts_with(word + " ")) {
            return option;
        }
    }
    return nullptr;
}

std::string no_value(const CLI::Option &option)
{
    return option.get_name() + " takes no value";
}

std::string mismatch(const CLI::App &command, const std::string &text)
{
    const CLI::Option *option = option_of(command, text);
    if (option == nullptr) {
        return text;
    }
    const std::string name = option->get_name();
    if (option->get_expected_max() == 0) {
        return no_value(*option);
    }
    return option->count() > 1
               ? fmt::format("{} is given {} times: give it once", name, option->count())
               : fmt::format("{0} needs a value: {0} {1}", name, option->get_type_name());
}

std::string without_option(const CLI::App &command, const std::string &word)
{
    const std::string name = word.substr(0, word.find('='));
    std::vector<std::string> names;
    std::vector<std::string> longer; // names that begin with it
    for (const CLI::Option *option : command.get_options()) {
        if (option->get_name().starts_with('-')) {
            names.push_back(option->get_name());
        }
        if (name.size() > 2 && option->get_name().starts_with(name)) {
            longer.push_back(option->get_name());
        }
    }
    const std::string near = longer.size() == 1 ? longer.front() : nearest(word, names);
    return fmt::format("there is no option {}{}", in_quotes(word), did_you_mean(near));
}

std::string surplus(const CLI::App &app, const CLI::App &command, const std::string &text)
{
    std::vector<std::string> words = app.remaining(true);
    std::erase(words, "--"); // see mark_numbers()
    if (words.empty()) {
        return text;
    }
    const std::string &word = words.front();
    if (!word.starts_with('-') || word == "-") {
        return fmt::format("{} is one argument too many", in_quotes(word));
    }
    return command.get_option_no_throw(word) != nullptr
               ? fmt::format("{} is not an option after --: put it before", word)
               : without_option(command, word);
}

std::string with_help(const std::string &text, const std::string &command)
{
    return with_advice(text,
                       fmt::format("see fptest {}--help", command.empty() ? "" : command + " "));
}

} // namespace

std::vector<std::string> split_empty_values(const CLI::App &command, std::vector<std::string> words)
{
    for (std::size_t at = 0; at < words.size() && words[at] != "--"; ++at) {
        const std::string &word = words[at];
        const CLI::Option *option =
            word.starts_with("--") && word.find('=') == word.size() - 1
                ? command.get_option_no_throw(word.substr(0, word.size() - 1))
                : nullptr;
        if (option == nullptr) {
            continue;
        }
        if (option->get_expected_max() == 0 && !option->get_disable_flag_override()) {
            throw Failure(
                Cause::input, "{}",
                with_help(option->get_name() + ": its value is empty", command.get_name()));
        }
        if (option->get_expected_max() == 0) {
            throw Failure(Cause::input, "{}", with_help(no_value(*option), command.get_name()));
        }
        words[at].pop_back();
        words.insert(words.begin() + static_cast<std::ptrdiff_t>(++at), "");
    }
    return words;
}

std::vector<std::string> join_seed(std::vector<std::string> words)
{
    std::vector<std::string> joined;
    for (std::string &word : words) {
        const bool is_number = word.find_first_not_of("0123456789") == std::string::npos;
        if (is_number && !joined.empty() && joined.back() == "--shuffle") {
            joined.back() += "=" + word;
        } else {
            joined.push_back(std::move(word));
        }
    }
    return joined;
}

std::vector<std::string> mark_numbers(const CLI::App &command, std::vector<std::string> words)
{
    const auto is_given = [&words](const char *word) {
        return std::ranges::find(words, word) != words.end();
    };
    if (command.get_name() == "measure" && !is_given("--") && !is_given("--help") &&
        !is_given("-h")) {
        words.insert(words.begin() + 1, "--");
    }
    return words;
}

std::string unknown_option(const std::string &word, const CLI::App &app)
{
    return with_help(without_option(app, word), "");
}

std::string usage_line(const CLI::App *app, const CLI::Error &error)
{
    const std::vector<CLI::App *> commands = app->get_subcommands();
    const CLI::App &command = commands.empty() ? *app : *commands.front();
    std::string text = error.what();
    switch (static_cast<CLI::ExitCodes>(error.get_exit_code())) {
    case CLI::ExitCodes::ArgumentMismatch:
        text = mismatch(command, text);
        break;
    case CLI::ExitCodes::ExtrasError:
        text = surplus(*app, command, text);
        break;
    case CLI::ExitCodes::RequiredError:
        // the missing word may be there, misspelt
        text = commands.empty() ? "no command is given" : surplus(*app, command, text);
        break;
    default:
        break;
    }
    return fmt::format("fptest: {}\n", with_help(text, commands.empty() ? "" : command.get_name()));
}

} // namespace fptest
