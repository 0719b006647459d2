/*
 * SPDX-FileCopyrightText: 2026 The Quillmark authors
 * SPDX-License-Identifier: Apache-2.0
 */

/* The platform's log call. */
#ifndef VORLANE_VR_LOG_H
#define VORLANE_VR_LOG_H

#ifdef __cplusplus
extern "C" {
#endif

/* The one priority that Quillmark uses, for errors as well. */
#define VR_LOG_DEBUG 4

/*
 * Writes one log line.
 *
 * priority  VR_LOG_DEBUG
 * tag       zero-terminated name of the part that logs
 * format    printf format of the text; the arguments follow
 *
 * Returns the length of the formatted text in bytes, or a negative value when
 * it could not be formatted. The texts stay the caller's. An implementation
 * must not change errno and must not call strtok: callers split strings with
 * it between two log calls.
 */
int vr_log_printf(int priority, const char *tag, const char *format, ...)
    __attribute__((format(printf, 3, 4)));

#ifdef __cplusplus
}
#endif

#endif
