// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "plan.h"

#include "quillmark.h"

#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <numeric>
#include <stdexcept>
#include <sys/socket.h>
#include <unistd.h>

namespace bench
{
namespace
{

std::string item_name(int index)
{
    return "Item" + std::to_string(index);
}

// As the library writes one.
template <typename Attributes> std::string plan_of(int items, Attributes attributes)
{
    std::string plan = "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n<Plan>\n\t<CmdGroup name=\"";
    plan += kGroup;
    plan += "\">\n";
    for (int index = 0; index < items; ++index) {
        plan += "\t\t<Cmd " + attributes(index) + "/>\n";
    }
    return plan + "</CmdGroup>\n</Plan>\n";
}

std::set<int> descriptors()
{
    std::set<int> open;
    for (const auto &entry : std::filesystem::directory_iterator("/proc/self/fd")) {
        open.insert(std::stoi(entry.path().filename()));
    }
    // the listing's own is closed by now
    std::erase_if(open, [](int descriptor) { return fcntl(descriptor, F_GETFD) < 0; });
    return open;
}

} // namespace

std::string trivial_plan(int items)
{
    return plan_of(items, [](int) { return std::string("name=\"true\" args=\"\""); });
}

std::string fresh_plan(int items)
{
    return plan_of(items, [](int index) {
        return "name=\"" + item_name(index) + "\" args=\"--group Bench\"";
    });
}

std::string reported_plan(int items)
{
    return plan_of(items, [](int index) {
        return "name=\"" + item_name(index) +
               "\" args=\"--group Bench\" progress=\"100\" result=\"1\" description=\"contact 97\"";
    });
}

// Steps of about three eighths, without a common divisor: all are met.
Places::Places(int items)
{
    int step = items * 3 / 8 + 1;
    while (std::gcd(items, step) != 1) {
        ++step;
    }
    for (int index = 0; std::ssize(all_) < items; index = (index + step) % items) {
        all_.emplace_back(index, item_name(index));
    }
}

const std::pair<int, std::string> &Places::next()
{
    const auto &place = all_[next_];
    next_ = (next_ + 1) % all_.size();
    return place;
}

void write_plan(const std::string &text)
{
    std::ofstream file(kPlanPath, std::ios::binary | std::ios::trunc);
    file << text;
    if (!file.flush()) {
        throw std::runtime_error(std::string(kPlanPath) + " cannot be written: is it full?");
    }
}

std::string read_plan()
{
    std::ifstream file(kPlanPath, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

void load_into_library(const std::string &text)
{
    const LeftOpen left_open;
    FPTEST_RunTestCmd("XMLFile::<Plan/>", nullptr, 0);
    left_open.close_all();
    write_plan(text);
    // a group that is not there: the plan is loaded, and nothing is run
    FPTEST_RunTestCmd("XMLNodePath::plan/Missing", nullptr, 0);
    if (g_TestCmdTree == nullptr) {
        throw std::runtime_error(std::string(kPlanPath) + ": the library has not loaded it");
    }
}

LeftOpen::LeftOpen() : before_(descriptors())
{
}

void LeftOpen::close_all() const
{
    const linger at_once{1, 0};
    for (const int descriptor : descriptors()) {
        if (!before_.contains(descriptor)) {
            setsockopt(descriptor, SOL_SOCKET, SO_LINGER, &at_once, sizeof at_once);
            close(descriptor);
        }
    }
}

} // namespace bench
