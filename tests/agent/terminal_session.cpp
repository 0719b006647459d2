// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "terminal_session.h"

#include "support/wait.h"

#include <cerrno>
#include <chrono>
#include <iterator>
#include <poll.h>
#include <pty.h>
#include <stdexcept>
#include <sys/ioctl.h>
#include <unistd.h>
#include <utf8.h>
#include <utmp.h>

using namespace std::chrono;

namespace
{

std::string text_of(const VTermScreenCell &cell)
{
    std::string text;
    for (int at = 0; at < VTERM_MAX_CHARS_PER_CELL && cell.chars[at] != 0; ++at) {
        utf8::append(cell.chars[at], std::back_inserter(text));
    }
    return text;
}

// The cells of a line; the second half of a wide character holds none.
std::string line_of(const std::function<VTermScreenCell(int)> &cell, int columns)
{
    std::string line;
    for (int column = 0; column < columns; ++column) {
        const VTermScreenCell one = cell(column);
        if (one.chars[0] == static_cast<std::uint32_t>(-1)) {
            continue;
        }
        line += one.chars[0] == 0 ? " " : text_of(one);
    }
    line.erase(line.find_last_not_of(' ') + 1);
    return line;
}

} // namespace

TerminalSession::TerminalSession(const std::vector<std::string> &arguments, int columns, int rows,
                                 const support::Environment &environment)
    : columns_(columns), rows_(rows), vterm_(vterm_new(rows, columns)),
      screen_(vterm_obtain_screen(vterm_))
{
    static const auto callbacks = [] {
        VTermScreenCallbacks all{};
        all.sb_pushline = push_line;
        return all;
    }();
    vterm_set_utf8(vterm_, 1);
    vterm_screen_set_callbacks(screen_, &callbacks, this);
    vterm_screen_reset(screen_, 1);

    winsize size{};
    size.ws_col = static_cast<unsigned short>(columns);
    size.ws_row = static_cast<unsigned short>(rows);
    int terminal = -1;
    int programs_side = -1;
    if (openpty(&terminal, &programs_side, nullptr, nullptr, &size) != 0) {
        throw std::runtime_error("no terminal to be had");
    }
    terminal_ = Descriptor(terminal);
    const Descriptor other_side(programs_side);
    support::Start start{.arguments = arguments, .environment = environment};
    start.environment.insert({{"TERM", "xterm-256color"},
                              {"NO_COLOR", std::nullopt},
                              // it would say at each start what goes with the device
                              {"QUILLMARK_DEVICE", std::nullopt}});
    start.shares_streams = true;
    start.prepare = [programs_side] { login_tty(programs_side); };
    process_.emplace(start);
}

TerminalSession::~TerminalSession()
{
    vterm_free(vterm_);
}

void TerminalSession::type(std::string_view keys)
{
    if (write(terminal_.get(), keys.data(), keys.size()) != static_cast<ssize_t>(keys.size())) {
        throw std::runtime_error("the terminal takes no keys");
    }
}

void TerminalSession::resize(int columns, int rows)
{
    winsize size{};
    size.ws_col = static_cast<unsigned short>(columns);
    size.ws_row = static_cast<unsigned short>(rows);
    columns_ = columns;
    rows_ = rows;
    vterm_set_size(vterm_, rows, columns);
    ioctl(terminal_.get(), TIOCSWINSZ, &size);
}

bool TerminalSession::read_some(int milliseconds)
{
    pollfd polled{terminal_.get(), POLLIN, 0};
    if (at_end_ || poll(&polled, 1, milliseconds) <= 0) {
        return !at_end_;
    }
    char buffer[4096];
    const ssize_t got = read(terminal_.get(), buffer, sizeof buffer);
    if (got <= 0) { // EIO once nobody has the other side open
        at_end_ = got == 0 || errno != EINTR;
        return !at_end_;
    }
    written_.append(buffer, static_cast<std::size_t>(got));
    vterm_input_write(vterm_, buffer, static_cast<std::size_t>(got));
    vterm_screen_flush_damage(screen_);
    return true;
}

bool TerminalSession::wait_for(const std::function<bool()> &condition, double seconds)
{
    const auto end = steady_clock::now() + duration<double>(seconds);
    while (!condition()) {
        if (steady_clock::now() > end || !read_some(20)) {
            return condition();
        }
    }
    return true;
}

bool TerminalSession::wait_for_text(const std::string &text, double seconds)
{
    return wait_for([&] { return this->text().find(text) != std::string::npos; }, seconds);
}

int TerminalSession::wait_for_end(double seconds)
{
    const auto end = steady_clock::now() + duration<double>(seconds);
    wait_for([] { return false; }, seconds);
    const duration<double> left = end - steady_clock::now();
    if (!support::eventually([this] { return process_->has_ended(); }, left.count())) {
        throw std::runtime_error("the program has not ended:\n" + text());
    }
    return process_->wait().status;
}

std::vector<std::string> TerminalSession::lines() const
{
    std::vector<std::string> lines;
    for (int row = 0; row < rows_; ++row) {
        lines.push_back(line_of(
            [&](int column) {
                VTermScreenCell cell{};
                vterm_screen_get_cell(screen_, {row, column}, &cell);
                return cell;
            },
            columns_));
    }
    return lines;
}

std::vector<std::string> TerminalSession::all_lines() const
{
    std::vector<std::string> all = gone_lines_;
    for (std::string &line : lines()) {
        all.push_back(std::move(line));
    }
    while (!all.empty() && all.back().empty()) {
        all.pop_back();
    }
    return all;
}

std::string TerminalSession::text() const
{
    std::string text;
    for (const std::string &line : all_lines()) {
        text += line + "\n";
    }
    return text;
}

int TerminalSession::colour(int row, int column) const
{
    VTermScreenCell cell{};
    vterm_screen_get_cell(screen_, {row, column}, &cell);
    return VTERM_COLOR_IS_INDEXED(&cell.fg) ? cell.fg.indexed.idx : -1;
}

int TerminalSession::push_line(int columns, const VTermScreenCell *cells, void *user)
{
    auto *session = static_cast<TerminalSession *>(user);
    session->gone_lines_.push_back(line_of([cells](int column) { return cells[column]; }, columns));
    return 1;
}
