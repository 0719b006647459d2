// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Hosts of other kinds, and what the library needs of its surroundings.
#include "device_test.h"
#include "support/process.h"

namespace
{

using Host = DeviceTest;

const std::string kTests = QUILLMARK_BINARY_DIR "/tests/device";
const std::string kHost = kTests + "/c_host";

TEST_F(Host, InCGetsItsPingOnce)
{
    EXPECT_EQ(support::run({.arguments = {kHost}}).out,
              "0 <Ping Success!> <> 32 2049 1024 no plan\n");
}

TEST_F(Host, PlatformsLibraryIsReplacedAtLoadTime)
{
    support::Start start{.arguments = {kHost}};
    // by its name: the loader takes a blank for the end of a path
    start.environment = {{"VR_LOG_FILE", std::nullopt},
                         {"LD_LIBRARY_PATH", kTests},
                         {"LD_PRELOAD", "libother_vorlane.so"}};
    EXPECT_EQ(support::run(start).out, "other log: 4 VRCODE => testHead is : %s\n"
                                       "other log: 4 VRCODE => Get ping reply success!\n"
                                       "other log: 4 VRCODE => testHead is : %s\n"
                                       "0 <Ping Success!> <> 32 2049 1024 no plan\n");
}

TEST_F(Host, SeesTheCachedPlanThroughTheExportedVariable)
{
    EXPECT_EQ(g_TestCmdTree, nullptr);
    store(group_of({{"Note", ""}}));
    EXPECT_EQ(g_TestCmdTree, nullptr);
    run_path("P/G");
    ASSERT_NE(g_TestCmdTree, nullptr);
    EXPECT_STREQ(mxmlGetElement(g_TestCmdTree), "P");
    store("<P/>");
    EXPECT_EQ(g_TestCmdTree, nullptr);
}

} // namespace
