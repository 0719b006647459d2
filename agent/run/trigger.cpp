// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/trigger.h"

#include "common/descriptor.h"
#include "plan/plan.h"

#include <chrono>
#include <netinet/in.h>
#include <sys/socket.h>
#include <thread>

namespace fptest
{

void release_trigger()
{
    const Descriptor connection(socket(AF_INET, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0));
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(kTriggerPort);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    static_cast<void>(
        connect(connection.get(), reinterpret_cast<const sockaddr *>(&address), sizeof address));
    // long enough to be accepted
    std::this_thread::sleep_for(std::chrono::milliseconds(25));
}

} // namespace fptest
