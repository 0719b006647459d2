// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The process-list parser of the suspension. Input: "NAME\0" and what ps prints.
#include "doubles.h"
#include "input.h"
#include "internals.h"
#include "quillmark.h"
#include "runs.h"

#include <algorithm>
#include <optional>
#include <string>
#include <vector>

using doubles::require;

namespace
{

// Reads as fgets does, with room for 512 characters.
std::optional<std::string> next_line(std::string_view &listing)
{
    if (listing.empty()) {
        return std::nullopt;
    }
    const std::size_t end = listing.find('\n');
    const std::size_t length = end == std::string_view::npos ? listing.size() : end + 1;
    const std::string_view line = listing.substr(0, std::min<std::size_t>(length, 512));
    listing.remove_prefix(line.size());
    return std::string(line.substr(0, line.find('\0')));
}

// The kill command; nothing if no process is listed.
std::optional<std::string> expected_kill(std::string_view listing)
{
    next_line(listing);
    const auto process = next_line(listing);
    if (!process) {
        return std::nullopt;
    }
    const auto columns = components(*process, ' ');
    return ("kill 9 " + (columns.size() > 1 ? columns[1] : "(null)")).substr(0, 31);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size)
{
    const doubles::Run run;
    const auto [name, listing] = texts<2>(data, size);
    // the library's own array, which only the run of an item fills
    const std::string item = name.substr(0, sizeof internals::command_name - 1);
    item.copy(internals::command_name, item.size());
    doubles::set_listing(listing);

    const auto kill = expected_kill(listing);
    std::vector<std::string> expected{"popen ps " + item.substr(0, 28)};
    if (kill) {
        expected.emplace_back("launch");
    }
    require(FPTEST_SuspendItemExecute() == (kill ? 0 : -1), "the result is another");
    require(doubles::started() == expected, "another process is asked for");
    require(doubles::left_open() == 1, "the listing is closed");

    if (kill) {
        expected.back() = "shell " + *kill;
    }
    doubles::run_as_child([] { FPTEST_SuspendItemExecute(); });
    require(doubles::started() == expected, "another process is killed");
    require(internals::command_name == item, "the item's name is changed");
    return 0;
}
