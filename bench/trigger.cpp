// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cases.h"
#include "floor.h"
#include "plan.h"
#include "quiet_vorlane.h"
#include "sockwrap.h"
#include "unit.h"

#include "common/descriptor.h"

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
class Client
{
  public:
    static void connect()
    {
        const sockaddr_in address = address_of(htonl(INADDR_LOOPBACK));
        [[maybe_unused]] const int connected =
            ::connect(socket_.get(), reinterpret_cast<const sockaddr *>(&address), sizeof address);
    }
    static void receive()
    {
        const ssize_t got = read(socket_.get(), text_.data(), text_.size());
        received_ = got > 0 ? static_cast<std::size_t>(got) : 0;
    }
    // At once, without lingering in the network's tables.
    static void leave()
    {
        const linger at_once{1, 0};
        setsockopt(socket_.get(), SOL_SOCKET, SO_LINGER, &at_once, sizeof at_once);
        socket_ = Descriptor(-1);
    }
    static void renew()
    {
        received_ = 0;
        socket_ = Descriptor(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    }
    static std::string text()
    {
        return {text_.data(), received_};
    }

  private:
    static inline Descriptor socket_{-1};
    static inline std::array<char, 64> text_{};
    static inline std::size_t received_ = 0;
};

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
    FLOOR_LOG("retWri=%d", (int)write(connection, kText.data(), kText.size()));
    FLOOR_LOG("retWri success\n");
    close(server);
}

class Trigger : public Contest
{
  public:
    Trigger() : Contest("trigger round trip", 1.05, 1, 0.1)
    {
    }
    ~Trigger() override
    {
        quiet_on_accept(nullptr);
    }
    void prepare() override
    {
        quiet_on_accept(Client::connect);
        Client::renew();
    }
    void module(int /* calls */) override
    {
        unit::Sock_Init1();
        Client::receive();
    }
    void floor(int /* calls */) override
    {
        serve_bare();
        Client::receive();
    }
    void clear() override
    {
        Client::leave();
        left_open_.close_all();
        Client::renew();
    }
    std::string outcome() override
    {
        return Client::text();
    }

  private:
    const LeftOpen left_open_;
};

} // namespace

std::unique_ptr<Contest> trigger()
{
    return std::make_unique<Trigger>();
}

} // namespace bench
