/*
 * SPDX-FileCopyrightText: 2026 The Quillmark authors
 * SPDX-License-Identifier: Apache-2.0
 */

/* The socket wrappers on Linux. What they cannot report they log. */
#include "sockwrap.h"

#include "vr_log.h"

#include <errno.h>
#include <string.h>

static void log_failure(const char *call)
{
    const int error = errno;

    vr_log_printf(VR_LOG_DEBUG, "VRSOCK", "%s failed(%d),%s\n", call, error, strerror(error));
}

void Setsockopt(int descriptor, const int *value)
{
    if (setsockopt(descriptor, SOL_SOCKET, SO_REUSEADDR, value, (socklen_t)sizeof *value) < 0) {
        log_failure("setsockopt");
    }
}

void Bind(int descriptor, const struct sockaddr *address, socklen_t length)
{
    if (bind(descriptor, address, length) < 0) {
        log_failure("bind");
    }
}

/* A signal, or a client that left before it was accepted, is no reason to stop
   waiting. */
int Accept(int descriptor, struct sockaddr *address, socklen_t *length)
{
    int connection;

    do {
        connection = accept(descriptor, address, length);
    } while (connection < 0 && (errno == EINTR || errno == ECONNABORTED));
    return connection;
}
