// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/protocol.h"

#include "util/write.h"

#include <array>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <unistd.h>

namespace fptest
{
namespace
{

bool receive_all(int fd, char *data, std::size_t size)
{
    while (size > 0) {
        const ssize_t got = read(fd, data, size);
        if (got < 0 && errno == EINTR) {
            continue;
        }
        if (got <= 0) {
            return false;
        }
        data += got;
        size -= static_cast<std::size_t>(got);
    }
    return true;
}

} // namespace

// A message is its kind, the length of its text, and the text.
bool send_message(int socket, const Message &message)
{
    std::array<char, 5> head{static_cast<char>(message.kind)};
    const auto length = static_cast<std::uint32_t>(message.text.size());
    std::memcpy(head.data() + 1, &length, sizeof length);
    return write_text(socket, {head.data(), head.size()}) == head.size() &&
           write_text(socket, message.text) == message.text.size();
}

bool receive_message(int socket, Message &message)
{
    std::array<char, 5> head{};
    std::uint32_t length = 0;
    if (!receive_all(socket, head.data(), head.size())) {
        return false;
    }
    message.kind = static_cast<MessageKind>(head[0]);
    std::memcpy(&length, head.data() + 1, sizeof length);
    message.text.resize(length);
    return receive_all(socket, message.text.data(), length);
}

} // namespace fptest
