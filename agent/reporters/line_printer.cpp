// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/line_printer.h"

#include "util/terminal.h"
#include "util/text.h"

#include <algorithm>
#include <fmt/core.h>
#include <numeric>
#include <utility>

namespace fptest
{
namespace
{

constexpr std::size_t kMostKept = 65536;

} // namespace

void Line::add(const std::string &text, Colour colour)
{
    const std::string shown = ellipsize(text, room());
    if (coloured_ && colour != Colour::none && !shown.empty()) {
        static constexpr const char *codes[] = {"", "31", "32", "33", "36"};
        text_ += fmt::format("\x1b[{}m{}\x1b[0m", codes[static_cast<int>(colour)], shown);
    } else {
        text_ += shown;
    }
    width_ += display_width(shown);
}

LinePrinter::LinePrinter(std::FILE *terminal, bool coloured)
    : terminal_(terminal), writer_("standard output", fileno(terminal)), coloured_(coloured)
{
}

// The last column stays free: some terminals wrap as soon as it is written.
Line LinePrinter::new_line() const
{
    return {terminal_width(terminal_) - 1, coloured_};
}

void LinePrinter::keep(const Line &line)
{
    if (writer_.failure().empty()) {
        kept_ += line.text() + "\n";
    }
}

bool LinePrinter::wants_frame() const
{
    return !writer_.is_pending() || kept_.size() > kMostKept;
}

void LinePrinter::redraw(const std::vector<Line> &lines)
{
    std::string frame = erase() + std::exchange(kept_, {});
    for (const Line &line : lines) {
        frame += (drawn_.empty() ? "" : "\n") + line.text();
        drawn_.push_back(line.width());
    }
    writer_.write(frame);
}

void LinePrinter::leave()
{
    if (!drawn_.empty()) {
        writer_.write("\n");
        drawn_.clear();
    }
}

void LinePrinter::forget()
{
    drawn_.clear();
}

bool LinePrinter::is_flushed() const
{
    return !writer_.is_pending();
}

std::string LinePrinter::failure() const
{
    return writer_.failure();
}

// Erases the drawn lines and leaves the cursor where they began. A terminal that was
// made narrower has wrapped them.
std::string LinePrinter::erase()
{
    if (drawn_.empty()) {
        return {};
    }
    const std::size_t width = terminal_width(terminal_);
    const std::size_t rows = std::accumulate(
        drawn_.begin(), drawn_.end(), std::size_t{0}, [&](std::size_t sum, std::size_t line) {
            return sum + std::max<std::size_t>(1, (line + width - 1) / width);
        });
    drawn_.clear();
    return rows > 1 ? fmt::format("\r\x1b[{}A\x1b[J", rows - 1) : "\r\x1b[J";
}

} // namespace fptest
