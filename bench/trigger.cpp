// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "baseline.h"
#include "cases.h"
#include "plan.h"
#include "quiet_vorlane.h"
#include "sockwrap.h"
#include "tests/unit/internals.h"

#include <array>
#include <netinet/in.h>
#include <string>
#include <string_view>
#include <sys/socket.h>
#include <unistd.h>

namespace bench
{
namespace
{

constexpr std::string_view kText = "gather again!";

sockaddr_in address_of(in_addr_t host)
{
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = 0x8888;
    address.sin_addr.s_addr = host;
    return address;
}

// The gatherer of both sides: this thread itself, at the moment when the server
// is about to accept. So nobody waits for a scheduler, and what a round trip
// takes is the calls.
struct Gatherer {
    int socket = -1;
    std::array<char, 64> text{};
    std::size_t received = 0;
};

Gatherer gatherer;

void connect_gatherer()
{
    const sockaddr_in address = address_of(htonl(INADDR_LOOPBACK));
    [[maybe_unused]] const int connected =
        connect(gatherer.socket, reinterpret_cast<const sockaddr *>(&address), sizeof address);
}

void receive()
{
    const ssize_t got = read(gatherer.socket, gatherer.text.data(), gatherer.text.size());
    gatherer.received = got > 0 ? static_cast<std::size_t>(got) : 0;
}

void renew_gatherer()
{
    gatherer = {.socket = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)};
}

void serve_bare()
{
    const int reuse = 1;
    const sockaddr_in here = address_of(htonl(INADDR_ANY));
    sockaddr_in there{};
    socklen_t length = sizeof there;

    const int server = socket(AF_INET, SOCK_STREAM, 0);
    Setsockopt(server, &reuse);
    Bind(server, reinterpret_cast<const sockaddr *>(&here), sizeof here);
    listen(server, 5);
    const int connection = Accept(server, reinterpret_cast<sockaddr *>(&there), &length);
    BASELINE_LOG("retWri=%d", (int)write(connection, kText.data(), kText.size()));
    BASELINE_LOG("retWri success\n");
    close(server);
}

} // namespace

Comparison trigger()
{
    return {.name = "trigger round trip",
            .limit = 1.05,
            .seconds = 0.1,
            .prepare =
                [] {
                    quiet_on_accept(connect_gatherer);
                    renew_gatherer();
                },
            .library =
                [] {
                    internals::Sock_Init1();
                    receive();
                },
            .baseline =
                [] {
                    serve_bare();
                    receive();
                },
            .clear =
                [left_open = LeftOpen()] {
                    left_open.close_all(); // the gatherer too
                    renew_gatherer();
                },
            .outcome = [] { return std::string(gatherer.text.data(), gatherer.received); }};
}

} // namespace bench
