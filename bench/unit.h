// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the library keeps to itself and no exported function reaches alone.
#pragma once

#include <mxml.h>

namespace unit
{

mxml_node_t *load_configs_file(const char *path);
// The first ping of a process, as often as wanted.
void ping(char *reply, int length);
int get_node_index(const char *group, const char *item);
mxml_node_t *get_node_byIndex(mxml_node_t *tree, const char *group, int index);
void Sock_Init1();

// Deletes the tree that was loaded.
void drop();

} // namespace unit
