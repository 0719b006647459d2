// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How the library reads and cuts names and texts.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace fptest
{

inline constexpr char kDataDirectory[] = "/data/vorlane";
inline constexpr char kStoredPlan[] = "/data/vorlane/src1.xml";
inline constexpr std::size_t kPlanLimit = 2048;    // bytes that a command stores of a plan
inline constexpr std::size_t kPathLimit = 2047;    // bytes of a node path
inline constexpr std::size_t kNameLimit = 63;      // characters of a name in a node path
inline constexpr std::size_t kStopLimit = 28;      // characters of a name that a stop gives ps
inline constexpr std::size_t kKernelLimit = 15;    // characters that the kernel keeps of it
inline constexpr std::size_t kCommandLimit = 1024; // characters of an item's command line
inline constexpr char kBlanks[] = " \t\n\v\f\r";   // to Mini-XML
inline constexpr char kGatherer[] = "SensorProbe";
inline constexpr unsigned short kTriggerPort = 34952;

// What an "XMLFile" command stores of this text: without leading ':', up to the first ':' or
// zero byte, and 2048 bytes at most.
std::string as_stored(std::string_view text);

// "", "_ca" or "_ca_qsee"; nullopt for a vendor that runs no item.
std::optional<std::string> vendor_suffix(int vendor);

// What a node path does to this name, as in "is split at '/'", or empty.
std::string path_damage(std::string_view name);

// Whether a path can name it: no path splits or cuts the name.
bool is_addressable(std::string_view name);

// Whether the library starts the item in the background and triggers it.
bool is_gatherer(std::string_view name, int vendor);

// The item's program; the library cuts its name at a tab or line feed.
std::string program_of(std::string_view name, std::string_view suffix);

// Whether the shell takes the name literally.
bool is_plain_name(std::string_view name);

// The item's whole command line, of which the library runs the first 1024 characters.
std::string command_line(std::string_view name, const std::optional<std::string> &args,
                         std::string_view suffix);

} // namespace fptest
