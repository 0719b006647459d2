// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Hosts of other kinds, and what the library needs of its surroundings.
#include "../quoted.h"
#include "device_test.h"

#include <array>
#include <cstdio>
#include <cstdlib>
#include <memory>

using namespace device;

namespace
{

class Host : public DeviceTest
{
};

std::string output_of(const std::string &command)
{
    std::string output;
    const std::unique_ptr<FILE, int (*)(FILE *)> pipe(popen(command.c_str(), "r"), &pclose);
    std::array<char, 256> buffer{};
    while (fgets(buffer.data(), buffer.size(), pipe.get()) != nullptr) {
        output += buffer.data();
    }
    return output;
}

const std::string kTests = QUILLMARK_BINARY_DIR "/tests/device";
const std::string kHost = quoted(kTests + "/c_host");

TEST_F(Host, InCGetsItsPingOnce)
{
    EXPECT_EQ(output_of(kHost), "0 <Ping Success!> <> 32 2049 1024 no plan\n");
}

TEST_F(Host, MakersLibraryIsReplacedAtLoadTime)
{
    unsetenv("VR_LOG_FILE");
    EXPECT_EQ(
        // by its name: the loader takes a blank for the end of a path
        output_of("LD_LIBRARY_PATH=" + quoted(kTests) + " LD_PRELOAD=libother_vorlane.so " + kHost),
        "other log: 4 VRCODE => testHead is : %s\n"
        "other log: 4 VRCODE => Get ping reply success!\n"
        "other log: 4 VRCODE => testHead is : %s\n"
        "0 <Ping Success!> <> 32 2049 1024 no plan\n");
}

TEST_F(Host, FirstPingOfTheProcessIsAnsweredAndNoOther)
{
    std::array<char, 64> reply{};
    EXPECT_EQ(FPTEST_RunTestCmd("pingtest::x", nullptr, 0), 0);
    EXPECT_EQ(FPTEST_RunTestCmd("pingtest", reply.data(), reply.size()), 0);
    EXPECT_STREQ(reply.data(), "");
}

TEST_F(Host, SeesTheCachedPlanThroughTheExportedVariable)
{
    EXPECT_EQ(g_TestCmdTree, nullptr);
    store(plan_of({{"G", {{"Note", ""}}}}));
    EXPECT_EQ(g_TestCmdTree, nullptr);
    run_path("P/G");
    ASSERT_NE(g_TestCmdTree, nullptr);
    EXPECT_STREQ(mxmlGetElement(g_TestCmdTree), "P");
    store("<P/>");
    EXPECT_EQ(g_TestCmdTree, nullptr);
}

} // namespace
