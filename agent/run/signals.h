// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The signals that end or suspend a run, as a descriptor to poll.
#pragma once

#include "common/descriptor.h"

#include <csignal>
#include <string>

namespace fptest
{

// SIGINT, SIGTERM and SIGHUP, and on request Ctrl-Z's SIGTSTP; without those that the
// caller ignores, such as nohup.
class Signals
{
  public:
    Signals();
    // Restores what they do by themselves, and drops those that were not taken.
    ~Signals();
    Signals(const Signals &) = delete;
    Signals &operator=(const Signals &) = delete;

    int descriptor() const
    {
        return descriptor_.get();
    }
    // The number of the next one that was received, or 0.
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
};

// "Ctrl-C", "SIGTERM", "SIGHUP"
std::string name_for_people(int signal);

} // namespace fptest
