// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The signals that end or suspend a run, as something to wait for.
#pragma once

#include "common/descriptor.h"

#include <csignal>
#include <string>

namespace fptest
{

// SIGINT, SIGTERM and SIGHUP of this process; on request Ctrl-Z's SIGTSTP, too. One
// that this process was started to ignore, as by nohup, stays ignored.
class Signals
{
  public:
    Signals();
    // From here on they do again what they do by themselves; one that has come and was
    // not taken is forgotten.
    ~Signals();
    Signals(const Signals &) = delete;
    Signals &operator=(const Signals &) = delete;

    int descriptor() const;
    // The number of one that has come; 0 where none has.
    int take();

    // From here on SIGTSTP is taken as well, and suspends nothing by itself.
    void take_suspensions();

    // Does what SIGTSTP does by itself: returns when this process goes on, at once
    // where the system lets nothing suspend it as nobody could resume it.
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
