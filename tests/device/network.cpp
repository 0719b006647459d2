// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "network.h"

#include <filesystem>
#include <fstream>
#include <iterator>
#include <poll.h>
#include <set>
#include <sstream>
#include <sys/socket.h>
#include <unistd.h>

namespace fs = std::filesystem;

namespace device
{

sockaddr_in loopback(unsigned short port)
{
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return address;
}

Socket listen_on(unsigned short port)
{
    Socket server(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    const int on = 1; // an earlier connection may linger
    setsockopt(server.get(), SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
    sockaddr_in address = loopback(port);
    EXPECT_EQ(bind(server.get(), reinterpret_cast<sockaddr *>(&address), sizeof address), 0);
    EXPECT_EQ(listen(server.get(), 1), 0);
    return server;
}

Socket connect_to(unsigned short port)
{
    Socket client(-1);
    const sockaddr_in address = loopback(port);
    EXPECT_TRUE(eventually([&] {
        client = Socket(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
        return connect(client.get(), reinterpret_cast<const sockaddr *>(&address),
                       sizeof address) == 0;
    })) << "nobody listens on port "
        << port;
    return client;
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

namespace
{

// The sockets of this process and of those that it has forked, as /proc/PID/fd
// names them. A process in a container is not alone, and neither are its sockets.
std::set<std::string> own_sockets()
{
    std::set<std::string> found;
    for (const Process &process : processes()) {
        if (process.pid != getpid() && process.parent != getpid()) {
            continue;
        }
        // one that ends meanwhile has none any more
        std::error_code gone;
        fs::directory_iterator entry("/proc/" + std::to_string(process.pid) + "/fd", gone);
        for (; !gone && entry != fs::directory_iterator(); entry.increment(gone)) {
            std::error_code closed;
            found.insert(fs::read_symlink(entry->path(), closed));
        }
    }
    return found;
}

} // namespace

Lines listeners()
{
    const std::string trigger_port = ":8888";
    Lines found;
    const auto own = own_sockets();
    std::ifstream table("/proc/net/tcp");
    std::string line;
    std::getline(table, line); // the header
    while (std::getline(table, line)) {
        std::istringstream stream(line);
        const Lines columns{std::istream_iterator<std::string>(stream), {}};
        const std::string &local = columns.at(1);
        const bool is_listening = columns.at(3) == "0A";
        if (is_listening &&
            (local.ends_with(trigger_port) || own.contains("socket:[" + columns.at(9) + "]"))) {
            found.push_back(local);
        }
    }
    return found;
}

} // namespace device
