// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "network.h"

#include <chrono>
#include <fstream>
#include <poll.h>
#include <sstream>
#include <sys/socket.h>
#include <thread>
#include <unistd.h>

namespace device
{

Socket::~Socket()
{
    if (descriptor_ >= 0) {
        close(descriptor_);
    }
}

sockaddr_in loopback(unsigned short port)
{
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return address;
}

Socket connect_to(unsigned short port)
{
    for (int tries = 0; tries < 2000; ++tries) {
        Socket client(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
        const sockaddr_in address = loopback(port);
        if (connect(client.get(), reinterpret_cast<const sockaddr *>(&address), sizeof address) ==
            0) {
            return client;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
    ADD_FAILURE() << "nobody listens on port " << port;
    return Socket(-1);
}

std::string receive(const Socket &client)
{
    std::string text;
    pollfd wait{client.get(), POLLIN, 0};
    while (poll(&wait, 1, 300) > 0) {
        char byte = 0;
        if (read(client.get(), &byte, 1) != 1) {
            return text + "<closed>";
        }
        text += byte;
    }
    return text;
}

Lines listeners()
{
    Lines found;
    std::ifstream table("/proc/net/tcp");
    std::string line;
    std::getline(table, line); // the header
    while (std::getline(table, line)) {
        std::istringstream columns(line);
        std::string slot;
        std::string local;
        std::string remote;
        std::string state;
        columns >> slot >> local >> remote >> state;
        if (state == "0A") {
            found.push_back(local);
        }
    }
    return found;
}

} // namespace device
