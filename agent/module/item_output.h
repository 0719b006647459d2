// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the library and its items print, in a file in memory.
#pragma once

#include "common/descriptor.h"

#include <cstdio>
#include <string>
#include <sys/types.h>

namespace fptest
{

class ItemOutput
{
  public:
    static constexpr off_t kKept = off_t{64} * 1024;

    // Throws std::system_error if there is no memory for it.
    ItemOutput();

    int descriptor() const
    {
        return file_.get();
    }
    off_t size() const;

    // What was printed since the last call, up to that size; only the end of it if it is
    // longer than kKept.
    std::string take(off_t end);

    // Writes all that was printed since the last call, up to that size.
    void pass(std::FILE *stream, off_t end);

    // Begins anew if all of it was taken: a limit on a file's size counts whatever was
    // printed before. A process that was left running may lose what it prints right now.
    void rewind();

    // A gatherer that stays keeps it to print into: its writes must neither fail from now
    // on nor fill the memory.
    void leave();

  private:
    void note_truncation(off_t end);

    Descriptor file_;
    off_t taken_ = 0;
};

} // namespace fptest
