// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Clients of the trigger channel, as the gatherer is one.
#pragma once

#include "common/descriptor.h"
#include "device_test.h"

#include <netinet/in.h>
#include <string>

namespace device
{

using Socket = Descriptor;

sockaddr_in loopback(unsigned short port);

// One that listens there, at this machine's own address.
Socket listen_on(unsigned short port);

// Tries until somebody listens.
Socket connect_to(unsigned short port);

// Every byte that arrives until the peer closes or is silent for a while;
// "<closed>" is put after it if the peer has closed.
std::string receive(const Socket &client);

// Local addresses and ports, as in "00000000:8888", of the sockets that listen at
// the trigger port, and of those elsewhere that this process or a child of it has.
Lines listeners();

} // namespace device
