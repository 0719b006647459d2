// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Recording doubles for everything that the library calls outside itself: the
// platform, whose calls are redirected here at link time, and the platform's
// interfaces. Files are real ones in a directory of the test's own; nothing is
// started, signalled, listened on or slept for.
#pragma once

#include <mxml.h>

#include <functional>
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
// Returns the value (with errno set, where an error is given) and does nothing.
Step gives(long value, int error = 0);
// read and write: does the real thing, with at most that many bytes.
Step limit(long bytes);

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

// What the coming popen calls, in turn, will have printed.
void plan_output(std::vector<std::string> outputs);
// Forgets those that no popen call has taken.
void drop_output();

// The status word that the next waitpid calls with a result above 0 store.
void set_wait_status(int status);

// The text that get_node_value finds; by default it finds none.
void set_vendor(const std::string &text);

// Called inside each system() call, with its command.
void on_system(std::function<void(const std::string &)> hook);
// Called with each tree that Mini-XML has loaded, before the library sees it.
void on_load(std::function<void(mxml_node_t *)> hook);
// Called inside each log call, with its event.
void on_log(std::function<void(const std::string &)> hook);

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

// For long runs: no events, and no checks of log lines, from now on.
void stop_recording();

// The test plan file: where it is, whether it is there, what is in it.
std::string plan_path();
bool plan_exists();
std::string plan_text();
void write_plan(const std::string &text);

} // namespace platform
