// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The library's unit once more. The names that it exports are taken: the shipped
// library is in this program too.
#define g_TestCmdTree unit_TestCmdTree
#define FPTEST_RunTestCmd unit_RunTestCmd
#define FPTEST_SetTransation unit_SetTransation
#define FPTEST_ExtractResultMsg unit_ExtractResultMsg
#define FPTEST_SuspendItemExecute unit_SuspendItemExecute
#include "../src/quillmark.cpp"

#include "unit.h"

namespace unit
{

mxml_node_t *load_configs_file(const char *path)
{
    return ::load_configs_file(path);
}

void ping(char *reply, int length)
{
    g_PingMask = 0;
    unit_RunTestCmd("pingtest", reply, length);
}

int get_node_index(const char *group, const char *item)
{
    return ::get_node_index(group, item, 3);
}

mxml_node_t *get_node_byIndex(mxml_node_t *tree, const char *group, int index)
{
    return ::get_node_byIndex(tree, group, index);
}

void Sock_Init1()
{
    ::Sock_Init1();
}

void drop()
{
    mxmlDelete(unit_TestCmdTree);
    unit_TestCmdTree = nullptr;
}

} // namespace unit
