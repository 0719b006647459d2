// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// An agent in C++ that is its own item, and reads the plan by Mini-XML.
#include <quillmark.h>

#include <csignal>
#include <iostream>

int main()
{
    std::signal(SIGPIPE, SIG_IGN);
    FPTEST_RunTestCmd("XMLFile::<P><CmdGroup name=\"G\"><Cmd name=\"I\"/></CmdGroup></P>", nullptr,
                      0);
    FPTEST_SetTransation("G", "I", 100, 0, "from C++");
    mxml_node_t *item =
        mxmlFindElement(g_TestCmdTree, g_TestCmdTree, "Cmd", nullptr, nullptr, MXML_DESCEND);
    std::cout << mxmlElementGetAttr(item, "name") << ": " << mxmlElementGetAttr(item, "description")
              << '\n';
}
