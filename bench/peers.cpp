// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cases.h"
#include "figures.h"

#include <cstdlib>
#include <filesystem>
#include <optional>
#include <stdexcept>
#include <unistd.h>

namespace bench
{
namespace
{

namespace fs = std::filesystem;

struct Peer {
    const char *name;
    const char *program;
    const char *arguments;
    // Shell commands that make item $i of an empty directory, and those before the first.
    const char *item;
    const char *start = ":";
};

const Peer kPeers[] = {
    {"ctest", "/usr/bin/ctest", "-Q",
     "echo \"add_test(item$i /usr/bin/true)\" >>CTestTestfile.cmake"},
    {"prove (a shell, two echo)", "/usr/bin/prove", "-Q --exec /system/bin/sh .",
     "echo 'echo 1..1; echo ok 1' >item$i.t"},
    {"kyua", "/usr/bin/kyua", "test",
     "ln -s /usr/bin/true item$i; echo \"plain_test_program{name='item$i'}\" >>Kyuafile",
     "printf \"syntax(2)\\ntest_suite('trivial')\\n\" >Kyuafile"},
};

// Seconds for so many trivial items; none if it does not run here.
std::optional<double> time_of(const Peer &peer, int items)
{
    std::string directory = (fs::temp_directory_path() / "peers-XXXXXX").string();
    if (mkdtemp(directory.data()) == nullptr) {
        throw std::runtime_error(directory + " cannot be made");
    }
    const std::string there = "exec >/dev/null 2>&1; cd " + directory + " && ";
    const std::string make = there + peer.start + "; i=0; while [ $i -lt " + std::to_string(items) +
                             " ]; do " + peer.item + "; i=$((i + 1)); done";
    const std::string run = there + "HOME=/tmp exec " + peer.program + " " + peer.arguments;
    bool passed = std::system(make.c_str()) == 0;
    std::vector<double> took;
    for (int turn = 0; turn < 3; ++turn) {
        took.push_back(seconds_of([&] { passed &= std::system(run.c_str()) == 0; }));
    }
    fs::remove_all(directory);
    return passed ? std::optional(median(took)) : std::nullopt;
}

void print_row(const std::string &name, double seconds, double ours)
{
    print({name, time_text(seconds), "", decimal(seconds / ours, 2)});
}

void print_peer(const Peer &peer, int items, double ours)
{
    if (access(peer.program, X_OK) != 0) {
        print({peer.name, "-", "", "-", "", "", "absent"});
        return;
    }
    const auto one = time_of(peer, 1);
    const auto all = time_of(peer, items + 1);
    if (one && all) {
        print_row(peer.name, (*all - *one) / items, ours);
    } else {
        print({peer.name, "-", "", "-", "", "", "fails"});
    }
}

} // namespace

void print_peers(double ours, double query, int items)
{
    print({"one trivial item of many", "median", "", "ratio"});
    print_row("a group run", ours, ours);
    print_row("  without the query", ours * (1 - query), ours);
    for (const Peer &peer : kPeers) {
        print_peer(peer, items, ours);
    }
    print({"Of what an item takes here, asking for a running gatherer takes " +
           decimal(100 * query, 0) + " %."});
}

} // namespace bench
