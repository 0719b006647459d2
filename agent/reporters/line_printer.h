// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Lines on a terminal: some stay, and below them some are drawn again and again. What
// is in them is a view's.
#pragma once

#include "reporters/writer.h"

#include <cstddef>
#include <cstdio>
#include <string>
#include <vector>

namespace fptest
{

enum class Colour { none, red, green, yellow, cyan };

// A line as it grows, with its width in columns and not in bytes.
class Line
{
  public:
    Line(std::size_t room, bool coloured) : room_(room), coloured_(coloured)
    {
    }

    std::size_t room() const
    {
        return room_ - width_;
    }

    // What there is no room for is cut.
    void add(const std::string &text, Colour colour = Colour::none);

    const std::string &text() const
    {
        return text_;
    }
    std::size_t width() const
    {
        return width_;
    }

  private:
    std::size_t room_;
    bool coloured_;
    std::string text_;
    std::size_t width_ = 0;
};

class LinePrinter
{
  public:
    LinePrinter(std::FILE *terminal, bool coloured);

    // As wide as the terminal is now.
    Line new_line() const;

    // Puts a line above those that are redrawn, when they are.
    void keep(const Line &line);

    // False while the terminal does not take what it was given: frames are left out then.
    bool wants_frame() const;

    // Puts these lines in the place of those that were drawn.
    void redraw(const std::vector<Line> &lines);

    // Leaves those that are drawn as they are, and begins a line after them.
    void leave();
    // They are gone, or somebody else's.
    void forget();

    bool is_flushed() const;
    std::string failure() const;

  private:
    std::string erase();

    std::FILE *terminal_;
    Writer writer_;
    bool coloured_;
    std::vector<std::size_t> drawn_; // the widths of the lines that are redrawn
    std::string kept_;               // lines that are above the next frame
};

} // namespace fptest
