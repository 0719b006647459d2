// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "check/shell_reader.h"

#include <algorithm>
#include <initializer_list>
#include <set>
#include <utility>

namespace fptest
{

namespace
{

using Fault = ShellReading::Fault;
using Effect = ShellReading::Effect;

constexpr std::string_view kEndsWord = " \t\n;&|<>()";
constexpr std::string_view kOperators = "$;&|<>(";

std::string trimmed(std::string_view text)
{
    constexpr std::string_view kBlanks = " \t\n";
    while (text.starts_with("\\\n")) {
        text.remove_prefix(2);
    }
    const std::size_t begin = std::min(text.find_first_not_of(kBlanks), text.size());
    const std::size_t end = text.find_last_not_of(kBlanks);
    text = text.substr(begin, end == text.npos ? 0 : end + 1 - begin);
    return std::string(text == "\\" ? "" : text);
}

bool is_any(std::string_view word, std::initializer_list<std::string_view> words)
{
    return std::ranges::find(words, word) != words.end();
}

class LineScanner
{
  public:
    explicit LineScanner(std::string_view line) : line_(line)
    {
    }

    ShellReading read()
    {
        read_commands();
        if (!here_documents_.empty()) {
            fail(Fault::Kind::no_end, here_documents_.front().at, here_documents_.front().mark);
        }
        end_effect();
        return std::move(reading_);
    }

  private:
    struct HereDocument {
        std::size_t at = 0;
        std::string mark;
        std::string end;
        bool drops_tabs = false;
        bool is_quoted = false; // then nothing is expanded in it
    };

    // The progress through the current command.
    struct State {
        std::size_t words = 0;
        bool is_empty = true;  // it has no redirection either
        std::size_t cases = 0; // "case" without its "esac"
        std::size_t operator_at = 0;
        std::string operator_ = {}; // what has a command after it
    };

    // --- places ---

    [[nodiscard]] bool at_end() const
    {
        return at_ >= line_.size();
    }
    [[nodiscard]] bool looking_at(std::string_view what) const
    {
        return line_.compare(std::min(at_, line_.size()), what.size(), what) == 0;
    }
    [[nodiscard]] bool looking_at_any(std::string_view characters) const
    {
        return !at_end() && characters.find(line_[at_]) != std::string_view::npos;
    }
    bool pass(std::string_view what)
    {
        const bool found = looking_at(what);
        at_ += found ? what.size() : 0;
        return found;
    }
    // The first of these marks that is here; empty if none is.
    std::string_view pass_any(std::initializer_list<std::string_view> marks)
    {
        const auto *const found =
            std::ranges::find_if(marks, [this](auto mark) { return pass(mark); });
        return found != marks.end() ? *found : "";
    }
    void pass_blanks()
    {
        while (pass(" ") || pass("\t") || pass_continuation()) {
        }
    }
    // Inside an operator it makes another operator, which is not read here.
    bool pass_continuation()
    {
        const std::size_t begin = at_;
        if (pass("\\\n") && begin > 0 && kOperators.find(line_[begin - 1]) != kOperators.npos) {
            note(Effect::Kind::continuation, begin, "\\", begin, begin);
        }
        return at_ > begin;
    }

    void fail(Fault::Kind kind, std::size_t at, std::string_view mark)
    {
        if (!reading_.fault) {
            reading_.fault = Fault{kind, at, std::string(mark)};
        }
        at_ = line_.size();
    }

    // --- effects ---

    [[nodiscard]] bool is_first() const
    {
        return depth_ == 0 && !after_first_;
    }

    void note(Effect::Kind kind, std::size_t at, std::string_view mark, std::size_t begin,
              std::size_t end)
    {
        if (is_first()) {
            reading_.effects.push_back(
                {kind, at, std::string(mark),
                 trimmed(line_.substr(begin, std::max(begin, end) - begin))});
        }
    }

    // Its text is what follows, up to the end of the line.
    void begin_effect(std::size_t at, std::string_view mark)
    {
        if (is_first()) {
            note(Effect::Kind::command, at, mark, at, at);
            open_ = at_;
            after_first_ = true;
        }
    }

    void end_effect()
    {
        if (open_ && at_ >= *open_) {
            reading_.effects.back().text = trimmed(line_.substr(*open_, at_ - *open_));
            open_.reset();
        }
    }

    // --- commands ---

    // Up to a ')' that ends something.
    void read_commands()
    {
        State state;
        while (!at_end()) {
            pass_blanks();
            if (at_end()) {
                break;
            }
            if (looking_at(")")) {
                if (state.cases > 0) {
                    ++at_;
                    state = {.cases = state.cases};
                } else if (depth_ == 0) {
                    fail(Fault::Kind::unexpected, at_, ")");
                } else {
                    break;
                }
            } else if (looking_at("\n")) {
                read_line_end(state);
            } else if (looking_at("#")) {
                read_comment();
            } else if (looking_at("(")) {
                read_parenthesis(state);
            } else if (looking_at_any("<>") || looking_at("&>")) {
                state.is_empty = false;
                read_redirection(at_);
            } else if (looking_at_any(";&|")) {
                read_operator(state);
            } else {
                read_word(state);
            }
        }
        if (!state.operator_.empty() && state.is_empty) {
            fail(Fault::Kind::nothing_after, state.operator_at, state.operator_);
        }
    }

    void read_comment()
    {
        const std::size_t begin = at_;
        if (depth_ == 0) {
            end_effect();
        }
        at_ = std::min(line_.find('\n', at_), line_.size());
        note(Effect::Kind::comment, begin, "#", begin, at_);
    }

    void read_line_end(State &state)
    {
        const std::size_t place = at_;
        if (depth_ == 0 && state.operator_.empty()) {
            end_effect();
        }
        ++at_;
        read_here_documents();
        if (!state.operator_.empty() && state.is_empty) {
            return;
        }
        state = {.cases = state.cases};
        if (depth_ == 0 && !has_line_end_ && next_command() < line_.size()) {
            has_line_end_ = true;
            end_effect();
            after_first_ = false;
            begin_effect(place, "\n");
            open_ = next_command();
        }
    }

    // Where the next command begins; the line's size if there is none.
    [[nodiscard]] std::size_t next_command() const
    {
        std::size_t at = at_;
        while (at < line_.size()) {
            const std::string_view left = line_.substr(at);
            if (left.starts_with("\\\n") || left == "\\") {
                at += left.size() == 1 ? 1 : 2;
            } else if (left.starts_with('#')) {
                at = std::min(line_.find('\n', at), line_.size());
            } else if (left.find_first_of(" \t\n") == 0) {
                ++at;
            } else {
                break;
            }
        }
        return at;
    }

    void read_parenthesis(State &state)
    {
        const std::size_t begin = at_;
        if (state.words == 1 && pass_empty_parentheses()) {
            note(Effect::Kind::function, begin, "(", begin, at_);
            state = {.cases = state.cases};
        } else if (state.words > 0 && state.cases == 0) {
            fail(Fault::Kind::unexpected, begin, "(");
        } else if (state.words > 0) {
            ++at_; // in front of a pattern
        } else {
            state.words = 1;
            state.is_empty = false;
            if (!pass_arithmetic("((")) {
                read_nested("(");
            }
        }
    }

    bool pass_empty_parentheses()
    {
        const std::size_t begin = at_++;
        pass_blanks();
        const bool found = pass(")");
        at_ = found ? at_ : begin;
        return found;
    }

    void read_nested(std::string_view mark)
    {
        const std::size_t begin = at_;
        at_ += mark.size();
        const std::size_t documents = here_documents_.size();
        ++depth_;
        read_commands();
        --depth_;
        here_documents_.resize(std::min(documents, here_documents_.size()));
        if (at_end()) {
            fail(Fault::Kind::no_end, begin, mark);
        } else {
            ++at_;
        }
    }

    void read_operator(State &state)
    {
        const std::size_t begin = at_;
        const std::string_view mark = pass_any({"&&", "||", "|&", ";;", ";&", ";|", ";", "&", "|"});
        const bool ends_case = mark.starts_with(';') && mark.size() == 2;
        if (ends_case ? state.cases == 0 : state.is_empty) {
            fail(Fault::Kind::unexpected, begin, mark);
            return;
        }
        begin_effect(begin, mark);
        state = {.cases = state.cases};
        if (is_any(mark, {"&&", "||", "|"})) {
            state.operator_at = begin;
            state.operator_ = mark;
        }
    }

    // --- redirections ---

    void read_redirection(std::size_t begin)
    {
        const std::size_t place = at_;
        const std::string_view mark = pass_any({"<<<", "<<-", "<<", "<&", "<>", "<", "&>>", "&>|",
                                                "&>&", "&>", ">>", ">|", ">&", ">"});
        pass_blanks();
        const std::size_t target = at_;
        pass_word();
        if (at_ == target) {
            fail(Fault::Kind::nothing_after, place, mark);
            return;
        }
        const std::string_view word = line_.substr(target, at_ - target);
        const bool is_refused = is_any(mark, {">&", "<&", "&>&"}) && !is_any(word, {"-", "p"}) &&
                                word.find_first_not_of("0123456789") != word.npos &&
                                word.find_first_of("$`\\'\"") == word.npos;
        note(is_refused ? Effect::Kind::no_descriptor : Effect::Kind::redirection, begin, mark,
             begin, at_);
        if (is_any(mark, {"<<", "<<-"})) {
            here_documents_.push_back({place, std::string(line_.substr(place, at_ - place)),
                                       unquoted(word), mark == "<<-", unquoted(word) != word});
        }
    }

    static std::string unquoted(std::string_view word)
    {
        std::string plain;
        for (std::size_t at = 0; at < word.size(); ++at) {
            if (word[at] == '\\' && at + 1 < word.size()) {
                plain += word[++at];
            } else if (word[at] != '"' && word[at] != '\'') {
                plain += word[at];
            }
        }
        return plain;
    }

    void read_here_documents()
    {
        for (const HereDocument &document : std::exchange(here_documents_, {})) {
            bool found = false;
            while (!found && !at_end()) {
                const std::size_t end = std::min(line_.find('\n', at_), line_.size());
                std::string_view text = line_.substr(at_, end - at_);
                if (document.drops_tabs) {
                    text.remove_prefix(std::min(text.find_first_not_of('\t'), text.size()));
                }
                // an enclosing substitution may end right after it
                const bool is_last = depth_ > 0 && text.starts_with(document.end + ")");
                found = is_last || text == document.end;
                if (is_last) {
                    at_ = end - text.size() + document.end.size();
                } else if (found || document.is_quoted) {
                    at_ = std::min(end + 1, line_.size());
                } else {
                    read_here_line(end);
                }
            }
            if (!found) {
                fail(Fault::Kind::no_end, document.at, document.mark);
            }
        }
    }

    // A line of a here document, in which quotes mean nothing.
    void read_here_line(std::size_t end)
    {
        while (at_ < end) {
            if (looking_at_any("$`\\")) {
                read_character(true);
            } else {
                ++at_;
            }
        }
        at_ = std::min(std::max(at_, end + 1), line_.size());
    }

    // --- words ---

    void read_word(State &state)
    {
        const std::size_t begin = at_;
        pass_word();
        const std::string_view word = line_.substr(begin, at_ - begin);
        state.is_empty = false;
        if (word.find_first_not_of("0123456789") == word.npos && looking_at_any("<>")) {
            read_redirection(begin);
            return;
        }
        if (state.words > 0) {
            ++state.words;
            return;
        }
        if (word == "case") {
            ++state.cases;
        } else if (word == "esac") {
            state.cases -= std::min<std::size_t>(state.cases, 1);
        }
        if (word.ends_with('=') && looking_at("(")) {
            read_pattern(); // the values of an array
        }
        // a command follows these
        if (!is_any(word, {"if", "then", "elif", "else", "while", "until", "do", "{", "!"})) {
            ++state.words;
        }
    }

    void pass_word()
    {
        while (!at_end()) {
            if (looking_at_any("@*+?!") && line_.substr(at_ + 1).starts_with('(')) {
                ++at_;
                read_pattern();
            } else if (looking_at_any(kEndsWord)) {
                break;
            } else {
                read_character(false);
            }
        }
    }

    // One character, a quotation or an expansion.
    void read_character(bool in_quotes)
    {
        if (looking_at("\\\n")) {
            pass_continuation();
        } else if (looking_at("\\") || looking_at("$$")) {
            at_ = std::min(at_ + 2, line_.size());
        } else if (looking_at("'") && !in_quotes) {
            read_single_quotes("'");
        } else if (looking_at("$'") && !in_quotes) {
            read_single_quotes("$'");
        } else if (looking_at("\"")) {
            read_double_quotes();
        } else if (looking_at("`")) {
            read_backticks();
        } else if (looking_at("${")) {
            read_braces(in_quotes);
        } else if (looking_at("$(")) {
            const std::size_t begin = at_;
            if (!pass_arithmetic("$((")) {
                read_nested("$(");
                note(Effect::Kind::substitution, begin, "$(", begin + 2, at_ - 1);
            }
        } else {
            ++at_;
        }
    }

    // In $'...' a quote may be escaped.
    void read_single_quotes(std::string_view mark)
    {
        const std::size_t begin = at_;
        at_ += mark.size();
        while (!at_end() && !looking_at("'")) {
            at_ += mark == "$'" && looking_at("\\") ? 2 : 1;
        }
        expect_end("'", begin, mark);
    }

    // Passes over the end of what began there, or reports that it is missing.
    void expect_end(std::string_view end, std::size_t begin, std::string_view mark)
    {
        if (!pass(end)) {
            fail(Fault::Kind::no_end, begin, mark);
        }
    }

    void read_double_quotes()
    {
        const std::size_t begin = at_++;
        while (!at_end() && !looking_at("\"")) {
            read_character(true);
        }
        expect_end("\"", begin, "\"");
    }

    void read_backticks()
    {
        const std::size_t begin = at_++;
        while (!at_end() && !looking_at("`")) {
            at_ += looking_at("\\") ? 2 : 1;
        }
        expect_end("`", begin, "`");
        note(Effect::Kind::substitution, begin, "`", begin + 1, at_ - 1);
    }

    // "${NAME}"; "${ COMMAND;}" and "${|COMMAND;}" run something.
    void read_braces(bool in_quotes)
    {
        const std::size_t begin = at_;
        at_ += 2;
        const bool is_command = looking_at_any(" \t\n|");
        ++braces_; // a word inside is expanded only where its turn comes
        while (!at_end() && !looking_at("}")) {
            read_character(in_quotes && !is_command);
        }
        --braces_;
        expect_end("}", begin, "${");
        if (is_command) {
            note(Effect::Kind::substitution, begin, "${", begin + 3, at_ - 1);
        } else if (braces_ == 0) {
            note(Effect::Kind::expansion, begin, "${", begin, at_);
        }
    }

    void read_pattern()
    {
        const std::size_t begin = at_++;
        while (!at_end() && !looking_at(")")) {
            if (looking_at("(")) {
                read_pattern();
            } else {
                read_character(false);
            }
        }
        expect_end(")", begin, "(");
    }

    // False if it is no arithmetic, or ends otherwise: then it holds commands.
    bool pass_arithmetic(std::string_view mark)
    {
        const std::size_t begin = at_;
        if (not_arithmetic_.contains(begin) || !pass(mark)) {
            return false;
        }
        const std::size_t effects = reading_.effects.size();
        std::size_t open = 2;
        while (!at_end()) {
            if (pass("(")) {
                ++open;
            } else if (looking_at(")")) {
                if (open > 2) {
                    ++at_;
                    --open;
                } else if (pass("))")) {
                    if (mark == "$((" && braces_ == 0) {
                        note(Effect::Kind::expansion, begin, mark, begin, at_);
                    }
                    return true;
                } else {
                    not_arithmetic_.insert(begin);
                    reading_.effects.resize(effects);
                    at_ = begin;
                    return false;
                }
            } else {
                read_character(true);
            }
        }
        if (mark != "((") { // which the shell takes without its end
            fail(Fault::Kind::no_end, begin, mark);
        }
        return true;
    }

    std::string_view line_;
    std::size_t at_ = 0;
    ShellReading reading_;
    std::size_t depth_ = 0; // of what is run on its own
    std::size_t braces_ = 0;
    std::set<std::size_t> not_arithmetic_; // where it has been tried: once, or it never ends
    bool after_first_ = false;
    bool has_line_end_ = false;
    std::optional<std::size_t> open_; // where the last effect's text begins
    std::vector<HereDocument> here_documents_;
};

} // namespace

ShellReading read_shell_line(std::string_view line)
{
    return LineScanner(line).read();
}

} // namespace fptest
