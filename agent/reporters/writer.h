// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Writes without blocking: a terminal may be stopped, a pipe full, a FIFO without a
// reader.
#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <sys/types.h>

namespace fptest
{

// A regular file gets the text at once. A thread writes to anything else; if the reader
// is prompt, that is at once, too.
class Writer
{
  public:
    // To a descriptor that stays the caller's; failures call it by the name.
    Writer(std::string name, int descriptor);
    // To a file, opened with these flags, O_APPEND among them. With O_CREAT, a regular file is
    // locked, and a text that does not fit into it is taken back.
    Writer(const std::string &path, int flags, mode_t mode);
    Writer(const Writer &) = delete;
    Writer &operator=(const Writer &) = delete;
    // Pending text may be lost.
    ~Writer();

    // In the order of the calls. More than kMostWaiting bytes waiting is a failure; after
    // a failure nothing is written.
    void write(const std::string &text);
    static constexpr std::size_t kMostWaiting = std::size_t{16} << 20;

    // The error of opening that file for writing; 0 if there is none, or if it would wait
    // for a reader. Leaves the file as it is, and creates none to stay.
    static int obstacle(const std::string &path);

    // Whether text is still waiting.
    bool is_pending() const;
    // "out.json: No space left on device"; empty while all is well.
    std::string failure() const;

  private:
    struct State;

    void start();
    void write_now(const std::string &text);

    std::shared_ptr<State> state_; // shared with the thread, which may outlive this
    bool has_thread_ = false;
    bool is_own_ = false;
    off_t written_ = 0;
    bool waits_for_reader_ = true;
};

} // namespace fptest
