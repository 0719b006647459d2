// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Clients of the trigger channel, as the gatherer is one.
#pragma once

#include "device_test.h"

#include <netinet/in.h>
#include <string>
#include <utility>

namespace device
{

// A descriptor that is closed with its owner.
class Socket
{
  public:
    explicit Socket(int descriptor) : descriptor_(descriptor)
    {
    }
    ~Socket();
    Socket(const Socket &) = delete;
    Socket &operator=(const Socket &) = delete;
    Socket(Socket &&other) noexcept : descriptor_(std::exchange(other.descriptor_, -1))
    {
    }
    Socket &operator=(Socket &&) = delete;

    [[nodiscard]] int get() const
    {
        return descriptor_;
    }

  private:
    int descriptor_;
};

sockaddr_in loopback(unsigned short port);

// Tries until somebody listens.
Socket connect_to(unsigned short port);

// Every byte that arrives until the peer closes or is silent for a while;
// "<closed>" is put after it where the peer has closed.
std::string receive(const Socket &client);

// Local addresses and ports, as in "00000000:8888", of the sockets that listen at
// the trigger port, and of those elsewhere that this process or a child of it has.
Lines listeners();

} // namespace device
