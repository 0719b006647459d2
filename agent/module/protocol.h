// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the agent and the library's process say to each other over their socket.
#pragma once

#include <string>

namespace fptest
{

// The result of a stop that found nothing to stop.
inline constexpr int kNothingToStop = -2;

enum class MessageKind : char {
    // to the library's process
    command = 'c',     // the command and the names of its items, a zero byte between each
    directories = 'f', // of the next command's items, a zero byte after each
    stop = 's',        // the item's name
    read_back = 'b',   // nothing
    hold = 'h',        // nothing: from here on the library is held at ended and connected
    go_on = 'g',       // nothing: it may go on
    // from it
    item = 'i',      // "MOMENT VENDOR": the command has reached an item
    ended = 'e',     // "MOMENT STATUS LEFT": the item's process; LEFT is 1 if others may be left
    connected = 'n', // "MOMENT": the gatherer, which is triggered once the library goes on
    returned = 'r',  // "MOMENT REPLY"
    stopped = 'd',   // the result of the stop
    plan = 'p',      // the stored plan
};

struct Message {
    MessageKind kind{};
    std::string text;
};

// Both return false if the other side is gone.
bool send_message(int socket, const Message &message);
bool receive_message(int socket, Message &message);

} // namespace fptest
