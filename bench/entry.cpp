// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cases.h"
#include "floor.h"
#include "plan.h"
#include "unit.h"

#include "quillmark.h"

#include <array>
#include <cstdio>
#include <fcntl.h>

namespace bench
{
namespace
{

// Commands that run nothing: what is left for a floor is the log.
class Ping : public Contest
{
  public:
    Ping() : Contest("ping", 0, 200, 0.02)
    {
    }
    void module(int calls) override
    {
        for (int call = 0; call < calls; ++call) {
            unit::ping(reply_.data(), static_cast<int>(reply_.size()));
        }
    }
    void floor(int calls) override
    {
        for (int call = 0; call < calls; ++call) {
            FLOOR_LOG("testHead is : %s\n", "pingtest");
            FLOOR_LOG("Get ping reply success!\n");
        }
    }

  private:
    std::array<char, 64> reply_{};
};

class UnknownHead : public Contest
{
  public:
    UnknownHead() : Contest("unknown head", 0, 200, 0.02)
    {
    }
    void module(int calls) override
    {
        for (int call = 0; call < calls; ++call) {
            FPTEST_RunTestCmd("Unknown", nullptr, 0);
        }
    }
    void floor(int calls) override
    {
        for (int call = 0; call < calls; ++call) {
            FLOOR_LOG("testHead is : %s\n", "Unknown");
        }
    }
};

class Store : public Contest
{
  public:
    Store() : Contest("store a plan of 2 KB", 0, 16, 0.05)
    {
    }
    void prepare() override
    {
        write_plan("");
    }
    void module(int calls) override
    {
        for (int call = 0; call < calls; ++call) {
            FPTEST_RunTestCmd(command_.c_str(), nullptr, 0);
        }
    }
    void floor(int calls) override
    {
        for (int call = 0; call < calls; ++call) {
            FLOOR_LOG("testHead is : %s\n", "XMLFile");
            FLOOR_LOG("testName is : %s\n", document_.c_str());
            std::remove(kPlanPath);
            const int fd = open(kPlanPath, O_RDWR | O_CREAT, 0666);
            [[maybe_unused]] const ssize_t written = write(fd, document_.data(), document_.size());
            FLOOR_LOG("Save source xml file success!\n");
        }
    }
    void clear() override
    {
        left_open_.close_all();
    }
    std::string outcome() override
    {
        return read_plan();
    }

  private:
    const std::string document_ = reported_plan(40).substr(0, 2048);
    const std::string command_ = "XMLFile::" + document_;
    const LeftOpen left_open_;
};

} // namespace

std::unique_ptr<Contest> ping()
{
    return std::make_unique<Ping>();
}

std::unique_ptr<Contest> unknown_head()
{
    return std::make_unique<UnknownHead>();
}

std::unique_ptr<Contest> store()
{
    return std::make_unique<Store>();
}

} // namespace bench
