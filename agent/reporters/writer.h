// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Writes for whoever must not wait: a terminal may be stopped, a pipe may be full,
// a FIFO may have no reader.
#pragma once

#include <cstddef>
#include <memory>
#include <string>

namespace fptest
{

// What is written to a regular file is there at once. To anything else a thread
// writes it; a text that a reader takes promptly is still there at once.
class Writer
{
  public:
    // To a descriptor that stays the caller's. The name is what a failure calls it.
    Writer(std::string name, int descriptor);
    // To a file that is opened with these flags, O_APPEND among them. With O_CREAT a
    // text that finds no room in a regular one is taken back.
    Writer(const std::string &path, int flags, int mode);
    Writer(const Writer &) = delete;
    Writer &operator=(const Writer &) = delete;
    // What is pending may be lost.
    ~Writer();

    // In the order of the calls. So much waits at most; more of it is a failure.
    // After a failure nothing is written.
    void write(const std::string &text);
    static constexpr std::size_t kMostWaiting = std::size_t{16} << 20;

    // The error that opening that file for writing meets; 0 where it meets none, or may
    // take until somebody reads it. The file is left as it is, and one that is not
    // there is not there afterwards.
    static int obstacle(const std::string &path);

    // Whether some of it is still to be written.
    bool is_pending() const;
    // "out.json: No space left on device"; empty while all is well.
    std::string failure() const;

  private:
    struct State;

    void start();
    void write_now(const std::string &text);

    std::shared_ptr<State> state_; // the thread's as well, which may outlive this
    bool has_thread_ = false;
    bool is_own_ = false;
    bool is_patient_ = true;
};

} // namespace fptest
