// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The library in a process of its own, which the agent sends messages. So a terminal's
// Ctrl-C reaches the agent only, results survive a library that dies, and the agent can stop
// an item while the library's command blocks.
#pragma once

#include "common/descriptor.h"
#include "module/item_output.h"
#include "module/processes.h"

#include <chrono>
#include <cstddef>
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
            item,      // the command has reached an item; value is the vendor
            ended,     // that item's process; value is its wait status
            connected, // the gatherer, which is triggered once go_on() is called
            returned,  // the command; text is its reply
            stopped,   // a stop has returned; value is its result, or kNothingToStop
            gone,      // the library's process has ended; text says how
        };
        Kind kind;
        int value = 0;
        std::string text;
        // when it happened, and how much was printed by then; not for stopped
        std::chrono::steady_clock::time_point time;
        off_t output = 0;
        bool left_running = false; // for ended: there may be processes left
    };

    // Throws std::system_error if the process cannot be started. The library and its items
    // get no input.
    LibraryProcess();
    // Ends the process, and stops its item.
    ~LibraryProcess();
    LibraryProcess(const LibraryProcess &) = delete;
    LibraryProcess &operator=(const LibraryProcess &) = delete;

    // Starts a command that runs items of these names. The last one must have returned.
    void command(const std::string &text, const std::vector<std::string> &items = {});

    // What the items of the next command find in FPTEST_ITEM_DIR, one for each that the
    // library reaches; empty for none.
    void give_directories(const std::vector<std::string> &directories);

    // Has FPTEST_SuspendItemExecute called, if the item has a process: otherwise the
    // library would stop the first process of the system.
    void stop(const std::string &item);

    // From here on, holds the library at the end of each item, and before it triggers a
    // gatherer, until go_on(): so reports and processes left running can be read before
    // anything else starts.
    void hold_at_ends();
    void go_on();

    // What runs for the library, or was left by a process of it that has ended.
    ChildProcesses processes() const;

    // Whether the library has left so many open that programs which it starts may fail: it
    // leaves one with each trigger and stop, and they inherit them.
    bool has_many_descriptors() const;

    // Ends the library's process and what its items left running. Only between commands.
    void quit();
    // Starts another process if the library's has ended.
    void restart();

    // For a library that does not answer.
    void kill_library() const;

    // Whether suspend() or another process has suspended it.
    bool is_suspended() const;

    // Suspends and resumes the library and its items.
    void suspend();
    void resume();

    // Waits for the next event, for that long or until one of the others is readable.
    std::optional<Event> wait(std::chrono::milliseconds longest,
                              std::initializer_list<int> others = {});

    // The stored plan, as FPTEST_ExtractResultMsg gives it. Only between commands.
    std::string read_back();

    // What the library and its items print.
    ItemOutput &output()
    {
        return output_;
    }
    // How much was printed up to now; nullopt while there are events, which come first.
    std::optional<off_t> output_size() const;

  private:
    void start();
    bool has_news(std::chrono::milliseconds longest, std::initializer_list<int> others = {}) const;
    bool has_events() const;
    void read_control();
    void lose();
    void rewind_output();

    pid_t pid_ = -1;    // -1 once it has ended
    pid_t leader_ = -1; // of the process group that it had
    Descriptor control_{-1};
    ItemOutput output_;
    bool hold_requested_ = false;
    int vendor_ = 0; // of the library's last item
    std::deque<Event> events_;
    std::string plan_;
    bool has_plan_ = false;
};

// Says that the library's process has ended, and what to do.
std::string gone_text(const LibraryProcess::Event &event);

// Sends a command that runs nothing and waits for its end. Returns the vendor that the
// library read, or 0. Throws a Failure if the process ends.
int send_and_wait(LibraryProcess &library, const std::string &command);

// The vendor that the library reads, without running anything. Throws a Failure if the
// library runs no items for it.
int ask_vendor(LibraryProcess &library);

} // namespace fptest
