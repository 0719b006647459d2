// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Files that are read from their beginning, whatever they are.
#pragma once

#include "common/descriptor.h"

#include <cstddef>
#include <string>
#include <sys/types.h>

namespace fptest
{

// So long a pipe is waited for until somebody writes to it.
inline constexpr int kPipeSeconds = 5;

class InputFile
{
  public:
    // "-" is standard input; flags are those of open().
    explicit InputFile(const std::string &path, int flags = 0);

    bool is_open() const
    {
        return file_.is_open();
    }
    // The next bytes; 0 at the end, -1 with the reason in errno: EPIPE where nobody writes.
    ssize_t read(char *buffer, std::size_t size);

  private:
    bool is_pipe_ = false;
    bool has_begun_ = false;
    Descriptor file_;
};

// A text's lines. Throws a Failure where it cannot be read, or has no end of a line for long.
class LineReader
{
  public:
    // The name is for messages.
    LineReader(const std::string &path, std::string name);

    // False at the end.
    bool next(std::string &line);

  private:
    std::string name_;
    InputFile file_;
    std::string unread_;
    std::size_t number_ = 0;
};

} // namespace fptest
