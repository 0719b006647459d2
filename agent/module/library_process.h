// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The library in a process of its own, which the agent asks by messages. A
// terminal's Ctrl-C reaches the agent and not the items, a library that dies
// takes no results along, and while a command runs this process calls nothing:
// the suspension goes through the other one.
#pragma once

#include "common/descriptor.h"
#include "module/processes.h"

#include <chrono>
#include <cstddef>
#include <cstdio>
#include <deque>
#include <initializer_list>
#include <optional>
#include <string>
#include <sys/types.h>
#include <vector>

namespace fptest
{

class LibraryProcess
{
  public:
    struct Event {
        enum class Kind {
            item,      // the command has come to an item; value is the vendor
            ended,     // that item's process has ended; value is its wait status
            connected, // the gatherer has, and is told to gather once go_on() is called
            returned,  // the command has returned; text is its reply
            stopped,   // a stop has returned; value is what it returned, or kNothingToStop
            gone,      // the process has ended; text says how
        };
        Kind kind;
        int value = 0;
        std::string text;
        // when it happened, and how much had been printed by then; not of a stop
        std::chrono::steady_clock::time_point time;
        off_t output = 0;
        bool left_running = false; // of ended: whether there may be processes left
    };

    // Throws std::system_error where the process cannot be made.
    // What the library and its items print is kept for take_output(); input they get
    // none.
    LibraryProcess();
    // Ends the process. An item that it still runs is stopped.
    ~LibraryProcess();
    LibraryProcess(const LibraryProcess &) = delete;
    LibraryProcess &operator=(const LibraryProcess &) = delete;

    // Starts a command that runs items of these names. The one before must have
    // returned.
    void command(const std::string &text, const std::vector<std::string> &items = {});

    // Asks for FPTEST_SuspendItemExecute, which is called where a process of the
    // item is there to be stopped: before any has been started, the library would
    // stop the first process of the system.
    void stop(const std::string &item);

    // Holds the library at the end of each item, and before it tells a gatherer to
    // gather, from here on, until go_on() is called: what has been reported and left
    // can be looked at before anything else starts.
    void hold_at_ends();
    void go_on();

    // What runs for the library; also what a library's process that has ended left.
    ChildProcesses processes() const;

    // Takes another process for the library in place of one that has ended.
    void restart();

    // Ends the library's process, where that does not answer.
    void kill_library() const;

    // Whether something has suspended it: suspend() or another process.
    bool is_suspended() const;

    // Suspends the library and its items, and lets them go on.
    void suspend();
    void resume();

    // The next event, waited for that long, or until one of the others can be read.
    std::optional<Event> wait(std::chrono::milliseconds longest,
                              std::initializer_list<int> others = {});

    // The stored plan, as FPTEST_ExtractResultMsg gives it. Only between commands.
    std::string read_back();

    static constexpr off_t kOutputKept = off_t{64} * 1024;

    // What was printed since the last call, up to now or up to where an event says,
    // or the last 64 KiB of it. Nothing while there are events to come first.
    std::string take_output();
    std::string take_output(off_t end);

    // Writes what was printed since the last call, all of it, up to now or up to
    // where an event says. Nothing while there are events to come first.
    void pass_output(std::FILE *stream);
    void pass_output(std::FILE *stream, off_t end);

  private:
    void start();
    bool has_news(std::chrono::milliseconds longest, std::initializer_list<int> others = {}) const;
    bool has_events() const;
    void read_control();
    void lose();
    off_t output_size() const;
    void rewind_output();
    void leave_output();
    void note_truncation(off_t end);

    pid_t pid_ = -1;    // none when it has ended
    pid_t leader_ = -1; // of the process group that it had
    Descriptor control_{-1};
    Descriptor output_{-1};
    bool hold_requested_ = false;
    int vendor_ = 0; // of the item that the library came to last
    off_t taken_ = 0;
    std::deque<Event> events_;
    std::string plan_;
    bool has_plan_ = false;
};

// Says that the library's process has ended, and what to do.
std::string gone_text(const LibraryProcess::Event &event);

// Sends a command that runs nothing, and waits for its end. Gives the vendor that
// the library read for it; 0 where it read none. Throws a Failure where the process ends.
int send_and_wait(LibraryProcess &library, const std::string &command);

// The vendor that the library reads; nothing is run to learn it. Throws a Failure where
// it is none that the library runs items for.
int ask_vendor(LibraryProcess &library);

} // namespace fptest
