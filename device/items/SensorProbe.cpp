// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The sensor-data gatherer. It stays in the background and gathers whenever the
// library tells it to: it connects to the library's port, waits there for the
// word, leaves, gathers, and connects again.
//
// Vendor 2's variant is started like any other item and never told anything, so
// it gathers once and ends.

#include "common/descriptor.h"
#include "item.h"

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <netinet/in.h>
#include <random>
#include <string_view>
#include <sys/socket.h>
#include <thread>

namespace
{

constexpr in_port_t trigger_port = 34952;
constexpr std::string_view trigger_text = "gather again!";
constexpr const char *readings_path = "/data/vorlane/readings.txt";
constexpr int sample_count = 64;

// Says each complaint once, not again with every try.
class Complaints
{
  public:
    explicit Complaints(std::string program) : program_(std::move(program))
    {
    }
    void say(const std::string &complaint)
    {
        if (complaint != last_) {
            std::fprintf(stderr, "%s: %s\n", program_.c_str(), complaint.c_str());
            last_ = complaint;
        }
    }
    void forget()
    {
        last_.clear();
    }

  private:
    std::string program_;
    std::string last_;
};

// While nobody listens, a connection from the port's own number would find
// itself, and hold the port against the library. Such a one is taken down at once.
bool is_connected_to_itself(const Descriptor &connection)
{
    sockaddr_in local{};
    socklen_t length = sizeof(local);
    getsockname(connection.get(), reinterpret_cast<sockaddr *>(&local), &length);
    if (local.sin_port != htons(trigger_port)) {
        return false;
    }
    const linger reset{1, 0};
    setsockopt(connection.get(), SOL_SOCKET, SO_LINGER, &reset, sizeof(reset));
    return true;
}

bool connect_to_module(const Descriptor &connection)
{
    sockaddr_in module{};
    module.sin_family = AF_INET;
    module.sin_port = htons(trigger_port);
    module.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return connect(connection.get(), reinterpret_cast<const sockaddr *>(&module), sizeof(module)) ==
               0 &&
           !is_connected_to_itself(connection);
}

// Reads until the text is there. The library never closes its end, so nothing
// after the text is waited for.
bool read_trigger(const Descriptor &connection, Complaints &complaints)
{
    std::array<char, trigger_text.size()> buffer{};
    std::size_t length = 0;

    while (length < buffer.size()) {
        const ssize_t got = read(connection.get(), buffer.data() + length, buffer.size() - length);
        if (got < 0 && errno == EINTR) {
            continue;
        }
        if (got < 0) {
            // A listening socket that is closed resets those still waiting in its
            // queue: the library has just told this gatherer, and is done.
            if (errno != ECONNRESET || length > 0) {
                complaints.say(std::string("the trigger cannot be read: ") + std::strerror(errno));
            }
            return false;
        }
        if (got == 0) {
            complaints.say("the trigger ended after " + std::to_string(length) + " of " +
                           std::to_string(buffer.size()) + " bytes");
            return false;
        }
        length += static_cast<std::size_t>(got);
        if (!trigger_text.starts_with(std::string_view(buffer.data(), length))) {
            complaints.say("the trigger is not \"" + std::string(trigger_text) + "\"");
            return false;
        }
    }
    complaints.forget();
    return true;
}

void wait_for_trigger(Complaints &complaints)
{
    using namespace std::chrono_literals;
    for (;; std::this_thread::sleep_for(20ms)) {
        const Descriptor connection(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
        if (!connection.is_open()) {
            complaints.say(std::string("no socket: ") + std::strerror(errno));
        } else if (connect_to_module(connection) && read_trigger(connection, complaints)) {
            return;
        }
    }
}

bool write_readings(unsigned gathering)
{
    std::minstd_rand noise(gathering);
    std::ofstream file(readings_path);

    file << "gatherings " << gathering << '\n';
    for (int sample = 1; sample <= sample_count; ++sample) {
        file << noise() % 4096 << (sample % 8 == 0 ? '\n' : ' ');
    }
    file.close();
    return !file.fail();
}

int gather(const Item &item, unsigned gathering)
{
    item.work(1);
    if (!write_readings(gathering)) {
        return item.finish(Result::failed, std::string(readings_path) + " cannot be written");
    }
    return item.finish(Result::passed, "gathering " + std::to_string(gathering) + ", " +
                                           std::to_string(sample_count) + " samples");
}

} // namespace

int main(int argc, char **argv)
{
    using namespace std::chrono_literals;
    const Item item(argc, argv, "Gathers sensor data whenever it is told to, for ever.", 300ms);
    Complaints complaints(item.program());

    if (item.program().ends_with("_ca_qsee")) {
        return gather(item, 1);
    }
    for (unsigned gathering = 1;; ++gathering) {
        wait_for_trigger(complaints);
        gather(item, gathering);
    }
}
