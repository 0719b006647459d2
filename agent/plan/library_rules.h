// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The library's rules for names and texts: its limits, and what it makes of them.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace fptest
{

inline constexpr char kStoredPlan[] = "/data/vorlane/src1.xml";
inline constexpr std::size_t kPlanLimit = 2048;    // bytes that a command stores of a plan
inline constexpr std::size_t kPathLimit = 2047;    // bytes of a node path
inline constexpr std::size_t kNameLimit = 63;      // characters of a name in a node path
inline constexpr std::size_t kStopLimit = 28;      // characters of a name that ps is asked for
inline constexpr std::size_t kCommandLimit = 1024; // characters of an item's command line
inline constexpr char kBlanks[] = " \t\n\v\f\r";   // to Mini-XML
inline constexpr char kGatherer[] = "SensorProbe";
inline constexpr unsigned short kTriggerPort = 34952;

// What an "XMLFile" command stores of this text: it ends at the first ':' (those
// at its very start are passed over) or zero byte, and holds 2048 bytes at most.
std::string as_stored(std::string_view text);

// "", "_ca" or "_ca_qsee"; nothing for a vendor that runs no item.
std::optional<std::string> vendor_suffix(int vendor);

// What a node path does to a name with these characters: "is split at '/'";
// empty for a name without.
std::string path_damage(std::string_view name);

// Whether a path can lead to it: it has a name that no path splits or cuts.
bool is_addressable(std::string_view name);

// Whether the item of that name is started in the background and triggered.
bool is_gatherer(std::string_view name, int vendor);

// The program of an item: the library cuts its name at a tab or line feed.
std::string program_of(std::string_view name, std::string_view suffix);

// Whether the shell takes the name as it is; else the program is another one.
bool is_plain_name(std::string_view name);

// The command line that the library runs for an item, whole; it runs the first
// 1024 characters.
std::string command_line(std::string_view name, const std::optional<std::string> &args,
                         std::string_view suffix);

} // namespace fptest
