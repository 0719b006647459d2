// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "peers.h"

#include "contest.h"
#include "figures.h"
#include "plan.h"

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <optional>
#include <stdexcept>
#include <unistd.h>

namespace bench
{
namespace
{

namespace fs = std::filesystem;

constexpr const char *kProgram = "/usr/bin/true";

// A directory with so many trivial items of one peer.
class Items
{
  public:
    explicit Items(int count) : count_(count)
    {
        std::string path = (fs::temp_directory_path() / "peers-XXXXXX").string();
        if (mkdtemp(path.data()) == nullptr) {
            throw std::runtime_error(path + " cannot be made");
        }
        path_ = path;
    }
    ~Items()
    {
        std::error_code ignored;
        fs::remove_all(path_, ignored);
    }
    Items(const Items &) = delete;
    Items &operator=(const Items &) = delete;

    [[nodiscard]] int count() const
    {
        return count_;
    }
    [[nodiscard]] const fs::path &path() const
    {
        return path_;
    }

  private:
    int count_;
    fs::path path_;
};

struct Peer {
    std::string name;
    std::string program;
    std::string arguments;
    void (*make)(const Items &items);
};

std::string item(int index)
{
    return "item" + std::to_string(index);
}

void make_for_ctest(const Items &items)
{
    std::ofstream list(items.path() / "CTestTestfile.cmake");
    for (int index = 0; index < items.count(); ++index) {
        list << "add_test(" << item(index) << " " << kProgram << ")\n";
    }
}

void make_for_prove(const Items &items)
{
    for (int index = 0; index < items.count(); ++index) {
        std::ofstream(items.path() / (item(index) + ".t")) << "echo 1..1\necho ok 1\n";
    }
}

void make_for_kyua(const Items &items)
{
    std::ofstream list(items.path() / "Kyuafile");
    list << "syntax(2)\ntest_suite('trivial')\n";
    for (int index = 0; index < items.count(); ++index) {
        fs::create_symlink(kProgram, items.path() / item(index));
        list << "plain_test_program{name='" << item(index) << "'}\n";
    }
}

const Peer kPeers[] = {
    {"ctest", "/usr/bin/ctest", "-Q", make_for_ctest},
    {"prove (a shell, two echo)", "/usr/bin/prove", "-Q --exec /system/bin/sh .", make_for_prove},
    {"kyua", "/usr/bin/kyua", "test", make_for_kyua},
};

// Seconds; none where it does not run here.
std::optional<double> time_of(const Peer &peer, int count)
{
    const Items items(count);
    peer.make(items);
    const std::string command = "cd " + items.path().string() + " && HOME=/tmp exec " +
                                peer.program + " " + peer.arguments + " >/dev/null 2>&1";
    std::vector<double> took;
    for (int turn = 0; turn < 3; ++turn) {
        const auto start = std::chrono::steady_clock::now();
        const int status = std::system(command.c_str());
        took.push_back(
            std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count());
        if (status != 0) {
            return std::nullopt;
        }
    }
    return median(took);
}

std::string row(const std::string &name, double seconds, double ours)
{
    return table_line({name, time_text(seconds), "", decimal(seconds / ours, 2)});
}

std::string peer_row(const Peer &peer, int items, double ours)
{
    if (access(peer.program.c_str(), X_OK) != 0) {
        return table_line({peer.name, "-", "", "-", "", "", "absent"});
    }
    const auto one = time_of(peer, 1);
    const auto all = time_of(peer, items + 1);
    if (!one || !all) {
        return table_line({peer.name, "-", "", "-", "", "", "fails"});
    }
    return row(peer.name, (*all - *one) / items, ours);
}

} // namespace

std::string peer_table(double ours, double query, int items)
{
    std::string table = table_line({"one trivial item of many", "median", "", "ratio"}) +
                        row("a group run", ours, ours) +
                        row("  without the query", ours * (1 - query), ours);
    for (const Peer &peer : kPeers) {
        table += peer_row(peer, items, ours);
    }
    table += "Of what an item takes here, asking for a running gatherer takes " +
             decimal(100 * query, 0) + " %.\n";
    return table;
}

} // namespace bench
