// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Recording doubles for everything that the library calls outside itself: the
// platform, whose calls are redirected here at link time, and the platform's
// interfaces. Files are real ones in a directory of the test's own; nothing is
// started, signalled, listened on or slept for.
#pragma once

#include "support/this_process.h"

#include <mxml.h>

#include <csetjmp>
#include <csignal>
#include <cstdio>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace platform
{

// What the next call of a function does instead of its default.
struct Step {
    enum class Kind { Pass, Return, Limit } kind = Kind::Pass;
    long value = 0;
    int error = 0;
};

// The default.
Step pass();
// Returns the value (with errno set, if an error is given) and does nothing.
Step gives(long value, int error = 0);
// read and write: does the real thing, with at most that many bytes.
Step limit(long bytes);

constexpr int kFirstFake = 1'000'000; // descriptors that stand for sockets

// What the doubles have recorded and are to answer.
struct Answers {
    std::vector<std::string> events;
    bool recording = true; // not for long runs: no events, and no checks of log lines
    std::map<std::string, std::deque<Step>> steps;
    std::deque<std::string> outputs; // what the coming popen calls, in turn, will have printed
    std::map<int, std::string> descriptors;
    std::map<FILE *, std::string> streams;
    std::map<std::string, int> made; // how many of each kind
    int next_fake = kFirstFake;
    std::optional<std::string> vendor; // the text that get_node_value finds
    int wait_status = 0;               // that waitpid calls with a result above 0 store
    std::unique_ptr<support::FreedDescriptor> freed;
    std::function<void(const std::string &)> system_hook; // inside each system(), its command
    std::function<void(const std::string &)> log_hook;    // inside each log call, its event
    std::function<void(mxml_node_t *)> load_hook; // with each tree, before the library sees it
    sigset_t mask{};
    std::map<int, sighandler_t> handlers;
    std::jmp_buf child{};
};

Answers &state();

// Handlers as the host has set them.
void host_int(int signal);
void host_quit(int signal);

// The file that stands for the one at this path.
std::string redirected(const std::string &path);

// Forgets everything and starts anew: no events, no steps, no open
// descriptors, an empty directory for /data/vorlane.
void reset();

// Queues steps for the coming calls of the function with that name: "open",
// "read", "write", "lseek", "close", "remove", "socket", "listen", "Accept",
// "popen", "fgets", "pclose", "system", "vfork", "execve", "waitpid",
// "sigprocmask", "strdup".
void plan_steps(const std::string &function, std::vector<Step> steps);
// Whether any of them are still to come.
bool steps_left(const std::string &function);

void plan_output(std::vector<std::string> outputs);

// Frees descriptor 0 until the next reset: the next real open gets it.
void free_descriptor_zero();

// Calls that return twice or never: runs the body until it returns or until
// the library calls _exit.
void run_child(const std::function<void()> &body);

// What has happened since the last call of this function, in order. Log lines
// are written "FUNCTION| TEXT", a place "FUNCTION[line]" in them "FUNCTION[]"
// where it is the log line's own; their prefix, priority and tag have been
// checked already. Calls are written "name(arguments) = result". Descriptors
// are named by what they are: plan#1 for the first opened plan file, listener#1,
// connection#1, stream#1. What goes to standard output is "stdout: TEXT".
std::vector<std::string> events();
// The log lines among them, or the others; each takes all events.
std::vector<std::string> log_lines();
std::vector<std::string> calls();

// What the library has opened and not closed, by the names above; popen's
// streams are stream#1 and so on.
std::vector<std::string> left_open();

// The test plan file: whether it is there, what is in it.
bool plan_exists();
std::string plan_text();
void write_plan(const std::string &text);

} // namespace platform
