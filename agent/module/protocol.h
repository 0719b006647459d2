// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the agent and the library's process say to each other over their socket.
#pragma once

#include <string>

namespace fptest
{

// What a stop returns that found nothing to stop.
inline constexpr int kNothingToStop = -2;

enum class MessageKind : char {
    // to the library's process
    command = 'c',   // the command and the names of its items, a zero byte between each
    stop = 's',      // the item's name
    read_back = 'b', // nothing
    hold = 'h',      // nothing: from here on the library is held at the two below that say so
    go_on = 'g',     // nothing: it may go on
    // from it
    item = 'i',      // "MOMENT VENDOR": the command has come to an item
    ended = 'e',     // "MOMENT STATUS LEFT": its process has; whether any are left; held
    connected = 'n', // "MOMENT": the gatherer has, and is told when the library goes on; held
    returned = 'r',  // "MOMENT REPLY"
    stopped = 'd',   // what the stop returned
    plan = 'p',      // the stored plan
};

struct Message {
    MessageKind kind{};
    std::string text;
};

// Both return false where the other side is gone.
bool send_message(int socket, const Message &message);
bool receive_message(int socket, Message &message);

} // namespace fptest
