// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The library's internal functions and variables, for the tests of what no
// exported function can show alone; and its command entry, which the bench has twice.
#pragma once

#include "quillmark.h"

namespace internals
{

// As at load time: no cached plan, no ping answered, no item started.
void reset();

extern int &ping_mask;
extern const int &vendor;
extern char (&command_name)[65];

extern int (&RunTestCmd)(const char *command, char *reply, int length);
extern void (&ExtractString)(char *text, int length);
extern void (&TestMsgInit)(fpTest_TestMsg_t *message);
extern void (&ParseCmdLine)(const char *command, fpTest_TestMsg_t *message);
extern int (&saveRecvFile)(const char *filename, const char *data, int length);
extern mxml_node_t *(&load_configs_file)(const char *path);
extern int (&get_node_index)(const char *group, const char *item, int level);
extern int (&node_position)(const mxml_node_t *node);
extern mxml_node_t *(&get_node_byIndex)(mxml_node_t *tree, const char *group, int index);
extern int (&get_node_length)(const char *group, int level);
extern const char *(&whitespace_cb)(mxml_node_t *node, int where);
extern void (&save_XmlFile)(mxml_node_t *tree);
extern int (&mysystem)(const char *command);
extern void (&Sock_Init1)();
extern int (&ResourceReduce)();
extern void (&SingleItemExecute)(mxml_node_t *tree, const char *group, int index);
extern int (&get_node_level)(const char *path, char *last, int length);
extern void (&get_node_name)(char *path, char *group, int group_length, char *item,
                             int item_length);
extern int (&ItemsTest)(char *path, char *result);

} // namespace internals
