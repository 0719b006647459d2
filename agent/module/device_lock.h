// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// That only one fptest uses the device at a time, and what the others can know of it and ask
// of it. Its note is a file beside the stored plan. Who holds the note is asked of the
// kernel, so a note that a killed run has left is never taken for a run.
#pragma once

#include "common/descriptor.h"

#include <chrono>
#include <optional>
#include <string>
#include <sys/types.h>

namespace fptest
{

inline constexpr char kRunNote[] = "/data/vorlane/fptest.run";

// What an fptest says of itself there; its texts are single lines.
struct RunNote {
    using TimePoint = std::chrono::steady_clock::time_point;

    std::string plan;   // or "commands" of fptest send
    std::string labels; // "device=A7 job=12"
    std::string tally;  // "3 passed, 1 failed"
    std::string item;   // that runs, "Bringup/SpiCheck (round 2)"; empty if none does
    TimePoint begun = std::chrono::steady_clock::now();
    TimePoint item_begun = begun;
    std::optional<TimePoint> suspended; // since then, by Ctrl-Z
};

class DeviceLock
{
  public:
    // Holds nothing.
    DeviceLock() = default;
    // Waits for what an fptest that was killed was running. Throws a Failure, busy, that
    // names another fptest.
    explicit DeviceLock(const RunNote &note);
    DeviceLock(DeviceLock &&other) noexcept = default;
    DeviceLock &operator=(DeviceLock &&other) noexcept = default;
    // The note goes with it.
    ~DeviceLock();

    // Does nothing if the disk is full.
    void tell(const RunNote &note) const;

    bool is_asked_to_stop() const;

  private:
    Descriptor directory_{-1};
    Descriptor note_{-1};
};

// Another fptest that uses the device, or what the last one left.
class OtherRun
{
  public:
    // One that is just beginning says who it is within that time. Throws a Failure if this is
    // no device.
    static OtherRun find(std::chrono::milliseconds patience = std::chrono::milliseconds(500));

    // Whether one uses the device, or something that a killed one was running still does.
    bool runs() const
    {
        return runs_;
    }
    // "process 812, plans/demo.xml for 12.0 s, at Bringup/BurnIn for 3.2 s", by the run's clock;
    // "process 812, suspended, plans/..." of one that could go on; of one that was killed
    // "plans/demo.xml, at Bringup/BurnIn", or empty if there is none.
    std::string described() const;
    // 0 if nobody knows.
    pid_t process() const
    {
        return process_;
    }
    // What it says, or said when it was killed.
    const std::optional<RunNote> &note() const
    {
        return note_;
    }

    // Asks this run, and no later one, to stop: by its note, as its process's number may be
    // another's by now, and old kernels have no other name for it. Throws a Failure if it
    // cannot be asked.
    void ask_to_stop() const;
    // Whether it, and what it ran, has ended.
    bool has_ended() const;

  private:
    OtherRun() = default;

    bool runs_ = false;
    pid_t process_ = 0;
    Descriptor file_{-1};
    std::optional<RunNote> note_;
};

} // namespace fptest
