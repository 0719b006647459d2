// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// All reporters. Result files are written as results come: whatever ends this process, the
// file holds what was known by then, and shows that the run did not finish.
#pragma once

#include "module/device_lock.h"
#include "run/results.h"

#include <cstdio>
#include <memory>
#include <string>

namespace fptest
{

// One JSON object per line and event, flushed; the path "-" is standard output. The
// events and their keys are in fptest-results(5). A run without "finish" was cut off; one
// that ended early has it, with "finished":false, and an "end" for each item of the round
// that was not run.
std::unique_ptr<Reporter> make_json_reporter(const std::string &path);

// JUnit XML; the path "-" is standard output. The file always holds a whole document:
// it is replaced, at most once a second and at the end. Anything but a regular file is
// written only at the end. Each suite has a property "finished". Until the run has
// finished, what has not been run is an error, so that a killed run never looks green.
std::unique_ptr<Reporter> make_junit_reporter(const std::string &path);

// What other fptests see of the run: it goes into the lock's note. The lock outlives it.
std::unique_ptr<Reporter> make_note_reporter(const DeviceLock &lock, RunNote note);

// Whether fptest writes a property of that name of its own into a JUnit suite.
bool is_property_of_junit(const std::string &name);

// Why no result file could be begun there, in the words of Reporter::failure(); empty if
// one could. Changes nothing.
std::string json_obstacle(const std::string &path);
std::string junit_obstacle(const std::string &path);

// TAP 14, a subtest per suite and round, to a stream that stays the caller's. A point
// is written when its item and those before it have ended. The plan comes first if the
// number of rounds is known, otherwise last. A run that ended early bails out; one that
// was cut off lacks points, or the plan.
std::unique_ptr<Reporter> make_tap_reporter(std::FILE *stream);

// For a terminal: finished items above; below, redrawn in the terminal's width, those
// that run, each with a progress bar, and a running total.
std::unique_ptr<Reporter> make_live_view(std::FILE *terminal, bool colour);

// For anything else: a line for each item that has ended, and now and then one for an
// item that takes long. Quiet leaves out items that passed and the total.
std::unique_ptr<Reporter> make_plain_view(std::FILE *stream, bool quiet);

// The view that suits the stream: live on a terminal that can move its cursor, in
// colour unless NO_COLOR is set and not empty.
std::unique_ptr<Reporter> make_suitable_view(std::FILE *stream, bool quiet);

} // namespace fptest
