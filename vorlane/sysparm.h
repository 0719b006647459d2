/*
 * SPDX-FileCopyrightText: 2026 The Quillmark authors
 * SPDX-License-Identifier: Apache-2.0
 */

/* The platform's reader of parameter files. */
#ifndef VORLANE_SYSPARM_H
#define VORLANE_SYSPARM_H

#include <stddef.h>

#ifdef __cplusplus
extern "C" {
#endif

/*
 * Reads one value of a parameter file.
 *
 * file    path of the file
 * path    slash-separated names of the elements that lead to the value
 * buffer  receives the value, zero-terminated; owned by the caller
 * length  its capacity in bytes, the terminating zero included; a longer
 *         value is cut
 *
 * Returns 0 when the value was found. When the file or the value is missing it
 * returns -1 and leaves the buffer as it was.
 */
int get_node_value(const char *file, const char *path, char *buffer, size_t length);

#ifdef __cplusplus
}
#endif

#endif
