// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Where the library's log goes.
#pragma once

#include <string>
#include <utility>

namespace fptest
{

// A file, with what names it: an option or an environment variable.
using NamedFile = std::pair<std::string, std::string>;
// "--log agent.log", "VR_LOG_FILE=agent.log"
std::string label(const NamedFile &file);

// The file that --log names, or else VR_LOG_FILE; its name is empty for no log.
NamedFile log_file(const std::string &option);

// Sends the library's log there; to be called before the library is. log_loss() reports
// nothing if that is not wanted.
void choose_log(const std::string &option, bool reports_loss = true);

// Locks the log's file, for no other fptest to write it. False if one does.
bool lock_log();

// Why the log's file is incomplete, which the library does not report; empty if it is complete.
std::string log_loss();

} // namespace fptest
