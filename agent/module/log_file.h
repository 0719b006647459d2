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

// Where the library's log goes: to the file that --log names, else where VR_LOG_FILE
// says. Its name is empty where it goes nowhere.
NamedFile log_file(const std::string &option);

// Sees to that. To be called before the library is.
void choose_log(const std::string &option);

// What keeps the library from logging to --log's file, which it says nothing of; empty
// if nothing does. An item that reports has its run's log, and cannot help it.
std::string log_loss();

} // namespace fptest
