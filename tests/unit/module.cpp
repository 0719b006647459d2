// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The library's unit itself, so that what it keeps to itself can be reached.
#include "../../src/quillmark.cpp"

#include "module.h"

namespace module
{

void reset()
{
    mxmlDelete(g_TestCmdTree);
    g_TestCmdTree = nullptr;
    g_PingMask = 0;
    ::vendor = 0;
    memset(g_CmdName, 0, sizeof g_CmdName);
    static_assert(sizeof g_CmdName == command_name_size);
    sServer = 0;
    memset(sendBuf, 0, sizeof sendBuf);
}

int ping_mask()
{
    return g_PingMask;
}
int vendor()
{
    return ::vendor;
}
const char *command_name()
{
    return g_CmdName;
}

void ExtractString(char *text, int length)
{
    ::ExtractString(text, length);
}
void TestMsgInit(fpTest_TestMsg_t *message)
{
    ::TestMsgInit(message);
}
void ParseCmdLine(const char *command, fpTest_TestMsg_t *message)
{
    fptest_ParseCmdLine(command, message);
}
int saveRecvFile(const char *filename, const char *data, int length)
{
    return ::saveRecvFile(filename, data, length);
}
mxml_node_t *load_configs_file(const char *path)
{
    return ::load_configs_file(path);
}
int get_node_index(const char *group, const char *item, int level)
{
    return ::get_node_index(group, item, level);
}
int node_position(const mxml_node_t *node)
{
    return my_mxmlGetNodeIdx(node);
}
mxml_node_t *get_node_byIndex(mxml_node_t *tree, const char *group, int index)
{
    return ::get_node_byIndex(tree, group, index);
}
int get_node_length(const char *group, int level)
{
    return ::get_node_length(group, level);
}
const char *whitespace_cb(mxml_node_t *node, int where)
{
    return ::whitespace_cb(node, where);
}
void save_XmlFile(mxml_node_t *tree)
{
    ::save_XmlFile(tree);
}
int mysystem(const char *command)
{
    return ::mysystem(command);
}
void Sock_Init1()
{
    ::Sock_Init1();
}
int ResourceReduce()
{
    return ::ResourceReduce();
}
void SingleItemExecute(mxml_node_t *tree, const char *group, int index)
{
    ::SingleItemExecute(tree, group, index);
}
int get_node_level(const char *path, char *last, int length)
{
    return ::get_node_level(path, last, length);
}
void get_node_name(char *path, char *group, int group_length, char *item, int item_length)
{
    ::get_node_name(path, group, group_length, item, item_length);
}
int ItemsTest(char *path, char *result)
{
    return fptest_ItemsTest(path, result);
}

} // namespace module
