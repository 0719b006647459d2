// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The signals that end or suspend a run, as a descriptor to poll, and a request to end it.
#pragma once

#include "common/descriptor.h"

#include <csignal>
#include <functional>
#include <string>

namespace fptest
{

// What take() gives for fptest stop.
inline constexpr int kStopRequest = NSIG;

// SIGINT, SIGTERM and SIGHUP, and on request Ctrl-Z's SIGTSTP; without those that the
// caller ignores, such as nohup.
class Signals
{
  public:
    // Asks each time that a signal is taken, until it is so, whether a stop is requested.
    explicit Signals(std::function<bool()> is_stop_requested = {});
    // Restores what they do by themselves, and drops those that were not taken.
    ~Signals();
    Signals(const Signals &) = delete;
    Signals &operator=(const Signals &) = delete;

    int descriptor() const
    {
        return descriptor_.get();
    }
    // The number of the next one that was received, kStopRequest, or 0.
    int take();

    // From here on take() returns SIGTSTP as well, which no longer suspends by itself.
    void take_suspensions();

    // Suspends this process and returns when it is resumed; at once if nobody could resume it.
    static void suspend();

  private:
    void add(int signal);
    void receive();

    sigset_t set_{};
    sigset_t before_{};
    Descriptor descriptor_{-1};
    std::function<bool()> is_stop_requested_; // none once it was
};

// "Ctrl-C", "SIGTERM", "SIGHUP", "fptest stop"
std::string name_for_people(int signal);

} // namespace fptest
