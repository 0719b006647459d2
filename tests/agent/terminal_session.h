// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A program on a terminal of its own: what it shows is what a person would see.
#pragma once

#include "common/descriptor.h"
#include "support/process.h"

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>
#include <vterm.h>

class TerminalSession
{
  public:
    // Starts the program at once; it is ended with this object.
    TerminalSession(const std::vector<std::string> &arguments, int columns, int rows,
                    const support::Environment &environment = {});
    ~TerminalSession();
    TerminalSession(const TerminalSession &) = delete;
    TerminalSession &operator=(const TerminalSession &) = delete;

    void type(std::string_view keys);
    void resize(int columns, int rows);

    // Lets the program go on until the condition holds, or it has ended, or the
    // time is over. Returns whether the condition holds.
    bool wait_for(const std::function<bool()> &condition, double seconds = 20);
    bool wait_for_text(const std::string &text, double seconds = 20);

    // Lets it go on to its end; its exit status, or minus the signal that ended it.
    int wait_for_end(double seconds = 20);

    // The lines that are shown, without blanks at their ends.
    std::vector<std::string> lines() const;
    // Those that have left the screen at its top as well, and no empty ones behind.
    std::vector<std::string> all_lines() const;
    std::string text() const;
    // Everything that the program has written.
    const std::string &written() const
    {
        return written_;
    }
    // 0 to 15 of the palette; -1 for the terminal's own.
    int colour(int row, int column) const;

  private:
    bool read_some(int milliseconds);
    static int push_line(int columns, const VTermScreenCell *cells, void *user);

    int columns_;
    int rows_;
    Descriptor terminal_{-1};
    std::optional<support::Process> process_;
    bool at_end_ = false;
    VTerm *vterm_;
    VTermScreen *screen_;
    std::vector<std::string> gone_lines_;
    std::string written_;
};
