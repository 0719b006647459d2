// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Results in files, as they come: whatever ends this process, what was known
// then can be read, and says that the run did not finish.
#pragma once

#include "run/results.h"

#include <cstdio>
#include <memory>
#include <string>

namespace fptest
{

// One JSON object per line and event, flushed; the path "-" is standard output.
// "run" comes first, with the format's version and the planned items of a round.
// Then, for each item of each round, come "start", "progress" and "end", which name
// it by a number that goes on over the rounds. "finish" comes last: without it the
// run was cut off. A run that ended early has it, with "finished":false, and an "end"
// for each item of the round that was not run.
std::unique_ptr<Reporter> make_json_reporter(const std::string &path);

// JUnit XML; the path "-" is standard output. The file always holds a whole document:
// it is replaced, at most once a second and at the end. What is not a regular file is
// written at the end alone. Each suite has a property "finished". What has not been
// run is an error until the run has finished, so that what is left of a run that was
// killed is no success.
std::unique_ptr<Reporter> make_junit_reporter(const std::string &path);

// Why a report could not be begun there, as Reporter::failure() would say; empty where
// it could. Changes nothing.
std::string json_obstacle(const std::string &path);
std::string junit_obstacle(const std::string &path);

// TAP 14, a subtest per suite and round, into a stream that stays the caller's. A
// point is written when its item and those before it have ended. The plan comes first
// where the number of rounds is known, and else last. A run that ended early bails
// out; one that was cut off lacks points of the plan, or the plan.
std::unique_ptr<Reporter> make_tap_reporter(std::FILE *stream);

} // namespace fptest
