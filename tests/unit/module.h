// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The library's internal functions and variables, for the tests of what no
// exported function can show alone.
#pragma once

#include "quillmark.h"

#include <cstddef>

namespace module
{

// As at load time: no cached plan, no ping answered, no item started.
void reset();

int ping_mask();
int vendor();
const char *command_name(); // 65 bytes
constexpr std::size_t command_name_size = 65;

void ExtractString(char *text, int length);
void TestMsgInit(fpTest_TestMsg_t *message);
void ParseCmdLine(const char *command, fpTest_TestMsg_t *message);
int saveRecvFile(const char *filename, const char *data, int length);
mxml_node_t *load_configs_file(const char *path);
int get_node_index(const char *group, const char *item, int level);
int node_position(const mxml_node_t *node);
mxml_node_t *get_node_byIndex(mxml_node_t *tree, const char *group, int index);
int get_node_length(const char *group, int level);
const char *whitespace_cb(mxml_node_t *node, int where);
void save_XmlFile(mxml_node_t *tree);
int mysystem(const char *command);
void Sock_Init1();
int ResourceReduce();
void SingleItemExecute(mxml_node_t *tree, const char *group, int index);
int get_node_level(const char *path, char *last, int length);
void get_node_name(char *path, char *group, int group_length, char *item, int item_length);
int ItemsTest(char *path, char *result);

} // namespace module
