// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The library's unit itself, so that what it keeps to itself can be reached.
#include "../../src/quillmark.cpp"

#include "internals.h"

namespace internals
{

void reset()
{
    mxmlDelete(g_TestCmdTree);
    g_TestCmdTree = nullptr;
    g_PingMask = 0;
    ::vendor = 0;
    memset(g_CmdName, 0, sizeof g_CmdName);
    sServer = 0;
    memset(sendBuf, 0, sizeof sendBuf);
}

int &ping_mask = g_PingMask;
const int &vendor = ::vendor;
char (&command_name)[65] = g_CmdName;

int (&RunTestCmd)(const char *, char *, int) = FPTEST_RunTestCmd;
void (&ExtractString)(char *, int) = ::ExtractString;
void (&TestMsgInit)(fpTest_TestMsg_t *) = ::TestMsgInit;
void (&ParseCmdLine)(const char *, fpTest_TestMsg_t *) = fptest_ParseCmdLine;
int (&saveRecvFile)(const char *, const char *, int) = ::saveRecvFile;
mxml_node_t *(&load_configs_file)(const char *) = ::load_configs_file;
int (&get_node_index)(const char *, const char *, int) = ::get_node_index;
int (&node_position)(const mxml_node_t *) = my_mxmlGetNodeIdx;
mxml_node_t *(&get_node_byIndex)(mxml_node_t *, const char *, int) = ::get_node_byIndex;
int (&get_node_length)(const char *, int) = ::get_node_length;
const char *(&whitespace_cb)(mxml_node_t *, int) = ::whitespace_cb;
void (&save_XmlFile)(mxml_node_t *) = ::save_XmlFile;
int (&mysystem)(const char *) = ::mysystem;
void (&Sock_Init1)() = ::Sock_Init1;
int (&ResourceReduce)() = ::ResourceReduce;
void (&SingleItemExecute)(mxml_node_t *, const char *, int) = ::SingleItemExecute;
int (&get_node_level)(const char *, char *, int) = ::get_node_level;
void (&get_node_name)(char *, char *, int, char *, int) = ::get_node_name;
int (&ItemsTest)(char *, char *) = fptest_ItemsTest;

} // namespace internals
