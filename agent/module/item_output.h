// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the library and its items print, in a file in memory.
#pragma once

#include "common/descriptor.h"

#include <chrono>
#include <functional>
#include <string_view>
#include <sys/types.h>

namespace fptest
{

class ItemOutput
{
  public:
    // Throws std::system_error if there is no memory for it.
    ItemOutput();

    int descriptor() const
    {
        return file_.get();
    }
    off_t size() const;

    // Whether more than so many bytes, of those up to that size, were not taken: only their
    // last 64 KiB then are, or as many as may be.
    bool skip(off_t end, off_t most = 0);
    // Hands on what was printed since the last call, up to that size, in pieces. What is left
    // at that time is for the next call.
    using Use = std::function<void(std::string_view)>;
    using TimePoint = std::chrono::steady_clock::time_point;
    void take(off_t end, const Use &use, TimePoint until = TimePoint::max());

    // Whether somebody has truncated it, as found since the last call.
    bool was_truncated();

    // Begins anew if all of it was taken, and it is much or the size of files is limited, which
    // counts whatever was printed before. A process that was left running may lose what it
    // prints in that very moment. An item may have changed where and how the next one writes;
    // that is undone.
    void rewind();

    // A gatherer that stays keeps it to print into: its writes must neither fail from now
    // on, unless it prints more than 1 MiB, nor fill the memory.
    void leave();

    // Whether so much of that has been used by the process that the next run may fail by it.
    static bool is_filling(pid_t process);

  private:
    void note_truncation(off_t end);

    void release(); // the memory of what was taken

    Descriptor file_;
    off_t taken_ = 0;
    bool was_truncated_ = false;
};

} // namespace fptest
