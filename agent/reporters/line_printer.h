// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Lines on a terminal: some stay, and others below them are redrawn. What they say is
// up to a view.
#pragma once

#include "reporters/writer.h"

#include <cstddef>
#include <cstdio>
#include <string>
#include <vector>

namespace fptest
{

enum class Colour { none, red, green, yellow, cyan };

// A line as it grows, measured in columns, not bytes.
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

    // Cuts what does not fit.
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

    // Puts a line above the redrawn ones, at the next redraw.
    void keep(const Line &line);

    // False while the terminal is behind: skip frames then.
    bool wants_frame() const;

    // Replaces the lines that were drawn.
    void redraw(const std::vector<Line> &lines);

    // Leaves the drawn lines as they are, and starts a new line below them.
    void leave();
    // The drawn lines are gone, or somebody else has written over them.
    void forget();

    bool is_flushed() const;
    std::string failure() const;

  private:
    std::string erase();

    std::FILE *terminal_;
    Writer writer_;
    bool coloured_;
    std::vector<std::size_t> drawn_; // widths of the redrawn lines
    std::string kept_;               // lines to go above the next frame
};

} // namespace fptest
