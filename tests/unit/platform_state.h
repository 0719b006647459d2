// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the doubles have recorded and are to answer: set by platform.cpp for the
// tests, used by doubles.cpp for the library.
#pragma once

#include "platform.h"
#include "support/this_process.h"

#include <csetjmp>
#include <csignal>
#include <cstdio>
#include <deque>
#include <map>
#include <memory>
#include <optional>

namespace platform
{

constexpr int kFirstFake = 1'000'000; // descriptors that stand for sockets

struct State {
    std::vector<std::string> events;
    bool recording = true;
    std::map<std::string, std::deque<Step>> steps;
    std::deque<std::string> outputs;
    std::map<int, std::string> descriptors;
    std::map<FILE *, std::string> streams;
    std::map<std::string, int> made; // how many of each kind
    int next_fake = kFirstFake;
    std::optional<std::string> vendor;
    int wait_status = 0;
    std::unique_ptr<support::FreedDescriptor> freed;
    std::function<void(const std::string &)> system_hook;
    std::function<void(const std::string &)> log_hook;
    std::function<void(mxml_node_t *)> load_hook;
    sigset_t mask{};
    std::map<int, sighandler_t> handlers;
    std::jmp_buf child{};
};

State &state();

// Handlers as the host has set them.
void host_int(int signal);
void host_quit(int signal);

// The file that stands for the one at this path.
std::string redirected(const std::string &path);

} // namespace platform
