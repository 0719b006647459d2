// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Digests of texts, as sha256sum prints them, and of plans.
#include "plan/plan_text.h"
#include "util/sha256.h"

#include <gmock/gmock.h>

#include <string>

using fptest::Plan;
using fptest::sha256;

namespace
{

TEST(Sha256, IsThatOfTheStandard)
{
    EXPECT_EQ(sha256(""), "e3b0c44298fc1c149afbf4c8996fb92427ae41e4649b934ca495991b7852b855");
    EXPECT_EQ(sha256("abc"), "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad");
    EXPECT_EQ(sha256(std::string(1000000, 'a')),
              "cdc76e5c9914fb9281a1c7e284d73e67f1809a48a497200e046d39ccc7112cd0");
}

TEST(Sha256, FillsItsLastBlocks)
{
    EXPECT_EQ(sha256(std::string(55, 'a')),
              "9f4390f8d30c2dd92ec9f095b65e2b9ae9b0a925a5258e241c9f1e910f734318");
    EXPECT_EQ(sha256(std::string(56, 'a')),
              "b35439a4ac6f0948b6d6f9e3c6af0f5f590ce20f1bde7090ef7970686ec6738a");
    EXPECT_EQ(sha256(std::string(63, 'a')),
              "7d3e74a05d7db15bce4ad9ec0658ea98e3f06eeecf16b4c6fff2da457ddc2f34");
    EXPECT_EQ(sha256(std::string(64, 'a')),
              "ffe054fe7ae0cb6dc65c3af9b61d5209f439851db43d0ba5997337df154668eb");
}

std::string digest(const std::string &text)
{
    return fptest::digest_of(Plan::load_as_library(text).value());
}

TEST(DigestOfAPlan, DependsOnWhatRunsOnly)
{
    const std::string plan =
        digest("<P><CmdGroup name=\"G\"><Cmd name=\"I\" args=\"1\"/></CmdGroup></P>");
    EXPECT_EQ(plan.size(), 64U);
    EXPECT_EQ(plan,
              digest("<P>\n  <CmdGroup name='G'>\n    <Cmd args=\"1\" name=\"I\" result=\"0\" "
                     "fptest-run=\"x\" ></Cmd>\n</CmdGroup></P>\n"));
    EXPECT_EQ(plan, digest("<?xml version=\"1.0\"?>\n<!-- a --><P><CmdGroup name=\"G\"><!-- b -->"
                           "<Cmd name=\"I\" args=\"1\"/></CmdGroup></P>"));
    for (const char *other :
         {"<P><CmdGroup name=\"G\"><Cmd name=\"I\" args=\"2\"/></CmdGroup></P>",
          "<P><CmdGroup name=\"G\"><Cmd name=\"J\" args=\"1\"/></CmdGroup></P>",
          "<P><CmdGroup name=\"G\"><Cmd name=\"I\"/></CmdGroup></P>",
          "<P><CmdGroup name=\"G\"/><Cmd name=\"I\" args=\"1\"/></P>",
          "<P><CmdGroup name=\"G\"><Cmd name=\"I\" args=\"1\"/><Cmd/></CmdGroup>"
          "</P>"}) {
        EXPECT_NE(plan, digest(other)) << other;
    }
}

} // namespace
