// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What every unit test starts from.
#pragma once

#include "internals.h"
#include "platform.h"
#include "quillmark.h"
#include "support/sequences.h"
#include "support/this_process.h"

#include <gmock/gmock.h>

#include <cstddef>
#include <string>

using support::Lines;

// Every character that a string can hold, except those.
inline std::string every_character_but(const std::string &these)
{
    std::string text;
    for (int code = 1; code < 256; ++code) {
        const char character = static_cast<char>(code);
        if (these.find(character) == std::string::npos) {
            text += character;
        }
    }
    return text;
}

// What an array of that size holds: the text, then zeros.
inline std::string filled(std::string text, std::size_t size)
{
    text.resize(size, '\0');
    return text;
}

// The tree in one line: elements with their attributes and children, texts.
inline std::string shape(mxml_node_t *node)
{
    if (mxmlGetType(node) == MXML_TEXT) {
        return std::string("'") + mxmlGetText(node, nullptr) + "'";
    }
    std::string text = mxmlGetElement(node);
    for (int at = 0; at < mxmlElementGetAttrCount(node); ++at) {
        const char *name = nullptr;
        const char *value = mxmlElementGetAttrByIndex(node, at, &name);
        text += std::string(" ") + name + "=" + (value != nullptr ? value : "(none)");
    }
    std::string children;
    for (mxml_node_t *child = mxmlGetFirstChild(node); child != nullptr;
         child = mxmlGetNextSibling(child)) {
        children += (children.empty() ? "" : ", ") + shape(child);
    }
    return children.empty() ? text : text + "{" + children + "}";
}

// The library as at load time, on a platform without a test plan.
class LibraryTest : public ::testing::Test
{
  protected:
    static constexpr char kPath[] = "/data/vorlane/src1.xml";

    void SetUp() override
    {
        internals::reset();
        platform::reset();
    }
    void TearDown() override
    {
        SetUp();
    }

    // Runs a command for its effects alone, and forgets its events.
    static void run_quietly(const std::string &command)
    {
        FPTEST_RunTestCmd(command.c_str(), nullptr, 0);
        platform::events();
    }

    // The tree of a plan, loaded anew; its events are forgotten.
    static mxml_node_t *load_plan(const std::string &text)
    {
        internals::reset();
        platform::write_plan(text);
        mxml_node_t *tree = internals::load_configs_file(kPath);
        EXPECT_NE(tree, nullptr) << text;
        platform::events();
        return tree;
    }
    // A plan as the library saves it.
    static constexpr char kLaidOut[] = "<?xml version=\"1.0\"?>\n"
                                       "<P>\n"
                                       "\t<CmdGroup name=\"g\">\n"
                                       "\t\t<Cmd name=\"a\" args=\"1\" />\n"
                                       "\t\t<Cmd name=\"b\" args=\"2\" />\n"
                                       "\t\t<Cmd name=\"c\" args=\"3\" />\n"
                                       "</CmdGroup>\n"
                                       "\t<CmdGroup name=\"empty\" />\n"
                                       "\t<CmdGroup name=\"h\">\n"
                                       "\t\t<Cmd name=\"d\" args=\"4\" />\n"
                                       "\t\t<Cmd name=\"b\" args=\"5\" />\n"
                                       "\t\t<Cmd name=\"e\" args=\"6\" />\n"
                                       "</CmdGroup>\n"
                                       "</P>\n";

    // A plan with a group "g" of those children.
    static std::string plan_of(const std::string &children)
    {
        return "<?xml version=\"1.0\"?><P><CmdGroup name=\"g\">" + children + "</CmdGroup></P>";
    }
    static std::string cmd(const std::string &name, const std::string &args = "-t 5")
    {
        return "<Cmd name=\"" + name + "\" args=\"" + args + "\"/>";
    }

    // All bytes of the name of the item last started.
    static std::string command_name()
    {
        return {internals::command_name, sizeof internals::command_name};
    }
    static std::string recorded(const std::string &name)
    {
        return filled(name, sizeof internals::command_name);
    }
};

using namespace platform;
using namespace sequences;
using namespace testing;
