// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/signals.h"

#include "run/results.h"

#include <cerrno>
#include <sys/signalfd.h>
#include <system_error>
#include <unistd.h>
#include <utility>

namespace fptest
{

Signals::Signals(std::function<bool()> is_stop_requested)
    : is_stop_requested_(std::move(is_stop_requested))
{
    sigprocmask(SIG_BLOCK, nullptr, &before_);
    sigemptyset(&set_);
    for (const int signal : {SIGINT, SIGTERM, SIGHUP}) {
        add(signal);
    }
    receive();
}

Signals::~Signals()
{
    while (take() != 0) {
    }
    sigprocmask(SIG_SETMASK, &before_, nullptr);
}

// A blocked signal would be received even if it is ignored.
void Signals::add(int signal)
{
    struct sigaction now {
    };
    if (sigaction(signal, nullptr, &now) != 0 || now.sa_handler != SIG_IGN) {
        sigaddset(&set_, signal);
    }
}

void Signals::receive()
{
    sigprocmask(SIG_BLOCK, &set_, nullptr);
    const int fd = signalfd(descriptor_.get(), &set_, SFD_NONBLOCK | SFD_CLOEXEC);
    if (fd < 0) {
        throw std::system_error(errno, std::generic_category(), "signals cannot be received");
    }
    if (!descriptor_.is_open()) {
        descriptor_ = Descriptor(fd);
    }
}

int Signals::take()
{
    signalfd_siginfo info{};
    const ssize_t got = read(descriptor_.get(), &info, sizeof info);
    if (got == static_cast<ssize_t>(sizeof info)) {
        return static_cast<int>(info.ssi_signo);
    }
    if (is_stop_requested_ && is_stop_requested_()) {
        is_stop_requested_ = {};
        return kStopRequest;
    }
    return 0;
}

void Signals::take_suspensions()
{
    add(SIGTSTP);
    receive();
}

void Signals::suspend()
{
    sigset_t suspension;
    sigemptyset(&suspension);
    sigaddset(&suspension, SIGTSTP);
    kill(getpid(), SIGTSTP);
    sigprocmask(SIG_UNBLOCK, &suspension, nullptr); // here it takes effect
    sigprocmask(SIG_BLOCK, &suspension, nullptr);
}

std::string name_for_people(int signal)
{
    return signal == SIGINT         ? "Ctrl-C"
           : signal == kStopRequest ? "fptest stop"
                                    : name_of_signal(signal);
}

} // namespace fptest
