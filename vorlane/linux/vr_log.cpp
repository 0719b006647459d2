/*
 * SPDX-FileCopyrightText: 2026 The Quillmark authors
 * SPDX-License-Identifier: Apache-2.0
 */

/*
 * The log on Linux: one line and one write for each call, to standard error or
 * to the file that VR_LOG_FILE names.
 */
#include "vr_log.h"

#include <errno.h>
#include <fcntl.h>
#include <pthread.h>
#include <stdarg.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

static pthread_once_t g_Opened = PTHREAD_ONCE_INIT;
static int g_Log = STDERR_FILENO;

static void open_log(void)
{
    const char *path = getenv("VR_LOG_FILE");

    if (path == nullptr || path[0] == '\0') {
        if (fcntl(g_Log, F_GETFD) < 0) {
            /* closed: what is opened next would get its number, and the log */
            g_Log = -1;
        }
        return;
    }
    int fd = open(path, O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0644);
    if (fd < 0) {
        dprintf(STDERR_FILENO,
                "vr_log: cannot open %s, which VR_LOG_FILE names: %s; logging to standard error\n",
                path, strerror(errno));
        return;
    }
    if (fd <= STDERR_FILENO) { /* a program may close these to reuse them */
        const int low = fd;
        fd = fcntl(low, F_DUPFD_CLOEXEC, STDERR_FILENO + 1);
        close(low);
    }
    g_Log = fd;
}

/* Writes the text as one line: a line feed is added where the text lacks it.
   The array has room for it after the text. */
static void write_line(char *text, size_t length)
{
    if (length == 0 || text[length - 1] != '\n') {
        text[length++] = '\n';
    }
    /* a log that cannot be written to is no reason to fail */
    [[maybe_unused]] const ssize_t written = write(g_Log, text, length);
}

int vr_log_printf(int priority, const char *tag, const char *format, ...)
{
    const int error = errno;
    char small[2048];
    char *text = small;
    va_list arguments;

    pthread_once(&g_Opened, open_log);
    const int head = snprintf(small, sizeof small, "%d/%.32s: ", priority, tag);
    va_start(arguments, format);
    const int length = vsnprintf(nullptr, 0, format, arguments);
    va_end(arguments);
    if (head < 0 || length < 0) {
        errno = error;
        return -1;
    }
    size_t capacity = (size_t)head + (size_t)length + 2; /* a line feed, a zero */
    if (capacity > sizeof small) {
        text = static_cast<char *>(malloc(capacity));
        if (text == nullptr) { /* better the beginning than nothing */
            text = small;
            capacity = sizeof small;
        } else {
            memcpy(text, small, (size_t)head);
        }
    }
    va_start(arguments, format);
    vsnprintf(text + head, capacity - 1 - (size_t)head, format, arguments);
    va_end(arguments);
    write_line(text, strlen(text));
    if (text != small) {
        free(text);
    }
    errno = error;
    return length;
}
